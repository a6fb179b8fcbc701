// Writing gridded files: the layout of a written file, item naming, refused
// settings, and files that appear under their name only when complete.
#include <gtest/gtest.h>
#include <netcdf.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <csignal>
#include <cstdlib>
#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/nc_test_files.h"

namespace karnet {
namespace {

using test::ScratchDir;

constexpr float kMisc[7] = {12.5f, -1e-30f, -900.0f, 10.0f, -1e-30f, -1e-30f, -1e-30f};

// A header described the way the result writer describes one.
struct ResultHeader {
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  ResultHeader(std::int32_t itemType, const char* key, std::int32_t unit, const char* projection,
               std::int32_t nx = 4, std::int32_t ny = 3, std::int32_t nz = 2,
               const char* title = "") {
    EXPECT_EQ(grdHeaderCreate(1, "unused.nc", title, 1, 1, 2, &header), 0);
    EXPECT_EQ(grdSetDeleteValFloat(header, -1e-30f), 0);
    EXPECT_EQ(grdSetDeleteValDouble(header, -1e-30), 0);
    EXPECT_EQ(grdSetDataType(header, 0), 0);
    EXPECT_EQ(grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0), 0);
    GrdItem* item = grdItemD(header, 1);
    EXPECT_EQ(grdSetItemInfo(header, item, itemType, key, unit, 1), 0);
    EXPECT_EQ(grdSetItemUnitConversion(item, 3, 0), 0);
    EXPECT_EQ(grdSetItemAxisEqD3(item, 1000, nx, ny, nz, 0.0f, 0.0f, 0.0f, 50.0f, 25.0f, 2.5f),
              0);
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

std::vector<float> ramp(std::size_t count) {
  std::vector<float> v(count);
  for (std::size_t i = 0; i < count; ++i) v[i] = static_cast<float>(i) * 0.5f;
  return v;
}

std::string textAtt(int ncid, int varid, const char* name) {
  std::size_t length = 0;
  if (nc_inq_attlen(ncid, varid, name, &length) != NC_NOERR) return "<none>";
  std::string text(length, '\0');
  nc_get_att_text(ncid, varid, name, text.data());
  return text;
}

double numberAtt(int ncid, int varid, const char* name) {
  double v = std::nan("");
  nc_get_att_double(ncid, varid, name, &v);
  return v;
}

int varId(int ncid, const char* name) {
  int id = -1;
  nc_inq_varid(ncid, name, &id);
  return id;
}

std::vector<double> coordinate(int ncid, const char* name, std::size_t n) {
  std::vector<double> v(n, -1);
  nc_get_var_double(ncid, varId(ncid, name), v.data());
  return v;
}

// ---- what a written file holds --------------------------------------------

TEST(GridFileWriteLayout, ResultFileReadsBackThroughNetcdf) {
  ScratchDir dir;
  const std::string path = dir.file("result.nc");
  ResultHeader r(2, "Temperature", 2, "UTM-32", 4, 3, 2, "a run");
  ASSERT_EQ(r.create(path), 0);
  ASSERT_EQ(r.write(ramp(24)), 0);
  ASSERT_EQ(r.close(), 0);

  int ncid = -1;
  ASSERT_EQ(nc_open(path.c_str(), NC_NOWRITE, &ncid), NC_NOERR);
  int format = 0;
  nc_inq_format(ncid, &format);
  EXPECT_EQ(format, NC_FORMAT_NETCDF4);
  int unlimited = -1;
  nc_inq_unlimdim(ncid, &unlimited);
  char name[NC_MAX_NAME + 1];
  std::size_t length = 0;
  ASSERT_EQ(nc_inq_dim(ncid, unlimited, name, &length), NC_NOERR);
  EXPECT_STREQ(name, "time");
  EXPECT_EQ(length, 1u);

  const int item = varId(ncid, "Temperature");
  ASSERT_GE(item, 0);
  int ndims = 0, dims[NC_MAX_VAR_DIMS];
  nc_inq_varndims(ncid, item, &ndims);
  nc_inq_vardimid(ncid, item, dims);
  ASSERT_EQ(ndims, 4);
  std::vector<std::string> dimNames;
  for (int d = 0; d < ndims; ++d) {
    nc_inq_dimname(ncid, dims[d], name);
    dimNames.push_back(name);
  }
  EXPECT_EQ(dimNames, (std::vector<std::string>{"time", "z", "y", "x"}));
  std::vector<float> values(24);
  nc_get_var_float(ncid, item, values.data());
  EXPECT_EQ(values, ramp(24));
  float fill = 0;
  nc_get_att_float(ncid, item, "_FillValue", &fill);
  EXPECT_EQ(fill, -1e-30f);
  EXPECT_EQ(textAtt(ncid, item, "long_name"), "Temperature");
  EXPECT_EQ(textAtt(ncid, item, "units"), "degree_Celsius");
  EXPECT_EQ(textAtt(ncid, item, "standard_name"), "sea_water_temperature");
  EXPECT_EQ(textAtt(ncid, item, "grid_mapping"), "crs");
  int itemType = 0;
  nc_get_att_int(ncid, item, "item_type", &itemType);
  EXPECT_EQ(itemType, 2);

  EXPECT_EQ(coordinate(ncid, "x", 4), (std::vector<double>{0, 50, 100, 150}));
  EXPECT_EQ(coordinate(ncid, "y", 3), (std::vector<double>{0, 25, 50}));
  EXPECT_EQ(coordinate(ncid, "z", 2), (std::vector<double>{0, 2.5}));
  EXPECT_EQ(coordinate(ncid, "time", 1), (std::vector<double>{0}));
  EXPECT_EQ(numberAtt(ncid, varId(ncid, "z"), "spacing"), 2.5);
  EXPECT_EQ(textAtt(ncid, varId(ncid, "x"), "axis"), "X");
  EXPECT_EQ(textAtt(ncid, varId(ncid, "x"), "units"), "m");
  EXPECT_EQ(textAtt(ncid, varId(ncid, "time"), "units"), "seconds since 1900-02-28 00:00:00");

  const int crs = varId(ncid, "crs");
  EXPECT_EQ(textAtt(ncid, crs, "projection"), "UTM-32");
  EXPECT_EQ(numberAtt(ncid, crs, "origin_longitude"), 9.5);
  EXPECT_EQ(numberAtt(ncid, crs, "origin_latitude"), 55.25);
  EXPECT_EQ(numberAtt(ncid, crs, "orientation"), 12.5);
  EXPECT_NE(textAtt(ncid, crs, "crs_wkt").find("UTM zone 32N"), std::string::npos);

  EXPECT_EQ(textAtt(ncid, NC_GLOBAL, "Conventions"), "CF-1.8");
  EXPECT_EQ(textAtt(ncid, NC_GLOBAL, "title"), "a run");
  float misc[7] = {};
  nc_type type = NC_NAT;
  nc_inq_att(ncid, NC_GLOBAL, "Q84_Misc", &type, &length);
  EXPECT_EQ(type, NC_FLOAT);
  EXPECT_EQ(length, 7u);
  nc_get_att_float(ncid, NC_GLOBAL, "Q84_Misc", misc);
  EXPECT_TRUE(std::equal(misc, misc + 7, kMisc));
  nc_close(ncid);
}

TEST(GridFileWriteLayout, NcdumpSeesTheLayoutAndOurReaderReadsItBack) {
  ScratchDir dir;
  const std::string path = dir.file("dump.nc");
  ResultHeader r(6, "Current speed", 6, "LOCAL");
  ASSERT_EQ(r.create(path), 0);
  ASSERT_EQ(r.write(ramp(24), 0.0), 0);
  ASSERT_EQ(r.write(ramp(24), 60.0), 0);
  ASSERT_EQ(r.close(), 0);

  const std::string dump = test::commandOutput("ncdump -h '" + path + "'");
  EXPECT_NE(dump.find("time = UNLIMITED ; // (2 currently)"), std::string::npos) << dump;
  EXPECT_NE(dump.find("float Current_speed(time, z, y, x)"), std::string::npos) << dump;
  EXPECT_NE(dump.find("Current_speed:standard_name = \"sea_water_speed\""), std::string::npos);
  EXPECT_NE(dump.find("Current_speed:units = \"m s-1\""), std::string::npos);
  EXPECT_NE(dump.find(":Q84_Misc = 12.5f, -1.e-30f, -900.f, 10.f"), std::string::npos) << dump;
  EXPECT_NE(dump.find(":Conventions = \"CF-1.8\""), std::string::npos);
  // LOCAL has no place on the earth: no WKT; an empty title writes none.
  EXPECT_EQ(dump.find("crs_wkt"), std::string::npos);
  EXPECT_EQ(dump.find(":title"), std::string::npos);

  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  ASSERT_EQ(grdFileRead(path.c_str(), &header, &file), 0);
  ASSERT_EQ(grdGetNoOfItems(header), 1);
  GrdItem* item = grdItemD(header, 1);
  EXPECT_EQ(grdGetItemAxisType(item), 10);
  double low = 0, high = 0;
  ASSERT_EQ(grdGetItemStatsGlobal(item, &low, &high, nullptr), 0);
  EXPECT_EQ(low, 0.0);
  EXPECT_EQ(high, 11.5);
  std::string projection;
  double lon = 0, lat = 0, orientation = 0;
  ASSERT_EQ(grdGetGeoInfoUTMProj(header, &projection, &lon, &lat, &orientation), 0);
  EXPECT_EQ(projection, "LOCAL");
  EXPECT_EQ(lon, 9.5);
  std::vector<float> step(24);
  double time = -1;
  ASSERT_EQ(grdFindBlockDynamic(header, file), 0);
  ASSERT_EQ(grdReadItemTimeStep(header, file, &time, step.data()), 0);
  ASSERT_EQ(grdReadItemTimeStep(header, file, &time, step.data()), 0);
  EXPECT_EQ(time, 60.0);
  EXPECT_EQ(step, ramp(24));
  grdHeaderDestroy(&header);
  EXPECT_EQ(header, nullptr);
}

// A 2-D item without a time axis is the bathymetry layout; the reader takes
// it as axis type 5 with its spacings, and it has exactly one step.
TEST(GridFileWriteLayout, TwoDimensionalFileWithoutTime) {
  ScratchDir dir;
  const std::string path = dir.file("bathy.nc");
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

  const std::string dump = test::commandOutput("ncdump -h '" + path + "'");
  EXPECT_NE(dump.find("float bathymetry(y, x)"), std::string::npos) << dump;
  EXPECT_NE(dump.find("bathymetry:units = \"m\""), std::string::npos) << dump;
  EXPECT_EQ(dump.find("time"), std::string::npos) << dump;

  GrdFile* readFile = nullptr;
  ASSERT_EQ(grdFileRead(path.c_str(), &header, &readFile), 0);
  std::int32_t j0, k0, nx, ny;
  double x0, y0;
  float dx, dy;
  EXPECT_EQ(grdGetItemAxisType(grdItemD(header, 1)), 5);
  ASSERT_EQ(grdGetItemAxisEqD2(grdItemD(header, 1), &j0, &k0, &nx, &ny, &x0, &y0, &dx, &dy), 0);
  EXPECT_EQ(nx, 3);
  EXPECT_EQ(ny, 2);
  EXPECT_EQ(dx, 40.0f);
  EXPECT_EQ(dy, 30.0f);
  std::vector<float> back(6);
  ASSERT_EQ(grdReadItemTimeStep(header, readFile, nullptr, back.data()), 0);
  EXPECT_EQ(back, data);
  grdHeaderDestroy(&header);
}

TEST(GridFileWriteLayout, ItemNamesFromKeyTexts) {
  struct Case {
    std::int32_t type;
    const char* key;
    std::int32_t unit;
    const char* variable;
    const char* units;
    const char* standardName;
  };
  const Case cases[] = {
      {99, "", 0, "item_99", "1", "<none>"},
      {9, "Concentration", 9, "Concentration", "mg l-1", "<none>"},
      {3, "S/alt (psu)", 3, "S_alt__psu_", "1e-3", "sea_water_salinity"},
      {1, "x", 1, "x_1", "1", "<none>"},
  };
  ScratchDir dir;
  for (const Case& c : cases) {
    const std::string path = dir.file("names.nc");
    {
      ResultHeader r(c.type, c.key, c.unit, "LOCAL", 2, 2, 1);
      ASSERT_EQ(r.create(path), 0) << c.key;
      ASSERT_EQ(r.close(), 0) << c.key;
    }
    int ncid = -1;
    ASSERT_EQ(nc_open(path.c_str(), NC_NOWRITE, &ncid), NC_NOERR);
    const int item = varId(ncid, c.variable);
    EXPECT_GE(item, 0) << c.variable;
    EXPECT_EQ(textAtt(ncid, item, "long_name"), c.key);
    EXPECT_EQ(textAtt(ncid, item, "units"), c.units);
    EXPECT_EQ(textAtt(ncid, item, "standard_name"), c.standardName);
    nc_close(ncid);
  }
}

// ---- settings that are refused ----------------------------------------------

TEST(GridFileWriteRefusals, AxesBlocksAndGeographicInformation) {
  GrdHeader* header = nullptr;
  EXPECT_NE(grdHeaderCreate(0, "a.nc", "", 1, 1, 2, &header), 0);
  EXPECT_EQ(header, nullptr);
  ASSERT_EQ(grdHeaderCreate(1, "a.nc", nullptr, 1, 1, 2, &header), 0);
  GrdItem* item = grdItemD(header, 1);
  EXPECT_EQ(grdItemD(header, 2), nullptr);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1001, 2, 2, 2, 0, 0, 0, 1, 1, 1), 0);  // not metres
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 0, 2, 2, 0, 0, 0, 1, 1, 1), 0);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 2, 2, 2, 0, 0, 0, 1, -1, 1), 0);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 2, 2, 2, NAN, 0, 0, 1, 1, 1), 0);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 70000, 70000, 1, 0, 0, 0, 1, 1, 1), 0);
  EXPECT_EQ(grdSetItemAxisEqD3(item, 1000, 2, 2, 1, 0, 0, 0, 1, 1, 0), 0);  // one level
  EXPECT_NE(grdAddCustomBlock(header, 2, "Q84_Misc", 7, kMisc), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "", 7, kMisc), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "title", 7, kMisc), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "_Hidden", 7, kMisc), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "Q84_Misc", 7, nullptr), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "Q84_Misc", -1, kMisc), 0);
  EXPECT_EQ(grdAddCustomBlock(header, 1, "Q84_Misc", 7, kMisc), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "Q84_Misc", 7, kMisc), 0);  // twice
  EXPECT_NE(grdSetGeoInfoUTMProj(header, nullptr, 0, 0, 0), 0);
  EXPECT_NE(grdSetGeoInfoUTMProj(header, "LOCAL", NAN, 0, 0), 0);
  EXPECT_NE(grdSetGeoInfoUTMProj(header, "LOCAL", 0, 0, INFINITY), 0);
  // The item has no key text and type yet: no file.
  ScratchDir dir;
  GrdFile* file = nullptr;
  EXPECT_NE(grdFileCreate(dir.file("a.nc").c_str(), header, &file), 0);
  EXPECT_TRUE(dir.entries().empty());
  grdHeaderDestroy(&header);
}

