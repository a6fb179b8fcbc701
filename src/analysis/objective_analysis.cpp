// The objective analysis pass: optimal interpolation layer by layer over the
// local grid's footprint.
//
// Layers are independent of each other and are shared out over threads; the
// nodes of a layer go to the threads of the layer's team line by line. Every
// estimate reads the data cells collected before the layer's estimates began,
// never another estimate, so the number of threads and the order of the work
// cannot change a bit of the result.
#include "analysis/objective_analysis.h"

#include <algorithm>
#include <cstdio>
#include <exception>
#include <optional>
#include <string>
#include <vector>

#include "analysis/error_variance.h"
#include "analysis/filters.h"
#include "analysis/objan.h"
#include "analysis/select_data.h"
#include "control/log.h"
#include "control/layer_loop.h"
#include "control/progress.h"
#include "control/ranks.h"
#include "control/threads.h"
#include "interp/node_tests.h"
#include "interp/setadj.h"
#include "state/run_context.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

// Collects the cells of the layer that hold a value, x outer and y inner, into
// the workspace's data arrays. Room was made for nData cells; a cell beyond
// that is reported through messages and left out.
void collectDataCells(OaWorkspace& ws, const FloatGrid2D& grid, std::int32_t nData,
                      double deleteValue, std::string& messages) {
  std::int32_t collected = 0;
  for (std::int32_t j = 0; j < grid.nj; ++j) {
    for (std::int32_t k = 0; k < grid.nk; ++k) {
      const float value = grid.data[std::int64_t{k} * grid.nj + j];
      if (isEmptyCell(value, deleteValue)) continue;
      if (collected > nData - 1) {
        char line[64];
        std::snprintf(line, sizeof line, "Uppsss... %i of %i \n", collected, nData);
        messages += line;
        continue;
      }
      ws.dataX[collected] = static_cast<float>(j);
      ws.dataY[collected] = static_cast<float>(k);
      ws.dataValue[collected] = value;
      ++collected;
    }
  }
  ws.dataCount = collected;
}

// Stores e at local node (p, q, s) of the error field, when the node lies in it.
void recordErrorVariance(FloatGrid3D& field, float e, std::int64_t p, std::int64_t q,
                         std::int64_t s) {
  if (p < 0 || p >= field.nj || q < 0 || q >= field.nk || s < 0 || s >= field.nl) return;
  field.data[(s * field.nk + q) * field.nj + p] = e;
}

// The storage of one thread's estimates: the candidate and chosen-cell arrays
// and sort keys, the matrix and the pivot records, the selection's window,
// column cursors and row reaches (carried from node to node along the
// thread's own walk), and the inverses it made on its current and previous
// line. It works on a copy of the layer's workspace whose per-node arrays
// point here; the layer's data cells, column index and correlation table stay
// shared and are only read.
class NodeScratch {
 public:
  NodeScratch(const OaWorkspace& layer, std::int64_t lineNodes, bool keepMatrices)
      : ws(layer),
        inverse(layer.limit, lineNodes, keepMatrices),
        candIndex_(entries(layer.dataCapacity)),
        candCorr_(entries(layer.dataCapacity)),
        candKey_(entries(layer.dataCapacity)),
        windowCell_(entries(layer.dataCapacity)),
        windowLast_(entries(layer.dataCapacity)),
        columnCursor_(entries(layer.columnCount)),
        columnEnter_(entries(layer.columnCount)),
        rowReach_(entries(layer.columnCount)),
        selIndex_(entries(layer.limit)),
        selX_(entries(layer.limit)),
        selY_(entries(layer.limit)),
        selValue_(entries(layer.limit)),
        selCorr_(entries(layer.limit)),
        matrix_(entries(std::int64_t{layer.limit} * layer.limit)),
        rowSums_(entries(layer.limit)),
        rowProducts_(entries(layer.limit)),
        pivot_(entries(oaPivotEntries(layer.limit))) {
    ws.candIndex = candIndex_.data();
    ws.candCorr = candCorr_.data();
    ws.candKey = candKey_.data();
    // Cursors and row reaches start afresh on every thread.
    ws.windowCell = windowCell_.data();
    ws.windowLast = windowLast_.data();
    if (layer.columnCursor != nullptr) ws.columnCursor = columnCursor_.data();
    if (layer.columnEnter != nullptr) ws.columnEnter = columnEnter_.data();
    if (layer.rowReach != nullptr) ws.rowReach = rowReach_.data();
    ws.cursorJ = -1;
    ws.cursorK = 0;
    ws.rowReachCount = 0;
    ws.selIndex = selIndex_.data();
    ws.selX = selX_.data();
    ws.selY = selY_.data();
    ws.selValue = selValue_.data();
    ws.selCorr = selCorr_.data();
    ws.matrix = matrix_.data();
    ws.rowSums = rowSums_.data();
    ws.rowProducts = rowProducts_.data();
    ws.pivot = pivot_.data();
  }
  NodeScratch(const NodeScratch&) = delete;
  NodeScratch& operator=(const NodeScratch&) = delete;

