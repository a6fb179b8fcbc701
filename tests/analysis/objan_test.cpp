// The estimator: own value for one cell, the weighted mean, failures.
#include "analysis/objan.h"

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "analysis/select_data.h"
#include "analysis_fixtures.h"

namespace karnet {
namespace {

using testing::ScopedWorkspace;

TEST(Objan, OneChosenCellGivesItsOwnValue) {
  RunSettings s = testing::withLimit(4);
  ScopedWorkspace w(1, 30, 30, s);
  w.setCells({{2, 1, 17.3f}});
  // On the node, near, beyond the zero crossing (negative correlation) and
  // beyond the cut-off (correlation 0): without observation error, exactly.
  for (const auto& node : std::vector<std::pair<int, int>>{{2, 1}, {3, 3}, {11, 1}, {29, 29}}) {
    const std::int32_t m = selectData(w.ws, node.first, node.second, s);
    ASSERT_EQ(m, 1);
    float estimate = -1.0f;
    ASSERT_EQ(OBJAN(w.ws, m, &estimate, s), 0);
    EXPECT_EQ(estimate, 17.3f) << node.first << "," << node.second;
  }
  // With ErrorVariance 10 the steps round.
  s.ErrorVariance = 10.0f;
  float estimate = 0.0f;
  ASSERT_EQ(OBJAN(w.ws, selectData(w.ws, 6, 5, s), &estimate, s), 0);
  EXPECT_FLOAT_EQ(estimate, 17.3f);
}

TEST(Objan, SymmetricPairGivesTheirMeanAndNearerCellsWeighMore) {
  RunSettings s = testing::withLimit(8);
  s.ErrorVariance = 5.0f;
  ScopedWorkspace w(2, 10, 10, s);
  w.setCells({{2, 4, 10}, {6, 4, 20}});
  float estimate = 0.0f;
  ASSERT_EQ(OBJAN(w.ws, selectData(w.ws, 4, 4, s), &estimate, s), 0);  // equally far from both
  EXPECT_NEAR(estimate, 15.0f, 1e-5f);
  ASSERT_EQ(OBJAN(w.ws, selectData(w.ws, 3, 4, s), &estimate, s), 0);  // nearer the first
  EXPECT_LT(estimate, 15.0f);
  EXPECT_GT(estimate, 10.0f);
}

TEST(Objan, FailuresLeaveTheEstimateAlone) {
  RunSettings s = testing::withLimit(8);
  ScopedWorkspace w(2, 10, 10, s);
  float estimate = 42.0f;
  EXPECT_EQ(OBJAN(w.ws, 0, &estimate, s), -1);
  EXPECT_EQ(std::string(w.ws.errorText), "No observational data in OBJAN");
  // Two cells on one spot without observation error: a singular matrix.
  w.setCells({{3, 3, 1}, {3, 3, 2}});
  EXPECT_EQ(OBJAN(w.ws, selectData(w.ws, 5, 5, s), &estimate, s), -1);
  EXPECT_EQ(std::string(w.ws.errorText), "Matrix singular in INVMTX");
  EXPECT_EQ(estimate, 42.0f);
}

}  // namespace
}  // namespace karnet
