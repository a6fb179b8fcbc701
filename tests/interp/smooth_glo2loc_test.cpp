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

TEST(SmoothLayer, OneRowUsesNeighboursAlreadySmoothed) {
  std::vector<float> row = {0.0f, 0.0f, 12.0f};
  smoothLayer(row.data(), 3, 1);
  EXPECT_EQ(row, (std::vector<float>{0.0f, 3.0f, 9.75f}));
}

TEST(SmoothLayer, OneColumnBehavesLikeOneRow) {
  std::vector<float> column = {0.0f, 0.0f, 12.0f};
  smoothLayer(column.data(), 1, 3);
  EXPECT_EQ(column, (std::vector<float>{0.0f, 3.0f, 9.75f}));
}

TEST(SmoothLayer, VisitsColumnByColumn) {
  // 2 x 2 layer, (1, 0) = 12 and the rest 0, visited (0,0), (0,1), (1,0), (1,1).
  std::vector<float> layer = {0.0f, 12.0f, 0.0f, 0.0f};
  smoothLayer(layer.data(), 2, 2);
  const float v00 = (0.0f + 0.0f + 12.0f + 0.0f + 0.0f + 12.0f + 0.0f + 0.0f + 0.0f) / 12.0f;
  const float v01 = (v00 + v00 + 12.0f + 0.0f + 0.0f + 0.0f + 0.0f + 0.0f + 0.0f) / 12.0f;
  // (1, 0): below (1,0) itself, then (0,0), (1,0), (0,0), 4u, (1,0), (0,1), (1,1), (1,1).
  const float v10 = (12.0f + v00 + 12.0f + v00 + 48.0f + 12.0f + v01 + 0.0f + 0.0f) / 12.0f;
  const float v11 = (v10 + v00 + v10 + v01 + 0.0f + 0.0f + v01 + 0.0f + 0.0f) / 12.0f;
  EXPECT_EQ(layer, (std::vector<float>{v00, v10, v01, v11}));
}

TEST(SmoothLayer, SumsTheStencilInItsFixedOrder) {
  // Centre (1, 1) = 1 of a 3 x 3 layer; the nodes visited before it are empty
  // and count as 1. Its other neighbours: (2, 0) = 3, (2, 1) = 1e8,
  // (1, 2) = -1e8, (2, 2) = 0. The order decides what survives of the small terms.
  std::vector<float> layer(9, kEmpty);
  layer[1 * 3 + 1] = 1.0f;
  layer[0 * 3 + 2] = 3.0f;
  layer[1 * 3 + 2] = 1e8f;
  layer[2 * 3 + 1] = -1e8f;
  layer[2 * 3 + 2] = 0.0f;
  smoothLayer(layer.data(), 3, 3);
  // (1,0), (0,0), (2,0), (0,1), 4u, (2,1), (0,2), (1,2), (2,2)
  float sum = 1.0f;
  sum += 1.0f;
  sum += 3.0f;
  sum += 1.0f;
  sum += 4.0f;
  sum += 1e8f;
  sum += 1.0f;
  sum += -1e8f;
  sum += 0.0f;
  EXPECT_EQ(layer[1 * 3 + 1], sum / 12.0f);
  EXPECT_NE(layer[1 * 3 + 1], 11.0f / 12.0f);  // the exact mean would be 11/12
}

TEST(SmoothLayer, EmptyNeighboursCountAsTheCentre) {
  // A data node among empty nodes keeps its value; the empty nodes stay empty.
  std::vector<float> layer(5 * 4, kEmpty);
  layer[2 * 5 + 3] = 7.0f;
  layer[0] = -2.0f;  // in the corner, its clamped neighbours are itself or empty
  std::vector<float> before = layer;
  smoothLayer(layer.data(), 5, 4);
  EXPECT_EQ(layer, before);
}

TEST(SmoothLayer, UniformLayerStaysUniformAndHolesStayEmpty) {
  std::vector<float> layer(6 * 5, 2.5f);
  layer[7] = kEmpty;
  layer[20] = kEmpty;
  std::vector<float> before = layer;
  smoothLayer(layer.data(), 6, 5);
  EXPECT_EQ(layer, before);
}

