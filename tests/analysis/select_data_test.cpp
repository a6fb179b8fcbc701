// Correlation model, candidate selection and the exchange sort at the cut.
#include "analysis/select_data.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "analysis/correlation.h"
#include "analysis_fixtures.h"

namespace karnet {
namespace {

using testing::ScopedWorkspace;

bool sameBits(float a, float b) { return std::memcmp(&a, &b, sizeof a) == 0; }

// DecayDistance = 1 and ZeroCrossingDistance = 3 on unit spacing: decay2 = 2,
// zeroCross2 = 9, cut-off beyond d2 = 80.
RunSettings shortRange(std::int32_t limit, float radius = 100.0f) {
  RunSettings s = testing::withLimit(limit);
  s.DecayDistance = 1.0f;
  s.ZeroCrossingDistance = 3.0f;
  s.SearchRadius = radius;
  return s;
}

TEST(Correlation, OneAtZeroZeroAtCrossingAndCutBeyondForty) {
  RunSettings s = shortRange(1);
  s.dx = 250.0f;  // the scale factors are in node units
  s.DecayDistance = s.ZeroCrossingDistance = 250.0f;
  ScopedWorkspace unit(0, 4, 4, s);
  EXPECT_EQ(unit.ws.decay2, 2.0f);
  EXPECT_EQ(unit.ws.zeroCross2, 1.0f);

  ScopedWorkspace w(0, 20, 20, shortRange(1));
  EXPECT_EQ(correlation(0.0f, w.ws), 1.0f);
  EXPECT_EQ(correlation(9.0f, w.ws), 0.0f);  // the zero crossing
  EXPECT_LT(correlation(10.0f, w.ws), 0.0f);
  EXPECT_NEAR(correlation(4.0f, w.ws), std::exp(-2.0) * (1.0 - 4.0 / 9.0), 1e-7);
  EXPECT_LT(correlation(80.0f, w.ws), 0.0f);  // evaluated up to 40 * decay2
  EXPECT_EQ(correlation(80.5f, w.ws), 0.0f);  // cut beyond it
}

TEST(Correlation, TableGivesTheSameBitsAsTheModel) {
  for (const float zero : {8.0f, 0.0f}) {
    RunSettings s = testing::withLimit(8);
    s.ZeroCrossingDistance = zero;  // 0: not-a-number at the node, -inf beyond
    ScopedWorkspace w(0, 40, 30, s);
    ASSERT_GT(w.ws.corrTableSize, 1);
    for (float d2 = 0.0f; d2 < 2000.0f; d2 += 0.5f) {
      ASSERT_TRUE(sameBits(tabledCorrelation(d2, w.ws), correlation(d2, w.ws))) << d2;
    }
  }
}

// The exchange sort as the method states it: passes over (i, i + gap) until a
// pass exchanges nothing, for gap = n/2, n/4, ..., 1.
void passByPassSort(std::vector<float>& corr, std::vector<std::int32_t>& index) {
  const auto n = static_cast<std::int32_t>(corr.size());
  for (std::int32_t gap = n / 2; gap >= 1; gap /= 2) {
    for (bool exchanged = true; exchanged;) {
      exchanged = false;
      for (std::int32_t i = 0; i < n - gap; ++i) {
        if (corr[i] < corr[i + gap]) {
          std::swap(corr[i], corr[i + gap]);
          std::swap(index[i], index[i + gap]);
          exchanged = true;
        }
      }
    }
  }
}

TEST(SortByCorrelation, HandWorkedTiesAndThePassByPassMethod) {
  // Gap 2 moves the 0.9 at index 4 past index 0's 0.5, so of the equal 0.5
  // values index 0 ends first and index 3 before index 2.
  std::vector<float> corr = {0.5f, 0.9f, 0.5f, 0.5f, 0.9f};
  std::vector<std::int32_t> index = {0, 1, 2, 3, 4};
  sortByCorrelation(corr.data(), index.data(), 5);
  EXPECT_EQ(corr, (std::vector<float>{0.9f, 0.9f, 0.5f, 0.5f, 0.5f}));
  EXPECT_EQ(index, (std::vector<std::int32_t>{4, 1, 0, 3, 2}));

  // Random lists with many ties and an occasional not-a-number (which never
  // moves, so the sort ends) give the same order as the pass-by-pass method.
  std::mt19937 random(17);
  std::uniform_int_distribution<int> level(0, 5);
  for (int trial = 0; trial < 500; ++trial) {
    const int n = 1 + trial % 70;
    std::vector<float> c(static_cast<std::size_t>(n));
    for (float& v : c) v = 0.2f * static_cast<float>(level(random)) - 0.3f;
    if (trial % 7 == 0) c[static_cast<std::size_t>(trial % n)] = std::nanf("");
    std::vector<std::int32_t> i(static_cast<std::size_t>(n));
    for (int p = 0; p < n; ++p) i[static_cast<std::size_t>(p)] = p;
    std::vector<float> refC = c;
    std::vector<std::int32_t> refI = i;
    passByPassSort(refC, refI);
    sortByCorrelation(c.data(), i.data(), n);
    ASSERT_EQ(i, refI) << "trial " << trial;
  }
}

// Chooses for node (j, k) among cells given in collection order; returns the
// chosen values in order.
std::vector<float> chosen(const RunSettings& s, const std::vector<std::array<float, 3>>& cells,
                          std::int32_t j, std::int32_t k) {
  ScopedWorkspace w(static_cast<std::int32_t>(cells.size()), 12, 12, s);
  std::vector<float> x, y, v;
  for (const auto& c : cells) {
    x.push_back(c[0]);
    y.push_back(c[1]);
    v.push_back(c[2]);
  }
  w.setCells(x, y, v);
  const std::int32_t m = selectData(w.ws, j, k, s);
  return {w.ws.selValue, w.ws.selValue + m};
}

TEST(SelectData, RadiusLimitAndOrder) {
  const std::vector<std::array<float, 3>> cells = {
      {2, 2, 10}, {4, 5, 20}, {5, 7, 30}, {8, 5, 40}, {8, 6, 50}};
  // Node (5, 5), radius 3: d2 = 18, 1, 4, 9, 10; three candidates in
  // collection order, as exactly limit candidates are not sorted.
  EXPECT_EQ(chosen(shortRange(3, 3.0f), cells, 5, 5), (std::vector<float>{20, 30, 40}));
  // More than limit: the best-correlated first.
  EXPECT_EQ(chosen(shortRange(2, 3.0f), cells, 5, 5), (std::vector<float>{20, 30}));
  // SearchRadius 0: only a cell on the node; none, no choice.
  EXPECT_EQ(chosen(shortRange(3, 0.0f), cells, 5, 7), (std::vector<float>{30}));
  EXPECT_TRUE(chosen(shortRange(3, 0.0f), cells, 5, 5).empty());
}

TEST(SelectData, TiesAtTheCutFollowTheExchangeSort) {
  // Four cells at distance 1 around node (5, 5) and one on it: gap 2 brings
  // the cell on the node to the front by exchanging it with cell 0, which then
  // stands behind cell 1.
  EXPECT_EQ(chosen(shortRange(3), {{4, 5, 1}, {5, 4, 2}, {5, 5, 3}, {5, 6, 4}, {6, 5, 5}}, 5, 5),
            (std::vector<float>{3, 2, 1}));
  // Beyond the cut-off (d2 81, 100: correlation 0) ranks after the positive
  // (d2 1) and before the negative (d2 16) cell.
  const std::vector<std::array<float, 3>> line = {{0, 1, 1}, {0, 4, 2}, {0, 9, 3}, {0, 10, 4}};
  EXPECT_EQ(chosen(shortRange(2, 11.0f), line, 0, 0), (std::vector<float>{1, 4}));
  EXPECT_EQ(chosen(shortRange(3, 11.0f), line, 0, 0), (std::vector<float>{1, 4, 3}));
}

TEST(SelectData, ColumnWindowMatchesTheFullScan) {
  // Random layer in collection order: the column-indexed selection must make
  // the very same choice as the scan over every cell, at every node.
  constexpr std::int32_t nj = 37, nk = 29;
  std::mt19937 random(11);
  std::vector<float> x, y, v;
  for (std::int32_t j = 0; j < nj; ++j) {
    for (std::int32_t k = 0; k < nk; ++k) {
      if (random() % 8 != 0) continue;
      x.push_back(static_cast<float>(j));
      y.push_back(static_cast<float>(k));
      v.push_back(static_cast<float>(random() % 1000) * 0.03f);
    }
  }
  const auto n = static_cast<std::int32_t>(x.size());
  for (const float radius : {0.0f, 2.5f, 4.0f, 7.3f, 100.0f}) {
    RunSettings s = testing::withLimit(6);
    s.SearchRadius = radius;
    ScopedWorkspace indexed(n, nj, nk, s), plain(n, nj, nk, s);
    indexed.setCells(x, y, v);
    plain.setCells(x, y, v);
    workspaceIndexColumns(indexed.ws, nj);
    ASSERT_NE(indexed.ws.columnStart, nullptr);
    for (std::int32_t node = 0; node < nj * nk; ++node) {
      const std::int32_t m = selectData(indexed.ws, node % nj, node / nj, s);
      ASSERT_EQ(m, selectData(plain.ws, node % nj, node / nj, s)) << radius << " " << node;
      ASSERT_EQ(std::memcmp(indexed.ws.selValue, plain.ws.selValue, m * sizeof(float)), 0);
      ASSERT_EQ(std::memcmp(indexed.ws.selCorr, plain.ws.selCorr, m * sizeof(float)), 0);
    }
  }
}

}  // namespace
}  // namespace karnet
