// The optimal-interpolation estimator of one node.
#include "analysis/objan.h"

#include <algorithm>

#if defined(__x86_64__) && defined(__GNUC__)
#include <immintrin.h>
#endif

#include "analysis/correlation.h"
#include "analysis/invmtx.h"
#include "analysis/row_sums.h"

namespace karnet {

namespace {

void fillScalar(OaWorkspace& ws, std::int32_t m, double errorTerm) {
  const std::int64_t stride = ws.limit;
  float* a = ws.matrix;
  for (std::int32_t i = 0; i < m; ++i) {
    for (std::int32_t j = i; j < m; ++j) {
      const float dy = ws.selY[i] - ws.selY[j];
      const float dx = ws.selX[i] - ws.selX[j];
      const float d2 = dy * dy + dx * dx;
      const float rho = tabledCorrelation(d2, ws);
      a[j * stride + i] = rho;
      a[i * stride + j] = rho;
    }
    float& diagonal = a[i * stride + i];
    diagonal = static_cast<float>(errorTerm + static_cast<double>(diagonal));
  }
}

#if defined(__x86_64__) && defined(__GNUC__)
#define KARNET_FILL_AVX2 1
// Whole rows, eight entries at a time. Entry (i, j) and entry (j, i) have the
// same squared distance (the differences only change sign), so each row is
// computed in full instead of being mirrored. Correlations come from the table
// by a gather when every lane's squared distance is one of its entries, else
// lane by lane as tabledCorrelation takes them.
[[gnu::target("avx2")]] void fillAvx2(OaWorkspace& ws, std::int32_t m, double errorTerm) {
  const std::int64_t stride = ws.limit;
  float* a = ws.matrix;
  const __m256 tableEnd = _mm256_set1_ps(static_cast<float>(ws.corrTableSize));
  const __m256 zero = _mm256_setzero_ps();
  const __m256i lanes = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7);
  for (std::int32_t i = 0; i < m; ++i) {
    const __m256 yi = _mm256_set1_ps(ws.selY[i]);
    const __m256 xi = _mm256_set1_ps(ws.selX[i]);
    float* row = a + i * stride;
    for (std::int32_t j = 0; j < m; j += 8) {
      const __m256i inside = _mm256_cmpgt_epi32(_mm256_set1_epi32(m - j), lanes);
      const __m256 dy = _mm256_sub_ps(yi, _mm256_maskload_ps(ws.selY + j, inside));
      const __m256 dx = _mm256_sub_ps(xi, _mm256_maskload_ps(ws.selX + j, inside));
      const __m256 d2 = _mm256_add_ps(_mm256_mul_ps(dy, dy), _mm256_mul_ps(dx, dx));
      const __m256i index = _mm256_cvttps_epi32(d2);
      const __m256 tabled =
          _mm256_and_ps(_mm256_and_ps(_mm256_cmp_ps(d2, zero, _CMP_GE_OQ),
                                      _mm256_cmp_ps(d2, tableEnd, _CMP_LT_OQ)),
                        _mm256_cmp_ps(_mm256_cvtepi32_ps(index), d2, _CMP_EQ_OQ));
      const int wanted = _mm256_movemask_ps(_mm256_castsi256_ps(inside));
      if ((_mm256_movemask_ps(tabled) & wanted) == wanted) {
        const __m256 rho = _mm256_mask_i32gather_ps(zero, ws.corrTable, index,
                                                     _mm256_castsi256_ps(inside), 4);
        // A full store where the row has room for it: the lanes beyond the
        // block hold zeros in columns that nothing reads, and the diagonal
        // entry read back below comes straight from the store.
        if (j + 8 <= stride) {
          _mm256_storeu_ps(row + j, rho);
        } else {
          _mm256_maskstore_ps(row + j, inside, rho);
        }
      } else {
        alignas(32) float d[8];
        _mm256_store_ps(d, d2);
        for (std::int32_t q = 0; q < 8 && j + q < m; ++q) row[j + q] = tabledCorrelation(d[q], ws);
      }
    }
    row[i] = static_cast<float>(errorTerm + static_cast<double>(row[i]));
  }
}
#endif

}  // namespace

void fillCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings,
                           bool vectorised) {
  const double errorTerm = static_cast<double>(settings.ErrorVariance) * 0.01;
#ifdef KARNET_FILL_AVX2
  static const bool hasAvx2 = __builtin_cpu_supports("avx2");
  if (vectorised && hasAvx2) {
    fillAvx2(ws, m, errorTerm);
    return;
  }
#else
  (void)vectorised;
#endif
  fillScalar(ws, m, errorTerm);
}

std::int32_t buildCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings) {
  float det = 0.0f;
  // A block that the matrix cannot hold is not filled; the inversion refuses it.
  if (m <= ws.limit) fillCorrelationMatrix(ws, m, settings);
  return INVMTX(ws, ws.matrix, m, det) != 0 ? -1 : 0;
}

void removeWeightedMean(const OaWorkspace& ws, const float* a, float* values, std::int32_t n,
                        float& mean, float& weightSum) {
  // The row sums and row products are added to the totals in row order, as a
  // sum over stored row results would be.
  float* rowSum = ws.rowSums;
  float* rowDot = ws.rowProducts;
  floatRowSums(a, ws.limit, values, n, n, rowSum, rowDot);
  float total = 0.0f;
  float weighted = 0.0f;
  for (std::int32_t i = 0; i < n; ++i) {
    total = total + rowSum[i];
    weighted = weighted + rowDot[i];
  }
  mean = weighted / total;
  weightSum = total;
  for (std::int32_t i = 0; i < n; ++i) values[i] = values[i] - mean;
}

bool InverseCache::holds(const std::int32_t* cells, std::int32_t m) const {
  return count == m && std::equal(cells, cells + m, chosen);
}

void InverseCache::keep(const std::int32_t* cells, std::int32_t m, std::int32_t inverted,
                        const char* reason) {
  std::copy(cells, cells + m, chosen);
  count = m;
  result = inverted;
  errorText = reason;
}

std::int32_t OBJAN(OaWorkspace& ws, std::int32_t m, float* estimate, const RunSettings& settings,
                   InverseCache* cache) {
  if (m < 1) {
    ws.errorText = "No observational data in OBJAN";
    return -1;
  }
  float mean = 0.0f;
  const float* products = ws.rowProducts;  // row i of the inverse times the values less the mean
  if (cache != nullptr && cache->holds(ws.selIndex, m)) {
    // The same cells have the same values: the mean and the row products of
    // the kept inverse stand as they were.
    ws.errorText = cache->errorText;
    if (cache->result != 0) return -1;
    mean = cache->mean;
    for (std::int32_t i = 0; i < m; ++i) ws.selValue[i] = ws.selValue[i] - mean;
    products = cache->products;
  } else {
    const std::int32_t inverted = buildCorrelationMatrix(ws, m, settings);
    if (cache != nullptr) cache->keep(ws.selIndex, m, inverted, ws.errorText);
    if (inverted != 0) return -1;
    float weightSum = 0.0f;
    removeWeightedMean(ws, ws.matrix, ws.selValue, m, mean, weightSum);
    floatRowSums(ws.matrix, ws.limit, ws.selValue, m, m, nullptr, ws.rowProducts);
    if (cache != nullptr) {
      cache->mean = mean;
      std::copy(ws.rowProducts, ws.rowProducts + m, cache->products);
    }
  }

  float sum = 0.0f;
  for (std::int32_t i = 0; i < m; ++i) sum = ws.selCorr[i] * products[i] + sum;
  *estimate = mean + sum;
  return 0;
}

}  // namespace karnet
