// The two estimators: the bilinear estimate from four quadrant hits and the
// weighted mean of one to three hits, exactly in single precision and against
// double-precision closed forms.
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdint>

#include "interp/bilin.h"
#include "interp/interp.h"
#include "interp/meanw.h"
#include "interp/search.h"
#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::LogCapture;
using testing::TestRun;

void expectClose(double actual, double expected, const char* what) {
  EXPECT_NEAR(actual, expected, 1e-5 * std::fabs(expected) + 1e-5) << what;
}

// Four hits, quadrants Q1..Q4, as offsets from the node.
using Hits = std::array<std::array<int, 2>, 4>;

// bilin at node (30, 40) with hit i = 1..4 at offset hits[i - 1] valued f[i - 1].
float bilinAt(const Hits& hits, const double (&f)[4]) {
  std::int32_t jHit[kHitListSize] = {}, kHit[kHitListSize] = {};
  float fHit[kHitListSize] = {};
  for (int i = 1; i <= 4; ++i) {
    jHit[i] = 30 + hits[i - 1][0];
    kHit[i] = 40 + hits[i - 1][1];
    fHit[i] = static_cast<float>(f[i - 1]);
  }
  return bilin(jHit, kHit, fHit, 30, 40);
}

TEST(Bilin, MeanOfTheColumnAndRowEstimatesInSinglePrecision) {
  // Column j = 0 meets P1-P2 at P2 and P3-P4 at P4: 3; row k = 0 meets P2-P3
  // at P3 and P4-P1 at P1: 5.
  EXPECT_EQ(bilinAt({{{2, 0}, {0, 2}, {-2, 0}, {0, -2}}}, {10, 2, 0, 4}), 4.0f);
  // Column estimate 2^24, row estimate 1 + correction 1: (2^24 + 1) + 1 stays
  // 2^24 in single precision, so 2^23 where the exact mean is 2^23 + 1.
  EXPECT_EQ(bilinAt({{{1, 0}, {0, 1}, {-1, 0}, {0, -1}}}, {3, 16777216.0, 1, 16777216.0}),
            8388608.0f);
}

TEST(Meanw, WeightedMeanSummedInIndexOrderInSinglePrecision) {
  // 1e8 + 1 is 1e8 in single precision: the 1 is lost unless added last.
  const float w[] = {0, 1, 1, 1}, lost[] = {0, 1e8f, 1, -1e8f}, kept[] = {0, 1e8f, -1e8f, 1};
  EXPECT_EQ(meanw(lost, w, 3), 0.0f);
  EXPECT_EQ(meanw(kept, w, 3), 1.0f / 3.0f);
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
    expectClose(bilinAt(*hits, plane), 2.0, "plane");
    // Any other field: the mean of the column and row interpolations.
    const double bumpy[4] = {10.0, -4.0, 7.5, 1.25};
    expectClose(bilinAt(*hits, bumpy), bilinReference(*hits, bumpy), "bumpy");
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

}  // namespace
}  // namespace karnet
