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

  basin    (asked for on its own) a made-up basin for timing and memory runs of any size:
           a NX x NY bowl of 100 m cells, deepest in the middle, land in one corner; CASTS
           casts at random water nodes, one value every 5 m from the surface to the bed;
           LEVELS levels of 5 m; case.pfs (bilinear, or objective with --analysis objective).

Deterministic: the same arguments give the same files.

usage: make_workloads.py [--mkgrid PATH] [--only large|dense] OUTDIR
       make_workloads.py [--mkgrid PATH] basin NX NY LEVELS CASTS OUTDIR [--analysis A]
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
      DataFileName = |{data}|
      FileName = |bathymetry.nc|
      Projection = 'LOCAL'
   EndSect  // INPUT_FILES

   [DESCRIPTION_OF_GRID]
      ZRange = 0, {last}
      Spacing = {spacing}
   EndSect  // DESCRIPTION_OF_GRID

   [CALCULATION_PARAMETERS]
      SearchRadius = {radius}
      MaxExtrapolationDistance = {extrapolation}
      Analysis = {analysis}
   EndSect  // CALCULATION_PARAMETERS

   [OBJECTIVE_ANALYSIS_PARAMETERS]
      ZeroCrossingDistance = {zero}
      DecayDistance = {decay}
      ErrorVariance = 10
      MinData = {low}
      MaxData = {high}
      FilterOperations = {filters}
      CorrelationSampleSize = {css}
      FilterType = '{filter}'
   EndSect  // OBJECTIVE_ANALYSIS_PARAMETERS

   [OUTPUT_DATA]
      FileName = |{result}|
      Title = '{title}'
      ItemType = 2
   EndSect  // OUTPUT_DATA
EndSect  // Q4_DIGITIZING_OF_DATA
"""


def write_asc(path, bed):
    """bed[k, j] (row k = y index from the south) as an ESRI ASCII grid of DX cells."""
    ny, nx = bed.shape
    with open(path, "w") as f:
        f.write("ncols %d\nnrows %d\nxllcenter 0.0\nyllcenter 0.0\ncellsize %.1f\n"
                "NODATA_value -9999\n" % (nx, ny, DX))
        # ESRI ASCII rows run from north to south.
        for row in bed[::-1]:
            f.write(" ".join("%.1f" % v for v in row) + "\n")


def make_bathymetry(mkgrid, folder, asc):
    subprocess.run([mkgrid, "--projection", "LOCAL", "--orientation", "0", "--title",
                    "benchmark bathymetry", asc, os.path.join(folder, "bathymetry.nc")],
                   check=True)


def write_case(folder, mkgrid, nx, ny, levels, cells, seed):
    """Bathymetry (-(levels + 5) * SPACING everywhere, all water) and one full cast at each
    of the given flat node numbers; returns nothing."""
    os.makedirs(folder, exist_ok=True)
    asc = os.path.join(folder, "bathymetry.asc")
    write_asc(asc, np.full((ny, nx), -(levels + 5) * SPACING))
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
    make_bathymetry(mkgrid, folder, asc)


# The settings of the workloads, which a case may change.
WORKLOAD_SETTINGS = dict(data="observations.txt", spacing=SPACING, extrapolation="0, 0", low=-5,
                         high=40, filters=0, filter="shapiro")


def pfs(folder, name, **fields):
    settings = dict(WORKLOAD_SETTINGS, title="benchmark " + name)
    settings.update(fields)
    with open(os.path.join(folder, name + ".pfs"), "w") as f:
        f.write(PFS.format(name=name, **settings))


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


def basin(argv, mkgrid):
    parser = argparse.ArgumentParser(prog="make_workloads.py basin")
    parser.add_argument("nx", type=int)
    parser.add_argument("ny", type=int)
    parser.add_argument("levels", type=int)
    parser.add_argument("casts", type=int)
    parser.add_argument("dir")
    parser.add_argument("--analysis", default="bilinear")
    args = parser.parse_args(argv)
    os.makedirs(args.dir, exist_ok=True)
    spacing = 5.0
    deepest = spacing * args.levels
    x = np.linspace(-1.0, 1.0, args.nx)
    y = np.linspace(-1.0, 1.0, args.ny)
    xx, yy = np.meshgrid(x, y)
    bed = -deepest * (1.05 - 0.6 * (xx * xx + yy * yy)) + 8.0 * np.sin(7 * xx) * np.cos(5 * yy)
    bed[(xx > 0.7) & (yy > 0.7)] = 5.0  # land in the north-east corner
    bed = np.round(bed, 1)
    asc = os.path.join(args.dir, "basin.asc")
    write_asc(asc, bed)
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
            px, py = i * DX + rng.uniform(-20, 20), k * DX + rng.uniform(-20, 20)
            z = -1.0
            lines = []
            while z > b:
                t = 4.0 + 14.0 * np.exp(z / 60.0) + 0.5 * np.sin(px / 7000.0) \
                    + 0.3 * np.cos(py / 5000.0)
                lines.append(f"{px:.1f} {py:.1f} {z:.1f} {t:.3f}\n")
                z -= spacing
            f.writelines(lines)
    pfs(args.dir, "case", data="casts.txt", last=args.levels - 1, spacing=spacing, radius=8000,
        extrapolation="10, 20", analysis=args.analysis, zero=8000, decay=3000, low=-2, high=30,
        filters=1, filter="12 pts filter", css=8, result="result.nc", title="large made-up case")
    make_bathymetry(mkgrid, args.dir, asc)


def main():
    if "basin" in sys.argv[1:]:
        at = sys.argv.index("basin")
        front = argparse.ArgumentParser(prog="make_workloads.py")
        front.add_argument("--mkgrid", default="build/tools/karnet-mkgrid")
        mkgrid = os.path.abspath(front.parse_args(sys.argv[1:at]).mkgrid)
        basin(sys.argv[at + 1:], mkgrid)
        return
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
