// Reading gridded files: which variables are items, axis codes and spacings,
// geographic information, custom blocks, statistics, values and bad files.
#include <gtest/gtest.h>
#include <netcdf.h>

#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/nc_test_files.h"

namespace karnet {
namespace {

using test::NcBuilder;
using test::ScratchDir;
using test::steps;

// A file opened for reading, released with the test.
struct Opened {
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  int result = -1;
  explicit Opened(const std::string& path) { result = grdFileRead(path.c_str(), &header, &file); }
  ~Opened() { grdHeaderDestroy(&header); }
  GrdItem* item(int n) const { return grdItemD(header, n); }
};

struct Axes {
  std::int32_t j0 = -1, k0 = -1, nx = -1, ny = -1;
  double x0 = -1, y0 = -1;
  float dx = -1, dy = -1;
  int result = -1;
};

Axes axesOf(GrdItem* item) {
  Axes a;
  a.result = grdGetItemAxisEqD2(item, &a.j0, &a.k0, &a.nx, &a.ny, &a.x0, &a.y0, &a.dx, &a.dy);
  return a;
}

// ---- which variables are items --------------------------------------------

TEST(GridFileReadItems, CoordinatesAndGridMappingsAreNoItems) {
  ScratchDir dir;
  const std::string path = dir.file("items.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 2), x = nc.dim("x", 3);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    const int a = nc.var("alpha", NC_FLOAT, {y, x});
    nc.text(a, "grid_mapping", "geo");
    nc.crs("geo");
    nc.crs("crs");
    nc.var("beta", NC_DOUBLE, {y, x});
    // A variable named like a dimension but with two dimensions is data.
    nc.var("y2", NC_FLOAT, {y, x});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  ASSERT_EQ(grdGetNoOfItems(f.header), 3);
  EXPECT_NE(f.item(1), nullptr);
  EXPECT_EQ(f.item(4), nullptr);
  EXPECT_EQ(f.item(0), nullptr);
  EXPECT_EQ(f.item(-1), nullptr);
  // Item 1 is alpha: its grid mapping "geo" carries the geographic information.
  std::string projection;
  double lon = 0, lat = 0, orient = 0;
  ASSERT_EQ(grdGetGeoInfoUTMProj(f.header, &projection, &lon, &lat, &orient), 0);
  EXPECT_EQ(projection, "LOCAL");
}

TEST(GridFileReadItems, AxisCodesByShape) {
  ScratchDir dir;
  const std::string path = dir.file("shapes.nc");
  {
    NcBuilder nc(path);
    const int z = nc.dim("z", 4), y = nc.dim("y", 3), x = nc.dim("x", 5), w = nc.dim("w", 2);
    nc.coordinate("x", x, 10.0);
    nc.coordinate("y", y, 20.0);
    nc.coordinate("z", z, 2.0);
    nc.coordinate("w", w, 1.0);
    nc.var("flat", NC_FLOAT, {y, x});
    nc.var("cube", NC_FLOAT, {z, y, x});
    nc.var("line", NC_FLOAT, {x});
    nc.var("four", NC_FLOAT, {w, z, y, x});
    nc.var("letters", NC_CHAR, {y, x});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  ASSERT_EQ(grdGetNoOfItems(f.header), 5);
  EXPECT_EQ(grdGetItemAxisType(f.item(1)), 5);
  EXPECT_EQ(grdGetItemAxisType(f.item(2)), 10);
  EXPECT_EQ(grdGetItemAxisType(f.item(3)), 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(4)), 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(5)), 0);
  EXPECT_EQ(grdGetItemAxisType(nullptr), 0);

  const Axes flat = axesOf(f.item(1));
  EXPECT_EQ(flat.result, 0);
  EXPECT_EQ(flat.j0, 0);
  EXPECT_EQ(flat.k0, 0);
  EXPECT_EQ(flat.nx, 5);
  EXPECT_EQ(flat.ny, 3);
  EXPECT_EQ(flat.x0, 0.0);
  EXPECT_EQ(flat.y0, 0.0);
  EXPECT_EQ(flat.dx, 10.0f);
  EXPECT_EQ(flat.dy, 20.0f);
  // The 2-D form of the axis does not describe a 3-D item.
  EXPECT_NE(axesOf(f.item(2)).result, 0);
}

TEST(GridFileReadItems, SpacingFromAttributeOrFromEvenSteps) {
  ScratchDir dir;
  const std::string path = dir.file("spacing.nc");
  {
    NcBuilder nc(path);
    const int a = nc.dim("a", 4), b = nc.dim("b", 3), c = nc.dim("c", 3), d = nc.dim("d", 3),
              e = nc.dim("e", 1), g = nc.dim("g", 1), h = nc.dim("h", 2);
    const int av = nc.coordinate("a", a);     // even values, no attribute
    const int bv = nc.coordinate("b", b, 7);  // attribute wins over uneven values
    const int cv = nc.coordinate("c", c);     // uneven values
    const int dv = nc.coordinate("d", d);     // decreasing values
    const int ev = nc.coordinate("e", e);     // a single node with a coordinate
    nc.var("evenOverAttr", NC_FLOAT, {b, a});
    nc.var("uneven", NC_FLOAT, {c, a});
    nc.var("decreasing", NC_FLOAT, {d, a});
    nc.var("singleNodes", NC_FLOAT, {g, e});  // g has no coordinate variable
    nc.var("noCoordinate", NC_FLOAT, {h, a});  // two nodes without coordinates
    nc.endDef();
    // Steps of 2.5 with a deviation far below the tolerance.
    nc.put(av, std::vector<double>{0.0, 2.5, 5.0 + 1e-9, 7.5});
    nc.put(bv, std::vector<double>{0.0, 1.0, 5.0});
    nc.put(cv, std::vector<double>{0.0, 1.0, 3.0});
    nc.put(dv, std::vector<double>{10.0, 5.0, 0.0});
    nc.put(ev, std::vector<double>{0.0});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  ASSERT_EQ(grdGetNoOfItems(f.header), 5);
  const Axes even = axesOf(f.item(1));
  ASSERT_EQ(even.result, 0);
  EXPECT_FLOAT_EQ(even.dx, 2.5f);
  EXPECT_EQ(even.dy, 7.0f);
  EXPECT_EQ(grdGetItemAxisType(f.item(2)), 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(3)), 0);
  const Axes single = axesOf(f.item(4));
  ASSERT_EQ(single.result, 0);
  EXPECT_EQ(single.nx, 1);
  EXPECT_EQ(single.ny, 1);
  EXPECT_EQ(single.dx, 0.0f);
  EXPECT_EQ(single.dy, 0.0f);
  EXPECT_EQ(grdGetItemAxisType(f.item(5)), 0);
}

TEST(GridFileReadItems, BadSpacingAttributesMakeNoGrid) {
  ScratchDir dir;
  const std::string path = dir.file("badspacing.nc");
  {
    NcBuilder nc(path);
    const int x = nc.dim("x", 3), y = nc.dim("y", 3), z = nc.dim("z", 3), w = nc.dim("w", 3);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 0.0);   // zero spacing for three nodes
    const int zv = nc.coordinate("z", z);
    nc.text(zv, "spacing", "ten");  // not a number
    nc.coordinate("w", w, -2.0);
    nc.var("zero", NC_FLOAT, {y, x});
    nc.var("text", NC_FLOAT, {z, x});
    nc.var("negative", NC_FLOAT, {w, x});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  for (int n = 1; n <= 3; ++n) EXPECT_EQ(grdGetItemAxisType(f.item(n)), 0) << "item " << n;
}

// ---- values, time steps, packing and statistics ---------------------------

TEST(GridFileReadValues, XRunsFastestAndAnyNumericTypeIsRead) {
  ScratchDir dir;
  const std::string path = dir.file("order.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 2), x = nc.dim("x", 3);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    const int v = nc.var("counts", NC_INT, {y, x});
    nc.crs();
    nc.endDef();
    nc.put(v, std::vector<int>{0, 1, 2, 10, 11, 12});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  ASSERT_EQ(grdFindBlockDynamic(f.header, f.file), 0);
  std::vector<float> data(6, -7.0f);
  double time = -1;
  ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, &time, data.data()), 0);
  EXPECT_EQ(data, (std::vector<float>{0, 1, 2, 10, 11, 12}));
  EXPECT_EQ(time, 0.0);
  // A file without a time dimension has exactly one step.
  EXPECT_NE(grdReadItemTimeStep(f.header, f.file, &time, data.data()), 0);
  double low = 0, high = 0;
  ASSERT_EQ(grdGetItemStatsGlobal(f.item(1), &low, &high, nullptr), 0);
  EXPECT_EQ(low, 0.0);
  EXPECT_EQ(high, 12.0);
}

TEST(GridFileReadValues, TimeStepsInOrderWithTheirTimes) {
  ScratchDir dir;
  const std::string path = dir.file("time.nc");
  {
    NcBuilder nc(path);
    const int t = nc.dim("time", NC_UNLIMITED), y = nc.dim("y", 1), x = nc.dim("x", 2);
    const int tv = nc.var("time", NC_DOUBLE, {t});
    nc.coordinate("x", x, 3.0);
    nc.coordinate("y", y, 3.0);
    const int v = nc.var("temp", NC_FLOAT, {t, y, x});
    nc.fill(v, -99.0f);
    nc.endDef();
    const std::size_t start[3] = {0, 0, 0}, count[3] = {2, 1, 2};
    const float values[4] = {1, 2, -99, 40};
    test::ncCheck(nc_put_vara_float(nc.id(), v, start, count, values), "put");
    nc.put(tv, std::vector<double>{0.0, 3600.0});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(1)), 5);
  ASSERT_EQ(grdFindBlockDynamic(f.header, f.file), 0);
  float data[2];
  double time = -1;
  ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, &time, data), 0);
  EXPECT_EQ(time, 0.0);
  EXPECT_EQ(data[0], 1.0f);
  ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, &time, data), 0);
  EXPECT_EQ(time, 3600.0);
  EXPECT_EQ(data[0], -99.0f);
  EXPECT_EQ(data[1], 40.0f);
  EXPECT_NE(grdReadItemTimeStep(f.header, f.file, &time, data), 0);
  // Statistics run over every step and skip the fill value.
  double low = 0, high = 0, third = 0;
  ASSERT_EQ(grdGetItemStatsGlobal(f.item(1), &low, &high, &third), 0);
  EXPECT_EQ(low, 1.0);
  EXPECT_EQ(high, 40.0);
  // Finding the block again starts from the first step.
  ASSERT_EQ(grdFindBlockDynamic(f.header, f.file), 0);
  ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, &time, data), 0);
  EXPECT_EQ(data[1], 2.0f);
}

