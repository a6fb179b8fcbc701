// The bathymetry reader and the result writer on real files: what they take
// from and put into the gridded-file layer. (The result file's metadata is
// checked by the end-to-end runs.)
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <string>
#include <tuple>
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

constexpr double kD = kDeleteValueDouble;

// A description and grid as the bathymetry reader's callers hold them.
struct Bathymetry {
  FileDescription* d = descriptionNew(2);
  FloatGrid2D grid;
  ~Bathymetry() {
    grid2DFree(grid);
    descriptionFree(d);
  }
  int read(const std::string& path, int wantValues = 1) {
    return bathymetryRead(path.c_str(), *d, wantValues, grid);
  }
};

class BathymetryReadFile : public test::ScratchTest {};
class ResultWriteFile : public test::ScratchTest {};

float depthAt(std::size_t i, std::size_t j) { return -1.0f - static_cast<float>(i + 1000 * j); }

TEST_F(BathymetryReadFile, AxesOriginBlockStatisticsAndValues) {
  test::makeBathymetry(path, 120, 80, 50.0, 25.0, depthAt);
  Bathymetry b;
  ASSERT_EQ(b.read(path), 1);
  const FileDescription& d = *b.d;
  for (int a : {1, 2}) {  // last index, spacing, start, factor, origin
    EXPECT_EQ(std::vector<double>({double(d.axes[a].lastIndex), d.axes[a].spacing,
                                   d.axes[a].start, d.axes[a].factor, d.axes[a].origin}),
              a == 1 ? std::vector<double>({119, 50, 0, 1, 9.1234})
                     : std::vector<double>({79, 25, 0, 1, 55.321}));
  }
  EXPECT_EQ(std::vector<double>({d.misc[0], d.misc[2], d.misc[3]}),
            std::vector<double>({12.5, -900, 10}));
  EXPECT_EQ(d.items[1].values[1], depthAt(119, 79));  // the minimum
  EXPECT_EQ(d.items[1].values[2], depthAt(0, 0));
  ASSERT_NE(b.grid.data, nullptr);
  EXPECT_EQ(std::vector<int>({b.grid.nj, b.grid.nk}), std::vector<int>({120, 80}));
  EXPECT_EQ(b.grid.at(3, 41), depthAt(3, 41));
}

// Only float attributes are blocks, and only as many characters as the
// block's name has (at most eight) are compared with "Q84_Misc"; the first
// match wins; what a short block lacks stays at the delete value, as does
// everything when no block matches.
TEST_F(BathymetryReadFile, MiscBlockByThePrefixRule) {
  const std::string a = " = 1.f, 2.f, 3.f, 4.f, 5.f, 6.f, 7.f;", b = " = 11.f, 12.f, 13.f, 14.f;";
  const std::vector<double> ofA = {1, 2, 3, 4, 7}, none = {kD, kD, kD, kD, kD};
  const std::tuple<const char*, std::string, std::vector<double>> cases[] = {
      {"longer name", ":Q84_MiscExtra" + a, ofA},
      {"shorter name", ":Q84" + a, ofA},
      {"differs within eight", ":Q84_Mist" + a, none},
      {"first match wins", ":Other" + b + " :Q8" + a + " :Q84_Misc" + b, ofA},
      {"doubles are no block", ":Q84_Misc = 11., 12.; :Q84_Misc2" + a, ofA},
      {"short block", ":Q84_Misc = 3.f, 4.f, 5.f;", {3, 4, 5, kD, kD}},
  };
  for (const auto& [what, blocks, misc] : cases) {
    SCOPED_TRACE(what);
    test::makeBathymetry(path, 2, 2, 1, 1, depthAt, blocks);
    Bathymetry bathy;
    ASSERT_EQ(bathy.read(path, 0), 1);
    const double* m = bathy.d->misc;
    EXPECT_EQ(std::vector<double>({m[0], m[1], m[2], m[3], m[6]}), misc);
    EXPECT_EQ(bathy.grid.data, nullptr);  // no values asked for
  }
}

