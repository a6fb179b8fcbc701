// Weighted mean of the hits of a quadrant search.
#include "interp/meanw.h"

namespace karnet {

float meanw(const float* f, const float* w, std::int32_t n) {
  float numerator = 0.0f;
  float denominator = 0.0f;
  for (std::int32_t i = 1; i <= n; ++i) {
    numerator += w[i] * f[i];
    denominator += w[i];
  }
  return numerator / denominator;
}

}  // namespace karnet
