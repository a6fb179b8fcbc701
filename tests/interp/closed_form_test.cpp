// The interpolation numerics against double-precision closed forms: the
// bilinear estimate, the inverse-distance weights, the in-place smoother and
// the vertical completion with different upward and downward limits.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <vector>

#include "common/closed_forms.h"
#include "interp/bilin.h"
#include "interp/interp.h"
#include "interp/search.h"
#include "interp/setadj.h"
#include "interp/smooth_layer.h"
#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using testing::kLand;
using testing::LogCapture;
using testing::TestRun;

void expectClose(double actual, double expected, const char* what) {
  EXPECT_NEAR(actual, expected, 1e-5 * std::fabs(expected) + 1e-5) << what;
}

// Four hits, quadrants Q1..Q4, as offsets from the node.
using Hits = std::array<std::array<int, 2>, 4>;

float bilinAtOrigin(const Hits& hits, const double (&f)[4]) {
  std::int32_t jHit[kHitListSize] = {}, kHit[kHitListSize] = {};
  float fHit[kHitListSize] = {};
  for (int i = 1; i <= 4; ++i) {
    jHit[i] = 50 + hits[i - 1][0];
    kHit[i] = 50 + hits[i - 1][1];
    fHit[i] = static_cast<float>(f[i - 1]);
  }
  return bilin(jHit, kHit, fHit, 50, 50);
}

// The estimate in double: the column through the node cuts P1-P2 at A and
// P3-P4 at C, the row cuts P2-P3 at B and P4-P1 at D; the mean of the linear
// interpolations A-C along the column and B-D along the row.
double bilinReference(const Hits& p, const double (&f)[4]) {
  auto cut = [](double a0, double a1, double t0, double t1, double t) {
    return a0 + (a1 - a0) * (t - t0) / (t1 - t0);
  };
  const double kA = cut(p[0][1], p[1][1], p[0][0], p[1][0], 0);
  const double fA = cut(f[0], f[1], p[0][0], p[1][0], 0);
  const double kC = cut(p[2][1], p[3][1], p[2][0], p[3][0], 0);
  const double fC = cut(f[2], f[3], p[2][0], p[3][0], 0);
  const double jB = cut(p[1][0], p[2][0], p[1][1], p[2][1], 0);
  const double fB = cut(f[1], f[2], p[1][1], p[2][1], 0);
  const double jD = cut(p[3][0], p[0][0], p[3][1], p[0][1], 0);
  const double fD = cut(f[3], f[0], p[3][1], p[0][1], 0);
  return 0.5 * (cut(fA, fC, kA, kC, 0) + cut(fB, fD, jB, jD, 0));
}

TEST(InterpClosedForm, BilinearEstimate) {
  const Hits asymmetric = {{{2, 1}, {-1, 3}, {-3, -1}, {1, -2}}};
  const Hits onAxes = {{{1, 0}, {0, 4}, {-2, 0}, {0, -1}}};
  const Hits far = {{{5, 4}, {-2, 1}, {-1, -6}, {3, -2}}};
  for (const Hits* hits : {&asymmetric, &onAxes, &far}) {
    // A plane 2 - 0.75 dj + 1.5 dk is reproduced at the node: 2.
    double plane[4];
    for (int i = 0; i < 4; ++i) plane[i] = 2.0 - 0.75 * (*hits)[i][0] + 1.5 * (*hits)[i][1];
    expectClose(bilinAtOrigin(*hits, plane), 2.0, "plane");
    // Any other field: the mean of the column and row interpolations.
    const double bumpy[4] = {10.0, -4.0, 7.5, 1.25};
    expectClose(bilinAtOrigin(*hits, bumpy), bilinReference(*hits, bumpy), "bumpy");
  }
}

