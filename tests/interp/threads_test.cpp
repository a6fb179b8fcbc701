// The bilinear / distance-weighted analysis on several threads: the same bits
// and statistics for any number of threads, with many levels or one.
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "interp/interp.h"
#include "interp_fixture.h"

namespace karnet {
namespace {

using testing::kLand;

struct Outcome {
  std::vector<float> values;
  std::string log;
};

// A 71 x 53 basic grid with scattered observations on nl levels, a dry block,
// a footprint with a margin, and two smoothing passes.
Outcome runInterp(std::int32_t nl, int threads) {
  testing::TestRun run(71, 53, nl, -60.0f);
  run.settings.jx = 64;
  run.settings.kx = 47;
  run.settings.lx = nl - 1;
  run.settings.SearchRadius = 9.0f;
  run.settings.FilterOperations = 2;
  for (std::int32_t k = 12; k < 19; ++k) {
    for (std::int32_t j = 40; j < 48; ++j) run.setBed(j, k, kLand);
  }
  std::mt19937 random(nl * 7 + 1);
  std::vector<testing::Observation> observations;
  for (int i = 0; i < 40 * nl; ++i) {
    observations.push_back({static_cast<double>(random() % 7000) * 0.01,
                            static_cast<double>(random() % 5200) * 0.01,
                            static_cast<double>(random() % nl),
                            static_cast<double>(random() % 300) * 0.1});
  }
  const std::int32_t last = run.observe(observations);
  testing::LogCapture capture;
  interp(last, 3, 2, 0, run.state, run.context(threads));
  return Outcome{run.values(), capture.text()};
}

TEST(InterpThreads, EveryThreadCountGivesTheSameBitsAndCounts) {
  for (std::int32_t nl : {1, 6}) {
    const Outcome one = runInterp(nl, 1);
    ASSERT_NE(one.log.find("No. of bilinear interpolations"), std::string::npos);
    for (int threads : {2, 3, 7}) {
      SCOPED_TRACE(::testing::Message() << nl << " levels, " << threads << " threads");
      const Outcome many = runInterp(nl, threads);
      EXPECT_EQ(many.log, one.log);
      ASSERT_EQ(many.values.size(), one.values.size());
      ASSERT_EQ(std::memcmp(many.values.data(), one.values.data(),
                            one.values.size() * sizeof(float)),
                0);
    }
  }
}

}  // namespace
}  // namespace karnet
