// The error variance of one optimal-interpolation estimate, from the inverse
// that the estimate itself used.
#include "analysis/error_variance.h"

namespace karnet {

float estimateErrorVariance(const OaWorkspace& ws, std::int32_t m) {
  const std::int64_t stride = ws.limit;
  double rInvR = 0.0;    // r' A^-1 r
  double oneInvR = 0.0;  // 1' A^-1 r
  double oneInvOne = 0.0;  // 1' A^-1 1
  for (std::int32_t i = 0; i < m; ++i) {
    const float* row = ws.matrix + i * stride;
    double invR = 0.0;  // (A^-1 r)_i
    double rowSum = 0.0;
    for (std::int32_t j = 0; j < m; ++j) {
      invR += static_cast<double>(row[j]) * static_cast<double>(ws.selCorr[j]);
      rowSum += static_cast<double>(row[j]);
    }
    rInvR += static_cast<double>(ws.selCorr[i]) * invR;
    oneInvR += invR;
    oneInvOne += rowSum;
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
