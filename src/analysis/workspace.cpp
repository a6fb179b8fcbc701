// Set-up and release of the objective analysis workspace.
#include "analysis/workspace.h"

#include <algorithm>
#include <cstdint>

#include "support/checked_alloc.h"

namespace karnet {
namespace {

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

  ws.selX = allocateEntries<float>(limit);
  ws.selY = allocateEntries<float>(limit);
  ws.selValue = allocateEntries<float>(limit);
  ws.selCorr = allocateEntries<float>(limit);
  ws.matrix = allocateEntries<float>(limit * limit);

  ws.lineCapacity = static_cast<std::int32_t>(line);
  ws.lineBuffer = allocateEntries<float>(line);

  ws.pivot = allocateEntries<std::int32_t>(2 * limit);
  ws.rowSum = allocateEntries<float>(limit);
  ws.rowDot = allocateEntries<float>(limit);
  ws.errorText = "";
}

void workspaceRelease(OaWorkspace& ws) {
  release(ws.dataX);
  release(ws.dataY);
  release(ws.dataValue);
  release(ws.candIndex);
  release(ws.candCorr);
  release(ws.selX);
  release(ws.selY);
  release(ws.selValue);
  release(ws.selCorr);
  release(ws.matrix);
  release(ws.lineBuffer);
  release(ws.pivot);
  release(ws.rowSum);
  release(ws.rowDot);
  ws.dataCapacity = 0;
  ws.dataCount = 0;
  ws.lineCapacity = 0;
}

}  // namespace karnet
