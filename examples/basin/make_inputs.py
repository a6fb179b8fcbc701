#!/usr/bin/python3
"""Writes the inputs of the basin example: basin.asc (an ESRI ASCII bathymetry grid) and
casts.txt (CTD-like temperature casts). Deterministic: the same files on every run.

The basin is 20 km x 15 km of 250 m cells, in UTM zone 32 with its south-west cell centre at
easting 640000, northing 6150000. Land (NODATA) lies along a curved eastern coast and on an
island in the middle; the bed deepens towards a trough in the west, down to 48 m.

The grid is turned: karnet-mkgrid --orientation 15 makes its y axis point 15 degrees east of
true north, so the grid's axes stand at 15 degrees minus the meridian convergence at the origin
against the UTM axes. The casts are laid out on grid nodes and written at those nodes' UTM
positions, so that each falls on the node it was drawn for, in the water and above the bed.
"""
import math
import os

from osgeo import osr

HERE = os.path.dirname(os.path.abspath(__file__))
NCOLS, NROWS, CELL = 80, 60, 250.0
X0, Y0 = 640000.0, 6150000.0
NODATA = -9999
ORIENTATION = 15.0  # degrees clockwise from true north to the grid's y axis (mkgrid --orientation)


def convergence(x, y):
    """Meridian convergence (degrees, clockwise from true north to grid north) at a UTM-32 point."""
    utm = osr.SpatialReference()
    utm.ImportFromEPSG(32632)
    utm.SetAxisMappingStrategy(osr.OAMS_TRADITIONAL_GIS_ORDER)
    geo = utm.CloneGeogCS()
    geo.SetAxisMappingStrategy(osr.OAMS_TRADITIONAL_GIS_ORDER)
    lon, lat, _ = osr.CoordinateTransformation(utm, geo).TransformPoint(x, y)
    xn, yn, _ = osr.CoordinateTransformation(geo, utm).TransformPoint(lon, lat + 1e-4)
    return -math.degrees(math.atan2(xn - x, yn - y))


def node_position(i, j, turn):
    """UTM position of grid node (i, j): the grid offsets turned clockwise by `turn` degrees."""
    a = math.radians(turn)
    u, v = i * CELL, j * CELL
    return X0 + u * math.cos(a) + v * math.sin(a), Y0 - u * math.sin(a) + v * math.cos(a)


def depth(i, j):
    """Bed height (m, negative below sea level) at column i, row j (row 0 south), or None on land."""
    x, y = i * CELL, j * CELL
    coast = 16500.0 + 1800.0 * math.sin(y / 2600.0)
    if x > coast:
        return None
    if math.hypot(x - 9000.0, y - 8000.0) < 1300.0:
        return None
    trough = 48.0 * math.exp(-((x - 5000.0) / 6000.0) ** 2)
    shelf = 6.0 + 20.0 * (coast - x) / coast
    d = max(trough, shelf)
    # shoals towards the island
    r = math.hypot(x - 9000.0, y - 8000.0)
    if r < 3500.0:
        d *= 0.35 + 0.65 * (r - 1300.0) / 2200.0
    return -round(max(d, 2.0), 1)


def temperature(x, y, z):
    """A warm surface layer over a cold bottom layer with a thermocline near 15 m that deepens
    and warms towards the north-east."""
    thermocline = 13.0 + 4.0 * (x + y) / 35000.0
    surface = 15.5 + 1.5 * y / 15000.0
    bottom = 6.0 + 0.5 * x / 20000.0
    s = 1.0 / (1.0 + math.exp((thermocline + z) / 2.5))
    return surface + (bottom - surface) * s


def main():
    with open(os.path.join(HERE, "basin.asc"), "w") as f:
        f.write("ncols %d\nnrows %d\nxllcenter %.1f\nyllcenter %.1f\ncellsize %.1f\n"
                "NODATA_value %d\n" % (NCOLS, NROWS, X0, Y0, CELL, NODATA))
        for j in reversed(range(NROWS)):  # north first
            row = []
            for i in range(NCOLS):
                d = depth(i, j)
                row.append(str(NODATA) if d is None else "%.1f" % d)
            f.write(" ".join(row) + "\n")

    # Casts on a coarse, slightly irregular station pattern; each is sampled every metre
    # from 1 m below the surface to 1 m above the bed.
    turn = ORIENTATION - convergence(X0, Y0)
    lines = []
    for sj in range(5):
        for si in range(7):
            i = 4 + si * 11 + (sj % 2) * 3
            j = 5 + sj * 12 + (si % 3)
            d = depth(i, j) if i < NCOLS and j < NROWS else None
            if d is None or d > -4.0:
                continue
            x, y = node_position(i, j, turn)
            z = -1.0
            while z > d + 1.0:
                # The temperature field is drawn in the grid's own frame.
                lines.append("%.1f %.1f %.1f %.3f" % (x, y, z, temperature(i * CELL, j * CELL, z)))
                z -= 1.0
    with open(os.path.join(HERE, "casts.txt"), "w") as f:
        f.write("\n".join(lines) + "\n")


if __name__ == "__main__":
    main()
