// Leave-one-cast-out cross-validation on small gridded fields.
#include "analysis/cross_validation.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <vector>

#include "analysis/objan.h"
#include "analysis/select_data.h"
#include "analysis_fixtures.h"
#include "interp/interp_fixture.h"

namespace karnet {
namespace {

using testing::kHole;
using testing::kHoleWide;
using testing::kLand;

// A basic grid of nj x nk x nl nodes, all wet and empty until set; the
// footprint is the whole grid unless narrowed.
struct Field {
  Field(std::int32_t nj, std::int32_t nk, std::int32_t nl)
      : values(static_cast<std::size_t>(nj * nk * nl), kHole),
        bed(values.size(), -10.0f),
        settings(testing::withLimit(8)) {
    for (FloatGrid3D* g : {&valueGrid, &bedGrid}) {
      g->nj = nj;
      g->nk = nk;
      g->nl = nl;
      g->total = std::int64_t{nj} * nk * nl;
    }
    valueGrid.data = values.data();
    bedGrid.data = bed.data();
    settings.jx = nj - 1;
    settings.kx = nk - 1;
    settings.lx = nl - 1;
    input.values = &valueGrid;
    input.bathymetry = &bedGrid;
    input.landValue = kLand;
    input.deleteValue = kHoleWide;
  }
  std::size_t at(std::int32_t j, std::int32_t k, std::int32_t l) const {
    return static_cast<std::size_t>((l * valueGrid.nk + k) * valueGrid.nj + j);
  }
  void cast(std::int32_t j, std::int32_t k, std::vector<float> levels) {
    for (std::size_t l = 0; l < levels.size(); ++l) {
      values[at(j, k, static_cast<std::int32_t>(l))] = levels[l];
    }
  }
  std::vector<CvResult> run(const std::vector<RunSettings>& trials, std::int32_t threads = 1) {
    return crossValidate(input, trials, threads);
  }
  std::vector<float> values, bed;
  FloatGrid3D valueGrid, bedGrid;
  CvInput input;
  RunSettings settings;
};

TEST(CrossValidation, EachCastIsEstimatedFromTheOthersAlone) {
  // With one cell per estimate the estimate is the best-correlated other
  // cast's value: here the nearest one within the search radius.
  Field f(20, 10, 1);
  f.settings.CorrelationSampleSize = 1;
  f.settings.SearchRadius = 6.0f;
  f.cast(2, 5, {1.0f});   // A: nearest other is B
  f.cast(4, 5, {2.0f});   // B: nearest other is A
  f.cast(9, 5, {4.5f});   // C: nearest other is B, 5 nodes off
  f.cast(18, 0, {9.0f});  // D: nothing within reach
  const CvResult r = f.run({f.settings}).front();
  const double diffs[] = {2.0 - 1.0, 1.0 - 2.0, 2.0 - 4.5};
  double square = 0.0, sum = 0.0;
  for (double d : diffs) {
    square += d * d;
    sum += d;
  }
  ASSERT_EQ(r.levels.size(), 1u);
  EXPECT_EQ(r.overall.nodes, 3);
  EXPECT_EQ(r.overall.missed, 1);
  EXPECT_DOUBLE_EQ(r.overall.rms(), std::sqrt(square / 3.0));
  EXPECT_DOUBLE_EQ(r.overall.bias(), sum / 3.0);
  EXPECT_EQ(countValidatedCasts(f.input, f.settings), 4);

  // The estimates are clipped as the analysis clips them.
  f.settings.MaxData = 1.5f;
  const CvResult clipped = f.run({f.settings}).front();
  EXPECT_DOUBLE_EQ(clipped.overall.bias(), ((1.5 - 1.0) + (1.0 - 2.0) + (1.5 - 4.5)) / 3.0);
}

TEST(CrossValidation, OnlyWetFootprintNodesAreComparedButEveryCellServesAsData) {
  Field f(12, 10, 2);
  f.settings.CorrelationSampleSize = 1;
  f.settings.jx = 7;  // footprint j = 2 .. 9
  f.input.jOff = 2;
  f.cast(1, 4, {3.0f, 30.0f});  // outside the footprint: data only
  f.cast(3, 4, {4.0f, 40.0f});
  f.cast(6, 4, {6.0f, 60.0f});
  f.bed[f.at(6, 4, 1)] = kLand;  // C's lower node is dry there
  const CvResult r = f.run({f.settings}).front();
  // Level 0: B from the outside cast (3 - 4), C from B (4 - 6).
  EXPECT_EQ(r.levels[0].nodes, 2);
  EXPECT_DOUBLE_EQ(r.levels[0].bias(), ((3.0 - 4.0) + (4.0 - 6.0)) / 2.0);
  // Level 1: only B; its dry neighbour still serves as data but is the farther one.
  EXPECT_EQ(r.levels[1].nodes, 1);
  EXPECT_DOUBLE_EQ(r.levels[1].bias(), 30.0 - 40.0);
  EXPECT_EQ(r.overall.nodes, 3);
  EXPECT_EQ(countValidatedCasts(f.input, f.settings), 2);
}

// The estimate at (j, k, l) from a workspace set up afresh with every data
// cell of the layer but the node's own, clipped.
bool referenceEstimate(const Field& f, const RunSettings& s, std::int32_t j, std::int32_t k,
                       std::int32_t l, float& estimate) {
  std::vector<std::array<float, 3>> cells;
  for (std::int32_t x = 0; x < f.valueGrid.nj; ++x) {
    for (std::int32_t y = 0; y < f.valueGrid.nk; ++y) {
      const float v = f.values[f.at(x, y, l)];
      if (v == kHole || (x == j && y == k)) continue;
      cells.push_back({static_cast<float>(x), static_cast<float>(y), v});
    }
  }
  testing::ScopedWorkspace scoped(static_cast<std::int32_t>(cells.size()), f.valueGrid.nj,
                                  f.valueGrid.nk, s);
  scoped.setCells(cells);
  const std::int32_t m = selectData(scoped.ws, j, k, s);
  if (OBJAN(scoped.ws, m, &estimate, s) != 0) return false;
  if (estimate > s.MaxData) estimate = s.MaxData;
  if (s.MinData > estimate) estimate = s.MinData;
  return true;
}

TEST(CrossValidation, MatchesFreshEstimatesForEveryTrialWhateverTheThreads) {
  Field f(16, 14, 3);
  f.settings.SearchRadius = 7.0f;
  f.settings.CorrelationSampleSize = 4;
  // Casts of uneven depth; their values vary with position and level.
  // Every second column, rows staggered: several casts within reach of each.
  std::vector<std::array<std::int32_t, 2>> positions;
  for (std::int32_t j = 0; j < 16; j += 2) {
    for (std::int32_t k = (j * 3) % 4; k < 14; k += 4) positions.push_back({j + k % 3 / 2, k});
  }
  for (const auto& p : positions) {
    const float base = 0.37f * static_cast<float>(p[0]) - 0.21f * static_cast<float>(p[1]);
    f.cast(p[0], p[1], {base + 5.0f, base + 3.0f, base});
  }
  f.values[f.at(positions[5][0], positions[5][1], 2)] = kHole;  // a cast ending a level early
  std::vector<RunSettings> trials;
  for (float decay : {2.0f, 4.0f}) {
    for (float error : {1.0f, 30.0f}) {
      trials.push_back(f.settings);
      trials.back().DecayDistance = decay;
      trials.back().ErrorVariance = error;
    }
  }
  // A short reach: the selection visits only the columns next to the node.
  trials.push_back(f.settings);
  trials.back().SearchRadius = 3.0f;
  const std::vector<CvResult> one = f.run(trials, 1);
  const std::vector<CvResult> three = f.run(trials, 3);
  ASSERT_EQ(one.size(), trials.size());
  for (std::size_t t = 0; t < trials.size(); ++t) {
    SCOPED_TRACE(t);
    CvStats total;
    for (std::int32_t l = 0; l < 3; ++l) {
      CvStats expected;
      for (const auto& p : positions) {
        if (f.values[f.at(p[0], p[1], l)] == kHole) continue;
        float estimate = 0.0f;
        if (!referenceEstimate(f, trials[t], p[0], p[1], l, estimate)) {
          ++expected.missed;
          continue;
        }
        const double d = static_cast<double>(estimate) - f.values[f.at(p[0], p[1], l)];
        ++expected.nodes;
        expected.sumDifference += d;
        expected.sumSquare += d * d;
      }
      const CvStats& got = one[t].levels[static_cast<std::size_t>(l)];
      EXPECT_EQ(got.nodes, expected.nodes);
      EXPECT_EQ(got.missed, expected.missed);
      EXPECT_DOUBLE_EQ(got.sumSquare, expected.sumSquare);
      EXPECT_DOUBLE_EQ(got.sumDifference, expected.sumDifference);
      total.add(got);
    }
    EXPECT_EQ(one[t].overall.nodes, total.nodes);
    EXPECT_DOUBLE_EQ(one[t].overall.sumSquare, total.sumSquare);
    // The threads share the work, not the result.
    EXPECT_EQ(three[t].overall.sumSquare, one[t].overall.sumSquare);
    EXPECT_EQ(three[t].overall.sumDifference, one[t].overall.sumDifference);
  }
  // The trials do differ.
  EXPECT_NE(one[0].overall.sumSquare, one[3].overall.sumSquare);
}

}  // namespace
}  // namespace karnet
