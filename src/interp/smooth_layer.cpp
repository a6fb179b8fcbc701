// Twelve-point smoother of one layer, in place.
#include "interp/smooth_layer.h"

#include <cstdint>

#include "support/file_description.h"

namespace karnet {

namespace {

// New value of a data node u from its eight neighbours; an empty neighbour
// stands in as u. The sum is formed in this fixed order, then divided by 12.
inline float smoothed(float u, float s, float sw, float se, float w, float e, float nw, float n,
                      float ne) {
  const float empty = kDeleteValueFloat;
  auto v = [&](float x) { return x == empty ? u : x; };
  float sum = v(s);
  sum += v(sw);
  sum += v(se);
  sum += v(w);
  sum += 4.0f * u;
  sum += v(e);
  sum += v(nw);
  sum += v(n);
  sum += v(ne);
  return sum / 12.0f;
}

// Smooths node (j, k) with the given (clamped) neighbour columns and rows.
inline void smoothNode(float* data, std::int64_t nj, std::int64_t j, std::int64_t k,
                       std::int64_t jm, std::int64_t jp, std::int64_t km, std::int64_t kp) {
  float* centre = data + k * nj + j;
  const float u = *centre;
  if (u == kDeleteValueFloat) return;
  const float* below = data + km * nj;
  const float* row = data + k * nj;
  const float* above = data + kp * nj;
  *centre = smoothed(u, below[j], below[jm], below[jp], row[jm], row[jp], above[jm], above[j],
                     above[jp]);
}

}  // namespace

void smoothLayer(float* data, std::int32_t nj, std::int32_t nk) {
  if (nj < 1 || nk < 1) return;
  const std::int64_t lastJ = nj - 1;
  const std::int64_t lastK = nk - 1;
  // Column by column, each column bottom to top: the neighbours are read as the
  // pass has left them, so earlier nodes contribute their smoothed values.
  for (std::int64_t j = 0; j <= lastJ; ++j) {
    const std::int64_t jm = j > 0 ? j - 1 : 0;
    const std::int64_t jp = j < lastJ ? j + 1 : lastJ;
    smoothNode(data, nj, j, 0, jm, jp, 0, lastK > 0 ? 1 : 0);
    for (std::int64_t k = 1; k < lastK; ++k) smoothNode(data, nj, j, k, jm, jp, k - 1, k + 1);
    if (lastK > 0) smoothNode(data, nj, j, lastK, jm, jp, lastK - 1, lastK);
  }
}

}  // namespace karnet