TEST(GridFileReadValues, PackedValuesAreUnpackedAndFillBecomesTheDeleteValue) {
  ScratchDir dir;
  const std::string path = dir.file("packed.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 1), x = nc.dim("x", 4);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    const int v = nc.var("depth", NC_SHORT, {y, x});
    const short fill = -32768;
    test::ncCheck(nc_put_att_short(nc.id(), v, "_FillValue", NC_SHORT, 1, &fill), "fill");
    nc.number(v, "scale_factor", 0.5);
    nc.number(v, "add_offset", -100.0);
    nc.endDef();
    nc.put(v, std::vector<short>{0, 10, -32768, 400});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  ASSERT_EQ(grdFindBlockDynamic(f.header, f.file), 0);
  float data[4];
  ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, nullptr, data), 0);
  EXPECT_EQ(data[0], -100.0f);
  EXPECT_EQ(data[1], -95.0f);
  EXPECT_EQ(data[2], -32768.0f);
  EXPECT_EQ(data[3], 100.0f);
  double low = 0, high = 0;
  ASSERT_EQ(grdGetItemStatsGlobal(f.item(1), &low, &high, nullptr), 0);
  EXPECT_EQ(low, -100.0);
  EXPECT_EQ(high, 100.0);
}

TEST(GridFileReadValues, StatisticsWithoutValuesGiveTheDeleteValue) {
  ScratchDir dir;
  const std::string path = dir.file("stats.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 2), x = nc.dim("x", 2);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    const int empty = nc.var("empty", NC_FLOAT, {y, x});
    nc.fill(empty, 5.0f);
    // No _FillValue: -1e-30 is the delete value; NaN is never a value.
    const int plain = nc.var("plain", NC_FLOAT, {y, x});
    nc.endDef();
    nc.put(empty, std::vector<float>{5, 5, 5, 5});
    nc.put(plain, std::vector<float>{-1e-30f, std::nanf(""), -3.0f, 2.0f});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  double low = 0, high = 0;
  ASSERT_EQ(grdGetItemStatsGlobal(f.item(1), &low, &high, nullptr), 0);
  EXPECT_EQ(low, 5.0);
  EXPECT_EQ(high, 5.0);
  ASSERT_EQ(grdGetItemStatsGlobal(f.item(2), &low, &high, nullptr), 0);
  EXPECT_EQ(low, -3.0);
  EXPECT_EQ(high, 2.0);
}

// Items larger than one read: values arrive complete and in order whether the
// item is cut into rows or a row into pieces.
TEST(GridFileReadValues, LargeItemsAreReadPieceByPiece) {
  ScratchDir dir;
  const std::string path = dir.file("large.nc");
  const std::size_t wideX = (std::size_t{1} << 20) + 7;
  const std::size_t tallX = 1500, tallY = 800;
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", tallY), x = nc.dim("x", tallX);
    const int wy = nc.dim("wy", 2), wx = nc.dim("wx", wideX);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    nc.coordinate("wx", wx, 1.0);
    nc.coordinate("wy", wy, 1.0);
    const int tall = nc.var("tall", NC_FLOAT, {y, x});
    const int wide = nc.var("wide", NC_FLOAT, {wy, wx});
    nc.endDef();
    std::vector<float> t(tallX * tallY), w(wideX * 2);
    for (std::size_t i = 0; i < t.size(); ++i) t[i] = static_cast<float>(i % 65536);
    for (std::size_t i = 0; i < w.size(); ++i) w[i] = static_cast<float>(i % 4099) - 9.0f;
    t[tallX * 799 + 3] = 70000.0f;
    nc.put(tall, t);
    nc.put(wide, w);
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  double low = 0, high = 0;
  ASSERT_EQ(grdGetItemStatsGlobal(f.item(1), &low, &high, nullptr), 0);
  EXPECT_EQ(low, 0.0);
  EXPECT_EQ(high, 70000.0);
  ASSERT_EQ(grdGetItemStatsGlobal(f.item(2), &low, &high, nullptr), 0);
  EXPECT_EQ(low, -9.0);
  EXPECT_EQ(high, 4089.0);
  std::vector<float> data(tallX * tallY);
  ASSERT_EQ(grdReadItemTimeStep(f.header, f.file, nullptr, data.data()), 0);
  for (std::size_t i = 0; i < data.size(); ++i) {
    const float expected = i == tallX * 799 + 3 ? 70000.0f : static_cast<float>(i % 65536);
    ASSERT_EQ(data[i], expected) << "at " << i;
  }
}

// ---- geographic information -----------------------------------------------

TEST(GridFileReadGeo, FourAttributesOfTheGridMapping) {
  ScratchDir dir;
  const std::string path = dir.file("geo.nc");
  test::makeBathymetry(path, 3, 2, 50, 50, [](std::size_t, std::size_t) { return -5.0f; });
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  std::string projection;
  double lon = 0, lat = 0, orient = 0;
  ASSERT_EQ(grdGetGeoInfoUTMProj(f.header, &projection, &lon, &lat, &orient), 0);
  EXPECT_EQ(projection, "UTM-32");
  EXPECT_EQ(lon, 9.1234);
  EXPECT_EQ(lat, 55.321);
  EXPECT_EQ(orient, 12.5);
}

// Each attribute missing or of the wrong kind, and the variable missing.
TEST(GridFileReadGeo, IncompleteOrMistypedInformationFails) {
  struct Case {
    const char* name;
    const char* drop;       // attribute left out
    const char* textNamed;  // attribute written as text instead of a number
    bool twoValues;         // origin_longitude with two values
    bool noVariable;
  };
  const Case cases[] = {
      {"no projection", "projection", nullptr, false, false},
      {"no longitude", "origin_longitude", nullptr, false, false},
      {"no latitude", "origin_latitude", nullptr, false, false},
      {"no orientation", "orientation", nullptr, false, false},
      {"text orientation", nullptr, "orientation", false, false},
      {"two longitudes", nullptr, nullptr, true, false},
      {"no crs", nullptr, nullptr, false, true},
  };
  ScratchDir dir;
  for (const Case& c : cases) {
    const std::string path = dir.file("geo.nc");
    {
      NcBuilder nc(path);
      const int y = nc.dim("y", 1), x = nc.dim("x", 1);
      nc.var("depth", NC_FLOAT, {y, x});
      if (!c.noVariable) {
        const int v = nc.var("crs", NC_INT, {});
        const char* numbers[] = {"origin_longitude", "origin_latitude", "orientation"};
        if (c.drop == nullptr || std::string(c.drop) != "projection") {
          nc.text(v, "projection", "LOCAL");
        }
        for (const char* n : numbers) {
          if (c.drop != nullptr && std::string(c.drop) == n) continue;
          if (c.textNamed != nullptr && std::string(c.textNamed) == n) {
            nc.text(v, n, "12");
          } else if (c.twoValues && std::string(n) == "origin_longitude") {
            nc.numbers(v, n, {1.0, 2.0});
          } else {
            nc.number(v, n, 1.0);
          }
        }
      }
      nc.close();
    }
    Opened f(path);
    ASSERT_EQ(f.result, 0) << c.name;
    EXPECT_EQ(grdGetItemAxisType(f.item(1)), 5) << c.name;
    std::string projection;
    double lon = 0, lat = 0, orient = 0;
    EXPECT_NE(grdGetGeoInfoUTMProj(f.header, &projection, &lon, &lat, &orient), 0) << c.name;
  }
}

// ---- custom blocks --------------------------------------------------------

TEST(GridFileReadBlocks, FloatGlobalAttributesInOrder) {
  ScratchDir dir;
  const std::string path = dir.file("blocks.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 1), x = nc.dim("x", 1);
    nc.var("depth", NC_FLOAT, {y, x});
    nc.text(NC_GLOBAL, "Conventions", "CF-1.8");
    nc.floats(NC_GLOBAL, "First", {1.5f, 2.5f});
    nc.number(NC_GLOBAL, "NotAFloat", 3.0);  // double: no custom block
    nc.floats(NC_GLOBAL, "Q84_Misc", {7.0f, 8.0f, 9.0f});
    nc.close();
  }
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
    GrdCustomBlock* next = nullptr;
    ASSERT_EQ(grdGetCustomBlock(block, &type, &name, &count, &v, &next), 0);
    EXPECT_EQ(type, 1);
    names.push_back(name);
    values.emplace_back(v, v + count);
    block = next;
  }
  EXPECT_EQ(names, (std::vector<std::string>{"First", "Q84_Misc"}));
  EXPECT_EQ(values[0], (std::vector<float>{1.5f, 2.5f}));
  EXPECT_EQ(values[1], (std::vector<float>{7.0f, 8.0f, 9.0f}));
}

