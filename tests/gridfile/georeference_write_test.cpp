// The georeferenced layout of a result file: depth axis, x and y, lon and lat
// written row by row, the CF grid mapping of the crs variable, and the
// provenance attributes.
#include <gtest/gtest.h>

#include <cmath>
#include <map>
#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/grid_file_internal.h"
#include "gridfile/nc_test_files.h"

namespace karnet {
namespace {

// A 4 x 3 x 2 result header the way the result writer describes one.
struct Header {
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  explicit Header(const char* projection) {
    EXPECT_EQ(grdHeaderCreate(1, "unused.nc", "", 1, 1, 2, &header), 0);
    EXPECT_EQ(grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0), 0);
    GrdItem* item = grdItemD(header, 1);
    EXPECT_EQ(grdSetItemInfo(header, item, 2, "Temperature", 2, 1), 0);
    EXPECT_EQ(grdSetItemAxisEqD3(item, 1000, 4, 3, 2, 0.0f, 0.0f, 0.0f, 50.0f, 25.0f, 2.5f), 0);
    EXPECT_EQ(grdSetGeoInfoUTMProj(header, projection, 9.5, 55.25, 12.5), 0);
  }
  ~Header() {
    if (file != nullptr) grdFileAbandon(header, &file);
    grdHeaderDestroy(&header);
  }
  int writeTo(const std::string& path) {
    if (grdFileCreate(path.c_str(), header, &file) != 0) return 1;
    const std::vector<float> values(24, 1.5f);
    if (grdWriteItemTimeStep(header, file, 0.0, values.data()) != 0) return 1;
    return grdFileClose(header, &file);
  }
};

class Georeference : public test::ScratchTest {};

TEST_F(Georeference, ProjectedGridWithNodePositions) {
  Header h("UTM-32");
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
  ASSERT_EQ(h.writeTo(path), 0);
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

TEST_F(Georeference, TurnedGridIsNotPlacedThroughXAndY) {
  Header h("UTM-32");
  GrdGeoreference g;
  g.firstDepth = 5.0;
  g.itemGridMapping = false;
  g.rowGeolocation = [](std::int32_t, double* lon, double* lat) {
    for (int i = 0; i < 4; ++i) lon[i] = lat[i] = 1.0;
    return true;
  };
  ASSERT_EQ(grdSetGeoreference(h.header, g), 0);
  ASSERT_EQ(h.writeTo(path), 0);
  const std::string dump = test::ncdump(path, "-v x");
  test::expectParts(dump, {"distance from the origin node along the grid",
                           " x = 0, 50, 100, 150 ;", "Temperature:coordinates = \"lon lat\" ;"});
  EXPECT_EQ(dump.find("Temperature:grid_mapping"), std::string::npos) << dump;
  EXPECT_EQ(dump.find("projection_x_coordinate"), std::string::npos) << dump;
}

TEST_F(Georeference, RefusedAttributesAndFailedPositions) {
  {
    Header h("UTM-32");
    GrdGeoreference g;
    g.globalAttributes = {{"Conventions", "CF-1.6"}};
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
    g.globalAttributes = {{"history", "a"}, {"history", "b"}};
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
    g.globalAttributes = {{"Q84_Misc", "clashes with a custom block"}};
    const float misc[1] = {1.0f};
    ASSERT_EQ(grdAddCustomBlock(h.header, 1, "Q84_Misc", 1, misc), 0);
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
    g.globalAttributes.clear();
    g.firstDepth = NAN;
    EXPECT_NE(grdSetGeoreference(h.header, g), 0);
  }
  // Positions that cannot be computed leave no file.
  Header h("UTM-32");
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
