// The bilinear / distance-weighted analysis over whole run states: which nodes
// are filled and how, the layers and footprint it works on, smoothing, and the
// statistics block in the log.
#include "interp/interp.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

#include "interp/smooth_layer.h"
#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using testing::kLand;
using testing::LogCapture;
using testing::ProgressCounter;
using testing::TestRun;

std::string statisticsBlock(int bilinear, int weighted, int none) {
  return "\n-------------------------------------------------\n"
         "Statistics for local grid:\n"
         "\n"
         "No. of bilinear interpolations          : " + std::to_string(bilinear) + "\n" +
         "No. of distance weighted interpolations : " + std::to_string(weighted) + "\n" +
         "No. of no interpolations                : " + std::to_string(none) + "\n" +
         "-------------------------------------------------\n"
         "\n";
}

std::vector<float> row(const TestRun& run, std::int32_t k, std::int32_t l) {
  std::vector<float> out;
  for (std::int32_t j = 0; j < run.state.basicValues.nj; ++j) out.push_back(run.value(j, k, l));
  return out;
}

void makeDry(TestRun& run, std::int32_t j, std::int32_t k) {
  for (std::int32_t l = 0; l < run.state.basicBathymetry.nl; ++l) {
    run.state.basicBathymetry.at(j, k, l) = static_cast<float>(kLand);
  }
}

TEST(Interp, FourNeighboursReproduceAPlane) {
  TestRun run(5, 5, 1);
  run.wetEverywhere(-50.0f);
  // f = 5 + 2*dj + 3*dk around (2, 2)
  const std::int32_t last =
      run.observe({{3, 2, 0, 7.0}, {2, 3, 0, 8.0}, {1, 2, 0, 3.0}, {2, 1, 0, 2.0}});
  LogCapture log;
  interp(last, 0, 0, 0, run.state, run.settings);
  EXPECT_EQ(run.value(2, 2, 0), 5.0f);
  EXPECT_EQ(run.value(3, 2, 0), 7.0f);  // data nodes keep their values
  EXPECT_EQ(run.value(2, 1, 0), 2.0f);
  for (std::int32_t k = 0; k < 5; ++k)
    for (std::int32_t j = 0; j < 5; ++j) EXPECT_NE(run.value(j, k, 0), kEmpty) << j << "," << k;
}

TEST(Interp, StatisticsBlockCountsOverAllLayers) {
  // Layer 0: the centre has four neighbours (bilinear), three corners two
  // (distance weighted), the fourth corner is dry. Layer 1 is empty: its eight
  // wet nodes find nothing.
  TestRun run(3, 3, 2);
  run.wetEverywhere(-50.0f);
  makeDry(run, 2, 2);
  const std::int32_t last =
      run.observe({{2, 1, 0, 1.0}, {1, 2, 0, 2.0}, {0, 1, 0, 3.0}, {1, 0, 0, 4.0}});
  LogCapture log;
  ProgressCounter progress;
  interp(last, 0, 0, 0, run.state, run.settings);
  EXPECT_EQ(log.text(), statisticsBlock(1, 3, 8));
  EXPECT_EQ(run.value(1, 1, 0), 2.5f);
  EXPECT_EQ(run.value(2, 2, 0), kEmpty);
  EXPECT_EQ(row(run, 1, 1), std::vector<float>(3, kEmpty));
  // Gridding: one start, reports at 4, 8, .., 48 of its 49 units; then one
  // start and one report per layer.
  EXPECT_EQ(ProgressCounter::readings, 13 + 3);
}

TEST(Interp, SingleHitAtDistanceTwoGivesItsValue) {
  TestRun run(3, 1, 1);
  run.wetEverywhere(-50.0f);
  makeDry(run, 1, 0);  // the node in between takes no part
  const std::int32_t last = run.observe({{2, 0, 0, 0.3}});
  LogCapture log;
  interp(last, 0, 0, 0, run.state, run.settings);
  EXPECT_EQ(row(run, 0, 0), (std::vector<float>{0.3f, kEmpty, 0.3f}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 1, 0));
}

TEST(Interp, EstimatesReadTheLayerAsItWasBeforeItsPass) {
  // 3 x 2 layer with data at (0, 0) = 0 and (2, 1) = 12.
  TestRun run(3, 2, 1);
  run.wetEverywhere(-50.0f);
  const std::int32_t last = run.observe({{0, 0, 0, 0.0}, {2, 1, 0, 12.0}});
  LogCapture log;
  interp(last, 0, 0, 0, run.state, run.settings);
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
  EXPECT_EQ(row(run, 0, 0), (std::vector<float>{0.0f, n10, n20}));
  EXPECT_EQ(row(run, 1, 0), (std::vector<float>{n01, n11, 12.0f}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 4, 0));
}

