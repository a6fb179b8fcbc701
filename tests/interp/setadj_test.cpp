// Observation gridding: binning, averaging and the vertical completion of the
// water columns.
#include "interp/setadj.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using testing::ProgressCounter;
using testing::TestRun;

// Levels of column (j, k) from the bottom up.
std::vector<float> column(const TestRun& run, std::int32_t j, std::int32_t k) {
  std::vector<float> out;
  for (std::int32_t l = 0; l < run.state.basicValues.nl; ++l) out.push_back(run.value(j, k, l));
  return out;
}

std::int64_t dataNodes(const TestRun& run) {
  std::int64_t n = 0;
  const FloatGrid3D& v = run.state.basicValues;
  for (std::int64_t i = 0; i < v.total; ++i) n += v.data[i] != kEmpty ? 1 : 0;
  return n;
}

TEST(SetadjBinning, HalvesRoundUpAndOthersStayEmpty) {
  TestRun run(8, 2, 1);
  run.wetEverywhere(-50.0f);
  const std::int32_t last = run.observe({{4.5, 0.0, 0.0, 7.0}, {4.49, 1.0, 0.2, 3.0}});
  setadj(last, run.state, run.settings);
  EXPECT_EQ(run.value(5, 0, 0), 7.0f);
  EXPECT_EQ(run.value(4, 0, 0), kEmpty);
  EXPECT_EQ(run.value(4, 1, 0), 3.0f);
  EXPECT_EQ(dataNodes(run), 2);
}

TEST(SetadjBinning, ObservationsSharingANodeAreAveraged) {
  TestRun run(4, 4, 1);
  run.wetEverywhere(-50.0f);
  const std::int32_t last = run.observe({{2.2, 0.9, 0.1, 1.0},
                                         {1.6, 1.4, -0.3, 2.0},
                                         {2.49, 1.49, 0.49, 4.0},
                                         {0.0, 0.0, 0.0, 10.0}});
  setadj(last, run.state, run.settings);
  EXPECT_EQ(run.value(2, 1, 0), 7.0f / 3.0f);
  EXPECT_EQ(run.value(0, 0, 0), 10.0f);
  EXPECT_EQ(dataNodes(run), 2);
}

TEST(SetadjBinning, SumIsFormedInDoubleAndRoundedAtEachStep) {
  TestRun run(1, 1, 1);
  run.wetEverywhere(-50.0f);
  // 2^24 + 1 is not a float; added in double to 1.0f it gives 2^24 + 2, which is.
  const std::int32_t last = run.observe({{0, 0, 0, 1.0}, {0, 0, 0, 16777217.0}});
  setadj(last, run.state, run.settings);
  EXPECT_EQ(run.value(0, 0, 0), 16777218.0f / 2.0f);
}

TEST(SetadjBinning, NoObservationsLeavesEverythingEmpty) {
  TestRun run(3, 3, 4);
  run.wetEverywhere(-50.0f);
  run.settings.MaxExtrapolationDistance[0] = 1000.0f;
  run.settings.MaxExtrapolationDistance[1] = 1000.0f;
  grid3DFill(run.state.basicValues, 5.0f);  // stale content is discarded
  setadj(-1, run.state, run.settings);
  EXPECT_EQ(dataNodes(run), 0);
}

TEST(SetadjBinning, ObservationOutsideTheBasicGridIsSkipped) {
  TestRun run(3, 3, 2);
  run.wetEverywhere(-50.0f);
  const std::int32_t last = run.observe(
      {{-2.0, 1.0, 0.0, 9.0}, {1.0, 3.6, 0.0, 9.0}, {1.0, 1.0, 7.0, 9.0}, {1.0, 1.0, 1.0, 4.0}});
  setadj(last, run.state, run.settings);
  EXPECT_EQ(run.value(1, 1, 1), 4.0f);
  EXPECT_EQ(dataNodes(run), 1);
}

TEST(SetadjColumns, ZeroValuedObservationIsDataAndClosesAGap) {
  TestRun run(1, 1, 3);
  run.wetEverywhere(-50.0f);
  const std::int32_t last = run.observe({{0, 0, 0, 0.0}, {0, 0, 2, 6.0}});
  setadj(last, run.state, run.settings);
  EXPECT_EQ(column(run, 0, 0), (std::vector<float>{0.0f, 3.0f, 6.0f}));
}

