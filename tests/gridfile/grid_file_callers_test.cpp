// The bathymetry reader and the result writer on real files: what they take
// from and put into the gridded-file layer.
#include <gtest/gtest.h>
#include <netcdf.h>

#include <cmath>
#include <string>
#include <utility>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/nc_test_files.h"
#include "input/bathymetry_read.h"
#include "output/result_write.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

using test::ScratchDir;

struct Description {
  FileDescription* d;
  explicit Description(std::int32_t dimension) : d(descriptionNew(dimension)) {}
  ~Description() { descriptionFree(d); }
};

struct Grid2D {
  FloatGrid2D g;
  ~Grid2D() { grid2DFree(g); }
};

float depthAt(std::size_t i, std::size_t j) { return -1.0f - static_cast<float>(i + 1000 * j); }

// ---- bathymetry reader ----------------------------------------------------

TEST(BathymetryReadFile, AxesOriginBlockStatisticsAndValues) {
  ScratchDir dir;
  const std::string path = dir.file("bathy.nc");
  test::makeBathymetry(path, 120, 80, 50.0, 25.0, depthAt);
  Description desc(2);
  Grid2D grid;
  ASSERT_EQ(bathymetryRead(path.c_str(), *desc.d, 1, grid.g), 1);
  const FileDescription& d = *desc.d;
  EXPECT_EQ(d.axes[1].lastIndex, 119);
  EXPECT_EQ(d.axes[2].lastIndex, 79);
  EXPECT_EQ(d.axes[1].spacing, 50.0f);
  EXPECT_EQ(d.axes[2].spacing, 25.0f);
  EXPECT_EQ(d.axes[1].start, 0.0f);
  EXPECT_EQ(d.axes[1].factor, 1.0f);
  EXPECT_EQ(d.axes[1].origin, 9.1234);
  EXPECT_EQ(d.axes[2].origin, 55.321);
  EXPECT_EQ(d.misc[0], 12.5);
  EXPECT_EQ(d.misc[2], -900.0);
  EXPECT_EQ(d.misc[3], 10.0);
  EXPECT_EQ(d.items[1].values[1], depthAt(119, 79));  // the minimum
  EXPECT_EQ(d.items[1].values[2], depthAt(0, 0));
  ASSERT_NE(grid.g.data, nullptr);
  EXPECT_EQ(grid.g.nj, 120);
  EXPECT_EQ(grid.g.nk, 80);
  EXPECT_EQ(grid.g.elementCount(), 9600);
  EXPECT_EQ(grid.g.at(7, 0), depthAt(7, 0));
  EXPECT_EQ(grid.g.at(3, 41), depthAt(3, 41));

  // A second read replaces the values with those of the file again.
  grid.g.at(3, 41) = 5.0f;
  ASSERT_EQ(bathymetryRead(path.c_str(), *desc.d, 1, grid.g), 1);
  EXPECT_EQ(grid.g.at(3, 41), depthAt(3, 41));
}

TEST(BathymetryReadFile, MiscBlockFoundByThePrefixRule) {
  const std::vector<float> a = {1, 2, 3, 4, 5, 6, 7};
  const std::vector<float> b = {11, 12, 13, 14, 15, 16, 17};
  struct Case {
    const char* what;
    std::vector<std::pair<const char*, std::vector<float>>> blocks;
    double expectedFirst;  // misc 1, or the delete value when no block matches
  };
  const Case cases[] = {
      {"longer name", {{"Q84_MiscExtra", a}}, 1},
      {"shorter name", {{"Q84", a}}, 1},
      {"differs within eight", {{"Q84_Mist", a}}, -1e-30},
      {"first match wins", {{"Other", b}, {"Q8", a}, {"Q84_Misc", b}}, 1},
      {"no block", {}, -1e-30},
  };
  ScratchDir dir;
  for (const Case& c : cases) {
    const std::string path = dir.file("blocks.nc");
    {
      test::NcBuilder nc(path);
      const int y = nc.dim("y", 2), x = nc.dim("x", 2);
      nc.coordinate("x", x, 1.0);
      nc.coordinate("y", y, 1.0);
      const int v = nc.var("bathymetry", NC_FLOAT, {y, x});
      nc.crs();
      for (const auto& block : c.blocks) {
        test::ncCheck(nc_put_att_float(nc.id(), NC_GLOBAL, block.first, NC_FLOAT,
                                       block.second.size(), block.second.data()),
                      "block");
      }
      nc.endDef();
      nc.put(v, std::vector<float>{-1, -2, -3, -4});
      nc.close();
    }
    Description desc(2);
    Grid2D grid;
    ASSERT_EQ(bathymetryRead(path.c_str(), *desc.d, 0, grid.g), 1) << c.what;
    EXPECT_EQ(desc.d->misc[0], c.expectedFirst) << c.what;
    EXPECT_EQ(grid.g.data, nullptr) << c.what;
  }
}

