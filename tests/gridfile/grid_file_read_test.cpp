// Reading gridded files: which variables are items, axis codes and spacings,
// values and statistics, geographic information, custom blocks and bad files.
#include <gtest/gtest.h>

#include <string>
#include <utility>
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
    EXPECT_EQ(std::vector<double>({double(j0), double(k0), x0, y0}), std::vector<double>(4, 0.0));
    return {double(nx), double(ny), dx, dy};
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
               "float y2(y, x);\n"  // named like a dimension, but data
               ":Q84_Misc = 1.;");  // not a float: no custom block
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  ASSERT_EQ(grdGetNoOfItems(f.header), 6);
  const int codes[] = {5, 10, 0, 0, 0, 5};
  for (int n = 1; n <= 6; ++n) EXPECT_EQ(grdGetItemAxisType(f.item(n)), codes[n - 1]) << n;
  for (int n : {0, -1, 7}) EXPECT_EQ(f.item(n), nullptr) << n;
  EXPECT_EQ(grdGetItemAxisType(nullptr), 0);
  EXPECT_EQ(f.axes(1), std::vector<double>({5, 3, 10, 20}));
  EXPECT_TRUE(f.axes(2).empty());  // the 2-D form does not describe a cube
  // Item 1 names its grid mapping "geo": that one gives the geographic information.
  std::string projection;
  double lon = 0, lat = 0, orient = 0;
  ASSERT_EQ(grdGetGeoInfoUTMProj(f.header, &projection, &lon, &lat, &orient), 0);
  EXPECT_EQ(projection, "UTM-33");
  GrdCustomBlock* block = reinterpret_cast<GrdCustomBlock*>(&f);
  EXPECT_NE(grdGetCustomBlockRef(f.header, &block), 0);
  EXPECT_EQ(block, nullptr);
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
      {"one node with a coordinate", 1, "double y(y);", "y = 0;", 5, 0},
      {"one node without a coordinate", 1, "", "", 5, 0},
      {"two nodes without a coordinate", 2, "", "", 0, 0},
      {"zero spacing", 3, "double y(y); y:spacing = 0.;", "", 0, 0},
      {"negative spacing", 3, "double y(y); y:spacing = -2.;", "", 0, 0},
      {"text spacing", 3, "double y(y); y:spacing = \"ten\";", "", 0, 0},
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
      {"int", "int v(y, x);", "0, 1, 2, 10, 11, 12", {0, 1, 2, 10, 11, 12}, {0, 12}},
      {"packed short with fill",
       "short v(y, x); v:_FillValue = -32768s; v:scale_factor = 0.5; v:add_offset = -100.;",
       "0, 10, -32768, 400, 2, 4", {-100, -95, -32768, 100, -99, -98}, {-100, 100}},
      {"only fill values", "float v(y, x); v:_FillValue = 5.f;", "5, 5, 5, 5, 5, 5",
       {5, 5, 5, 5, 5, 5}, {5, 5}},
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
    std::vector<float> data(6, -7.0f);
    double time = -1;
    ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, &time, data.data()), 0);
    EXPECT_EQ(time, 0.0);
    EXPECT_TRUE(c.read.empty() || data == c.read) << testing::PrintToString(data);
    EXPECT_NE(grdReadItemTimeStep(f.header, f.file, &time, data.data()), 0);
  }
}

TEST_F(GridFileRead, TimeStepsInOrderWithTheirTimes) {
  makeNc(path, "dimensions: time = UNLIMITED; y = 1; x = 2;\n"
               "variables: double time(time); double x(x); x:spacing = 3.; double y(y); "
               "y:spacing = 3.;\nfloat temp(time, y, x); temp:_FillValue = -99.f;\n"
               "data: time = 0, 3600; temp = 1, 2, -99, 40;");
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(1)), 5);
  EXPECT_EQ(f.stats(1), std::vector<double>({1, 40}));  // over every step, fill skipped
  for (int pass = 0; pass < 2; ++pass) {  // finding the block again starts anew
    ASSERT_EQ(grdFindBlockDynamic(f.header, f.file), 0);
    std::vector<float> data(2);
    double time = -1;
    ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, &time, data.data()), 0);
    EXPECT_EQ(time, 0.0);
    EXPECT_EQ(data, std::vector<float>({1, 2}));
    ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, &time, data.data()), 0);
    EXPECT_EQ(time, 3600.0);
    EXPECT_EQ(data, std::vector<float>({-99, 40}));
    EXPECT_NE(grdReadItemTimeStep(f.header, f.file, &time, data.data()), 0);
  }
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
  std::vector<float> data(tall.size());
  ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, nullptr, data.data()), 0);
  EXPECT_TRUE(data == tall);
}

