#!/usr/bin/python3
"""Writes a large made-up karnet case for timing and memory runs.

    scripts/large-case.py NX NY LEVELS CASTS DIR [--analysis bilinear|objective]

DIR gets basin.asc (a NX x NY bowl of 100 m cells, deepest in the middle,
land in one corner), casts.txt (CASTS casts at random water nodes, one value
every 5 m from the surface to the bed) and case.pfs (LEVELS levels of 5 m,
LOCAL coordinates). Turn basin.asc into bathymetry.nc with
    karnet-mkgrid --projection LOCAL DIR/basin.asc DIR/bathymetry.nc
The same arguments give the same files.
"""
import argparse
import os

import numpy as np

parser = argparse.ArgumentParser()
parser.add_argument("nx", type=int)
parser.add_argument("ny", type=int)
parser.add_argument("levels", type=int)
parser.add_argument("casts", type=int)
parser.add_argument("dir")
parser.add_argument("--analysis", default="bilinear")
args = parser.parse_args()
os.makedirs(args.dir, exist_ok=True)

cell = 100.0
spacing = 5.0
deepest = spacing * args.levels
x = np.linspace(-1.0, 1.0, args.nx)
y = np.linspace(-1.0, 1.0, args.ny)
xx, yy = np.meshgrid(x, y)
bed = -deepest * (1.05 - 0.6 * (xx * xx + yy * yy)) + 8.0 * np.sin(7 * xx) * np.cos(5 * yy)
bed[(xx > 0.7) & (yy > 0.7)] = 5.0  # land in the north-east corner
bed = np.round(bed, 1)

with open(os.path.join(args.dir, "basin.asc"), "w") as f:
    f.write(f"ncols {args.nx}\nnrows {args.ny}\nxllcenter 0.0\nyllcenter 0.0\n")
    f.write(f"cellsize {cell}\nNODATA_value -9999\n")
    # ESRI ASCII rows run from north to south.
    for row in bed[::-1]:
        f.write(" ".join(f"{v:.1f}" for v in row))
        f.write("\n")

rng = np.random.default_rng(20261206)
with open(os.path.join(args.dir, "casts.txt"), "w") as f:
    made = 0
    while made < args.casts:
        i = int(rng.integers(0, args.nx))
        k = int(rng.integers(0, args.ny))
        b = bed[k, i]
        if b >= 0:
            continue
        made += 1
        px, py = i * cell + rng.uniform(-20, 20), k * cell + rng.uniform(-20, 20)
        z = -1.0
        lines = []
        while z > b:
            t = 4.0 + 14.0 * np.exp(z / 60.0) + 0.5 * np.sin(px / 7000.0) + 0.3 * np.cos(py / 5000.0)
            lines.append(f"{px:.1f} {py:.1f} {z:.1f} {t:.3f}\n")
            z -= spacing
        f.writelines(lines)

with open(os.path.join(args.dir, "case.pfs"), "w") as f:
    f.write(f"""// large made-up case
[Q4_DIGITIZING_OF_DATA]
   [INPUT_FILES]
      DataFileName = |casts.txt|
      FileName = |bathymetry.nc|
      Projection = 'LOCAL'
   EndSect  // INPUT_FILES
   [DESCRIPTION_OF_GRID]
      ZRange = 0, {args.levels - 1}
      Spacing = {spacing}
   EndSect  // DESCRIPTION_OF_GRID
   [CALCULATION_PARAMETERS]
      SearchRadius = 8000
      MaxExtrapolationDistance = 10, 20
      Analysis = {args.analysis}
   EndSect  // CALCULATION_PARAMETERS
   [OBJECTIVE_ANALYSIS_PARAMETERS]
      ZeroCrossingDistance = 8000
      DecayDistance = 3000
      ErrorVariance = 10
      MinData = -2
      MaxData = 30
      FilterOperations = 1
      CorrelationSampleSize = 8
      FilterType = '12 pts filter'
   EndSect  // OBJECTIVE_ANALYSIS_PARAMETERS
   [OUTPUT_DATA]
      FileName = |result.nc|
      Title = 'large made-up case'
      ItemType = 2
   EndSect  // OUTPUT_DATA
EndSect  // Q4_DIGITIZING_OF_DATA
""")