TEST(BathymetryReadFile, ShortBlockLeavesTheRestAtTheDeleteValue) {
  ScratchDir dir;
  const std::string path = dir.file("short.nc");
  test::makeBathymetry(path, 2, 2, 1, 1, depthAt, {{"Q84_Misc", {3.0f, 4.0f, 5.0f}}});
  Description desc(2);
  Grid2D grid;
  ASSERT_EQ(bathymetryRead(path.c_str(), *desc.d, 1, grid.g), 1);
  EXPECT_EQ(desc.d->misc[2], 5.0);
  EXPECT_EQ(desc.d->misc[3], kDeleteValueDouble);
  EXPECT_EQ(desc.d->misc[6], kDeleteValueDouble);
}

TEST(BathymetryReadFile, FilesItCannotUse) {
  ScratchDir dir;
  test::writeBytes(dir.file("text.nc"), "not a grid\n");
  {
    // A 3-D item: axis type 10, not 5.
    test::NcBuilder nc(dir.file("cube.nc"));
    const int z = nc.dim("z", 2), y = nc.dim("y", 2), x = nc.dim("x", 2);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    nc.coordinate("z", z, 1.0);
    nc.var("b", NC_FLOAT, {z, y, x});
    nc.crs();
    nc.close();
  }
  {
    // No crs variable.
    test::NcBuilder nc(dir.file("nocrs.nc"));
    const int y = nc.dim("y", 2), x = nc.dim("x", 2);
    nc.coordinate("x", x, 1.0);
    nc.coordinate("y", y, 1.0);
    nc.var("b", NC_FLOAT, {y, x});
    nc.close();
  }
  {
    // Only coordinates: no item at all.
    test::NcBuilder nc(dir.file("noitem.nc"));
    nc.coordinate("x", nc.dim("x", 2), 1.0);
    nc.crs();
    nc.close();
  }
  for (const char* name : {"missing.nc", "text.nc", "cube.nc", "nocrs.nc", "noitem.nc"}) {
    Description desc(2);
    Grid2D grid;
    EXPECT_EQ(bathymetryRead(dir.file(name).c_str(), *desc.d, 1, grid.g), 0) << name;
  }
}

// ---- result writer --------------------------------------------------------

struct ResultSetup {
  Description desc{3};
  std::vector<float> values;
  FloatGrid3D grid;
  ResultSetup(std::int32_t nx, std::int32_t ny, std::int32_t nz) {
    FileDescription& d = *desc.d;
    d.axes[1].lastIndex = nx - 1;
    d.axes[2].lastIndex = ny - 1;
    d.axes[3].lastIndex = nz - 1;
    d.axes[1].spacing = 50.0f;
    d.axes[2].spacing = 40.0f;
    d.axes[3].spacing = 1.0f;
    d.axes[1].origin = 9.25;
    d.axes[2].origin = 55.5;
    const double misc[7] = {3.5, -1e-30, -900.0, 0.0, -1e-30, -1e-30, -1e-30};
    for (int i = 0; i < 7; ++i) d.misc[i] = misc[i];
    values.resize(static_cast<std::size_t>(nx) * ny * nz);
    for (std::size_t i = 0; i < values.size(); ++i) values[i] = static_cast<float>(i);
    grid.nj = nx;
    grid.nk = ny;
    grid.nl = nz;
    grid.total = static_cast<std::int64_t>(values.size());
    grid.data = values.data();
  }
};

