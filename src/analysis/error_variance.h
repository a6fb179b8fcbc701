#ifndef KARNET_ANALYSIS_ERROR_VARIANCE_H_
#define KARNET_ANALYSIS_ERROR_VARIANCE_H_

#include <cstdint>

#include "analysis/objan.h"
#include "analysis/workspace.h"

namespace karnet {

// Relative error variance of the estimate that OBJAN has just made from the m
// chosen cells, in the ordinary-kriging form
//   e = 1 - r' A^-1 r + (1 - 1' A^-1 r)^2 / (1' A^-1 1),
// with r the node's correlations with the cells (ws.selCorr) and A^-1 the
// inverted matrix that OBJAN left in ws.matrix (correlations among the cells,
// the error variance on the diagonal). Sums and products are formed in double
// from the float entries; the result is clipped to [0, 1]: 0 where the node is
// known exactly, 1 where the data tell nothing beyond the signal variance.
// Reads the workspace only; call it only after OBJAN returned 0 for the node.
float estimateErrorVariance(const OaWorkspace& ws, std::int32_t m);

// 1' A^-1 1: the sum of the m x m inverse's entries (rows stride apart), each
// row summed in double over its columns in turn, the rows' sums added in row
// order. It depends on the inverse alone, so nodes sharing one can share it.
double inverseEntrySum(const float* inverse, std::int64_t stride, std::int32_t m);

// The same error variance with the inverse elsewhere (m rows stride apart)
// and its entry sum from inverseEntrySum.
float estimateErrorVariance(const OaWorkspace& ws, std::int32_t m, const float* inverse,
                            std::int64_t stride, double entrySum);

// The error variance of the estimate that OBJAN has just made with the cache:
// from the inverse it used, whose entry sum is made once per kept inverse.
float estimateErrorVariance(const OaWorkspace& ws, const InverseCache& cache, std::int32_t m);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_ERROR_VARIANCE_H_
