#include "interp/setadj.h"

#include <algorithm>
#include <cstdint>
#include <vector>

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

void setadj(std::int32_t lastObs, RunState& state, const RunSettings& settings, int threads) {
  FloatGrid3D& values = state.basicValues;
  const FloatGrid3D& bathymetry = state.basicBathymetry;
  const double deleteValue = state.deleteValue();
  const double landValue = state.landValue;
  const float emptyValue = static_cast<float>(deleteValue);
  const std::int32_t nj = values.nj;
  const std::int32_t nk = values.nk;
  const std::int32_t nl = state.basicLevelCount();
  const bool wholeColumns = state.holdsAllLevels();
  grid3DFill(values, emptyValue, threads);

  // Observations land on few nodes of a large grid: the binned nodes are kept
  // as a list sorted by column, then level, and each column holding data is
  // completed in a buffer of its own. This process then keeps the levels it
  // holds, so that a run over several processes never needs whole columns.
  struct Binned {
    std::int64_t node;  // (k * nj + j) * nl + l
    std::int32_t observation;
  };
  std::vector<Binned> binned;
  binned.reserve(static_cast<std::size_t>(std::max<std::int32_t>(lastObs + 1, 0)));

  const std::int64_t progressTotal = std::int64_t{lastObs} + 1 + 2 * std::int64_t{nj} * nk;
  progressStart(progressTotal);
  ProgressTicker progress(progressTotal);

  // Phase 1: binning to the nearest node.
  const ScatterData& scatter = state.scatter;
  for (std::int32_t i = 0; i <= lastObs; ++i) {
    std::int32_t j = 0, k = 0, l = 0;
    if (nearestNode(scatter.x[i], nj, j) && nearestNode(scatter.y[i], nk, k) &&
        nearestNode(scatter.z[i], nl, l)) {
      binned.push_back(Binned{(std::int64_t{k} * nj + j) * nl + l, i});
    }
    progress.tick();
  }
  // Observations of one node stay in file order: their sum is rounded to a
  // float after every addition, so the order is part of the result.
  std::stable_sort(binned.begin(), binned.end(),
                   [](const Binned& a, const Binned& b) { return a.node < b.node; });

  std::vector<float> column(static_cast<std::size_t>(nl));
  std::vector<float> bed(static_cast<std::size_t>(nl));
  const std::int64_t layerSize = std::int64_t{nj} * nk;
  const std::int32_t heldFirst = values.l0;
  const std::int32_t heldEnd = values.l0 + values.nl;
  std::size_t next = 0;
  while (next < binned.size()) {
    const std::int64_t columnIndex = binned[next].node / nl;
    std::fill(column.begin(), column.end(), emptyValue);

    // Phase 2: the mean of each node's observations, summed in double and
    // rounded back at every step, divided in single precision.
    bool hasData = false;
    while (next < binned.size() && binned[next].node / nl == columnIndex) {
      const std::int64_t node = binned[next].node;
      float sum = 0.0f;
      float count = 0.0f;
      for (; next < binned.size() && binned[next].node == node; ++next) {
        sum = static_cast<float>(static_cast<double>(sum) + scatter.value[binned[next].observation]);
        count += 1.0f;
      }
      const float mean = sum / count;
      column[static_cast<std::size_t>(node % nl)] = mean;
      if (!isEmptyCell(mean, deleteValue)) hasData = true;
    }
    progress.tick();

    // Phase 3: vertical completion of a column that holds data.
    const auto k = static_cast<std::int32_t>(columnIndex / nj);
    const auto j = static_cast<std::int32_t>(columnIndex % nj);
    if (hasData) {
      for (std::int32_t l = 0; l < nl; ++l) {
        bed[static_cast<std::size_t>(l)] =
            wholeColumns ? bathymetry.data[l * layerSize + columnIndex]
                         : basicBedAt(state.bathymetryGrid, landValue, state.window, j, k, l);
      }
      const Column c{column.data(), bed.data(), 1, nl};
      completeColumn(c, deleteValue, landValue, settings);
    }
    for (std::int32_t l = std::max(heldFirst, 0); l < std::min(heldEnd, nl); ++l) {
      values.at(j, k, l) = column[static_cast<std::size_t>(l)];
    }
    progress.tick();
  }
}

}  // namespace karnet
