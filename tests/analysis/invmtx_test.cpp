// Matrix inversion: known inverses, pivot choice, and every failure text.
#include "analysis/invmtx.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "analysis_fixtures.h"

namespace karnet {
namespace {

// An n x n block, given row by row, in a workspace matrix of row stride limit.
struct Matrix {
  Matrix(std::int32_t limit, const std::vector<float>& rows)
      : scope(0, 1, 1, testing::withLimit(limit)), n(static_cast<int>(std::sqrt(rows.size()))) {
    for (std::int32_t i = 0; i < limit * limit; ++i) scope.ws.matrix[i] = 12345.0f;
    for (int r = 0; r < n; ++r) {
      for (int q = 0; q < n; ++q) at(r, q) = rows[static_cast<std::size_t>(r * n + q)];
    }
  }
  float& at(int r, int q) { return scope.ws.matrix[r * scope.ws.limit + q]; }
  std::int32_t invert(std::int32_t size) { return INVMTX(scope.ws, scope.ws.matrix, size, det); }
  std::int32_t invert() { return invert(n); }
  std::string error() const { return scope.ws.errorText; }
  testing::ScopedWorkspace scope;
  int n;
  float det = 0.0f;
};

TEST(Invmtx, InvertsSmallMatricesWithKnownInverses) {
  Matrix one(1, {4.0f});
  ASSERT_EQ(one.invert(), 0);
  EXPECT_EQ(one.at(0, 0), 0.25f);
  EXPECT_FLOAT_EQ(one.det, 4.0f);

  // [[4, 7], [2, 6]]^-1 = [[0.6, -0.7], [-0.2, 0.4]], determinant 10; stride 3.
  Matrix two(3, {4.0f, 7.0f, 2.0f, 6.0f});
  ASSERT_EQ(two.invert(), 0);
  EXPECT_NEAR(two.at(0, 0), 0.6f, 1e-6f);
  EXPECT_NEAR(two.at(0, 1), -0.7f, 1e-6f);
  EXPECT_NEAR(two.at(1, 0), -0.2f, 1e-6f);
  EXPECT_NEAR(two.at(1, 1), 0.4f, 1e-6f);
  EXPECT_NEAR(two.det, 10.0f, 1e-4f);
  EXPECT_EQ(two.at(0, 2), 12345.0f);  // outside the block: untouched
  EXPECT_EQ(two.at(2, 2), 12345.0f);

  // A permutation is its own inverse; determinant -1 counts as "very small".
  Matrix swap(2, {0.0f, 1.0f, 1.0f, 0.0f});
  ASSERT_EQ(swap.invert(), 0);
  EXPECT_EQ(std::vector<float>(swap.scope.ws.matrix, swap.scope.ws.matrix + 4),
            (std::vector<float>{0.0f, 1.0f, 1.0f, 0.0f}));
  EXPECT_EQ(swap.det, -1.0f);
  EXPECT_EQ(swap.error(), "Determinant very small in INVMTX");
}

TEST(Invmtx, EqualMagnitudesPickTheLastInScanOrder) {
  // Equal diagonal above the off-diagonal entries: step 0 takes the last
  // diagonal element (pivot column n-1 of step 0, found in row n-1).
  Matrix m(4, {1.1f, .25f, .25f, .25f, .25f, 1.1f, .25f, .25f, .25f, .25f, 1.1f, .25f, .25f, .25f,
               .25f, 1.1f});
  ASSERT_EQ(m.invert(), 0);
  EXPECT_EQ(m.scope.ws.pivot[4 + 0], 3);
  EXPECT_EQ(m.scope.ws.pivot[3], 3);

  // All magnitudes equal: columns outer, rows inner, so (1, 1) wins.
  Matrix e(2, {1.0f, 1.0f, 1.0f, -1.0f});
  ASSERT_EQ(e.invert(), 0);
  EXPECT_EQ(e.scope.ws.pivot[2 + 0], 1);
  EXPECT_EQ(e.scope.ws.pivot[1], 1);
  EXPECT_EQ(e.at(0, 0), 0.5f);
  EXPECT_EQ(e.at(1, 1), -0.5f);
}

// Gauss-Jordan inversion step by step as the method states it: pivot search
// over columns (outer) and rows (inner) with ">=", row exchange with scaling,
// elimination, column exchanges in reverse.
std::vector<float> stepByStepInverse(std::vector<float> a, int n, std::vector<int>& steps) {
  std::vector<int> used(static_cast<std::size_t>(n), -1);
  steps.assign(static_cast<std::size_t>(n), -1);
  auto at = [&](int r, int q) -> float& { return a[static_cast<std::size_t>(r * n + q)]; };
  for (int s = 0; s < n; ++s) {
    int pr = -1, pc = -1;
    float largest = 0.0f;
    for (int b = 0; b < n; ++b) {
      for (int r = 0; r < n; ++r) {
        if (used[b] == -1 && used[r] == -1 && std::fabs(at(r, b)) >= largest) {
          largest = std::fabs(at(r, b));
          pr = r;
          pc = b;
        }
      }
    }
    used[pc] = pr;
    steps[s] = pc;
    const float p = at(pr, pc);
    at(pr, pc) = 1.0f;
    for (int q = 0; q < n; ++q) {
      const float t = at(pr, q);
      at(pr, q) = at(pc, q);
      at(pc, q) = t / p;
    }
    for (int r = 0; r < n; ++r) {
      if (r == pc) continue;
      const float f = at(r, pc);
      at(r, pc) = 0.0f;
      for (int q = 0; q < n; ++q) at(r, q) = at(r, q) - f * at(pc, q);
    }
  }
  for (int s = n - 1; s >= 0; --s) {
    for (int q = 0; q < n; ++q) std::swap(at(q, used[steps[s]]), at(q, steps[s]));
  }
  return a;
}

TEST(Invmtx, PivotChoiceAndBitsMatchTheStepByStepMethod) {
  // Entries from a few values only, so that equal magnitudes abound.
  std::mt19937 random(3);
  std::uniform_int_distribution<int> pick(0, 6);
  const float values[] = {-2.0f, -1.0f, 0.5f, 1.0f, 2.0f, 3.0f, -3.0f};
  int compared = 0;
  for (int trial = 0; trial < 300; ++trial) {
    const int n = 2 + trial % 6;
    std::vector<float> a(static_cast<std::size_t>(n * n));
    for (float& v : a) v = values[pick(random)];
    Matrix m(n, a);
    if (m.invert() != 0) continue;  // singular draws have nothing to compare
    std::vector<int> steps;
    const std::vector<float> expected = stepByStepInverse(a, n, steps);
    for (int s = 0; s < n; ++s) ASSERT_EQ(m.scope.ws.pivot[n + s], steps[s]) << trial;
    ASSERT_EQ(std::memcmp(m.scope.ws.matrix, expected.data(), expected.size() * sizeof(float)), 0)
        << trial;
    ++compared;
  }
  EXPECT_GT(compared, 100);
}

TEST(Invmtx, FailuresAndWarningsNameTheirReason) {
  Matrix id(2, {1, 0, 0, 1});
  EXPECT_EQ(id.invert(0), -1);
  EXPECT_EQ(id.error(), "NOBS < 1 in INVMTX");
  EXPECT_EQ(id.invert(3), -1);
  EXPECT_EQ(id.error(), "LIMIT < N in INVMTX");

  Matrix singular(2, {1.0f, 2.0f, 2.0f, 4.0f});
  EXPECT_EQ(singular.invert(), -1);
  EXPECT_EQ(singular.error(), "Matrix singular in INVMTX");
  // The pivot is judged after division by the step number: 1.5e-4 fails at
  // step 2 (7.5e-5).
  Matrix small(2, {1.5e-4f, 0.0f, 0.0f, 1.5e-4f});
  EXPECT_EQ(small.invert(), -1);
  EXPECT_EQ(small.error(), "Matrix singular in INVMTX");

  // Eight pivots of 1e10 need some eighty scalings by ten: det holds the count.
  std::vector<float> big(64, 0.0f);
  for (int i = 0; i < 8; ++i) big[static_cast<std::size_t>(i * 9)] = 1e10f;
  Matrix large(8, big);
  EXPECT_EQ(large.invert(), -1);
  EXPECT_EQ(large.error(), "Determinant too large in INVMTX");
  EXPECT_GE(large.det, 76.0f);
  EXPECT_EQ(large.det, std::floor(large.det));

  // A determinant of 1e-6 is only a warning; the inverse is used.
  Matrix tiny(3, {0.01f, 0, 0, 0, 0.01f, 0, 0, 0, 0.01f});
  EXPECT_EQ(tiny.invert(), 0);
  EXPECT_EQ(tiny.error(), "Determinant very small in INVMTX");
  EXPECT_NEAR(tiny.det, 1e-6f, 1e-10f);
  EXPECT_FLOAT_EQ(tiny.at(2, 2), 100.0f);
}

TEST(Invmtx, NonFiniteEntriesEndTheInversion) {
  const float inf = std::numeric_limits<float>::infinity();
  const float nan = std::numeric_limits<float>::quiet_NaN();
  // An infinite pivot makes the determinant infinite; no scaling by ten can
  // bring it down, so the inversion ends as too large instead of looping.
  Matrix m(2, {nan, -inf, -inf, nan});
  EXPECT_EQ(m.invert(), -1);
  EXPECT_EQ(m.error(), "Determinant too large in INVMTX");
}

}  // namespace
}  // namespace karnet
