// Quadrant neighbour search: scan order, quadrant membership, edge distances
// and reach, and the agreement of the table-assisted search with the plain one.
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
constexpr double kDelete = static_cast<double>(kEmpty);

// An nj x nk layer, empty unless set.
class Layer {
 public:
  Layer(std::int32_t nj, std::int32_t nk) : values_(static_cast<std::size_t>(nj) * nk, kEmpty) {
    grid_.nj = nj;
    grid_.nk = nk;
    grid_.data = values_.data();
  }
  void set(std::int32_t j, std::int32_t k, float v = 1.0f) { grid_.at(j, k) = v; }
  const FloatGrid2D& grid() const { return grid_; }

 private:
  std::vector<float> values_;
  FloatGrid2D grid_;
};

using Hits = std::vector<std::pair<std::int32_t, std::int32_t>>;

// Runs the plain search; also checks that entry 0 and the entries past the
// count are left alone.
Hits find(const Layer& layer, std::int32_t j, std::int32_t k, float reach) {
  std::int32_t jHit[kHitListSize], kHit[kHitListSize];
  std::fill(jHit, jHit + kHitListSize, -777);
  std::fill(kHit, kHit + kHitListSize, -777);
  const std::int32_t n = search(j, k, layer.grid(), reach, kDelete, jHit, kHit);
  EXPECT_GE(n, 0);
  EXPECT_LE(n, 4);
  EXPECT_EQ(jHit[0], -777);
  EXPECT_EQ(kHit[0], -777);
  for (int i = n + 1; i < kHitListSize; ++i) {
    EXPECT_EQ(jHit[i], -777);
    EXPECT_EQ(kHit[i], -777);
  }
  Hits hits;
  for (int i = 1; i <= n; ++i) hits.emplace_back(jHit[i], kHit[i]);
  return hits;
}

TEST(SearchOrder, NeighbourAlongTheRowIsQ1LegA) {
  Layer layer(7, 7);
  layer.set(4, 3);
  EXPECT_EQ(find(layer, 3, 3, 10.0f), (Hits{{4, 3}}));
}

TEST(SearchOrder, NeighbourStraightAboveBelongsToQ2) {
  Layer layer(7, 7);
  layer.set(3, 4);
  layer.set(1, 5);  // a second Q2 node: found only if (3, 4) were taken by Q1
  EXPECT_EQ(find(layer, 3, 3, 10.0f), (Hits{{3, 4}}));
}

TEST(SearchOrder, DiagonalNeighbourIsQ1LegB) {
  Layer layer(7, 7);
  layer.set(4, 4);
  EXPECT_EQ(find(layer, 3, 3, 10.0f), (Hits{{4, 4}}));
}

TEST(SearchOrder, LegAComesBeforeLegB) {
  Layer layer(7, 7);
  layer.set(1, 2);
  layer.set(2, 1);
  EXPECT_EQ(find(layer, 0, 0, 10.0f), (Hits{{2, 1}}));
}

TEST(SearchOrder, FirstInScanOrderNotNearest) {
  Layer layer(9, 9);
  layer.set(4, 3);  // ring 3, leg A, t = 2: distance sqrt(13)
  layer.set(2, 4);  // ring 3, leg B, t = 1: distance sqrt(10)
  EXPECT_EQ(find(layer, 1, 1, 10.0f), (Hits{{4, 3}}));
}

TEST(SearchOrder, FourQuadrantsInOrder) {
  Layer layer(9, 9);
  layer.set(6, 4);  // Q1
  layer.set(3, 7);  // Q2
  layer.set(2, 2);  // Q3
  layer.set(4, 1);  // Q4
  EXPECT_EQ(find(layer, 4, 4, 10.0f), (Hits{{6, 4}, {3, 7}, {2, 2}, {4, 1}}));
}

TEST(SearchOrder, MissingQuadrantsAreSkipped) {
  Layer layer(9, 9);
  layer.set(2, 6);  // Q2
  layer.set(7, 0);  // Q4
  EXPECT_EQ(find(layer, 4, 4, 10.0f), (Hits{{2, 6}, {7, 0}}));
}

