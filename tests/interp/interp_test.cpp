// The bilinear / distance-weighted analysis over whole run states: which nodes
// are filled and how, the layers and footprint it works on, smoothing, and the
// statistics block in the log.
#include "interp/interp.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

#include "interp/smooth_layer.h"
#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kEmpty;
using testing::kLand;
using testing::LogCapture;
using testing::Observation;
using testing::TestRun;

std::string statisticsBlock(int bilinear, int weighted, int none) {
  const std::string rule = "-------------------------------------------------\n";
  return "\n" + rule + "Statistics for local grid:\n\n" +
         "No. of bilinear interpolations          : " + std::to_string(bilinear) + "\n" +
         "No. of distance weighted interpolations : " + std::to_string(weighted) + "\n" +
         "No. of no interpolations                : " + std::to_string(none) + "\n" + rule + "\n";
}

TEST(Interp, FillsTheFootprintOfTheLocalLevelsAndCountsIt) {
  // One row of nj nodes on nl basic levels, node spacing 100.
  const float E = kEmpty, far = 1e5f;
  const struct {
    const char* what;
    std::int32_t nj, nl;
    std::vector<Observation> observations;
    std::vector<std::int32_t> dry;  // dry columns
    std::int32_t jOff, lOff, jx, l0, lx, filterOperations;
    float searchRadius;
    std::vector<float> expected;  // the basic grid before smoothing
    int weighted, none;           // counts in the statistics block (no bilinear ones)
  } cases[] = {
      // A binned observation in a dry node is data for its wet neighbours, then
      // removed; a dry node without data is neither interpolated nor counted.
      {"dry nodes emptied after serving as data", 4, 1, {{1, 0, 0, 5}}, {1, 3}, 0, 0, 3, 0, 0, 0,
       far, {5, E, 5, E}, 2, 0},
      {"reach is SearchRadius over dx", 4, 1, {{0, 0, 0, 5}}, {}, 0, 0, 3, 0, 0, 0, 150,
       {5, 5, E, E}, 1, 2},
      // Basic levels 0..3; local levels 5..6 sit at basic levels 1..2.
      {"only the local levels", 3, 4, {{0, 0, 0, 10}, {0, 0, 1, 20}, {0, 0, 2, 30}, {0, 0, 3, 40}},
       {}, 0, 1, 2, 5, 6, 0, far, {10, E, E, 20, 20, 20, 30, 30, 30, 40, E, E}, 4, 0},
      // Local footprint: columns 1..3 of 6; the whole layer is smoothed.
      {"the whole layer smoothed", 6, 1, {{0, 0, 0, 0}, {1, 0, 0, 12}}, {}, 1, 0, 2, 0, 0, 2, far,
       {0, 12, 12, 12, E, E}, 2, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    TestRun run(c.nj, 1, c.nl);
    for (std::int32_t j : c.dry) run.setBed(j, 0, kLand);
    run.settings.jx = c.jx;
    run.settings.l0 = c.l0;
    run.settings.lx = c.lx;
    run.settings.FilterOperations = c.filterOperations;
    run.settings.SearchRadius = c.searchRadius;
    run.settings.dx = 100.0f;
    LogCapture log;
    interp(run.observe(c.observations), c.jOff, 0, c.lOff, run.state, run.context());
    std::vector<float> expected = c.expected;
    for (int i = 0; i < c.filterOperations; ++i) smoothLayer(expected.data(), c.nj, 1);
    EXPECT_EQ(run.values(), expected);
    EXPECT_EQ(log.text(), statisticsBlock(0, c.weighted, c.none));
  }
}

TEST(Interp, EstimatesReadTheLayerAsItWasBeforeItsPass) {
  // 3 x 2 layer with data at (0, 0) = 0 and (2, 1) = 12.
  TestRun run(3, 2, 1);
  LogCapture log;
  interp(run.observe({{0, 0, 0, 0.0}, {2, 1, 0, 12.0}}), 0, 0, 0, run.state, run.context());
  const float diagonal = static_cast<float>(1.0 / std::sqrt(2.0));
  // (1, 0): Q1 (2, 1) diagonal, Q3 (0, 0) one away.
  const float n10 = (diagonal * 12.0f + 1.0f * 0.0f) / (diagonal + 1.0f);
  // (2, 0): Q2 (2, 1) one away, Q3 (0, 0) two away: (1, 0) beside it, filled
  // earlier in the pass, is not used.
  const float n20 = (1.0f * 12.0f + 0.5f * 0.0f) / (1.0f + 0.5f);
  // (0, 1): Q1 (2, 1) two away ((1, 1) is still empty), Q4 (0, 0) one away.
  const float n01 = (0.5f * 12.0f + 1.0f * 0.0f) / (0.5f + 1.0f);
  // (1, 1): Q1 (2, 1) one away, Q3 (0, 0) diagonal.
  const float n11 = (1.0f * 12.0f + diagonal * 0.0f) / (1.0f + diagonal);
  EXPECT_EQ(run.values(), (std::vector<float>{0.0f, n10, n20, n01, n11, 12.0f}));
  EXPECT_EQ(log.text(), statisticsBlock(0, 4, 0));
}

}  // namespace
}  // namespace karnet
