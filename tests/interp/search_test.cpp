// Quadrant neighbour search: scan order, quadrant membership, edge distances
// and reach, and the agreement of the table search with the plain one.
#include "interp/search.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <random>
#include <utility>
#include <vector>

#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using Hits = std::vector<std::pair<std::int32_t, std::int32_t>>;
constexpr double kDelete = static_cast<double>(kEmpty);

// An nj x nk layer, empty unless set.
struct Layer {
  Layer(std::int32_t nj, std::int32_t nk)
      : values(static_cast<std::size_t>(nj) * nk, kEmpty), grid{0, 0, nj, nk, values.data()} {}
  void set(std::int32_t j, std::int32_t k, float v = 1.0f) { grid.at(j, k) = v; }
  std::vector<float> values;
  FloatGrid2D grid;
};

// Runs the plain search, or the table search when given the tables; entry 0
// and the entries past the count must be left alone.
Hits find(const Layer& layer, std::int32_t j, std::int32_t k, float reach,
          const SearchTables* tables = nullptr) {
  std::int32_t jHit[kHitListSize] = {-7, -7, -7, -7, -7}, kHit[kHitListSize] = {-7, -7, -7, -7, -7};
  const std::int32_t n = tables == nullptr
                             ? search(j, k, layer.grid, reach, kDelete, jHit, kHit)
                             : tables->search(j, k, reach, jHit, kHit);
  EXPECT_TRUE(n >= 0 && n <= 4) << n;
  Hits hits;
  for (int i = 0; i < kHitListSize; ++i) {
    if (i >= 1 && i <= n) {
      hits.emplace_back(jHit[i], kHit[i]);
    } else {
      EXPECT_TRUE(jHit[i] == -7 && kHit[i] == -7) << i;
    }
  }
  return hits;
}

// Both searches on the layer; they must agree.
Hits findBoth(const Layer& layer, std::int32_t j, std::int32_t k, float reach) {
  SearchTables tables(layer.grid.nj, layer.grid.nk);
  tables.build(layer.grid, kDelete);
  const Hits plain = find(layer, j, k, reach);
  EXPECT_EQ(find(layer, j, k, reach, &tables), plain);
  return plain;
}

