// Matrix inversion: known inverses, pivot choice, and every failure text.
#include "analysis/invmtx.h"

#include <gtest/gtest.h>

#include <algorithm>
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
// over columns (outer) and rows (inner) with ">=", determinant with its scaling
// by ten, singularity test, row exchange with scaling, elimination, column
// exchanges in reverse. The matrix is n x n in a block of row stride limit.
struct StepByStep {
  std::int32_t result = 0;
  std::string error;
  float det = 1.0f;
  std::vector<int> steps;
  std::vector<float> a;
};

StepByStep stepByStepInverse(std::vector<float> a, int n, int limit) {
  StepByStep out;
  std::vector<int> used(static_cast<std::size_t>(n), -1);
  out.steps.assign(static_cast<std::size_t>(n), -1);
  auto at = [&](int r, int q) -> float& { return a[static_cast<std::size_t>(r * limit + q)]; };
  int scale = 0;
  for (int s = 0; s < n; ++s) {
    int pr = -1, pc = -1;
    float largest = 0.0f;
    for (int b = 0; b < n; ++b)
      for (int r = 0; r < n; ++r)
        if (used[b] == -1 && used[r] == -1 && std::fabs(at(r, b)) >= largest)
          largest = std::fabs(at(r, b)), pr = r, pc = b;
    if (pc < 0) {  // every free entry is not a number: the first free index
      for (pc = 0; used[pc] != -1;) ++pc;
      pr = pc;
    }
    used[pc] = pr;
    out.steps[s] = pc;
    const float p = at(pr, pc);
    out.det = out.det * p;
    while (std::fabs(out.det) > 1.0f) {
      if (std::isinf(out.det)) {
        scale = std::max(scale, 76);
        break;
      }
      out.det = static_cast<float>(out.det / 10.0);
      ++scale;
    }
    if (std::fabs(static_cast<double>(p / static_cast<float>(s + 1))) < 1e-4) {
      out.result = -1;
      out.error = "Matrix singular in INVMTX";
      out.a = a;
      return out;
    }
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
    if (used[out.steps[s]] == out.steps[s]) continue;
    out.det = static_cast<float>(out.det * -1.0);
    for (int q = 0; q < n; ++q) std::swap(at(q, used[out.steps[s]]), at(q, out.steps[s]));
  }
  out.a = a;
  if (scale >= 76) {
    out.result = -1;
    out.error = "Determinant too large in INVMTX";
    out.det = static_cast<float>(scale);
    return out;
  }
  out.det = static_cast<float>(out.det * std::pow(10.0, scale));
  if (out.det < 1e-4) out.error = "Determinant very small in INVMTX";
  return out;
}

// Random n x n blocks in a matrix of row stride limit >= n (other entries
// 12345), drawn in four kinds: correlation-like symmetric matrices with a
// heavy diagonal (the run's case), entries from a few values only (equal
// magnitudes and exact ties in the pivot search abound), nearly singular ones
// (a row repeated, or scaled down to the singularity threshold), and ones
// holding infinities and not-a-numbers. The not-a-number is the one an invalid
// operation makes, as in a run (0/0 from a zero decay distance): its bits then
// do not depend on which operand an operation takes it from.
std::vector<float> randomBlock(std::mt19937& random, int n, int limit, int kind) {
  std::vector<float> a(static_cast<std::size_t>(limit * limit), 12345.0f);
  auto at = [&](int r, int q) -> float& { return a[static_cast<std::size_t>(r * limit + q)]; };
  std::uniform_real_distribution<float> unit(-1.0f, 1.0f);
  std::uniform_int_distribution<int> pick(0, 6);
  std::uniform_int_distribution<int> index(0, n - 1);
  const float values[] = {-2.0f, -1.0f, 0.5f, 1.0f, 2.0f, 3.0f, -3.0f};
  for (int r = 0; r < n; ++r) {
    for (int q = 0; q < n; ++q) {
      switch (kind) {
        case 0:
          at(r, q) = q < r ? at(q, r) : (q == r ? 1.1f : 0.8f * std::exp(-std::fabs(unit(random))));
          break;
        case 1:
          at(r, q) = values[pick(random)];
          break;
        default:
          at(r, q) = unit(random);
      }
    }
  }
  if (kind == 2 && n > 1) {
    const int from = index(random), to = index(random);
    for (int q = 0; q < n; ++q) {
      at(to, q) = from != to ? at(from, q) : at(to, q) * 1e-5f;
    }
  }
  if (kind == 3) {
    volatile float zero = 0.0f;
    const float specials[] = {std::numeric_limits<float>::infinity(),
                              -std::numeric_limits<float>::infinity(), zero / zero, -0.0f};
    for (int i = 0; i < 1 + n / 8; ++i) {
      at(index(random), index(random)) = specials[pick(random) % 4];
    }
  }
  return a;
}