  OaWorkspace ws;
  InverseCache inverse;

 private:
  static std::size_t entries(std::int64_t count) {
    return static_cast<std::size_t>(std::max<std::int64_t>(count, 1));
  }
  std::vector<std::int32_t> candIndex_;
  std::vector<float> candCorr_;
  std::vector<std::uint64_t> candKey_;
  std::vector<std::int32_t> windowCell_;
  std::vector<std::int32_t> windowLast_;
  std::vector<std::int32_t> columnCursor_;
  std::vector<std::int32_t> columnEnter_;
  std::vector<std::int32_t> rowReach_;
  std::vector<std::int32_t> selIndex_;
  std::vector<float> selX_, selY_, selValue_, selCorr_;
  std::vector<float> matrix_;
  std::vector<float> rowSums_, rowProducts_;
  std::vector<std::int32_t> pivot_;
};

}  // namespace

std::int32_t countDataCells(const FloatGrid2D& grid, double deleteValue) {
  const std::int64_t count = grid.elementCount();
  std::int32_t cells = 0;
  for (std::int64_t i = 0; i < count; ++i) {
    if (!isEmptyCell(grid.data[i], deleteValue)) ++cells;
  }
  return cells;
}

std::int32_t analyseLayer(OaWorkspace& ws, FloatGrid2D& grid, std::int32_t nData,
                          const LayerAnalysisInput& input, std::int32_t l,
                          std::int32_t& failures, const RunSettings& settings) {
  LayerTeam team;
  const std::int32_t successes = analyseLayer(ws, grid, nData, input, l, failures, settings, team);
  if (!team.messages.empty()) {
    std::fputs(team.messages.c_str(), stdout);
    std::fflush(stdout);
  }
  return successes;
}

