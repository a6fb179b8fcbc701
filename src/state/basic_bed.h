#ifndef KARNET_STATE_BASIC_BED_H_
#define KARNET_STATE_BASIC_BED_H_

#include <cstdint>

#include "support/float_grid.h"

namespace karnet {

// Where the local grid lies in the basic grid, and its levels.
struct LocalWindow {
  std::int32_t jOff = 0, kOff = 0, lOff = 0;  // basic node of the local grid's first node
  std::int32_t l0 = 0, lx = 0;                // the local grid's first and last level
  float dz = 0;                               // level spacing
};

// The wet/dry rule of the basic grid's bathymetry field, for one node: inside
// the local grid's footprint and levels, a water column (bed below the land
// value) holds its bed value at the top level and at every level whose height
// lies above the bed; every other node holds the land value (as a float).
inline float basicBedAt(const FloatGrid2D& bed, double landValue, const LocalWindow& w,
                        std::int32_t jb, std::int32_t kb, std::int32_t lb) {
  const auto land = static_cast<float>(landValue);
  const std::int64_t i = std::int64_t{jb} - w.jOff;
  const std::int64_t k = std::int64_t{kb} - w.kOff;
  const std::int64_t l = std::int64_t{lb} - w.lOff + w.l0;
  if (i < 0 || i >= bed.nj || k < 0 || k >= bed.nk || l < w.l0 || l > w.lx) return land;
  const float b = bed.data[k * bed.nj + i];
  if (!(landValue > static_cast<double>(b))) return land;
  const float height = static_cast<float>(static_cast<std::int32_t>(l) - w.lx - 1) * w.dz;
  return l == w.lx || height > b ? b : land;
}

}  // namespace karnet

#endif  // KARNET_STATE_BASIC_BED_H_
