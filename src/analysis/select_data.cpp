// Choice of the data cells that inform one node.
#include "analysis/select_data.h"

#include <algorithm>
#include <bit>
#include <climits>
#include <cmath>
#include <cstdint>

#include "analysis/correlation.h"

namespace karnet {
namespace {

// Squared search radius in node units: SearchRadius^2 / dx / dx in single
// precision, the two divisions in turn.
float searchRadius2(const RunSettings& settings) {
  return settings.SearchRadius * settings.SearchRadius / settings.dx / settings.dx;
}

// Largest whole-node offset o whose square, formed as a float the way the
// distance test forms it, does not exceed r2; kUnbounded when that is not a
// usable bound (an infinite or not-a-number radius). A cell further than o in x
// alone, or in y alone, fails the radius test whatever its other offset.
constexpr std::int64_t kUnbounded = std::int64_t{1} << 24;

std::int64_t reachInNodes(float r2) {
  if (!(r2 < static_cast<float>(kUnbounded) * static_cast<float>(kUnbounded))) return kUnbounded;
  if (!(r2 >= 0.0f)) return -1;  // nothing passes a negative radius
  auto o = static_cast<std::int64_t>(std::sqrt(static_cast<double>(r2)));
  auto square = [](std::int64_t v) {
    const auto f = static_cast<float>(v);
    return f * f;
  };
  while (o > 0 && square(o) > r2) --o;
  while (o + 1 < kUnbounded && !(square(o + 1) > r2)) ++o;
  return o;
}

// rowReach[o] for o = 0 .. count - 1: the largest row offset d for which a
// cell o columns and d rows from the node passes the radius test, whose float
// arithmetic (whole-node offsets, exact squares) rises with d; -1 when none
// does. The radius is bounded here (reachInNodes is below kUnbounded), so
// every offset stays exact as a float.
void fillRowReach(std::int32_t* rowReach, std::int64_t count, float r2) {
  auto passes = [r2](std::int64_t o, std::int64_t d) {
    const auto fo = static_cast<float>(o);
    const auto fd = static_cast<float>(d);
    return !(fd * fd + fo * fo > r2);
  };
  std::int64_t d = reachInNodes(r2);
  for (std::int64_t o = 0; o < count; ++o) {
    while (d >= 0 && !passes(o, d)) --d;
    rowReach[o] = static_cast<std::int32_t>(d);
  }
}

// Appends data cell i as a candidate of node (nodeX, nodeY) when it lies within
// the search radius.
inline void consider(OaWorkspace& ws, std::int32_t i, float nodeX, float nodeY, float radius2,
                     std::int32_t& count) {
  const float ddy = nodeY - ws.dataY[i];
  const float ddx = nodeX - ws.dataX[i];
  const float d2 = ddy * ddy + ddx * ddx;
  if (d2 > radius2) return;
  ws.candIndex[count] = i;
  ws.candCorr[count] = tabledCorrelation(d2, ws);
  ++count;
}

// The window of node (j, k) over columns xFirst .. xLast: in column x the
// cells of rows k - rowReach[|x - j|] .. k + rowReach[|x - j|], which are the
// cells the radius test can pass. Cell positions are whole numbers below 2^24
// (the column index holds no others), so the bounds are exact integers.
std::int32_t windowRows(const OaWorkspace& ws, std::int32_t j, std::int64_t x) {
  return ws.rowReach[x < j ? j - x : x - j];
}

// Where column x's cell at cursor i comes into the window (the node row at
// which it does), or INT32_MAX when the column has no cell left above.
std::int32_t enterRow(const OaWorkspace& ws, std::int64_t x, std::int32_t i, std::int32_t rows) {
  if (i >= ws.columnStart[x + 1]) return INT32_MAX;
  return static_cast<std::int32_t>(ws.dataY[i]) - rows;
}

// Fills the window of node (j, k) from the column index, column by column.
void openWindow(OaWorkspace& ws, std::int32_t j, std::int32_t k, std::int64_t xFirst,
                std::int64_t xLast) {
  std::int32_t count = 0;
  std::int32_t nextEnter = INT32_MAX;
  for (std::int64_t x = xFirst; x <= xLast; ++x) {
    const std::int32_t rows = windowRows(ws, j, x);
    const std::int64_t yFirst = std::int64_t{k} - rows;
    const std::int64_t yLast = std::int64_t{k} + rows;
    const std::int32_t end = ws.columnStart[x + 1];
    const float* first = std::lower_bound(
        ws.dataY + ws.columnStart[x], ws.dataY + end, yFirst,
        [](float y, std::int64_t bound) { return static_cast<std::int64_t>(y) < bound; });
    auto i = static_cast<std::int32_t>(first - ws.dataY);
    for (; i < end && static_cast<std::int64_t>(ws.dataY[i]) <= yLast; ++i) {
      ws.windowCell[count] = i;
      ws.windowLast[count] = static_cast<std::int32_t>(ws.dataY[i]) + rows;
      ++count;
    }
    ws.columnCursor[x] = i;
    ws.columnEnter[x] = enterRow(ws, x, i, rows);
    nextEnter = std::min(nextEnter, ws.columnEnter[x]);
  }
  ws.windowCount = count;
  ws.nextEnter = nextEnter;
}

// Moves the window of node (j, cursorK) up to node (j, k), k >= cursorK: the
// cells whose last row has passed leave, the cells of each column that the
// window has reached come in (unless the window has passed them too), and the
// window stays in collection order.
void slideWindow(OaWorkspace& ws, std::int32_t j, std::int32_t k, std::int64_t xFirst,
                 std::int64_t xLast) {
  std::int32_t kept = 0;
  for (std::int32_t p = 0; p < ws.windowCount; ++p) {
    ws.windowCell[kept] = ws.windowCell[p];
    ws.windowLast[kept] = ws.windowLast[p];
    kept += ws.windowLast[p] >= k ? 1 : 0;
  }
  ws.windowCount = kept;
  if (ws.nextEnter > k) return;

  // The cells coming in, in column order (so ascending), gathered in
  // candIndex, which is free until the candidates are taken.
  std::int32_t* incoming = ws.candIndex;
  std::int32_t added = 0;
  std::int32_t nextEnter = INT32_MAX;
  for (std::int64_t x = xFirst; x <= xLast; ++x) {
    if (ws.columnEnter[x] <= k) {
      const std::int32_t rows = windowRows(ws, j, x);
      const std::int32_t end = ws.columnStart[x + 1];
      std::int32_t i = ws.columnCursor[x];
      for (; i < end && static_cast<std::int64_t>(ws.dataY[i]) <= std::int64_t{k} + rows; ++i) {
        if (static_cast<std::int64_t>(ws.dataY[i]) + rows >= k) incoming[added++] = i;
      }
      ws.columnCursor[x] = i;
      ws.columnEnter[x] = enterRow(ws, x, i, rows);
    }
    nextEnter = std::min(nextEnter, ws.columnEnter[x]);
  }
  ws.nextEnter = nextEnter;

  // Merge, from the back, the incoming cells into the window.
  std::int32_t p = ws.windowCount - 1;
  std::int32_t out = ws.windowCount + added - 1;
  for (std::int32_t q = added - 1; q >= 0; --out) {
    if (p >= 0 && ws.windowCell[p] > incoming[q]) {
      ws.windowCell[out] = ws.windowCell[p];
      ws.windowLast[out] = ws.windowLast[p];
      --p;
    } else {
      const std::int32_t i = incoming[q--];
      ws.windowCell[out] = i;
      ws.windowLast[out] = static_cast<std::int32_t>(ws.dataY[i]) +
                           windowRows(ws, j, static_cast<std::int64_t>(ws.dataX[i]));
    }
  }
  ws.windowCount += added;
}

// The exchange sort of sortByCorrelation on one array of 64-bit keys instead
// of two arrays: the high half is an integer image of the correlation that
// orders as the floats do (both zeros alike), the low half the candidate's
// position, which the comparisons leave out. The same comparisons in the same
// order make the same moves. Returns false, sorting nothing, when a
// correlation is not a number (which no integer image orders like a float).
bool sortByKey(OaWorkspace& ws, std::int32_t n) {
  std::uint64_t* key = ws.candKey;
  for (std::int32_t i = 0; i < n; ++i) {
    const float c = ws.candCorr[i];
    if (c != c) return false;
    const auto bits = std::bit_cast<std::uint32_t>(c == 0.0f ? 0.0f : c);
    const std::uint32_t image = bits & 0x80000000u ? ~bits : bits | 0x80000000u;
    key[i] = (std::uint64_t{image} << 32) | static_cast<std::uint32_t>(i);
  }
  constexpr std::uint64_t kHigh = 0xffffffff00000000u;
  for (std::int32_t gap = n / 2; gap >= 1; gap /= 2) {
    for (std::int32_t i = gap; i < n; ++i) {
      const std::uint64_t moving = key[i];
      const std::uint64_t bound = moving & kHigh;  // below it: a smaller correlation
      std::int32_t p = i;
      while (p >= gap && key[p - gap] < bound) {
        key[p] = key[p - gap];
        p -= gap;
      }
      key[p] = moving;
    }
  }
  return true;
}

}  // namespace

void sortByCorrelation(float* corr, std::int32_t* index, std::int32_t n) {
  // The exchange sort repeats passes over the pairs (i, i + gap) until no pair
  // is out of order, for gaps n/2, n/4, ..., 1. Pairs of one gap only ever join
  // entries of the same residue class modulo the gap, and within a class each
  // exchange swaps neighbours that are strictly out of order: equal values
  // never pass each other, and a not-a-number (which compares with nothing)
  // never moves and is never passed. So each gap's pass series leaves every
  // class in the one order a stable descending sort gives, with any
  // not-a-number as a fixed barrier. A gapped insertion sort with the same
  // strict comparison reaches that very order without the repeated passes.
  if (n < 2) return;
  for (std::int32_t gap = n / 2; gap >= 1; gap /= 2) {
    for (std::int32_t i = gap; i < n; ++i) {
      const float value = corr[i];
      const std::int32_t moving = index[i];
      std::int32_t p = i;
      while (p >= gap && corr[p - gap] < value) {
        corr[p] = corr[p - gap];
        index[p] = index[p - gap];
        p -= gap;
      }
      corr[p] = value;
      index[p] = moving;
    }
  }
}

std::int32_t selectData(OaWorkspace& ws, std::int32_t j, std::int32_t k,
                        const RunSettings& settings) {
  const float radius2 = searchRadius2(settings);
  const float nodeX = static_cast<float>(j);
  const float nodeY = static_cast<float>(k);

  std::int32_t count = 0;
  if (ws.columnStart != nullptr && ws.columnCount > 0) {
    // Cells in column order: only the columns, and within a column only the
    // rows, that the radius can reach are visited, in collection order. Cells
    // outside that window would fail the radius test anyway.
    const std::int32_t nj = ws.columnCount;
    const bool sameRadius = ws.rowReachCount != 0 && ws.rowReachRadius2 == radius2;
    const std::int64_t reach = sameRadius ? ws.rowReachNodes : reachInNodes(radius2);
    const std::int64_t xFirst = std::max<std::int64_t>(std::int64_t{j} - reach, 0);
    const std::int64_t xLast = std::min<std::int64_t>(std::int64_t{j} + reach, nj - 1);
    if (reach >= kUnbounded) {
      for (std::int64_t x = xFirst; x <= xLast; ++x) {
        for (std::int32_t i = ws.columnStart[x]; i < ws.columnStart[x + 1]; ++i) {
          consider(ws, i, nodeX, nodeY, radius2, count);
        }
      }
    } else if (xFirst <= xLast) {
      std::int32_t* rowReach = ws.rowReach;
      if (!sameRadius) {
        const std::int64_t offsets = std::min<std::int64_t>(reach + 1, nj);
        fillRowReach(rowReach, offsets, radius2);
        ws.rowReachCount = static_cast<std::int32_t>(offsets);
        ws.rowReachRadius2 = radius2;
        ws.rowReachNodes = reach;
      }
      if (sameRadius && ws.cursorJ == j && ws.cursorK <= k) {
        slideWindow(ws, j, k, xFirst, xLast);
      } else {
        openWindow(ws, j, k, xFirst, xLast);
      }
      ws.cursorJ = j;
      ws.cursorK = k;
      for (std::int32_t p = 0; p < ws.windowCount; ++p) {
        consider(ws, ws.windowCell[p], nodeX, nodeY, radius2, count);
      }
    }
  } else {
    for (std::int32_t i = 0; i < ws.dataCount; ++i) {
      consider(ws, i, nodeX, nodeY, radius2, count);
    }
  }

  std::int32_t kept = count;
  if (count > ws.limit) {
    kept = ws.limit > 0 ? ws.limit : 0;
    if (sortByKey(ws, count)) {
      // Candidate p of the sorted order is the one first found at position
      // candKey[p]'s low half.
      for (std::int32_t p = 0; p < kept; ++p) {
        const auto from = static_cast<std::int32_t>(ws.candKey[p] & 0xffffffffu);
        const std::int32_t i = ws.candIndex[from];
        ws.selIndex[p] = i;
        ws.selX[p] = ws.dataX[i];
        ws.selY[p] = ws.dataY[i];
        ws.selValue[p] = ws.dataValue[i];
        ws.selCorr[p] = ws.candCorr[from];
      }
      return kept;
    }
    sortByCorrelation(ws.candCorr, ws.candIndex, count);
  }
  for (std::int32_t p = 0; p < kept; ++p) {
    const std::int32_t i = ws.candIndex[p];
    ws.selIndex[p] = i;
    ws.selX[p] = ws.dataX[i];
    ws.selY[p] = ws.dataY[i];
    ws.selValue[p] = ws.dataValue[i];
    ws.selCorr[p] = ws.candCorr[p];
  }
  return kept;
}

}  // namespace karnet
