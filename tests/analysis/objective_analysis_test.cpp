// The layer pass and the whole objective analysis on small grids.
#include "analysis/objective_analysis.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <vector>

#include "analysis_fixtures.h"
#include "interp/interp_fixture.h"

namespace karnet {
namespace {

using testing::kHole;
using testing::kHoleWide;
using testing::kLand;

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

}  // namespace
}  // namespace karnet
