#ifndef KARNET_ANALYSIS_CORRELATION_H_
#define KARNET_ANALYSIS_CORRELATION_H_

#include <cstdint>

#include "analysis/workspace.h"

namespace karnet {

// Correlation of two points whose squared distance in node units is d2:
// exp(-(d2 / decay2)) * (1 - d2 / zeroCross2), and 0 beyond d2 = 40 * decay2.
// The quotients are single precision; the exponential, the subtraction and the
// product are double precision, the result is rounded to float.
float correlation(float d2, const OaWorkspace& ws);

// The same value, taken from the workspace's table when d2 is one of its
// integral entries.
inline float tabledCorrelation(float d2, const OaWorkspace& ws) {
  if (d2 >= 0.0f && d2 < static_cast<float>(ws.corrTableSize)) {
    const auto i = static_cast<std::int32_t>(d2);
    if (static_cast<float>(i) == d2) return ws.corrTable[i];
  }
  return correlation(d2, ws);
}

}  // namespace karnet

#endif  // KARNET_ANALYSIS_CORRELATION_H_