TEST(SearchOrder, EachQuadrantScansItsTurnedLegs) {
  // The ring-1 nodes of each quadrant in scan order, seen from (2, 2): the
  // first one holding data is the hit, so setting them one at a time from the
  // last to the first shows the order.
  const std::vector<Hits> rings = {
      {{3, 2}, {3, 3}},  // Q1: leg A (3, 2); leg B (3, 3)
      {{2, 3}, {1, 3}},  // Q2: leg A (2, 3); leg B (1, 3)
      {{1, 2}, {1, 1}},  // Q3: leg A (1, 2); leg B (1, 1)
      {{2, 1}, {3, 1}},  // Q4: leg A (2, 1); leg B (3, 1)
  };
  for (const Hits& ring : rings) {
    Layer layer(5, 5);
    for (auto it = ring.rbegin(); it != ring.rend(); ++it) {
      layer.set(it->first, it->second);
      EXPECT_EQ(find(layer, 2, 2, 1.0f), (Hits{*it}));
    }
  }
}

TEST(SearchEdges, LastRowAndLastColumnAreExamined) {
  Layer row(6, 4);
  row.set(3, 3);  // (j + 1, nk - 1) with k + 1 = nk - 1
  EXPECT_EQ(find(row, 2, 2, 1.0f), (Hits{{3, 3}}));
  Layer col(4, 6);
  col.set(3, 3);  // (nj - 1, k + 1) with j + 1 = nj - 1
  EXPECT_EQ(find(col, 2, 2, 1.0f), (Hits{{3, 3}}));
}

TEST(SearchEdges, RingsRunToTheFartherEdge) {
  // From (1, 5) in a 20 x 7 layer Q1 faces column 19 (18 away) and row 6 (1
  // away): the rings run to 18, so the far corner is found.
  Layer layer(20, 7);
  layer.set(19, 6);
  EXPECT_EQ(find(layer, 1, 5, 100.0f), (Hits{{19, 6}}));
}

TEST(SearchEdges, CornerNodeSearchesOnlyInside) {
  Layer layer(10, 3);
  layer.set(9, 2);  // Q1
  layer.set(0, 2);  // Q2, on the first column
  EXPECT_EQ(find(layer, 0, 0, 100.0f), (Hits{{9, 2}, {0, 2}}));
  Layer far(10, 3);
  far.set(0, 0);
  EXPECT_EQ(find(far, 9, 2, 100.0f), (Hits{{0, 0}}));  // Q3 from the opposite corner
}

TEST(SearchReach, ReachTruncatesToWholeRings) {
  Layer layer(9, 9);
  layer.set(7, 4);  // ring 3 of Q1
  layer.set(4, 6);  // ring 2 of Q2
  EXPECT_EQ(find(layer, 4, 4, 2.9f), (Hits{{4, 6}}));
  EXPECT_EQ(find(layer, 4, 4, 3.0f), (Hits{{7, 4}, {4, 6}}));
}

TEST(SearchReach, BelowOneNodeNothingIsSearched) {
  Layer layer(5, 5);
  layer.set(3, 2);
  layer.set(1, 2);
  EXPECT_TRUE(find(layer, 2, 2, 0.99f).empty());
  EXPECT_TRUE(find(layer, 2, 2, 0.0f).empty());
  EXPECT_TRUE(find(layer, 2, 2, -3.0f).empty());
}

TEST(SearchReach, ReachIsSearchRadiusOverDx) {
  RunSettings settings;
  settings.SearchRadius = 250.0f;
  settings.dx = 100.0f;
  settings.dy = 1.0f;  // not used
  EXPECT_EQ(searchReach(settings), 2.5f);
  settings.SearchRadius = 1.0f;
  settings.dx = 3.0f;
  EXPECT_EQ(searchReach(settings), 1.0f / 3.0f);
}

// The search as described ring by ring, quadrant by quadrant, written out
// without any shared geometry, for comparison on random layers.
Hits referenceSearch(const Layer& layer, std::int32_t j, std::int32_t k, float reach) {
  const FloatGrid2D& g = layer.grid();
  const std::int32_t nj = g.nj, nk = g.nk;
  const std::int32_t edges[4] = {std::max(nj - 1 - j, nk - 1 - k), std::max(nk - 1 - k, j),
                                 std::max(k, j), std::max(k, nj - 1 - j)};
  auto holds = [&](std::int32_t a, std::int32_t b) {
    return a >= 0 && a <= nj - 1 && b >= 0 && b <= nk - 1 && g.at(a, b) != kEmpty;
  };
  Hits hits;
  for (int q = 0; q < 4; ++q) {
    float limit = static_cast<float>(edges[q]);
    if (reach <= limit) limit = reach;
    const std::int32_t rings = limit >= 1.0f ? static_cast<std::int32_t>(limit) : 0;
    bool found = false;
    for (std::int32_t r = 1; r <= rings && !found; ++r) {
      std::vector<std::pair<std::int32_t, std::int32_t>> candidates;
      for (std::int32_t t = 0; t <= r - 1; ++t) {
        if (q == 0) candidates.emplace_back(j + r, k + t);
        if (q == 1) candidates.emplace_back(j - t, k + r);
        if (q == 2) candidates.emplace_back(j - r, k - t);
        if (q == 3) candidates.emplace_back(j + t, k - r);
      }
      for (std::int32_t t = 1; t <= r; ++t) {
        if (q == 0) candidates.emplace_back(j + t, k + r);
        if (q == 1) candidates.emplace_back(j - r, k + t);
        if (q == 2) candidates.emplace_back(j - t, k - r);
        if (q == 3) candidates.emplace_back(j + r, k - t);
      }
      for (const auto& c : candidates) {
        if (holds(c.first, c.second)) {
          hits.push_back(c);
          found = true;
          break;
        }
      }
    }
  }
  return hits;
}

