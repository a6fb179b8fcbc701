// The correlation model of the optimal interpolation.
#include "analysis/correlation.h"

#include <cmath>

namespace karnet {

float correlation(float d2, const OaWorkspace& ws) {
  if (static_cast<double>(d2) > 40.0 * static_cast<double>(ws.decay2)) return 0.0f;
  const float decayRatio = d2 / ws.decay2;
  const float crossRatio = d2 / ws.zeroCross2;
  const double value =
      std::exp(-static_cast<double>(decayRatio)) * (1.0 - static_cast<double>(crossRatio));
  return static_cast<float>(value);
}

}  // namespace karnet