TEST(ResultWriteFile, OneTimeStepXFastest) {
  ScratchDir dir;
  const std::string path = dir.file("result.nc");
  ResultSetup r(120, 80, 20);
  ASSERT_EQ(resultWrite(path.c_str(), *r.desc.d, 1, 2, r.grid, "UTM-32"), 1);

  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  ASSERT_EQ(grdFileRead(path.c_str(), &header, &file), 0);
  GrdItem* item = grdItemD(header, 1);
  EXPECT_EQ(grdGetItemAxisType(item), 10);
  std::vector<float> back(192000, -1.0f);
  double time = -1;
  ASSERT_EQ(grdReadItemTimeStep(header, file, &time, back.data()), 0);
  EXPECT_EQ(time, 0.0);
  EXPECT_EQ(back, r.values);
  EXPECT_NE(grdReadItemTimeStep(header, file, &time, back.data()), 0);  // only one step
  std::string projection;
  double lon = 0, lat = 0, orientation = 0;
  ASSERT_EQ(grdGetGeoInfoUTMProj(header, &projection, &lon, &lat, &orientation), 0);
  EXPECT_EQ(projection, "UTM-32");
  EXPECT_EQ(lon, 9.25);
  EXPECT_EQ(lat, 55.5);
  EXPECT_EQ(orientation, 3.5);
  GrdCustomBlock* block = nullptr;
  ASSERT_EQ(grdGetCustomBlockRef(header, &block), 0);
  const char* name = nullptr;
  std::int32_t count = 0;
  const float* misc = nullptr;
  ASSERT_EQ(grdGetCustomBlock(block, nullptr, &name, &count, &misc, nullptr), 0);
  EXPECT_STREQ(name, "Q84_Misc");
  ASSERT_EQ(count, 7);
  EXPECT_EQ(misc[0], 3.5f);
  EXPECT_EQ(misc[2], -900.0f);
  grdHeaderDestroy(&header);

  const std::string dump = test::commandOutput("ncdump -h '" + path + "'");
  EXPECT_NE(dump.find("float Temperature(time, z, y, x)"), std::string::npos) << dump;
  EXPECT_NE(dump.find("x = 120 ;"), std::string::npos);
  EXPECT_NE(dump.find("z = 20 ;"), std::string::npos);
}

TEST(ResultWriteFile, WithoutValuesAndWithAnUnknownItemType) {
  ScratchDir dir;
  const std::string path = dir.file("empty.nc");
  ResultSetup r(3, 2, 2);
  ASSERT_EQ(resultWrite(path.c_str(), *r.desc.d, 0, 77, r.grid, "LOCAL"), 1);
  const std::string dump = test::commandOutput("ncdump -h '" + path + "'");
  EXPECT_NE(dump.find("time = UNLIMITED ; // (0 currently)"), std::string::npos) << dump;
  EXPECT_NE(dump.find("float item_77(time, z, y, x)"), std::string::npos) << dump;
  EXPECT_NE(dump.find(":Q84_Misc = 3.5f, -1.e-30f, -900.f, 0.f"), std::string::npos) << dump;
  EXPECT_NE(dump.find("crs:projection = \"LOCAL\""), std::string::npos) << dump;
}

TEST(ResultWriteFile, FailureKeepsTheEarlierResult) {
  ScratchDir dir;
  const std::string path = dir.file("result.nc");
  test::writeBytes(path, "earlier result");
  ResultSetup bad(3, 2, 2);
  bad.desc.d->axes[2].origin = std::nan("");  // no place for the origin
  EXPECT_EQ(resultWrite(path.c_str(), *bad.desc.d, 1, 2, bad.grid, "LOCAL"), 0);
  ResultSetup noLevels(3, 2, 0);
  EXPECT_EQ(resultWrite(path.c_str(), *noLevels.desc.d, 1, 2, noLevels.grid, "LOCAL"), 0);
  EXPECT_EQ(test::readBytes(path), "earlier result");
  EXPECT_EQ(dir.entries(), std::vector<std::string>{"result.nc"});
  ResultSetup good(3, 2, 2);
  EXPECT_EQ(resultWrite(dir.file("sub/result.nc").c_str(), *good.desc.d, 1, 2, good.grid,
                        "LOCAL"),
            0);
}

}  // namespace
}  // namespace karnet