TEST(SetadjColumns, InteriorGapGetsLinearWeights) {
  TestRun run(2, 1, 8);
  run.wetEverywhere(-100.0f);
  const float a = 0.3f, b = 1.7f;
  const std::int32_t last = run.observe({{1, 0, 2, a}, {1, 0, 6, b}});
  setadj(last, run.state, run.settings);
  const std::vector<float> expected = {kEmpty,
                                       kEmpty,
                                       a,
                                       0.25f * b + 0.75f * a,
                                       0.5f * b + 0.5f * a,
                                       0.75f * b + 0.25f * a,
                                       b,
                                       kEmpty};
  EXPECT_EQ(column(run, 1, 0), expected);
  // The neighbouring column without data stays empty.
  EXPECT_EQ(column(run, 0, 0), std::vector<float>(8, kEmpty));
}

TEST(SetadjColumns, SeveralGapsAreClosedWhateverTheirLength) {
  TestRun run(1, 1, 9);
  run.wetEverywhere(-100.0f);
  const std::int32_t last = run.observe({{0, 0, 0, 2.0}, {0, 0, 1, 4.0}, {0, 0, 3, 8.0}, {0, 0, 8, 3.0}});
  setadj(last, run.state, run.settings);
  const std::vector<float> expected = {2.0f, 4.0f, 6.0f, 8.0f,
                                       0.2f * 3.0f + 0.8f * 8.0f,
                                       0.4f * 3.0f + 0.6f * 8.0f,
                                       0.6f * 3.0f + 0.4f * 8.0f,
                                       0.8f * 3.0f + 0.2f * 8.0f,
                                       3.0f};
  EXPECT_EQ(column(run, 0, 0), expected);
}

// Column of six levels, top level (5) at height -1, bed at -6.5: the top lies
// 5.5 above the bed.
class SetadjUpward : public ::testing::Test {
 protected:
  SetadjUpward() : run(1, 1, 6) { run.wetEverywhere(-6.5f); }
  std::vector<float> complete(float maxUp, std::int32_t level) {
    run.settings.MaxExtrapolationDistance[0] = maxUp;
    setadj(run.observe({{0, 0, static_cast<double>(level), 2.5}}), run.state, run.settings);
    return column(run, 0, 0);
  }
  TestRun run;
};

TEST_F(SetadjUpward, ExtendsWhenTheTopLiesCloseEnoughAboveTheBed) {
  EXPECT_EQ(complete(5.6f, 2), (std::vector<float>{kEmpty, kEmpty, 2.5f, 2.5f, 2.5f, 2.5f}));
}

TEST_F(SetadjUpward, BoundIsStrict) {
  EXPECT_EQ(complete(5.5f, 2), (std::vector<float>{kEmpty, kEmpty, 2.5f, kEmpty, kEmpty, kEmpty}));
}

TEST_F(SetadjUpward, JudgedOnTheTopLevelNotOnTheDistanceToTheData) {
  // The data lie one level below the top, yet the top is 5.5 above the bed.
  EXPECT_EQ(complete(2.0f, 4), (std::vector<float>{kEmpty, kEmpty, kEmpty, kEmpty, 2.5f, kEmpty}));
}

// Twelve levels at heights -12 .. -1, bed at -6.5: wet from level 6 (height -6).
class SetadjDownward : public ::testing::Test {
 protected:
  SetadjDownward() : run(1, 1, 12) { run.wetColumn(0, 0, 6, -6.5f); }
  std::vector<float> complete(float maxDown, std::int32_t level) {
    run.settings.MaxExtrapolationDistance[1] = maxDown;
    setadj(run.observe({{0, 0, static_cast<double>(level), -1.25}}), run.state, run.settings);
    return column(run, 0, 0);
  }
  TestRun run;
};

TEST_F(SetadjDownward, ReachesIntoTheBedByTruncatedLevelCount) {
  // Data at height -4, 2.5 above the bed; lstart = trunc(6 - 2.6) = 3.
  std::vector<float> expected(12, kEmpty);
  for (int l = 3; l <= 8; ++l) expected[l] = -1.25f;
  EXPECT_EQ(complete(2.6f, 8), expected);
}