std::int32_t analyseLayer(OaWorkspace& ws, FloatGrid2D& grid, std::int32_t nData,
                          const LayerAnalysisInput& input, std::int32_t l,
                          std::int32_t& failures, const RunSettings& settings,
                          LayerTeam& team) {
  const std::int32_t nj = grid.nj;
  const std::int32_t nk = grid.nk;
  const FloatGrid2D& bathymetry = *input.bathymetry;
  const double deleteValue = input.deleteValue;
  const double landValue = input.landValue;
  const std::int32_t jLast = input.jOff + (settings.jx - settings.j0);
  const std::int32_t kLast = input.kOff + (settings.kx - settings.k0);

  workspaceSetUp(ws, nData, nj, nk, settings);

  collectDataCells(ws, grid, nData, deleteValue, team.messages);
  workspaceIndexColumns(ws, nj);

  // Lines of constant j go to the threads of the team a few neighbouring lines
  // at a time; within a line the nodes follow k upwards, so that neighbouring
  // nodes, which mostly choose the same cells, meet the same thread one after
  // the other, and a line finds the inverses of the line before.
  std::int32_t successes = 0;
  std::int32_t failed = 0;
  WorkProgress* progress = team.progress;
  const std::int64_t lineNodes = std::max<std::int64_t>(std::int64_t{kLast} - input.kOff + 1, 0);
  const OaWorkspace& layer = ws;
  const std::int64_t lines = std::max(jLast - input.jOff + 1, 1);
  const auto linesPerTurn = static_cast<std::int32_t>(
      std::max<std::int64_t>(1, lines / (16 * std::int64_t{std::max(team.threads, 1)})));
  std::exception_ptr error;
#pragma omp parallel num_threads(team.threads) if (team.threads > 1) \
    reduction(+ : successes, failed)
  {
    std::optional<NodeScratch> scratch;
    try {
      scratch.emplace(layer, lineNodes, input.errorField != nullptr);
    } catch (...) {
#pragma omp critical(karnet_layer_error)
      if (error == nullptr) error = std::current_exception();
    }
#pragma omp for schedule(dynamic, linesPerTurn)
    for (std::int32_t j = input.jOff; j <= jLast; ++j) {
      if (!scratch.has_value() || (progress != nullptr && progress->stopped())) continue;
      scratch->inverse.startLine();
      for (std::int32_t k = input.kOff; k <= kLast; ++k) {
        const std::int64_t at = std::int64_t{k} * nj + j;
        if (isDryCell(bathymetry.data[at], landValue)) continue;
        const std::int32_t m = selectData(scratch->ws, j, k, settings);
        // The estimate replaces the cell only on success; the collected data
        // arrays, not the grid, feed later estimates.
        if (OBJAN(scratch->ws, m, &grid.data[at], settings, &scratch->inverse) == 0) {
          ++successes;
          if (input.errorField != nullptr) {
            recordErrorVariance(*input.errorField,
                                estimateErrorVariance(scratch->ws, scratch->inverse, m),
                                j - input.jOff, k - input.kOff, l - input.lOff);
          }
        } else {
          ++failed;
        }
      }
      if (progress != nullptr) {
        progress->add(lineNodes);
        progress->poll();
      }
    }
  }

  if (error != nullptr) std::rethrow_exception(error);

  if (settings.FilterType == 1) {
    for (std::int32_t i = 0; i < settings.FilterOperations; ++i) {
      twelvePointFilter(grid.data, nj, nk, deleteValue);
    }
  } else {
    for (std::int32_t i = 0; i < settings.FilterOperations; ++i) {
      shapiroFilter(grid.data, nj, nk, 8, deleteValue, ws.lineBuffer);
    }
  }

  for (std::int32_t j = input.jOff; j <= jLast; ++j) {
    for (std::int32_t k = input.kOff; k <= kLast; ++k) {
      const std::int64_t at = std::int64_t{k} * nj + j;
      if (isDryCell(bathymetry.data[at], landValue)) continue;
      float& cell = grid.data[at];
      if (isEmptyCell(cell, deleteValue)) continue;
      if (cell > settings.MaxData) cell = settings.MaxData;
      if (settings.MinData > cell) cell = settings.MinData;
    }
  }

  workspaceRelease(ws);
  failures = failed;
  return successes;
}

namespace {

// What one layer's pass leaves for the totals and the messages.
struct LayerOutcome {
  std::int64_t dataCells = 0;
  std::int64_t interpolations = 0;
  std::int64_t failures = 0;
  std::string messages;
};

// The layers of the thread that analyses them: the layer's bed, its values
// and the grid being analysed, and the analysis workspace.
class LayerWorkspace {
 public:
  LayerWorkspace(std::int32_t nj, std::int32_t nk)
      : size_(static_cast<std::size_t>(nj) * static_cast<std::size_t>(nk)),
        bed_(size_), values_(size_), analysis_(size_) {
    bed = FloatGrid2D{0, 0, nj, nk, bed_.data()};
    values = FloatGrid2D{0, 0, nj, nk, values_.data()};
    analysis = FloatGrid2D{0, 0, nj, nk, analysis_.data()};
  }
  LayerWorkspace(const LayerWorkspace&) = delete;
  LayerWorkspace& operator=(const LayerWorkspace&) = delete;

  FloatGrid2D bed;
  FloatGrid2D values;
  FloatGrid2D analysis;
  OaWorkspace oa;

 private:
  std::size_t size_;
  std::vector<float> bed_, values_, analysis_;
};

}  // namespace

