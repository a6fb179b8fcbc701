#include "input/level_share.h"

#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

std::vector<std::int64_t> wetNodesPerLevel(const FloatGrid2D& bed, double landValue,
                                           const RunSettings& s) {
  std::vector<std::int64_t> wet;
  if (s.lx < s.l0) return wet;
  wet.assign(static_cast<std::size_t>(std::int64_t{s.lx} - s.l0 + 1), 0);
  const std::int64_t columns = bed.elementCount();
  for (std::int32_t l = s.l0; l <= s.lx; ++l) {
    const bool top = l == s.lx;
    const float height = static_cast<float>(l - s.lx - 1) * s.dz;
    std::int64_t n = 0;
    for (std::int64_t c = 0; c < columns; ++c) {
      const float b = bed.data[c];
      if (landValue > static_cast<double>(b) && (top || height > b)) ++n;
    }
    wet[static_cast<std::size_t>(l - s.l0)] = n;
  }
  return wet;
}

LevelRange shareBasicLevels(RunState& state, const RunSettings& s, std::int32_t nl,
                            std::int32_t jOff, std::int32_t kOff, std::int32_t lOff, int ranks,
                            int rank) {
  state.basicLevels = nl;
  state.window = LocalWindow{jOff, kOff, lOff, s.l0, s.lx, s.dz};
  if (ranks <= 1) {
    state.levelOwners.assign(1, LevelRange{0, nl});
    return state.levelOwners[0];
  }
  // Only the local grid's levels are analysed and written; the levels of the
  // basic grid around them serve the vertical completion alone, which works
  // on whole columns of its own.
  std::vector<std::int64_t> work = wetNodesPerLevel(state.bathymetryGrid, state.landValue, s);
  // A level also costs its copies and its smoothing, wet nodes or not.
  const std::int64_t perLevel = state.bathymetryGrid.elementCount() / 64 + 1;
  for (std::int64_t& w : work) w += perLevel;
  // Rank 0 also builds the result file in memory: it takes the top block,
  // where the levels are widest in water and so fewest for its share of the
  // work, the next rank the block below, and so on down.
  const auto levels = static_cast<std::int32_t>(work.size());
  const std::vector<std::int64_t> topDown(work.rbegin(), work.rend());
  state.levelOwners = partitionLevels(topDown, 0, ranks);
  for (LevelRange& block : state.levelOwners) {
    block.first = lOff + levels - block.first - block.count;
  }
  return state.levelOwners[static_cast<std::size_t>(rank)];
}

}  // namespace karnet
