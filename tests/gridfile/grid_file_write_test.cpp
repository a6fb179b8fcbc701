// Writing gridded files: the layout of a written file, refused settings, files
// that appear under their name only when complete, and the georeferenced layout
// of a result (depth axis, x and y, lon and lat row by row, the CF grid mapping).
#include <gtest/gtest.h>
#include <netcdf.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/grid_file_internal.h"
#include "gridfile/nc_test_files.h"

namespace karnet {
namespace {

constexpr float kMisc[7] = {12.5f, -1e-30f, -900.0f, 10.0f, -1e-30f, -1e-30f, -1e-30f};
const std::string kEarlier = "earlier result";

// A header described the way the result writer describes one.
struct ResultHeader {
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  explicit ResultHeader(const char* projection = "LOCAL", const char* title = "") {
    EXPECT_EQ(grdHeaderCreate(1, "unused.nc", title, 1, 1, 2, &header), 0);
    EXPECT_EQ(grdSetDeleteValFloat(header, -1e-30f), 0);
    EXPECT_EQ(grdSetDeleteValDouble(header, -1e-30), 0);
    EXPECT_EQ(grdSetDataType(header, 0), 0);
    EXPECT_EQ(grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0), 0);
    GrdItem* item = grdItemD(header, 1);
    EXPECT_EQ(grdSetItemInfo(header, item, 2, "Temperature", 2, 1), 0);
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

// One step written and the file closed; 0 on success.
int writeOnce(ResultHeader& r, const std::string& path) {
  return r.create(path) != 0 || r.write(ramp()) != 0 ? 1 : r.close();
}

// What ncdump sees in a written file that replaced an earlier one, and the
// reader reading its steps back.
TEST_F(GridFileWrite, ResultFileLayout) {
  test::writeBytes(path, kEarlier);
  ResultHeader r("UTM-32", "a run");
  ASSERT_EQ(r.create(path), 0);
  ASSERT_EQ(r.write(ramp(), 0.0), 0);
  ASSERT_EQ(r.write(ramp(100.0f), 60.0), 0);
  ASSERT_EQ(r.close(), 0);
  EXPECT_EQ(entries(), std::vector<std::string>{"test.nc"});

  EXPECT_EQ(test::ncdump(path, "-k"), "netCDF-4\n");
  const std::string dump = test::ncdump(path, "-v x,y,z,time,Temperature");
  test::expectParts(
      dump, {"time = UNLIMITED ; // (2 currently)", "float Temperature(time, z, y, x) ;",
             "Temperature:_FillValue = -1.e-30f ;", "Temperature:long_name = \"Temperature\" ;",
             "Temperature:item_type = 2 ;", "x:axis = \"X\" ;", "z:spacing = 2.5 ;",
             "time:units = \"seconds since 1900-02-28 00:00:00\" ;",
             "crs:origin_longitude = 9.5 ;", "crs:origin_latitude = 55.25 ;", "UTM zone 32N",
             ":title = \"a run\" ;",
             ":Q84_Misc = 12.5f, -1.e-30f, -900.f, 10.f, -1.e-30f, -1.e-30f, -1.e-30f ;",
             " x = 0, 50, 100, 150 ;", " y = 0, 25, 50 ;", " z = 0, 2.5 ;", " time = 0, 60 ;"});
  // Stored as given: x fastest, then y, then z, then time.
  test::expectParts(dump, {" Temperature =\n  0, 0.5, 1, 1.5,\n  2, 2.5, 3, 3.5,\n",
                           "  10, 10.5, 11, 11.5,\n  100, 100.5, 101, 101.5,\n",
                           "  110, 110.5, 111, 111.5 ;"});

  GrdHeader* header = nullptr;
  GrdFile* handle = nullptr;
  ASSERT_EQ(grdFileRead(path.c_str(), &header, &handle), 0);
  std::vector<float> data(24);
  double time = -1;
  for (const auto& [when, first] : {std::pair{0.0, 0.0f}, std::pair{60.0, 100.0f}}) {
    ASSERT_EQ(grdReadItemTimeStep(header, handle, &time, data.data()), 0);
    EXPECT_EQ(time, when);
    EXPECT_EQ(data, ramp(first));
  }
  EXPECT_NE(grdReadItemTimeStep(header, handle, &time, data.data()), 0);
  grdHeaderDestroy(&header);
}

TEST_F(GridFileWrite, RefusedSettingsAndPlaces) {
  GrdHeader* header = nullptr;
  ASSERT_EQ(grdHeaderCreate(1, "a.nc", nullptr, 1, 1, 2, &header), 0);
  GrdItem* item = grdItemD(header, 1);
  EXPECT_NE(grdSetItemAxisEqD3(item, 1001, 2, 2, 2, 0, 0, 0, 1, 1, 1), 0);  // not metres
  EXPECT_NE(grdSetItemAxisEqD3(item, 1000, 70000, 70000, 1, 0, 0, 0, 1, 1, 1), 0);
  EXPECT_NE(grdAddCustomBlock(header, 1, "title", 7, kMisc), 0);  // a name the file uses itself
  // The item has no key text and type yet: no file.
  GrdFile* handle = nullptr;
  EXPECT_NE(grdFileCreate(file("a.nc").c_str(), header, &handle), 0);
  grdHeaderDestroy(&header);

  ResultHeader r;
  EXPECT_NE(grdAddCustomBlock(r.header, 1, "Q84_Misc", 7, kMisc), 0);  // twice
  EXPECT_NE(r.create(file("no/such/dir/r.nc")), 0);
  EXPECT_NE(r.create(dir), 0);
  EXPECT_TRUE(entries().empty());
  // Once a file is open, a second one is refused and the header is fixed.
  ASSERT_EQ(r.create(path), 0);
  EXPECT_NE(grdFileCreate(file("s.nc").c_str(), r.header, &handle), 0);
  EXPECT_NE(grdSetDeleteValFloat(r.header, 0.0f), 0);
}

// Why a file cannot be created, in the words the user sees after its name.
TEST_F(GridFileWrite, CreateProblemsAreNamed) {
  test::writeBytes(file("plain.txt"), "x\n");
  EXPECT_EQ(grdCreateProblem(path), "");
  EXPECT_EQ(grdCreateProblem(""), "no file name");
  EXPECT_EQ(grdCreateProblem(file("out/")), "the name ends in '/' (a directory)");
  EXPECT_EQ(grdCreateProblem(dir), "is a directory");
  EXPECT_EQ(grdCreateProblem(file("no/such/dir/r.nc")), "No such file or directory");
  EXPECT_EQ(grdCreateProblem(file("plain.txt/r.nc")), file("plain.txt") + " is not a directory");
  if (geteuid() != 0) {  // permissions do not bind root
    std::filesystem::create_directory(file("locked"));
    std::filesystem::permissions(file("locked"), std::filesystem::perms::owner_read |
                                                     std::filesystem::perms::owner_exec);
    EXPECT_EQ(grdCreateProblem(file("locked/r.nc")), "Permission denied");
    std::filesystem::permissions(file("locked"), std::filesystem::perms::owner_all);
  }
}

// A second item with attributes of its own, named by the first as its
// ancillary variable, each item written with its own values.
TEST_F(GridFileWrite, SecondItemWithItsOwnAttributesAndValues) {
  GrdHeader* header = nullptr;
  ASSERT_EQ(grdHeaderCreate(2, "unused.nc", "", 1, 1, 2, &header), 0);
  ASSERT_EQ(grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0), 0);
  GrdItem* item = grdItemD(header, 1);
  GrdItem* error = grdItemD(header, 2);
  ASSERT_EQ(grdSetItemInfo(header, item, 2, "Temperature", 2, 1), 0);
  ASSERT_EQ(grdSetItemInfo(header, error, 1, "Temperature_error", 0, 1), 0);
  for (GrdItem* i : {item, error}) {
    ASSERT_EQ(grdSetItemAxisEqD3(i, 1000, 4, 3, 2, 0.0f, 0.0f, 0.0f, 50.0f, 25.0f, 2.5f), 0);
  }
  ASSERT_EQ(grdSetItemAttribute(error, "units", "1"), 0);
  ASSERT_EQ(grdSetItemAttribute(error, "long_name", "first"), 0);
  ASSERT_EQ(grdSetItemAttribute(error, "long_name", "relative error"), 0);  // replaced
  EXPECT_NE(grdSetItemAttribute(error, "_FillValue", "0"), 0);
  EXPECT_NE(grdSetItemAncillary(item, item), 0);
  ASSERT_EQ(grdSetItemAncillary(item, error), 0);
  GrdFile* handle = nullptr;
  ASSERT_EQ(grdFileCreate(path.c_str(), header, &handle), 0);
  ASSERT_EQ(grdWriteItemTimeStep(header, handle, 0.0, ramp().data()), 0);
  EXPECT_NE(grdWriteItemNTimeStep(header, handle, 3, 0.0, ramp().data()), 0);  // no item 3
  ASSERT_EQ(grdWriteItemNTimeStep(header, handle, 2, 0.0, ramp(100.0f).data()), 0);
  ASSERT_EQ(grdFileClose(header, &handle), 0);
  grdHeaderDestroy(&header);

