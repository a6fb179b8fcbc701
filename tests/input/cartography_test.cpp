#include "input/cartography.h"

#include <gtest/gtest.h>

#include <cmath>
#include <numbers>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace karnet {
namespace {

constexpr double kDegree = std::numbers::pi / 180.0;

// Grid north measured clockwise from true north, found from the projection
// itself: the image of a short step due north.
double numericConvergence(const Cartography& map, double longitude, double latitude) {
  double x0, y0, x1, y1;
  map.geoToProj(longitude, latitude - 1e-5, &x0, &y0);
  map.geoToProj(longitude, latitude + 1e-5, &x1, &y1);
  return -std::atan2(x1 - x0, y1 - y0) / kDegree;
}

TEST(CartographyTest, UtmKnownValues) {
  Cartography north("UTM-32", 0, 0, 0);
  double x, y;
  // The central meridian meets the equator at the false easting.
  north.geoToProj(9.0, 0.0, &x, &y);
  EXPECT_NEAR(x, 500000.0, 1e-6);
  EXPECT_NEAR(y, 0.0, 1e-6);
  // Grid convergence at 12°E 55°N (3° east of the central meridian).
  EXPECT_NEAR(north.convergence(12.0, 55.0), 2.458, 0.001);
  EXPECT_NEAR(north.convergence(6.0, 55.0), -2.458, 0.001);

  Cartography south("utm-32s", 0, 0, 0);
  south.geoToProj(9.0, 0.0, &x, &y);
  EXPECT_NEAR(x, 500000.0, 1e-6);
  EXPECT_NEAR(y, 10000000.0, 1e-6);
  EXPECT_LT(south.convergence(12.0, -30.0), 0.0);
}

TEST(CartographyTest, WebMercatorKnownValues) {
  Cartography map("EPSG:3857", 0, 0, 0);
  double x, y;
  map.geoToProj(180.0, 0.0, &x, &y);
  EXPECT_NEAR(x, 20037508.342789244, 1e-6);
  EXPECT_NEAR(y, 0.0, 1e-6);
  map.geoToProj(0.0, 45.0, &x, &y);
  EXPECT_NEAR(x, 0.0, 1e-6);
  EXPECT_NEAR(y, 5621521.486192066, 1e-5);
}

// Every way of naming WGS 84 / UTM zone 32 north gives the same coordinates.
TEST(CartographyTest, EquivalentTextsAgree) {
  const Cartography reference("UTM-32N", 0, 0, 0);
  double xr, yr;
  reference.geoToProj(10.5, 56.25, &xr, &yr);
  const std::string texts[] = {
      "UTM-32", "  utm-32n ", "EPSG:32632", "+proj=utm +zone=32 +datum=WGS84 +units=m +no_defs",
      "+proj=utm +zone=32 +datum=WGS84 +type=crs", reference.wkt(),
      // With heights (compound CRS) and with a datum shift (bound CRS).
      "EPSG:32632+5703", "+proj=utm +zone=32 +ellps=WGS84 +towgs84=0,0,0"};
  for (const std::string& text : texts) {
    SCOPED_TRACE(text);
    Cartography map(text, 0, 0, 0);
    double x, y;
    map.geoToProj(10.5, 56.25, &x, &y);
    EXPECT_NEAR(x, xr, 1e-6);
    EXPECT_NEAR(y, yr, 1e-6);
  }
  EXPECT_NE(reference.wkt().find("UTM zone 32N"), std::string::npos);
}

// Projected coordinates are easting first even for a CRS whose axes are
// northing first (DHDN / 3-degree Gauss-Kruger zone 3).
TEST(CartographyTest, EastingFirstWhateverTheAxisOrder) {
  Cartography map("EPSG:31467", 0, 0, 0);
  double x, y;
  map.geoToProj(9.0, 50.0, &x, &y);
  EXPECT_NEAR(x, 3500000.0, 1e-3);
  EXPECT_GT(y, 5500000.0);
  EXPECT_LT(y, 5600000.0);
  double longitude, latitude;
  map.projToGeo(x, y, &longitude, &latitude);
  EXPECT_NEAR(longitude, 9.0, 1e-9);
  EXPECT_NEAR(latitude, 50.0, 1e-9);
}

TEST(CartographyTest, RoundTripsAndConvergenceAgreeWithTheProjection) {
  struct Case {
    const char* text;
    double longitude, latitude;
  };
  const Case cases[] = {
      {"UTM-32", 12.0, 55.0},     {"UTM-32", 5.5, 61.0},     {"UTM-60S", 179.0, -45.0},
      {"UTM-1", -178.0, 10.0},    {"EPSG:3034", 20.0, 60.0}, {"EPSG:25833", 16.0, 52.0},
      {"EPSG:3035", -5.0, 40.0},  {"+proj=tmerc +lon_0=3 +lat_0=0 +k=0.9996 +ellps=GRS80", 7.0, 57.0},
      {"EPSG:31467", 11.0, 48.0}, {"EPSG:2263", -73.0, 41.0}, {"EPSG:27572", 1.5, 47.0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    Cartography map(c.text, c.longitude, c.latitude, 10.0);
    double x, y, longitude, latitude;
    map.geoToProj(c.longitude, c.latitude, &x, &y);
    ASSERT_TRUE(std::isfinite(x) && std::isfinite(y));
    map.projToGeo(x, y, &longitude, &latitude);
    EXPECT_NEAR(longitude, c.longitude, 1e-8);
    EXPECT_NEAR(latitude, c.latitude, 1e-8);
    // And the other way round, from a projected point.
    double x2, y2;
    map.geoToProj(longitude, latitude, &x2, &y2);
    EXPECT_NEAR(x2, x, 1e-3);
    EXPECT_NEAR(y2, y, 1e-3);
    EXPECT_NEAR(map.convergence(c.longitude, c.latitude),
                numericConvergence(map, c.longitude, c.latitude), 1e-4);
  }
}

TEST(CartographyTest, LocalIsTheIdentity) {
  for (const char* text : {"LOCAL", "local", " Local\t"}) {
    SCOPED_TRACE(text);
    Cartography map(text, 1000.0, 2000.0, 33.0);
    double x, y;
    map.geoToProj(1234.5, -678.25, &x, &y);
    EXPECT_EQ(x, 1234.5);
    EXPECT_EQ(y, -678.25);
    map.projToGeo(-5.0, 7.5, &x, &y);
    EXPECT_EQ(x, -5.0);
    EXPECT_EQ(y, 7.5);
    EXPECT_EQ(map.convergence(1234.5, -678.25), 0.0);
    EXPECT_EQ(map.wkt(), "");
  }
}

// The origin and orientation given to the constructor change no result.
TEST(CartographyTest, OriginAndOrientationChangeNothing) {
  Cartography a("UTM-33", 0, 0, 0);
  Cartography b("UTM-33", 14.0, 54.0, 45.0);
  double xa, ya, xb, yb;
  a.geoToProj(13.0, 55.0, &xa, &ya);
  b.geoToProj(13.0, 55.0, &xb, &yb);
  EXPECT_EQ(xa, xb);
  EXPECT_EQ(ya, yb);
  EXPECT_EQ(a.convergence(16.0, 55.0), b.convergence(16.0, 55.0));
}

TEST(CartographyTest, RejectedTexts) {
  const char* texts[] = {"",          "   ",         "UTM-",          "UTM-0",
                         "UTM-61",    "UTM-32X",     "UTM-32 N",      "UTM-3a",
                         "UTM-1000",  "EPSG:4326",   "EPSG:99999999", "nonsense",
                         "+proj=longlat +datum=WGS84", "+proj=nosuchprojection", "GEOGCS[",
                         "EPSG:5703"};
  for (const char* text : texts) {
    SCOPED_TRACE(text);
    EXPECT_THROW(Cartography(text, 0, 0, 0), std::runtime_error);
    EXPECT_EQ(cartographyCreate(0, 0, 0, text), -1);
  }
  EXPECT_EQ(cartographyCreate(0, 0, 0, nullptr), -1);
}

TEST(CartographyTest, RunObjectIsReplacedAndGoneAfterAFailedCreation) {
  ASSERT_EQ(cartographyCreate(0, 0, 0, "UTM-32"), 0);
  double x, y;
  cartographyGeoToProj(9.0, 0.0, &x, &y);
  EXPECT_NEAR(x, 500000.0, 1e-6);
  EXPECT_NEAR(cartographyConvergence(12.0, 55.0), 2.458, 0.001);

  ASSERT_EQ(cartographyCreate(9.0, 55.0, 5.0, "UTM-33"), 0);
  cartographyGeoToProj(15.0, 0.0, &x, &y);
  EXPECT_NEAR(x, 500000.0, 1e-6);
  double longitude, latitude;
  cartographyProjToGeo(x, y, &longitude, &latitude);
  EXPECT_NEAR(longitude, 15.0, 1e-9);
  EXPECT_NEAR(latitude, 0.0, 1e-9);

  // A failed creation leaves no object: results are NaN, not stale values.
  ASSERT_EQ(cartographyCreate(0, 0, 0, "UTM-99"), -1);
  cartographyGeoToProj(15.0, 0.0, &x, &y);
  EXPECT_TRUE(std::isnan(x) && std::isnan(y));
  cartographyProjToGeo(500000.0, 0.0, &longitude, &latitude);
  EXPECT_TRUE(std::isnan(longitude) && std::isnan(latitude));
  EXPECT_TRUE(std::isnan(cartographyConvergence(15.0, 0.0)));

  ASSERT_EQ(cartographyCreate(0, 0, 0, "LOCAL"), 0);
  cartographyGeoToProj(15.0, 3.0, &x, &y);
  EXPECT_EQ(x, 15.0);
  EXPECT_EQ(y, 3.0);
}

TEST(CartographyTest, PointsOutsideTheProjectionGiveNaN) {
  Cartography map("UTM-32", 0, 0, 0);
  double x, y;
  map.geoToProj(9.0, 95.0, &x, &y);
  EXPECT_TRUE(std::isnan(x) || std::isnan(y));
  EXPECT_TRUE(std::isnan(map.convergence(9.0, 95.0)));
  // The object stays usable afterwards.
  map.geoToProj(9.0, 0.0, &x, &y);
  EXPECT_NEAR(x, 500000.0, 1e-6);
  EXPECT_NEAR(map.convergence(12.0, 55.0), 2.458, 0.001);
}

// Each object has its own PROJ context: objects on different threads work
// side by side.
TEST(CartographyTest, ObjectsOnSeveralThreads) {
  std::vector<std::thread> threads;
  std::vector<int> failures(4, 0);
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([t, &failures] {
      const int zone = 31 + t;
      Cartography map("UTM-" + std::to_string(zone), 0, 0, 0);
      const double centre = 6.0 * zone - 183.0;
      for (int i = 0; i < 200; ++i) {
        double x, y, longitude, latitude;
        map.geoToProj(centre, 0.1 * i, &x, &y);
        map.projToGeo(x, y, &longitude, &latitude);
        if (std::fabs(x - 500000.0) > 1e-6 || std::fabs(latitude - 0.1 * i) > 1e-9) {
          ++failures[t];
        }
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  for (int t = 0; t < 4; ++t) EXPECT_EQ(failures[t], 0) << "thread " << t;
}

}  // namespace
}  // namespace karnet
