// Matrix inversion of the optimal interpolation: Gauss-Jordan elimination with
// full pivoting, in place and in single precision.
//
// The row operations (pivot search, row exchange and scaling, elimination) are
// written as plain loops over whole rows in which every element has its own
// operations, in the order the method states them: vectorised, each element
// still sees exactly the same single-precision operations, so every width gives
// the same bits. The same body is compiled once per instruction set (AVX-512,
// AVX2, the baseline); which one runs is decided once, from the processor.
#include "analysis/invmtx.h"

#include <bit>
#include <cmath>
#include <cstdint>

namespace karnet {
namespace {

// Scalings by ten that mark a determinant as too large.
constexpr std::int32_t kTooLarge = 76;

// Sort key of a matrix entry in the pivot search: the bits of its magnitude,
// which order non-negative floats as the floats themselves, or -1 for a
// not-a-number (which never wins the ">=" comparison). notFree is 0 for a free
// column and -1 for a used one, which turns its key into -1.
inline std::int32_t pivotKey(float value, std::int32_t notFree) {
  std::int32_t magnitude = std::bit_cast<std::int32_t>(value) & 0x7fffffff;
  magnitude = magnitude > 0x7f800000 ? -1 : magnitude;
  return magnitude | notFree;
}

[[gnu::always_inline]] inline std::int32_t invert(OaWorkspace& ws, float* a, std::int32_t n,
                                                  float& det) {
  if (n < 1) {
    ws.errorText = "NOBS < 1 in INVMTX";
    return -1;
  }
  if (ws.limit < n) {
    ws.errorText = "LIMIT < N in INVMTX";
    return -1;
  }
  const std::int64_t stride = ws.limit;
  auto rowOf = [a, stride](std::int32_t r) { return a + r * stride; };

  // used[c] is -1 while column c has not been a pivot column, else the row its
  // pivot was found in; order[s] is the pivot column of step s.
  std::int32_t* __restrict used = ws.pivot;
  std::int32_t* __restrict order = ws.pivot + n;
  for (std::int32_t i = 0; i < 2 * n; ++i) ws.pivot[i] = -1;
  det = 1.0f;
  std::int32_t scale = 0;

  // The indices not yet used as pivots, ascending; a free column is also a
  // free row, as each pivot is moved onto the diagonal.
  std::int32_t* __restrict free = ws.pivot + 2 * std::int64_t{n};
  std::int32_t freeCount = n;
  for (std::int32_t i = 0; i < n; ++i) free[i] = i;
  // The greatest pivot key of each free row over the free columns, as the
  // pivot search needs it: made here for the first step, and for each later
  // step while the elimination before it writes the row.
  std::int32_t* __restrict rowKey = ws.pivot + 3 * std::int64_t{n};
  for (std::int32_t r = 0; r < n; ++r) {
    const float* __restrict row = rowOf(r);
    std::int32_t rowBest = -1;
    for (std::int32_t q = 0; q < n; ++q) {
      const std::int32_t key = pivotKey(row[q], 0);
      rowBest = key > rowBest ? key : rowBest;
    }
    rowKey[r] = rowBest;
  }

  for (std::int32_t s = 0; s < n; ++s) {
    // Pivot search. The method scans the free entries over columns (outer) and
    // rows (inner) and takes the entry of greatest magnitude, ">=" letting the
    // last of equal magnitudes win: that is the equal-magnitude entry with the
    // greatest column, and within it the greatest row. Here each free row's
    // greatest key over the free columns (rowKey) is compared, and only a row
    // that reaches the running maximum is looked at for its last column
    // holding it. A not-a-number never wins; should every free entry be one,
    // the first free column and row stand as the pivot.
    std::int32_t pivotRow = free[0];
    std::int32_t pivotCol = free[0];
    std::int32_t best = -1;
    for (std::int32_t ri = 0; ri < freeCount; ++ri) {
      const std::int32_t r = free[ri];
      const float* __restrict row = rowOf(r);
      const std::int32_t rowBest = rowKey[r];
      if (rowBest < best || rowBest < 0) continue;
      std::int32_t col = n - 1;
      while (pivotKey(row[col], ~used[col] >> 31) != rowBest) --col;
      if (rowBest > best || col >= pivotCol) {
        best = rowBest;
        pivotRow = r;
        pivotCol = col;
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
    const float p = rowOf(pr)[pc];

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

    // The pivot entry becomes 1 before the exchange, and each eliminated row's
    // entry in column pc becomes 0 before its update. Both are folded into the
    // row loops as a choice per element (the same values in the same
    // operations): a single-element store right before a loop that reads the
    // row as vectors would stall the load.
    // Exchange rows pr and pc; the row that lands in pc is divided by p.
    float* rowB = rowOf(pc);
    if (pr == pc) {
      for (std::int32_t q = 0; q < n; ++q) rowB[q] = (q == pc ? 1.0f : rowB[q]) / p;
    } else {
      float* __restrict rowA = rowOf(pr);
      float* __restrict target = rowB;
      for (std::int32_t q = 0; q < n; ++q) {
        const float t = q == pc ? 1.0f : rowA[q];
        rowA[q] = target[q];
        target[q] = t / p;
      }
    }

    // Elimination of column pc from every other row; a row still free takes
    // its pivot key for the next step on the way.
    const float* __restrict pivotRowValues = rowB;
    for (std::int32_t r = 0; r < n; ++r) {
      if (r == pc) continue;
      float* __restrict row = rowOf(r);
      const float f = row[pc];
      if (used[r] < 0) {
        std::int32_t rowBest = -1;
        for (std::int32_t q = 0; q < n; ++q) {
          const float value = (q == pc ? 0.0f : row[q]) - f * pivotRowValues[q];
          row[q] = value;
          const std::int32_t key = pivotKey(value, ~used[q] >> 31);
          rowBest = key > rowBest ? key : rowBest;
        }
        rowKey[r] = rowBest;
      } else {
        for (std::int32_t q = 0; q < n; ++q) {
          row[q] = (q == pc ? 0.0f : row[q]) - f * pivotRowValues[q];
        }
      }
    }
  }

  // Undo the interchanges as column exchanges, last step first.
  for (std::int32_t s = n - 1; s >= 0; --s) {
    const std::int32_t b = order[s];
    const std::int32_t r = used[b];
    if (r == b) continue;
    det = static_cast<float>(static_cast<double>(det) * -1.0);
    for (std::int32_t q = 0; q < n; ++q) {
      float* row = rowOf(q);
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
  // pow(10, 0) is exactly 1 by definition; the usual unscaled determinant
  // spares the call.
  const double power = scale == 0 ? 1.0 : std::pow(10.0, scale);
  det = static_cast<float>(static_cast<double>(det) * power);
  if (static_cast<double>(det) < 1e-4) ws.errorText = "Determinant very small in INVMTX";
  return 0;
}

std::int32_t invertBaseline(OaWorkspace& ws, float* a, std::int32_t n, float& det) {
  return invert(ws, a, n, det);
}

#if defined(__x86_64__) && defined(__GNUC__)
#define KARNET_INVMTX_CLONES 1
[[gnu::target("avx2")]] std::int32_t invertAvx2(OaWorkspace& ws, float* a, std::int32_t n,
                                                float& det) {
  return invert(ws, a, n, det);
}

[[gnu::target("avx512f,avx512bw,avx512vl,prefer-vector-width=512")]] std::int32_t invertAvx512(
    OaWorkspace& ws, float* a, std::int32_t n, float& det) {
  return invert(ws, a, n, det);
}
#endif

using InvertFunction = std::int32_t (*)(OaWorkspace&, float*, std::int32_t, float&);

InvertFunction variantFunction(InvmtxVariant variant) {
  if (!invmtxVariantAvailable(variant)) return nullptr;
  switch (variant) {
    case InvmtxVariant::kBaseline:
      return invertBaseline;
#ifdef KARNET_INVMTX_CLONES
    case InvmtxVariant::kAvx2:
      return invertAvx2;
    case InvmtxVariant::kAvx512:
      return invertAvx512;
#endif
    default:
      return nullptr;
  }
}

// The variant for blocks of up to kShortRows rows, and the one for larger
// blocks. 512-bit rows only pay once they are long: on short ones the partial
// vector at the end of each row costs more than the wider body saves.
constexpr std::int32_t kShortRows = 32;

struct Chosen {
  InvertFunction shortRows = invertBaseline;
  InvertFunction longRows = invertBaseline;
};

Chosen chooseVariants() {
  Chosen chosen;
  if (InvertFunction f = variantFunction(InvmtxVariant::kAvx2)) {
    chosen.shortRows = f;
    chosen.longRows = f;
  }
  if (InvertFunction f = variantFunction(InvmtxVariant::kAvx512)) chosen.longRows = f;
  return chosen;
}

}  // namespace

bool invmtxVariantAvailable(InvmtxVariant variant) {
  switch (variant) {
    case InvmtxVariant::kBaseline:
      return true;
#ifdef KARNET_INVMTX_CLONES
    case InvmtxVariant::kAvx2:
      return __builtin_cpu_supports("avx2");
    case InvmtxVariant::kAvx512:
      return __builtin_cpu_supports("avx512f") && __builtin_cpu_supports("avx512bw") &&
             __builtin_cpu_supports("avx512vl");
#endif
    default:
      return false;
  }
}

const char* invmtxVariantName(InvmtxVariant variant) {
  switch (variant) {
    case InvmtxVariant::kBaseline:
      return "baseline";
    case InvmtxVariant::kAvx2:
      return "avx2";
    case InvmtxVariant::kAvx512:
      return "avx512";
  }
  return "?";
}

std::int32_t INVMTX(OaWorkspace& ws, float* a, std::int32_t n, float& det) {
  static const Chosen chosen = chooseVariants();
  return (n > kShortRows ? chosen.longRows : chosen.shortRows)(ws, a, n, det);
}

std::int32_t invmtxWith(InvmtxVariant variant, OaWorkspace& ws, float* a, std::int32_t n,
                        float& det) {
  const InvertFunction f = variantFunction(variant);
  return f != nullptr ? f(ws, a, n, det) : invertBaseline(ws, a, n, det);
}

}  // namespace karnet
