// Correlation model, candidate selection, the exchange sort at the cut, and
// the estimator built on them.
#include "analysis/select_data.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstring>
#include <numeric>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "analysis/correlation.h"
#include "analysis/objan.h"
#include "analysis_fixtures.h"

namespace karnet {
namespace {

using testing::ScopedWorkspace;

// DecayDistance = 1 and ZeroCrossingDistance = 3 on unit spacing: decay2 = 2,
// zeroCross2 = 9, cut-off beyond d2 = 80.
RunSettings shortRange(std::int32_t limit, float radius = 100.0f) {
  RunSettings s = testing::withLimit(limit);
  s.DecayDistance = 1.0f;
  s.ZeroCrossingDistance = 3.0f;
  s.SearchRadius = radius;
  return s;
}

// The model's values against its closed form are checked with the estimator's
// numerics; here the table that stands in for it.
TEST(Correlation, TableGivesTheBitsOfTheModel) {
  // The very bits, also where the model gives not-a-number (at the node) and
  // -inf (beyond it) for a zero crossing at 0.
  for (const float zero : {8.0f, 0.0f}) {
    RunSettings s = testing::withLimit(8);
    s.ZeroCrossingDistance = zero;
    ScopedWorkspace t(0, 40, 30, s);
    ASSERT_GT(t.ws.corrTableSize, 1);
    for (float d2 = 0.0f; d2 < 2000.0f; d2 += 0.5f) {
      const float tabled = tabledCorrelation(d2, t.ws), model = correlation(d2, t.ws);
      ASSERT_EQ(std::memcmp(&tabled, &model, sizeof model), 0) << zero << " " << d2;
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

TEST(SortByCorrelation, MatchesThePassByPassMethod) {
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
    std::iota(i.begin(), i.end(), 0);
    std::vector<float> refC = c;
    std::vector<std::int32_t> refI = i;
    passByPassSort(refC, refI);
    sortByCorrelation(c.data(), i.data(), n);
    ASSERT_EQ(i, refI) << "trial " << trial;
  }
}

TEST(SelectData, RadiusLimitOrderAndTiesAtTheCut) {
  using Cells = std::vector<std::array<float, 3>>;  // in collection order
  const Cells five = {{2, 2, 10}, {4, 5, 20}, {5, 7, 30}, {8, 5, 40}, {8, 6, 50}};
  const Cells line = {{0, 1, 1}, {0, 4, 2}, {0, 9, 3}, {0, 10, 4}};
  const struct {
    const char* what;
    std::int32_t limit;
    float radius;
    Cells cells;
    std::int32_t j, k;
    std::vector<float> expected;  // the chosen values in order
  } cases[] = {
      // From (5, 5): d2 = 18, 1, 4, 9, 10.
      {"exactly limit candidates stay unsorted", 3, 3, five, 5, 5, {20, 30, 40}},
      {"more than limit: the best correlated first", 2, 3, five, 5, 5, {20, 30}},
      {"radius 0: a cell on the node", 3, 0, five, 5, 7, {30}},
      // Gap 2 brings the cell on the node to the front by exchanging it with
      // cell 0, which then stands behind cell 1.
      {"ties at distance 1", 3, 100, {{4, 5, 1}, {5, 4, 2}, {5, 5, 3}, {5, 6, 4}, {6, 5, 5}}, 5, 5,
       {3, 2, 1}},
      // Beyond the cut-off (d2 81, 100: correlation 0) ranks after the positive
      // (d2 1) and before the negative (d2 16) cell.
      {"cut-off ranks between the signs, the later zero first", 3, 11, line, 0, 0, {1, 4, 3}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    const RunSettings s = shortRange(c.limit, c.radius);
    ScopedWorkspace w(static_cast<std::int32_t>(c.cells.size()), 12, 12, s);
    w.setCells(c.cells);
    const std::int32_t m = selectData(w.ws, c.j, c.k, s);
    EXPECT_EQ(std::vector<float>(w.ws.selValue, w.ws.selValue + m), c.expected);
  }
}

TEST(SelectData, ColumnWindowMatchesTheFullScan) {
  // Random layer in collection order: the column-indexed selection must make
  // the very same choice as the scan over every cell, at every node.
  constexpr std::int32_t nj = 37, nk = 29;
  std::mt19937 random(11);
  std::vector<std::array<float, 3>> cells;
  for (std::int32_t j = 0; j < nj; ++j) {
    for (std::int32_t k = 0; k < nk; ++k) {
      if (random() % 8 == 0)
        cells.push_back({float(j), float(k), static_cast<float>(random() % 1000) * 0.03f});
    }
  }
  const auto n = static_cast<std::int32_t>(cells.size());
  for (const float radius : {0.0f, 2.5f, 4.0f, 7.3f, 100.0f}) {
    RunSettings s = testing::withLimit(6);
    s.SearchRadius = radius;
    ScopedWorkspace indexed(n, nj, nk, s), plain(n, nj, nk, s);
    indexed.setCells(cells);
    plain.setCells(cells);
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

// The selection as the method states it: every cell in collection order, the
// radius test, the correlation model evaluated directly, and when there are
// more candidates than the limit the pass-by-pass sort of all of them.
std::vector<std::array<float, 4>> literalSelection(const OaWorkspace& ws,
                                                   const std::vector<std::array<float, 3>>& cells,
                                                   std::int32_t j, std::int32_t k,
                                                   const RunSettings& s) {
  const float r2 = s.SearchRadius * s.SearchRadius / s.dx / s.dx;
  std::vector<float> corr;
  std::vector<std::int32_t> index;
  for (std::size_t i = 0; i < cells.size(); ++i) {
    const float dy = static_cast<float>(k) - cells[i][1];
    const float dx = static_cast<float>(j) - cells[i][0];
    const float d2 = dy * dy + dx * dx;
    if (d2 > r2) continue;
    corr.push_back(correlation(d2, ws));
    index.push_back(static_cast<std::int32_t>(i));
  }
  if (static_cast<std::int32_t>(corr.size()) > ws.limit) {
    passByPassSort(corr, index);
    corr.resize(static_cast<std::size_t>(ws.limit));
    index.resize(corr.size());
  }
  std::vector<std::array<float, 4>> chosen;
  for (std::size_t p = 0; p < corr.size(); ++p) {
    const auto& c = cells[static_cast<std::size_t>(index[p])];
    chosen.push_back({c[0], c[1], c[2], corr[p]});
  }
  return chosen;
}

TEST(SelectData, EveryVisitingOrderMatchesTheLiteralSelection) {
  // Random layers, sparse to nearly full, with values from a few levels (ties
  // in correlation abound at the cut): the indexed selection, whose column
  // cursors carry over from node to node, must choose the very cells of the
  // literal steps in the very order, whichever order the nodes come in.
  constexpr unsigned kDensity[] = {4, 30, 90};  // per cent of the nodes
  constexpr std::int32_t kLimit[] = {1, 5, 20, 3};
  constexpr float kSpacing[] = {1.0f, 2.5f};
  constexpr float kRadius[] = {0.0f, 1.0f, 2.5f, 7.3f, 12.0f, 1000.0f};  // in nodes
  std::mt19937 random(23);
  int compared = 0, cut = 0;
  for (int trial = 0; trial < 36; ++trial) {
    const std::int32_t nj = 12 + static_cast<std::int32_t>(random() % 20);
    const std::int32_t nk = 12 + static_cast<std::int32_t>(random() % 20);
    const unsigned density = kDensity[trial % 3];
    std::vector<std::array<float, 3>> cells;
    for (std::int32_t j = 0; j < nj; ++j) {
      for (std::int32_t k = 0; k < nk; ++k) {
        if (random() % 100 < density)
          cells.push_back({float(j), float(k), static_cast<float>(random() % 7) * 0.5f});
      }
    }
    RunSettings s = testing::withLimit(kLimit[trial % 4]);
    s.dx = kSpacing[trial % 2];
    s.SearchRadius = s.dx * kRadius[trial % 6];
    s.DecayDistance = 3.0f * s.dx;
    s.ZeroCrossingDistance = trial % 9 == 4 ? 0.0f : 8.0f * s.dx;  // 0: not-a-number at d2 0
    const auto n = static_cast<std::int32_t>(cells.size());
    ScopedWorkspace w(n, nj, nk, s);
    w.setCells(cells);
    workspaceIndexColumns(w.ws, nj);
    ASSERT_NE(w.ws.columnStart, nullptr);

    std::vector<std::pair<std::int32_t, std::int32_t>> nodes;
    for (std::int32_t j = 0; j < nj; ++j)  // the layer pass's order
      for (std::int32_t k = 0; k < nk; ++k) nodes.emplace_back(j, k);
    for (std::int32_t k = 0; k < nk; ++k)  // row by row
      for (std::int32_t j = 0; j < nj; ++j) nodes.emplace_back(j, k);
    for (std::int32_t j = 0; j < nj; ++j)  // up each column with gaps (dry nodes)
      for (std::int32_t k = static_cast<std::int32_t>(random() % 3); k < nk;
           k += 1 + static_cast<std::int32_t>(random() % (trial % 2 == 0 ? 3 : 9)))
        nodes.emplace_back(j, k);
    for (int i = 0; i < 100; ++i)  // anywhere, rows going down as well
      nodes.emplace_back(random() % nj, random() % nk);
    for (const auto& [j, k] : nodes) {
      const std::int32_t m = selectData(w.ws, j, k, s);
      const auto expected = literalSelection(w.ws, cells, j, k, s);
      ASSERT_EQ(m, static_cast<std::int32_t>(expected.size()))
          << "trial " << trial << " node " << j << "," << k;
      for (std::int32_t p = 0; p < m; ++p) {
        const std::array<float, 4> got = {w.ws.selX[p], w.ws.selY[p], w.ws.selValue[p],
                                          w.ws.selCorr[p]};
        ASSERT_EQ(std::memcmp(got.data(), expected[p].data(), sizeof got), 0)
            << "trial " << trial << " node " << j << "," << k << " cell " << p;
      }
      ++compared;
      cut += m == s.CorrelationSampleSize ? 1 : 0;
    }
  }
  EXPECT_GT(cut, compared / 4);  // the cut at the limit is well exercised
}

TEST(Objan, OneChosenCellGivesItsOwnValueAndNoneFails) {
  const RunSettings s = testing::withLimit(4);
  ScopedWorkspace w(1, 30, 30, s);
  float estimate = 42.0f;
  EXPECT_EQ(OBJAN(w.ws, 0, &estimate, s), -1);
  EXPECT_EQ(std::string(w.ws.errorText), "No observational data in OBJAN");
  EXPECT_EQ(estimate, 42.0f);  // a failure leaves the estimate alone
  w.setCells({{2, 1, 17.3f}});
  // On the node, near, beyond the zero crossing (negative correlation) and
  // beyond the cut-off (correlation 0): without observation error, exactly.
  for (const auto& node : std::vector<std::pair<int, int>>{{2, 1}, {3, 3}, {11, 1}, {29, 29}}) {
    const std::int32_t m = selectData(w.ws, node.first, node.second, s);
    ASSERT_EQ(m, 1);
    ASSERT_EQ(OBJAN(w.ws, m, &estimate, s), 0);
    EXPECT_EQ(estimate, 17.3f) << node.first << "," << node.second;
  }
}

}  // namespace
}  // namespace karnet