  const std::string dump = test::ncdump(path, "-v Temperature_error");
  test::expectParts(dump, {"Temperature:ancillary_variables = \"Temperature_error\" ;",
                           "Temperature_error:units = \"1\" ;",
                           "Temperature_error:long_name = \"relative error\" ;",
                           "time = UNLIMITED ; // (1 currently)",
                           " Temperature_error =\n  100, 100.5, 101, 101.5,"});
  EXPECT_EQ(dump.find("\"first\""), std::string::npos);
}

// Levels too large for one chunk are stored in row blocks, the last one
// padded; levels written one at a time or in batches compressed on several
// threads give the same bytes, and every value reads back as written.
TEST_F(GridFileWrite, ChunkedLevelsReadBackAndDoNotDependOnThreads) {
  constexpr std::int32_t nx = 2100, ny = 2100, nz = 3;  // two chunks per level
  std::vector<float> values(static_cast<std::size_t>(nx) * ny * nz);
  std::uint32_t seed = 7;
  for (float& v : values) {
    seed = seed * 1664525u + 1013904223u;
    v = static_cast<float>(seed >> 8) * 1e-5f;
  }
  values[5] = -1e-30f;
  auto writeWith = [&](int threads, std::int32_t batch, const std::string& name) {
    GrdHeader* header = nullptr;
    EXPECT_EQ(grdHeaderCreate(1, "unused.nc", "", 1, 1, 2, &header), 0);
    EXPECT_EQ(grdSetDeleteValFloat(header, -1e-30f), 0);
    EXPECT_EQ(grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0), 0);
    GrdItem* item = grdItemD(header, 1);
    EXPECT_EQ(grdSetItemInfo(header, item, 2, "Temperature", 2, 1), 0);
    EXPECT_EQ(grdSetItemAxisEqD3(item, 1000, nx, ny, nz, 0.0f, 0.0f, 0.0f, 1.0f, 1.0f, 1.0f), 0);
    EXPECT_EQ(grdSetCompressionThreads(header, threads), 0);
    GrdFile* handle = nullptr;
    EXPECT_EQ(grdFileCreate(file(name).c_str(), header, &handle), 0);
    const std::size_t level = static_cast<std::size_t>(nx) * ny;
    for (std::int32_t l = 0; l < nz; l += batch) {
      const std::int32_t count = std::min(batch, nz - l);
      EXPECT_EQ(grdWriteItemLevels(header, handle, l, count, values.data() + l * level), 0);
    }
    EXPECT_NE(grdWriteItemLevels(header, handle, nz - 1, 2, values.data()), 0);  // past the top
    EXPECT_EQ(grdFinishItemTimeStep(header, handle, 0.0), 0);
    EXPECT_EQ(grdFileClose(header, &handle), 0);
    grdHeaderDestroy(&header);
    return test::readBytes(file(name));
  };
  const std::string one = writeWith(1, 1, "one.nc");
  EXPECT_EQ(writeWith(3, 3, "three.nc"), one);
  EXPECT_EQ(writeWith(2, 2, "two.nc"), one);

