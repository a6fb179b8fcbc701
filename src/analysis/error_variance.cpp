// The error variance of one optimal-interpolation estimate, from the inverse
// that the estimate itself used.
#include "analysis/error_variance.h"

#include <algorithm>

#include "analysis/row_sums.h"

namespace karnet {

float estimateErrorVariance(const OaWorkspace& ws, std::int32_t m) {
  double rInvR = 0.0;      // r' A^-1 r
  double oneInvR = 0.0;    // 1' A^-1 r
  double oneInvOne = 0.0;  // 1' A^-1 1
  // Per row i: (A^-1 r)_i and the row's sum, eight rows at a time.
  constexpr std::int32_t kRows = 8;
  for (std::int32_t i0 = 0; i0 < m; i0 += kRows) {
    const std::int32_t rows = std::min(kRows, m - i0);
    double invR[kRows];
    double rowSum[kRows];
    doubleRowSums(ws.matrix + i0 * std::int64_t{ws.limit}, ws.limit, ws.selCorr, rows, m, invR,
                  rowSum);
    for (std::int32_t k = 0; k < rows; ++k) {
      rInvR += static_cast<double>(ws.selCorr[i0 + k]) * invR[k];
      oneInvR += invR[k];
      oneInvOne += rowSum[k];
    }
  }
  const double meanTerm = 1.0 - oneInvR;
  double e = 1.0 - rInvR + meanTerm * meanTerm / oneInvOne;
  // A not-a-number (from a degenerate matrix) stays one: clipping must not
  // pass it off as a trustworthy value.
  if (e < 0.0) e = 0.0;
  if (e > 1.0) e = 1.0;
  return static_cast<float>(e);
}

}  // namespace karnet
