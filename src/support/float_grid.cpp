// Creation, release, filling and window copies of the 2-D and 3-D float grids.
#include "support/float_grid.h"

#include <algorithm>
#include <cmath>
#include <cstdint>

#include "support/checked_alloc.h"
#include "support/file_description.h"

namespace karnet {
namespace {

// Truncation toward zero that stays defined for any float: NaN gives 0 and
// values beyond the 32-bit range saturate.
std::int32_t truncateToInt32(float value) {
  if (std::isnan(value)) return 0;
  const double truncated = std::trunc(static_cast<double>(value));
  if (truncated <= static_cast<double>(INT32_MIN)) return INT32_MIN;
  if (truncated >= static_cast<double>(INT32_MAX)) return INT32_MAX;
  return static_cast<std::int32_t>(truncated);
}

std::int32_t countFromLastIndex(std::int32_t lastIndex) {
  return lastIndex == INT32_MAX ? INT32_MAX : lastIndex + 1;
}

// Element counts become byte sizes in 64 bits. A negative count cannot be
// served and ends the run like any request the platform cannot satisfy.
float* allocateFloats(std::int64_t count) {
  if (count < 0) memoryError(1, nullptr);
  return checkedAllocArray<float>(static_cast<std::uint64_t>(count));
}

}  // namespace

FloatGrid2D grid2DFromDescription(const FileDescription& description) {
  FloatGrid2D grid;
  grid.j0 = truncateToInt32(description.axes[1].start);
  grid.k0 = truncateToInt32(description.axes[2].start);
  grid.nj = countFromLastIndex(description.axes[1].lastIndex);
  grid.nk = countFromLastIndex(description.axes[2].lastIndex);
  grid.data = nullptr;
  return grid;
}

void grid2DAlloc(FloatGrid2D& grid) {
  if (grid.nj < 0 || grid.nk < 0) memoryError(1, nullptr);
  grid.data = allocateFloats(grid.elementCount());
}

void grid3DAlloc(FloatGrid3D& grid) { grid.data = allocateFloats(grid.total); }

void grid2DFree(FloatGrid2D& grid) {
  if (grid.data == nullptr) return;
  checkedFree(grid.data);
  grid.data = nullptr;
}

void grid3DFree(FloatGrid3D& grid) {
  if (grid.data == nullptr) return;
  checkedFree(grid.data);
  grid.data = nullptr;
}

void grid3DFill(FloatGrid3D& grid, float value, int threads) {
  if (grid.data == nullptr || grid.total <= 0) return;
  // In pieces over the threads: a new grid's pages are then also first
  // touched (and so mapped) on all of them.
  constexpr std::int64_t kPiece = std::int64_t{1} << 20;
  const std::int64_t total = grid.total;
  float* data = grid.data;
#pragma omp parallel for schedule(static) num_threads(threads) if (threads > 1 && total > kPiece)
  for (std::int64_t at = 0; at < total; at += kPiece) {
    std::fill(data + at, data + std::min(total, at + kPiece), value);
  }
}

void grid3DLayerGet(const FloatGrid3D& grid, std::int32_t l, FloatGrid2D& layer) {
  const float* from = grid.data + grid.index(grid.j0, grid.k0, l);
  std::copy(from, from + grid.layerSize(), layer.data);
}

void grid3DLayerPut(FloatGrid3D& grid, std::int32_t l, const FloatGrid2D& layer) {
  std::copy(layer.data, layer.data + grid.layerSize(), grid.data + grid.index(grid.j0, grid.k0, l));
}

void grid2DCopyWindow(FloatGrid2D& destination, const FloatGrid2D& source) {
  if (destination.data == nullptr || source.data == nullptr) return;
  // Only the part of the destination's window that the source covers is
  // copied; nodes outside the source keep their values instead of being read
  // from beyond the source's array.
  const std::int64_t jFirst = std::max<std::int64_t>(destination.j0, source.j0);
  const std::int64_t kFirst = std::max<std::int64_t>(destination.k0, source.k0);
  const std::int64_t jEnd = std::min(std::int64_t{destination.j0} + destination.nj,
                                     std::int64_t{source.j0} + source.nj);
  const std::int64_t kEnd = std::min(std::int64_t{destination.k0} + destination.nk,
                                     std::int64_t{source.k0} + source.nk);
  for (std::int64_t k = kFirst; k < kEnd; ++k) {
    for (std::int64_t j = jFirst; j < jEnd; ++j) {
      const auto jj = static_cast<std::int32_t>(j);
      const auto kk = static_cast<std::int32_t>(k);
      destination.at(jj, kk) = source.at(jj, kk);
    }
  }
}

}  // namespace karnet