TEST_F(SetadjDownward, StartsAtTheBottomWhenTheReachGoesBelowIt) {
  std::vector<float> expected(12, kEmpty);
  for (int l = 0; l <= 8; ++l) expected[l] = -1.25f;
  EXPECT_EQ(complete(20.0f, 8), expected);
}

TEST_F(SetadjDownward, DataTooHighAboveTheBedIsNotExtended) {
  std::vector<float> expected(12, kEmpty);
  expected[8] = -1.25f;
  EXPECT_EQ(complete(2.5f, 8), expected);
}

TEST_F(SetadjDownward, DataBelowTheBedExtendsFromItsOwnLevel) {
  // Data in the bed at level 4: first = 4, lstart = trunc(4 - 1.5) = 2; its
  // "height above the bed" is measured against the land value and passes.
  std::vector<float> expected(12, kEmpty);
  for (int l = 2; l <= 4; ++l) expected[l] = -1.25f;
  EXPECT_EQ(complete(1.5f, 4), expected);
}

TEST(SetadjColumns, DryColumnExtendsFromItsData) {
  TestRun run(1, 1, 8);  // land everywhere
  run.settings.MaxExtrapolationDistance[1] = 2.5f;
  const std::int32_t last = run.observe({{0, 0, 5, 9.0}});
  setadj(last, run.state, run.settings);
  // lstart = trunc(5 - 2.5) = 2. The top level's "height above the bed" is
  // measured against the land value, so the upward test passes even at 0.
  const std::vector<float> expected = {kEmpty, kEmpty, 9.0f, 9.0f, 9.0f, 9.0f, 9.0f, 9.0f};
  EXPECT_EQ(column(run, 0, 0), expected);
}

TEST(SetadjColumns, HeightsFollowTheLocalTopLevel) {
  // Basic level l lies at (l - lx - 1) * dz whatever the basic grid's depth:
  // with lx = 3 and dz = 2 the top basic level 5 is at +2, 7 above a bed at -5.
  TestRun run(1, 1, 6);
  run.wetEverywhere(-5.0f);
  run.settings.lx = 3;
  run.settings.dz = 2.0f;
  run.settings.MaxExtrapolationDistance[0] = 7.5f;
  setadj(run.observe({{0, 0, 3, 1.0}}), run.state, run.settings);
  EXPECT_EQ(column(run, 0, 0), (std::vector<float>{kEmpty, kEmpty, kEmpty, 1.0f, 1.0f, 1.0f}));

  TestRun strict(1, 1, 6);
  strict.wetEverywhere(-5.0f);
  strict.settings.lx = 3;
  strict.settings.dz = 2.0f;
  strict.settings.MaxExtrapolationDistance[0] = 7.0f;
  setadj(strict.observe({{0, 0, 3, 1.0}}), strict.state, strict.settings);
  EXPECT_EQ(column(strict, 0, 0), (std::vector<float>{kEmpty, kEmpty, kEmpty, 1.0f, kEmpty, kEmpty}));
}

TEST(SetadjProgress, ReportsEveryTenthOfTheWork) {
  ProgressCounter progress;
  TestRun run(4, 3, 2);
  run.wetEverywhere(-50.0f);
  const std::int32_t last = run.observe({{0, 0, 0, 1.0}, {1, 1, 1, 2.0}});
  setadj(last, run.state, run.settings);
  // total = (2*2 + 1)*3*4 + 1 = 61, step 6; the counter runs to 62: one start
  // and reports at 6, 12, .., 60.
  EXPECT_EQ(ProgressCounter::readings, 1 + 10);
}

TEST(SetadjProgress, TinyRunReportsEveryUnit) {
  ProgressCounter progress;
  TestRun run(1, 1, 1);
  run.wetEverywhere(-50.0f);
  setadj(-1, run.state, run.settings);
  // total = 3 - 1 = 2 units (step below one, taken as one); the counter runs to 3.
  EXPECT_EQ(ProgressCounter::readings, 1 + 3);
}

}  // namespace
}  // namespace karnet