TEST(GridFileWriteRefusals, PlacesWhereNoFileCanBe) {
  ScratchDir dir;
  ResultHeader r(2, "Temperature", 2, "LOCAL");
  EXPECT_NE(r.create(dir.file("no/such/dir/r.nc")), 0);
  EXPECT_NE(r.create(dir.path()), 0);
  EXPECT_NE(r.create(dir.path() + "/"), 0);
  EXPECT_NE(r.create(""), 0);
  EXPECT_TRUE(dir.entries().empty());
  // Once a file is open, a second one is refused and the header is fixed.
  ASSERT_EQ(r.create(dir.file("r.nc")), 0);
  GrdFile* second = nullptr;
  EXPECT_NE(grdFileCreate(dir.file("s.nc").c_str(), r.header, &second), 0);
  EXPECT_NE(grdSetDeleteValFloat(r.header, 0.0f), 0);
  EXPECT_NE(grdWriteItemTimeStep(r.header, r.file, 0.0, nullptr), 0);
}

// ---- a file appears whole or not at all -------------------------------------

TEST(GridFileWriteAtomic, NothingUnderTheNameBeforeClose) {
  ScratchDir dir;
  const std::string path = dir.file("r.nc");
  test::writeBytes(path, "earlier result");
  ResultHeader r(2, "Temperature", 2, "LOCAL");
  ASSERT_EQ(r.create(path), 0);
  ASSERT_EQ(r.write(ramp(24)), 0);
  EXPECT_EQ(test::readBytes(path), "earlier result");
  EXPECT_EQ(dir.entries(), std::vector<std::string>{"r.nc"});
  ASSERT_EQ(r.close(), 0);
  EXPECT_EQ(r.file, nullptr);
  EXPECT_EQ(dir.entries(), std::vector<std::string>{"r.nc"});
  EXPECT_EQ(test::readBytes(path).substr(1, 3), "HDF");
}

