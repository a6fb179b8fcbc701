// Bilinear / distance-weighted analysis of the basic grid, layer by layer.
//
// Layers are independent of each other: each reads and writes only its own
// level of the basic grid. They are shared out over threads, and the rows of a
// layer over the threads of a layer's team; every estimate reads only the copy
// of its layer made before the layer's pass, so neither the number of threads
// nor the order of the work changes a bit of the result.
#include "interp/interp.h"

#include <algorithm>
#include <cinttypes>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <vector>

#include "control/layer_loop.h"
#include "control/log.h"
#include "control/progress.h"
#include "control/ranks.h"
#include "control/threads.h"
#include "interp/bilin.h"
#include "interp/meanw.h"
#include "interp/node_tests.h"
#include "interp/search.h"
#include "interp/setadj.h"
#include "interp/smooth_layer.h"
#include "state/run_context.h"
#include "support/float_grid.h"

namespace karnet {

namespace {

// Tallies of one layer; a call's totals are summed in layer order.
struct InterpolationCounts {
  std::int64_t bilinear = 0;
  std::int64_t weighted = 0;
  std::int64_t none = 0;
};

// Working storage of the thread that analyses a layer: the copy of the
// layer's values as they were before the layer's pass (the only data the
// estimators see) and the search tables of that copy. The layer itself is
// worked on in place: no other layer's pass touches it.
class LayerWorkspace {
 public:
  LayerWorkspace(std::int32_t nj, std::int32_t nk)
      : scratch_(static_cast<std::size_t>(nj) * static_cast<std::size_t>(nk)), tables(nj, nk) {
    scratch = FloatGrid2D{0, 0, nj, nk, scratch_.data()};
  }
  LayerWorkspace(const LayerWorkspace&) = delete;
  LayerWorkspace& operator=(const LayerWorkspace&) = delete;

 private:
  std::vector<float> scratch_;

