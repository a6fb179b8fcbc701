// The layer pass and the whole objective analysis on small grids.
#include "analysis/objective_analysis.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "analysis_fixtures.h"
#include "control/log.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

using testing::kHole;
using testing::kHoleWide;

constexpr double kLand = 999.0;

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

TEST(AnalyseLayer, NoDataFailsAndOneDataCellFillsEveryWetFootprintNode) {
  Layer empty(6, 5, 1, 1, 4, 3);
  empty.makeDry(2, 2);  // in the footprint: neither estimated nor counted
  std::int32_t failures = -1;
  EXPECT_EQ(empty.analyse(failures), 0);
  EXPECT_EQ(failures, 4 * 3 - 1);
  EXPECT_EQ(empty.values, std::vector<float>(6 * 5, kHole));

  Layer one(7, 6, 2, 1, 3, 4);
  one.value(0, 5) = 11.5f;  // outside the footprint: data, never changed
  one.makeDry(3, 2);
  EXPECT_EQ(one.analyse(failures), 3 * 4 - 1);
  EXPECT_EQ(failures, 0);
  for (std::int32_t j = 0; j < 7; ++j) {
    for (std::int32_t k = 0; k < 6; ++k) {
      const bool footprint = j >= 2 && j <= 4 && k >= 1 && k <= 4 && !(j == 3 && k == 2);
      const bool filled = footprint || (j == 0 && k == 5);
      EXPECT_EQ(one.value(j, k), filled ? 11.5f : kHole) << j << "," << k;
    }
  }
  // jOff = 0 and jx = j0 make the progress period 3 * 0: still every node.
  Layer column(1, 5, 0, 0, 1, 5);
  column.value(0, 2) = 1.5f;
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
  constexpr std::int32_t nj = 5, nk = 4, nl = 2;
  RunState state;
  RunSettings settings = testing::withLimit(8);
  settings.jx = 2;
  settings.kx = 1;
  settings.lx = 1;
  settings.ErrorVariance = 10.0f;
  settings.FilterOperations = 1;
  for (FloatGrid3D* g : {&state.basicBathymetry, &state.basicValues}) {
    *g = FloatGrid3D{0, 0, 0, nj, nk, nl, 1, 1, 1, std::int64_t{nj} * nk * nl, nullptr};
    grid3DAlloc(*g);
  }
  for (FloatGrid2D* g : {&state.layerBathymetry, &state.layerValues}) {
    *g = FloatGrid2D{0, 0, nj, nk, nullptr};
    grid2DAlloc(*g);
  }
  grid3DFill(state.basicBathymetry, -10.0f);
  state.landValue = kLand;
  state.basicBathymetry.at(2, 2, 0) = static_cast<float>(kLand);
  state.basicBathymetry.at(2, 2, 1) = -1.5f;
  const double obs[3][3] = {{1, 1, 6}, {4, 3, 14}, {2, 2, 9}};
  ASSERT_TRUE(scatterDataAlloc(state.scatter, 3));
  for (std::size_t i = 0; i < 3; ++i) {
    state.scatter.x[i] = obs[i][0];
    state.scatter.y[i] = obs[i][1];
    state.scatter.z[i] = 0.0;
    state.scatter.value[i] = obs[i][2];
  }
  std::FILE* log = std::tmpfile();
  logSetStream(log);
  objectiveAnalysis(2, 1, 1, 0, state, settings);
  logSetStream(nullptr);
  std::string text(4096, '\0');
  std::rewind(log);
  text.resize(std::fread(text.data(), 1, text.size(), log));
  std::fclose(log);
  // Five wet footprint nodes estimated on layer 0; six failed on layer 1.
  const std::string rule = "-------------------------------------------------\n";
  const std::string block = "\n" + rule + "Statistics for local grid:\n\n" +
                            "No. of data grid cells                  : 3\n" +
                            "No. of interpolations                   : 5\n" +
                            "No. of unsuccesful interpolations       : 6\n" + rule + "\n";
  ASSERT_GE(text.size(), block.size());
  EXPECT_EQ(text.substr(text.size() - block.size()), block);

  // Layer 0 analysed on its own gives the same bits, but for the dry node:
  // blank although it held an observation. Layer 1 stays empty.
  Layer reference(nj, nk, 1, 1, 3, 2);
  reference.settings = settings;
  for (const auto& o : obs) reference.value(int(o[0]), int(o[1])) = static_cast<float>(o[2]);
  reference.makeDry(2, 2);
  std::int32_t failures = 0;
  reference.analyse(failures);
  reference.value(2, 2) = kHole;
  const float* layer0 = state.basicValues.data;
  EXPECT_EQ(std::memcmp(layer0, reference.values.data(), nj * nk * sizeof(float)), 0);
  EXPECT_EQ(layer0[3 * nj + 4], 14.0f);  // outside the footprint: as gridded
  EXPECT_NE(layer0[1 * nj + 3], kHole);
  EXPECT_EQ(std::vector<float>(layer0 + nj * nk, layer0 + 2 * nj * nk),
            std::vector<float>(nj * nk, kHole));
  releaseAll(state);
}

}  // namespace
}  // namespace karnet
