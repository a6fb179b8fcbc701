#ifndef KARNET_ANALYSIS_CORRELATION_H_
#define KARNET_ANALYSIS_CORRELATION_H_

#include "analysis/workspace.h"

namespace karnet {

// Correlation of two points whose squared distance in node units is d2:
// exp(-(d2 / decay2)) * (1 - d2 / zeroCross2), and 0 beyond d2 = 40 * decay2.
// The quotients are single precision; the exponential, the subtraction and the
// product are double precision, the result is rounded to float.
float correlation(float d2, const OaWorkspace& ws);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_CORRELATION_H_