TEST(GridFileWriteAtomic, AbandonAndDestroyKeepTheEarlierFile) {
  ScratchDir dir;
  const std::string kept = dir.file("kept.nc");
  test::writeBytes(kept, "earlier result");
  {
    ResultHeader r(2, "Temperature", 2, "LOCAL");
    ASSERT_EQ(r.create(kept), 0);
    ASSERT_EQ(r.write(ramp(24)), 0);
    ASSERT_EQ(grdFileAbandon(r.header, &r.file), 0);
    EXPECT_EQ(r.file, nullptr);
    EXPECT_NE(grdFileClose(r.header, &r.file), 0);
  }
  {
    // The header goes while its file is still open.
    ResultHeader r(2, "Temperature", 2, "LOCAL");
    ASSERT_EQ(r.create(dir.file("never.nc")), 0);
    ASSERT_EQ(r.write(ramp(24)), 0);
    GrdFile* open = r.file;
    r.file = nullptr;
    (void)open;
  }
  EXPECT_EQ(test::readBytes(kept), "earlier result");
  EXPECT_EQ(dir.entries(), std::vector<std::string>{"kept.nc"});
}

TEST(GridFileWriteAtomic, FailedCloseLeavesNoTrace) {
  ScratchDir dir;
  const std::string path = dir.file("r.nc");
  ResultHeader r(2, "Temperature", 2, "LOCAL");
  ASSERT_EQ(r.create(path), 0);
  ASSERT_EQ(r.write(ramp(24)), 0);
  // The name has become a directory in the meantime: the rename fails.
  ASSERT_EQ(mkdir(path.c_str(), 0700), 0);
  test::writeBytes(path + "/inside", "x");
  EXPECT_NE(r.close(), 0);
  EXPECT_EQ(r.file, nullptr);
  EXPECT_EQ(dir.entries(), std::vector<std::string>{"r.nc"});
  EXPECT_EQ(test::readBytes(path + "/inside"), "x");
}

