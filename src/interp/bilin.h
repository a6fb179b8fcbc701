#ifndef KARNET_INTERP_BILIN_H_
#define KARNET_INTERP_BILIN_H_

#include <cstdint>

namespace karnet {

// Bilinear estimate at node (j, k) from four hits (entries 1..4 of jHit, kHit, f),
// one per quadrant in the order Q1, Q2, Q3, Q4 as search() returns them.
// Single precision throughout; the two directional estimates are averaged.
float bilin(const std::int32_t* jHit, const std::int32_t* kHit, const float* f,
            std::int32_t j, std::int32_t k);

}  // namespace karnet

#endif  // KARNET_INTERP_BILIN_H_
