// Observation gridding in a process that holds only some levels of the basic
// grid: each held level must come out as in a process that holds them all.
#include <gtest/gtest.h>

#include <cstdint>
#include <random>
#include <vector>

#include "input/bathymetry_scan.h"
#include "input/level_share.h"
#include "interp/setadj.h"
#include "params/run_settings.h"
#include "state/basic_bed.h"
#include "state/run_state.h"

namespace karnet {
namespace {

constexpr double kLand = 10.0;
constexpr std::int32_t kNx = 9, kNy = 7;                 // the bathymetry (local grid)
constexpr std::int32_t kJOff = 1, kKOff = 2, kLOff = 2;  // its place in the basic grid
constexpr std::int32_t kNj = kNx + 3, kNk = kNy + 3, kNl = 12;

// A run of the same inputs in a process holding the basic levels `held`.
struct SlabRun {
  RunState state;
  RunSettings settings;

  SlabRun() {
    settings.l0 = 1;
    settings.lx = 8;
    settings.dz = 2.5f;
    settings.MaxExtrapolationDistance[0] = 5.0f;
    settings.MaxExtrapolationDistance[1] = 10.0f;
    state.landValue = kLand;
    state.bathymetryGrid.nj = kNx;
    state.bathymetryGrid.nk = kNy;
    grid2DAlloc(state.bathymetryGrid);
    // Beds from 3 m to 24 m deep, with a dry corner and a dry node inside.
    for (std::int32_t k = 0; k < kNy; ++k) {
      for (std::int32_t i = 0; i < kNx; ++i) {
        float bed = -3.0f - 2.5f * static_cast<float>((i * 3 + k * 5) % 9) - 0.7f * static_cast<float>(k);
        if ((i >= 7 && k >= 5) || (i == 3 && k == 3)) bed = static_cast<float>(kLand);
        state.bathymetryGrid.data[k * kNx + i] = bed;
      }
    }
  }
  ~SlabRun() { releaseAll(state); }