Hits findIndexed(const Layer& layer, const SearchIndex& index, std::int32_t j, std::int32_t k,
                 float reach) {
  std::int32_t jHit[kHitListSize] = {}, kHit[kHitListSize] = {};
  const std::int32_t n = search(j, k, layer.grid(), reach, kDelete, index, jHit, kHit);
  Hits hits;
  for (int i = 1; i <= n; ++i) hits.emplace_back(jHit[i], kHit[i]);
  return hits;
}

TEST(SearchRandom, PlainAndTableSearchesAgreeWithTheRingWalk) {
  std::mt19937 random(20240611);
  const std::int32_t shapes[][2] = {{1, 1}, {1, 17}, {23, 1}, {9, 9}, {31, 12}, {40, 45}};
  const double densities[] = {0.0, 0.002, 0.02, 0.1, 0.5, 0.95};
  const float reaches[] = {0.5f, 1.0f, 2.7f, 5.0f, 9.0f, 30.0f, 1000.0f};
  std::int64_t compared = 0, nonEmpty = 0;
  for (const auto& shape : shapes) {
    for (double density : densities) {
      Layer layer(shape[0], shape[1]);
      std::bernoulli_distribution put(density);
      for (std::int32_t k = 0; k < shape[1]; ++k)
        for (std::int32_t j = 0; j < shape[0]; ++j)
          if (put(random)) layer.set(j, k, static_cast<float>(j - k));
      SearchIndex index;
      searchIndexAlloc(index, shape[0], shape[1]);
      searchIndexBuild(index, layer.grid(), kDelete);
      for (float reach : reaches) {
        for (std::int32_t k = 0; k < shape[1]; ++k) {
          for (std::int32_t j = 0; j < shape[0]; ++j) {
            const Hits expected = referenceSearch(layer, j, k, reach);
            ASSERT_EQ(find(layer, j, k, reach), expected) << j << "," << k << " reach " << reach;
            ASSERT_EQ(findIndexed(layer, index, j, k, reach), expected)
                << j << "," << k << " reach " << reach;
            ++compared;
            nonEmpty += expected.empty() ? 0 : 1;
          }
        }
      }
      searchIndexFree(index);
    }
  }
  EXPECT_GT(compared, 10000);
  EXPECT_GT(nonEmpty, compared / 4);
}

TEST(SearchRandom, TableSearchFindsFarDataAcrossEmptyRings) {
  // One data node per quadrant, far out: the table skips the empty rings.
  Layer layer(200, 150);
  layer.set(180, 90);
  layer.set(60, 140);
  layer.set(5, 3);
  layer.set(150, 10);
  SearchIndex index;
  searchIndexAlloc(index, 200, 150);
  searchIndexBuild(index, layer.grid(), kDelete);
  const Hits expected = {{180, 90}, {60, 140}, {5, 3}, {150, 10}};
  EXPECT_EQ(referenceSearch(layer, 100, 75, 1000.0f), expected);
  EXPECT_EQ(findIndexed(layer, index, 100, 75, 1000.0f), expected);
  // Reach 80.5 stops short of the Q3 node (ring 95), reach 79 also of Q1's (ring 80).
  EXPECT_EQ(findIndexed(layer, index, 100, 75, 80.5f), (Hits{{180, 90}, {60, 140}, {150, 10}}));
  EXPECT_EQ(findIndexed(layer, index, 100, 75, 79.0f), (Hits{{60, 140}, {150, 10}}));
  searchIndexFree(index);
}

}  // namespace
}  // namespace karnet
