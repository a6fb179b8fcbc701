// Shapiro and twelve-point filters on small fields with holes, worked by hand
// and against double-precision closed forms, and the filter choice and the
// clipping of the layer pass.
#include "analysis/filters.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <vector>

#include "analysis/objective_analysis.h"
#include "analysis_fixtures.h"
#include "common/closed_forms.h"

namespace karnet {
namespace {

using testing::kHole;
using testing::kHoleWide;

// A field of nj x nk floats, element k * nj + j.
struct Field {
  Field(std::int32_t nj_, std::int32_t nk_, float fill)
      : nj(nj_), nk(nk_), data(static_cast<std::size_t>(nj_ * nk_), fill) {}
  float& at(std::int32_t j, std::int32_t k) { return data[static_cast<std::size_t>(k * nj + j)]; }
  void shapiro() {
    std::vector<float> line(static_cast<std::size_t>(std::max(nj, nk)));
    shapiroFilter(data.data(), nj, nk, 8, kHoleWide, line.data());
  }
  void twelve() { twelvePointFilter(data.data(), nj, nk, kHoleWide); }
  std::int32_t nj, nk;
  std::vector<float> data;
};

TEST(ShapiroFilter, AlternatingRunsVanishInOneApplicationShortRunsStay) {
  // Rows alternate +a, -a along x; columns are constant. The column pass
  // leaves the field, the row pass removes the two-node wave.
  Field f(6, 3, 0.0f);
  for (std::int32_t i = 0; i < 18; ++i) f.data[i] = (i % 2 == 0) ? 2.5f : -2.5f;
  f.shapiro();
  EXPECT_EQ(f.data, std::vector<float>(18, 0.0f));
  // One column: a run of two, a hole, an alternating run of five, a hole, a
  // lone cell.
  Field column(1, 10, 0.0f);
  column.data = {4.0f, 9.0f, kHole, 1.0f, -1.0f, 1.0f, -1.0f, 1.0f, kHole, 7.0f};
  column.shapiro();
  EXPECT_EQ(column.data, (std::vector<float>{4, 9, kHole, 0, 0, 0, 0, 0, kHole, 7}));
}

TEST(TwelvePointFilter, ReadsTheUnfilteredFieldRepeatsEdgesAndFillsHoles) {
  // A spike of 12 in a zero field: 48 / 12 at the spike and 12 / 12 at each of
  // its eight neighbours, whatever order the nodes are visited in.
  Field f(5, 5, 0.0f);
  f.at(2, 2) = 12.0f;
  f.twelve();
  for (std::int32_t j = 0; j < 5; ++j) {
    for (std::int32_t k = 0; k < 5; ++k) {
      const bool near = j >= 1 && j <= 3 && k >= 1 && k <= 3;
      EXPECT_EQ(f.at(j, k), (j == 2 && k == 2) ? 4.0f : near ? 1.0f : 0.0f) << j << "," << k;
    }
  }
  // At a corner the edge repeats count the spike three more times:
  // (12 + 12 + 12 + 48) / 12; a hole neighbour counts as the centre.
  Field corner(3, 3, 0.0f);
  corner.at(0, 0) = 12.0f;
  corner.at(2, 2) = kHole;
  corner.at(1, 1) = 6.0f;
  corner.twelve();
  EXPECT_EQ(corner.at(0, 0), (36.0f + 48.0f + 6.0f) / 12.0f);
  EXPECT_EQ(corner.at(1, 1), (12.0f + 24.0f + 6.0f) / 12.0f);
  EXPECT_EQ(corner.at(2, 2), kHole);
}

constexpr float H = kHole;

// A 6 x 5 field with holes: runs of one to six cells along columns and rows,
// values far from any constant or alternating pattern.
const std::vector<float> kField = {
    3.0f, 7.5f,  -2.0f, 4.0f, 11.0f, H,     //
    1.0f, H,     6.0f,  9.5f, -4.0f, 2.0f,  //
    5.5f, 8.0f,  0.5f,  H,    3.0f,  12.0f, //
    H,    2.0f,  10.0f, 1.5f, 6.5f,  -1.0f, //
    4.5f, -3.0f, 7.0f,  5.0f, 0.0f,  8.5f};
constexpr int kNj = 6, kNk = 5;

reference::Field toReference(const std::vector<float>& field) {
  reference::Field f{kNj, kNk, {}, [](double v) { return v == kHoleWide; }};
  for (float v : field) f.v.push_back(v);
  return f;
}

void expectField(const std::vector<float>& actual, const reference::Field& expected) {
  for (std::size_t i = 0; i < actual.size(); ++i) {
    if (expected.hole(expected.v[i])) {
      EXPECT_EQ(actual[i], kHole) << "node " << i;
    } else {
      EXPECT_NEAR(actual[i], expected.v[i], 1e-5 * std::fabs(expected.v[i]) + 1e-5) << "node " << i;
    }
  }
}

TEST(FiltersClosedForm, ShapiroOperatorIsTheMirroredEighthPowerOfTheSecondDifference) {
  // A unit spike in a run of twelve: the 16th difference spreads binomial
  // weights that the mirrored ends fold back. Exact in single precision.
  for (const int at : {0, 3, 6, 11}) {
    std::vector<double> run(12, 0.0);
    run[static_cast<std::size_t>(at)] = 1.0;
    std::vector<float> buffer(run.begin(), run.end());
    shapiroOperator(buffer.data(), 11, 8);
    const std::vector<double> filtered = reference::shapiroRun(run, 8);
    for (std::size_t i = 0; i < run.size(); ++i) {
      // filtered = run - D^8 run / 65536
      EXPECT_EQ(buffer[i], (run[i] - filtered[i]) * 65536.0) << at << ": " << i;
    }
  }
}

// One basic layer analysed with SearchRadius 0: every data cell is estimated
// from itself alone (its own value, exactly, without an error term) and every
// other node fails, so the field that is smoothed and clipped is the data.
TEST(FiltersClosedForm, LayerPassSmoothsWithTheChosenFilterThenClips) {
  const struct {
    const char* what;
    std::int32_t filterType, operations;
    float minData, maxData;
  } cases[] = {
      {"Shapiro", 0, 1, -100, 100},
      {"twelve-point", 1, 1, -100, 100},
      {"Shapiro twice, clipped", 0, 2, 0.5f, 9.0f},
      {"twelve-point twice, clipped", 1, 2, 4.0f, 5.0f},
      {"no smoothing, clipped", 1, 0, -1.0f, 10.0f},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    std::vector<float> values = kField, bed(kField.size(), -10.0f);
    FloatGrid2D grid{0, 0, kNj, kNk, values.data()}, bedGrid{0, 0, kNj, kNk, bed.data()};
    const LayerAnalysisInput input{&bedGrid, 1e10, kHoleWide, 0, 0, 0};
    RunSettings s = testing::withLimit(4);
    s.jx = kNj - 1;
    s.kx = kNk - 1;
    s.SearchRadius = 0.0f;
    s.ErrorVariance = 0.0f;
    s.FilterType = c.filterType;
    s.FilterOperations = c.operations;
    s.MinData = c.minData;
    s.MaxData = c.maxData;
    OaWorkspace ws;
    std::int32_t failures = 0;
    const std::int32_t nData = countDataCells(grid, kHoleWide);
    EXPECT_EQ(analyseLayer(ws, grid, nData, input, 0, failures, s), nData);
    EXPECT_EQ(failures, kNj * kNk - nData);

    reference::Field expected = toReference(kField);
    for (int a = 0; a < c.operations; ++a) {
      if (c.filterType == 1) {
        reference::twelvePoint(expected);
      } else {
        reference::shapiro(expected, 8);
      }
    }
    int clipped = 0;
    for (double& v : expected.v) {
      if (expected.hole(v)) continue;
      clipped += v < c.minData || v > c.maxData;
      v = std::max<double>(std::min<double>(v, c.maxData), c.minData);
    }
    EXPECT_EQ(clipped > 0, c.minData > -100);
    expectField(values, expected);
  }
}

}  // namespace
}  // namespace karnet
