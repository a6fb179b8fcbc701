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
#include <iterator>
#include <utility>

#if defined(__x86_64__) && defined(__GNUC__)
#include <immintrin.h>
#endif

namespace karnet {
namespace {

// Scalings by ten that mark a determinant as too large.
constexpr std::int32_t kTooLarge = 76;

// pow(10, e) for the scale counts below kTooLarge, taken from pow itself once,
// so that the determinant has the bits pow gives without a call per inversion.
double powerOfTen(std::int32_t e) {
  struct Powers {
    double value[kTooLarge];
    Powers() {
      value[0] = 1.0;  // pow(10, 0) is exactly 1
      for (std::int32_t i = 1; i < kTooLarge; ++i) value[i] = std::pow(10.0, i);
    }
  };
  static const Powers powers;
  return powers.value[e];
}

// Sort key of a matrix entry in the pivot search: the bits of its magnitude,
// which order non-negative floats as the floats themselves, or -1 for a
// not-a-number (which never wins the ">=" comparison). notFree is 0 for a free
// column and -1 for a used one, which turns its key into -1.
inline std::int32_t pivotKey(float value, std::int32_t notFree) {
  std::int32_t magnitude = std::bit_cast<std::int32_t>(value) & 0x7fffffff;
  magnitude = magnitude > 0x7f800000 ? -1 : magnitude;
  return magnitude | notFree;
}

// Takes the pivot p of step s (from 0) into the determinant, scaled down by
// ten while its magnitude is above 1 (scale counts the scalings), and tests
// the pivot: false, with the reason in ws.errorText, when it is too small
// (the matrix singular).
[[gnu::always_inline]] inline bool takePivot(OaWorkspace& ws, float p, std::int32_t s,
                                             float& det, std::int32_t& scale) {
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
    return false;
  }
  return true;
}

// The determinant's last steps once the interchanges are undone (det already
// negated for each): 0 with det unscaled, or -1 when it was scaled too often
// (det then holds the count).
[[gnu::always_inline]] inline std::int32_t finishDeterminant(OaWorkspace& ws, float& det,
                                                             std::int32_t scale) {
  if (scale >= kTooLarge) {
    ws.errorText = "Determinant too large in INVMTX";
    det = static_cast<float>(scale);
    return -1;
  }
  det = static_cast<float>(static_cast<double>(det) * powerOfTen(scale));
  if (static_cast<double>(det) < 1e-4) ws.errorText = "Determinant very small in INVMTX";
  return 0;
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
    if (!takePivot(ws, p, s, det, scale)) return -1;

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

  return finishDeterminant(ws, det, scale);
}

using InvertFunction = std::int32_t (*)(OaWorkspace&, float*, std::int32_t, float&);

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

#ifdef KARNET_INVMTX_CLONES
// Blocks of up to kPaddedMax rows are inverted in a copy whose rows are padded
// with zeros to whole 8-float vectors: every row operation is then W vector
// operations without a scalar tail, the pivot keys of a row come from the same
// vectors, and the undoing of the interchanges becomes one column permutation
// applied while the copy is written back. Lanes beyond the block only ever see
// zeros (or what a zero becomes when divided by the pivot or reduced by a
// multiple of the pivot row); they never take part in a pivot search and are
// not written back, so the block's bits are those of the row loops above.
constexpr std::int32_t kPaddedMax = 64;

// The padded rows of the block followed, right after its last row, by the
// kept pivot keys of each row (long rows) in the same shape: together, so
// that a key and the rows stored before it are never a multiple of 4 KiB
// apart (which would make the processor hold the load back until those
// stores are done).
struct alignas(32) PaddedBlock {
  float values[2 * kPaddedMax * kPaddedMax];
};

// The pivot keys (pivotKey) of the W vectors of a padded row; notFree holds -1
// in the lanes of used columns and of lanes beyond the block.
template <int W>
[[gnu::target("avx2"), gnu::always_inline]] inline void rowKeys(const float* row,
                                                                 const __m256i* notFree,
                                                                 __m256i* keys) {
  const __m256i magnitudeBits = _mm256_set1_epi32(0x7fffffff);
  const __m256i infinity = _mm256_set1_epi32(0x7f800000);
  for (int w = 0; w < W; ++w) {
    const __m256i bits = _mm256_castps_si256(_mm256_load_ps(row + 8 * w));
    const __m256i magnitude = _mm256_and_si256(bits, magnitudeBits);
    const __m256i notNumber = _mm256_cmpgt_epi32(magnitude, infinity);
    keys[w] = _mm256_or_si256(_mm256_or_si256(magnitude, notNumber), notFree[w]);
  }
}

// Raises the lane-wise greatest keys to those of padded row r (notRow is -1
// in every lane for a row that is no longer free, else 0), and notes where
// they are: in short rows by making r the holder of each lane where its key
// reaches the greatest (rows come in rising order, so each lane's holder is
// the last row with its greatest key); in long rows, where that would cost
// more than looking the row up afterwards, by keeping the row's keys.
template <int W>
[[gnu::target("avx2"), gnu::always_inline]] inline void takeKeys(
    const float* row, const __m256i* notFree, __m256i notRow, std::int32_t r,
    __m256i* greatest, __m256i* holder, __m256i* kept) {
  __m256i keys[W];
  rowKeys<W>(row, notFree, keys);
  const __m256i index = _mm256_set1_epi32(r);
  for (int w = 0; w < W; ++w) {
    const __m256i key = _mm256_or_si256(keys[w], notRow);
    if constexpr (W <= 2) {
      const __m256i below = _mm256_cmpgt_epi32(greatest[w], key);
      holder[w] = _mm256_blendv_epi8(index, holder[w], below);
    } else {
      kept[w] = key;
    }
    greatest[w] = _mm256_max_epi32(greatest[w], key);
  }
}

// Eliminates column pc from padded row r (its entry there set to 0 first)
// with the scaled pivot row, and takes the row's keys for the next step.
// rowUsed is -1 for a row that is no longer free, else 0.
template <int W>
[[gnu::target("avx2"), gnu::always_inline]] inline void eliminateRow(
    float* row, std::int32_t r, std::int32_t pc, const __m256* atPivot,
    const __m256* pivotValues, const __m256i* notFree, std::int32_t rowUsed, __m256i* greatest,
    __m256i* holder, __m256i* kept) {
  const __m256 zero = _mm256_setzero_ps();
  const __m256 f = _mm256_set1_ps(row[pc]);
  for (int w = 0; w < W; ++w) {
    const __m256 v = _mm256_blendv_ps(_mm256_load_ps(row + 8 * w), zero, atPivot[w]);
    _mm256_store_ps(row + 8 * w, _mm256_sub_ps(v, _mm256_mul_ps(f, pivotValues[w])));
  }
  // Short rows take the keys of a used row too (masked out), which costs less
  // than a branch the processor cannot foresee; long rows skip them (their
  // kept keys were cleared when they were used).
  if (W > 2 && rowUsed != 0) return;
  takeKeys<W>(row, notFree, _mm256_set1_epi32(rowUsed), r, greatest, holder, kept);
}

// The greatest of the keys of a padded row.
template <int W>
[[gnu::target("avx2"), gnu::always_inline]] inline std::int32_t greatestKey(const __m256i* keys) {
  __m256i m = keys[0];
  for (int w = 1; w < W; ++w) m = _mm256_max_epi32(m, keys[w]);
  __m128i h = _mm_max_epi32(_mm256_castsi256_si128(m), _mm256_extracti128_si256(m, 1));
  h = _mm_max_epi32(h, _mm_shuffle_epi32(h, 0x4e));
  h = _mm_max_epi32(h, _mm_shuffle_epi32(h, 0xb1));
  return _mm_cvtsi128_si32(h);
}

// Lanes of the padded row vector w that lie inside an n-column block.
template <int W>
[[gnu::target("avx2"), gnu::always_inline]] inline void blockLanes(std::int32_t n,
                                                                   const __m256i* lane,
                                                                   __m256i* inside) {
  const __m256i last = _mm256_set1_epi32(n - 1);
  for (int w = 0; w < W; ++w) inside[w] = _mm256_xor_si256(_mm256_cmpgt_epi32(lane[w], last),
                                                           _mm256_set1_epi32(-1));
}

template <int W>
[[gnu::target("avx2")]] std::int32_t invertPadded(OaWorkspace& ws, float* a, std::int32_t n,
                                                  float& det) {
  constexpr std::int64_t kStride = 8 * W;
  const std::int64_t stride = ws.limit;
  PaddedBlock block;
  float* b = block.values;
  auto rowOf = [b](std::int32_t r) { return b + r * kStride; };

  __m256i lane[W];
  __m256i inside[W];
  __m256i notFree[W];
  for (int w = 0; w < W; ++w) {
    lane[w] = _mm256_add_epi32(_mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7), _mm256_set1_epi32(8 * w));
  }
  blockLanes<W>(n, lane, inside);
  for (int w = 0; w < W; ++w) notFree[w] = _mm256_xor_si256(inside[w], _mm256_set1_epi32(-1));
  // Masked loads read only the block's columns and give zeros beyond.
  for (std::int32_t r = 0; r < n; ++r) {
    for (int w = 0; w < W; ++w) {
      _mm256_store_ps(rowOf(r) + 8 * w, _mm256_maskload_ps(a + r * stride + 8 * w, inside[w]));
    }
  }