TEST(GridFileReadBlocks, NoFloatAttributeMeansNoBlock) {
  ScratchDir dir;
  const std::string path = dir.file("noblocks.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 1), x = nc.dim("x", 1);
    nc.var("depth", NC_FLOAT, {y, x});
    nc.number(NC_GLOBAL, "Q84_Misc", 1.0);
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  GrdCustomBlock* block = reinterpret_cast<GrdCustomBlock*>(&f);
  EXPECT_NE(grdGetCustomBlockRef(f.header, &block), 0);
  EXPECT_EQ(block, nullptr);
  EXPECT_NE(grdGetCustomBlock(nullptr, nullptr, nullptr, nullptr, nullptr, nullptr), 0);
}

// ---- files that are not what they should be -------------------------------

TEST(GridFileReadFaults, FilesThatCannotBeOpened) {
  ScratchDir dir;
  test::writeBytes(dir.file("text.nc"), "netcdf looks like this but is not\n");
  test::writeBytes(dir.file("empty.nc"), "");
  test::writeBytes(dir.file("hdf.nc"), std::string("\x89HDF\r\n\x1a\n", 8) + "garbage");
  const std::string names[] = {"missing.nc", "text.nc", "empty.nc", "hdf.nc", ""};
  for (const std::string& name : names) {
    const std::string path = name.empty() ? dir.path() : dir.file(name);
    GrdHeader* header = reinterpret_cast<GrdHeader*>(&dir);
    GrdFile* file = reinterpret_cast<GrdFile*>(&dir);
    EXPECT_NE(grdFileRead(path.c_str(), &header, &file), 0) << path;
    EXPECT_EQ(header, nullptr);
    EXPECT_EQ(file, nullptr);
    grdHeaderDestroy(&header);
  }
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  EXPECT_NE(grdFileRead(nullptr, &header, &file), 0);
  EXPECT_NE(grdFileRead("", &header, &file), 0);
}

TEST(GridFileReadFaults, TruncatedFileFailsWithoutCrash) {
  ScratchDir dir;
  const std::string path = dir.file("cut.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 100), x = nc.dim("x", 100);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    const int v = nc.var("depth", NC_FLOAT, {y, x});
    nc.endDef();
    nc.put(v, std::vector<float>(10000, -3.0f));
    nc.close();
  }
  const std::string bytes = test::readBytes(path);
  test::writeBytes(path, bytes.substr(0, bytes.size() / 2));
  Opened f(path);
  EXPECT_NE(f.result, 0);
  EXPECT_EQ(f.header, nullptr);
}

// Dimensions whose product exceeds what a grid can hold are no grid at all,
// and nothing tries to allocate them.
TEST(GridFileReadFaults, AbsurdDimensions) {
  ScratchDir dir;
  const std::string path = dir.file("huge.nc");
  {
    NcBuilder nc(path);
    const int y = nc.dim("y", 70000), x = nc.dim("x", 70000), z = nc.dim("z", 0);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    nc.var("huge", NC_FLOAT, {y, x});
    nc.var("none", NC_FLOAT, {z, x});
    nc.close();
  }
  Opened f(path);
  ASSERT_EQ(f.result, 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(1)), 0);
  EXPECT_NE(axesOf(f.item(1)).result, 0);
  double low = 0, high = 0;
  EXPECT_NE(grdGetItemStatsGlobal(f.item(1), &low, &high, nullptr), 0);
  float one = 0;
  EXPECT_NE(grdReadItemTimeStep(f.header, f.file, nullptr, &one), 0);
  EXPECT_EQ(grdGetItemAxisType(f.item(2)), 0);
}

TEST(GridFileReadFaults, HandlesFromElsewhereAreRefused) {
  ScratchDir dir;
  const std::string path = dir.file("one.nc");
  test::makeBathymetry(path, 2, 2, 1, 1, [](std::size_t, std::size_t) { return -1.0f; });
  Opened a(path), b(path);
  ASSERT_EQ(a.result, 0);
  ASSERT_EQ(b.result, 0);
  float data[4];
  EXPECT_NE(grdFindBlockDynamic(a.header, b.file), 0);
  EXPECT_NE(grdReadItemTimeStep(a.header, b.file, nullptr, data), 0);
  EXPECT_NE(grdReadItemTimeStep(a.header, a.file, nullptr, nullptr), 0);
  EXPECT_EQ(grdReadItemTimeStep(a.header, a.file, nullptr, data), 0);
  // A header from reading takes no settings for writing.
  EXPECT_NE(grdSetDeleteValFloat(a.header, 1.0f), 0);
  EXPECT_NE(grdAddCustomBlock(a.header, 1, "X", 0, nullptr), 0);
  GrdFile* file = nullptr;
  EXPECT_NE(grdFileCreate(dir.file("copy.nc").c_str(), a.header, &file), 0);
}

}  // namespace
}  // namespace karnet
