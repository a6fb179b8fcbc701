// Sharing levels out in contiguous blocks balanced by their work.
#include "state/level_partition.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <numeric>
#include <vector>

namespace karnet {
namespace {

// Blocks follow each other without gap or overlap and cover every level.
void expectTiling(const std::vector<LevelRange>& blocks, std::int32_t first, std::int32_t count) {
  std::int32_t next = first;
  for (const LevelRange& b : blocks) {
    EXPECT_EQ(b.first, next);
    EXPECT_GE(b.count, 0);
    next = b.end();
  }
  EXPECT_EQ(next, first + count);
}

std::int64_t blockWeight(const std::vector<std::int64_t>& w, const LevelRange& b,
                         std::int32_t first) {
  return std::accumulate(w.begin() + (b.first - first), w.begin() + (b.end() - first),
                         std::int64_t{0});
}

TEST(LevelPartition, BlocksAreContiguousAndBalancedByWeight) {
  const struct {
    const char* what;
    std::vector<std::int64_t> weights;
    int parts;
    std::vector<std::int32_t> counts;  // expected block sizes
  } cases[] = {
      {"equal weights, even split", {5, 5, 5, 5, 5, 5}, 3, {2, 2, 2}},
      {"equal weights, uneven split", {1, 1, 1, 1, 1, 1, 1}, 3, {2, 3, 2}},
      // Total 40: the first boundary nearest 20 is after the level of 20.
      {"one heavy level stands alone", {20, 5, 5, 5, 5}, 2, {1, 4}},
      // A wide top and a narrow bottom: blocks of equal work, not of equal size.
      {"wet nodes thin out with depth", {100, 100, 70, 20, 10, 5, 3, 2}, 2, {2, 6}},
      {"more parts than levels", {3, 4}, 4, {1, 0, 1, 0}},
      {"no weight at all: by count", {0, 0, 0, 0}, 2, {2, 2}},
      {"one part takes all", {9, 1, 4}, 1, {3}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    const std::vector<LevelRange> blocks = partitionLevels(c.weights, 7, c.parts);
    ASSERT_EQ(blocks.size(), static_cast<std::size_t>(c.parts));
    expectTiling(blocks, 7, static_cast<std::int32_t>(c.weights.size()));
    std::vector<std::int32_t> counts;
    for (const LevelRange& b : blocks) counts.push_back(b.count);
    EXPECT_EQ(counts, c.counts);
  }
}

TEST(LevelPartition, NoBlockExceedsItsShareByMoreThanOneLevel) {
  // Wet-node counts of a basin whose levels narrow with depth, many parts.
  std::vector<std::int64_t> weights;
  for (int l = 0; l < 40; ++l) weights.push_back(4000000 - 90000 * l + (l % 3) * 7000);
  const std::int64_t total = std::accumulate(weights.begin(), weights.end(), std::int64_t{0});
  const std::int64_t heaviest = *std::max_element(weights.begin(), weights.end());
  for (int parts : {2, 3, 4, 7, 16}) {
    SCOPED_TRACE(parts);
    const std::vector<LevelRange> blocks = partitionLevels(weights, 0, parts);
    expectTiling(blocks, 0, 40);
    for (const LevelRange& b : blocks) {
      EXPECT_LE(blockWeight(weights, b, 0), total / parts + heaviest);
      EXPECT_GE(blockWeight(weights, b, 0), total / parts - heaviest);
    }
  }
}

TEST(LevelPartition, OwnerOfEachLevel) {
  const std::vector<LevelRange> blocks = {{10, 2}, {12, 0}, {12, 3}};
  EXPECT_EQ(levelOwner(blocks, 9), -1);
  EXPECT_EQ(levelOwner(blocks, 10), 0);
  EXPECT_EQ(levelOwner(blocks, 11), 0);
  EXPECT_EQ(levelOwner(blocks, 12), 2);  // the empty block owns nothing
  EXPECT_EQ(levelOwner(blocks, 14), 2);
  EXPECT_EQ(levelOwner(blocks, 15), -1);
  EXPECT_TRUE(partitionLevels({1, 2}, 0, 0).empty());
}

}  // namespace
}  // namespace karnet
