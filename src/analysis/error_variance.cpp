// The error variance of one optimal-interpolation estimate, from the inverse
// that the estimate itself used.
#include "analysis/error_variance.h"

namespace karnet {

namespace {

// Adds rows i .. i + R - 1 of the inverse to the three sums, each row's own
// sums formed over j rising and added in row order; the rows of a block are
// worked on side by side, so that their chains of additions overlap.
template <int R>
inline void addRows(const OaWorkspace& ws, std::int32_t m, std::int32_t i, double& rInvR,
                    double& oneInvR, double& oneInvOne) {
  const std::int64_t stride = ws.limit;
  double invR[R] = {};    // (A^-1 r)_i
  double rowSum[R] = {};
  for (std::int32_t j = 0; j < m; ++j) {
    const auto r = static_cast<double>(ws.selCorr[j]);
    for (int q = 0; q < R; ++q) {
      const auto x = static_cast<double>(ws.matrix[(i + q) * stride + j]);
      invR[q] += x * r;
      rowSum[q] += x;
    }
  }
  for (int q = 0; q < R; ++q) {
    rInvR += static_cast<double>(ws.selCorr[i + q]) * invR[q];
    oneInvR += invR[q];
    oneInvOne += rowSum[q];
  }
}

}  // namespace

float estimateErrorVariance(const OaWorkspace& ws, std::int32_t m) {
  double rInvR = 0.0;      // r' A^-1 r
  double oneInvR = 0.0;    // 1' A^-1 r
  double oneInvOne = 0.0;  // 1' A^-1 1
  std::int32_t i = 0;
  for (; i + 4 <= m; i += 4) addRows<4>(ws, m, i, rInvR, oneInvR, oneInvOne);
  for (; i < m; ++i) addRows<1>(ws, m, i, rInvR, oneInvR, oneInvOne);
  const double meanTerm = 1.0 - oneInvR;
  double e = 1.0 - rInvR + meanTerm * meanTerm / oneInvOne;
  // A not-a-number (from a degenerate matrix) stays one: clipping must not
  // pass it off as a trustworthy value.
  if (e < 0.0) e = 0.0;
  if (e > 1.0) e = 1.0;
  return static_cast<float>(e);
}

}  // namespace karnet
