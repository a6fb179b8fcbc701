// Reading gridded files: which variables are items, axis codes and spacings,
// geographic information, values and statistics, and malformed files.
#include <gtest/gtest.h>

#include <cstring>

#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/nc_test_files.h"

namespace karnet {
namespace {

using test::crs;
using test::makeNc;
using test::plane;

// A file opened for reading, released with the test.
struct Opened {
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  int result = -1;
  explicit Opened(const std::string& path) { result = grdFileRead(path.c_str(), &header, &file); }
  ~Opened() { grdHeaderDestroy(&header); }
  GrdItem* item(int n) const { return grdItemD(header, n); }
  std::vector<double> stats(int n) const {
    double low = 0, high = 0;
    if (grdGetItemStatsGlobal(item(n), &low, &high, nullptr) != 0) return {};
    return {low, high};
  }
  // Axis of a 2-D item: node counts and spacings, or nothing.
  std::vector<double> axes(int n) const {
    std::int32_t j0 = -1, k0 = -1, nx = -1, ny = -1;
    double x0 = -1, y0 = -1;
    float dx = -1, dy = -1;
    if (grdGetItemAxisEqD2(item(n), &j0, &k0, &nx, &ny, &x0, &y0, &dx, &dy) != 0) return {};
    return {double(nx), double(ny), dx, dy};
  }
  std::vector<float> readStep(std::size_t count, double* time) const {
    std::vector<float> data(count, -7.0f);
    if (grdReadItemTimeStep(header, file, time, data.data()) != 0) return {};
    return data;
  }
};

class GridFileRead : public test::ScratchTest {};

// Every data variable is an item, whatever its shape or type; coordinate and
// grid-mapping variables are not. Only numeric 2-D and 3-D grids get a code.
TEST_F(GridFileRead, ItemsAndAxisCodes) {
  makeNc(path, "dimensions: z = 4; y = 3; x = 5; w = 2;\n"
               "variables: double x(x); x:spacing = 10.; double y(y); y:spacing = 20.;\n"
               "double z(z); z:spacing = 2.; double w(w); w:spacing = 1.;\n"
               "float flat(y, x); flat:grid_mapping = \"geo\";\n" + crs("crs") +
               crs("geo", "UTM-33") +
               "double cube(z, y, x); float line(x); float four(w, z, y, x); char letters(y, x);\n"
               "float y2(y, x);");  // named like a dimension, but data
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  ASSERT_EQ(grdGetNoOfItems(f.header), 6);
  const int codes[] = {5, 10, 0, 0, 0, 5};
  for (int n = 1; n <= 6; ++n) EXPECT_EQ(grdGetItemAxisType(f.item(n)), codes[n - 1]) << n;
  EXPECT_EQ(f.axes(1), std::vector<double>({5, 3, 10, 20}));
  EXPECT_TRUE(f.axes(2).empty());  // the 2-D form does not describe a cube
  // Item 1 names its grid mapping "geo": that one gives the geographic information.
  std::string projection;
  double lon = 0, lat = 0, orient = 0;
  ASSERT_EQ(grdGetGeoInfoUTMProj(f.header, &projection, &lon, &lat, &orient), 0);
  EXPECT_EQ(projection, "UTM-33");
  EXPECT_EQ(std::vector<double>({lon, lat, orient}), std::vector<double>({10, 20, 0}));
}

// The y spacing of a (y, x) item from the y coordinate's spacing attribute or
// from evenly stepped coordinate values; anything else makes no grid.
TEST_F(GridFileRead, Spacing) {
  struct Case {
    const char* name;
    int ny;
    std::string coordinate, data;  // CDL of the y coordinate and of its values
    int code;
    double dy;
  };
  const Case cases[] = {
      {"even steps", 4, "double y(y);", "y = 0, 2.5, 5.000000001, 7.5;", 5, 2.5},
      {"attribute wins over uneven steps", 3, "double y(y); y:spacing = 7.;", "y = 0, 1, 5;", 5, 7},
      {"uneven steps", 3, "double y(y);", "y = 0, 1, 3;", 0, 0},
      {"decreasing steps", 3, "double y(y);", "y = 10, 5, 0;", 0, 0},
      {"one node without a coordinate", 1, "", "", 5, 0},
      {"two nodes without a coordinate", 2, "", "", 0, 0},
      {"zero spacing", 3, "double y(y); y:spacing = 0.;", "", 0, 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    makeNc(path, "dimensions: y = " + std::to_string(c.ny) + "; x = 3;\n"
                 "variables: double x(x); x:spacing = 1.; float depth(y, x); " + c.coordinate +
                 (c.data.empty() ? "" : "\ndata: " + c.data));
    Opened f(path);
    ASSERT_EQ(f.result, 0);
    EXPECT_EQ(grdGetItemAxisType(f.item(1)), c.code);
    if (c.code == 5) {
      EXPECT_EQ(f.axes(1), std::vector<double>({3, double(c.ny), 1, c.dy}));
    }
  }
}

// Item 1 of a (2, 3) file without time: values x fastest, one step only, and
// statistics that skip fill values, -1e-30 and NaN.
TEST_F(GridFileRead, ValuesAndStatistics) {
  struct Case {
    const char* name;
    std::string variable, data;  // CDL
    std::vector<float> read;     // empty: not compared
    std::vector<double> stats;
  };
  const Case cases[] = {
      {"packed short with fill",
       "short v(y, x); v:_FillValue = -32768s; v:scale_factor = 0.5; v:add_offset = -100.;",
       "0, 10, -32768, 400, 2, 4", {-100, -95, -32768, 100, -99, -98}, {-100, 100}},
      {"only fill values", "float v(y, x); v:_FillValue = 5.f;", "5, 5, 5, 5, 5, 5", {}, {5, 5}},
      {"no fill: -1e-30 and NaN are no values", "float v(y, x);", "-1e-30, NaN, -3, 2, 1, 0", {},
       {-3, 2}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    makeNc(path, plane(2, 3) + c.variable + "\ndata: v = " + c.data + ";");
    Opened f(path);
    ASSERT_EQ(f.result, 0);
    EXPECT_EQ(f.stats(1), c.stats);
    ASSERT_EQ(grdFindBlockDynamic(f.header, f.file), 0);
    double time = -1;
    const std::vector<float> data = f.readStep(6, &time);
    ASSERT_EQ(data.size(), 6u);
    EXPECT_EQ(time, 0.0);
    EXPECT_TRUE(c.read.empty() || data == c.read) << testing::PrintToString(data);
    EXPECT_TRUE(f.readStep(6, &time).empty());

    // Both at once, from one reading: the same statistics and values.
    Opened g(path);
    std::vector<float> both(6, -7.0f);
    double low = 0, high = 0;
    ASSERT_EQ(grdReadItemStatsAndFirstStep(g.header, g.file, &low, &high, &time, both.data()), 0);
    EXPECT_EQ((std::vector<double>{low, high}), c.stats);
    EXPECT_EQ(std::memcmp(both.data(), data.data(), sizeof(float) * 6), 0);
  }
}

// With several time steps the statistics go over all of them, the values are
// the first step's.
TEST_F(GridFileRead, StatisticsOfEveryStepWithTheFirstStepsValues) {
  makeNc(path, "dimensions: time = UNLIMITED; y = 2; x = 2;\n"
               "variables: double time(time); time:units = \"seconds since 2000-01-01\";\n"
               "double y(y); double x(x); float v(time, y, x);\n"
               "data: time = 0, 60; y = 0, 1; x = 0, 1; v = 1, 2, 3, 4, -5, 6, 7, 80;");
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  std::vector<float> first(4, -7.0f);
  double low = 0, high = 0, time = -1;
  ASSERT_EQ(grdReadItemStatsAndFirstStep(f.header, f.file, &low, &high, &time, first.data()), 0);
  EXPECT_EQ(low, -5.0);
  EXPECT_EQ(high, 80.0);
  EXPECT_EQ(first, (std::vector<float>{1, 2, 3, 4}));
}

// Items larger than one read: values arrive complete and in order whether the
// item is cut into rows or a row into pieces.
TEST_F(GridFileRead, LargeItemsAreReadPieceByPiece) {
  const std::size_t wideX = (std::size_t{1} << 20) + 7, tallX = 1500, tallY = 800;
  std::vector<float> tall(tallX * tallY), wide(wideX * 2);
  for (std::size_t i = 0; i < tall.size(); ++i) tall[i] = static_cast<float>(i % 65536);
  for (std::size_t i = 0; i < wide.size(); ++i) wide[i] = static_cast<float>(i % 4099) - 9.0f;
  tall[tallX * 799 + 3] = 70000.0f;
  makeNc(path, "dimensions: y = 800; x = 1500; wy = 2; wx = " + std::to_string(wideX) +
                   ";\nvariables: double x(x); double y(y); double wx(wx); double wy(wy);\n"
                   "x:spacing = 1.; y:spacing = 1.; wx:spacing = 1.; wy:spacing = 1.;\n"
                   "float tall(y, x); float wide(wy, wx);");
  test::putValues(path, "tall", tall);
  test::putValues(path, "wide", wide);
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  EXPECT_EQ(f.stats(1), std::vector<double>({0, 70000}));
  EXPECT_EQ(f.stats(2), std::vector<double>({-9, 4089}));
  EXPECT_TRUE(f.readStep(tall.size(), nullptr) == tall);
}

TEST_F(GridFileRead, MalformedFiles) {
  test::writeBytes(file("text.nc"), "netcdf looks like this but is not\n");
  makeNc(path, plane(100, 100) + "float depth(y, x);");
  test::putValues(path, "depth", std::vector<float>(10000, -3.0f));
  const std::string whole = test::readBytes(path);
  test::writeBytes(file("cut.nc"), whole.substr(0, whole.size() / 2));
  // Each refusal says why, in words for the user.
  const std::pair<std::string, const char*> cases[] = {
      {file("missing.nc"), "No such file or directory"},
      {file("text.nc"), "cannot be read as NetCDF: "},
      {file("cut.nc"), "cannot be read as NetCDF: "},
      {dir, "not a regular file"},
      {"", "no file name"},
  };
  for (const auto& [bad, why] : cases) {
    GrdHeader* header = reinterpret_cast<GrdHeader*>(this);
    GrdFile* handle = reinterpret_cast<GrdFile*>(this);
    std::string reason;
    EXPECT_NE(grdFileRead(bad.c_str(), &header, &handle, &reason), 0) << bad;
    EXPECT_EQ(header, nullptr) << bad;
    EXPECT_EQ(handle, nullptr) << bad;
    EXPECT_NE(reason.find(why), std::string::npos) << bad << ": " << reason;
  }
}

}  // namespace
}  // namespace karnet
