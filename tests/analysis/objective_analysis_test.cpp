// The layer pass and the whole objective analysis on small grids, and the error
// variance of its estimates against a computation in double precision made here.
#include "analysis/objective_analysis.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "analysis/error_variance.h"
#include "analysis/objan.h"
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

// One basic layer of nj x nk nodes, holes and wet bed unless set, with the
// local grid's footprint at (jOff, kOff) spanning width x height nodes.
struct Layer {
  Layer(std::int32_t nj, std::int32_t nk, std::int32_t jOff, std::int32_t kOff,
        std::int32_t width, std::int32_t height)
      : values(static_cast<std::size_t>(nj * nk), kHole),
        bed(values.size(), -10.0f),
        grid{0, 0, nj, nk, values.data()},
        bedGrid{0, 0, nj, nk, bed.data()},
        input{&bedGrid, kLand, kHoleWide, jOff, kOff, 0},
        settings(testing::withLimit(8)) {
    settings.jx = width - 1;
    settings.kx = height - 1;
  }
  float& value(std::int32_t j, std::int32_t k) { return values[std::size_t(k * grid.nj + j)]; }
  void makeDry(std::int32_t j, std::int32_t k) { bed[std::size_t(k * grid.nj + j)] = kLand; }
  // nData: the room made for data cells; by default what the layer holds.
  std::int32_t analyse(std::int32_t& failures, std::int32_t nData = -1) {
    OaWorkspace ws;
    if (nData < 0) nData = countDataCells(grid, kHoleWide);
    return analyseLayer(ws, grid, nData, input, 0, failures, settings);
  }
  std::vector<float> values, bed;
  FloatGrid2D grid, bedGrid;
  LayerAnalysisInput input;
  RunSettings settings;
};

TEST(AnalyseLayer, ProgressPeriodOfZeroStillEstimatesEveryNode) {
  // jOff = 0 and jx = j0 make the progress period 3 * 0: still every node.
  Layer column(1, 5, 0, 0, 1, 5);
  column.value(0, 2) = 1.5f;
  std::int32_t failures = -1;
  EXPECT_EQ(column.analyse(failures), 5);
  EXPECT_EQ(column.values, std::vector<float>(5, 1.5f));
}

TEST(AnalyseLayer, ClipsWetFootprintValuesAndMinDataWinsOverMaxData) {
  // SearchRadius 0: a node is estimated only from a cell on itself, which
  // gives that cell's value; every other node fails and stays a hole. The
  // cells on the dry node (4, 3) and outside the footprint (0, 0) are left alone.
  const float cells[][3] = {{1, 0, 0.5f}, {2, 1, 5}, {3, 2, 9.5f}, {4, 3, -7}, {0, 0, 50}};
  const struct {
    float minData, maxData, expected[5];
  } cases[] = {{2, 8, {2, 5, 8, -7, 50}}, {20, 5, {20, 20, 20, -7, 50}}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.minData);
    Layer layer(6, 4, 1, 0, 4, 4);
    layer.settings.SearchRadius = 0.0f;
    layer.settings.MinData = c.minData;
    layer.settings.MaxData = c.maxData;
    for (const auto& cell : cells) layer.value(int(cell[0]), int(cell[1])) = cell[2];
    layer.makeDry(4, 3);
    std::int32_t failures = -1;
    EXPECT_EQ(layer.analyse(failures), 3);
    EXPECT_EQ(failures, 4 * 4 - 1 - 3);
    for (int i = 0; i < 5; ++i)
      EXPECT_EQ(layer.value(int(cells[i][0]), int(cells[i][1])), c.expected[i]) << i;
    EXPECT_EQ(layer.value(2, 2), kHole);
  }
}

