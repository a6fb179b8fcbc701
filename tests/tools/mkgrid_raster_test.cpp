// karnet-mkgrid on GeoTIFF and NetCDF rasters: resampling, projections,
// turned grids, land and faults.
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <string>
#include <vector>

#include "tools/mkgrid_test_support.h"

namespace karnet {
namespace {

using test::MadeGrid;
using test::NodePlacer;
using test::quoted;
using test::readMadeGrid;
using test::runMkgrid;

constexpr int kUtm32 = 32632;

class MkgridRaster : public test::ScratchTest {
 protected:
  // Runs the program on input, writing out; expects success.
  MadeGrid make(const std::string& options, const std::string& input,
                std::string* output = nullptr) {
    int code = -1;
    const std::string text = runMkgrid(options + " " + quoted(input) + " " + quoted(path), &code);
    if (output != nullptr) *output = text;
    EXPECT_EQ(code, 0) << text;
    return readMadeGrid(path);
  }
};

// A plane in projected metres, bilinearly resampled, keeps its value at every
// node: the nodes must lie where the file says they do.
TEST_F(MkgridRaster, LinearFieldKeepsItsValueAtEveryNode) {
  auto field = [](double x, double y) {
    return -100.0 - 0.01 * (x - 540000) - 0.02 * (y - 6100000);
  };
  const double transform[6] = {540000, 100, 0, 6105000, 0, -100};
  std::vector<double> values;
  for (int r = 0; r < 50; ++r) {
    for (int c = 0; c < 60; ++c) values.push_back(field(540050 + 100 * c, 6104950 - 100 * r));
  }
  test::writeGeoTiff(file("plane.tif"), 60, 50, transform, kUtm32, values);
  std::string output;
  const MadeGrid g = make("-p UTM-32 --spacing 70,60 --extent-proj 541000,6101000,545000,6104000",
                          file("plane.tif"), &output);
  EXPECT_NE(output.find("bilinear"), std::string::npos) << output;
  ASSERT_EQ(g.nx, 58);  // 4000 / 70 rounded up
  ASSERT_EQ(g.ny, 50);
  NodePlacer nodes(g);
  EXPECT_NEAR(nodes.x0, 541035.0, 1e-3);  // the south-west node's centre
  EXPECT_NEAR(nodes.y0, 6101030.0, 1e-3);
  EXPECT_NEAR(g.orientation, nodes.map.convergence(g.longitude, g.latitude), 1e-9);
  for (int j = 0; j < g.ny; ++j) {
    for (int i = 0; i < g.nx; ++i) {
      double x, y;
      nodes.place(i, j, &x, &y);
      ASSERT_NEAR(g.at(i, j), field(x, y), 2e-3) << i << ", " << j;
    }
  }
}

// Coarser nodes take the mean of the cells they cover, not a value between neighbours.
TEST_F(MkgridRaster, CoarserSpacingAveragesTheCells) {
  const double transform[6] = {600000, 100, 0, 6203000, 0, -100};
  std::vector<double> values;
  for (int r = 0; r < 30; ++r) {
    for (int c = 0; c < 30; ++c) values.push_back(-100.0 - 30.0 * ((c + r) % 2) - 0.5 * c);
  }
  test::writeGeoTiff(file("board.tif"), 30, 30, transform, kUtm32, values);
  std::string output;
  const MadeGrid g = make("--spacing 300", file("board.tif"), &output);
  EXPECT_NE(output.find("average"), std::string::npos) << output;
  EXPECT_EQ(g.projection, "UTM-32");  // the source's own
  ASSERT_EQ(g.nx, 10);
  ASSERT_EQ(g.ny, 10);
  for (int j = 0; j < 10; ++j) {
    for (int i = 0; i < 10; ++i) {
      double sum = 0;
      for (int r = 29 - 3 * j - 2; r <= 29 - 3 * j; ++r) {
        for (int c = 3 * i; c < 3 * i + 3; ++c) sum += values[r * 30 + c];
      }
      ASSERT_NEAR(g.at(i, j), sum / 9.0, 1e-3) << i << ", " << j;
    }
  }
}

// A GEBCO-like file: lat and lon coordinate variables, a packed elevation
// with a fill value, no CRS. Heights are linear in longitude and latitude.
std::string lonLatCdl(int nlat, double lat0, int nlon, double lon0, const std::string& extra = "") {
  std::string lat, lon;
  for (int k = 0; k < nlat; ++k) lat += (k ? ", " : "") + test::cdlNumber(lat0 + 0.1 * k);
  for (int k = 0; k < nlon; ++k) lon += (k ? ", " : "") + test::cdlNumber(lon0 + 0.1 * k);
  return "dimensions: lat = " + std::to_string(nlat) + " ; lon = " + std::to_string(nlon) +
         " ;\nvariables:\n double lat(lat) ; lat:units = \"degrees_north\" ;\n"
         " double lon(lon) ; lon:units = \"degrees_east\" ;\n"
         " float elevation(lat, lon) ; elevation:_FillValue = -9999.f ;"
         " elevation:scale_factor = 2.f ; elevation:add_offset = -1000.f ;\n" +
         extra + "data:\n lat = " + lat + " ;\n lon = " + lon + " ;\n";
}

// Stored (packed) values, southern row first; stored = (height + 1000) / 2.
std::vector<float> lonLatValues(int nlat, double lat0, int nlon, double lon0,
                                double (*height)(double, double)) {
  std::vector<float> values;
  for (int k = 0; k < nlat; ++k) {
    for (int m = 0; m < nlon; ++m) {
      values.push_back(static_cast<float>((height(lon0 + 0.1 * m, lat0 + 0.1 * k) + 1000.0) / 2.0));
    }
  }
  return values;
}

double northHeight(double lon, double lat) {
  return -40.0 - 10.0 * (lon - 8.0) - 20.0 * (lat - 54.0);
}
double southHeight(double lon, double lat) {
  return -200.0 + 30.0 * (lon - 150.0) - 5.0 * (lat + 34.0);
}

TEST_F(MkgridRaster, LonLatNetCdfNeedsAProjectionAndAutoPicksTheUtmZone) {
  const std::string nc = file("gebco.nc");
  test::makeNc(nc, lonLatCdl(21, 54.0, 31, 8.0));
  std::vector<float> stored = lonLatValues(21, 54.0, 31, 8.0, northHeight);
  stored.back() = -9999.f;  // the north-east corner: outside the extent below
  test::putValues(nc, "elevation", stored);

  int code = -1;
  std::string output = runMkgrid(quoted(nc) + " " + quoted(path), &code);
  EXPECT_EQ(code, 1);
  EXPECT_NE(output.find("longitude and latitude"), std::string::npos) << output;
  EXPECT_NE(output.find("--projection"), std::string::npos) << output;
  EXPECT_FALSE(std::filesystem::exists(path));

  const MadeGrid g = make("-p auto --spacing 2000 --extent 8.5,54.5,10.5,55.5", nc, &output);
  EXPECT_EQ(g.projection, "UTM-32N") << output;
  NodePlacer nodes(g);
  int checked = 0;
  for (int j = 0; j < g.ny; ++j) {
    for (int i = 0; i < g.nx; ++i) {
      double x, y, lon, lat;
      nodes.place(i, j, &x, &y);
      nodes.map.projToGeo(x, y, &lon, &lat);
      // Between the cell centres of the file, heights are bilinear in lon, lat.
      if (lon < 8.05 || lon > 10.95 || lat < 54.05 || lat > 55.95) continue;
      ASSERT_NEAR(g.at(i, j), northHeight(lon, lat), 2e-3) << i << ", " << j;
      ++checked;
    }
  }
  EXPECT_GT(checked, 3000);

  // South of the equator the zone is a southern one.
  const std::string south = file("south.nc");
  test::makeNc(south, lonLatCdl(11, -34.0, 11, 150.0));
  test::putValues(south, "elevation", lonLatValues(11, -34.0, 11, 150.0, southHeight));
  const MadeGrid s = make("--projection auto", south, &output);
  EXPECT_EQ(s.projection, "UTM-56S");
  // Without --spacing: the smaller side of a source cell there (0.1 degree of
  // longitude at 33.5 S, some 9.3 km), cut to three digits, and bilinear.
  Cartography utm56s("UTM-56S", 0, 0, 0);
  double xa, ya, xb, yb;
  utm56s.geoToProj(150.5, -33.5, &xa, &ya);
  utm56s.geoToProj(150.6, -33.5, &xb, &yb);
  const double cell = std::hypot(xb - xa, yb - ya);
  EXPECT_LE(s.dx, cell);
  EXPECT_GT(s.dx, cell - 10.0);
  EXPECT_EQ(s.dx, s.dy);
  EXPECT_NE(output.find("bilinear"), std::string::npos) << output;
  NodePlacer southNodes(s);
  double x, y, lon, lat;
  southNodes.place(s.nx / 2, s.ny / 2, &x, &y);
  southNodes.map.projToGeo(x, y, &lon, &lat);
  EXPECT_NEAR(s.at(s.nx / 2, s.ny / 2), southHeight(lon, lat), 2e-3);
}

// A file with several 2-D variables takes --variable; a file in degrees
// without CRS is refused like one that says it is in degrees.
TEST_F(MkgridRaster, VariablesAndDegreesWithoutCrs) {
  const std::string nc = file("two.nc");
  test::makeNc(nc, lonLatCdl(5, 54.0, 5, 8.0, " float other(lat, lon) ;\n"));
  test::putValues(nc, "elevation", lonLatValues(5, 54.0, 5, 8.0, northHeight));
  test::putValues(nc, "other", std::vector<float>(25, -7.0f));
  int code = -1;
  std::string output = runMkgrid("-p UTM-32 " + quoted(nc) + " " + quoted(path), &code);
  EXPECT_EQ(code, 1);
  EXPECT_NE(output.find("several 2-D variables"), std::string::npos) << output;
  const MadeGrid g = make("-p UTM-32 --variable other --spacing 3000", nc);
  EXPECT_EQ(g.at(g.nx / 2, g.ny / 2), -7.0f);

  test::writeBytes(file("deg.asc"),
                   "ncols 2\nnrows 2\nxllcorner 8\nyllcorner 54\ncellsize 0.1\n"
                   "-1 -2\n-3 -4\n");
  output = runMkgrid(quoted(file("deg.asc")) + " " + quoted(file("deg.nc")), &code);
  EXPECT_EQ(code, 1);
  EXPECT_NE(output.find("look like degrees"), std::string::npos) << output;
  EXPECT_FALSE(std::filesystem::exists(file("deg.nc")));
}

// NODATA cells and nodes beyond the source get the land value, whether the
// nodes are the source's cells or resampled between them.
TEST_F(MkgridRaster, NodataAndOutsideBecomeLand) {
  const double transform[6] = {500000, 100, 0, 6002000, 0, -100};
  std::vector<double> values(20 * 20, -50.0);
  for (int r = 5; r < 11; ++r) {
    for (int c = 5; c < 11; ++c) values[r * 20 + c] = -9999.0;
  }
  const double nodata = -9999.0;
  test::writeGeoTiff(file("holes.tif"), 20, 20, transform, kUtm32, values, &nodata);
  for (const char* spacing : {"100", "50"}) {
    const MadeGrid g = make(
        std::string("-l 3 --spacing ") + spacing + " --extent-proj 500000,6000000,502500,6002000",
        file("holes.tif"));
    EXPECT_EQ(g.landValue, 3.0f);
    NodePlacer nodes(g);
    for (int j = 0; j < g.ny; ++j) {
      for (int i = 0; i < g.nx; ++i) {
        double x, y;
        nodes.place(i, j, &x, &y);
        const double c = (x - 500000) / 100, r = (6002000 - y) / 100;  // source cell units
        const bool inHole = c > 5.6 && c < 10.4 && r > 5.6 && r < 10.4;
        const bool outside = c > 20.0;
        const bool clear = c < 19.5 && !(c > 4.4 && c < 11.6 && r > 4.4 && r < 11.6);
        if (inHole || outside) {
          ASSERT_EQ(g.at(i, j), 3.0f) << spacing << ": " << i << ", " << j;
        } else if (clear) {
          ASSERT_NEAR(g.at(i, j), -50.0f, 1e-4) << spacing << ": " << i << ", " << j;
        }
      }
    }
  }
}

// A grid turned 30 degrees from true north finds a deep square where it lies.
// The site lies far east of the zone's central meridian, where grid north is
// 3 degrees off true north: a grid turned from the wrong north misses it.
TEST_F(MkgridRaster, TurnedGridPlacesAFeatureWhereItLies) {
  const double transform[6] = {740000, 50, 0, 6105000, 0, -50};
  std::vector<double> values(100 * 100, -10.0);
  for (int r = 20; r < 30; ++r) {
    for (int c = 60; c < 70; ++c)
      values[r * 100 + c] = -500.0;  // x 743000..743500, y 6103500..6104000
  }
  test::writeGeoTiff(file("pit.tif"), 100, 100, transform, kUtm32, values);
  const MadeGrid g = make(
      "--orientation 30 --spacing 50 --extent-proj 740500,6100500,744500,6104500", file("pit.tif"));
  EXPECT_EQ(g.orientation, 30.0);
  NodePlacer nodes(g);
  EXPECT_GT(nodes.map.convergence(g.longitude, g.latitude), 2.5);
  int inPit = 0, around = 0;
  for (int j = 0; j < g.ny; ++j) {
    for (int i = 0; i < g.nx; ++i) {
      double x, y;
      nodes.place(i, j, &x, &y);
      const bool deep = x > 743075 && x < 743425 && y > 6103575 && y < 6103925;
      const bool flat = (x < 742925 || x > 743575 || y < 6103425 || y > 6104075) && x > 740075 &&
                        x < 744925 && y > 6100075 && y < 6104925;
      if (deep) {
        ++inPit;
        ASSERT_NEAR(g.at(i, j), -500.0f, 1e-3) << i << ", " << j;
      } else if (flat) {
        ++around;
        ASSERT_NEAR(g.at(i, j), -10.0f, 1e-3) << i << ", " << j;
      }
    }
  }
  EXPECT_GT(inPit, 25);
  EXPECT_GT(around, 5000);
}

TEST_F(MkgridRaster, BadInputIsNamedAndLeavesNoFile) {
  const double transform[6] = {540000, 100, 0, 6102000, 0, -100};
  test::writeGeoTiff(file("small.tif"), 20, 20, transform, kUtm32, std::vector<double>(400, -5.0));
  test::writeBytes(file("text.tif"), "this is no raster\n");
  const std::string nc = file("one.nc");
  test::makeNc(nc, lonLatCdl(3, 54.0, 3, 8.0));
  test::putValues(nc, "elevation", std::vector<float>(9, 0.0f));
  // A classic NetCDF file cut short after its header: its values would read as zeros.
  const std::string classic = file("cut.nc");
  test::ncgen(classic, "netcdf c {\n" + lonLatCdl(3, 54.0, 3, 8.0) +
                           " elevation = 1, 2, 3, 4, 5, 6, 7, 8, 9 ;\n}\n", "classic");
  std::filesystem::resize_file(classic, std::filesystem::file_size(classic) - 20);
  const std::string tif = quoted(file("small.tif")) + " ";
  const std::pair<std::string, const char*> cases[] = {
      {"-p UTM-32 " + quoted(classic) + " ", "cut.nc: a NetCDF file whose header declares more"},
      // A 209-byte classic header, found by fuzzing, on which the NetCDF library under GDAL
      // crashes while it cleans up after the fault.
      {"-p UTM-32 " +
           quoted(std::string(KARNET_SOURCE_DIR) +
                  "/tests/fuzz/regressions/source_raster_bad_classic_header.nc") +
           " ",
       "source_raster_bad_classic_header.nc: a NetCDF file whose header declares more"},
      // arguments, part of the message
      {quoted(file("text.tif")) + " ", "text.tif: not a raster GDAL reads"},
      {quoted(file("none.tif")) + " ", "cannot open"},
      {"-p UTM-32 --variable depth " + quoted(nc) + " ", "no variable 'depth'"},
      {"--extent-proj 541000,6101000,541000,6101500 " + tif, "is empty"},
      {"--extent-proj 700000,6101000,701000,6101500 " + tif, "no node of the grid gets a value"},
      {"--extent 10,56,9,57 " + tif, "--extent '10,56,9,57' is empty"},
      {"--spacing 0.001 " + tif, "--spacing 0.001,0.001 gives 2000000 x 2000000 nodes"},
      {"--spacing -5 " + tif, "--spacing must be between"},
      {"--resampling magic " + tif, "--resampling is bilinear, average, nearest or cubic"},
      {"--origin-geo 9,55 " + tif, "--origin-geo: "},
      {"-p LOCAL --extent 8,54,9,55 " + tif, "--extent is in degrees"},
      {"--source-crs EPSG:999999 " + tif, "--source-crs 'EPSG:999999'"},
  };
  int code = -1;
  for (const auto& [arguments, expected] : cases) {
    const std::string output = runMkgrid(arguments + quoted(path), &code);
    EXPECT_EQ(code, 1) << arguments;
    EXPECT_NE(output.find(expected), std::string::npos) << arguments << "\n" << output;
    EXPECT_FALSE(std::filesystem::exists(path)) << arguments;
  }
  EXPECT_NE(runMkgrid("--version", &code).find("karnet-mkgrid 1."), std::string::npos);
  EXPECT_EQ(code, 0);
  const std::string help = runMkgrid("--help", &code);
  EXPECT_EQ(code, 0);
  for (const char* option : {"--spacing", "--extent", "--extent-proj", "--variable",
                             "--orientation", "--resampling", "--source-crs", "--land-value",
                             "auto"}) {
    EXPECT_NE(help.find(option), std::string::npos) << option;
  }
}

}  // namespace
}  // namespace karnet
