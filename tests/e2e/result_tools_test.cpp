// Results opened with the tools users place them with: GDAL, CDO, xarray. Each test skips
// when its tool is not installed.
#include <gtest/gtest.h>
#include <netcdf.h>
#include <proj.h>

#include <cmath>
#include <filesystem>
#include <numbers>
#include <sstream>

#include "common/utm32_reference.h"
#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

constexpr double kDeg = test::kDegree;
constexpr double kLon0 = 11.3, kLat0 = 55.2;
constexpr int kNx = 40, kNy = 30;
constexpr double kCell = 250.0;

bool haveTool(const char* path) { return std::filesystem::exists(path); }
bool havePythonModule(const char* module) {
  return haveTool("/usr/bin/python3") &&
         runProgram("/usr/bin/python3", {"-c", std::string("import ") + module}, "/").exitCode ==
             0;
}

using test::Utm32;

// Temperature that falls with depth only: 20 degrees at the surface, 10 at 500 m.
double temperature(double depth) { return 20.0 - depth / 50.0; }

// A 40 x 30 node UTM-32 basin, 610 m deep with a land strip along its west side, turned
// `turn` degrees against the projection's north, and casts every fourth node down to 575 m.
// The levels lie every 25 m from 600 m up to 25 m.
void writeUtmCase(const TempDir& dir, double turn, const std::string& projection = "'UTM-32'") {
  const Utm32 utm;
  BathymetrySpec b;
  b.nx = kNx;
  b.ny = kNy;
  b.spacing = kCell;
  b.projection = "UTM-32";
  b.originLongitude = kLon0;
  b.originLatitude = kLat0;
  b.orientation = utm.convergence(kLon0, kLat0) + turn;
  b.heights.assign(kNx * kNy, -610.0f);
  for (int j = 0; j < kNy; ++j) b.heights[j * kNx] = 10.0f;
  writeBathymetry(dir.file("bathymetry.nc"), b);

  const PJ_XY origin = utm.forward(kLon0, kLat0);
  const double a = turn * kDeg;
  std::ostringstream obs;
  obs.precision(17);
  for (int j = 0; j < kNy; j += 4) {
    for (int i = 2; i < kNx; i += 4) {
      const double xt = kCell * i, yt = kCell * j;
      const double x = origin.x + xt * std::cos(a) + yt * std::sin(a);
      const double y = origin.y - xt * std::sin(a) + yt * std::cos(a);
      for (int k = 1; k <= 23; ++k) {
        obs << x << ' ' << y << ' ' << -25.0 * k << ' ' << temperature(25.0 * k) << '\n';
      }
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  ParameterFile p;
  p.projection = projection;
  p.zRange = "0, 23";
  p.spacing = "25";
  p.searchRadius = "3000";
  p.maxExtrapolationDistance = "30, 30";
  p.filterOperations = "0";
  writeFile(dir.file("case.pfs"), p.render());
}

void runQuietly(const TempDir& dir) {
  const CaseRun r = runCase(dir, {"--quiet", "case.pfs"});
  ASSERT_EQ(r.exitCode, 0) << r.log << r.err;
}

std::vector<double> numbers(const std::string& text) {
  std::istringstream in(text);
  std::vector<double> out;
  double v;
  while (in >> v) out.push_back(v);
  return out;
}

TEST(ResultTools, GdalPlacesAnUnrotatedUtmResult) {
  if (!havePythonModule("osgeo.gdal")) GTEST_SKIP() << "GDAL's Python bindings not installed";
  TempDir dir;
  writeUtmCase(dir, 0.0);
  runQuietly(dir);
  // GDAL's corners of the grid (cell edges, half a cell beyond the outer nodes) in WGS 84.
  const ProcessResult gdal = runProgram(
      "/usr/bin/python3",
      {"-c",
       "from osgeo import gdal, osr\n"
       "gdal.UseExceptions()\n"
       "ds = gdal.Open('NETCDF:\"result.nc\":Temperature')\n"
       "gt = ds.GetGeoTransform()\n"
       "src = ds.GetSpatialRef(); dst = osr.SpatialReference(); dst.ImportFromEPSG(4326)\n"
       "for s in (src, dst): s.SetAxisMappingStrategy(osr.OAMS_TRADITIONAL_GIS_ORDER)\n"
       "t = osr.CoordinateTransformation(src, dst)\n"
       "print(ds.RasterXSize, ds.RasterYSize)\n"
       "for px, py in ((0, 0), (ds.RasterXSize, 0), (0, ds.RasterYSize),\n"
       "               (ds.RasterXSize, ds.RasterYSize)):\n"
       "    x = gt[0] + px * gt[1] + py * gt[2]; y = gt[3] + px * gt[4] + py * gt[5]\n"
       "    lon, lat, _ = t.TransformPoint(x, y)\n"
       "    print('%.12f %.12f' % (lon, lat))\n"},
      dir.path());
  ASSERT_EQ(gdal.exitCode, 0) << gdal.err;
  const std::vector<double> v = numbers(gdal.out);
  ASSERT_EQ(v.size(), 10u) << gdal.out;
  EXPECT_EQ(v[0], kNx);
  EXPECT_EQ(v[1], kNy);
  const Utm32 utm;
  const PJ_XY o = utm.forward(kLon0, kLat0);
  const double west = o.x - kCell / 2, east = o.x + kCell * (kNx - 0.5);
  const double south = o.y - kCell / 2, north = o.y + kCell * (kNy - 0.5);
  const PJ_XY corners[4] = {utm.inverse(west, north), utm.inverse(east, north),
                            utm.inverse(west, south), utm.inverse(east, south)};
  for (int c = 0; c < 4; ++c) {
    EXPECT_NEAR(v[2 + 2 * c], corners[c].x, 1e-6) << "corner " << c;
    EXPECT_NEAR(v[3 + 2 * c], corners[c].y, 1e-6) << "corner " << c;
  }
}

TEST(ResultTools, CdoCutsAndRemapsAnUnrotatedResultByLongitudeAndLatitude) {
  if (!haveTool("/usr/bin/cdo")) GTEST_SKIP() << "cdo not installed";
  TempDir dir;
  writeUtmCase(dir, 0.0);
  runQuietly(dir);
  const std::vector<double> lon = readVariable(dir.file("result.nc"), "lon");
  const std::vector<double> lat = readVariable(dir.file("result.nc"), "lat");
  ASSERT_EQ(lon.size(), static_cast<std::size_t>(kNx * kNy));
  // A box around the middle of the grid.
  const double lon1 = lon[15 * kNx + 10], lon2 = lon[15 * kNx + 30];
  const double lat1 = lat[5 * kNx + 20], lat2 = lat[25 * kNx + 20];
  std::ostringstream box;
  box.precision(10);
  box << "-sellonlatbox," << lon1 << ',' << lon2 << ',' << lat1 << ',' << lat2;
  const ProcessResult cut =
      runProgram("/usr/bin/cdo", {"-s", box.str(), "result.nc", "cut.nc"}, dir.path());
  ASSERT_EQ(cut.exitCode, 0) << cut.err;
  const std::vector<double> cutLon = readVariable(dir.file("cut.nc"), "lon");
  const std::vector<double> cutLat = readVariable(dir.file("cut.nc"), "lat");
  ASSERT_FALSE(cutLon.empty());
  EXPECT_LT(cutLon.size(), lon.size());
  for (std::size_t n = 0; n < cutLon.size(); ++n) {
    EXPECT_TRUE(cutLon[n] > lon1 - 0.01 && cutLon[n] < lon2 + 0.01) << cutLon[n];
    EXPECT_TRUE(cutLat[n] > lat1 - 0.01 && cutLat[n] < lat2 + 0.01) << cutLat[n];
  }

  // Bilinear remapping onto a 5 x 5 lon/lat grid inside the basin keeps the layers.
  writeFile(dir.file("target.txt"),
            "gridtype = lonlat\nxsize = 5\nysize = 5\nxfirst = " + std::to_string(lon1) +
                "\nxinc = " + std::to_string((lon2 - lon1) / 5) +
                "\nyfirst = " + std::to_string(lat1) +
                "\nyinc = " + std::to_string((lat2 - lat1) / 5) + "\n");
  const ProcessResult remap = runProgram(
      "/usr/bin/cdo", {"-s", "remapbil,target.txt", "result.nc", "remapped.nc"}, dir.path());
  ASSERT_EQ(remap.exitCode, 0) << remap.err;
  const std::vector<double> t = readVariable(dir.file("remapped.nc"), "Temperature");
  ASSERT_EQ(t.size(), 24u * 25u);
  // z index 4 is the level at (24 - 4) * 25 = 500 m.
  for (int n = 0; n < 25; ++n) EXPECT_NEAR(t[4 * 25 + n], temperature(500.0), 1e-3) << n;
}

TEST(ResultTools, TurnedResultIsPlacedThroughItsGeolocationArrays) {
  if (!haveTool("/usr/bin/gdalinfo") || !haveTool("/usr/bin/gdalwarp")) {
    GTEST_SKIP() << "gdalinfo or gdalwarp not installed";
  }
  TempDir dir;
  writeUtmCase(dir, 25.0);
  runQuietly(dir);

  // The run records the orientation it was given (the convergence at the origin and the
  // turn); where its nodes lie along the turned axes is checked with the result writer's
  // coordinates.
  const Utm32 utm;
  const std::vector<double> lon = readVariable(dir.file("result.nc"), "lon");
  const std::vector<double> lat = readVariable(dir.file("result.nc"), "lat");
  ASSERT_EQ(lon.size(), static_cast<std::size_t>(kNx * kNy));
  double orientation = 0.0;
  {
    int nc = 0, crs = 0;
    ASSERT_EQ(nc_open(dir.file("result.nc").c_str(), NC_NOWRITE, &nc), NC_NOERR);
    ASSERT_EQ(nc_inq_varid(nc, "crs", &crs), NC_NOERR);
    ASSERT_EQ(nc_get_att_double(nc, crs, "orientation", &orientation), NC_NOERR);
    nc_close(nc);
  }
  EXPECT_NEAR(orientation - utm.convergence(kLon0, kLat0), 25.0, 1e-5);

  const ProcessResult info =
      runProgram("/usr/bin/gdalinfo", {"NETCDF:result.nc:Temperature"}, dir.path());
  ASSERT_EQ(info.exitCode, 0) << info.err;
  EXPECT_NE(info.out.find("Geolocation:"), std::string::npos) << info.out;
  EXPECT_NE(info.out.find("X_DATASET=NETCDF:\"result.nc\":lon"), std::string::npos) << info.out;
  // No projection: GDAL does not place the grid through x and y.
  EXPECT_EQ(info.out.find("Origin = "), std::string::npos) << info.out;
  EXPECT_EQ(info.out.find("PROJCRS"), std::string::npos) << info.out;

  const ProcessResult warp =
      runProgram("/usr/bin/gdalwarp", {"-q", "-geoloc", "-t_srs", "EPSG:4326",
                                       "NETCDF:result.nc:Temperature", "warped.tif"},
                 dir.path());
  ASSERT_EQ(warp.exitCode, 0) << warp.err;
  const ProcessResult warped = runProgram("/usr/bin/gdalinfo", {"warped.tif"}, dir.path());
  ASSERT_EQ(warped.exitCode, 0) << warped.err;
  EXPECT_NE(warped.out.find("GEOGCRS[\"WGS 84\""), std::string::npos) << warped.out;
  // The lon/lat raster spans the nodes' longitudes and latitudes.
  const auto origin = warped.out.find("Origin = (");
  ASSERT_NE(origin, std::string::npos) << warped.out;
  double west = 0, north = 0;
  ASSERT_EQ(std::sscanf(warped.out.c_str() + origin, "Origin = (%lf,%lf)", &west, &north), 2);
  EXPECT_NEAR(west, *std::min_element(lon.begin(), lon.end()), 0.01);
  EXPECT_NEAR(north, *std::max_element(lat.begin(), lat.end()), 0.01);
}

// Observations in zone 32 run as zone 33 lie hundreds of kilometres away from the grid:
// the run completes, but says so.
TEST(ResultTools, WrongZoneRunWarnsToCheckTheProjection) {
  TempDir dir;
  writeUtmCase(dir, 0.0, "'UTM-33'");
  const ProcessResult wrong = runKarnet({"case.pfs"}, dir.path(), kBatch);
  EXPECT_EQ(wrong.exitCode, 0);
  EXPECT_NE(wrong.err.find("karnet: warning: only 0 of 1840 observations lie inside the grid: "
                           "check the projection\n"),
            std::string::npos)
      << wrong.err;
  EXPECT_NE(wrong.err.find("1840 outside the grid"), std::string::npos) << wrong.err;
  // Quiet runs are still warned.
  const ProcessResult quiet = runKarnet({"--quiet", "case.pfs"}, dir.path(), kBatch);
  EXPECT_NE(quiet.err.find("check the projection"), std::string::npos) << quiet.err;

  writeUtmCase(dir, 0.0);
  const ProcessResult right = runKarnet({"case.pfs"}, dir.path(), kBatch);
  EXPECT_EQ(right.exitCode, 0);
  EXPECT_EQ(right.err.find("warning"), std::string::npos) << right.err;
  // Casts at 10 x 8 nodes (every fourth, clear of the land column), 23 levels each.
  EXPECT_NE(right.err.find("1840 read, 1840 used"), std::string::npos) << right.err;
}

// The result records when and how it was made: the time from SOURCE_DATE_EPOCH (which makes
// repeated runs give the same bytes, as the threaded runs compare them) and the command line.
TEST(ResultTools, HistoryRecordsTheTimeAndTheCommandLine) {
  TempDir dir;
  writeUtmCase(dir, 25.0);
  std::map<std::string, std::string> env = kBatch;
  env["SOURCE_DATE_EPOCH"] = "1700000000";
  ASSERT_EQ(runKarnet({"--quiet", "case.pfs"}, dir.path(), env).exitCode, 0);
  const ProcessResult header = runProgram("/usr/bin/ncdump", {"-h", "result.nc"}, dir.path());
  EXPECT_NE(header.out.find(":history = \"2023-11-14T22:13:20Z: " KARNET_BINARY
                            " --quiet case.pfs\" ;"),
            std::string::npos)
      << header.out;
}

}  // namespace
}  // namespace karnet::e2e
