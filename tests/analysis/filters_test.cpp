// Shapiro and twelve-point filters on small fields with holes.
#include "analysis/filters.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "analysis_fixtures.h"

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

}  // namespace
}  // namespace karnet
