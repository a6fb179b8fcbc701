#include "input/cartography.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <numbers>
#include <stdexcept>
#include <string>

namespace karnet {
namespace {

using Point = std::array<double, 2>;

Point toProj(const Cartography& map, double longitude, double latitude) {
  Point p;
  map.geoToProj(longitude, latitude, &p[0], &p[1]);
  return p;
}

Point toGeo(const Cartography& map, const Point& p) {
  Point g;
  map.projToGeo(p[0], p[1], &g[0], &g[1]);
  return g;
}

double distance(const Point& a, const Point& b) { return std::hypot(a[0] - b[0], a[1] - b[1]); }

// Grid north measured clockwise from true north, found from the projection
// itself: the image of a short step due north.
double numericConvergence(const Cartography& map, double longitude, double latitude) {
  const Point a = toProj(map, longitude, latitude - 1e-5);
  const Point b = toProj(map, longitude, latitude + 1e-5);
  return -std::atan2(b[0] - a[0], b[1] - a[1]) * 180.0 / std::numbers::pi;
}

TEST(CartographyTest, KnownValues) {
  // The central meridian at the equator, north and south; web Mercator.
  EXPECT_LT(distance(toProj(Cartography("UTM-32", 0, 0, 0), 9.0, 0.0), {500000.0, 0.0}), 1e-6);
  EXPECT_LT(distance(toProj(Cartography("utm-32s", 0, 0, 0), 9.0, 0.0), {500000.0, 1e7}), 1e-6);
  EXPECT_LT(distance(toProj(Cartography("EPSG:3857", 0, 0, 0), 180.0, 45.0),
                     {20037508.342789244, 5621521.486192066}),
            1e-5);
  // Grid convergence 3° east of the central meridian at 55°N.
  const Cartography utm32("UTM-32", 0, 0, 0);
  EXPECT_NEAR(utm32.convergence(12.0, 55.0), 2.458, 0.001);
  // Easting first even where the CRS's axes are northing first (DHDN /
  // 3-degree Gauss-Kruger zone 3; its round trip is below).
  const Point gk = toProj(Cartography("EPSG:31467", 0, 0, 0), 9.0, 50.0);
  EXPECT_NEAR(gk[0], 3500000.0, 1e-3);
  EXPECT_TRUE(gk[1] > 5500000.0 && gk[1] < 5600000.0) << gk[1];
  // Outside the projection: NaN, and the object stays usable.
  const Point pole = toProj(utm32, 9.0, 95.0);
  EXPECT_TRUE(std::isnan(pole[0]) || std::isnan(pole[1]));
  EXPECT_TRUE(std::isnan(utm32.convergence(9.0, 95.0)));
  EXPECT_NEAR(utm32.convergence(12.0, 55.0), 2.458, 0.001);
}

// Every way of naming WGS 84 / UTM zone 32 north gives the same coordinates,
// whatever origin and orientation the object is given.
TEST(CartographyTest, EquivalentTextsAgree) {
  const Cartography reference("UTM-32N", 0, 0, 0);
  const std::string texts[] = {
      "UTM-32", "  utm-32n ", "EPSG:32632", "+proj=utm +zone=32 +datum=WGS84 +units=m +no_defs",
      "+proj=utm +zone=32 +datum=WGS84 +type=crs", reference.wkt(),
      // With heights (compound CRS) and with a datum shift (bound CRS).
      "EPSG:32632+5703", "+proj=utm +zone=32 +ellps=WGS84 +towgs84=0,0,0"};
  for (const std::string& text : texts) {
    SCOPED_TRACE(text);
    const Cartography map(text, 14.0, 54.0, 45.0);
    EXPECT_LT(distance(toProj(map, 10.5, 56.25), toProj(reference, 10.5, 56.25)), 1e-6);
    EXPECT_NEAR(map.convergence(13.0, 55.0), reference.convergence(13.0, 55.0), 1e-12);
  }
}

TEST(CartographyTest, RoundTripsAndConvergenceAgreeWithTheProjection) {
  struct Case {
    const char* text;
    double longitude, latitude;
  };
  const Case cases[] = {
      {"UTM-60S", 179.0, -45.0}, {"UTM-1", -178.0, 10.0},     {"EPSG:3035", -5.0, 40.0},
      {"EPSG:31467", 11.0, 48.0}, {"EPSG:2263", -73.0, 41.0}, {"EPSG:27572", 1.5, 47.0},
      {"+proj=tmerc +lon_0=3 +lat_0=0 +k=0.9996 +ellps=GRS80", 7.0, 57.0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    const Cartography map(c.text, c.longitude, c.latitude, 10.0);
    const Point back = toGeo(map, toProj(map, c.longitude, c.latitude));
    EXPECT_LT(distance(back, {c.longitude, c.latitude}), 1e-8);
    EXPECT_NEAR(map.convergence(c.longitude, c.latitude),
                numericConvergence(map, c.longitude, c.latitude), 1e-4);
  }
}

TEST(CartographyTest, LocalIsTheIdentity) {
  for (const char* text : {"LOCAL", "local", " Local\t"}) {
    SCOPED_TRACE(text);
    const Cartography map(text, 1000.0, 2000.0, 33.0);
    EXPECT_EQ(toProj(map, 1234.5, -678.25), Point({1234.5, -678.25}));
    EXPECT_EQ(toGeo(map, {-5.0, 7.5}), Point({-5.0, 7.5}));
    EXPECT_EQ(map.convergence(1234.5, -678.25), 0.0);
    EXPECT_EQ(map.wkt(), "");
  }
}

TEST(CartographyTest, RejectedTexts) {
  const char* texts[] = {"   ", "UTM-", "UTM-0", "UTM-61", "UTM-32X", "UTM-32 N", "EPSG:4326",
                         "EPSG:99999999", "EPSG:5703", "nonsense", "+proj=longlat +datum=WGS84",
                         "+proj=nosuchprojection", "GEOGCS["};
  for (const char* text : texts) {
    SCOPED_TRACE(text);
    EXPECT_THROW(Cartography(text, 0, 0, 0), std::runtime_error);
  }
}

}  // namespace
}  // namespace karnet