TEST(SmoothLayer, EmptyShapeTouchesNothing) {
  std::vector<float> layer = {1.0f, 5.0f};
  smoothLayer(layer.data(), 0, 2);
  smoothLayer(layer.data(), 2, 0);
  smoothLayer(layer.data(), -1, 2);
  EXPECT_EQ(layer, (std::vector<float>{1.0f, 5.0f}));
}

TEST(SmoothLayer, OnlyTheGivenLayerIsRead) {
  // A layer of one row inside a larger buffer: the guard values around it
  // neither change nor enter the result.
  std::vector<float> buffer = {1000.0f, 0.0f, 0.0f, 12.0f, 1000.0f};
  smoothLayer(buffer.data() + 1, 3, 1);
  EXPECT_EQ(buffer, (std::vector<float>{1000.0f, 0.0f, 3.0f, 9.75f, 1000.0f}));
}

// Basic grid 6 x 5 x 7 whose nodes hold 10000*l + 100*k + j; local grid
// 3 x 2 x 4 with origin (0, 0, 2), cut out at basic node (2, 1, 3).
class Glo2loc : public ::testing::Test {
 protected:
  Glo2loc() : run(6, 5, 7) {
    for (std::int32_t l = 0; l < 7; ++l)
      for (std::int32_t k = 0; k < 5; ++k)
        for (std::int32_t j = 0; j < 6; ++j)
          run.state.basicValues.at(j, k, l) = static_cast<float>(10000 * l + 100 * k + j);
    run.state.basicValues.at(3, 2, 4) = kEmpty;
    FloatGrid3D& local = run.state.localValues;
    local.j0 = 0;
    local.k0 = 0;
    local.l0 = 2;
    local.nj = 3;
    local.nk = 2;
    local.nl = 4;
    local.total = 3 * 2 * 4;
    grid3DAlloc(local);
    grid3DFill(local, 123.0f);
    run.settings.jx = 2;
    run.settings.kx = 1;
    run.settings.l0 = 2;
    run.settings.lx = 5;
  }
  TestRun run;
};

TEST_F(Glo2loc, CopiesTheWindowFromItsFirstNode) {
  glo2loc(2, 1, 3, run.state, run.settings);
  const FloatGrid3D& local = run.state.localValues;
  EXPECT_EQ(local.data[0], 30000.0f + 100.0f + 2.0f);  // local (0, 0, 2) = basic (2, 1, 3)
  for (std::int32_t s = 0; s < 4; ++s) {
    for (std::int32_t q = 0; q < 2; ++q) {
      for (std::int32_t p = 0; p < 3; ++p) {
        const float expected = run.state.basicValues.at(2 + p, 1 + q, 3 + s);
        EXPECT_EQ(local.data[(s * 2 + q) * 3 + p], expected) << p << "," << q << "," << s;
        EXPECT_EQ(local.at(p, q, 2 + s), expected);
      }
    }
  }
  EXPECT_EQ(local.at(1, 1, 3), kEmpty);  // empty nodes are copied as they are
}

TEST_F(Glo2loc, WindowReachingPastTheBasicGridIsLeftEmptyThere) {
  // Not laid out this way by data scanning; the part outside is not read.
  glo2loc(4, 4, 5, run.state, run.settings);
  const FloatGrid3D& local = run.state.localValues;
  EXPECT_EQ(local.at(0, 0, 2), 50000.0f + 400.0f + 4.0f);
  EXPECT_EQ(local.at(1, 0, 3), 60000.0f + 400.0f + 5.0f);
  EXPECT_EQ(local.at(2, 0, 2), kEmpty);  // column 6
  EXPECT_EQ(local.at(0, 1, 2), kEmpty);  // row 5
  EXPECT_EQ(local.at(0, 0, 4), kEmpty);  // level 7
}

}  // namespace
}  // namespace karnet
