// The error variance of one optimal-interpolation estimate, from the inverse
// that the estimate itself used.
#include "analysis/error_variance.h"

#include <algorithm>

#include "analysis/row_sums.h"

namespace karnet {

namespace {

constexpr std::int32_t kRows = 8;  // rows summed side by side

// The inverse's rows eight at a time: sums(i0, rows, products, sums) forms
// the products with the node's correlations and/or the entry sums of rows
// i0 .. i0 + rows - 1, in either layout.
template <typename RowSums>
double entrySumOf(std::int32_t m, RowSums sums) {
  double total = 0.0;
  for (std::int32_t i0 = 0; i0 < m; i0 += kRows) {
    const std::int32_t rows = std::min(kRows, m - i0);
    double rowSum[kRows];
    sums(i0, rows, nullptr, rowSum);
    for (std::int32_t k = 0; k < rows; ++k) total += rowSum[k];
  }
  return total;
}

template <typename RowSums>
float errorVarianceOf(const OaWorkspace& ws, std::int32_t m, double entrySum, RowSums sums) {
  double rInvR = 0.0;    // r' A^-1 r
  double oneInvR = 0.0;  // 1' A^-1 r
  // Per row i: (A^-1 r)_i, eight rows at a time.
  for (std::int32_t i0 = 0; i0 < m; i0 += kRows) {
    const std::int32_t rows = std::min(kRows, m - i0);
    double invR[kRows];
    sums(i0, rows, invR, nullptr);
    for (std::int32_t k = 0; k < rows; ++k) {
      rInvR += static_cast<double>(ws.selCorr[i0 + k]) * invR[k];
      oneInvR += invR[k];
    }
  }
  const double meanTerm = 1.0 - oneInvR;
  double e = 1.0 - rInvR + meanTerm * meanTerm / entrySum;
  // A not-a-number (from a degenerate matrix) stays one: clipping must not
  // pass it off as a trustworthy value.
  if (e < 0.0) e = 0.0;
  if (e > 1.0) e = 1.0;
  return static_cast<float>(e);
}

}  // namespace

double inverseEntrySum(const float* inverse, std::int64_t stride, std::int32_t m) {
  return entrySumOf(m, [=](std::int32_t i0, std::int32_t rows, double* products, double* sums) {
    doubleRowSums(inverse + i0 * stride, stride, nullptr, rows, m, products, sums);
  });
}

float estimateErrorVariance(const OaWorkspace& ws, std::int32_t m) {
  return estimateErrorVariance(ws, m, ws.matrix, ws.limit,
                               inverseEntrySum(ws.matrix, ws.limit, m));
}

float estimateErrorVariance(const OaWorkspace& ws, std::int32_t m, const float* inverse,
                            std::int64_t stride, double entrySum) {
  return errorVarianceOf(
      ws, m, entrySum, [&](std::int32_t i0, std::int32_t rows, double* products, double* sums) {
        doubleRowSums(inverse + i0 * stride, stride, ws.selCorr, rows, m, products, sums);
      });
}

float estimateErrorVariance(const OaWorkspace& ws, const InverseCache& cache, std::int32_t m) {
  KeptInverse* entry = cache.usedEntry;
  if (entry == nullptr || entry->inverse == nullptr) return estimateErrorVariance(ws, m);
  // A kept inverse is stored column by column.
  const float* byColumn = entry->inverse;
  auto sums = [&](std::int32_t i0, std::int32_t rows, double* products, double* rowSums) {
    doubleColumnSums(byColumn + i0, m, ws.selCorr, rows, m, products, rowSums);
  };
  if (!entry->hasEntrySum) {
    entry->entrySum = entrySumOf(m, sums);
    entry->hasEntrySum = true;
  }
  return errorVarianceOf(ws, m, entry->entrySum, sums);
}

}  // namespace karnet
