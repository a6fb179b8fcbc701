// Extraction of the local grid's window from the basic-grid values.
#include "interp/glo2loc.h"

#include <algorithm>
#include <cstdint>

#include "support/file_description.h"

namespace karnet {

void glo2loc(std::int32_t jOff, std::int32_t kOff, std::int32_t lOff, RunState& state,
             const RunSettings& /*settings*/, int threads) {
  FloatGrid3D& local = state.localValues;
  const FloatGrid3D& basic = state.basicValues;
  if (local.data == nullptr) return;
  const std::int64_t njL = local.nj, nkL = local.nk, nlL = local.nl;
  const std::int64_t nj = basic.nj, nk = basic.nk, nl = basic.nl;
  const float empty = static_cast<float>(state.deleteValue());
  // Local node (p, q, s) comes from basic node (jOff + p, kOff + q, lOff + s).
  // The window normally lies inside the basic grid; any part of it that does
  // not is left empty rather than read from outside the basic array.
  const std::int64_t pLo = std::clamp<std::int64_t>(-std::int64_t{jOff}, 0, njL);
  const std::int64_t pHi = std::clamp<std::int64_t>(nj - jOff, pLo, njL);
#pragma omp parallel for schedule(static) num_threads(threads) if (threads > 1)
  for (std::int64_t s = 0; s < nlL; ++s) {
    const std::int64_t lb = lOff + s;
    for (std::int64_t q = 0; q < nkL; ++q) {
      const std::int64_t kb = kOff + q;
      float* out = local.data + (s * nkL + q) * njL;
      if (basic.data == nullptr || lb < 0 || lb >= nl || kb < 0 || kb >= nk) {
        std::fill(out, out + njL, empty);
        continue;
      }
      const float* in = basic.data + (lb * nk + kb) * nj + (jOff + pLo);
      std::fill(out, out + pLo, empty);
      std::copy(in, in + (pHi - pLo), out + pLo);
      std::fill(out + pHi, out + njL, empty);
    }
  }
}

}  // namespace karnet
