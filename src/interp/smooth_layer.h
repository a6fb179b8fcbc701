#ifndef KARNET_INTERP_SMOOTH_LAYER_H_
#define KARNET_INTERP_SMOOTH_LAYER_H_

#include <cstdint>

namespace karnet {

// One in-place pass of the twelve-point smoother over a layer of nj x nk floats
// (node (j, k) at k * nj + j). Columns are visited in order, so neighbours
// already visited contribute their new values. Empty nodes (the delete value)
// are never changed, and empty neighbours count as the centre's value.
void smoothLayer(float* data, std::int32_t nj, std::int32_t nk);

}  // namespace karnet

#endif  // KARNET_INTERP_SMOOTH_LAYER_H_