  int ncid = -1, varid = -1;
  ASSERT_EQ(nc_open(file("one.nc").c_str(), NC_NOWRITE, &ncid), NC_NOERR);
  ASSERT_EQ(nc_inq_varid(ncid, "Temperature", &varid), NC_NOERR);
  std::size_t chunks[4] = {};
  int storage = 0;
  ASSERT_EQ(nc_inq_var_chunking(ncid, varid, &storage, chunks), NC_NOERR);
  EXPECT_LT(chunks[2], static_cast<std::size_t>(ny));
  std::vector<float> back(values.size());
  ASSERT_EQ(nc_get_var_float(ncid, varid, back.data()), NC_NOERR);
  nc_close(ncid);
  EXPECT_TRUE(back == values);
}

// Until it is closed, a file is not under its name: an earlier file stays,
// and an abandoned file, one whose header goes first or one that cannot take
// its name leaves nothing.
TEST_F(GridFileWriteAtomic, FileAppearsOnlyWhenClosed) {
  test::writeBytes(path, kEarlier);
  {
    ResultHeader abandoned;
    ASSERT_EQ(abandoned.create(path), 0);
    ASSERT_EQ(abandoned.write(ramp()), 0);
    ASSERT_EQ(grdFileAbandon(abandoned.header, &abandoned.file), 0);
    ResultHeader unclosed;
    ASSERT_EQ(unclosed.create(file("never.nc")), 0);
    ASSERT_EQ(unclosed.write(ramp()), 0);
    unclosed.file = nullptr;  // the header is destroyed while its file is open
  }
  EXPECT_EQ(test::readBytes(path), kEarlier);
  EXPECT_EQ(entries(), std::vector<std::string>{"test.nc"});

  // The name has become a directory in the meantime: the rename fails.
  const std::string taken = file("taken.nc");
  ResultHeader failing;
  ASSERT_EQ(failing.create(taken), 0);
  ASSERT_EQ(failing.write(ramp()), 0);
  ASSERT_EQ(mkdir(taken.c_str(), 0700), 0);
  EXPECT_NE(failing.close(), 0);
  EXPECT_EQ(entries(), (std::vector<std::string>{"taken.nc", "test.nc"}));
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
    EXPECT_TRUE(killed ? WIFSIGNALED(status) : WIFEXITED(status) && WEXITSTATUS(status) == 7)
        << status;
    EXPECT_EQ(test::readBytes(path), kEarlier);
    EXPECT_EQ(entries(), std::vector<std::string>{"test.nc"});
  }
}

