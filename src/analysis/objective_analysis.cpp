// The objective analysis pass: optimal interpolation layer by layer over the
// local grid's footprint.
#include "analysis/objective_analysis.h"

#include <algorithm>
#include <cstdio>

#include "analysis/filters.h"
#include "analysis/objan.h"
#include "analysis/select_data.h"
#include "control/log.h"
#include "control/progress.h"
#include "control/ranks.h"
#include "interp/node_tests.h"
#include "interp/setadj.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

// Collects the cells of the layer that hold a value, x outer and y inner, into
// the workspace's data arrays. Room was made for nData cells; a cell beyond
// that is reported on standard output and left out.
void collectDataCells(OaWorkspace& ws, const FloatGrid2D& grid, std::int32_t nData,
                      double deleteValue) {
  std::int32_t collected = 0;
  for (std::int32_t j = 0; j < grid.nj; ++j) {
    for (std::int32_t k = 0; k < grid.nk; ++k) {
      const float value = grid.data[std::int64_t{k} * grid.nj + j];
      if (isEmptyCell(value, deleteValue)) continue;
      if (collected > nData - 1) {
        std::printf("Uppsss... %i of %i \n", collected, nData);
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
  const std::int32_t nj = grid.nj;
  const std::int32_t nk = grid.nk;
  const FloatGrid2D& bathymetry = *input.bathymetry;
  const double deleteValue = input.deleteValue;
  const double landValue = input.landValue;
  const std::int32_t jLast = input.jOff + (settings.jx - settings.j0);
  const std::int32_t kLast = input.kOff + (settings.kx - settings.k0);

  workspaceSetUp(ws, nData, nj, nk, settings);
  std::int32_t successes = 0;
  std::int32_t failed = 0;

  collectDataCells(ws, grid, nData, deleteValue);
  workspaceIndexColumns(ws, nj);

  // Progress is reported every 3 * (jOff + jx - j0) nodes; a grid whose period
  // would be 0 (one x node at basic node 0) reports at every node.
  const std::int64_t period =
      std::max<std::int64_t>(3 * (std::int64_t{input.jOff} + settings.jx - settings.j0), 1);
  std::int64_t visited = 0;
  for (std::int32_t j = input.jOff; j <= jLast; ++j) {
    for (std::int32_t k = input.kOff; k <= kLast; ++k) {
      ++visited;
      if (visited % period == 0) {
        progressCheckCancel();
        progressReportGrid(j - input.jOff, k - input.kOff, l - input.lOff);
      }
      const std::int64_t at = std::int64_t{k} * nj + j;
      if (isDryCell(bathymetry.data[at], landValue)) continue;

      const std::int32_t m = selectData(ws, j, k, settings);
      // The estimate replaces the cell only on success; the collected data
      // arrays, not the grid, feed later estimates.
      if (OBJAN(ws, m, &grid.data[at], settings) == 0) {
        ++successes;
      } else {
        ++failed;
      }
    }
  }

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

void objectiveAnalysis(std::int32_t lastObs, std::int32_t jOff, std::int32_t kOff,
                       std::int32_t lOff, RunState& state, const RunSettings& settings) {
  FloatGrid2D analysisGrid;
  analysisGrid.j0 = 0;
  analysisGrid.k0 = 0;
  analysisGrid.nj = state.layerValues.nj;
  analysisGrid.nk = state.layerValues.nk;
  grid2DAlloc(analysisGrid);

  setadj(lastObs, state, settings);

  // Progress runs over the levels this process holds (all of them alone).
  const LevelRange held = state.heldSteps(lOff, std::int64_t{settings.lx} - settings.l0 + 1);
  progressStartGrid(settings.jx - settings.j0, settings.kx - settings.k0,
                    held.count > 0 ? held.count - 1 : 0);
  progressStatus("Interpolating ...");

  const double deleteValue = state.deleteValue();
  const auto deleteCell = static_cast<float>(deleteValue);
  const std::int32_t nj = state.basicValues.nj;
  const std::int32_t jLast = jOff + (settings.jx - settings.j0);
  const std::int32_t kLast = kOff + (settings.kx - settings.k0);
  const std::int32_t lLast = lOff + (settings.lx - settings.l0);

  LayerAnalysisInput input;
  input.bathymetry = &state.layerBathymetry;
  input.landValue = state.landValue;
  input.deleteValue = deleteValue;
  input.jOff = jOff;
  input.kOff = kOff;
  input.lOff = lOff + held.first;  // progress counts from the first level held

  OaWorkspace ws;
  std::int64_t dataCells = 0;
  std::int64_t interpolations = 0;
  std::int64_t failures = 0;
  // Only the levels this process holds (all of them when it runs alone).
  for (std::int32_t l = lOff + held.first; l < lOff + held.end() && l <= lLast; ++l) {
    grid3DLayerGet(state.basicBathymetry, l, state.layerBathymetry);
    grid3DLayerGet(state.basicValues, l, state.layerValues);
    grid2DCopyWindow(analysisGrid, state.layerValues);

    const std::int32_t nData = countDataCells(analysisGrid, deleteValue);
    dataCells += nData;
    std::int32_t failed = 0;
    interpolations += analyseLayer(ws, analysisGrid, nData, input, l, failed, settings);
    failures += failed;

    for (std::int32_t j = jOff; j <= jLast; ++j) {
      for (std::int32_t k = kOff; k <= kLast; ++k) {
        const std::int64_t at = std::int64_t{k} * nj + j;
        state.layerValues.data[at] = isDryCell(state.layerBathymetry.data[at], state.landValue)
                                         ? deleteCell
                                         : analysisGrid.data[at];
      }
    }
    grid3DLayerPut(state.basicValues, l, state.layerValues);
  }

  // The counts of every process's levels.
  std::int64_t sums[3] = {dataCells, interpolations, failures};
  ranksSum(sums, 3);
  dataCells = sums[0];
  interpolations = sums[1];
  failures = sums[2];

  logPrintf("\n");
  logPrintf("-------------------------------------------------\n");
  logPrintf("Statistics for local grid:\n");
  logPrintf("\n");
  logPrintf("No. of data grid cells                  : %lld\n", static_cast<long long>(dataCells));
  logPrintf("No. of interpolations                   : %lld\n",
            static_cast<long long>(interpolations));
  logPrintf("No. of unsuccesful interpolations       : %lld\n",
            static_cast<long long>(failures));
  logPrintf("-------------------------------------------------\n");
  logPrintf("\n");

  grid2DFree(analysisGrid);
}

}  // namespace karnet
