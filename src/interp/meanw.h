#ifndef KARNET_INTERP_MEANW_H_
#define KARNET_INTERP_MEANW_H_

#include <cstdint>

namespace karnet {

// Weighted mean of f[1..n] with weights w[1..n], accumulated in single
// precision in index order.
float meanw(const float* f, const float* w, std::int32_t n);

}  // namespace karnet

#endif  // KARNET_INTERP_MEANW_H_