TEST(Search, HandWorkedOrderQuadrantsEdgesAndReach) {
  const Hits far = {{180, 90}, {60, 140}, {5, 3}, {150, 10}};
  const Hits ring1 = {{3, 2}, {3, 3}, {2, 3}, {1, 3}, {1, 2}, {1, 1}, {2, 1}, {3, 1}};
  const struct {
    const char* what;
    std::int32_t nj, nk;
    Hits data;
    std::int32_t j, k;
    float reach;
    Hits expected;
  } cases[] = {
      // Ring 1 of each quadrant seen from (2, 2): leg A, then leg B.
      {"leg A before leg B", 5, 5, ring1, 2, 2, 1, {{3, 2}, {2, 3}, {1, 2}, {2, 1}}},
      {"leg B alone", 5, 5, {{3, 3}, {1, 3}, {1, 1}, {3, 1}}, 2, 2, 1,
       {{3, 3}, {1, 3}, {1, 1}, {3, 1}}},
      // Ring 3: leg A t = 2 at distance sqrt(13) before leg B t = 1 at sqrt(10).
      {"first in scan order, not nearest", 9, 9, {{4, 3}, {2, 4}}, 1, 1, 10, {{4, 3}}},
      {"four quadrants in order", 9, 9, {{4, 1}, {2, 2}, {3, 7}, {6, 4}}, 4, 4, 10,
       {{6, 4}, {3, 7}, {2, 2}, {4, 1}}},
      {"missing quadrants skipped", 9, 9, {{7, 0}, {2, 6}}, 4, 4, 10, {{2, 6}, {7, 0}}},
      {"last row examined", 6, 4, {{3, 3}}, 2, 2, 1, {{3, 3}}},
      // Q1 faces column 19 (18 away) and row 6 (1 away): rings run to 18.
      {"rings run to the farther edge", 20, 7, {{19, 6}}, 1, 5, 100, {{19, 6}}},
      {"corner searches only inside", 10, 3, {{9, 2}, {0, 2}}, 0, 0, 100, {{9, 2}, {0, 2}}},
      {"reach truncates to whole rings", 9, 9, {{7, 4}, {4, 6}}, 4, 4, 2.9f, {{4, 6}}},
      {"reach 3 takes ring 3", 9, 9, {{7, 4}, {4, 6}}, 4, 4, 3, {{7, 4}, {4, 6}}},
      {"reach below one", 5, 5, {{3, 2}, {1, 2}}, 2, 2, 0.99f, {}},
      // One node per quadrant far out: Q1's lies on ring 80, Q3's on ring 95.
      {"far data", 200, 150, far, 100, 75, 1000, far},
      {"far data, reach 80.5", 200, 150, far, 100, 75, 80.5f, {far[0], far[1], far[3]}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    Layer layer(c.nj, c.nk);
    for (const auto& d : c.data) layer.set(d.first, d.second);
    EXPECT_EQ(findBoth(layer, c.j, c.k, c.reach), c.expected);
  }
}

// The search as described ring by ring, quadrant by quadrant: Q1's ring r is
// leg A (r, t), t = 0..r-1, then leg B (t, r), t = 1..r; each further quadrant
// turns these offsets a quarter turn anticlockwise.
Hits ringWalk(const FloatGrid2D& g, std::int32_t j, std::int32_t k, float reach) {
  const std::int32_t edges[4] = {std::max(g.nj - 1 - j, g.nk - 1 - k), std::max(g.nk - 1 - k, j),
                                 std::max(k, j), std::max(k, g.nj - 1 - j)};
  Hits hits;
  for (int q = 0; q < 4; ++q) {
    const float edge = static_cast<float>(edges[q]), limit = reach <= edge ? reach : edge;
    const std::int32_t rings = limit >= 1.0f ? static_cast<std::int32_t>(limit) : 0;
    bool found = false;
    for (std::int32_t r = 1; r <= rings && !found; ++r) {
      for (std::int32_t s = 0; s < 2 * r && !found; ++s) {
        std::int32_t a = s < r ? r : s - r + 1, b = s < r ? s : r;
        for (int turn = 0; turn < q; ++turn) {
          std::swap(a, b);
          a = -a;
        }
        const std::int32_t hj = j + a, hk = k + b;
        found = hj >= 0 && hj < g.nj && hk >= 0 && hk < g.nk && g.at(hj, hk) != kEmpty;
        if (found) hits.emplace_back(hj, hk);
      }
    }
  }
  return hits;
}

// The searches agree with the ring walk at every node of random layers, the
// table search with tables built on one thread and on three.
TEST(Search, PlainAndTableSearchesAgreeWithTheRingWalkOnRandomLayers) {
  std::mt19937 random(20240611);
  const std::int32_t shapes[][2] = {{1, 1}, {1, 17}, {23, 1}, {9, 9}, {31, 12}, {40, 45}};
  const double densities[] = {0.0, 0.002, 0.02, 0.1, 0.5, 0.95};
  const float reaches[] = {0.5f, 1.0f, 2.7f, 5.0f, 9.0f, 30.0f, 1000.0f};
  std::int64_t compared = 0, nonEmpty = 0;
  for (const auto& shape : shapes) {
    for (double density : densities) {
      Layer layer(shape[0], shape[1]);
      std::bernoulli_distribution put(density);
      for (std::size_t node = 0; node < layer.values.size(); ++node)
        if (put(random)) layer.values[node] = static_cast<float>(node);
      SearchTables tables(shape[0], shape[1]);
      tables.build(layer.grid, kDelete, compared % 2 == 0 ? 1 : 3);
      for (float reach : reaches) {
        for (std::int32_t k = 0; k < shape[1]; ++k) {
          for (std::int32_t j = 0; j < shape[0]; ++j) {
            const Hits expected = ringWalk(layer.grid, j, k, reach);
            SCOPED_TRACE(::testing::Message() << j << "," << k << " reach " << reach);
            ASSERT_EQ(find(layer, j, k, reach), expected);
            ASSERT_EQ(find(layer, j, k, reach, &tables), expected);
            ++compared;
            nonEmpty += expected.empty() ? 0 : 1;
          }
        }
      }
    }
  }
  EXPECT_GT(compared, 10000);
  EXPECT_GT(nonEmpty, compared / 4);
}

// A layer wider than 65535 nodes keeps its distances in 32 bits: data 70000
// nodes away is found where it lies.
TEST(Search, TablesOfAVeryWideLayer) {
  Layer layer(70002, 2);
  layer.set(70001, 1);
  layer.set(0, 0);
  layer.set(35000, 1);
  SearchTables tables(70002, 2);
  tables.build(layer.grid, kDelete, 2);
  for (const auto& node : Hits{{1, 0}, {1, 1}, {34999, 0}, {35001, 1}, {70000, 0}}) {
    SCOPED_TRACE(::testing::Message() << node.first << "," << node.second);
    EXPECT_EQ(find(layer, node.first, node.second, 1e6f, &tables),
              find(layer, node.first, node.second, 1e6f));
  }
  EXPECT_EQ(find(layer, 1, 0, 1e6f, &tables), (Hits{{35000, 1}, {0, 0}}));
}

}  // namespace
}  // namespace karnet
