// Row sums of the inverted correlation matrix, for the estimate and its error
// variance.
#include "analysis/row_sums.h"

#if defined(__x86_64__) && defined(__GNUC__)
#include <immintrin.h>
#endif

namespace karnet {
namespace {

// Where entry (i, j) lies: in rows of `stride` entries, or (ByColumn) in
// columns of `stride` entries.
template <bool ByColumn>
inline std::int64_t entryAt(std::int64_t stride, std::int64_t i, std::int64_t j) {
  return ByColumn ? j * stride + i : i * stride + j;
}

// Rows i .. i + R - 1: each row's sums over its columns in turn, the rows of
// the block worked on side by side so that their chains of additions overlap
// instead of waiting on one another.
template <int R, bool ByColumn, bool WithProducts, bool WithSums, typename Sum>
inline void rowBlock(const float* a, std::int64_t stride, const float* values, std::int32_t i,
                     std::int32_t columns, Sum* products, Sum* sums) {
  Sum product[R] = {};
  Sum sum[R] = {};
  for (std::int32_t j = 0; j < columns; ++j) {
    // values is not read (and may be null) without products.
    const Sum v = WithProducts ? static_cast<Sum>(values[j]) : Sum{};
    for (int r = 0; r < R; ++r) {
      const auto x = static_cast<Sum>(a[entryAt<ByColumn>(stride, i + r, j)]);
      if constexpr (WithProducts) product[r] = product[r] + x * v;
      if constexpr (WithSums) sum[r] = sum[r] + x;
    }
  }
  for (int r = 0; r < R; ++r) {
    if constexpr (WithProducts) products[i + r] = product[r];
    if constexpr (WithSums) sums[i + r] = sum[r];
  }
}

constexpr int kBlock = 4;

template <bool ByColumn, bool WithProducts, bool WithSums, typename Sum>
void rowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
             std::int32_t columns, Sum* products, Sum* sums) {
  std::int32_t i = 0;
  for (; i + kBlock <= rows; i += kBlock) {
    rowBlock<kBlock, ByColumn, WithProducts, WithSums>(a, stride, values, i, columns, products,
                                                       sums);
  }
  for (; i < rows; ++i) {
    rowBlock<1, ByColumn, WithProducts, WithSums>(a, stride, values, i, columns, products, sums);
  }
}

#if defined(__x86_64__) && defined(__GNUC__)
#define KARNET_COLUMN_SUMS_AVX2 1
// Four rows per vector of doubles, eight at a time where there are eight:
// each lane adds its row's terms in column order, as the loops above do.
template <bool WithProducts, bool WithSums>
[[gnu::target("avx2")]] void columnSumsAvx2(const float* aT, std::int64_t stride,
                                            const float* values, std::int32_t rows,
                                            std::int32_t columns, double* products,
                                            double* sums) {
  std::int32_t i = 0;
  for (; i + 8 <= rows; i += 8) {
    __m256d p0 = _mm256_setzero_pd(), p1 = _mm256_setzero_pd();
    __m256d s0 = _mm256_setzero_pd(), s1 = _mm256_setzero_pd();
    for (std::int32_t j = 0; j < columns; ++j) {
      const __m256 x = _mm256_loadu_ps(aT + j * stride + i);
      const __m256d x0 = _mm256_cvtps_pd(_mm256_castps256_ps128(x));
      const __m256d x1 = _mm256_cvtps_pd(_mm256_extractf128_ps(x, 1));
      if constexpr (WithProducts) {
        const __m256d v = _mm256_set1_pd(static_cast<double>(values[j]));
        p0 = _mm256_add_pd(p0, _mm256_mul_pd(x0, v));
        p1 = _mm256_add_pd(p1, _mm256_mul_pd(x1, v));
      }
      if constexpr (WithSums) {
        s0 = _mm256_add_pd(s0, x0);
        s1 = _mm256_add_pd(s1, x1);
      }
    }
    if constexpr (WithProducts) {
      _mm256_storeu_pd(products + i, p0);
      _mm256_storeu_pd(products + i + 4, p1);
    }
    if constexpr (WithSums) {
      _mm256_storeu_pd(sums + i, s0);
      _mm256_storeu_pd(sums + i + 4, s1);
    }
  }
  for (; i + 4 <= rows; i += 4) {
    __m256d p = _mm256_setzero_pd(), s = _mm256_setzero_pd();
    for (std::int32_t j = 0; j < columns; ++j) {
      const __m256d x = _mm256_cvtps_pd(_mm_loadu_ps(aT + j * stride + i));
      if constexpr (WithProducts) {
        p = _mm256_add_pd(p, _mm256_mul_pd(x, _mm256_set1_pd(static_cast<double>(values[j]))));
      }
      if constexpr (WithSums) s = _mm256_add_pd(s, x);
    }
    if constexpr (WithProducts) _mm256_storeu_pd(products + i, p);
    if constexpr (WithSums) _mm256_storeu_pd(sums + i, s);
  }
  for (; i < rows; ++i) {
    rowBlock<1, true, WithProducts, WithSums>(aT, stride, values, i, columns, products, sums);
  }
}
#endif

template <bool WithProducts, bool WithSums>
void chooseColumnSums(const float* aT, std::int64_t stride, const float* values,
                      std::int32_t rows, std::int32_t columns, double* products, double* sums,
                      bool vectorised) {
#ifdef KARNET_COLUMN_SUMS_AVX2
  static const bool hasAvx2 = __builtin_cpu_supports("avx2");
  if (vectorised && hasAvx2) {
    columnSumsAvx2<WithProducts, WithSums>(aT, stride, values, rows, columns, products, sums);
    return;
  }
#else
  (void)vectorised;
#endif
  rowSums<true, WithProducts, WithSums>(aT, stride, values, rows, columns, products, sums);
}

}  // namespace

void floatRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                  std::int32_t columns, float* sums, float* products) {
  if (sums == nullptr) {
    rowSums<false, true, false>(a, stride, values, rows, columns, products, sums);
  } else {
    rowSums<false, true, true>(a, stride, values, rows, columns, products, sums);
  }
}

void doubleRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                   std::int32_t columns, double* products, double* sums) {
  if (sums == nullptr) {
    rowSums<false, true, false>(a, stride, values, rows, columns, products, sums);
  } else if (products == nullptr) {
    rowSums<false, false, true>(a, stride, values, rows, columns, products, sums);
  } else {
    rowSums<false, true, true>(a, stride, values, rows, columns, products, sums);
  }
}

void doubleColumnSums(const float* aT, std::int64_t stride, const float* values,
                      std::int32_t rows, std::int32_t columns, double* products, double* sums,
                      bool vectorised) {
  if (sums == nullptr) {
    chooseColumnSums<true, false>(aT, stride, values, rows, columns, products, sums, vectorised);
  } else if (products == nullptr) {
    chooseColumnSums<false, true>(aT, stride, values, rows, columns, products, sums, vectorised);
  } else {
    chooseColumnSums<true, true>(aT, stride, values, rows, columns, products, sums, vectorised);
  }
}

}  // namespace karnet