// A grid mapping lacking an attribute or with one of the wrong kind counts as none.
TEST_F(BathymetryReadFile, FilesItCannotUse) {
  const std::string plane = test::plane(2, 2), mapping = test::crs("crs", "UTM-32", 9.5, 55.25, 3);
  const auto with = [&](const std::string& from, const std::string& to) {
    std::string text = mapping;
    return text.replace(text.find(from), from.size(), to);
  };
  const std::pair<const char*, std::string> files[] = {
      {"cube.nc", "dimensions: z = 2; y = 2; x = 2;\nvariables: double x(x); x:spacing = 1.; "
                  "double y(y); y:spacing = 1.; double z(z); z:spacing = 1.; float b(z, y, x);" +
                      mapping},
      {"nocrs.nc", plane + "float b(y, x);"},
      {"nolatitude.nc", plane + "float b(y, x);" + with("crs:origin_latitude = 55.25;", "")},
      {"textangle.nc", plane + "float b(y, x);" + with("= 3;", "= \"3\";")},
      {"noitem.nc", plane + mapping},
  };
  test::makeNc(path, plane + "float b(y, x);" + mapping);
  ASSERT_EQ(Bathymetry().read(path), 1);  // the same without a fault is read
  EXPECT_EQ(Bathymetry().read(file("missing.nc")), 0);
  for (const auto& [name, cdl] : files) test::makeNc(file(name), cdl);
  for (const auto& [name, cdl] : files) {
    Bathymetry b;
    EXPECT_EQ(b.read(file(name)), 0) << name;
  }
}

// Inputs found by fuzzing that once misbehaved or cost too much, read the way a run reads them.
std::string regression(const std::string& name) {
  return std::string(KARNET_SOURCE_DIR) + "/tests/fuzz/regressions/" + name;
}

// Classic-format files of a few hundred bytes whose headers declare gigabytes:
// an attribute of 1.7e9 floats, a variable of some 10^8 dimensions. The NetCDF
// library allocated and converted the declared sizes first (half a minute and
// 6.7 GB for the first); the reader now refuses both at once, keeping nothing.
TEST(BathymetryReadRegression, HugeDeclarationsAreRefused) {
  for (const char* name : {"bathymetry_huge_attribute.nc", "bathymetry_huge_variable.nc"}) {
    SCOPED_TRACE(name);
    FileDescription* description = descriptionNew(2);
    ASSERT_NE(description, nullptr);
    FloatGrid2D grid{};
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(bathymetryRead(regression(name).c_str(), *description, 1, grid), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
    EXPECT_EQ(grid.data, nullptr);
    descriptionFree(description);
  }
}

struct ResultSetup {
  FileDescription* d = descriptionNew(3);
  std::vector<float> values;
  FloatGrid3D grid;
  ResultSetup(std::int32_t nx, std::int32_t ny, std::int32_t nz) {
    const std::int32_t counts[3] = {nx, ny, nz};
    for (int a = 0; a < 3; ++a) {
      d->axes[a + 1].lastIndex = counts[a] - 1;
      d->axes[a + 1].spacing = 50.0f;
    }
    const double misc[7] = {3.5, kD, -900.0, 0.0, kD, kD, kD};
    std::copy(misc, misc + 7, d->misc);
    values.resize(static_cast<std::size_t>(nx) * ny * nz);
    for (std::size_t i = 0; i < values.size(); ++i) values[i] = static_cast<float>(i);
    grid.nj = nx;
    grid.nk = ny;
    grid.nl = nz;
    grid.total = static_cast<std::int64_t>(values.size());
    grid.data = values.data();
  }
  ~ResultSetup() { descriptionFree(d); }
  int write(const std::string& path, int writeValues, std::int32_t itemType = 2) {
    return resultWrite(path.c_str(), *d, writeValues, itemType, grid, "LOCAL");
  }
};

// (The values of a written result, x fastest, are read back with the level-by-level writer.)
// Without values: no step. An item type without a name names the item by its number.
TEST_F(ResultWriteFile, WithoutValuesNoStepAndAnUnnamedTypeByItsNumber) {
  ResultSetup r(4, 3, 2);
  ASSERT_EQ(r.write(path, 0, 77), 1);
  test::expectParts(test::ncdump(path),
                    {"time = UNLIMITED ; // (0 currently)", "float item_77(time, z, y, x)"});
}

TEST_F(ResultWriteFile, FailureKeepsTheEarlierResult) {
  test::writeBytes(path, "earlier result");
  ResultSetup bad(3, 2, 2);
  bad.d->axes[2].origin = std::nan("");  // no place for the origin
  EXPECT_EQ(bad.write(path, 1), 0);
  ResultSetup noLevels(3, 2, 0);
  EXPECT_EQ(noLevels.write(path, 1), 0);
  EXPECT_EQ(test::readBytes(path), "earlier result");
  EXPECT_EQ(entries(), std::vector<std::string>{"test.nc"});
}

}  // namespace
}  // namespace karnet
