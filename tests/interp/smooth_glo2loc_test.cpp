// The in-place twelve-point layer smoother and the extraction of the local grid.
#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "interp/glo2loc.h"
#include "interp/smooth_layer.h"
#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using testing::TestRun;

TEST(SmoothLayer, SmoothsInPlaceColumnByColumn) {
  // 2 x 2 layer, (1, 0) = 12 and the rest 0, visited (0,0), (0,1), (1,0), (1,1).
  const float v00 = (0.0f + 0.0f + 12.0f + 0.0f + 0.0f + 12.0f + 0.0f + 0.0f + 0.0f) / 12.0f;
  const float v01 = (v00 + v00 + 12.0f + 0.0f + 0.0f + 0.0f + 0.0f + 0.0f + 0.0f) / 12.0f;
  // (1, 0): below (1,0) itself, then (0,0), (1,0), (0,0), 4u, (1,0), (0,1), (1,1), (1,1).
  const float v10 = (12.0f + v00 + 12.0f + v00 + 48.0f + 12.0f + v01 + 0.0f + 0.0f) / 12.0f;
  const float v11 = (v10 + v00 + v10 + v01 + 0.0f + 0.0f + v01 + 0.0f + 0.0f) / 12.0f;
  std::vector<float> isolated(5 * 4, kEmpty);  // holes stay empty
  isolated[2 * 5 + 3] = 7.0f;  // empty neighbours count as the centre
  isolated[0] = -2.0f;                // in the corner, its clamped neighbours are itself or empty
  const struct {
    std::int32_t nj, nk;
    std::vector<float> layer, expected;
  } cases[] = {
      {3, 1, {0, 0, 12}, {0, 3, 9.75f}},  // uses the neighbours already smoothed
      {1, 3, {0, 0, 12}, {0, 3, 9.75f}},
      {2, 2, {0, 12, 0, 0}, {v00, v10, v01, v11}},
      {5, 4, isolated, isolated},
      {0, 2, {1, 5}, {1, 5}},
  };
  for (const auto& c : cases) {
    // Guard values around the layer neither change nor enter the result.
    std::vector<float> buffer = c.layer;
    buffer.insert(buffer.begin(), 1e3f);
    buffer.push_back(1e3f);
    smoothLayer(buffer.data() + 1, c.nj, c.nk);
    EXPECT_EQ(std::vector<float>(buffer.begin() + 1, buffer.end() - 1), c.expected)
        << c.nj << "x" << c.nk;
    EXPECT_TRUE(buffer.front() == 1e3f && buffer.back() == 1e3f);
  }
}

TEST(SmoothLayer, SumsTheStencilInItsFixedOrder) {
  // Centre (1, 1) = 1 of a 3 x 3 layer, the nodes before it empty (counting
  // as 1); then (2, 0) = 3, (2, 1) = 1e8, (1, 2) = -1e8, (2, 2) = 0. Summed
  // (1,0), (0,0), (2,0), (0,1), 4u, (2,1), (0,2), (1,2), (2,2), this order
  // leaves 8 where the exact sum is 11.
  std::vector<float> layer = {kEmpty, kEmpty, 3.0f, kEmpty, 1.0f, 1e8f, kEmpty, -1e8f, 0.0f};
  smoothLayer(layer.data(), 3, 3);
  EXPECT_EQ(layer[4], 8.0f / 12.0f);
}

TEST(Glo2loc, CopiesTheWindowAtItsOffset) {
  // Basic grid 6 x 5 x 7 whose nodes hold 10000*l + 100*k + j; local grid
  // 3 x 2 x 4 with origin (0, 0, 2).
  TestRun run(6, 5, 7);
  for (std::int32_t i = 0; i < 6 * 5 * 7; ++i)
    run.state.basicValues.data[i] = float(10000 * (i / 30) + 100 * (i / 6 % 5) + i % 6);
  run.state.basicValues.at(3, 2, 4) = kEmpty;
  FloatGrid3D& local = run.state.localValues;
  local = FloatGrid3D{0, 0, 2, 3, 2, 4, 1, 1, 1, 3 * 2 * 4, nullptr};
  grid3DAlloc(local);
  run.settings.jx = 2;
  run.settings.kx = 1;
  run.settings.l0 = 2;
  run.settings.lx = 5;

  grid3DFill(local, 123.0f);
  glo2loc(2, 1, 3, run.state, run.settings);  // local (0, 0, 2) = basic (2, 1, 3)
  EXPECT_EQ(local.at(0, 0, 2), 30102.0f);
  EXPECT_EQ(local.at(2, 1, 5), 60204.0f);
  EXPECT_EQ(local.at(1, 1, 3), kEmpty);  // empty nodes are copied as they are
}

}  // namespace
}  // namespace karnet