  std::int32_t* __restrict used = ws.pivot;
  std::int32_t* __restrict order = ws.pivot + n;
  for (std::int32_t i = 0; i < 2 * n; ++i) ws.pivot[i] = -1;
  det = 1.0f;
  std::int32_t scale = 0;

  // greatest[w]: lane by lane, the greatest pivot key of the free rows (keys
  // of used columns and of lanes beyond the block are -1); holder[w]: the last
  // row holding it (short rows), or each row's keys kept after the rows
  // (long rows).
  __m256i greatest[W];
  __m256i holder[W];
  const __m256i none = _mm256_set1_epi32(-1);
  for (int w = 0; w < W; ++w) greatest[w] = holder[w] = none;
  auto* kept = reinterpret_cast<__m256i*>(b + n * kStride);
  const auto* keptAt = reinterpret_cast<const std::int32_t*>(b + n * kStride);
  for (std::int32_t r = 0; r < n; ++r) {
    takeKeys<W>(rowOf(r), notFree, _mm256_setzero_si256(), r, greatest, holder, kept + r * W);
  }

  for (std::int32_t s = 0; s < n; ++s) {
    // Pivot search: the greatest key of all free rows; of the entries holding
    // it the greatest column, and in that column the greatest row, as the
    // column-major scan with ">=" takes them. With no key left (every free
    // entry not a number), the first free column and row.
    const std::int32_t best = greatestKey<W>(greatest);
    std::int32_t pr = 0;
    std::int32_t pc = 0;
    if (best >= 0) {
      const __m256i wanted = _mm256_set1_epi32(best);
      std::uint64_t columns = 0;
      for (int w = 0; w < W; ++w) {
        const __m256i holds = _mm256_cmpeq_epi32(greatest[w], wanted);
        columns |= static_cast<std::uint64_t>(
                       static_cast<unsigned>(_mm256_movemask_ps(_mm256_castsi256_ps(holds))))
                   << (8 * w);
      }
      pc = 63 - __builtin_clzll(columns);
      if constexpr (W <= 2) {
        alignas(32) std::int32_t holders[8];
        _mm256_store_si256(reinterpret_cast<__m256i*>(holders), holder[pc / 8]);
        pr = holders[pc % 8];
      } else {
        for (std::int32_t r = 0; r < n; ++r) pr = keptAt[r * kStride + pc] == best ? r : pr;
      }
    } else {
      while (used[pc] >= 0) ++pc;  // the first free index
      pr = pc;
    }
    for (int w = 0; w < W; ++w) greatest[w] = holder[w] = none;
    if constexpr (W > 2) {
      for (int w = 0; w < W; ++w) kept[pc * W + w] = none;
    }
    used[pc] = pr;
    order[s] = pc;
    const float p = rowOf(pr)[pc];
    if (!takePivot(ws, p, s, det, scale)) {
      for (std::int32_t r = 0; r < n; ++r) {
        for (int w = 0; w < W; ++w) {
          _mm256_maskstore_ps(a + r * stride + 8 * w, inside[w], _mm256_load_ps(rowOf(r) + 8 * w));
        }
      }
      return -1;
    }

    const __m256i column = _mm256_set1_epi32(pc);
    __m256 atPivot[W];
    for (int w = 0; w < W; ++w) {
      const __m256i here = _mm256_cmpeq_epi32(lane[w], column);
      atPivot[w] = _mm256_castsi256_ps(here);
      notFree[w] = _mm256_or_si256(notFree[w], here);
    }

    // Exchange rows pr and pc; the row that lands in pc is divided by p, its
    // pivot entry first set to 1.
    const __m256 pv = _mm256_set1_ps(p);
    const __m256 one = _mm256_set1_ps(1.0f);
    float* rowA = rowOf(pr);
    float* rowB = rowOf(pc);
    __m256 pivotValues[W];
    for (int w = 0; w < W; ++w) {
      const __m256 t = _mm256_blendv_ps(_mm256_load_ps(rowA + 8 * w), one, atPivot[w]);
      _mm256_store_ps(rowA + 8 * w, _mm256_load_ps(rowB + 8 * w));
      pivotValues[w] = _mm256_div_ps(t, pv);
      _mm256_store_ps(rowB + 8 * w, pivotValues[w]);
    }

    // Elimination of column pc from every other row; the rows still free
    // take their pivot keys for the next step.
    for (std::int32_t r = 0; r < pc; ++r) {
      eliminateRow<W>(rowOf(r), r, pc, atPivot, pivotValues, notFree, ~(used[r] >> 31),
                      greatest, holder, kept + r * W);
    }
    for (std::int32_t r = pc + 1; r < n; ++r) {
      eliminateRow<W>(rowOf(r), r, pc, atPivot, pivotValues, notFree, ~(used[r] >> 31),
                      greatest, holder, kept + r * W);
    }
  }

