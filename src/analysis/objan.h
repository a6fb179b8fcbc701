#ifndef KARNET_ANALYSIS_OBJAN_H_
#define KARNET_ANALYSIS_OBJAN_H_

#include <cstdint>

#include "analysis/workspace.h"
#include "params/run_settings.h"

namespace karnet {

// The inverted matrix of the last estimate of one thread, known by the ordered
// list of data cells it was made from. Two nodes that choose the same cells in
// the same order have the very same matrix, and so the same inverse.
struct InverseCache {
  std::int32_t* chosen = nullptr;  // room for limit indices
  std::int32_t count = -1;         // cells of the kept inverse; -1: none kept
  std::int32_t result = 0;         // what the inversion gave (0 or -1)
  const char* errorText = "";      // and the reason it left
  // For a successful inverse, what the cells' values make of it (the same
  // cells have the same values): their weighted mean and the products of the
  // inverse's rows with the values less that mean.
  float mean = 0.0f;
  float* products = nullptr;  // room for limit values

  bool holds(const std::int32_t* cells, std::int32_t m) const;
  void keep(const std::int32_t* cells, std::int32_t m, std::int32_t inverted,
            const char* reason);
};

// Optimal-interpolation estimate from the m cells chosen by selectData
// (ws.selX, selY, selValue, selCorr): mu + rho' A^-1 (d - mu), where A is the
// cells' correlation matrix with the error term on its diagonal and mu the
// A^-1-weighted mean of the values d. Returns 0 and writes *estimate on
// success; returns -1 and leaves *estimate alone on failure, with ws.errorText
// naming the reason. ws.selValue is left with the mean removed.
// With a cache, the matrix is not built and inverted again when the chosen
// cells (ws.selIndex[0..m-1]) are those of the cache's inverse, which must
// then still be in ws.matrix, and the mean and row products are the kept
// ones; the estimate is the same bit for bit.
std::int32_t OBJAN(OaWorkspace& ws, std::int32_t m, float* estimate, const RunSettings& settings,
                   InverseCache* cache = nullptr);

// Fills the top-left m x m block of ws.matrix with the correlations among the
// chosen cells, adds ErrorVariance / 100 on the diagonal and inverts the block
// in place with INVMTX. Returns 0, or -1 when the inversion fails.
std::int32_t buildCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings);

// The filling step of buildCorrelationMatrix alone (m <= ws.limit). With
// vectorised, the processor's vector body where it has one; both give the
// same bits.
void fillCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings,
                           bool vectorised = true);

// With a the inverted matrix (row stride ws.limit): mean = (sum of a's
// row products with values) / (sum of all of a's n x n entries); subtracts the
// mean from values[0..n-1] in place and hands back the mean and the entry sum.
// Uses ws.rowSums and ws.rowProducts.
void removeWeightedMean(const OaWorkspace& ws, const float* a, float* values, std::int32_t n,
                        float& mean, float& weightSum);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_OBJAN_H_
