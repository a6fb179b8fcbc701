#include "input/bathymetry_scan.h"

#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

void bathymetryScan(std::int32_t jOff, std::int32_t kOff, std::int32_t lOff, RunState& state,
                    const RunSettings& s, int threads) {
  FloatGrid3D& basic = state.basicBathymetry;
  const FloatGrid2D& bed = state.bathymetryGrid;
  grid3DFill(basic, static_cast<float>(state.landValue), threads);
  // Each node is written at most once, so the scan may go level by level, the
  // levels in any order: the top level takes every water column, a lower
  // level the columns whose bed lies below the level's height.
#pragma omp parallel for schedule(dynamic, 1) num_threads(threads) if (threads > 1)
  for (std::int32_t l = s.lx; l >= s.l0; --l) {
    const bool top = l == s.lx;
    const float height = static_cast<float>(l - s.lx - 1) * s.dz;
    const std::int32_t lb = l - s.l0 + lOff;
    // Only the levels this process holds.
    if (lb < basic.l0 || lb >= basic.l0 + basic.nl) continue;
    for (std::int32_t j = 0; j < bed.nk; ++j) {
      const float* row = bed.data + std::int64_t{j} * bed.nj;
      float* out = &basic.at(jOff, j + kOff, lb);
      for (std::int32_t i = 0; i < bed.nj; ++i) {
        const float b = row[i];
        if (!(state.landValue > static_cast<double>(b))) continue;
        if (top || height > b) out[i] = b;
      }
    }
  }
}

}  // namespace karnet
