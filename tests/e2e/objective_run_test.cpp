// Complete objective-analysis runs on a basin small enough that every result
// value follows in closed form: the optimal-interpolation estimate from three
// casts, smoothed by the filter the parameter file names, clipped.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <sstream>

#include "common/closed_forms.h"
#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

constexpr int kNx = 8, kNy = 7;

bool dry(int i, int j) { return i == 0 || j == 0 || i == kNx - 1 || j == kNy - 1; }

// Three casts, the same value at every one of the ten levels.
const std::vector<reference::Cell> kCasts = {{2, 2, 10.0}, {5, 3, 16.0}, {3, 5, 12.0}};

// An 8 x 7 node basin of 250 m cells, 25 m deep, with a dry rim (LOCAL, origin
// (1000, 2000)). Decay length 500 m, zero crossing 1250 m, error variance 10 %.
void writeCase(const TempDir& dir, ParameterFile p) {
  BathymetrySpec b = localBasin(kNx, kNy, 250.0, -25.0f);
  for (int j = 0; j < kNy; ++j)
    for (int i = 0; i < kNx; ++i) b.heights[j * kNx + i] = dry(i, j) ? b.landValue : -25.0f;
  writeBathymetry(dir.file("bathymetry.nc"), b);
  std::ostringstream obs;
  for (const auto& cast : kCasts) {
    for (int level = 1; level <= 10; ++level) {
      obs << 1000.0 + 250.0 * cast.x << ' ' << 2000.0 + 250.0 * cast.y << ' ' << -2.0 * level
          << ' ' << cast.value << '\n';
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  p.zRange = "0, 9";
  p.spacing = "2";
  p.searchRadius = "10000";
  p.analysis = "objective";
  p.decayDistance = "500";
  p.zeroCrossingDistance = "1250";
  p.errorVariance = "10";
  writeFile(dir.file("case.pfs"), p.render());
}

TEST(ObjectiveRun, EveryWetNodeIsTheSmoothedClippedEstimate) {
  const struct {
    const char* filterType;
    bool twelvePoint;
    const char* operations;
    double minData, maxData;
  } cases[] = {
      {"'12 pts filter'", true, "0", -5, 40},
      {"'12 pts filter'", true, "1", 11, 14.5},
      {"'12 PTS FILTER'", true, "2", -5, 40},
      {"shapiro", false, "1", 11.5, 15},
      {"'something else'", false, "2", -5, 40},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.filterType) + " x" + c.operations);
    TempDir dir;
    ParameterFile p;
    p.filterType = c.filterType;
    p.filterOperations = c.operations;
    p.minData = std::to_string(c.minData);
    p.maxData = std::to_string(c.maxData);
    writeCase(dir, p);
    const CaseRun r = runCase(dir);
    ASSERT_EQ(r.exitCode, 0) << r.log;

    reference::Field expected{kNx, kNy, {}, [](double v) { return std::isnan(v); }};
    for (int j = 0; j < kNy; ++j) {
      for (int i = 0; i < kNx; ++i) {
        expected.v.push_back(dry(i, j) ? std::nan("")
                                       : reference::optimalInterpolation(kCasts, i, j, 2, 5, 10));
      }
    }
    for (int a = 0; a < std::stoi(c.operations); ++a) {
      if (c.twelvePoint) {
        reference::twelvePoint(expected);
      } else {
        reference::shapiro(expected, 8);
      }
    }

    int shape[3];
    const std::vector<float> v = readResult(dir.file("result.nc"), nullptr, shape);
    ASSERT_EQ(shape[0], 10);
    ASSERT_EQ(shape[1], kNy);
    ASSERT_EQ(shape[2], kNx);
    int below = 0, above = 0;  // interior nodes that the bounds clip, on one level
    for (int j = 1; j < kNy - 1; ++j) {
      for (int i = 1; i < kNx - 1; ++i) {
        below += expected.at(i, j) < c.minData;
        above += expected.at(i, j) > c.maxData;
      }
    }
    EXPECT_EQ(below > 0 && above > 0, c.minData > -5) << below << " " << above;
    for (int l = 0; l < 10; ++l) {
      for (int j = 1; j < kNy - 1; ++j) {
        for (int i = 1; i < kNx - 1; ++i) {
          const double e = std::clamp(expected.at(i, j), c.minData, c.maxData);
          ASSERT_NEAR(v[static_cast<std::size_t>((l * kNy + j) * kNx + i)], e, 1e-4)
              << "node " << i << ", " << j << ", level " << l;
        }
      }
    }
  }
}

}  // namespace
}  // namespace karnet::e2e