TEST(Invmtx, EveryVariantGivesTheBitsOfTheStepByStepMethod) {
  std::mt19937 random(11);
  int variantsRun = 0;
  for (InvmtxVariant variant : kInvmtxVariants) {
    if (!invmtxVariantAvailable(variant)) continue;
    ++variantsRun;
    int outcomes[2] = {0, 0};
    for (int trial = 0; trial < 800; ++trial) {
      const int n = 1 + trial % 61;
      const int limit = n + (trial / 61) % 3;  // strides beyond the block as well
      const int kind = trial % 4;
      const std::vector<float> a = randomBlock(random, n, limit, kind);
      SCOPED_TRACE(std::string(invmtxVariantName(variant)) + " trial " + std::to_string(trial) +
                   " n " + std::to_string(n) + " kind " + std::to_string(kind));
      testing::ScopedWorkspace scope(0, 1, 1, testing::withLimit(limit));
      std::copy(a.begin(), a.end(), scope.ws.matrix);
      float det = 0.0f;
      const std::int32_t result = invmtxWith(variant, scope.ws, scope.ws.matrix, n, det);
      const StepByStep expected = stepByStepInverse(a, n, limit);
      ASSERT_EQ(result, expected.result);
      ++outcomes[result == 0 ? 0 : 1];
      EXPECT_EQ(std::string(scope.ws.errorText), expected.error);
      EXPECT_EQ(std::memcmp(&det, &expected.det, sizeof det), 0) << det << " " << expected.det;
      if (result == 0) {
        for (int s = 0; s < n; ++s) ASSERT_EQ(scope.ws.pivot[n + s], expected.steps[s]);
      }
      ASSERT_EQ(std::memcmp(scope.ws.matrix, expected.a.data(), a.size() * sizeof(float)), 0);
    }
    EXPECT_GT(outcomes[0], 300);  // inversions and failures both well represented
    EXPECT_GT(outcomes[1], 100);
  }
  EXPECT_GE(variantsRun, 1);
}

TEST(Invmtx, RunAndVariantsAgree) {
  // INVMTX picks a variant itself; on a correlation-like matrix it must give
  // the bits of every variant the processor runs.
  std::mt19937 random(5);
  const std::vector<float> a = randomBlock(random, 50, 50, 0);
  testing::ScopedWorkspace run(0, 1, 1, testing::withLimit(50));
  std::copy(a.begin(), a.end(), run.ws.matrix);
  float det = 0.0f;
  ASSERT_EQ(INVMTX(run.ws, run.ws.matrix, 50, det), 0);
  for (InvmtxVariant variant : kInvmtxVariants) {
    if (!invmtxVariantAvailable(variant)) continue;
    testing::ScopedWorkspace one(0, 1, 1, testing::withLimit(50));
    std::copy(a.begin(), a.end(), one.ws.matrix);
    float oneDet = 0.0f;
    ASSERT_EQ(invmtxWith(variant, one.ws, one.ws.matrix, 50, oneDet), 0);
    EXPECT_EQ(std::memcmp(one.ws.matrix, run.ws.matrix, a.size() * sizeof(float)), 0)
        << invmtxVariantName(variant);
  }
}

}  // namespace
}  // namespace karnet
