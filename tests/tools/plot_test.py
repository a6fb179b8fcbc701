#!/usr/bin/python3
"""karnet-plot drawn headless on small result and bathymetry files written here."""
import os
import struct
import subprocess
import sys
import tempfile
import unittest

import netCDF4
import numpy as np

PLOT = sys.argv.pop(1) if len(sys.argv) > 1 else "karnet-plot"
FILL = np.float32(-1e-30)


def png_size(path):
    with open(path, "rb") as f:
        head = f.read(24)
    assert head[:8] == b"\x89PNG\r\n\x1a\n", "not a PNG file"
    return struct.unpack(">II", head[16:24])


def png_colours(path):
    """How many distinct colours the picture uses (matplotlib reads its own PNGs)."""
    import matplotlib.image

    pixels = matplotlib.image.imread(path)
    return len(np.unique(pixels.reshape(-1, pixels.shape[-1]), axis=0))


def write_result(path, with_lonlat, empty_level=None):
    nz, ny, nx = 4, 6, 8
    with netCDF4.Dataset(path, "w") as ds:
        ds.title = "plot test"
        ds.createDimension("time", None)
        for name, n in (("z", nz), ("y", ny), ("x", nx)):
            ds.createDimension(name, n)
        z = ds.createVariable("z", "f8", ("z",))
        z[:] = [40.0, 30.0, 20.0, 10.0]
        z.positive = "down"
        z.standard_name = "depth"
        x = ds.createVariable("x", "f8", ("x",))
        x[:] = 500000.0 + 1000.0 * np.arange(nx)
        x.spacing = 1000.0
        x.standard_name = "projection_x_coordinate"
        y = ds.createVariable("y", "f8", ("y",))
        y[:] = 6100000.0 + 1000.0 * np.arange(ny)
        y.spacing = 1000.0
        y.standard_name = "projection_y_coordinate"
        crs = ds.createVariable("crs", "i4")
        crs.projection = "UTM-32"
        from osgeo import osr

        srs = osr.SpatialReference()
        srs.ImportFromEPSG(32632)
        crs.crs_wkt = srs.ExportToWkt()
        if with_lonlat:
            lon = ds.createVariable("lon", "f8", ("y", "x"))
            lat = ds.createVariable("lat", "f8", ("y", "x"))
            lon[:] = 9.0 + 0.015 * np.arange(nx)[None, :] + 0 * np.arange(ny)[:, None]
            lat[:] = 55.0 + 0.009 * np.arange(ny)[:, None] + 0 * np.arange(nx)[None, :]
        t = ds.createVariable("Temperature", "f4", ("time", "z", "y", "x"), fill_value=FILL)
        t.units = "degree_Celsius"
        values = (10.0 + np.arange(nz)[:, None, None] + 0.1 * np.arange(nx)[None, None, :]
                  + 0 * np.arange(ny)[None, :, None]).astype(np.float32)
        values[:, 0, 0] = FILL  # a dry corner
        if empty_level is not None:
            values[empty_level] = FILL
        t[0] = values
        # The error field of an objective analysis, linked as karnet links it.
        t.ancillary_variables = "Temperature_error"
        e = ds.createVariable("Temperature_error", "f4", ("time", "z", "y", "x"),
                              fill_value=FILL)
        e.units = "1"
        e.long_name = "relative error variance of the Temperature estimate"
        error = np.clip(0.02 * np.arange(nx)[None, None, :] + 0.1 * np.arange(ny)[None, :, None]
                        + 0 * np.arange(nz)[:, None, None], 0, 1).astype(np.float32)
        error[values == FILL] = FILL
        e[0] = error


def write_bathymetry(path):
    with netCDF4.Dataset(path, "w") as ds:
        ds.createDimension("y", 5)
        ds.createDimension("x", 7)
        b = ds.createVariable("bathymetry", "f4", ("y", "x"), fill_value=FILL)
        depth = -np.linspace(5, 60, 35, dtype=np.float32).reshape(5, 7)
        depth[0, :2] = 3.0  # land
        b[:] = depth
        ds.setncattr("Q84_Misc", np.array([0, -1e-30, -900, 0, -1e-30, -1e-30, -1e-30],
                                          dtype=np.float32))
        crs = ds.createVariable("crs", "i4")
        crs.projection = "LOCAL"
        crs.origin_longitude = 0.0
        crs.origin_latitude = 0.0
        crs.orientation = 0.0


def load_plot_module():
    """The karnet-plot script as a module, to check how it places observations."""
    import importlib.machinery
    import importlib.util

    loader = importlib.machinery.SourceFileLoader("karnet_plot", PLOT)
    module_spec = importlib.util.spec_from_loader("karnet_plot", loader)
    module = importlib.util.module_from_spec(module_spec)
    loader.exec_module(module)
    return module


