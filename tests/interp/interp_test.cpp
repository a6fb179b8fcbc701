// The two estimators (the bilinear estimate from four quadrant hits, the
// weighted mean of one to three), exactly in single precision and against
// double-precision closed forms; the bilinear / distance-weighted analysis over
// whole run states: which nodes are filled and how, the layers and footprint it
// works on, smoothing and the statistics block in the log; the in-place
// twelve-point layer smoother and the extraction of the local grid.
#include "interp/interp.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

#include "interp/bilin.h"
#include "interp/glo2loc.h"
#include "interp/meanw.h"
#include "interp/search.h"
#include "interp/smooth_layer.h"
#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using testing::kLand;
using testing::LogCapture;
using testing::Observation;
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

std::string statisticsBlock(int bilinear, int weighted, int none) {
  const std::string rule = "-------------------------------------------------\n";
  return "\n" + rule + "Statistics for local grid:\n\n" +
         "No. of bilinear interpolations          : " + std::to_string(bilinear) + "\n" +
         "No. of distance weighted interpolations : " + std::to_string(weighted) + "\n" +
         "No. of no interpolations                : " + std::to_string(none) + "\n" + rule + "\n";
}

TEST(Interp, FillsTheFootprintOfTheLocalLevelsAndCountsIt) {
  // One row of nj nodes on nl basic levels, node spacing 100.
  const float E = kEmpty, far = 1e5f;
  const struct {
    const char* what;
    std::int32_t nj, nl;
    std::vector<Observation> observations;
    std::vector<std::int32_t> dry;  // dry columns
    std::int32_t jOff, lOff, jx, l0, lx, filterOperations;
    float searchRadius;
    std::vector<float> expected;  // the basic grid before smoothing
    int weighted, none;           // counts in the statistics block (no bilinear ones)
  } cases[] = {
      // A binned observation in a dry node is data for its wet neighbours, then
      // removed; a dry node without data is neither interpolated nor counted.
      {"dry nodes emptied after serving as data", 4, 1, {{1, 0, 0, 5}}, {1, 3}, 0, 0, 3, 0, 0, 0,
       far, {5, E, 5, E}, 2, 0},
      {"reach is SearchRadius over dx", 4, 1, {{0, 0, 0, 5}}, {}, 0, 0, 3, 0, 0, 0, 150,
       {5, 5, E, E}, 1, 2},
      // Basic levels 0..3; local levels 5..6 sit at basic levels 1..2.
      {"only the local levels", 3, 4, {{0, 0, 0, 10}, {0, 0, 1, 20}, {0, 0, 2, 30}, {0, 0, 3, 40}},
       {}, 0, 1, 2, 5, 6, 0, far, {10, E, E, 20, 20, 20, 30, 30, 30, 40, E, E}, 4, 0},
      // Local footprint: columns 1..3 of 6; the whole layer is smoothed.
      {"the whole layer smoothed", 6, 1, {{0, 0, 0, 0}, {1, 0, 0, 12}}, {}, 1, 0, 2, 0, 0, 2, far,
       {0, 12, 12, 12, E, E}, 2, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    TestRun run(c.nj, 1, c.nl);
    for (std::int32_t j : c.dry) run.setBed(j, 0, kLand);
    run.settings.jx = c.jx;
    run.settings.l0 = c.l0;
    run.settings.lx = c.lx;
    run.settings.FilterOperations = c.filterOperations;
    run.settings.SearchRadius = c.searchRadius;
    run.settings.dx = 100.0f;
    LogCapture log;
    interp(run.observe(c.observations), c.jOff, 0, c.lOff, run.state, run.context());
    std::vector<float> expected = c.expected;
    for (int i = 0; i < c.filterOperations; ++i) smoothLayer(expected.data(), c.nj, 1);
    EXPECT_EQ(run.values(), expected);
    EXPECT_EQ(log.text(), statisticsBlock(0, c.weighted, c.none));
  }
}

TEST(Interp, EstimatesReadTheLayerAsItWasBeforeItsPass) {
  // 3 x 2 layer with data at (0, 0) = 0 and (2, 1) = 12.
  TestRun run(3, 2, 1);
  LogCapture log;
  interp(run.observe({{0, 0, 0, 0.0}, {2, 1, 0, 12.0}}), 0, 0, 0, run.state, run.context());
  const float diagonal = static_cast<float>(1.0 / std::sqrt(2.0));
  // (1, 0): Q1 (2, 1) diagonal, Q3 (0, 0) one away.
  const float n10 = (diagonal * 12.0f + 1.0f * 0.0f) / (diagonal + 1.0f);
  // (2, 0): Q2 (2, 1) one away, Q3 (0, 0) two away: (1, 0) beside it, filled
  // earlier in the pass, is not used.
  const float n20 = (1.0f * 12.0f + 0.5f * 0.0f) / (1.0f + 0.5f);
  // (0, 1): Q1 (2, 1) two away ((1, 1) is still empty), Q4 (0, 0) one away.
  const float n01 = (0.5f * 12.0f + 1.0f * 0.0f) / (0.5f + 1.0f);
  // (1, 1): Q1 (2, 1) one away, Q3 (0, 0) diagonal.
  const float n11 = (1.0f * 12.0f + diagonal * 0.0f) / (1.0f + diagonal);
  EXPECT_EQ(run.values(), (std::vector<float>{0.0f, n10, n20, n01, n11, 12.0f}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 4, 0));
}

TEST(SmoothLayer, SmoothsInPlaceColumnByColumn) {
  // 2 x 2 layer, (1, 0) = 12 and the rest 0, visited (0,0), (0,1), (1,0), (1,1).
  const float v00 = (0.0f + 0.0f + 12.0f + 0.0f + 0.0f + 12.0f + 0.0f + 0.0f + 0.0f) / 12.0f;
  const float v01 = (v00 + v00 + 12.0f + 0.0f + 0.0f + 0.0f + 0.0f + 0.0f + 0.0f) / 12.0f;
  // (1, 0): below (1,0) itself, then (0,0), (1,0), (0,0), 4u, (1,0), (0,1), (1,1), (1,1).
  const float v10 = (12.0f + v00 + 12.0f + v00 + 48.0f + 12.0f + v01 + 0.0f + 0.0f) / 12.0f;
  const float v11 = (v10 + v00 + v10 + v01 + 0.0f + 0.0f + v01 + 0.0f + 0.0f) / 12.0f;
  std::vector<float> isolated(5 * 4, kEmpty);  // holes stay empty
  isolated[2 * 5 + 3] = 7.0f;  // empty neighbours count as the centre
  isolated[0] = -2.0f;                // in the corner, its clamped neighbours are itself or empty
  const struct {
    std::int32_t nj, nk;
    std::vector<float> layer, expected;
  } cases[] = {
      {3, 1, {0, 0, 12}, {0, 3, 9.75f}},  // uses the neighbours already smoothed
      {1, 3, {0, 0, 12}, {0, 3, 9.75f}},
      {2, 2, {0, 12, 0, 0}, {v00, v10, v01, v11}},
      {5, 4, isolated, isolated},
      {0, 2, {1, 5}, {1, 5}},
  };
  for (const auto& c : cases) {
    // Guard values around the layer neither change nor enter the result.
    std::vector<float> buffer = c.layer;
    buffer.insert(buffer.begin(), 1e3f);
    buffer.push_back(1e3f);
    smoothLayer(buffer.data() + 1, c.nj, c.nk);
    EXPECT_EQ(std::vector<float>(buffer.begin() + 1, buffer.end() - 1), c.expected)
        << c.nj << "x" << c.nk;
    EXPECT_TRUE(buffer.front() == 1e3f && buffer.back() == 1e3f);
  }
}

TEST(SmoothLayer, SumsTheStencilInItsFixedOrder) {
  // Centre (1, 1) = 1 of a 3 x 3 layer, the nodes before it empty (counting
  // as 1); then (2, 0) = 3, (2, 1) = 1e8, (1, 2) = -1e8, (2, 2) = 0. Summed
  // (1,0), (0,0), (2,0), (0,1), 4u, (2,1), (0,2), (1,2), (2,2), this order
  // leaves 8 where the exact sum is 11.
  std::vector<float> layer = {kEmpty, kEmpty, 3.0f, kEmpty, 1.0f, 1e8f, kEmpty, -1e8f, 0.0f};
  smoothLayer(layer.data(), 3, 3);
  EXPECT_EQ(layer[4], 8.0f / 12.0f);
}

TEST(Glo2loc, CopiesTheWindowAtItsOffset) {
  // Basic grid 6 x 5 x 7 whose nodes hold 10000*l + 100*k + j; local grid
  // 3 x 2 x 4 with origin (0, 0, 2).
  TestRun run(6, 5, 7);
  for (std::int32_t i = 0; i < 6 * 5 * 7; ++i)
    run.state.basicValues.data[i] = float(10000 * (i / 30) + 100 * (i / 6 % 5) + i % 6);
  run.state.basicValues.at(3, 2, 4) = kEmpty;
  FloatGrid3D& local = run.state.localValues;
  local = FloatGrid3D{0, 0, 2, 3, 2, 4, 1, 1, 1, 3 * 2 * 4, nullptr};
  grid3DAlloc(local);
  run.settings.jx = 2;
  run.settings.kx = 1;
  run.settings.l0 = 2;
  run.settings.lx = 5;

  grid3DFill(local, 123.0f);
  glo2loc(2, 1, 3, run.state, run.settings);  // local (0, 0, 2) = basic (2, 1, 3)
  EXPECT_EQ(local.at(0, 0, 2), 30102.0f);
  EXPECT_EQ(local.at(2, 1, 5), 60204.0f);
  EXPECT_EQ(local.at(1, 1, 3), kEmpty);  // empty nodes are copied as they are
}

}  // namespace
}  // namespace karnet
