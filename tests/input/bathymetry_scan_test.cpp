// The wet/dry field: which nodes of each water column lie above the bed.
#include <gtest/gtest.h>

#include "input/bathymetry_scan.h"
#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {
namespace {

class BathymetryScan : public testing::Test {
 protected:
  // A bathymetry of nx x ny columns inside a basic grid with two spare nodes on each side.
  void build(const std::vector<float>& beds, int nx, int ny, int l0, int lx, float dz,
             double land, int lOff = 1) {
    settings.l0 = l0;
    settings.lx = lx;
    settings.dz = dz;
    state.landValue = land;
    state.bathymetryGrid.nj = nx;
    state.bathymetryGrid.nk = ny;
    grid2DAlloc(state.bathymetryGrid);
    std::copy(beds.begin(), beds.end(), state.bathymetryGrid.data);
    FloatGrid3D& b = state.basicBathymetry;
    b.nj = nx + 4;
    b.nk = ny + 4;
    b.nl = lx - l0 + 1 + lOff + 1;
    b.total = std::int64_t{b.nj} * b.nk * b.nl;
    grid3DAlloc(b);
    this->lOff = lOff;
    bathymetryScan(2, 2, lOff, state, settings);
  }
  ~BathymetryScan() override {
    grid2DFree(state.bathymetryGrid);
    grid3DFree(state.basicBathymetry);
  }
  // The node of column (i, j) at local level l.
  float node(int i, int j, int l) const {
    return state.basicBathymetry.at(i + 2, j + 2, l - settings.l0 + lOff);
  }

  RunState state;
  RunSettings settings;
  int lOff = 0;
};

TEST_F(BathymetryScan, WetLevelsStopAboveTheBed) {
  build({-4.5f, -0.3f, 10.0f, -4.0f}, 2, 2, 0, 9, 1.0f, 10.0);
  // Bed at -4.5: levels 9..6 (heights -1..-4) wet, level 5 (-5) and below dry.
  for (int l = 0; l <= 9; ++l) {
    EXPECT_EQ(node(0, 0, l), l >= 6 ? -4.5f : 10.0f) << "level " << l;
  }
  // A column shallower than one level is wet at the top level only.
  EXPECT_EQ(node(1, 0, 9), -0.3f);
  EXPECT_EQ(node(1, 0, 8), 10.0f);
  // The land value itself is land everywhere, even at the top.
  for (int l = 0; l <= 9; ++l) EXPECT_EQ(node(0, 1, l), 10.0f);
  // A level exactly at the bed is dry.
  EXPECT_EQ(node(1, 1, 7), -4.0f);
  EXPECT_EQ(node(1, 1, 6), 10.0f);
}

TEST_F(BathymetryScan, OutsideTheFootprintAndLevelsStaysLand) {
  build({-50.0f, -50.0f}, 2, 1, 3, 6, 2.0f, 10.0, 2);
  const FloatGrid3D& b = state.basicBathymetry;
  int wet = 0;
  for (std::int64_t n = 0; n < b.total; ++n) {
    if (b.data[n] != 10.0f) ++wet;
  }
  EXPECT_EQ(wet, 2 * 4);  // two columns, four local levels
  // Local levels 3..6 lie on basic levels 2..5.
  EXPECT_EQ(b.at(2, 2, 2), -50.0f);
  EXPECT_EQ(b.at(2, 2, 5), -50.0f);
  EXPECT_EQ(b.at(2, 2, 1), 10.0f);
  EXPECT_EQ(b.at(2, 2, 6), 10.0f);
}

TEST_F(BathymetryScan, WithoutALandValueEveryNegativeBedIsWater) {
  const double land = static_cast<double>(-1e-30f);
  build({-3.0f, 0.0f, 2.0f, -1e-31f}, 4, 1, 0, 4, 1.0f, land);
  EXPECT_EQ(node(0, 0, 4), -3.0f);
  EXPECT_EQ(node(1, 0, 4), static_cast<float>(land));
  EXPECT_EQ(node(2, 0, 4), static_cast<float>(land));
  // Barely below zero but above -1e-30: land.
  EXPECT_EQ(node(3, 0, 4), static_cast<float>(land));
}

}  // namespace
}  // namespace karnet
