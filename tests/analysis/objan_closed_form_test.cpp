// The optimal-interpolation numerics against double-precision closed forms:
// the correlation model, the weighted mean, the inverted correlation matrix
// and the estimate itself, on two- and three-cell problems.
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "analysis/correlation.h"
#include "analysis/objan.h"
#include "analysis/row_sums.h"
#include "analysis/select_data.h"
#include "analysis_fixtures.h"
#include "common/closed_forms.h"

namespace karnet {
namespace {

using testing::ScopedWorkspace;

// Node spacing 250 m, decay length 500 m and zero crossing 1250 m: 2 and 5
// nodes, so the cut-off lies beyond a squared distance of 80 * 2^2 = 320.
constexpr double kD = 2.0, kZ = 5.0;

RunSettings settings250(std::int32_t limit, float errorVariance) {
  RunSettings s = testing::withLimit(limit);
  s.dx = s.dy = 250.0f;
  s.DecayDistance = 500.0f;
  s.ZeroCrossingDistance = 1250.0f;
  s.SearchRadius = 1e6f;
  s.ErrorVariance = errorVariance;
  return s;
}

// Agreement within float32 rounding: relative 1e-5, absolute 1e-6 near zero.
void expectClose(double actual, double expected, const char* what) {
  EXPECT_NEAR(actual, expected, 1e-5 * std::fabs(expected) + 1e-6) << what;
}

TEST(ObjanClosedForm, CorrelationAtNodeDistances) {
  const RunSettings s = settings250(4, 0);
  ScopedWorkspace w(0, 30, 30, s);
  // Near, at the zero crossing, beyond it (negative), at and just beyond the
  // cut-off, and far beyond.
  for (const float d2 : {0.0f, 1.0f, 2.0f, 5.0f, 8.0f, 13.0f, 24.5f, 25.0f, 40.0f, 100.0f, 320.0f,
                         320.5f, 800.0f}) {
    const double expected = reference::correlation(d2, kD, kZ);
    EXPECT_NEAR(correlation(d2, w.ws), expected, 1e-6 * std::fabs(expected) + 1e-30) << d2;
    EXPECT_NEAR(tabledCorrelation(d2, w.ws), expected, 1e-6 * std::fabs(expected) + 1e-30) << d2;
  }
  EXPECT_LT(correlation(40.0f, w.ws), 0.0f);
  EXPECT_EQ(correlation(320.5f, w.ws), 0.0f);
}

TEST(ObjanClosedForm, RemoveWeightedMeanDividesByTheSumOfAllEntries) {
  // An arbitrary 3 x 3 block in a stride-4 matrix: mean = sum_ij a_ij v_j / sum_ij a_ij.
  const RunSettings s = settings250(4, 0);
  ScopedWorkspace w(0, 1, 1, s);
  const double a[3][3] = {{1.5, -0.25, 0.5}, {0.75, 2.0, -1.0}, {0.1, 0.3, 0.9}};
  const double v[3] = {4.0, -3.0, 10.0};
  float values[3];
  double total = 0, weighted = 0;
  for (int i = 0; i < 3; ++i) {
    values[i] = static_cast<float>(v[i]);
    for (int j = 0; j < 3; ++j) {
      w.ws.matrix[i * 4 + j] = static_cast<float>(a[i][j]);
      total += a[i][j];
      weighted += a[i][j] * v[j];
    }
    w.ws.matrix[i * 4 + 3] = 1e6f;  // outside the block: never read
  }
  float mean = 0, weightSum = 0;
  removeWeightedMean(w.ws, w.ws.matrix, values, 3, mean, weightSum);
  expectClose(mean, weighted / total, "mean");
  expectClose(weightSum, total, "weight sum");
  for (int i = 0; i < 3; ++i) expectClose(values[i], v[i] - weighted / total, "value");
}

TEST(ObjanClosedForm, CorrelationMatrixIsInvertedWithTheErrorTermOnItsDiagonal) {
  // Cells at (0, 0), (1, 2), (4, 0): the inverse times the matrix built in
  // double precision is the identity.
  const double x[3] = {0, 1, 4}, y[3] = {0, 2, 0};
  for (const float errorVariance : {0.0f, 10.0f, 40.0f}) {
    const RunSettings s = settings250(5, errorVariance);
    ScopedWorkspace w(0, 1, 1, s);
    for (int i = 0; i < 3; ++i) {
      w.ws.selX[i] = static_cast<float>(x[i]);
      w.ws.selY[i] = static_cast<float>(y[i]);
    }
    ASSERT_EQ(buildCorrelationMatrix(w.ws, 3, s), 0);
    for (int i = 0; i < 3; ++i) {
      for (int j = 0; j < 3; ++j) {
        double product = 0;
        for (int q = 0; q < 3; ++q) {
          const double r2 = (x[q] - x[j]) * (x[q] - x[j]) + (y[q] - y[j]) * (y[q] - y[j]);
          const double c = reference::correlation(r2, kD, kZ) + (q == j ? errorVariance / 100 : 0);
          product += w.ws.matrix[i * 5 + q] * c;
        }
        EXPECT_NEAR(product, i == j ? 1.0 : 0.0, 1e-5) << errorVariance << ": " << i << j;
      }
    }
  }
}

TEST(ObjanClosedForm, VectorFillGivesTheBitsOfTheEntryByEntryFill) {
  // Blocks of 1 to 40 cells (rows of several vectors with a partial last one),
  // strides with and without room beyond the block, positions whose squared
  // distances fall inside and beyond a deliberately small table (nodes 1 x 6:
  // the table ends at 26) and off the whole nodes, and a zero crossing of 0,
  // which makes the diagonal not a number.
  std::mt19937 random(31);
  std::uniform_int_distribution<int> node(0, 9);
  for (int trial = 0; trial < 120; ++trial) {
    const std::int32_t m = 1 + trial % 40;
    RunSettings s = settings250(m + (trial / 40) * 5, 10.0f);
    if (trial % 7 == 3) s.ZeroCrossingDistance = 0.0f;
    ScopedWorkspace vector(0, 1, 6, s), plain(0, 1, 6, s);
    for (std::int32_t i = 0; i < m; ++i) {
      const float off = trial % 5 == 0 && i % 3 == 0 ? 0.5f : 0.0f;
      vector.ws.selX[i] = plain.ws.selX[i] = static_cast<float>(node(random)) + off;
      vector.ws.selY[i] = plain.ws.selY[i] = static_cast<float>(node(random));
    }
    fillCorrelationMatrix(vector.ws, m, s, true);
    fillCorrelationMatrix(plain.ws, m, s, false);
    for (std::int32_t i = 0; i < m; ++i) {
      ASSERT_EQ(std::memcmp(vector.ws.matrix + i * s.CorrelationSampleSize,
                            plain.ws.matrix + i * s.CorrelationSampleSize, m * sizeof(float)),
                0)
          << "trial " << trial << " row " << i;
    }
  }
}

TEST(ObjanClosedForm, RowSumsAreEachRowsSumInColumnOrder) {
  // Blocks of 1 to 40 rows (several blocks of rows side by side, a partial
  // last one), strides beyond the columns, entries of all magnitudes and signs
  // (where the order of additions shows in the bits), a not-a-number and an
  // infinity among them.
  std::mt19937 random(8);
  std::uniform_real_distribution<float> entry(-1.0f, 1.0f);
  std::uniform_int_distribution<int> scale(-30, 30);
  for (int trial = 0; trial < 160; ++trial) {
    const std::int32_t rows = 1 + trial % 40;
    const std::int32_t columns = trial % 3 == 0 ? rows : 1 + (trial * 7) % 40;
    const std::int64_t stride = columns + trial % 4;
    std::vector<float> a(static_cast<std::size_t>(rows * stride));
    std::vector<float> values(static_cast<std::size_t>(columns));
    for (float& x : a) x = std::ldexp(entry(random), scale(random));
    for (float& x : values) x = std::ldexp(entry(random), scale(random));
    if (trial % 11 == 5) a[a.size() / 2] = std::nanf("");
    if (trial % 13 == 7) values[0] = INFINITY;
    std::vector<float> sums(static_cast<std::size_t>(rows)), products(sums.size());
    std::vector<double> dsums(sums.size()), dproducts(sums.size());
    floatRowSums(a.data(), stride, values.data(), rows, columns, sums.data(), products.data());
    std::vector<float> alone(sums.size());  // products without the sums
    floatRowSums(a.data(), stride, values.data(), rows, columns, nullptr, alone.data());
    EXPECT_EQ(std::memcmp(alone.data(), products.data(), alone.size() * 4), 0) << trial;
    doubleRowSums(a.data(), stride, values.data(), rows, columns, dproducts.data(), dsums.data());
    // The same matrix stored by column (with a longer column stride), through the
    // vector body and the plain one, products and sums together and alone.
    const std::int64_t columnStride = rows + trial % 3;
    std::vector<float> aT(static_cast<std::size_t>(columns * columnStride), -1.0f);
    for (std::int32_t i = 0; i < rows; ++i) {
      for (std::int32_t j = 0; j < columns; ++j) {
        aT[static_cast<std::size_t>(j * columnStride + i)] = a[static_cast<std::size_t>(i * stride + j)];
      }
    }
    for (const bool vectorised : {true, false}) {
      std::vector<double> cproducts(sums.size()), csums(sums.size());
      std::vector<double> cproductsAlone(sums.size()), csumsAlone(sums.size());
      doubleColumnSums(aT.data(), columnStride, values.data(), rows, columns, cproducts.data(),
                       csums.data(), vectorised);
      doubleColumnSums(aT.data(), columnStride, values.data(), rows, columns,
                       cproductsAlone.data(), nullptr, vectorised);
      doubleColumnSums(aT.data(), columnStride, nullptr, rows, columns, nullptr,
                       csumsAlone.data(), vectorised);
      for (const auto* got : {&cproducts, &cproductsAlone}) {
        EXPECT_EQ(std::memcmp(got->data(), dproducts.data(), dproducts.size() * 8), 0)
            << trial << (vectorised ? " vector" : " plain");
      }
      for (const auto* got : {&csums, &csumsAlone}) {
        EXPECT_EQ(std::memcmp(got->data(), dsums.data(), dsums.size() * 8), 0)
            << trial << (vectorised ? " vector" : " plain");
      }
    }
    for (std::int32_t i = 0; i < rows; ++i) {
      float sum = 0.0f, product = 0.0f;
      double dsum = 0.0, dproduct = 0.0;
      for (std::int32_t j = 0; j < columns; ++j) {
        const float x = a[static_cast<std::size_t>(i * stride + j)];
        sum = sum + x;
        product = product + x * values[static_cast<std::size_t>(j)];
        dsum = dsum + static_cast<double>(x);
        dproduct = dproduct + static_cast<double>(x) * static_cast<double>(values[j]);
      }
      const auto k = static_cast<std::size_t>(i);
      EXPECT_EQ(std::memcmp(&sum, &sums[k], 4), 0) << trial << " row " << i;
      EXPECT_EQ(std::memcmp(&product, &products[k], 4), 0) << trial << " row " << i;
      EXPECT_EQ(std::memcmp(&dsum, &dsums[k], 8), 0) << trial << " row " << i;
      EXPECT_EQ(std::memcmp(&dproduct, &dproducts[k], 8), 0) << trial << " row " << i;
    }
  }
}

TEST(ObjanClosedForm, EstimateFromTwoToSixCells) {
  using Cells = std::vector<reference::Cell>;
  const struct {
    const char* what;
    Cells cells;  // in collection order, on whole nodes
    int j, k;     // the node estimated
    float errorVariance;
  } cases[] = {
      {"two cells, node between", {{1, 1, 10}, {4, 2, 16}}, 2, 2, 10},
      {"two cells, node on one of them", {{1, 1, 10}, {4, 2, 16}}, 4, 2, 10},
      {"two cells without error term", {{1, 1, 10}, {4, 2, 16}}, 3, 1, 0},
      {"three cells, one beyond the zero crossing", {{0, 0, 5}, {2, 1, 9}, {9, 3, -2}}, 3, 0, 5},
      {"three cells, large error term", {{0, 0, 5}, {2, 1, 9}, {3, 3, 12}}, 1, 2, 60},
      // The node lies beyond the cut-off of the first cell (r2 = 333).
      {"three cells, one beyond the cut-off", {{0, 0, 20}, {15, 10, 7}, {17, 12, 11}}, 18, 3, 10},
      {"six cells", {{0, 0, 1}, {1, 3, 4}, {2, 1, -2}, {4, 4, 8}, {5, 0, 3}, {6, 2, 5}}, 3, 2, 10},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    const RunSettings s = settings250(8, c.errorVariance);
    ScopedWorkspace w(static_cast<std::int32_t>(c.cells.size()), 30, 30, s);
    std::vector<std::array<float, 3>> cells;
    for (const auto& cell : c.cells)
      cells.push_back({float(cell.x), float(cell.y), float(cell.value)});
    w.setCells(cells);
    const std::int32_t m = selectData(w.ws, c.j, c.k, s);
    ASSERT_EQ(m, static_cast<std::int32_t>(c.cells.size()));
    float estimate = -999.0f;
    ASSERT_EQ(OBJAN(w.ws, m, &estimate, s), 0);
    expectClose(estimate,
                reference::optimalInterpolation(c.cells, c.j, c.k, kD, kZ, c.errorVariance),
                c.what);
  }
}

}  // namespace
}  // namespace karnet
