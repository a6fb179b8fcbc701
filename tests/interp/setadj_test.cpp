// Observation gridding: binning, averaging and the vertical completion of the
// water columns.
#include "interp/setadj.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using testing::kLand;
using testing::Observation;
using testing::TestRun;

TEST(Setadj, BinsToTheNearestNodeAndAveragesSharedNodes) {
  const struct {
    const char* what;
    std::int32_t nj, nk, nl;
    std::vector<Observation> observations;
    std::vector<Observation> expected;  // (j, k, l, value) of every node holding data afterwards
  } cases[] = {
      {"halves round up", 8, 2, 1, {{4.5, 0, 0, 7}, {4.49, 1, 0.2, 3}},
       {{5, 0, 0, 7}, {4, 1, 0, 3}}},
      {"shared nodes averaged", 4, 4, 1,
       {{2.2, 0.9, 0.1, 1}, {1.6, 1.4, -0.3, 2}, {2.49, 1.49, 0.49, 4}, {0, 0, 0, 10}},
       {{0, 0, 0, 10}, {2, 1, 0, 7.0f / 3.0f}}},
      // 2^24 + 1 is not a float; added in double to 1.0f it gives 2^24 + 2, which is.
      {"sum in double, rounded at each step", 1, 1, 1, {{0, 0, 0, 1}, {0, 0, 0, 16777217.0}},
       {{0, 0, 0, 16777218.0f / 2.0f}}},
      {"outside the basic grid skipped", 3, 3, 2,
       {{-2, 1, 0, 9}, {1, 3.6, 0, 9}, {1, 1, 7, 9}, {1, 1, 1, 4}}, {{1, 1, 1, 4}}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    TestRun run(c.nj, c.nk, c.nl);
    grid3DFill(run.state.basicValues, 5.0f);  // stale content is discarded
    setadj(run.observe(c.observations), run.state, run.settings);
    std::vector<float> expected(static_cast<std::size_t>(run.state.basicValues.total), kEmpty);
    for (const Observation& n : c.expected)
      expected[run.state.basicValues.index(int(n.x), int(n.y), int(n.z))] = float(n.value);
    EXPECT_EQ(run.values(), expected);
  }
}

TEST(Setadj, ClosesGapsAndExtendsColumnsWithinTheirLimits) {
  // A single column. Level l lies at (l - lx - 1) * dz; a column wet from level
  // `wetFrom` holds its bed elevation there, landValue below.
  const float E = kEmpty, v = -1.25f;
  const struct {
    const char* what;
    std::int32_t nl, wetFrom, lx;
    float dz, bed, maxUp, maxDown;
    std::vector<Observation> observations;
    std::vector<float> expected;
  } cases[] = {
      {"a zero value is data", 3, 0, 2, 1, -100, 0, 0, {{0, 0, 0, 0}, {0, 0, 2, 6}}, {0, 3, 6}},
      {"several gaps", 9, 0, 8, 1, -100, 0, 0,
       {{0, 0, 0, 2}, {0, 0, 1, 4}, {0, 0, 3, 8}, {0, 0, 8, 3}},
       {2, 4, 6, 8, 0.2f * 3 + 0.8f * 8, 0.4f * 3 + 0.6f * 8, 0.6f * 3 + 0.4f * 8,
        0.8f * 3 + 0.2f * 8, 3}},
      // Six levels at -6 .. -1 above a bed at -6.5: the top lies 5.5 above it.
      {"up: top close enough above the bed", 6, 0, 5, 1, -6.5f, 5.6f, 0, {{0, 0, 2, v}},
       {E, E, v, v, v, v}},
      {"up: the bound is strict", 6, 0, 5, 1, -6.5f, 5.5f, 0, {{0, 0, 2, v}}, {E, E, v, E, E, E}},
      {"up: judged on the top level, not the data", 6, 0, 5, 1, -6.5f, 2, 0, {{0, 0, 4, v}},
       {E, E, E, E, v, E}},
      // With lx = 3 and dz = 2 the top level 5 is at +2, 7 above a bed at -5.
      {"up: heights follow the local top level", 6, 0, 3, 2, -5, 7.5f, 0, {{0, 0, 3, v}},
       {E, E, E, v, v, v}},
      // Twelve levels at -12 .. -1, wet from level 6 above a bed at -6.5: data
      // at level 8 (height -4) lie 2.5 above the bed.
      {"down: truncated level count, trunc(6 - 2.6)", 12, 6, 11, 1, -6.5f, 0, 2.6f, {{0, 0, 8, v}},
       {E, E, E, v, v, v, v, v, v, E, E, E}},
      {"down: stops at the bottom", 12, 6, 11, 1, -6.5f, 0, 20, {{0, 0, 8, v}},
       {v, v, v, v, v, v, v, v, v, E, E, E}},
      {"down: data too high above the bed", 12, 6, 11, 1, -6.5f, 0, 2.5f, {{0, 0, 8, v}},
       {E, E, E, E, E, E, E, E, v, E, E, E}},
      // Data in the bed: its height above the bed is measured against landValue
      // and passes; it extends from its own level, trunc(4 - 1.5).
      {"down: data below the bed", 12, 6, 11, 1, -6.5f, 0, 1.5f, {{0, 0, 4, v}},
       {E, E, v, v, v, E, E, E, E, E, E, E}},
      // All dry: the top's height above the "bed" passes the upward test even at 0.
      {"dry column, trunc(5 - 2.5)", 8, 8, 7, 1, 0, 0, 2.5f, {{0, 0, 5, v}},
       {E, E, v, v, v, v, v, v}},
      // Both ways in one column, each judged by its own limit: wet from level 3
      // above a bed at -9.5, data 3.5 above it (level 6) and at level 8; the
      // top lies 8.5 above the bed.
      {"both ways, each within its limit", 12, 3, 11, 1, -9.5f, 9, 4,
       {{0, 0, 6, 4}, {0, 0, 8, 12}}, {4, 4, 4, 4, 4, 4, 4, 8, 12, 12, 12, 12}},
      {"up within its limit, down beyond its own", 12, 3, 11, 1, -9.5f, 8.6f, 3.4f,
       {{0, 0, 6, 4}, {0, 0, 8, 12}}, {E, E, E, E, E, E, 4, 8, 12, 12, 12, 12}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    TestRun run(1, 1, c.nl, static_cast<float>(kLand));
    run.setBed(0, 0, c.bed, c.wetFrom);
    run.settings.lx = c.lx;
    run.settings.dz = c.dz;
    run.settings.MaxExtrapolationDistance[0] = c.maxUp;
    run.settings.MaxExtrapolationDistance[1] = c.maxDown;
    setadj(run.observe(c.observations), run.state, run.settings);
    EXPECT_EQ(run.values(), c.expected);
  }
}

}  // namespace
}  // namespace karnet