TEST_F(GridFileWrite, GeoreferenceProjectedGridWithNodePositions) {
  ResultHeader h("UTM-32");
  GrdGeoreference g;
  g.firstDepth = 5.0;
  g.xFirst = 500000.0;
  g.yFirst = 6100000.0;
  g.projectedXY = true;
  std::vector<int> rows;
  g.rowGeolocation = [&rows](std::int32_t row, double* lon, double* lat) {
    rows.push_back(row);
    for (int i = 0; i < 4; ++i) {
      lon[i] = 9.0 + 0.25 * i;
      lat[i] = 55.0 + row;
    }
    return true;
  };
  g.globalAttributes = {{"title", "a run"}, {"history", "now: karnet case.pfs"}, {"empty", ""}};
  ASSERT_EQ(grdSetGeoreference(h.header, g), 0);
  ASSERT_EQ(writeOnce(h, path), 0);
  EXPECT_EQ(rows, (std::vector<int>{0, 1, 2}));

  const std::string dump = test::ncdump(path, "-v x,y,z,lon,lat");
  test::expectParts(
      dump, {"z:standard_name = \"depth\" ;", "z:positive = \"down\" ;", "z:spacing = 2.5 ;",
             "x:standard_name = \"projection_x_coordinate\" ;",
             "y:standard_name = \"projection_y_coordinate\" ;",
             "Temperature:grid_mapping = \"crs\" ;", "Temperature:coordinates = \"lon lat\" ;",
             "double lon(y, x) ;", "lon:units = \"degrees_east\" ;",
             "lat:standard_name = \"latitude\" ;",
             "crs:grid_mapping_name = \"transverse_mercator\" ;", "crs:spatial_ref = \"PROJCS[",
             ":title = \"a run\" ;", ":history = \"now: karnet case.pfs\" ;",
             " x = 500000, 500050, 500100, 500150 ;", " y = 6100000, 6100025, 6100050 ;",
             " z = 5, 2.5 ;", " lon =\n  9, 9.25, 9.5, 9.75,\n  9, 9.25, 9.5, 9.75,",
             " lat =\n  55, 55, 55, 55,\n  56, 56, 56, 56,\n  57, 57, 57, 57 ;"});
  EXPECT_EQ(dump.find(":empty"), std::string::npos);

  // lon and lat are coordinates, not items: the file has one item.
  GrdHeader* read = nullptr;
  GrdFile* handle = nullptr;
  ASSERT_EQ(grdFileRead(path.c_str(), &read, &handle), 0);
  EXPECT_EQ(grdGetNoOfItems(read), 1);
  grdHeaderDestroy(&read);
}

TEST_F(GridFileWrite, GeoreferenceTurnedGridIsNotPlacedThroughXAndY) {
  ResultHeader h("UTM-32");
  GrdGeoreference g;
  g.firstDepth = 5.0;
  g.itemGridMapping = false;
  g.rowGeolocation = [](std::int32_t, double* lon, double* lat) {
    for (int i = 0; i < 4; ++i) lon[i] = lat[i] = 1.0;
    return true;
  };
  ASSERT_EQ(grdSetGeoreference(h.header, g), 0);
  ASSERT_EQ(writeOnce(h, path), 0);
  const std::string dump = test::ncdump(path, "-v x");
  test::expectParts(dump, {"distance from the origin node along the grid",
                           " x = 0, 50, 100, 150 ;", "Temperature:coordinates = \"lon lat\" ;"});
  EXPECT_EQ(dump.find("Temperature:grid_mapping"), std::string::npos) << dump;
  EXPECT_EQ(dump.find("projection_x_coordinate"), std::string::npos) << dump;
}