  void grid(const LevelRange& held, const std::vector<double>& obs) {
    state.basicLevels = kNl;
    state.window = LocalWindow{kJOff, kKOff, kLOff, settings.l0, settings.lx, settings.dz};
    for (FloatGrid3D* g : {&state.basicBathymetry, &state.basicValues}) {
      *g = FloatGrid3D{0, 0, held.first, kNj, kNk, held.count, 1, 1, 1,
                       std::int64_t{kNj} * kNk * held.count, nullptr};
      grid3DAlloc(*g);
    }
    const auto n = static_cast<std::int64_t>(obs.size() / 4);
    scatterDataAlloc(state.scatter, n);
    for (std::int64_t i = 0; i < n; ++i) {
      state.scatter.x[i] = obs[4 * i];
      state.scatter.y[i] = obs[4 * i + 1];
      state.scatter.z[i] = obs[4 * i + 2];
      state.scatter.value[i] = obs[4 * i + 3];
    }
    bathymetryScan(kJOff, kKOff, kLOff, state, settings);
    setadj(static_cast<std::int32_t>(n) - 1, state, settings);
  }
};

// Casts at random columns (some dry, some beyond the bathymetry), several
// observations sharing nodes, levels from below the bed to above the top.
std::vector<double> observations() {
  std::mt19937 random(7);
  std::uniform_real_distribution<double> x(0.0, kNj - 1.0), y(0.0, kNk - 1.0);
  std::uniform_real_distribution<double> value(2.0, 18.0);
  std::vector<double> obs;
  for (int cast = 0; cast < 40; ++cast) {
    const double cx = x(random), cy = y(random);
    const int from = static_cast<int>(random() % 6), to = from + static_cast<int>(random() % 7);
    for (int l = from; l <= to && l < kNl; l += 1 + static_cast<int>(random() % 3)) {
      obs.insert(obs.end(), {cx, cy, l + 0.3, value(random)});
      if (random() % 4 == 0) obs.insert(obs.end(), {cx + 0.1, cy, l - 0.2, value(random)});
    }
  }
  return obs;
}

TEST(SetadjSlabs, EveryHeldLevelAsInTheWholeGrid) {
  const std::vector<double> obs = observations();
  SlabRun whole;
  whole.grid(LevelRange{0, kNl}, obs);
  std::int64_t filled = 0;
  for (std::int64_t n = 0; n < whole.state.basicValues.total; ++n) {
    if (whole.state.basicValues.data[n] != kDeleteValueFloat) ++filled;
  }
  ASSERT_GT(filled, 150);  // the completion filled far more nodes than were binned

  for (int ranks : {2, 3, 5}) {
    for (int rank = 0; rank < ranks; ++rank) {
      SCOPED_TRACE(testing::Message() << rank << " of " << ranks);
      SlabRun part;
      const LevelRange held = shareBasicLevels(part.state, part.settings, kNl, kJOff, kKOff,
                                               kLOff, ranks, rank);
      part.grid(held, obs);
      for (std::int32_t l = held.first; l < held.end(); ++l) {
        for (std::int32_t k = 0; k < kNk; ++k) {
          for (std::int32_t j = 0; j < kNj; ++j) {
            ASSERT_EQ(part.state.basicValues.at(j, k, l), whole.state.basicValues.at(j, k, l))
                << "node " << j << ", " << k << ", " << l;
            ASSERT_EQ(part.state.basicBathymetry.at(j, k, l),
                      whole.state.basicBathymetry.at(j, k, l));
          }
        }
      }
    }
  }
}

TEST(SetadjSlabs, BedRuleOfOneNodeMatchesTheBathymetryScan) {
  SlabRun whole;
  whole.grid(LevelRange{0, kNl}, {});
  std::int64_t wet = 0;
  for (std::int32_t l = 0; l < kNl; ++l) {
    for (std::int32_t k = 0; k < kNk; ++k) {
      for (std::int32_t j = 0; j < kNj; ++j) {
        const float scanned = whole.state.basicBathymetry.at(j, k, l);
        EXPECT_EQ(basicBedAt(whole.state.bathymetryGrid, kLand, whole.state.window, j, k, l),
                  scanned);
        if (scanned != static_cast<float>(kLand)) ++wet;
      }
    }
  }
  // Wet nodes on every local level, none beyond the local grid's levels.
  EXPECT_GT(wet, 100);
  const std::vector<std::int64_t> perLevel =
      wetNodesPerLevel(whole.state.bathymetryGrid, kLand, whole.settings);
  std::int64_t counted = 0;
  for (std::int64_t n : perLevel) counted += n;
  EXPECT_EQ(counted, wet);
  EXPECT_EQ(perLevel.size(), 8u);
  EXPECT_EQ(perLevel.back(), kNx * kNy - 5);  // the top level: every water column
}

TEST(SetadjSlabs, LevelsSharedTopDownCoverTheLocalGrid) {
  SlabRun run;
  const LevelRange alone = shareBasicLevels(run.state, run.settings, kNl, kJOff, kKOff, kLOff, 1, 0);
  EXPECT_EQ(alone.first, 0);
  EXPECT_EQ(alone.count, kNl);

  shareBasicLevels(run.state, run.settings, kNl, kJOff, kKOff, kLOff, 3, 0);
  const std::vector<LevelRange>& blocks = run.state.levelOwners;
  ASSERT_EQ(blocks.size(), 3u);
  // Rank 0 ends at the local grid's top level, each next rank right below.
  EXPECT_EQ(blocks[0].end(), kLOff + 8);
  EXPECT_EQ(blocks[1].end(), blocks[0].first);
  EXPECT_EQ(blocks[2].end(), blocks[1].first);
  EXPECT_EQ(blocks[2].first, kLOff);
  // The upper levels hold more water, so the top block has no more levels.
  EXPECT_LE(blocks[0].count, blocks[2].count);
  EXPECT_EQ(run.state.basicLevels, kNl);
}

}  // namespace
}  // namespace karnet