// A run that ends while its result is being written, by exit() or killed
// outright, leaves the earlier result and no temporary file.
TEST(GridFileWriteAtomic, EndedRunLeavesEarlierResultAndNoTemporary) {
  for (const bool killed : {false, true}) {
    ScratchDir dir;
    const std::string path = dir.file("r.nc");
    test::writeBytes(path, "earlier result");
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      GrdHeader* header = nullptr;
      GrdFile* file = nullptr;
      std::vector<float> data(200 * 200 * 5, 1.0f);
      if (grdHeaderCreate(1, path.c_str(), "", 1, 1, 2, &header) != 0) _exit(20);
      GrdItem* item = grdItemD(header, 1);
      grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0);
      grdSetItemInfo(header, item, 2, "Temperature", 2, 1);
      grdSetItemAxisEqD3(item, 1000, 200, 200, 5, 0, 0, 0, 1, 1, 1);
      grdSetGeoInfoUTMProj(header, "LOCAL", 0, 0, 0);
      if (grdFileCreate(path.c_str(), header, &file) != 0) _exit(21);
      if (grdWriteItemTimeStep(header, file, 0.0, data.data()) != 0) _exit(22);
      if (killed) raise(SIGKILL);
      std::exit(7);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    if (killed) {
      ASSERT_TRUE(WIFSIGNALED(status));
    } else {
      ASSERT_TRUE(WIFEXITED(status));
      ASSERT_EQ(WEXITSTATUS(status), 7);
    }
    EXPECT_EQ(test::readBytes(path), "earlier result");
    EXPECT_EQ(dir.entries(), std::vector<std::string>{"r.nc"});
  }
}

}  // namespace
}  // namespace karnet