TEST(Interp, DryNodesAreEmptiedAfterServingAsData) {
  // A binned observation in a dry node is still data for its wet neighbours
  // during the layer's pass, and is removed afterwards. A dry node without
  // data is neither interpolated nor counted.
  TestRun run(4, 1, 1);
  run.wetEverywhere(-50.0f);
  makeDry(run, 1, 0);
  makeDry(run, 3, 0);
  const std::int32_t last = run.observe({{1, 0, 0, 5.0}});
  LogCapture log;
  interp(last, 0, 0, 0, run.state, run.settings);
  EXPECT_EQ(row(run, 0, 0), (std::vector<float>{5.0f, kEmpty, 5.0f, kEmpty}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 2, 0));
}

TEST(Interp, ReachIsSearchRadiusOverDx) {
  TestRun run(4, 1, 1);
  run.wetEverywhere(-50.0f);
  run.settings.SearchRadius = 150.0f;
  run.settings.dx = 100.0f;
  const std::int32_t last = run.observe({{0, 0, 0, 5.0}});
  LogCapture log;
  interp(last, 0, 0, 0, run.state, run.settings);
  EXPECT_EQ(row(run, 0, 0), (std::vector<float>{5.0f, 5.0f, kEmpty, kEmpty}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 1, 2));
}

TEST(Interp, OnlyTheLocalLevelsAreWorked) {
  // Basic levels 0..3; local levels 5..6 sit at basic levels 1..2.
  TestRun run(3, 1, 4);
  run.wetEverywhere(-50.0f);
  run.settings.l0 = 5;
  run.settings.lx = 6;
  const std::int32_t last =
      run.observe({{0, 0, 0, 10.0}, {0, 0, 1, 20.0}, {0, 0, 2, 30.0}, {0, 0, 3, 40.0}});
  LogCapture log;
  interp(last, 0, 0, 1, run.state, run.settings);
  EXPECT_EQ(row(run, 0, 0), (std::vector<float>{10.0f, kEmpty, kEmpty}));
  EXPECT_EQ(row(run, 0, 1), (std::vector<float>{20.0f, 20.0f, 20.0f}));
  EXPECT_EQ(row(run, 0, 2), (std::vector<float>{30.0f, 30.0f, 30.0f}));
  EXPECT_EQ(row(run, 0, 3), (std::vector<float>{40.0f, kEmpty, kEmpty}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 4, 0));
}

TEST(Interp, SingleLocalLevelIsStillWorked) {
  TestRun run(2, 1, 3);
  run.wetEverywhere(-50.0f);
  run.settings.l0 = 2;
  run.settings.lx = 2;
  const std::int32_t last = run.observe({{0, 0, 2, 1.5}});
  LogCapture log;
  interp(last, 0, 0, 2, run.state, run.settings);
  EXPECT_EQ(row(run, 0, 2), (std::vector<float>{1.5f, 1.5f}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 1, 0));
}

// A 6 x 1 basic layer whose local footprint is columns 1..3.
class InterpFootprint : public ::testing::Test {
 protected:
  InterpFootprint() : run(6, 1, 1) {
    run.wetEverywhere(-50.0f);
    run.settings.jx = 2;
  }
  std::vector<float> analyse(std::int32_t filterOperations) {
    run.settings.FilterOperations = filterOperations;
    const std::int32_t last = run.observe({{0, 0, 0, 0.0}, {1, 0, 0, 12.0}});
    interp(last, 1, 0, 0, run.state, run.settings);
    return row(run, 0, 0);
  }
  LogCapture log;
  TestRun run;
};

TEST_F(InterpFootprint, NodesOutsideAreNotInterpolated) {
  EXPECT_EQ(analyse(0), (std::vector<float>{0.0f, 12.0f, 12.0f, 12.0f, kEmpty, kEmpty}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 2, 0));
}

TEST_F(InterpFootprint, WholeLayerIsSmoothedFilterOperationsTimes) {
  std::vector<float> expected = {0.0f, 12.0f, 12.0f, 12.0f, kEmpty, kEmpty};
  smoothLayer(expected.data(), 6, 1);
  smoothLayer(expected.data(), 6, 1);
  EXPECT_EQ(analyse(2), expected);
}

TEST_F(InterpFootprint, NegativeFilterOperationsMeansNoSmoothing) {
  EXPECT_EQ(analyse(-3), (std::vector<float>{0.0f, 12.0f, 12.0f, 12.0f, kEmpty, kEmpty}));
}

TEST(Interp, NothingToFillGivesZeroCounts) {
  TestRun run(2, 2, 1);
  run.wetEverywhere(-50.0f);
  makeDry(run, 1, 1);
  const std::int32_t last = run.observe({{0, 0, 0, 1.0}, {1, 0, 0, 2.0}, {0, 1, 0, 3.0}});
  LogCapture log;
  interp(last, 0, 0, 0, run.state, run.settings);
  EXPECT_EQ(log.text(), statisticsBlock(0, 0, 0));
}

}  // namespace
}  // namespace karnet