void objectiveAnalysis(std::int32_t lastObs, std::int32_t jOff, std::int32_t kOff,
                       std::int32_t lOff, RunState& state, const RunContext& context,
                       FloatGrid3D* errorField) {
  const RunSettings& settings = context.settings;
  setadj(lastObs, state, settings, context.threads);

  progressStatus("Interpolating ...");

  const double deleteValue = state.deleteValue();
  const auto deleteCell = static_cast<float>(deleteValue);
  const std::int32_t nj = state.basicValues.nj;
  const std::int32_t nk = state.basicValues.nk;
  const std::int32_t jLast = jOff + (settings.jx - settings.j0);
  const std::int32_t kLast = kOff + (settings.kx - settings.k0);
  const std::int32_t lLast = lOff + (settings.lx - settings.l0);
  const double landValue = state.landValue;

  // One unit per footprint node of every layer.
  const std::int64_t layerCount = std::max<std::int64_t>(std::int64_t{lLast} - lOff + 1, 0);
  // Only the levels this process holds (all of them when it runs alone), and
  // progress over them.
  const LevelRange held = state.heldSteps(lOff, layerCount);
  WorkProgress progress((std::int64_t{jLast} - jOff + 1) * (std::int64_t{kLast} - kOff + 1) *
                        held.count);
  const ThreadShare share = shareThreads(context.threads, std::max<std::int64_t>(held.count, 1));
  allowNestedTeams();
  std::vector<LayerOutcome> outcomes(static_cast<std::size_t>(layerCount));

  forEachLayer<LayerWorkspace>(
      held.first, held.end(), share.layers, progress,
      [&](std::int64_t s, LayerWorkspace& ws) {
        const auto l = static_cast<std::int32_t>(lOff + s);
        LayerOutcome& outcome = outcomes[static_cast<std::size_t>(s)];
        grid3DLayerGet(state.basicBathymetry, l, ws.bed);
        grid3DLayerGet(state.basicValues, l, ws.values);
        grid2DCopyWindow(ws.analysis, ws.values);

        const std::int32_t nData = countDataCells(ws.analysis, deleteValue);
        outcome.dataCells = nData;
        LayerAnalysisInput input;
        input.bathymetry = &ws.bed;
        input.landValue = landValue;
        input.deleteValue = deleteValue;
        input.jOff = jOff;
        input.kOff = kOff;
        // The error field holds the levels this process holds, from its first.
        input.lOff = lOff + held.first;
        input.errorField = errorField;
        LayerTeam team;
        team.threads = share.rows;
        team.progress = &progress;
        std::int32_t failed = 0;
        outcome.interpolations =
            analyseLayer(ws.oa, ws.analysis, nData, input, l, failed, settings, team);
        outcome.failures = failed;
        outcome.messages = std::move(team.messages);

        for (std::int32_t j = jOff; j <= jLast; ++j) {
          for (std::int32_t k = kOff; k <= kLast; ++k) {
            const std::int64_t at = std::int64_t{k} * nj + j;
            ws.values.data[at] =
                isDryCell(ws.bed.data[at], landValue) ? deleteCell : ws.analysis.data[at];
          }
        }
        grid3DLayerPut(state.basicValues, l, ws.values);
      },
      nj, nk);

  // Totals and messages in layer order.
  std::int64_t dataCells = 0;
  std::int64_t interpolations = 0;
  std::int64_t failures = 0;
  for (const LayerOutcome& outcome : outcomes) {
    dataCells += outcome.dataCells;
    interpolations += outcome.interpolations;
    failures += outcome.failures;
    if (!outcome.messages.empty()) std::fputs(outcome.messages.c_str(), stdout);
  }
  std::fflush(stdout);

  // The counts of every process's levels.
  std::int64_t sums[3] = {dataCells, interpolations, failures};
  ranksSum(sums, 3);
  dataCells = sums[0];
  interpolations = sums[1];
  failures = sums[2];

  Report& report = context.report;
  report.printf("\n");
  report.printf("-------------------------------------------------\n");
  report.printf("Statistics for local grid:\n");
  report.printf("\n");
  report.printf("No. of data grid cells                  : %lld\n", static_cast<long long>(dataCells));
  report.printf("No. of interpolations                   : %lld\n",
                static_cast<long long>(interpolations));
  report.printf("No. of unsuccesful interpolations       : %lld\n",
                static_cast<long long>(failures));
  report.printf("-------------------------------------------------\n");
  report.printf("\n");
}

}  // namespace karnet
