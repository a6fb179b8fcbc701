#include "interp/setadj.h"

#include <algorithm>
#include <cstdint>

#include "control/progress.h"
#include "interp/node_tests.h"
#include "support/float_grid.h"

namespace karnet {

namespace {

// Counts units of work and reports every step-th one to the progress host.
class ProgressTicker {
 public:
  explicit ProgressTicker(std::int64_t total) {
    // A run of fewer than ten units would give a step of 0; report every unit then.
    step_ = static_cast<std::int64_t>(static_cast<double>(total) * 0.1);
    if (step_ < 1) step_ = 1;
    next_ = step_;
  }
  // Reports whenever the counter reaches a multiple of the step.
  void tick() {
    if (++counter_ == next_) {
      progressReport(counter_);
      next_ += step_;
    }
  }

 private:
  std::int64_t step_ = 1;
  std::int64_t next_ = 1;
  std::int64_t counter_ = 0;
};

// Nearest node of a coordinate in basic-grid units: trunc(x + 0.5) in double.
// Returns false (and leaves node alone) when that node lies outside 0..count-1,
// including non-finite coordinates.
bool nearestNode(double x, std::int32_t count, std::int32_t& node) {
  const double shifted = x + 0.5;
  // Truncation toward zero maps (-1, count) onto 0..count-1.
  if (!(shifted > -1.0 && shifted < static_cast<double>(count))) return false;
  node = static_cast<std::int32_t>(shifted);
  return true;
}

// One water column of the basic grid: level l of the column at offset l * stride.
struct Column {
  float* values;
  const float* bed;
  std::int64_t stride;
  std::int32_t nl;

  float& value(std::int32_t l) const { return values[l * stride]; }
  float bedAt(std::int32_t l) const { return bed[l * stride]; }
};

// Vertical completion of one column that holds data at one level at least.
void completeColumn(const Column& c, double deleteValue, double landValue,
                    const RunSettings& settings) {
  const std::int32_t nl = c.nl;
  const float dz = settings.dz;
  const float maxUp = settings.MaxExtrapolationDistance[0];
  const float maxDown = settings.MaxExtrapolationDistance[1];
  // Height of basic level l, in single precision.
  auto height = [&](std::int32_t l) { return static_cast<float>(l - settings.lx - 1) * dz; };
  auto empty = [&](std::int32_t l) { return isEmptyCell(c.value(l), deleteValue); };

  std::int32_t lbed = 0;
  while (lbed < nl && isDryCell(c.bedAt(lbed), landValue)) ++lbed;
  std::int32_t ldat = 0;
  while (ldat < nl && empty(ldat)) ++ldat;
  if (ldat >= nl) return;  // no data after all: nothing to complete
  const std::int32_t first = std::min(lbed, ldat);

  // Lowest level the downward extension may reach (it may go into the bed).
  const float reachDown = static_cast<float>(first) - maxDown / dz;
  std::int32_t lstart = 0;
  if (reachDown > 0.0f) {
    // Bounded so that a degenerate spacing cannot overflow the conversion;
    // any lstart at or above ldat means no extension.
    lstart = reachDown < static_cast<float>(nl) ? static_cast<std::int32_t>(reachDown) : nl;
  }
  const std::int32_t ldata = ldat;

  if (height(ldata) - c.bedAt(ldata) < maxDown && lstart < ldata) {
    const float v = c.value(ldata);
    for (std::int32_t l = lstart; l < ldata; ++l) c.value(l) = v;
  }

  std::int32_t l = ldata;
  while (true) {
    float below = c.value(l);
    while (l < nl && !empty(l)) {
      below = c.value(l);
      ++l;
    }
    if (l >= nl) return;
    const std::int32_t gapStart = l;
    while (l < nl && empty(l)) ++l;
    if (l >= nl) {
      // Open at the top: the extension is judged on the top level's height above bed.
      if (height(nl - 1) - c.bedAt(nl - 1) < maxUp) {
        for (std::int32_t g = gapStart; g < nl; ++g) c.value(g) = below;
      }
      return;
    }
    const std::int32_t gapEnd = l;
    const float above = c.value(gapEnd);
    const std::int32_t n = gapEnd - gapStart + 1;
    const float fn = static_cast<float>(n);
    for (std::int32_t i = 1; i < n; ++i) {
      const float wAbove = static_cast<float>(i) / fn;
      const float wBelow = static_cast<float>(n - i) / fn;
      c.value(gapStart + i - 1) = wAbove * above + wBelow * below;
    }
  }
}

}  // namespace

void setadj(std::int32_t lastObs, RunState& state, const RunSettings& settings) {
  FloatGrid3D& values = state.basicValues;
  const FloatGrid3D& bathymetry = state.basicBathymetry;
  const double deleteValue = state.deleteValue();
  const double landValue = state.landValue;
  const std::int32_t nj = values.nj;
  const std::int32_t nk = values.nk;
  const std::int32_t nl = values.nl;
  const std::int64_t layerSize = values.layerSize();
  const std::int64_t nodeCount = layerSize * nl;

  // Per-node observation counts, later per-column data-level counts (layer 0).
  FloatGrid3D count;
  count.nj = nj;
  count.nk = nk;
  count.nl = nl;
  count.total = values.total;
  grid3DAlloc(count);
  grid3DFill(count, 0.0f);
  grid3DFill(values, static_cast<float>(deleteValue));

  const std::int64_t progressTotal = (2 * std::int64_t{nl} + 1) * nk * nj + lastObs;
  progressStart(progressTotal);
  ProgressTicker progress(progressTotal);

  // Phase 1: binning, sums formed in double and rounded back at every step.
  const ScatterData& scatter = state.scatter;
  for (std::int32_t i = 0; i <= lastObs; ++i) {
    std::int32_t j = 0, k = 0, l = 0;
    if (nearestNode(scatter.x[i], nj, j) && nearestNode(scatter.y[i], nk, k) &&
        nearestNode(scatter.z[i], nl, l)) {
      const std::int64_t at = (std::int64_t{l} * nk + k) * nj + j;
      if (count.data[at] == 0.0f) values.data[at] = 0.0f;
      values.data[at] =
          static_cast<float>(static_cast<double>(values.data[at]) + scatter.value[i]);
      count.data[at] += 1.0f;
    }
    progress.tick();
  }

  // Phase 2: averaging. Each node is independent, so memory order is used.
  for (std::int64_t at = 0; at < nodeCount; ++at) {
    if (count.data[at] != 0.0f) values.data[at] = values.data[at] / count.data[at];
    progress.tick();
  }

  // Phase 3: number of data levels per column, kept in layer 0 of the count field.
  grid3DFill(count, 0.0f);
  for (std::int32_t l = 0; l < nl; ++l) {
    const float* layer = values.data + l * layerSize;
    for (std::int64_t at = 0; at < layerSize; ++at) {
      if (!isEmptyCell(layer[at], deleteValue)) count.data[at] += 1.0f;
      progress.tick();
    }
  }

  // Phase 4: vertical completion, column by column (columns are independent).
  for (std::int32_t k = 0; k < nk; ++k) {
    for (std::int32_t j = 0; j < nj; ++j) {
      const std::int64_t base = std::int64_t{k} * nj + j;
      if (count.data[base] != 0.0f) {
        const Column column{values.data + base, bathymetry.data + base, layerSize, nl};
        completeColumn(column, deleteValue, landValue, settings);
      }
      progress.tick();
    }
  }

  grid3DFree(count);
}

}  // namespace karnet
