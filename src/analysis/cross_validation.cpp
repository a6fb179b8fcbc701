// Leave-one-cast-out cross-validation of the objective analysis.
#include "analysis/cross_validation.h"

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstring>
#include <exception>
#include <mutex>
#include <thread>

#include "analysis/objan.h"
#include "analysis/select_data.h"
#include "analysis/workspace.h"
#include "interp/node_tests.h"

namespace karnet {
namespace {

// The checked allocator keeps one table of live blocks for the process; the
// workers take turns at it.
std::mutex allocatorMutex;

struct Footprint {
  std::int32_t jFirst = 0, jLast = -1, kFirst = 0, kLast = -1, lFirst = 0, lLast = -1;

  bool holds(std::int32_t j, std::int32_t k) const {
    return j >= jFirst && j <= jLast && k >= kFirst && k <= kLast;
  }
};

Footprint footprintOf(const CvInput& input, const RunSettings& s) {
  Footprint f;
  f.jFirst = input.jOff;
  f.jLast = input.jOff + (s.jx - s.j0);
  f.kFirst = input.kOff;
  f.kLast = input.kOff + (s.kx - s.k0);
  f.lFirst = input.lOff;
  f.lLast = input.lOff + (s.lx - s.l0);
  return f;
}

float valueAt(const FloatGrid3D& g, std::int32_t j, std::int32_t k, std::int32_t l) {
  return g.data[(std::int64_t{l} * g.nk + k) * g.nj + j];
}

bool layerInside(const FloatGrid3D& g, std::int32_t l) { return l >= 0 && l < g.nl; }

// A data node that the validation compares: in the footprint, wet, holding data.
bool validatedNode(const CvInput& input, const Footprint& f, std::int32_t j, std::int32_t k,
                   std::int32_t l) {
  if (!f.holds(j, k) || !layerInside(*input.values, l)) return false;
  if (j < 0 || j >= input.values->nj || k < 0 || k >= input.values->nk) return false;
  if (isEmptyCell(valueAt(*input.values, j, k, l), input.deleteValue)) return false;
  return !isDryCell(valueAt(*input.bathymetry, j, k, l), input.landValue);
}

// The data cells of one layer in the order the analysis collects them (x
// outer, y inner), gathered once and shared by every trial.
struct LayerCells {
  std::int32_t l = 0;
  std::vector<float> x, y, value;
};

// The cells of layer l, or nothing when no node of the layer is validated.
bool collectLayer(const CvInput& input, const Footprint& f, std::int32_t l, LayerCells& cells) {
  const FloatGrid3D& values = *input.values;
  if (!layerInside(values, l)) return false;
  const float* layer = values.data + std::int64_t{l} * values.nj * values.nk;
  bool validated = false;
  cells.l = l;
  for (std::int32_t j = 0; j < values.nj; ++j) {
    for (std::int32_t k = 0; k < values.nk; ++k) {
      const float v = layer[std::int64_t{k} * values.nj + j];
      if (isEmptyCell(v, input.deleteValue)) continue;
      cells.x.push_back(static_cast<float>(j));
      cells.y.push_back(static_cast<float>(k));
      cells.value.push_back(v);
      validated = validated || validatedNode(input, f, j, k, l);
    }
  }
  return validated;
}

// Takes data cell i out of the workspace's cells (kept in column order, so the
// column index only shifts) and puts it back.
struct LeftOut {
  float x = 0, y = 0, value = 0;
};

void shift(float* a, std::int32_t from, std::int32_t to, std::int32_t count) {
  std::memmove(a + to, a + from, static_cast<std::size_t>(count) * sizeof(float));
}

void columnsAfter(OaWorkspace& ws, float x, std::int32_t delta) {
  if (ws.columnStart == nullptr) return;
  for (std::int32_t c = static_cast<std::int32_t>(x) + 1; c <= ws.columnCount; ++c) {
    ws.columnStart[c] += delta;
  }
}

LeftOut leaveOut(OaWorkspace& ws, std::int32_t i) {
  const LeftOut cell{ws.dataX[i], ws.dataY[i], ws.dataValue[i]};
  const std::int32_t tail = ws.dataCount - i - 1;
  shift(ws.dataX, i + 1, i, tail);
  shift(ws.dataY, i + 1, i, tail);
  shift(ws.dataValue, i + 1, i, tail);
  --ws.dataCount;
  columnsAfter(ws, cell.x, -1);
  return cell;
}

void putBack(OaWorkspace& ws, std::int32_t i, const LeftOut& cell) {
  const std::int32_t tail = ws.dataCount - i;
  shift(ws.dataX, i, i + 1, tail);
  shift(ws.dataY, i, i + 1, tail);
  shift(ws.dataValue, i, i + 1, tail);
  ws.dataX[i] = cell.x;
  ws.dataY[i] = cell.y;
  ws.dataValue[i] = cell.value;
  ++ws.dataCount;
  columnsAfter(ws, cell.x, +1);
}

// One layer of one trial: every validated data node estimated without its cast.
CvStats validateLayer(const CvInput& input, const RunSettings& s, const LayerCells& cells) {
  const std::int32_t nj = input.values->nj;
  const std::int32_t nk = input.values->nk;
  const std::int32_t l = cells.l;
  const Footprint f = footprintOf(input, s);
  const auto n = static_cast<std::int32_t>(cells.value.size());

  OaWorkspace ws;
  {
    const std::lock_guard<std::mutex> lock(allocatorMutex);
    workspaceSetUp(ws, n, nj, nk, s);
  }
  std::copy(cells.x.begin(), cells.x.end(), ws.dataX);
  std::copy(cells.y.begin(), cells.y.end(), ws.dataY);
  std::copy(cells.value.begin(), cells.value.end(), ws.dataValue);
  ws.dataCount = n;
  {
    const std::lock_guard<std::mutex> lock(allocatorMutex);
    workspaceIndexColumns(ws, nj);
  }

  CvStats stats;
  for (std::int32_t i = 0; i < n; ++i) {
    const auto j = static_cast<std::int32_t>(ws.dataX[i]);
    const auto k = static_cast<std::int32_t>(ws.dataY[i]);
    if (!validatedNode(input, f, j, k, l)) continue;
    const LeftOut cell = leaveOut(ws, i);
    // The selection's column cursors hold entry numbers of the previous node's
    // cells, which taking a cell out has moved: each node searches afresh.
    ws.cursorJ = -1;
    const std::int32_t m = selectData(ws, j, k, s);
    float estimate = 0.0f;
    const bool made = OBJAN(ws, m, &estimate, s) == 0 && !std::isnan(estimate);
    putBack(ws, i, cell);
    if (!made) {
      ++stats.missed;
      continue;
    }
    // Clipped as the analysis clips its layer.
    if (estimate > s.MaxData) estimate = s.MaxData;
    if (s.MinData > estimate) estimate = s.MinData;
    const double difference = static_cast<double>(estimate) - static_cast<double>(cell.value);
    ++stats.nodes;
    stats.sumDifference += difference;
    stats.sumSquare += difference * difference;
  }

  {
    const std::lock_guard<std::mutex> lock(allocatorMutex);
    workspaceRelease(ws);
  }
  return stats;
}

struct Task {
  std::size_t trial = 0;
  std::size_t layer = 0;  // into the gathered layers
  CvStats stats;
};

}  // namespace

void CvStats::add(const CvStats& other) {
  nodes += other.nodes;
  missed += other.missed;
  sumDifference += other.sumDifference;
  sumSquare += other.sumSquare;
}

double CvStats::rms() const {
  return nodes > 0 ? std::sqrt(sumSquare / static_cast<double>(nodes)) : 0.0;
}

double CvStats::bias() const {
  return nodes > 0 ? sumDifference / static_cast<double>(nodes) : 0.0;
}

std::int64_t countValidatedCasts(const CvInput& input, const RunSettings& settings) {
  const Footprint f = footprintOf(input, settings);
  const FloatGrid3D& values = *input.values;
  std::int64_t casts = 0;
  for (std::int32_t j = std::max(f.jFirst, 0); j <= std::min(f.jLast, values.nj - 1); ++j) {
    for (std::int32_t k = std::max(f.kFirst, 0); k <= std::min(f.kLast, values.nk - 1); ++k) {
      for (std::int32_t l = f.lFirst; l <= f.lLast; ++l) {
        if (validatedNode(input, f, j, k, l)) {
          ++casts;
          break;
        }
      }
    }
  }
  return casts;
}

std::vector<CvResult> crossValidate(const CvInput& input, const std::vector<RunSettings>& trials,
                                    std::int32_t threads) {
  std::vector<CvResult> results(trials.size());
  if (trials.empty()) return results;
  // The trials differ in the analysis' keywords only, never in the grid: one
  // footprint, and one gathering of each layer's cells, serve them all.
  const Footprint f = footprintOf(input, trials.front());
  std::vector<LayerCells> layers;
  for (std::int32_t l = f.lFirst; l <= f.lLast; ++l) {
    LayerCells cells;
    if (collectLayer(input, f, l, cells)) layers.push_back(std::move(cells));
  }
  std::vector<Task> tasks;
  for (std::size_t t = 0; t < trials.size(); ++t) {
    const RunSettings& s = trials[t];
    results[t].firstLevel = s.l0;
    results[t].levels.assign(static_cast<std::size_t>(std::max(s.lx - s.l0 + 1, 0)), CvStats{});
    for (std::size_t i = 0; i < layers.size(); ++i) tasks.push_back(Task{t, i, CvStats{}});
  }

  // Workers take the next task in turn; each task's result has its own slot,
  // and the slots are summed in task order afterwards. The first error of any
  // worker stops the others and is thrown again here, on the calling thread.
  std::atomic<std::size_t> next{0};
  std::mutex errorMutex;
  std::exception_ptr error;
  auto work = [&]() {
    try {
      for (std::size_t i = next++; i < tasks.size(); i = next++) {
        tasks[i].stats = validateLayer(input, trials[tasks[i].trial], layers[tasks[i].layer]);
      }
    } catch (...) {
      const std::lock_guard<std::mutex> lock(errorMutex);
      if (error == nullptr) error = std::current_exception();
      next = tasks.size();
    }
  };
  // Each worker's workspace holds some twenty blocks of the checked
  // allocator, whose table has room for 512 live blocks in all.
  constexpr std::int32_t kMaxWorkers = 16;
  const std::size_t workers = std::min<std::size_t>(
      static_cast<std::size_t>(std::clamp(threads, 1, kMaxWorkers)), tasks.size());
  if (workers <= 1) {
    work();
  } else {
    std::vector<std::thread> pool;
    for (std::size_t w = 0; w < workers; ++w) pool.emplace_back(work);
    for (std::thread& t : pool) t.join();
  }
  if (error != nullptr) std::rethrow_exception(error);

  for (const Task& task : tasks) {
    CvResult& r = results[task.trial];
    const std::int32_t level = layers[task.layer].l - input.lOff;  // from the first local level
    r.levels[static_cast<std::size_t>(level)].add(task.stats);
    r.overall.add(task.stats);
  }
  return results;
}

}  // namespace karnet
