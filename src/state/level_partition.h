#ifndef KARNET_STATE_LEVEL_PARTITION_H_
#define KARNET_STATE_LEVEL_PARTITION_H_

#include <cstdint>
#include <vector>

namespace karnet {

// A run of consecutive basic levels first .. first + count - 1.
struct LevelRange {
  std::int32_t first = 0;
  std::int32_t count = 0;

  std::int32_t end() const { return first + count; }
  bool holds(std::int32_t level) const { return level >= first && level < first + count; }
};

// Splits the levels firstLevel .. firstLevel + weights.size() - 1 into `parts`
// contiguous blocks in level order, block p before block p + 1, so that the
// blocks' sums of weights (the work of each level, such as its wet nodes) come
// as close as contiguous blocks allow to an equal share. Blocks may be empty
// when there are fewer levels than parts; all weights 0 share by level count.
std::vector<LevelRange> partitionLevels(const std::vector<std::int64_t>& weights,
                                        std::int32_t firstLevel, int parts);

// The block holding the level, or -1.
int levelOwner(const std::vector<LevelRange>& blocks, std::int32_t level);

}  // namespace karnet

#endif  // KARNET_STATE_LEVEL_PARTITION_H_
