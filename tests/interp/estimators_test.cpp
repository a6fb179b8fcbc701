// The two estimators: the bilinear estimate from four quadrant hits and the
// weighted mean of one to three hits.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>

#include "interp/bilin.h"
#include "interp/meanw.h"
#include "interp/search.h"

namespace karnet {
namespace {

struct FourHits {
  std::int32_t j[kHitListSize];
  std::int32_t k[kHitListSize];
  float f[kHitListSize];
};

// Hits at the given offsets from (j, k), valued by the plane a + b*x + c*y.
FourHits planeHits(std::int32_t j, std::int32_t k, const std::int32_t (&offsets)[4][2], float a,
                   float b, float c) {
  FourHits h{};
  for (int i = 1; i <= 4; ++i) {
    h.j[i] = j + offsets[i - 1][0];
    h.k[i] = k + offsets[i - 1][1];
    h.f[i] = a + b * static_cast<float>(h.j[i]) + c * static_cast<float>(h.k[i]);
  }
  return h;
}

TEST(Bilin, FourNearestNeighboursGiveTheirMean) {
  const std::int32_t cross[4][2] = {{1, 0}, {0, 1}, {-1, 0}, {0, -1}};
  FourHits h{};
  const float values[4] = {4.0f, 8.0f, 1.0f, 3.0f};
  for (int i = 1; i <= 4; ++i) {
    h.j[i] = 10 + cross[i - 1][0];
    h.k[i] = 20 + cross[i - 1][1];
    h.f[i] = values[i - 1];
  }
  EXPECT_EQ(bilin(h.j, h.k, h.f, 10, 20), 4.0f);
}

TEST(Bilin, FourNearestNeighboursReproduceAPlaneExactly) {
  const std::int32_t cross[4][2] = {{1, 0}, {0, 1}, {-1, 0}, {0, -1}};
  const FourHits h = planeHits(6, 9, cross, 5.0f, 2.0f, -3.0f);
  EXPECT_EQ(bilin(h.j, h.k, h.f, 6, 9), 5.0f + 2.0f * 6.0f - 3.0f * 9.0f);
}

TEST(Bilin, ScatteredHitsReproduceAPlane) {
  // Hits anywhere in their quadrants: both directional estimates are exact for
  // a plane up to rounding.
  const std::int32_t layouts[][4][2] = {
      {{2, 1}, {-1, 3}, {-2, -1}, {1, -2}},
      {{5, 0}, {0, 2}, {-1, 0}, {0, -7}},
      {{1, 4}, {-3, 1}, {-4, -3}, {2, -1}},
      {{3, 3}, {0, 1}, {-2, 0}, {4, -4}},
  };
  for (const auto& layout : layouts) {
    const FourHits h = planeHits(30, 40, layout, 10.0f, 0.5f, -0.25f);
    const float expected = 10.0f + 0.5f * 30.0f - 0.25f * 40.0f;
    EXPECT_NEAR(bilin(h.j, h.k, h.f, 30, 40), expected, 1e-4f);
  }
}

TEST(Bilin, IsTheMeanOfTheColumnAndRowEstimates) {
  // Node (0, 0); P1 (2, 0) = 6, P2 (0, 2) = 2, P3 (-2, 0) = 0, P4 (0, -2) = 4.
  // Column j = 0 meets P1-P2 at P2 and P3-P4 at P4: estimate 3, the mean of
  // 2 and 4. Row k = 0 meets P2-P3 at P3 and P4-P1 at P1: estimate 3 as well.
  // With P1 = 10 instead the row estimate is 5 and the mean 4.
  FourHits h{};
  const std::int32_t pj[4] = {2, 0, -2, 0}, pk[4] = {0, 2, 0, -2};
  const float pf[4] = {10.0f, 2.0f, 0.0f, 4.0f};
  for (int i = 1; i <= 4; ++i) {
    h.j[i] = pj[i - 1];
    h.k[i] = pk[i - 1];
    h.f[i] = pf[i - 1];
  }
  EXPECT_EQ(bilin(h.j, h.k, h.f, 0, 0), 4.0f);
}

TEST(Bilin, EstimatesAreAddedInSinglePrecisionInOrder) {
  // Cross layout with f1 = 3, f2 = f4 = 2^24, f3 = 1: the column estimate is
  // 2^24, the row estimate fB = 1 plus the correction h = 1, all exact. The
  // sum (2^24 + 1) + 1 stays 2^24 in single precision, so the result is 2^23,
  // where the exact mean of the four values is 2^23 + 1.
  FourHits h{};
  const std::int32_t pj[4] = {1, 0, -1, 0}, pk[4] = {0, 1, 0, -1};
  const float pf[4] = {3.0f, 16777216.0f, 1.0f, 16777216.0f};
  for (int i = 1; i <= 4; ++i) {
    h.j[i] = pj[i - 1];
    h.k[i] = pk[i - 1];
    h.f[i] = pf[i - 1];
  }
  EXPECT_EQ(bilin(h.j, h.k, h.f, 0, 0), 8388608.0f);
}

TEST(Meanw, SingleHitKeepsItsValueWhateverTheWeight) {
  const float f[] = {0.0f, 0.123456f};
  const float half[] = {0.0f, 0.5f};
  EXPECT_EQ(meanw(f, half, 1), 0.123456f);
  const float third[] = {0.0f, static_cast<float>(1.0 / std::sqrt(8.0))};
  EXPECT_EQ(meanw(f, third, 1), 0.123456f);
}

TEST(Meanw, WeightsFavourTheNearerHit) {
  const float f[] = {0.0f, 1.0f, 4.0f};
  const float w[] = {0.0f, 1.0f, 0.5f};  // distances 1 and 2
  EXPECT_EQ(meanw(f, w, 2), 3.0f / 1.5f);
}

TEST(Meanw, SumsInIndexOrderInSinglePrecision) {
  // 1e8 + 1 is 1e8 in single precision, so the 1 is lost before -1e8 is added.
  const float f[] = {0.0f, 1e8f, 1.0f, -1e8f};
  const float w[] = {0.0f, 1.0f, 1.0f, 1.0f};
  EXPECT_EQ(meanw(f, w, 3), 0.0f);
  const float g[] = {0.0f, 1e8f, -1e8f, 1.0f};
  EXPECT_EQ(meanw(g, w, 3), 1.0f / 3.0f);
}

}  // namespace
}  // namespace karnet