TEST(AnalyseLayer, MoreCellsThanCountedAreReportedAndLeftOut) {
  Layer layer(4, 4, 0, 0, 4, 4);
  layer.value(0, 1) = 6.0f;
  layer.value(2, 2) = 8.0f;
  layer.value(3, 0) = 9.0f;
  ::testing::internal::CaptureStdout();
  std::int32_t failures = -1;
  const std::int32_t successes = layer.analyse(failures, 1);
  std::fflush(stdout);
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "Uppsss... 1 of 1 \nUppsss... 1 of 1 \n");
  // Only the first collected cell (x outer, y inner) informs the estimates.
  EXPECT_EQ(successes, 16);
  for (float v : layer.values) EXPECT_EQ(v, 6.0f);
}

TEST(ObjectiveAnalysis, AnalysesTheFootprintLayersAndWritesTheStatistics) {
  // Basic grid 5 x 4 x 2, footprint (1..3, 1..2) on both layers. Node (2, 2)
  // has its bed between the levels: dry on layer 0, wet on layer 1, too close
  // to the bed for any vertical extension. Layer 0 holds a cell inside the
  // footprint, one outside and one on the dry node.
  constexpr std::int32_t nj = 5, nk = 4;
  testing::TestRun run(nj, nk, 2, -10.0f);
  run.settings = testing::withLimit(8);
  run.settings.jx = 2;
  run.settings.kx = 1;
  run.settings.lx = 1;
  run.settings.ErrorVariance = 10.0f;
  run.settings.FilterOperations = 1;
  run.setBed(2, 2, kLand);
  run.setBed(2, 2, -1.5, 1);
  const std::int32_t last = run.observe({{1, 1, 0, 6}, {4, 3, 0, 14}, {2, 2, 0, 9}});
  testing::LogCapture log;
  objectiveAnalysis(last, 1, 1, 0, run.state, run.context());
  const std::string text = log.text();
  // Five wet footprint nodes estimated on layer 0; six failed on layer 1.
  const std::string rule = "-------------------------------------------------\n";
  const std::string block = "\n" + rule + "Statistics for local grid:\n\n" +
                            "No. of data grid cells                  : 3\n" +
                            "No. of interpolations                   : 5\n" +
                            "No. of unsuccesful interpolations       : 6\n" + rule + "\n";
  ASSERT_GE(text.size(), block.size());
  EXPECT_EQ(text.substr(text.size() - block.size()), block);
  // Layer 0: the dry node is blank although it held an observation, the node
  // outside the footprint keeps its gridded value. Layer 1 stays empty.
  const float* layer0 = run.state.basicValues.data;
  EXPECT_EQ(layer0[2 * nj + 2], kHole);
  EXPECT_EQ(layer0[3 * nj + 4], 14.0f);
  EXPECT_NE(layer0[1 * nj + 3], kHole);
  EXPECT_EQ(std::vector<float>(layer0 + nj * nk, layer0 + 2 * nj * nk),
            std::vector<float>(nj * nk, kHole));
}

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

// A layer of 12 x 10 nodes whose footprint starts at (1, 1) and spans 10 x 8,
// with three data cells and a dry node among them; its error field if asked.
struct ErrorLayer : Layer {
  explicit ErrorLayer(bool withErrors) : Layer(12, 10, 1, 1, 10, 8), errors(10 * 8, kHole) {
    settings.ErrorVariance = 10.0f;
    settings.SearchRadius = 4.0f;
    field = FloatGrid3D{0, 0, 0, 10, 8, 1, 1, 1, 1, 80, errors.data()};
    if (withErrors) input.errorField = &field;
    value(2, 2) = 5.0f;
    value(4, 3) = 6.0f;
    value(3, 5) = 7.0f;
    makeDry(3, 3);
  }
  float error(std::int32_t j, std::int32_t k) { return errors[std::size_t((k - 1) * 10 + j - 1)]; }
  std::vector<float> errors;
  FloatGrid3D field;
};

TEST(ErrorField, LayerPassWritesItWithoutChangingABitOfTheEstimates) {
  ErrorLayer plain(false);
  ErrorLayer withErrors(true);
  std::int32_t failures = 0;
  const std::int32_t estimated = plain.analyse(failures);
  EXPECT_EQ(withErrors.analyse(failures), estimated);
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
