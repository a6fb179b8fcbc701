// The two estimators: the bilinear estimate from four quadrant hits and the
// weighted mean of one to three hits.
#include <gtest/gtest.h>

#include <cstdint>

#include "interp/bilin.h"
#include "interp/meanw.h"
#include "interp/search.h"

namespace karnet {
namespace {

using Offsets = std::int32_t[4][2];

// bilin at node (30, 40) with hits i = 1..4 at offsets[i - 1] valued f[i - 1].
float bilinAt(const Offsets& offsets, const float (&f)[4]) {
  std::int32_t jHit[kHitListSize] = {}, kHit[kHitListSize] = {};
  float fHit[kHitListSize] = {};
  for (int i = 1; i <= 4; ++i) {
    jHit[i] = 30 + offsets[i - 1][0];
    kHit[i] = 40 + offsets[i - 1][1];
    fHit[i] = f[i - 1];
  }
  return bilin(jHit, kHit, fHit, 30, 40);
}

TEST(Bilin, MeanOfTheColumnAndRowEstimatesInSinglePrecision) {
  // Column j = 0 meets P1-P2 at P2 and P3-P4 at P4: 3; row k = 0 meets P2-P3
  // at P3 and P4-P1 at P1: 5.
  EXPECT_EQ(bilinAt({{2, 0}, {0, 2}, {-2, 0}, {0, -2}}, {10, 2, 0, 4}), 4.0f);
  // Column estimate 2^24, row estimate 1 + correction 1: (2^24 + 1) + 1 stays
  // 2^24 in single precision, so 2^23 where the exact mean is 2^23 + 1.
  EXPECT_EQ(bilinAt({{1, 0}, {0, 1}, {-1, 0}, {0, -1}}, {3, 16777216.0f, 1, 16777216.0f}),
            8388608.0f);
}

TEST(Meanw, WeightedMeanSummedInIndexOrderInSinglePrecision) {
  // 1e8 + 1 is 1e8 in single precision: the 1 is lost unless added last.
  const float w[] = {0, 1, 1, 1}, lost[] = {0, 1e8f, 1, -1e8f}, kept[] = {0, 1e8f, -1e8f, 1};
  EXPECT_EQ(meanw(lost, w, 3), 0.0f);
  EXPECT_EQ(meanw(kept, w, 3), 1.0f / 3.0f);
}

}  // namespace
}  // namespace karnet
