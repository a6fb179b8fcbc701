// The optimal-interpolation estimator of one node.
#include "analysis/objan.h"

#include <algorithm>

#include "analysis/correlation.h"
#include "analysis/invmtx.h"

namespace karnet {

std::int32_t buildCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings) {
  const std::int64_t stride = ws.limit;
  float* a = ws.matrix;
  const double errorTerm = static_cast<double>(settings.ErrorVariance) * 0.01;
  float det = 0.0f;
  // A block that the matrix cannot hold is not filled; the inversion refuses it.
  if (m > ws.limit) return INVMTX(ws, a, m, det) != 0 ? -1 : 0;
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
  return INVMTX(ws, a, m, det) != 0 ? -1 : 0;
}

void removeWeightedMean(const OaWorkspace& ws, const float* a, float* values, std::int32_t n,
                        float& mean, float& weightSum) {
  const std::int64_t stride = ws.limit;
  // Row by row, the row sum and row product are added to the totals in row
  // order, as a sum over stored row results would be.
  float total = 0.0f;
  float weighted = 0.0f;
  for (std::int32_t i = 0; i < n; ++i) {
    const float* row = a + i * stride;
    float rowSum = 0.0f;
    float rowDot = 0.0f;
    for (std::int32_t j = 0; j < n; ++j) {
      rowSum = rowSum + row[j];
      rowDot = rowDot + row[j] * values[j];
    }
    total = total + rowSum;
    weighted = weighted + rowDot;
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
  std::int32_t inverted = 0;
  if (cache != nullptr && cache->holds(ws.selIndex, m)) {
    inverted = cache->result;
    ws.errorText = cache->errorText;
  } else {
    inverted = buildCorrelationMatrix(ws, m, settings);
    if (cache != nullptr) cache->keep(ws.selIndex, m, inverted, ws.errorText);
  }
  if (inverted != 0) return -1;

  float mean = 0.0f;
  float weightSum = 0.0f;
  removeWeightedMean(ws, ws.matrix, ws.selValue, m, mean, weightSum);

  const std::int64_t stride = ws.limit;
  float sum = 0.0f;
  for (std::int32_t i = 0; i < m; ++i) {
    const float* row = ws.matrix + i * stride;
    float s = 0.0f;
    for (std::int32_t j = 0; j < m; ++j) s = s + row[j] * ws.selValue[j];
    sum = ws.selCorr[i] * s + sum;
  }
  *estimate = mean + sum;
  return 0;
}

}  // namespace karnet
