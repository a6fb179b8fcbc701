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
  w.setCells({2.0f}, {1.0f}, {17.3f});
  // On the node, near, beyond the zero crossing (negative correlation) and
  // beyond the cut-off (correlation 0): without observation error, exactly.
  for (const auto& node : std::vector<std::pair<int, int>>{{2, 1}, {3, 3}, {11, 1}, {29, 29}}) {
    const std::int32_t m = selectData(w.ws, node.first, node.second, s);
    ASSERT_EQ(m, 1);
    float estimate = -1.0f;
    ASSERT_EQ(OBJAN(w.ws, m, &estimate, s), 0);
    EXPECT_EQ(estimate, 17.3f) << node.first << "," << node.second;
  }
  // With ErrorVariance 10 the steps round (within a few ulps); the 1 x 1
  // inverse is 1 / 1.1.
  s.ErrorVariance = 10.0f;
  float estimate = 0.0f;
  ASSERT_EQ(OBJAN(w.ws, selectData(w.ws, 6, 5, s), &estimate, s), 0);
  EXPECT_FLOAT_EQ(estimate, 17.3f);
  EXPECT_FLOAT_EQ(w.ws.matrix[0], 1.0f / 1.1f);
}

TEST(Objan, SymmetricPairGivesTheirMeanAndDemeansTheValues) {
  RunSettings s = testing::withLimit(8);
  s.ErrorVariance = 5.0f;
  ScopedWorkspace w(2, 10, 10, s);
  // Two cells equally far from node (4, 4).
  w.setCells({2.0f, 6.0f}, {4.0f, 4.0f}, {10.0f, 20.0f});
  float estimate = 0.0f;
  ASSERT_EQ(OBJAN(w.ws, selectData(w.ws, 4, 4, s), &estimate, s), 0);
  EXPECT_NEAR(estimate, 15.0f, 1e-5f);
  EXPECT_NEAR(w.ws.selValue[0], -5.0f, 1e-5f);
  EXPECT_NEAR(w.ws.selValue[1], 5.0f, 1e-5f);
  // Nearer the first cell the estimate leans towards it.
  w.setCells({2.0f, 6.0f}, {4.0f, 4.0f}, {10.0f, 20.0f});
  ASSERT_EQ(OBJAN(w.ws, selectData(w.ws, 3, 4, s), &estimate, s), 0);
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
  w.ws.selX[0] = w.ws.selX[1] = w.ws.selY[0] = w.ws.selY[1] = 3.0f;
  w.ws.selValue[0] = 1.0f;
  w.ws.selValue[1] = 2.0f;
  w.ws.selCorr[0] = w.ws.selCorr[1] = 0.5f;
  EXPECT_EQ(OBJAN(w.ws, 2, &estimate, s), -1);
  EXPECT_EQ(std::string(w.ws.errorText), "Matrix singular in INVMTX");
  EXPECT_EQ(estimate, 42.0f);
}

}  // namespace
}  // namespace karnet