  // The interchanges, undone last step first as column exchanges, amount to
  // one permutation of the columns: column q of the result is column from[q]
  // of the eliminated block.
  alignas(32) std::int32_t from[kPaddedMax];
  for (std::int32_t q = 0; q < kPaddedMax; ++q) from[q] = q;
  for (std::int32_t s = n - 1; s >= 0; --s) {
    const std::int32_t c = order[s];
    const std::int32_t r = used[c];
    if (r == c) continue;
    det = static_cast<float>(static_cast<double>(det) * -1.0);
    std::swap(from[r], from[c]);
  }
  if constexpr (W == 1) {
    const __m256i permutation = _mm256_load_si256(reinterpret_cast<const __m256i*>(from));
    for (std::int32_t r = 0; r < n; ++r) {
      _mm256_maskstore_ps(a + r * stride, inside[0],
                          _mm256_permutevar8x32_ps(_mm256_load_ps(rowOf(r)), permutation));
    }
  } else {
    for (std::int32_t r = 0; r < n; ++r) {
      const float* row = rowOf(r);
      float* to = a + r * stride;
      for (std::int32_t q = 0; q < n; ++q) to[q] = row[from[q]];
    }
  }

  return finishDeterminant(ws, det, scale);
}

// The padded variant for blocks that it takes, the row-loop variant beyond.
[[gnu::target("avx2")]] std::int32_t invertAvx2Padded(OaWorkspace& ws, float* a, std::int32_t n,
                                                      float& det) {
  if (n < 1 || ws.limit < n || n > kPaddedMax) return invertAvx2(ws, a, n, det);
  // One body per row width in vectors (kPaddedMax / 8 of them).
  static constexpr InvertFunction kByWidth[] = {
      invertPadded<1>, invertPadded<2>, invertPadded<3>, invertPadded<4>,
      invertPadded<5>, invertPadded<6>, invertPadded<7>, invertPadded<8>};
  static_assert(std::size(kByWidth) * 8 == kPaddedMax);
  return kByWidth[(n + 7) / 8 - 1](ws, a, n, det);
}
#endif

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
    case InvmtxVariant::kAvx2Padded:
      return invertAvx2Padded;
#endif
    default:
      return nullptr;
  }
}

// The variant for blocks of up to kShortRows rows, and the one for larger
// blocks: padded rows up to their limit; beyond, 512-bit rows, which only pay
// once they are long (on short ones the partial vector at the end of each row
// costs more than the wider body saves).
constexpr std::int32_t kShortRows = 64;

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
  if (InvertFunction f = variantFunction(InvmtxVariant::kAvx2Padded)) chosen.shortRows = f;
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
    case InvmtxVariant::kAvx2Padded:
      return __builtin_cpu_supports("avx2");
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
    case InvmtxVariant::kAvx2Padded:
      return "avx2-padded";
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