// The grid mapping's four attributes; each missing or of the wrong kind, or
// the variable missing, fails.
TEST_F(GridFileRead, GeographicInformation) {
  const std::string full = crs("crs", "UTM-32", 9.5, 55.25, 12.5);
  const auto with = [&](const std::string& from, const std::string& to) {
    std::string text = full;
    return text.replace(text.find(from), from.size(), to);
  };
  const std::pair<const char*, std::string> cases[] = {
      {"complete", full},
      {"no projection", with("crs:projection = \"UTM-32\";", "")},
      {"no longitude", with("crs:origin_longitude = 9.5;", "")},
      {"no latitude", with("crs:origin_latitude = 55.25;", "")},
      {"no orientation", with("crs:orientation = 12.5;", "")},
      {"text orientation", with("crs:orientation = 12.5;", "crs:orientation = \"12\";")},
      {"two longitudes", with("crs:origin_longitude = 9.5;", "crs:origin_longitude = 1., 2.;")},
      {"no variable", ""},
  };
  for (const auto& [name, mapping] : cases) {
    SCOPED_TRACE(name);
    makeNc(path, "dimensions: y = 1; x = 1;\nvariables: float depth(y, x);\n" + mapping);
    Opened f(path);
    ASSERT_EQ(f.result, 0);
    EXPECT_EQ(grdGetItemAxisType(f.item(1)), 5);
    std::string projection;
    double lon = 0, lat = 0, orient = 0;
    const int result = grdGetGeoInfoUTMProj(f.header, &projection, &lon, &lat, &orient);
    if (mapping != full) {
      EXPECT_NE(result, 0);
      continue;
    }
    ASSERT_EQ(result, 0);
    EXPECT_EQ(projection, "UTM-32");
    EXPECT_EQ(std::vector<double>({lon, lat, orient}), std::vector<double>({9.5, 55.25, 12.5}));
  }
}

// Float global attributes are the custom blocks, in file order.
TEST_F(GridFileRead, CustomBlocks) {
  makeNc(path, "dimensions: y = 1; x = 1;\nvariables: float depth(y, x);\n"
               ":Conventions = \"CF-1.8\"; :First = 1.5f, 2.5f; :NotAFloat = 3.; "
               ":Q84_Misc = 7.f, 8.f, 9.f;");
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  GrdCustomBlock* block = nullptr;
  ASSERT_EQ(grdGetCustomBlockRef(f.header, &block), 0);
  std::vector<std::string> names;
  std::vector<std::vector<float>> values;
  while (block != nullptr) {
    std::int32_t type = 0, count = 0;
    const char* name = nullptr;
    const float* v = nullptr;
    ASSERT_EQ(grdGetCustomBlock(block, &type, &name, &count, &v, &block), 0);
    EXPECT_EQ(type, 1);
    names.push_back(name);
    values.emplace_back(v, v + count);
  }
  EXPECT_EQ(names, (std::vector<std::string>{"First", "Q84_Misc"}));
  EXPECT_EQ(values, (std::vector<std::vector<float>>{{1.5f, 2.5f}, {7, 8, 9}}));
  EXPECT_NE(grdGetCustomBlock(nullptr, nullptr, nullptr, nullptr, nullptr, nullptr), 0);
}

TEST_F(GridFileRead, BadFilesAndForeignHandles) {
  test::writeBytes(dir.file("text.nc"), "netcdf looks like this but is not\n");
  test::writeBytes(dir.file("empty.nc"), "");
  test::writeBytes(dir.file("hdf.nc"), std::string("\x89HDF\r\n\x1a\n", 8) + "garbage");
  makeNc(path, plane(100, 100) + "float depth(y, x);");
  test::putValues(path, "depth", std::vector<float>(10000, -3.0f));
  const std::string whole = test::readBytes(path);
  test::writeBytes(dir.file("cut.nc"), whole.substr(0, whole.size() / 2));
  for (const std::string& bad :
       {dir.file("missing.nc"), dir.file("text.nc"), dir.file("empty.nc"), dir.file("hdf.nc"),
        dir.file("cut.nc"), dir.path(), std::string()}) {
    GrdHeader* header = reinterpret_cast<GrdHeader*>(&dir);
    GrdFile* file = reinterpret_cast<GrdFile*>(&dir);
    EXPECT_NE(grdFileRead(bad.c_str(), &header, &file), 0) << bad;
    EXPECT_EQ(header, nullptr) << bad;
    EXPECT_EQ(file, nullptr) << bad;
  }
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  EXPECT_NE(grdFileRead(nullptr, &header, &file), 0);

  // Handles of another opening, or a header from reading used for writing.
  Opened a(path), b(path);
  ASSERT_EQ(a.result + b.result, 0);
  std::vector<float> data(10000);
  EXPECT_NE(grdFindBlockDynamic(a.header, b.file), 0);
  EXPECT_NE(grdReadItemTimeStep(a.header, b.file, nullptr, data.data()), 0);
  EXPECT_NE(grdReadItemTimeStep(a.header, a.file, nullptr, nullptr), 0);
  EXPECT_EQ(grdReadItemTimeStep(a.header, a.file, nullptr, data.data()), 0);
  EXPECT_NE(grdSetDeleteValFloat(a.header, 1.0f), 0);
  EXPECT_NE(grdAddCustomBlock(a.header, 1, "X", 0, nullptr), 0);
  EXPECT_NE(grdFileCreate(dir.file("copy.nc").c_str(), a.header, &file), 0);
}

// Dimensions whose product exceeds what a grid can hold are no grid at all,
// and nothing tries to allocate them.
TEST_F(GridFileRead, AbsurdDimensions) {
  makeNc(path, "dimensions: y = 70000; x = 70000; z = UNLIMITED;\nvariables: double x(x); "
               "x:spacing = 1.; double y(y); y:spacing = 1.; float huge(y, x); float none(z, x);");
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(1)), 0);
  EXPECT_TRUE(f.axes(1).empty());
  EXPECT_TRUE(f.stats(1).empty());
  float one = 0;
  EXPECT_NE(grdReadItemTimeStep(f.header, f.file, nullptr, &one), 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(2)), 0);
}

}  // namespace
}  // namespace karnet
