// Matrix inversion of the optimal interpolation: Gauss-Jordan elimination with
// full pivoting, in place and in single precision.
#include "analysis/invmtx.h"

#include <cmath>

namespace karnet {
namespace {

// Scalings by ten that mark a determinant as too large.
constexpr std::int32_t kTooLarge = 76;

}  // namespace

std::int32_t INVMTX(OaWorkspace& ws, float* a, std::int32_t n, float& det) {
  if (n < 1) {
    ws.errorText = "NOBS < 1 in INVMTX";
    return -1;
  }
  if (ws.limit < n) {
    ws.errorText = "LIMIT < N in INVMTX";
    return -1;
  }
  const std::int64_t stride = ws.limit;
  auto at = [a, stride](std::int32_t r, std::int32_t q) -> float& { return a[r * stride + q]; };

  // used[c] is -1 while column c has not been a pivot column, else the row its
  // pivot was found in; order[s] is the pivot column of step s.
  std::int32_t* used = ws.pivot;
  std::int32_t* order = ws.pivot + n;
  for (std::int32_t i = 0; i < 2 * n; ++i) ws.pivot[i] = -1;
  det = 1.0f;
  std::int32_t scale = 0;

  // The indices not yet used as pivots, ascending; a free column is also a
  // free row, as each pivot is moved onto the diagonal.
  std::int32_t* free = ws.pivot + 2 * std::int64_t{n};
  std::int32_t freeCount = n;
  for (std::int32_t i = 0; i < n; ++i) free[i] = i;

  for (std::int32_t s = 0; s < n; ++s) {
    // Pivot search. The scan runs over columns (outer) and rows (inner) of the
    // free entries and takes the entry of greatest magnitude, ">=" letting the
    // last of equal magnitudes win: that is the equal-magnitude entry with the
    // greatest column, and within it the greatest row. Here the free entries
    // are visited row by row, along memory, with that tie rule made explicit.
    // A not-a-number never wins; should every free entry be one, the first
    // free column and row stand as the pivot.
    std::int32_t pivotRow = free[0];
    std::int32_t pivotCol = free[0];
    float largest = 0.0f;
    bool found = false;
    for (std::int32_t ri = 0; ri < freeCount; ++ri) {
      const std::int32_t r = free[ri];
      const float* row = &at(r, 0);
      for (std::int32_t ci = 0; ci < freeCount; ++ci) {
        const std::int32_t b = free[ci];
        const float magnitude = std::fabs(row[b]);
        if (magnitude > largest || (magnitude == largest && (!found || b >= pivotCol))) {
          largest = magnitude;
          pivotRow = r;
          pivotCol = b;
          found = true;
        }
      }
    }
    const std::int32_t pr = pivotRow;
    const std::int32_t pc = pivotCol;
    used[pc] = pr;
    order[s] = pc;
    std::int32_t kept = 0;
    for (std::int32_t i = 0; i < freeCount; ++i) {
      if (free[i] != pc) free[kept++] = free[i];
    }
    freeCount = kept;
    const float p = at(pr, pc);

    det = det * p;
    while (std::fabs(det) > 1.0f) {
      if (std::isinf(det)) {
        // No scaling by ten makes an infinite determinant finite: count it as
        // too large at once instead of dividing for ever.
        if (scale < kTooLarge) scale = kTooLarge;
        break;
      }
      det = static_cast<float>(static_cast<double>(det) / 10.0);
      ++scale;
    }

    const float stepped = p / static_cast<float>(s + 1);
    if (std::fabs(static_cast<double>(stepped)) < 1e-4) {
      ws.errorText = "Matrix singular in INVMTX";
      return -1;
    }

    at(pr, pc) = 1.0f;
    // Exchange rows pr and pc; the row that lands in pc is divided by p.
    float* rowA = &at(pr, 0);
    float* rowB = &at(pc, 0);
    for (std::int32_t q = 0; q < n; ++q) {
      const float t = rowA[q];
      rowA[q] = rowB[q];
      rowB[q] = t / p;
    }

    // Elimination of column pc from every other row.
    for (std::int32_t r = 0; r < n; ++r) {
      if (r == pc) continue;
      float* row = &at(r, 0);
      const float f = row[pc];
      row[pc] = 0.0f;
      for (std::int32_t q = 0; q < n; ++q) row[q] = row[q] - f * rowB[q];
    }
  }

  // Undo the interchanges as column exchanges, last step first.
  for (std::int32_t s = n - 1; s >= 0; --s) {
    const std::int32_t b = order[s];
    const std::int32_t r = used[b];
    if (r == b) continue;
    det = static_cast<float>(static_cast<double>(det) * -1.0);
    for (std::int32_t q = 0; q < n; ++q) {
      float* row = &at(q, 0);
      const float t = row[r];
      row[r] = row[b];
      row[b] = t;
    }
  }

  if (scale >= kTooLarge) {
    ws.errorText = "Determinant too large in INVMTX";
    det = static_cast<float>(scale);
    return -1;
  }
  det = static_cast<float>(static_cast<double>(det) * std::pow(10.0, scale));
  if (static_cast<double>(det) < 1e-4) ws.errorText = "Determinant very small in INVMTX";
  return 0;
}

}  // namespace karnet
