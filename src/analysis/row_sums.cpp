// Row sums of the inverted correlation matrix, for the estimate and its error
// variance.
#include "analysis/row_sums.h"

#if defined(__x86_64__) && defined(__GNUC__)
#include <immintrin.h>
#define KARNET_ROW_SUMS_AVX2 1
#endif

namespace karnet {
namespace {

void floatPlain(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                std::int32_t columns, float* sums, float* products) {
  for (std::int32_t i = 0; i < rows; ++i) {
    const float* row = a + i * stride;
    float sum = 0.0f;
    float product = 0.0f;
    for (std::int32_t j = 0; j < columns; ++j) {
      sum = sum + row[j];
      product = product + row[j] * values[j];
    }
    sums[i] = sum;
    products[i] = product;
  }
}

void doublePlain(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                 std::int32_t columns, double* products, double* sums) {
  for (std::int32_t i = 0; i < rows; ++i) {
    const float* row = a + i * stride;
    double product = 0.0;
    double sum = 0.0;
    for (std::int32_t j = 0; j < columns; ++j) {
      product += static_cast<double>(row[j]) * static_cast<double>(values[j]);
      sum += static_cast<double>(row[j]);
    }
    products[i] = product;
    sums[i] = sum;
  }
}

#ifdef KARNET_ROW_SUMS_AVX2
// Rows i0 .. i0+7 (those below rows): lane k holds row i0 + k, and column j of
// those rows is gathered at each step.
struct RowBlock {
  __m256i offsets;  // k * stride for the lanes of rows inside the block, else 0
  __m256 inside;    // lanes of rows that exist
};

[[gnu::target("avx2")]] inline RowBlock rowBlock(std::int64_t stride, std::int32_t rows,
                                                 std::int32_t i0) {
  const __m256i lane = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7);
  const __m256i in = _mm256_cmpgt_epi32(_mm256_set1_epi32(rows - i0), lane);
  RowBlock block;
  block.offsets = _mm256_and_si256(
      _mm256_mullo_epi32(lane, _mm256_set1_epi32(static_cast<std::int32_t>(stride))), in);
  block.inside = _mm256_castsi256_ps(in);
  return block;
}

[[gnu::target("avx2")]] void floatAvx2(const float* a, std::int64_t stride, const float* values,
                                       std::int32_t rows, std::int32_t columns, float* sums,
                                       float* products) {
  for (std::int32_t i0 = 0; i0 < rows; i0 += 8) {
    const RowBlock block = rowBlock(stride, rows, i0);
    const float* base = a + i0 * stride;
    __m256 sum = _mm256_setzero_ps();
    __m256 product = _mm256_setzero_ps();
    for (std::int32_t j = 0; j < columns; ++j) {
      const __m256 column =
          _mm256_mask_i32gather_ps(_mm256_setzero_ps(), base + j, block.offsets, block.inside, 4);
      sum = _mm256_add_ps(sum, column);
      product = _mm256_add_ps(product, _mm256_mul_ps(column, _mm256_set1_ps(values[j])));
    }
    const __m256i in = _mm256_castps_si256(block.inside);
    _mm256_maskstore_ps(sums + i0, in, sum);
    _mm256_maskstore_ps(products + i0, in, product);
  }
}

[[gnu::target("avx2")]] void doubleAvx2(const float* a, std::int64_t stride, const float* values,
                                        std::int32_t rows, std::int32_t columns, double* products,
                                        double* sums) {
  for (std::int32_t i0 = 0; i0 < rows; i0 += 8) {
    const RowBlock block = rowBlock(stride, rows, i0);
    const float* base = a + i0 * stride;
    __m256d productLow = _mm256_setzero_pd(), productHigh = _mm256_setzero_pd();
    __m256d sumLow = _mm256_setzero_pd(), sumHigh = _mm256_setzero_pd();
    for (std::int32_t j = 0; j < columns; ++j) {
      const __m256 column =
          _mm256_mask_i32gather_ps(_mm256_setzero_ps(), base + j, block.offsets, block.inside, 4);
      const __m256d low = _mm256_cvtps_pd(_mm256_castps256_ps128(column));
      const __m256d high = _mm256_cvtps_pd(_mm256_extractf128_ps(column, 1));
      const __m256d value = _mm256_set1_pd(static_cast<double>(values[j]));
      productLow = _mm256_add_pd(productLow, _mm256_mul_pd(low, value));
      productHigh = _mm256_add_pd(productHigh, _mm256_mul_pd(high, value));
      sumLow = _mm256_add_pd(sumLow, low);
      sumHigh = _mm256_add_pd(sumHigh, high);
    }
    alignas(32) double p[8], s[8];
    _mm256_store_pd(p, productLow);
    _mm256_store_pd(p + 4, productHigh);
    _mm256_store_pd(s, sumLow);
    _mm256_store_pd(s + 4, sumHigh);
    for (std::int32_t k = 0; k < 8 && i0 + k < rows; ++k) {
      products[i0 + k] = p[k];
      sums[i0 + k] = s[k];
    }
  }
}

bool hasAvx2() {
  static const bool has = __builtin_cpu_supports("avx2");
  return has;
}
#endif

}  // namespace

void floatRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                  std::int32_t columns, float* sums, float* products, bool vectorised) {
#ifdef KARNET_ROW_SUMS_AVX2
  // Gathered offsets are 32-bit: far larger strides take the plain body.
  if (vectorised && hasAvx2() && stride * 8 < (std::int64_t{1} << 31)) {
    floatAvx2(a, stride, values, rows, columns, sums, products);
    return;
  }
#else
  (void)vectorised;
#endif
  floatPlain(a, stride, values, rows, columns, sums, products);
}

void doubleRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                   std::int32_t columns, double* products, double* sums, bool vectorised) {
#ifdef KARNET_ROW_SUMS_AVX2
  if (vectorised && hasAvx2() && stride * 8 < (std::int64_t{1} << 31)) {
    doubleAvx2(a, stride, values, rows, columns, products, sums);
    return;
  }
#else
  (void)vectorised;
#endif
  doublePlain(a, stride, values, rows, columns, products, sums);
}

}  // namespace karnet
