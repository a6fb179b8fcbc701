// Bilinear / distance-weighted analysis of the basic grid, layer by layer.
#include "interp/interp.h"

#include <algorithm>
#include <cinttypes>
#include <cmath>
#include <cstdint>
#include <cstring>

#include "control/log.h"
#include "control/progress.h"
#include "control/ranks.h"
#include "interp/bilin.h"
#include "interp/meanw.h"
#include "interp/node_tests.h"
#include "interp/search.h"
#include "interp/setadj.h"
#include "interp/smooth_layer.h"
#include "support/float_grid.h"

namespace karnet {

namespace {

// Tallies of one call, over all layers.
struct InterpolationCounts {
  std::int64_t bilinear = 0;
  std::int64_t weighted = 0;
  std::int64_t none = 0;
};

// Working storage of one call: the copy of the layer as it was before its pass
// (the only data the estimators see), the count table of that copy and the
// search hints of the walk over it.
struct InterpWorkspace {
  FloatGrid2D scratch;
  SearchIndex index;
  bool indexCurrent = false;
  SearchHints hints;
};

// Estimate for the empty wet node (j, k) from the data of the scratch layer.
float estimateNode(std::int32_t j, std::int32_t k, InterpWorkspace& ws, float reach,
                   double deleteValue, InterpolationCounts& counts) {
  std::int32_t jHit[kHitListSize];
  std::int32_t kHit[kHitListSize];
  float f[kHitListSize];
  float w[kHitListSize];
  const FloatGrid2D& data = ws.scratch;
  const std::int32_t n = search(j, k, data, reach, deleteValue, ws.index, ws.hints, jHit, kHit);
  if (n == 4) {
    for (int i = 1; i <= 4; ++i) f[i] = data.data[std::int64_t{kHit[i]} * data.nj + jHit[i]];
    ++counts.bilinear;
    return bilin(jHit, kHit, f, j, k);
  }
  if (n == 0) {
    ++counts.none;
    return static_cast<float>(deleteValue);
  }
  for (std::int32_t i = 1; i <= n; ++i) {
    const std::int64_t dj = jHit[i] - j;
    const std::int64_t dk = kHit[i] - k;
    const double d = static_cast<double>(dj * dj + dk * dk);
    w[i] = static_cast<float>(1.0 / std::sqrt(d));
    f[i] = data.data[std::int64_t{kHit[i]} * data.nj + jHit[i]];
  }
  ++counts.weighted;
  return meanw(f, w, n);
}

void writeStatistics(const InterpolationCounts& counts) {
  logPrintf("\n");
  logPrintf("-------------------------------------------------\n");
  logPrintf("Statistics for local grid:\n");
  logPrintf("\n");
  // The counts are kept in 64 bits; for any count that fits an int the text is
  // that of "%d".
  logPrintf("No. of bilinear interpolations          : %" PRId64 "\n", counts.bilinear);
  logPrintf("No. of distance weighted interpolations : %" PRId64 "\n", counts.weighted);
  logPrintf("No. of no interpolations                : %" PRId64 "\n", counts.none);
  logPrintf("-------------------------------------------------\n");
  logPrintf("\n");
}

}  // namespace

void interp(std::int32_t lastObs, std::int32_t jOff, std::int32_t kOff, std::int32_t lOff,
            RunState& state, const RunSettings& settings) {
  InterpWorkspace ws;
  ws.scratch.nj = state.layerValues.nj;
  ws.scratch.nk = state.layerValues.nk;
  grid2DAlloc(ws.scratch);
  searchIndexAlloc(ws.index, ws.scratch.nj, ws.scratch.nk);

  setadj(lastObs, state, settings);
  progressStatus("Interpolating ...");

  const std::int64_t spanJ = std::int64_t{settings.jx} - settings.j0;
  const std::int64_t spanK = std::int64_t{settings.kx} - settings.k0;
  const std::int64_t spanL = std::int64_t{settings.lx} - settings.l0;
  // Only the levels this process holds (all of them when it runs alone), and
  // progress over them.
  const LevelRange held = state.heldSteps(lOff, spanL + 1);
  progressStart(spanK * spanJ * (held.count > 0 ? held.count - 1 : 0));
  std::int64_t done = 0;
  InterpolationCounts counts;

  FloatGrid3D& values = state.basicValues;
  const FloatGrid3D& bathymetry = state.basicBathymetry;
  FloatGrid2D& layerValues = state.layerValues;
  FloatGrid2D& layerBathymetry = state.layerBathymetry;
  const double deleteValue = state.deleteValue();
  const float emptyValue = static_cast<float>(deleteValue);
  const double landValue = state.landValue;
  const float reach = searchReach(settings);

  const std::int64_t nj = layerValues.nj;
  const std::int64_t nk = layerValues.nk;
  const std::int64_t layerSize = nj * nk;
  // The local footprint, jOff .. jOff + spanJ by kOff .. kOff + spanK; data
  // scanning lays it inside the basic grid, and it is never walked outside.
  const std::int64_t jFirst = std::max<std::int64_t>(jOff, 0);
  const std::int64_t jLast = std::min<std::int64_t>(jOff + spanJ, nj - 1);
  const std::int64_t kFirst = std::max<std::int64_t>(kOff, 0);
  const std::int64_t kLast = std::min<std::int64_t>(kOff + spanK, nk - 1);

  for (std::int64_t s = held.first; s < held.end(); ++s) {
    progressReport(done);
    done += spanK * spanJ;
    const std::int64_t lb = lOff + s;
    // Only the levels this process holds (all of them when it runs alone).
    if (lb < values.l0 || lb >= values.l0 + values.nl || lb < bathymetry.l0 ||
        lb >= bathymetry.l0 + bathymetry.nl || layerSize != values.layerSize() ||
        layerSize != bathymetry.layerSize()) {
      continue;
    }

    const std::int32_t level = static_cast<std::int32_t>(lb);
    grid3DLayerGet(bathymetry, level, layerBathymetry);
    grid3DLayerGet(values, level, layerValues);
    std::memcpy(ws.scratch.data, layerValues.data,
                static_cast<std::size_t>(layerSize) * sizeof(float));
    ws.indexCurrent = false;

    // Every estimate reads only the scratch copy and writes only its own node,
    // so the footprint may be walked row by row (memory order).
    for (std::int64_t k = kFirst; k <= kLast; ++k) {
      float* row = layerValues.data + k * nj;
      const float* bedRow = layerBathymetry.data + k * nj;
      for (std::int64_t j = jFirst; j <= jLast; ++j) {
        if (!isEmptyCell(row[j], deleteValue) || isDryCell(bedRow[j], landValue)) continue;
        if (!ws.indexCurrent) {
          searchIndexBuild(ws.index, ws.scratch, deleteValue);
          ws.indexCurrent = true;
        }
        row[j] = estimateNode(static_cast<std::int32_t>(j), static_cast<std::int32_t>(k), ws,
                              reach, deleteValue, counts);
      }
    }

    // Dry nodes of the footprint hold no value, whatever was binned there.
    for (std::int64_t k = kFirst; k <= kLast; ++k) {
      float* row = layerValues.data + k * nj;
      const float* bedRow = layerBathymetry.data + k * nj;
      for (std::int64_t j = jFirst; j <= jLast; ++j) {
        if (isDryCell(bedRow[j], landValue)) row[j] = emptyValue;
      }
    }

    for (std::int32_t pass = 0; pass < settings.FilterOperations; ++pass) {
      smoothLayer(layerValues.data, layerValues.nj, layerValues.nk);
    }

    grid3DLayerPut(values, level, layerValues);
  }

  // The counts of every process's levels.
  std::int64_t sums[3] = {counts.bilinear, counts.weighted, counts.none};
  ranksSum(sums, 3);
  counts = InterpolationCounts{sums[0], sums[1], sums[2]};
  writeStatistics(counts);
  searchIndexFree(ws.index);
  grid2DFree(ws.scratch);
}

}  // namespace karnet