class ObservationPlacementTest(unittest.TestCase):
    """Observations drawn on a grid without lon/lat land on the node they were taken at."""

    def grid_file(self, tmp, projection, lon0, lat0, orientation, wkt=None):
        path = os.path.join(tmp, "grid.nc")
        with netCDF4.Dataset(path, "w") as ds:
            crs = ds.createVariable("crs", "i4")
            crs.projection = projection
            crs.origin_longitude = lon0
            crs.origin_latitude = lat0
            crs.orientation = orientation
            if wkt:
                crs.crs_wkt = wkt
        return netCDF4.Dataset(path)

    def test_turned_local_and_utm_grids(self):
        plot = load_plot_module()
        from osgeo import osr

        with tempfile.TemporaryDirectory() as tmp:
            # Plain metres, y axis pointing east: a point 1 km north of the origin lies 1 km
            # along the grid's negative x axis, one 2 km east lies 2 km along its y axis.
            with self.grid_file(tmp, "LOCAL", 1000.0, 2000.0, 90.0) as ds:
                u, v = plot.grid_frame(ds, np.array([1000.0, 3000.0]), np.array([3000.0, 2000.0]))
                np.testing.assert_allclose(u, [-1.0, 0.0], atol=1e-9)
                np.testing.assert_allclose(v, [0.0, 2.0], atol=1e-9)
        utm = osr.SpatialReference()
        utm.ImportFromEPSG(32632)
        utm.SetAxisMappingStrategy(osr.OAMS_TRADITIONAL_GIS_ORDER)
        geo = utm.CloneGeogCS()
        geo.SetAxisMappingStrategy(osr.OAMS_TRADITIONAL_GIS_ORDER)
        to_utm = osr.CoordinateTransformation(geo, utm)
        lon0, lat0 = 11.0, 55.0
        x0, y0, _ = to_utm.TransformPoint(lon0, lat0)
        # The convergence there, from the direction of true north in the UTM plane.
        xn, yn, _ = to_utm.TransformPoint(lon0, lat0 + 1e-3)
        gamma = -np.degrees(np.arctan2(xn - x0, yn - y0))
        self.assertGreater(gamma, 1.0)  # east of the central meridian: grid north turned east
        turn = np.radians(20.0 - gamma)
        nodes = [(3.0, 4.0), (10.0, 0.0), (0.0, 7.5)]
        xs = [x0 + 1000 * (i * np.cos(turn) + j * np.sin(turn)) for i, j in nodes]
        ys = [y0 + 1000 * (-i * np.sin(turn) + j * np.cos(turn)) for i, j in nodes]
        with tempfile.TemporaryDirectory() as tmp:
            with self.grid_file(tmp, "UTM-32", lon0, lat0, 20.0, utm.ExportToWkt()) as ds:
                u, v = plot.grid_frame(ds, np.array(xs), np.array(ys))
        np.testing.assert_allclose(u, [n[0] for n in nodes], atol=2e-3)
        np.testing.assert_allclose(v, [n[1] for n in nodes], atol=2e-3)


