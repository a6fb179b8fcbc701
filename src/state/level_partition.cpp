#include "state/level_partition.h"

#include <cstddef>

namespace karnet {

std::vector<LevelRange> partitionLevels(const std::vector<std::int64_t>& weights,
                                        std::int32_t firstLevel, int parts) {
  std::vector<LevelRange> blocks;
  if (parts < 1) return blocks;
  const auto levels = static_cast<std::int64_t>(weights.size());
  std::int64_t total = 0;
  for (const std::int64_t w : weights) total += w > 0 ? w : 0;
  // Weight of levels 0 .. i - 1; with no weight at all every level weighs 1.
  std::vector<std::int64_t> before(static_cast<std::size_t>(levels) + 1, 0);
  for (std::int64_t i = 0; i < levels; ++i) {
    const std::int64_t w = total > 0 ? (weights[static_cast<std::size_t>(i)] > 0
                                            ? weights[static_cast<std::size_t>(i)]
                                            : 0)
                                     : 1;
    before[static_cast<std::size_t>(i) + 1] = before[static_cast<std::size_t>(i)] + w;
  }
  const std::int64_t sum = before[static_cast<std::size_t>(levels)];

  // Block p ends at the level boundary whose weight before it lies nearest to
  // (p + 1) / parts of the whole; boundaries never go backwards.
  std::int64_t start = 0;
  for (int p = 0; p < parts; ++p) {
    std::int64_t stop = levels;
    if (p + 1 < parts) {
      // target = sum * (p + 1) / parts, compared without rounding: x * parts
      // against sum * (p + 1).
      const std::int64_t scaledTarget = sum * (p + 1);
      stop = start;
      while (stop < levels && before[static_cast<std::size_t>(stop)] * parts < scaledTarget) ++stop;
      // stop is the first boundary at or past the target; the one before may lie nearer.
      if (stop > start) {
        const std::int64_t over = before[static_cast<std::size_t>(stop)] * parts - scaledTarget;
        const std::int64_t under = scaledTarget - before[static_cast<std::size_t>(stop) - 1] * parts;
        if (under < over) --stop;
      }
    }
    LevelRange block;
    block.first = firstLevel + static_cast<std::int32_t>(start);
    block.count = static_cast<std::int32_t>(stop - start);
    blocks.push_back(block);
    start = stop;
  }
  return blocks;
}

int levelOwner(const std::vector<LevelRange>& blocks, std::int32_t level) {
  for (std::size_t p = 0; p < blocks.size(); ++p) {
    if (blocks[p].holds(level)) return static_cast<int>(p);
  }
  return -1;
}

}  // namespace karnet
