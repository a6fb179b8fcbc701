// Where the result writer places a grid: depths, x and y, and the nodes'
// longitudes and latitudes, checked against PROJ called directly; and what the
// result records about the run that made it.
#include <gtest/gtest.h>
#include <proj.h>

#include <cmath>
#include <cstdlib>
#include <cstring>
#include <map>
#include <numbers>
#include <utility>
#include <vector>

#include "common/utm32_reference.h"
#include "output/result_attributes.h"
#include "output/result_coordinates.h"
#include "params/run_parameters.h"
#include "support/file_description.h"

namespace karnet {
namespace {

constexpr double kDeg = test::kDegree;

using test::Utm32;

// A 7 x 5 x 4 result grid of 200 x 300 m cells and 5 m levels at (11.3 E, 55.2 N).
struct Description {
  FileDescription* d = descriptionNew(3);
  explicit Description(double orientation) {
    const double origins[3] = {11.3, 55.2, -20.0};
    const float spacings[3] = {200.0f, 300.0f, 5.0f};
    const std::int32_t last[3] = {6, 4, 3};
    for (int a = 0; a < 3; ++a) {
      d->axes[a + 1].origin = origins[a];
      d->axes[a + 1].spacing = spacings[a];
      d->axes[a + 1].lastIndex = last[a];
      d->axes[a + 1].factor = 1.0f;
    }
    d->misc[0] = orientation;
  }
  ~Description() { descriptionFree(d); }
};

struct Positions {
  std::vector<std::vector<double>> lon, lat;  // [row][column]
};
Positions positions(const GrdGeoreference& g) {
  Positions p;
  for (std::int32_t row = 0; row < 5; ++row) {
    std::vector<double> lon(7), lat(7);
    EXPECT_TRUE(g.rowGeolocation(row, lon.data(), lat.data()));
    p.lon.push_back(lon);
    p.lat.push_back(lat);
  }
  return p;
}

TEST(ResultCoordinates, GridParallelToTheProjectionHoldsProjectedCoordinates) {
  const Utm32 utm;
  const Description desc(utm.convergence(11.3, 55.2));
  GrdGeoreference g;
  ResultFrame frame;
  ASSERT_TRUE(resultGeoreference(*desc.d, "UTM-32", &g, &frame));
  EXPECT_FALSE(frame.turned);
  EXPECT_TRUE(g.projectedXY);
  EXPECT_TRUE(g.itemGridMapping);
  // Level l0 lies (lx - l0 + 1) * dz = 4 * 5 m below the surface.
  EXPECT_EQ(g.firstDepth, 20.0);
  const PJ_XY origin = utm.forward(11.3, 55.2);
  EXPECT_NEAR(g.xFirst, origin.x, 1e-6);
  EXPECT_NEAR(g.yFirst, origin.y, 1e-6);
  ASSERT_TRUE(g.rowGeolocation);
  const Positions p = positions(g);
  EXPECT_NEAR(p.lon[0][0], 11.3, 1e-9);
  EXPECT_NEAR(p.lat[0][0], 55.2, 1e-9);
  for (int j = 0; j < 5; ++j) {
    for (int i = 0; i < 7; ++i) {
      const PJ_XY geo = utm.inverse(g.xFirst + 200.0 * i, g.yFirst + 300.0 * j);
      EXPECT_NEAR(p.lon[j][i], geo.x, 1e-9) << i << "," << j;
      EXPECT_NEAR(p.lat[j][i], geo.y, 1e-9) << i << "," << j;
    }
  }
}

// The orientation is measured clockwise from true north to the grid's y axis: a node up
// the y axis lies that far clockwise from the projection's north, less the convergence.
TEST(ResultCoordinates, TurnedGridPlacesNodesAlongItsOwnAxes) {
  const Utm32 utm;
  const double gamma = utm.convergence(11.3, 55.2);
  const Description desc(gamma + 30.0);
  GrdGeoreference g;
  ASSERT_TRUE(resultGeoreference(*desc.d, "UTM-32", &g));
  EXPECT_FALSE(g.projectedXY);
  EXPECT_FALSE(g.itemGridMapping);
  EXPECT_EQ(g.xFirst, 0.0);
  EXPECT_EQ(g.yFirst, 0.0);
  const Positions p = positions(g);
  const PJ_XY origin = utm.forward(11.3, 55.2);
  for (int j = 0; j < 5; ++j) {
    for (int i = 0; i < 7; ++i) {
      const PJ_XY at = utm.forward(p.lon[j][i], p.lat[j][i]);
      const double east = at.x - origin.x, north = at.y - origin.y;
      // Turned back by the angle data scanning uses (pi to 10 digits).
      const double a = 30.0 * 3.141592654 / 180.0;
      const double xt = 200.0 * i, yt = 300.0 * j;
      EXPECT_NEAR(east, xt * std::cos(a) + yt * std::sin(a), 1e-5) << i << "," << j;
      EXPECT_NEAR(north, -xt * std::sin(a) + yt * std::cos(a), 1e-5) << i << "," << j;
    }
  }
  // Up the y axis: 30 degrees east of grid north; along the x axis: 120 degrees.
  const PJ_XY up = utm.forward(p.lon[4][0], p.lat[4][0]);
  EXPECT_NEAR(std::atan2(up.x - origin.x, up.y - origin.y) / kDeg, 30.0, 1e-6);
  const PJ_XY right = utm.forward(p.lon[0][6], p.lat[0][6]);
  EXPECT_NEAR(std::atan2(right.x - origin.x, right.y - origin.y) / kDeg, 120.0, 1e-6);
}

TEST(ResultCoordinates, PlainMetresHaveNoLongitudes) {
  for (const double orientation : {0.0, 30.0}) {
    Description desc(orientation);
    desc.d->axes[1].origin = 1000.0;
    desc.d->axes[2].origin = 2000.0;
    GrdGeoreference g;
    ASSERT_TRUE(resultGeoreference(*desc.d, "LOCAL", &g));
    EXPECT_FALSE(g.rowGeolocation);
    EXPECT_TRUE(g.itemGridMapping) << orientation;
    EXPECT_EQ(g.projectedXY, orientation == 0.0);
    EXPECT_EQ(g.xFirst, orientation == 0.0 ? 1000.0 : 0.0);
    EXPECT_EQ(g.yFirst, orientation == 0.0 ? 2000.0 : 0.0);
  }
  GrdGeoreference g;
  EXPECT_FALSE(resultGeoreference(*Description(0.0).d, "UTM-99", &g));
}

// A polar stereographic grid far from its central meridian has a large convergence, which
// the bathymetry keeps in single precision: still parallel. A turn of 1e-4 degrees is not.
TEST(ResultCoordinates, ParallelWithinTheOrientationsPrecision) {
  PJ_CONTEXT* context = proj_context_create();
  PJ* polar = proj_create(context, "+proj=stere +lat_0=90 +lat_ts=70 +lon_0=-45 +datum=WGS84");
  const double gamma =
      proj_factors(polar, proj_coord(120.37 * kDeg, 75.0 * kDeg, 0, 0)).meridian_convergence /
      kDeg;
  proj_destroy(polar);
  proj_context_destroy(context);
  ASSERT_GT(std::fabs(gamma), 100.0);
  // The case is one where the float rounding alone exceeds the plain tolerance.
  ASSERT_GT(std::fabs(static_cast<float>(gamma) - gamma), kParallelGridTolerance);
  for (const auto& [orientation, turned] :
       {std::pair{static_cast<double>(static_cast<float>(gamma)), false},
        std::pair{gamma + 1e-4, true}}) {
    Description desc(orientation);
    desc.d->axes[1].origin = 120.37;
    desc.d->axes[2].origin = 75.0;
    GrdGeoreference g;
    ResultFrame frame;
    ASSERT_TRUE(resultGeoreference(*desc.d, "EPSG:3413", &g, &frame));
    EXPECT_EQ(frame.turned, turned) << orientation - gamma;
    EXPECT_EQ(g.projectedXY, !turned);
  }
}

// What a result file records about the run that made it.
RunParameters parameters(std::int32_t analysis) {
  RunParameters p{};
  std::strcpy(p.inputFiles.DataFileName, "casts.txt");
  std::strcpy(p.inputFiles.FileName, "bathymetry.nc");
  std::strcpy(p.outputData.Title, "Basin temperature");
  p.gridDescription.ZRange[0] = 0;
  p.gridDescription.ZRange[1] = 19;
  p.gridDescription.Spacing = 2.5f;
  p.calculationParameters.SearchRadius = 3000.0f;
  p.calculationParameters.MaxExtrapolationDistance[0] = 5.0f;
  p.calculationParameters.MaxExtrapolationDistance[1] = 0.1f;
  p.calculationParameters.Analysis = analysis;
  p.objectiveAnalysisParameters.DecayDistance = 2500.0f;
  p.objectiveAnalysisParameters.FilterType = 1;
  p.objectiveAnalysisParameters.FilterOperations = 2;
  return p;
}

TEST(ResultAttributes, RecordWhatMadeTheResult) {
  const TextAttributes bilinear =
      resultGlobalAttributes(parameters(1), "karnet --quiet 'my case.pfs'", "1.2.3", 86400);
  std::map<std::string, std::string> a(bilinear.begin(), bilinear.end());
  EXPECT_EQ(bilinear.front().first, "title");
  EXPECT_EQ(a["title"], "Basin temperature");
  EXPECT_EQ(a["history"], "1970-01-02T00:00:00Z: karnet --quiet 'my case.pfs'");
  EXPECT_EQ(a["source"], "karnet 1.2.3");
  EXPECT_EQ(a["method"], "bilinear / distance-weighted interpolation");
  EXPECT_EQ(a["method_parameters"],
            "SearchRadius = 3000 m; MaxExtrapolationDistance = 5, 0.1 m; FilterOperations = 2; "
            "ZRange = 0, 19; Spacing = 2.5 m");
  EXPECT_EQ(a["input_observations"], "casts.txt");
  EXPECT_EQ(a["input_bathymetry"], "bathymetry.nc");

  const TextAttributes oa = resultGlobalAttributes(parameters(0), "karnet x.pfs", "1", 0);
  std::map<std::string, std::string> b(oa.begin(), oa.end());
  EXPECT_EQ(b["method"], "objective analysis (optimal interpolation)");
  EXPECT_NE(b["method_parameters"].find("DecayDistance = 2500 m"), std::string::npos);
  EXPECT_NE(b["method_parameters"].find("FilterType = 12 pts filter"), std::string::npos);
}

TEST(ResultAttributes, TimestampFromSourceDateEpoch) {
  setenv("SOURCE_DATE_EPOCH", "1700000000", 1);
  EXPECT_EQ(resultTimestamp(), 1700000000);
  setenv("SOURCE_DATE_EPOCH", "soon", 1);
  EXPECT_GT(resultTimestamp(), 1700000000);
  unsetenv("SOURCE_DATE_EPOCH");
}

}  // namespace
}  // namespace karnet