TEST(InterpClosedForm, FewerThanFourHitsGiveTheInverseDistanceMean) {
  // 7 x 6 layer with three data nodes. Node (3, 3) finds one in each of Q2,
  // Q3 and Q4 at squared distances 5, 18 and 10; node (5, 2) finds (2, 5) in
  // Q2 (18) and, of the two in Q3, (4, 0) on the nearer ring (5).
  TestRun run(7, 6, 1);
  const double a = 2.0, b = 11.0, c = -4.0;
  LogCapture log;
  interp(run.observe({{0, 0, 0, a}, {4, 0, 0, b}, {2, 5, 0, c}}), 0, 0, 0, run.state,
         run.context());
  const double at33 = (c / std::sqrt(5.0) + a / std::sqrt(18.0) + b / std::sqrt(10.0)) /
                      (1 / std::sqrt(5.0) + 1 / std::sqrt(18.0) + 1 / std::sqrt(10.0));
  const double at52 =
      (c / std::sqrt(18.0) + b / std::sqrt(5.0)) / (1 / std::sqrt(18.0) + 1 / std::sqrt(5.0));
  expectClose(run.value(3, 3, 0), at33, "(3, 3)");
  expectClose(run.value(5, 2, 0), at52, "(5, 2)");
}

TEST(InterpClosedForm, SmoothLayerWorksInPlaceColumnByColumn) {
  const float E = kEmpty;
  const std::vector<float> layer = {3.0f, 7.5f, -2.0f, 4.0f,  //
                                    1.0f, E,    6.0f,  9.5f,  //
                                    5.5f, 8.0f, 0.5f,  E};
  std::vector<float> smoothed = layer;
  reference::Field expected{4, 3, {}, [](double v) { return v == static_cast<double>(kEmpty); }};
  expected.v.assign(layer.begin(), layer.end());
  for (int pass = 0; pass < 2; ++pass) {
    smoothLayer(smoothed.data(), 4, 3);
    reference::twelvePoint(expected, true);
  }
  for (std::size_t i = 0; i < layer.size(); ++i) {
    if (layer[i] == E) {
      EXPECT_EQ(smoothed[i], E);
    } else {
      expectClose(smoothed[i], expected.v[i], "node");
    }
  }
}

TEST(InterpClosedForm, VerticalExtensionsUseTheirOwnLimits) {
  // One column of twelve levels at heights -12 .. -1 (lx = 11, dz = 1); the
  // bed lies at -9.5, wet from level 3, so the top level lies 8.5 above it.
  // Data a at level `low` and b at level 8; the gap between them is closed
  // linearly. The way down starts at trunc(3 - down) when the lowest data lie
  // less than `down` above the bed; the way up fills levels 9..11 when 8.5 < up.
  const double a = 4.0, b = 13.0;
  const struct {
    const char* what;
    int low;      // level of a: 5 lies 2.5 above the bed, 3 lies 0.5 above it
    float up, down;
    int from;     // lowest level the downward extension fills (low: none)
  } cases[] = {
      {"both extend", 5, 9.0f, 3.0f, 0},
      {"data too high for the way down", 5, 9.0f, 1.2f, 5},
      {"up too short, down long", 5, 2.0f, 8.6f, 0},
      {"up just long enough, down too short", 5, 8.6f, 2.4f, 5},
      {"down into the bed by trunc(1.8) levels", 3, 1.0f, 1.2f, 1},
      {"down by trunc(2.4) levels, up too short", 3, 8.4f, 0.6f, 2},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    TestRun run(1, 1, 12, static_cast<float>(kLand));
    run.setBed(0, 0, -9.5, 3);
    run.settings.lx = 11;
    run.settings.MaxExtrapolationDistance[0] = c.up;
    run.settings.MaxExtrapolationDistance[1] = c.down;
    setadj(run.observe({{0, 0, double(c.low), a}, {0, 0, 8, b}}), run.state, run.settings);
    for (int l = 0; l < 12; ++l) {
      const bool empty = l < c.from || (l > 8 && !(8.5 < c.up));
      if (empty) {
        EXPECT_EQ(run.value(0, 0, l), kEmpty) << "level " << l;
        continue;
      }
      const double t = std::clamp((l - c.low) / (8.0 - c.low), 0.0, 1.0);
      expectClose(run.value(0, 0, l), (1 - t) * a + t * b, "level");
    }
  }
}

}  // namespace
}  // namespace karnet
