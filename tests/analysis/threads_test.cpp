// The objective analysis on several threads: the same bits for any number of
// threads, and the kept inverse that spares inversions without changing them.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "analysis/error_variance.h"
#include "analysis/objan.h"
#include "analysis/objective_analysis.h"
#include "analysis/select_data.h"
#include "analysis_fixtures.h"
#include "control/progress.h"
#include "interp/interp_fixture.h"

namespace karnet {
namespace {

using testing::kHole;
using testing::kHoleWide;
using testing::kLand;

// A 61 x 47 layer with data in about one node in nine but none in a square
// wider than the search radius, a dry patch, and a footprint that leaves a
// margin of data outside it.
struct RandomLayer {
  static constexpr std::int32_t nj = 61, nk = 47;
  explicit RandomLayer(unsigned seed)
      : values(static_cast<std::size_t>(nj * nk), kHole), bed(values.size(), -30.0f) {
    std::mt19937 random(seed);
    for (std::size_t i = 0; i < values.size(); ++i) {
      if (random() % 9 == 0) values[i] = static_cast<float>(random() % 2000) * 0.01f;
    }
    for (std::int32_t k = 8; k < 27; ++k) {
      for (std::int32_t j = 8; j < 27; ++j) values[static_cast<std::size_t>(k * nj + j)] = kHole;
    }
    for (std::int32_t k = 20; k < 26; ++k) {
      for (std::int32_t j = 30; j < 37; ++j) bed[static_cast<std::size_t>(k * nj + j)] = kLand;
    }
  }
  std::vector<float> values, bed;
};

RunSettings layerSettings(std::int32_t filterType) {
  RunSettings s = testing::withLimit(7);
  s.SearchRadius = 6.5f;
  s.ErrorVariance = 5.0f;
  s.jx = 50;
  s.kx = 40;
  s.FilterType = filterType;
  s.FilterOperations = 2;
  s.MinData = 1.0f;
  s.MaxData = 18.0f;
  return s;
}

struct LayerResult {
  std::vector<float> values;
  std::int32_t successes = 0, failures = 0;
};

LayerResult analyse(const RandomLayer& layer, const RunSettings& s, int threads) {
  LayerResult result;
  result.values = layer.values;
  std::vector<float> bed = layer.bed;
  FloatGrid2D grid{0, 0, RandomLayer::nj, RandomLayer::nk, result.values.data()};
  FloatGrid2D bedGrid{0, 0, RandomLayer::nj, RandomLayer::nk, bed.data()};
  const LayerAnalysisInput input{&bedGrid, kLand, kHoleWide, 4, 3, 0};
  OaWorkspace ws;
  LayerTeam team;
  team.threads = threads;
  const std::int32_t nData = countDataCells(grid, kHoleWide);
  result.successes = analyseLayer(ws, grid, nData, input, 0, result.failures, s, team);
  return result;
}

TEST(AnalyseLayerThreads, EveryThreadCountGivesTheSameBits) {
  for (std::int32_t filterType : {0, 1}) {
    const RandomLayer layer(5u + static_cast<unsigned>(filterType));
    const RunSettings s = layerSettings(filterType);
    const LayerResult one = analyse(layer, s, 1);
    ASSERT_GT(one.successes, 1000);
    ASSERT_GT(one.failures, 0);  // nodes amid the empty square fail
    for (int threads : {2, 3, 7}) {
      SCOPED_TRACE(::testing::Message() << "filter " << filterType << ", threads " << threads);
      const LayerResult many = analyse(layer, s, threads);
      EXPECT_EQ(many.successes, one.successes);
      EXPECT_EQ(many.failures, one.failures);
      ASSERT_EQ(std::memcmp(many.values.data(), one.values.data(),
                            one.values.size() * sizeof(float)),
                0);
    }
  }
}

TEST(InverseCache, KeptInversesGiveTheEstimatesOfFreshOnes) {
  // Walk the nodes of a random layer line by line, as a thread does: nodes
  // that choose the cells of an inverse made on this line or the one before
  // reuse it, others build their own. Every estimate, failure and error
  // variance must equal the one made without the cache, bit for bit, also
  // when the cache has room for a single inverse.
  const RandomLayer layer(17u);
  RunSettings s = layerSettings(0);
  s.ErrorVariance = 0.0f;  // some matrices fail: failures are kept too
  std::vector<std::array<float, 3>> cells;
  for (std::int32_t j = 0; j < RandomLayer::nj; ++j) {
    for (std::int32_t k = 0; k < RandomLayer::nk; ++k) {
      const float v = layer.values[static_cast<std::size_t>(k * RandomLayer::nj + j)];
      if (v != kHole) cells.push_back({float(j), float(k), v});
    }
  }
  const auto n = static_cast<std::int32_t>(cells.size());
  std::vector<int> foundAgain;
  for (const std::int64_t lineNodes : {std::int64_t{RandomLayer::nk}, std::int64_t{0}}) {
    SCOPED_TRACE(::testing::Message() << "room for " << lineNodes + 1 << " inverses");
    testing::ScopedWorkspace cached(n, RandomLayer::nj, RandomLayer::nk, s);
    testing::ScopedWorkspace fresh(n, RandomLayer::nj, RandomLayer::nk, s);
    cached.setCells(cells);
    fresh.setCells(cells);
    InverseCache cache(s.CorrelationSampleSize, lineNodes, true);
    std::vector<std::int32_t> previous;
    int fromEarlierNodes = 0, failures = 0, estimates = 0;
    for (std::int32_t j = 0; j < RandomLayer::nj; ++j) {
      cache.startLine();
      for (std::int32_t k = 0; k < RandomLayer::nk; ++k) {
        const std::int32_t m = selectData(cached.ws, j, k, s);
        ASSERT_EQ(selectData(fresh.ws, j, k, s), m);
        const std::vector<std::int32_t> chosen(cached.ws.selIndex, cached.ws.selIndex + m);
        const std::int64_t reusedBefore = cache.reused;
        float a = -7.0f, b = -7.0f;
        const std::int32_t ra = OBJAN(cached.ws, m, &a, s, &cache);
        const std::int32_t rb = OBJAN(fresh.ws, m, &b, s);
        ASSERT_EQ(ra, rb) << j << "," << k;
        ASSERT_EQ(std::memcmp(&a, &b, sizeof a), 0) << j << "," << k << ": " << a << " " << b;
        if (cache.reused > reusedBefore && chosen != previous) ++fromEarlierNodes;
        previous = chosen;
        if (ra != 0) {
          ASSERT_STREQ(cached.ws.errorText, fresh.ws.errorText);
          ++failures;
          continue;
        }
        ++estimates;
        const float ea = estimateErrorVariance(cached.ws, cache, m);
        const float eb = estimateErrorVariance(fresh.ws, m);
        ASSERT_EQ(std::memcmp(&ea, &eb, sizeof ea), 0) << j << "," << k << ": " << ea << " " << eb;
      }
    }
    EXPECT_GT(failures, 0);
    EXPECT_LT(cache.reused, estimates + failures);
    foundAgain.push_back(fromEarlierNodes);
  }
  // With room for a line, inverses are found again well beyond the node right
  // before; with room for one, hardly.
  EXPECT_GT(foundAgain[0], 30);
  EXPECT_LT(foundAgain[1] * 3, foundAgain[0]);
}

TEST(ObjectiveAnalysisThreads, WholePassIsTheSameForAnyThreadCount) {
  // Several levels, some of them without any data, the footprint inside the grid.
  const auto run = [](int threads, std::string& log) {
    testing::TestRun run(33, 27, 5, -40.0f);
    run.settings = testing::withLimit(5);
    run.settings.jx = 28;
    run.settings.kx = 22;
    run.settings.lx = 4;
    run.settings.SearchRadius = 5.0f;
    run.settings.ErrorVariance = 2.0f;
    run.settings.FilterOperations = 1;
    run.setBed(10, 10, kLand);
    std::vector<testing::Observation> observations;
    std::mt19937 random(3);
    for (int i = 0; i < 160; ++i) {
      const double z = (random() % 2 == 0) ? 0.0 : 2.0;  // levels 1, 3, 4 stay empty
      observations.push_back({static_cast<double>(random() % 3300) * 0.01,
                              static_cast<double>(random() % 2700) * 0.01, z,
                              static_cast<double>(random() % 100) * 0.1});
    }
    run.settings.MaxExtrapolationDistance[0] = run.settings.MaxExtrapolationDistance[1] = 0.0f;
    const std::int32_t last = run.observe(observations);
    testing::LogCapture capture;
    objectiveAnalysis(last, 2, 2, 0, run.state, run.context(threads));
    log = capture.text();
    return run.values();
  };
  std::string logOne;
  const std::vector<float> one = run(1, logOne);
  ASSERT_NE(logOne.find("No. of unsuccesful interpolations"), std::string::npos);
  for (int threads : {2, 7}) {
    std::string log;
    const std::vector<float> many = run(threads, log);
    EXPECT_EQ(log, logOne) << threads;
    ASSERT_EQ(std::memcmp(many.data(), one.data(), one.size() * sizeof(float)), 0) << threads;
  }
}

}  // namespace
}  // namespace karnet
