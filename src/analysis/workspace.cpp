// Set-up and release of the objective analysis workspace.
#include "analysis/workspace.h"

#include <algorithm>
#include <cmath>
#include <cstdint>

#include "analysis/correlation.h"
#include "support/checked_alloc.h"

namespace karnet {
namespace {

// Largest correlation table: beyond it the correlation is computed directly.
constexpr std::int64_t kMaxCorrelationTable = std::int64_t{1} << 16;

// At least one element per array, so that an empty layer or a degenerate limit
// never asks the allocator for a zero-sized block.
template <typename T>
T* allocateEntries(std::int64_t count) {
  return checkedAllocArray<T>(static_cast<std::uint64_t>(std::max<std::int64_t>(count, 1)));
}

template <typename T>
void release(T*& p) {
  if (p != nullptr) checkedFree(p);
  p = nullptr;
}

// Number of table entries worth computing: no squared distance within an
// nj x nk layer exceeds (nj - 1)^2 + (nk - 1)^2, and beyond the cut-off
// 40 * decay2 the correlation is 0 at the price of one comparison.
std::int64_t correlationTableSize(const OaWorkspace& ws, std::int32_t nj, std::int32_t nk) {
  const std::int64_t sj = std::max<std::int64_t>(nj - 1, 0);
  const std::int64_t sk = std::max<std::int64_t>(nk - 1, 0);
  std::int64_t size = std::min(sj * sj + sk * sk + 1, kMaxCorrelationTable);
  const double cutOff = 40.0 * static_cast<double>(ws.decay2);
  if (cutOff >= 0.0 && cutOff < static_cast<double>(size)) {
    size = static_cast<std::int64_t>(std::floor(cutOff)) + 1;
  }
  return size;
}

}  // namespace

void workspaceSetUp(OaWorkspace& ws, std::int32_t nData, std::int32_t nj, std::int32_t nk,
                    const RunSettings& settings) {
  ws.limit = settings.CorrelationSampleSize;
  const float dx2 = settings.dx * settings.dx;
  ws.decay2 = (settings.DecayDistance * 2.0f * settings.DecayDistance) / dx2;
  ws.zeroCross2 = (settings.ZeroCrossingDistance * settings.ZeroCrossingDistance) / dx2;

  const std::int64_t data = std::max<std::int32_t>(nData, 0);
  const std::int64_t limit = std::max<std::int32_t>(ws.limit, 0);
  const std::int64_t line = std::max<std::int32_t>(std::max(nj, nk), 0);

  ws.dataCapacity = static_cast<std::int32_t>(data);
  ws.dataCount = 0;
  ws.dataX = allocateEntries<float>(data);
  ws.dataY = allocateEntries<float>(data);
  ws.dataValue = allocateEntries<float>(data);
  ws.candIndex = allocateEntries<std::int32_t>(data);
  ws.candCorr = allocateEntries<float>(data);
  ws.candKey = allocateEntries<std::uint64_t>(data);
  ws.windowCell = allocateEntries<std::int32_t>(data);
  ws.windowLast = allocateEntries<std::int32_t>(data);

  ws.selIndex = allocateEntries<std::int32_t>(limit);
  ws.selX = allocateEntries<float>(limit);
  ws.selY = allocateEntries<float>(limit);
  ws.selValue = allocateEntries<float>(limit);
  ws.selCorr = allocateEntries<float>(limit);
  ws.matrix = allocateEntries<float>(limit * limit);
  ws.rowSums = allocateEntries<float>(limit);
  ws.rowProducts = allocateEntries<float>(limit);

  ws.lineCapacity = static_cast<std::int32_t>(line);
  ws.lineBuffer = allocateEntries<float>(line);

  ws.pivot = allocateEntries<std::int32_t>(oaPivotEntries(limit));

  // The table is filled by the very function it stands in for, so a look-up
  // and a direct evaluation give the same bits.
  ws.corrTableSize = 0;
  const std::int64_t tableSize = correlationTableSize(ws, nj, nk);
  ws.corrTable = allocateEntries<float>(tableSize);
  for (std::int64_t i = 0; i < tableSize; ++i) {
    ws.corrTable[i] = correlation(static_cast<float>(i), ws);
  }
  ws.corrTableSize = static_cast<std::int32_t>(tableSize);

  ws.columnCount = 0;
  ws.columnStart = nullptr;
  ws.columnCursor = nullptr;
  ws.columnEnter = nullptr;
  ws.cursorJ = -1;
  ws.rowReach = nullptr;
  ws.rowReachCount = 0;
  ws.errorText = "";
}

void workspaceIndexColumns(OaWorkspace& ws, std::int32_t nj) {
  release(ws.columnStart);
  release(ws.columnCursor);
  release(ws.columnEnter);
  release(ws.rowReach);
  ws.columnCount = 0;
  ws.cursorJ = -1;
  ws.rowReachCount = 0;
  // Positions must stay exact as floats for the column window of the selection.
  if (nj < 1 || nj >= (1 << 24)) return;

  // Column order means: whole-node positions inside the layer, x never
  // decreasing, and y strictly increasing within a column.
  for (std::int32_t i = 0; i < ws.dataCount; ++i) {
    const float x = ws.dataX[i];
    const float y = ws.dataY[i];
    if (!(x >= 0.0f && x < static_cast<float>(nj)) || x != std::floor(x)) return;
    if (!(y >= 0.0f && y < 16777216.0f) || y != std::floor(y)) return;
    if (i > 0) {
      const float px = ws.dataX[i - 1];
      if (x < px || (x == px && !(ws.dataY[i - 1] < y))) return;
    }
  }

  ws.columnStart = allocateEntries<std::int32_t>(std::int64_t{nj} + 1);
  std::int32_t i = 0;
  for (std::int32_t x = 0; x < nj; ++x) {
    ws.columnStart[x] = i;
    while (i < ws.dataCount && ws.dataX[i] == static_cast<float>(x)) ++i;
  }
  ws.columnStart[nj] = i;
  ws.columnCursor = allocateEntries<std::int32_t>(nj);
  ws.columnEnter = allocateEntries<std::int32_t>(nj);
  ws.rowReach = allocateEntries<std::int32_t>(nj);
  ws.columnCount = nj;
}

void workspaceRelease(OaWorkspace& ws) {
  release(ws.dataX);
  release(ws.dataY);
  release(ws.dataValue);
  release(ws.candIndex);
  release(ws.candCorr);
  release(ws.candKey);
  release(ws.windowCell);
  release(ws.windowLast);
  release(ws.selIndex);
  release(ws.selX);
  release(ws.selY);
  release(ws.selValue);
  release(ws.selCorr);
  release(ws.matrix);
  release(ws.rowSums);
  release(ws.rowProducts);
  release(ws.lineBuffer);
  release(ws.pivot);
  release(ws.corrTable);
  release(ws.columnStart);
  release(ws.columnCursor);
  release(ws.columnEnter);
  release(ws.rowReach);
  ws.cursorJ = -1;
  ws.rowReachCount = 0;
  ws.dataCapacity = 0;
  ws.dataCount = 0;
  ws.lineCapacity = 0;
  ws.corrTableSize = 0;
  ws.columnCount = 0;
}

}  // namespace karnet
