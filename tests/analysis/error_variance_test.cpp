// The error variance of objective-analysis estimates, against a computation in
// double precision made here, and its field from the layer pass.
#include "analysis/error_variance.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstring>
#include <vector>

#include "analysis/objan.h"
#include "analysis/objective_analysis.h"
#include "analysis/select_data.h"
#include "analysis_fixtures.h"
#include "common/closed_forms.h"
#include "interp/interp_fixture.h"

namespace karnet {
namespace {

using testing::kHole;
using testing::kHoleWide;
using testing::kLand;
using Cell = std::array<float, 3>;

// The correlation model in node units (dx = 1).
double modelCorrelation(double d2, const RunSettings& s) {
  return reference::correlation(d2, s.DecayDistance, s.ZeroCrossingDistance);
}

// e = 1 - r'A^-1 r + (1 - 1'A^-1 r)^2 / 1'A^-1 1, clipped to [0, 1].
double expectedError(const std::vector<Cell>& cells, float j, float k, const RunSettings& s) {
  const std::size_t n = cells.size();
  std::vector<double> a(n * n), r(n);
  for (std::size_t p = 0; p < n; ++p) {
    for (std::size_t q = 0; q < n; ++q) {
      const double dx = cells[p][0] - cells[q][0];
      const double dy = cells[p][1] - cells[q][1];
      a[p * n + q] =
          modelCorrelation(dx * dx + dy * dy, s) + (p == q ? s.ErrorVariance / 100.0 : 0.0);
    }
    const double dx = j - cells[p][0];
    const double dy = k - cells[p][1];
    r[p] = modelCorrelation(dx * dx + dy * dy, s);
  }
  const std::vector<double> invR = reference::solve(a, r);
  const std::vector<double> invOne = reference::solve(a, std::vector<double>(n, 1.0));
  double rInvR = 0.0, oneInvR = 0.0, oneInvOne = 0.0;
  for (std::size_t p = 0; p < n; ++p) {
    rInvR += r[p] * invR[p];
    oneInvR += invR[p];
    oneInvOne += invOne[p];
  }
  const double e = 1.0 - rInvR + (1.0 - oneInvR) * (1.0 - oneInvR) / oneInvOne;
  return std::min(1.0, std::max(0.0, e));
}

// The implementation's e for node (j, k) from the given cells, after OBJAN.
float computedError(const std::vector<Cell>& cells, std::int32_t j, std::int32_t k,
                    const RunSettings& s, std::int32_t nj = 40) {
  testing::ScopedWorkspace scoped(static_cast<std::int32_t>(cells.size()), nj, nj, s);
  scoped.setCells(cells);
  const std::int32_t m = selectData(scoped.ws, j, k, s);
  EXPECT_EQ(m, static_cast<std::int32_t>(cells.size()));
  float estimate = 0.0f;
  EXPECT_EQ(OBJAN(scoped.ws, m, &estimate, s), 0);
  return estimateErrorVariance(scoped.ws, m);
}

RunSettings settingsWithError(float errorVariance) {
  RunSettings s = testing::withLimit(8);
  s.ErrorVariance = errorVariance;
  return s;
}

TEST(ErrorVariance, MatchesADoublePrecisionComputationForOneToThreeCells) {
  struct Case {
    const char* what;
    std::vector<Cell> cells;
    std::int32_t j, k;
    float errorVariance;
  };
  const Case cases[] = {
      {"one cell, next node", {{5, 5, 1.0f}}, 6, 5, 10.0f},
      {"one cell, two nodes off", {{5, 5, 1.0f}}, 6, 6, 1.0f},
      {"two cells, node between", {{5, 5, 1.0f}, {7, 5, 2.0f}}, 6, 6, 10.0f},
      {"two cells, node outside", {{5, 5, 1.0f}, {9, 5, 2.0f}}, 3, 7, 5.0f},
      {"three cells, node inside", {{4, 4, 1.0f}, {8, 5, 2.0f}, {6, 9, 3.0f}}, 6, 6, 5.0f},
      {"three cells, node on one", {{4, 4, 1.0f}, {8, 5, 2.0f}, {6, 9, 3.0f}}, 8, 5, 20.0f},
      {"three cells in a row", {{4, 4, 1.0f}, {5, 4, 2.0f}, {6, 4, 3.0f}}, 5, 6, 50.0f},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    const RunSettings s = settingsWithError(c.errorVariance);
    const double expected = expectedError(c.cells, static_cast<float>(c.j),
                                          static_cast<float>(c.k), s);
    EXPECT_GT(expected, 0.0);
    EXPECT_LT(expected, 1.0);
    EXPECT_NEAR(computedError(c.cells, c.j, c.k, s), expected, 2e-5);
  }
}

TEST(ErrorVariance, RisesAwayFromTheDataAndIsOneOutOfReach) {
  const RunSettings s = settingsWithError(5.0f);
  const std::vector<Cell> cells = {{4, 4, 1.0f}, {5, 6, 2.0f}, {6, 4, 3.0f}};
  float previous = -1.0f;
  for (std::int32_t j = 5; j <= 8; ++j) {
    const float e = computedError(cells, j, 5, s);
    EXPECT_GT(e, previous) << "node " << j;
    previous = e;
  }
  // Further off the formula exceeds 1 and is clipped.
  EXPECT_EQ(computedError(cells, 10, 5, s), 1.0f);
  EXPECT_LT(computedError(cells, 5, 5, s), 0.2f);
  // Beyond the correlation's cut-off the data tell nothing about the node.
  EXPECT_EQ(computedError(cells, 36, 36, s), 1.0f);
  // Without observation error a node on its only cell is known exactly.
  EXPECT_EQ(computedError({{5, 5, 3.0f}}, 5, 5, settingsWithError(0.0f)), 0.0f);
}

// A layer of 12 x 10 nodes whose footprint starts at (1, 1) and spans 10 x 8.
struct ErrorLayer {
  ErrorLayer()
      : values(12 * 10, kHole),
        bed(values.size(), -10.0f),
        errors(10 * 8, kHole),
        grid{0, 0, 12, 10, values.data()},
        bedGrid{0, 0, 12, 10, bed.data()},
        settings(settingsWithError(10.0f)) {
    settings.jx = 9;
    settings.kx = 7;
    settings.SearchRadius = 4.0f;
    field.nj = 10;
    field.nk = 8;
    field.nl = 1;
    field.total = 80;
    field.data = errors.data();
    value(2, 2) = 5.0f;
    value(4, 3) = 6.0f;
    value(3, 5) = 7.0f;
    bed[std::size_t(3 * 12 + 3)] = kLand;  // a dry node among the data
  }
  float& value(std::int32_t j, std::int32_t k) { return values[std::size_t(k * 12 + j)]; }
  float error(std::int32_t j, std::int32_t k) { return errors[std::size_t((k - 1) * 10 + j - 1)]; }
  std::int32_t analyse(bool withErrors) {
    LayerAnalysisInput input{&bedGrid, kLand, kHoleWide, 1, 1, 0};
    if (withErrors) input.errorField = &field;
    OaWorkspace ws;
    std::int32_t failures = 0;
    return analyseLayer(ws, grid, countDataCells(grid, kHoleWide), input, 0, failures, settings);
  }
  std::vector<float> values, bed, errors;
  FloatGrid2D grid, bedGrid;
  FloatGrid3D field;
  RunSettings settings;
};

TEST(ErrorField, LayerPassWritesItWithoutChangingABitOfTheEstimates) {
  ErrorLayer plain;
  ErrorLayer withErrors;
  const std::int32_t estimated = plain.analyse(false);
  EXPECT_EQ(withErrors.analyse(true), estimated);
  EXPECT_EQ(std::memcmp(plain.values.data(), withErrors.values.data(),
                        plain.values.size() * sizeof(float)),
            0);
  EXPECT_TRUE(std::all_of(plain.errors.begin(), plain.errors.end(),
                          [](float e) { return e == kHole; }));

  std::int32_t written = 0;
  for (float e : withErrors.errors) {
    if (e == kHole) continue;
    ++written;
    EXPECT_GE(e, 0.0f);
    EXPECT_LE(e, 1.0f);
  }
  EXPECT_EQ(written, estimated);
  // Dry: no estimate. Out of the search radius of every cell: no estimate.
  EXPECT_EQ(withErrors.error(3, 3), kHole);
  EXPECT_EQ(withErrors.error(10, 8), kHole);
  // Near the data the error is small, further off larger.
  EXPECT_LT(withErrors.error(2, 2), 0.3f);
  EXPECT_GT(withErrors.error(6, 5), withErrors.error(3, 4));
  // Each value is the one the estimate's own cells give.
  const std::vector<Cell> cells = {{2, 2, 5.0f}, {3, 5, 7.0f}, {4, 3, 6.0f}};
  EXPECT_NEAR(withErrors.error(4, 4), expectedError(cells, 4, 4, withErrors.settings), 2e-5);
}

}  // namespace
}  // namespace karnet
