// Writing gridded files: the layout of a written file, item naming and units,
// refused settings, and files that appear under their name only when complete.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cmath>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/nc_test_files.h"

namespace karnet {
namespace {

using test::expectParts;

constexpr float kMisc[7] = {12.5f, -1e-30f, -900.0f, 10.0f, -1e-30f, -1e-30f, -1e-30f};
const std::string kEarlier = "earlier result";

// A header described the way the result writer describes one.
struct ResultHeader {
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  explicit ResultHeader(std::int32_t itemType = 2, const char* key = "Temperature",
                        std::int32_t unit = 2, const char* projection = "LOCAL",
                        const char* title = "") {
    EXPECT_EQ(grdHeaderCreate(1, "unused.nc", title, 1, 1, 2, &header), 0);
    EXPECT_EQ(grdSetDeleteValFloat(header, -1e-30f), 0);
    EXPECT_EQ(grdSetDeleteValDouble(header, -1e-30), 0);
    EXPECT_EQ(grdSetDataType(header, 0), 0);
    EXPECT_EQ(grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0), 0);
    GrdItem* item = grdItemD(header, 1);
    EXPECT_EQ(grdSetItemInfo(header, item, itemType, key, unit, 1), 0);
    EXPECT_EQ(grdSetItemUnitConversion(item, 3, 0), 0);
    EXPECT_EQ(grdSetItemAxisEqD3(item, 1000, 4, 3, 2, 0.0f, 0.0f, 0.0f, 50.0f, 25.0f, 2.5f), 0);
    EXPECT_EQ(grdAddCustomBlock(header, 1, "Q84_Misc", 7, kMisc), 0);
    EXPECT_EQ(grdSetGeoInfoUTMProj(header, projection, 9.5, 55.25, 12.5), 0);
  }
  ~ResultHeader() {
    if (file != nullptr) grdFileAbandon(header, &file);
    grdHeaderDestroy(&header);
  }
  int create(const std::string& path) { return grdFileCreate(path.c_str(), header, &file); }
  int write(const std::vector<float>& data, double time = 0.0) {
    return grdWriteItemTimeStep(header, file, time, data.data());
  }
  int close() { return grdFileClose(header, &file); }
};

class GridFileWrite : public test::ScratchTest {};
class GridFileWriteAtomic : public test::ScratchTest {};

std::vector<float> ramp(float first = 0.0f) {
  std::vector<float> v(24);
  for (std::size_t i = 0; i < v.size(); ++i) v[i] = first + static_cast<float>(i) * 0.5f;
  return v;
}

TEST_F(GridFileWrite, ResultFileLayout) {
  ResultHeader r(2, "Temperature", 2, "UTM-32", "a run");
  ASSERT_EQ(r.create(path), 0);
  ASSERT_EQ(r.write(ramp(), 0.0), 0);
  ASSERT_EQ(r.write(ramp(100.0f), 60.0), 0);
  ASSERT_EQ(r.close(), 0);

  EXPECT_EQ(test::ncdump(path, "-k"), "netCDF-4\n");
  const std::string dump = test::ncdump(path, "-v x,y,z,time,Temperature");
  expectParts(dump, {"time = UNLIMITED ; // (2 currently)", "float Temperature(time, z, y, x) ;",
                     "Temperature:_FillValue = -1.e-30f ;",
                     "Temperature:long_name = \"Temperature\" ;",
                     "Temperature:units = \"degree_Celsius\" ;",
                     "Temperature:standard_name = \"sea_water_temperature\" ;",
                     "Temperature:grid_mapping = \"crs\" ;", "Temperature:item_type = 2 ;",
                     "x:axis = \"X\" ;", "x:units = \"m\" ;", "z:spacing = 2.5 ;",
                     "time:units = \"seconds since 1900-02-28 00:00:00\" ;",
                     "crs:projection = \"UTM-32\" ;", "crs:origin_longitude = 9.5 ;",
                     "crs:origin_latitude = 55.25 ;", "crs:orientation = 12.5 ;", "UTM zone 32N",
                     ":Conventions = \"CF-1.8\" ;", ":title = \"a run\" ;",
                     ":Q84_Misc = 12.5f, -1.e-30f, -900.f, 10.f, -1.e-30f, -1.e-30f, -1.e-30f ;",
                     " x = 0, 50, 100, 150 ;", " y = 0, 25, 50 ;", " z = 0, 2.5 ;",
                     " time = 0, 60 ;"});
  // Stored as given: x fastest, then y, then z, then time.
  expectParts(dump, {" Temperature =\n  0, 0.5, 1, 1.5,\n  2, 2.5, 3, 3.5,\n",
                     "  10, 10.5, 11, 11.5,\n  100, 100.5, 101, 101.5,\n",
                     "  110, 110.5, 111, 111.5 ;"});
}

// A 2-D item without a time axis is the bathymetry layout, with one step only.
TEST_F(GridFileWrite, TwoDimensionalFileWithoutTime) {
  GrdHeader* header = nullptr;
  ASSERT_EQ(grdHeaderCreate(1, path.c_str(), "", 1, 1, 2, &header), 0);
  GrdItem* item = grdItemD(header, 1);
  ASSERT_EQ(grdSetItemInfo(header, item, 1, "bathymetry", 1000, 1), 0);
  ASSERT_EQ(grdSetItemAxisEqD2(item, 1000, 3, 2, 0.0f, 0.0f, 40.0f, 30.0f), 0);
  ASSERT_EQ(grdSetGeoInfoUTMProj(header, "LOCAL", 100.0, 200.0, 0.0), 0);
  GrdFile* file = nullptr;
  ASSERT_EQ(grdFileCreate(path.c_str(), header, &file), 0);
  const std::vector<float> data = {-1, -2, -3, -4, -5, -6};
  ASSERT_EQ(grdWriteItemTimeStep(header, file, 0.0, data.data()), 0);
  EXPECT_NE(grdWriteItemTimeStep(header, file, 1.0, data.data()), 0);
  ASSERT_EQ(grdFileClose(header, &file), 0);
  EXPECT_EQ(file, nullptr);
  grdHeaderDestroy(&header);

  const std::string dump = test::ncdump(path, "-v x,y,bathymetry");
  expectParts(dump, {"float bathymetry(y, x) ;", "bathymetry:units = \"m\" ;", " x = 0, 40, 80 ;",
                     " y = 0, 30 ;", "bathymetry =\n  -1, -2, -3,\n  -4, -5, -6 ;"});
  // No time; LOCAL has no place on the earth: no WKT; an empty title writes none.
  for (const char* absent : {"time", "crs_wkt", ":title"}) {
    EXPECT_EQ(dump.find(absent), std::string::npos) << absent << "\n" << dump;
  }
}

// The item's variable name comes from its key text, its units and standard
// name from the unit table.
TEST_F(GridFileWrite, ItemNamesAndUnits) {
  struct Case {
    std::int32_t type;
    const char* key;
    std::int32_t unit;
    std::string variable, units;
    std::string standardName;  // empty: none
  };
  const Case cases[] = {
      {99, "", 0, "item_99", "1", ""},
      {9, "Concentration", 9, "Concentration", "mg l-1", ""},
      {3, "S/alt (psu)", 3, "S_alt__psu_", "1e-3", "sea_water_salinity"},
      {1, "x", 1, "x_1", "1", ""},  // not the name of a coordinate
      {6, "Current speed", 6, "Current_speed", "m s-1", "sea_water_speed"},
      {5, "Oxygen", 5, "Oxygen", "umol kg-1", "moles_of_oxygen_per_unit_mass_in_sea_water"},
  };
  for (const Case& c : cases) {
    {
      ResultHeader r(c.type, c.key, c.unit, "LOCAL");
      ASSERT_EQ(r.create(path), 0) << c.key;
      ASSERT_EQ(r.close(), 0) << c.key;
    }
    const std::string dump = test::ncdump(path);
    const std::string& v = c.variable;
    expectParts(dump, {"float " + v + "(time, z, y, x) ;",
                       v + ":long_name = \"" + c.key + "\" ;", v + ":units = \"" + c.units + "\""});
    EXPECT_EQ(dump.find(":standard_name") != std::string::npos, !c.standardName.empty());
    if (!c.standardName.empty()) expectParts(dump, {v + ":standard_name = \"" + c.standardName});
  }
}

TEST_F(GridFileWrite, RefusedSettingsAndPlaces) {
  GrdHeader* header = nullptr;
  EXPECT_NE(grdHeaderCreate(0, "a.nc", "", 1, 1, 2, &header), 0);
  EXPECT_EQ(header, nullptr);
  ASSERT_EQ(grdHeaderCreate(1, "a.nc", nullptr, 1, 1, 2, &header), 0);
  GrdItem* item = grdItemD(header, 1);
  EXPECT_EQ(grdItemD(header, 2), nullptr);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1001, 2, 2, 2, 0, 0, 0, 1, 1, 1), 0);  // not metres
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 2, 2, 2, 0, 0, 0, 1, -1, 1), 0);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 2, 2, 2, NAN, 0, 0, 1, 1, 1), 0);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 70000, 70000, 1, 0, 0, 0, 1, 1, 1), 0);
  EXPECT_EQ(grdSetItemAxisEqD3(item, 1000, 2, 2, 1, 0, 0, 0, 1, 1, 0), 0);  // one level
  for (const char* name : {"", "title", "_Hidden"}) {
    EXPECT_NE(grdAddCustomBlock(header, 1, name, 7, kMisc), 0) << name;
  }
  EXPECT_NE(grdAddCustomBlock(header, 2, "Q84_Misc", 7, kMisc), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "Q84_Misc", 7, nullptr), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "Q84_Misc", -1, kMisc), 0);
  EXPECT_EQ(grdAddCustomBlock(header, 1, "Q84_Misc", 7, kMisc), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "Q84_Misc", 7, kMisc), 0);  // twice
  EXPECT_NE(grdSetGeoInfoUTMProj(header, nullptr, 0, 0, 0), 0);
  EXPECT_NE(grdSetGeoInfoUTMProj(header, "LOCAL", 0, 0, INFINITY), 0);
  // The item has no key text and type yet: no file.
  GrdFile* file = nullptr;
  EXPECT_NE(grdFileCreate(dir.file("a.nc").c_str(), header, &file), 0);
  grdHeaderDestroy(&header);

  ResultHeader r;
  for (const std::string& place : {dir.file("no/such/dir/r.nc"), dir.path(), dir.path() + "/",
                                   std::string()}) {
    EXPECT_NE(r.create(place), 0) << place;
  }
  EXPECT_TRUE(dir.entries().empty());
  // Once a file is open, a second one is refused and the header is fixed.
  ASSERT_EQ(r.create(path), 0);
  GrdFile* second = nullptr;
  EXPECT_NE(grdFileCreate(dir.file("s.nc").c_str(), r.header, &second), 0);
  EXPECT_NE(grdSetDeleteValFloat(r.header, 0.0f), 0);
  EXPECT_NE(grdWriteItemTimeStep(r.header, r.file, 0.0, nullptr), 0);
}

