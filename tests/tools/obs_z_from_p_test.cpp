// karnet-obs: height from pressure and ISO times.
#include <gtest/gtest.h>

#include <cmath>

#include "obs/iso_time.h"
#include "obs/z_from_p.h"

namespace karnet::obs {
namespace {

// Check values of TEOS-10 gsw_z_from_p(p, lat = 4) for p = 10, 50, 125, 250, 600, 1000 dbar,
// as documented with the GSW R package (gsw 1.0-5, example of gsw_z_from_p, from the GSW-C
// library, TEOS-10 version 3.05; http://www.teos-10.org/pubs/gsw/html/gsw_z_from_p.html).
TEST(ObsZFromP, PublishedCheckValues) {
  const double pressures[] = {10, 50, 125, 250, 600, 1000};
  const double heights[] = {-0.099445834469453e2, -0.497180897012550e2, -1.242726219409978e2,
                            -2.484700576548589e2, -5.958253480356214e2, -9.920919060719987e2};
  for (int i = 0; i < 6; ++i) {
    EXPECT_NEAR(zFromPressure(pressures[i], 4.0), heights[i], 1e-12 * std::fabs(heights[i]))
        << pressures[i] << " dbar";
  }
}

TEST(ObsZFromP, SurfaceLatitudeAndDepth) {
  EXPECT_EQ(zFromPressure(0.0, 45.0), 0.0);
  // Gravity grows towards the poles, so the same pressure lies less deep there; north and south
  // alike.
  EXPECT_GT(zFromPressure(1000.0, 80.0), zFromPressure(1000.0, 0.0));
  EXPECT_EQ(zFromPressure(1000.0, -30.0), zFromPressure(1000.0, 30.0));
  // Deep: a little less than a metre per dbar, as sea water is denser than 1000 kg/m3.
  const double z = zFromPressure(6000.0, 20.0);
  EXPECT_LT(z, -5800.0);
  EXPECT_GT(z, -6000.0);
  // A pressure slightly below zero at the surface lies slightly above it.
  EXPECT_GT(zFromPressure(-0.5, 10.0), 0.0);
}

TEST(ObsZFromP, EnthalpyIsTheIntegralOfSpecificVolume) {
  // Near the surface, dh/dp is the specific volume of standard sea water at 0 degC,
  // 9.7266e-4 m3/kg, times 1e4 Pa per dbar.
  EXPECT_NEAR(enthalpyStandardOcean(1.0), 9.726613854843870e-4 * 1e4, 1e-4);
  EXPECT_EQ(enthalpyStandardOcean(0.0), 0.0);
}

TEST(ObsIsoTime, DatesAndTimes) {
  double days = -1.0;
  bool dateOnly = false;
  ASSERT_TRUE(parseIsoTime("1950-01-01", &days, &dateOnly));
  EXPECT_EQ(days, 0.0);
  EXPECT_TRUE(dateOnly);
  ASSERT_TRUE(parseIsoTime("1970-01-01T12:00Z", &days, &dateOnly));
  EXPECT_EQ(days, 7305.5);
  EXPECT_FALSE(dateOnly);
  ASSERT_TRUE(parseIsoTime(" 2000-03-01 06:00:00.5 ", &days));
  EXPECT_DOUBLE_EQ(days, 18322.0 + (6 * 3600 + 0.5) / 86400.0);  // 2000 is a leap year
  ASSERT_TRUE(parseIsoTime("1950-01-02T01:30+03:00", &days));  // 22:30 UTC the day before
  EXPECT_DOUBLE_EQ(days, 22.5 / 24.0);
  ASSERT_TRUE(parseIsoTime("1950-01-01T20:00-0400", &days));
  EXPECT_DOUBLE_EQ(days, 1.0);
  EXPECT_EQ(daysSince1950(1949, 12, 31), -1);
  EXPECT_EQ(daysSince1950(2100, 3, 1) - daysSince1950(2100, 2, 28), 1);  // 2100 is not
  for (const char* bad : {"2007-02-29", "2007-13-01", "2007-1-01", "07-01-01", "2007-01-01T25:00",
                          "2007-01-01x", "2007/01/01", "", "2007-01-01T10",
                          "2007-01-01+02:00", "2007-01-01T10:00+2"}) {
    EXPECT_FALSE(parseIsoTime(bad, &days)) << bad;
  }
  ASSERT_TRUE(parseDaysSinceUnit("days since 1950-01-01 00:00:00 UTC", &days));
  EXPECT_EQ(days, 0.0);
  ASSERT_TRUE(parseDaysSinceUnit("Days since 1970-01-01", &days));
  EXPECT_EQ(days, 7305.0);
  EXPECT_FALSE(parseDaysSinceUnit("seconds since 1970-01-01", &days));
}

}  // namespace
}  // namespace karnet::obs