class PlotTest(unittest.TestCase):
    def setUp(self):
        self.dir = tempfile.TemporaryDirectory()
        self.tmp = self.dir.name

    def tearDown(self):
        self.dir.cleanup()

    def path(self, name):
        return os.path.join(self.tmp, name)

    def plot(self, *args, expect=0):
        run = subprocess.run([PLOT, *args], capture_output=True, text=True)
        self.assertEqual(run.returncode, expect, run.stderr)
        return run

    def test_map_section_and_bathymetry_make_pictures(self):
        result = self.path("result.nc")
        write_result(result, with_lonlat=True)
        obs = self.path("obs.txt")
        with open(obs, "w") as f:
            f.write("502000 6102000 -10 11\n502000 6102000 -20 10\n505000 6103000 -5 12\n")
        cases = [
            ("map", result, "--depth", "20", "--obs", obs, "-o", self.path("map.png")),
            ("map", result, "--level", "0", "-o", self.path("map0.png")),
            ("section", result, "--row", "2", "-o", self.path("row.png")),
            ("section", result, "--from", "9.0,55.0", "--to", "9.1,55.04", "-o",
             self.path("line.png")),
        ]
        for args in cases:
            with self.subTest(args=args[:3]):
                self.plot(*args)
                width, height = png_size(args[-1])
                self.assertGreater(width, 300)
                self.assertGreater(height, 300)
                # A drawn field gives a colour ramp, not a blank canvas.
                self.assertGreater(png_colours(args[-1]), 50)
        bathymetry = self.path("bathymetry.nc")
        write_bathymetry(bathymetry)
        self.plot("bathymetry", bathymetry, "-o", self.path("bathy.png"))
        self.assertGreater(png_colours(self.path("bathy.png")), 50)

    def test_the_error_field_is_drawn_by_map_and_section(self):
        result = self.path("result.nc")
        write_result(result, with_lonlat=True)
        for args in [("map", result, "--var", "Temperature_error", "--level", "3", "-o",
                      self.path("error_map.png")),
                     ("section", result, "--var", "Temperature_error", "--column", "4", "-o",
                      self.path("error_section.png"))]:
            with self.subTest(args=args[:3]):
                self.plot(*args)
                self.assertGreater(png_colours(args[-1]), 50)

    def write(self, name, text):
        path = self.path(name)
        with open(path, "w") as f:
            f.write(text)
        return path

    def test_cross_validation_tables_are_drawn(self):
        levels = self.write("case_cv.csv",
                            "level,depth_m,nodes,missed,rms,bias\n"
                            "0,100,0,4,,\n"
                            "1,75,6,1,0.04,0\n"
                            "2,50,9,0,0.12,-0.02\n"
                            "3,25,9,0,0.31,0.05\n"
                            "all,,24,5,0.2,0.01\n")
        sweep = self.write("case_sweep.csv",
                           "DecayDistance,ErrorVariance,nodes,missed,rms,bias,best\n"
                           "1000,5,24,0,0.3,0.01,\n"
                           "1000,50,24,0,0.25,0.02,*\n"
                           "2000,5,24,0,0.4,-0.01,\n"
                           "2000,50,0,24,,,\n")
        for table in (levels, sweep):
            with self.subTest(table=os.path.basename(table)):
                out = table + ".png"
                self.plot("cv", table, "-o", out)
                width, height = png_size(out)
                self.assertGreater(width, 300)
                self.assertGreater(height, 300)
                self.assertGreater(png_colours(out), 20)
        # The best combination stands out in its own colour: drop the mark and the picture
        # loses it.
        with open(sweep) as f:
            unmarked = self.write("unmarked_sweep.csv", f.read().replace(",*", ","))
        self.plot("cv", unmarked, "-o", self.path("unmarked.png"))
        self.assertLess(png_colours(self.path("unmarked.png")), png_colours(sweep + ".png"))

    def test_bad_tables_fail_with_a_message(self):
        for name, text, words in [
            ("other.csv", "a,b,c\n1,2,3\n", "not a cross-validation table"),
            ("short.csv", "level,depth_m,nodes,missed,rms,bias\n1,2,3\n", "3 fields"),
            ("empty.csv", "", "no rows"),
            ("text.csv", "level,depth_m,nodes,missed,rms,bias\n1,x,3,0,1,1\n",
             "depth 'x' is not a number"),
        ]:
            with self.subTest(table=name):
                run = self.plot("cv", self.write(name, text), "-o", self.path(name + ".png"),
                                expect=1)
                self.assertIn(words, run.stderr)
                self.assertFalse(os.path.exists(self.path(name + ".png")))
        run = self.plot("cv", self.path("missing.csv"), "-o", self.path("m.png"), expect=1)
        self.assertIn("cannot read", run.stderr)

    def test_an_all_empty_level_is_drawn_as_a_blank_map(self):
        result = self.path("empty.nc")
        write_result(result, with_lonlat=False, empty_level=1)
        self.plot("map", result, "--level", "1", "-o", self.path("empty.png"))
        png_size(self.path("empty.png"))
        self.plot("map", result, "--level", "2", "-o", self.path("full.png"))
        self.assertLess(png_colours(self.path("empty.png")), png_colours(self.path("full.png")))

    def test_bad_requests_fail_with_a_message(self):
        result = self.path("result.nc")
        write_result(result, with_lonlat=True)
        not_nc = self.path("text.nc")
        with open(not_nc, "w") as f:
            f.write("not a netcdf file\n")
        for args, words in [
            (("map", not_nc, "-o", self.path("a.png")), "cannot read as NetCDF"),
            (("map", result, "--level", "9", "-o", self.path("b.png")), "level 9"),
            (("map", result, "--var", "Salinity", "-o", self.path("c.png")), "no variable"),
            (("section", result, "--row", "99", "-o", self.path("d.png")), "row 99"),
            (("map", result, "--obs", self.path("missing.txt"), "-o", self.path("e.png")),
             "cannot read"),
        ]:
            with self.subTest(args=args[:3]):
                run = self.plot(*args, expect=1)
                self.assertIn(words, run.stderr)
                self.assertFalse(os.path.exists(args[-1]))


if __name__ == "__main__":
    unittest.main()