// Until it is closed, a file is not under its name: an earlier file stays,
// and an abandoned file, one whose header goes first or one that cannot take
// its name leaves nothing.
TEST_F(GridFileWriteAtomic, FileAppearsOnlyWhenClosed) {
  const std::vector<std::string> onlyR = {"test.nc"};
  test::writeBytes(path, kEarlier);
  {
    ResultHeader r;
    ASSERT_EQ(r.create(path), 0);
    ASSERT_EQ(r.write(ramp()), 0);
    EXPECT_EQ(test::readBytes(path), kEarlier);
    EXPECT_EQ(dir.entries(), onlyR);
    ASSERT_EQ(grdFileAbandon(r.header, &r.file), 0);
    EXPECT_EQ(r.file, nullptr);
    EXPECT_NE(grdFileClose(r.header, &r.file), 0);
  }
  {
    ResultHeader r;
    ASSERT_EQ(r.create(dir.file("never.nc")), 0);
    ASSERT_EQ(r.write(ramp()), 0);
    r.file = nullptr;  // the header is destroyed while its file is open
  }
  EXPECT_EQ(test::readBytes(path), kEarlier);
  EXPECT_EQ(dir.entries(), onlyR);

  ResultHeader r;
  ASSERT_EQ(r.create(path), 0);
  ASSERT_EQ(r.write(ramp()), 0);
  EXPECT_EQ(test::readBytes(path), kEarlier);
  ASSERT_EQ(r.close(), 0);
  EXPECT_EQ(r.file, nullptr);
  EXPECT_EQ(dir.entries(), onlyR);
  EXPECT_EQ(test::readBytes(path).substr(1, 3), "HDF");

  // The name has become a directory in the meantime: the rename fails.
  const std::string taken = dir.file("taken.nc");
  ResultHeader failing;
  ASSERT_EQ(failing.create(taken), 0);
  ASSERT_EQ(failing.write(ramp()), 0);
  ASSERT_EQ(mkdir(taken.c_str(), 0700), 0);
  EXPECT_NE(failing.close(), 0);
  EXPECT_EQ(failing.file, nullptr);
  EXPECT_EQ(dir.entries(), (std::vector<std::string>{"taken.nc", "test.nc"}));
  EXPECT_TRUE(std::filesystem::is_directory(taken));
}

// A run that ends while its result is being written, by exit() or killed
// outright, leaves the earlier result and no temporary file.
TEST_F(GridFileWriteAtomic, EndedRunLeavesEarlierResultAndNoTemporary) {
  for (const bool killed : {false, true}) {
    SCOPED_TRACE(killed ? "killed" : "exit()");
    test::writeBytes(path, kEarlier);
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      ResultHeader r;  // std::exit() does not destroy it
      if (r.create(path) != 0 || r.write(ramp()) != 0) _exit(21);
      if (killed) raise(SIGKILL);
      std::exit(7);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    if (killed) {
      EXPECT_TRUE(WIFSIGNALED(status));
    } else {
      EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 7) << status;
    }
    EXPECT_EQ(test::readBytes(path), kEarlier);
    EXPECT_EQ(dir.entries(), std::vector<std::string>{"test.nc"});
  }
}

}  // namespace
}  // namespace karnet
