#!/usr/bin/python3
"""Writes the benchmark workloads of karnet as ordinary inputs, one folder each:

  large/   workload L: 1000 x 1000 nodes of 100 m x 10 levels, casts at 20 000 distinct nodes
           (so 20 000 data nodes per level), LOCAL projection, SearchRadius 10 dx,
           CorrelationSampleSize 20, no smoothing, no vertical extrapolation;
           large_bilinear.pfs and large_oa.pfs.
  dense/   a dense objective analysis: 160 x 160 nodes x 2 levels, a cast at every
           fourth node on average, SearchRadius 20 dx, CorrelationSampleSize 50; every
           node has at least 50 candidate cells (checked here); dense_oa.pfs.

Each folder gets bathymetry.asc, observations.txt and the .pfs files; bathymetry.nc is made
with karnet-mkgrid (pass its path with --mkgrid, default build/tools/karnet-mkgrid).
Deterministic: the same files on every run.

usage: make_workloads.py [--mkgrid PATH] [--only large|dense] OUTDIR
"""
import argparse
import os
import subprocess
import sys

import numpy as np

DX = 100.0
SPACING = 10.0

PFS = """// karnet benchmark workload {name}
[Q4_DIGITIZING_OF_DATA]
   [INPUT_FILES]
      DataFileName = |observations.txt|
      FileName = |bathymetry.nc|
      Projection = 'LOCAL'
   EndSect  // INPUT_FILES

   [DESCRIPTION_OF_GRID]
      ZRange = 0, {last}
      Spacing = {spacing}
   EndSect  // DESCRIPTION_OF_GRID

   [CALCULATION_PARAMETERS]
      SearchRadius = {radius}
      MaxExtrapolationDistance = 0, 0
      Analysis = {analysis}
   EndSect  // CALCULATION_PARAMETERS

   [OBJECTIVE_ANALYSIS_PARAMETERS]
      ZeroCrossingDistance = {zero}
      DecayDistance = {decay}
      ErrorVariance = 10
      MinData = -5
      MaxData = 40
      FilterOperations = 0
      CorrelationSampleSize = {css}
      FilterType = 'shapiro'
   EndSect  // OBJECTIVE_ANALYSIS_PARAMETERS

   [OUTPUT_DATA]
      FileName = |{result}|
      Title = 'benchmark {name}'
      ItemType = 2
   EndSect  // OUTPUT_DATA
EndSect  // Q4_DIGITIZING_OF_DATA
"""


def write_case(folder, mkgrid, nx, ny, levels, cells, seed):
    """Bathymetry (-(levels + 5) * SPACING everywhere, all water) and one full cast at each
    of the given flat node numbers; returns nothing."""
    os.makedirs(folder, exist_ok=True)
    depth = -(levels + 5) * SPACING
    asc = os.path.join(folder, "bathymetry.asc")
    with open(asc, "w") as f:
        f.write("ncols %d\nnrows %d\nxllcenter 0.0\nyllcenter 0.0\ncellsize %.1f\n"
                "NODATA_value -9999\n" % (nx, ny, DX))
        row = " ".join(["%.1f" % depth] * nx) + "\n"
        for _ in range(ny):
            f.write(row)
    rng = np.random.default_rng(seed)
    j = cells % nx
    k = cells // nx
    x = j * DX
    y = k * DX
    lines = []
    noise = rng.normal(0.0, 0.3, size=(len(cells), levels))
    for level in range(levels):
        # level l lies at (l - last - 1) * SPACING
        z = (level - levels) * SPACING
        value = 12.0 + 4.0 * np.sin(x / 9000.0) - 3.0 * np.cos(y / 7000.0) + 0.05 * z \
            + noise[:, level]
        lines.extend("%.1f %.1f %.1f %.4f" % (a, b, z, v) for a, b, v in zip(x, y, value))
    with open(os.path.join(folder, "observations.txt"), "w") as f:
        f.write("\n".join(lines) + "\n")
    subprocess.run([mkgrid, "--projection", "LOCAL", "--orientation", "0", "--title",
                    "benchmark bathymetry", asc, os.path.join(folder, "bathymetry.nc")],
                   check=True)


def pfs(folder, name, **fields):
    with open(os.path.join(folder, name + ".pfs"), "w") as f:
        f.write(PFS.format(name=name, spacing=SPACING, **fields))


def large(out, mkgrid):
    nx = ny = 1000
    levels = 10
    rng = np.random.default_rng(20240)
    cells = np.sort(rng.choice(nx * ny, size=20000, replace=False))
    folder = os.path.join(out, "large")
    write_case(folder, mkgrid, nx, ny, levels, cells, 1)
    common = dict(last=levels - 1, radius=10 * DX, zero=1500, decay=500, css=20)
    pfs(folder, "large_bilinear", analysis="bilinear", result="result_bilinear.nc", **common)
    pfs(folder, "large_oa", analysis="'objective'", result="result_oa.nc", **common)


def dense(out, mkgrid):
    nx = ny = 160
    levels = 2
    radius = 20
    rng = np.random.default_rng(777)
    cells = np.sort(rng.choice(nx * ny, size=nx * ny // 4, replace=False))
    # every node must see at least 50 cells within the search radius
    mask = np.zeros((ny, nx), dtype=np.int64)
    mask[cells // nx, cells % nx] = 1
    off = np.arange(-radius, radius + 1)
    dj, dk = np.meshgrid(off, off)
    inside = (dj * dj + dk * dk) <= radius * radius
    padded = np.pad(mask, radius)
    counts = np.zeros_like(mask)
    for a, b in zip(dk[inside], dj[inside]):
        counts += padded[radius + a:radius + a + ny, radius + b:radius + b + nx]
    if counts.min() < 50:
        sys.exit("dense workload: a node sees only %d cells" % counts.min())
    folder = os.path.join(out, "dense")
    write_case(folder, mkgrid, nx, ny, levels, cells, 2)
    pfs(folder, "dense_oa", analysis="'objective'", result="result_oa.nc", last=levels - 1,
        radius=radius * DX, zero=2500, decay=1000, css=50)
    print("dense workload: %d to %d candidate cells per node" % (counts.min(), counts.max()))


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--mkgrid", default="build/tools/karnet-mkgrid")
    parser.add_argument("--only", choices=["large", "dense"])
    parser.add_argument("outdir")
    args = parser.parse_args()
    mkgrid = os.path.abspath(args.mkgrid)
    if args.only in (None, "large"):
        large(args.outdir, mkgrid)
    if args.only in (None, "dense"):
        dense(args.outdir, mkgrid)


if __name__ == "__main__":
    main()
