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

// An n x n block, given row by row, in a workspace matrix of row stride limit
// whose other entries hold 12345.
struct Matrix {
  Matrix(std::int32_t limit, const std::vector<float>& rows)
      : scope(0, 1, 1, testing::withLimit(limit)), n(static_cast<int>(std::sqrt(rows.size()))) {
    std::fill(scope.ws.matrix, scope.ws.matrix + limit * limit, 12345.0f);
    for (int i = 0; i < n * n; ++i) at(i / n, i % n) = rows[static_cast<std::size_t>(i)];
  }
  float& at(int r, int q) { return scope.ws.matrix[r * scope.ws.limit + q]; }
  std::int32_t invert(std::int32_t size = -1) {
    return INVMTX(scope.ws, scope.ws.matrix, size < 0 ? n : size, det);
  }
  testing::ScopedWorkspace scope;
  int n;
  float det = 0.0f;
};

TEST(Invmtx, KnownInversesAndEveryFailureOrWarning) {
  const float inf = std::numeric_limits<float>::infinity(), nan = std::nanf("");
  std::vector<float> big(64, 0.0f);  // eight pivots of 1e10: some eighty scalings by ten
  for (int i = 0; i < 8; ++i) big[static_cast<std::size_t>(i * 9)] = 1e10f;
  const struct {
    const char* what;
    std::int32_t limit, size;  // size -1: the whole block
    std::vector<float> rows, inverse;  // inverse empty: the inversion fails
    float det;
    const char* error;
  } cases[] = {
      {"2 x 2 in stride 3", 3, -1, {4, 7, 2, 6}, {0.6f, -0.7f, -0.2f, 0.4f}, 10, ""},
      {"a permutation; determinant -1 is very small", 2, -1, {0, 1, 1, 0}, {0, 1, 1, 0}, -1,
       "Determinant very small in INVMTX"},
      {"determinant 1e-6 only warns", 3, -1, {0.01f, 0, 0, 0, 0.01f, 0, 0, 0, 0.01f},
       {100, 0, 0, 0, 100, 0, 0, 0, 100}, 1e-6f, "Determinant very small in INVMTX"},
      {"no size", 2, 0, {1, 0, 0, 1}, {}, 0, "NOBS < 1 in INVMTX"},
      {"size over the stride", 2, 3, {1, 0, 0, 1}, {}, 0, "LIMIT < N in INVMTX"},
      {"singular", 2, -1, {1, 2, 2, 4}, {}, 0, "Matrix singular in INVMTX"},
      // The pivot is judged after division by the step number: 7.5e-5 at step 2.
      {"very small pivot", 2, -1, {1.5e-4f, 0, 0, 1.5e-4f}, {}, 0, "Matrix singular in INVMTX"},
      {"too large", 8, -1, big, {}, 0, "Determinant too large in INVMTX"},
      // An infinite determinant cannot be scaled down: too large, not an endless loop.
      {"non-finite", 2, -1, {nan, -inf, -inf, nan}, {}, 0, "Determinant too large in INVMTX"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    Matrix m(c.limit, c.rows);
    ASSERT_EQ(m.invert(c.size), c.inverse.empty() ? -1 : 0);
    EXPECT_EQ(std::string(m.scope.ws.errorText), c.error);
    if (c.inverse.empty()) continue;
    EXPECT_NEAR(m.det, c.det, 1e-5f * std::fabs(c.det));
    for (int i = 0; i < c.limit * c.limit; ++i) {
      const int r = i / c.limit, q = i % c.limit;
      const float want = r < m.n && q < m.n ? c.inverse[r * m.n + q] : 12345.0f;  // else untouched
      EXPECT_NEAR(m.scope.ws.matrix[i], want, 1e-6f * (1.0f + std::fabs(want))) << r << "," << q;
    }
  }
}

TEST(Invmtx, EqualDiagonalsPickTheLastInScanOrder) {
  // Equal diagonal above the off-diagonal entries: step 0 takes the last
  // diagonal element (pivot column n-1 of step 0, found in row n-1).
  Matrix m(4, {1.1f, .25f, .25f, .25f, .25f, 1.1f, .25f, .25f, .25f, .25f, 1.1f, .25f, .25f, .25f,
               .25f, 1.1f});
  ASSERT_EQ(m.invert(), 0);
  EXPECT_EQ(m.scope.ws.pivot[4 + 0], 3);
  EXPECT_EQ(m.scope.ws.pivot[3], 3);
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
    for (int b = 0; b < n; ++b)
      for (int r = 0; r < n; ++r)
        if (used[b] == -1 && used[r] == -1 && std::fabs(at(r, b)) >= largest)
          largest = std::fabs(at(r, b)), pr = r, pc = b;
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
  for (int s = n - 1; s >= 0; --s)
    for (int q = 0; q < n; ++q) std::swap(at(q, used[steps[s]]), at(q, steps[s]));
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

}  // namespace
}  // namespace karnet