 public:
  FloatGrid2D scratch;
  SearchTables tables;
};

// Layer `level` of a 3-D grid, in place.
FloatGrid2D layerOf(const FloatGrid3D& grid, std::int32_t level) {
  return FloatGrid2D{0, 0, grid.nj, grid.nk, grid.data + grid.index(grid.j0, grid.k0, level)};
}

// Estimate for the empty wet node (j, k) from the data of the scratch layer.
float estimateNode(std::int32_t j, std::int32_t k, const LayerWorkspace& ws, float reach,
                   double deleteValue, InterpolationCounts& counts) {
  std::int32_t jHit[kHitListSize];
  std::int32_t kHit[kHitListSize];
  float f[kHitListSize];
  float w[kHitListSize];
  const FloatGrid2D& data = ws.scratch;
  const std::int32_t n = ws.tables.search(j, k, reach, jHit, kHit);
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

void writeStatistics(Report& report, const InterpolationCounts& counts) {
  report.printf("\n");
  report.printf("-------------------------------------------------\n");
  report.printf("Statistics for local grid:\n");
  report.printf("\n");
  // The counts are kept in 64 bits; for any count that fits an int the text is
  // that of "%d".
  report.printf("No. of bilinear interpolations          : %" PRId64 "\n", counts.bilinear);
  report.printf("No. of distance weighted interpolations : %" PRId64 "\n", counts.weighted);
  report.printf("No. of no interpolations                : %" PRId64 "\n", counts.none);
  report.printf("-------------------------------------------------\n");
  report.printf("\n");
}

// What every layer of one call shares.
struct LayerPass {
  FloatGrid3D* values;
  const FloatGrid3D* bathymetry;
  double deleteValue;
  double landValue;
  float reach;
  std::int32_t filterOperations;
  // The footprint, clipped to the basic grid.
  std::int64_t jFirst, jLast, kFirst, kLast;
  int rowThreads;
  WorkProgress* progress;
};

// Interpolates, blanks and smooths basic layer `level` in place.
InterpolationCounts interpolateLayer(const LayerPass& pass, std::int32_t level,
                                     LayerWorkspace& ws) {
  const FloatGrid2D values = layerOf(*pass.values, level);
  const FloatGrid2D bed = layerOf(*pass.bathymetry, level);
  const std::int64_t nj = values.nj;
  const std::int64_t layerSize = values.elementCount();
  const double deleteValue = pass.deleteValue;
  const double landValue = pass.landValue;
  std::memcpy(ws.scratch.data, values.data, static_cast<std::size_t>(layerSize) * sizeof(float));
  ws.tables.build(ws.scratch, deleteValue, pass.rowThreads);

  // Every estimate reads only the scratch copy and writes only its own node,
  // so the rows of the footprint may go to different threads.
  std::int64_t bilinear = 0, weighted = 0, none = 0;
  WorkProgress& progress = *pass.progress;
#pragma omp parallel num_threads(pass.rowThreads) if (pass.rowThreads > 1) \
    reduction(+ : bilinear, weighted, none)
  {
    InterpolationCounts counts;
#pragma omp for schedule(dynamic, 4)
    for (std::int64_t k = pass.kFirst; k <= pass.kLast; ++k) {
      if (progress.stopped()) continue;
      float* row = values.data + k * nj;
      const float* bedRow = bed.data + k * nj;
      for (std::int64_t j = pass.jFirst; j <= pass.jLast; ++j) {
        if (!isEmptyCell(row[j], deleteValue) || isDryCell(bedRow[j], landValue)) continue;
        row[j] = estimateNode(static_cast<std::int32_t>(j), static_cast<std::int32_t>(k), ws,
                              pass.reach, deleteValue, counts);
      }
      progress.poll();
    }
    bilinear += counts.bilinear;
    weighted += counts.weighted;
    none += counts.none;
  }

  // Dry nodes of the footprint hold no value, whatever was binned there.
  const float emptyValue = static_cast<float>(deleteValue);
  for (std::int64_t k = pass.kFirst; k <= pass.kLast; ++k) {
    float* row = values.data + k * nj;
    const float* bedRow = bed.data + k * nj;
    for (std::int64_t j = pass.jFirst; j <= pass.jLast; ++j) {
      if (isDryCell(bedRow[j], landValue)) row[j] = emptyValue;
    }
  }

  // The smoother reads the neighbours as its own pass has left them: it goes
  // through the layer in one fixed order, on this thread.
  for (std::int32_t p = 0; p < pass.filterOperations; ++p) {
    smoothLayer(values.data, values.nj, values.nk);
  }
  return InterpolationCounts{bilinear, weighted, none};
}

}  // namespace

void interp(std::int32_t lastObs, std::int32_t jOff, std::int32_t kOff, std::int32_t lOff,
            RunState& state, const RunContext& context) {
  const RunSettings& settings = context.settings;
  setadj(lastObs, state, settings, context.threads);
  progressStatus("Interpolating ...");

  const std::int64_t spanJ = std::int64_t{settings.jx} - settings.j0;
  const std::int64_t spanK = std::int64_t{settings.kx} - settings.k0;
  const std::int64_t spanL = std::int64_t{settings.lx} - settings.l0;

  FloatGrid3D& values = state.basicValues;
  const FloatGrid3D& bathymetry = state.basicBathymetry;
  const std::int32_t nj = values.nj;
  const std::int32_t nk = values.nk;

  LayerPass pass{};
  pass.values = &values;
  pass.bathymetry = &bathymetry;
  pass.deleteValue = state.deleteValue();
  pass.landValue = state.landValue;
  pass.reach = searchReach(settings);
  pass.filterOperations = settings.FilterOperations;
  // The local footprint, jOff .. jOff + spanJ by kOff .. kOff + spanK; data
  // scanning lays it inside the basic grid, and it is never walked outside.
  pass.jFirst = std::max<std::int64_t>(jOff, 0);
  pass.jLast = std::min<std::int64_t>(jOff + spanJ, std::int64_t{nj} - 1);
  pass.kFirst = std::max<std::int64_t>(kOff, 0);
  pass.kLast = std::min<std::int64_t>(kOff + spanK, std::int64_t{nk} - 1);

  // One work unit per footprint node of a layer (as the nodes less one per
  // axis were counted before, so a layer's share stays the same).
  const std::int64_t layerUnits = spanK * spanJ;
  // Only the levels this process holds (all of them when it runs alone), and
  // progress over them.
  const LevelRange held = state.heldSteps(lOff, spanL + 1);
  WorkProgress progress(layerUnits * (held.count > 0 ? held.count - 1 : 0));
  pass.progress = &progress;

  const std::int64_t layerCount = spanL + 1;
  const ThreadShare share = shareThreads(context.threads, std::max<std::int64_t>(held.count, 1));
  pass.rowThreads = share.rows;
  allowNestedTeams();
  std::vector<InterpolationCounts> counts(static_cast<std::size_t>(std::max<std::int64_t>(layerCount, 0)));

  forEachLayer<LayerWorkspace>(
      held.first, held.end(), share.layers, progress,
      [&](std::int64_t s, LayerWorkspace& ws) {
        const std::int64_t lb = lOff + s;
        const bool inside = lb >= values.l0 && lb < values.l0 + values.nl &&
                            lb >= bathymetry.l0 && lb < bathymetry.l0 + bathymetry.nl &&
                            values.layerSize() == bathymetry.layerSize();
        if (inside) {
          counts[static_cast<std::size_t>(s)] =
              interpolateLayer(pass, static_cast<std::int32_t>(lb), ws);
        }
        progress.add(layerUnits);
      },
      nj, nk);

  InterpolationCounts total;
  for (const InterpolationCounts& layer : counts) {
    total.bilinear += layer.bilinear;
    total.weighted += layer.weighted;
    total.none += layer.none;
  }
  // The counts of every process's levels.
  std::int64_t sums[3] = {total.bilinear, total.weighted, total.none};
  ranksSum(sums, 3);
  total = InterpolationCounts{sums[0], sums[1], sums[2]};
  writeStatistics(context.report, total);
}

}  // namespace karnet