TEST_F(GridFileWrite, GeoreferenceRefusedAttributesAndFailedPositions) {
  {
    ResultHeader h("UTM-32");
    GrdGeoreference g;
    g.globalAttributes = {{"Conventions", "CF-1.6"}};
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
    g.globalAttributes = {{"history", "a"}, {"history", "b"}};
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
    g.globalAttributes = {{"Q84_Misc", "clashes with a custom block"}};
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
    g.globalAttributes.clear();
    g.firstDepth = NAN;
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
  }
  // Positions that cannot be computed leave no file.
  ResultHeader h("UTM-32");
  GrdGeoreference g;
  g.rowGeolocation = [](std::int32_t row, double*, double*) { return row < 1; };
  ASSERT_EQ(grdSetGeoreference(h.header, g), 0);
  EXPECT_NE(grdFileCreate(path.c_str(), h.header, &h.file), 0);
  EXPECT_TRUE(entries().empty());
}

// The CF attributes of a projection text, as name -> numbers.
std::map<std::string, std::vector<double>> cf(const std::string& projection, std::string* name) {
  std::map<std::string, std::vector<double>> out;
  name->clear();
  for (const GrdCfAttribute& a : grdCfGridMapping(projection)) {
    if (a.name == "grid_mapping_name") {
      *name = a.text;
    } else {
      out[a.name] = a.numbers;
    }
  }
  return out;
}

TEST(CfGridMapping, ParametersOfTheCommonProjections) {
  struct Case {
    const char* projection;
    const char* name;
    std::map<std::string, std::vector<double>> expected;
  };
  const std::vector<Case> cases = {
      {"UTM-32", "transverse_mercator",
       {{"longitude_of_central_meridian", {9}}, {"latitude_of_projection_origin", {0}},
        {"scale_factor_at_central_meridian", {0.9996}}, {"false_easting", {500000}},
        {"false_northing", {0}}, {"semi_major_axis", {6378137}},
        {"inverse_flattening", {298.257223563}}}},
      {"utm-33s", "transverse_mercator",
       {{"longitude_of_central_meridian", {15}}, {"false_northing", {10000000}}}},
      {"+proj=tmerc +lat_0=50 +lon_0=-3 +k=0.9 +x_0=100 +y_0=-200 +ellps=GRS80",
       "transverse_mercator",
       {{"latitude_of_projection_origin", {50}}, {"longitude_of_central_meridian", {-3}},
        {"scale_factor_at_central_meridian", {0.9}}, {"false_easting", {100}},
        {"false_northing", {-200}}}},
      {"EPSG:2154", "lambert_conformal_conic",
       {{"standard_parallel", {49, 44}}, {"latitude_of_projection_origin", {46.5}},
        {"longitude_of_central_meridian", {3}}, {"false_easting", {700000}},
        {"false_northing", {6600000}}}},
      {"EPSG:3338", "albers_conical_equal_area",
       {{"standard_parallel", {55, 65}}, {"latitude_of_projection_origin", {50}},
        {"longitude_of_central_meridian", {-154}}}},
      {"EPSG:3413", "polar_stereographic",
       {{"latitude_of_projection_origin", {90}}, {"standard_parallel", {70}},
        {"straight_vertical_longitude_from_pole", {-45}}}},
      {"EPSG:3031", "polar_stereographic",
       {{"latitude_of_projection_origin", {-90}}, {"standard_parallel", {-71}}}},
      {"EPSG:3395", "mercator",
       {{"longitude_of_projection_origin", {0}}, {"scale_factor_at_projection_origin", {1}}}},
  };
  for (const Case& c : cases) {
    std::string name;
    const auto got = cf(c.projection, &name);
    EXPECT_EQ(name, c.name) << c.projection;
    for (const auto& [attribute, values] : c.expected) {
      const auto it = got.find(attribute);
      ASSERT_NE(it, got.end()) << c.projection << " lacks " << attribute;
      ASSERT_EQ(it->second.size(), values.size()) << c.projection << " " << attribute;
      for (std::size_t i = 0; i < values.size(); ++i) {
        EXPECT_NEAR(it->second[i], values[i], 1e-9) << c.projection << " " << attribute;
      }
    }
  }
  // No CF grid mapping: none invented.
  for (const char* projection : {"LOCAL", "+proj=sinu +lon_0=10", "no such thing"}) {
    EXPECT_TRUE(grdCfGridMapping(projection).empty()) << projection;
  }
}

}  // namespace
}  // namespace karnet
