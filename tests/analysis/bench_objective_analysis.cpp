// Timing of the objective analysis of one 200 x 200 layer with 2000 data cells
// and CorrelationSampleSize 20. Prints the best time of a few runs and a hash
// of the result bits, so that a faster build can be checked for equal output.
#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <random>
#include <vector>

#include "analysis/objective_analysis.h"
#include "analysis/workspace.h"

namespace {

constexpr std::int32_t kSize = 200;
constexpr std::int32_t kCells = 2000;
constexpr float kHole = -1e-30f;

// FNV-1a over the bytes of the values, lowest byte of each first.
std::uint64_t hashBits(const std::vector<float>& values) {
  std::uint64_t h = 1469598103934665603ULL;
  for (float v : values) {
    std::uint32_t bits = 0;
    std::memcpy(&bits, &v, sizeof bits);
    for (int b = 0; b < 4; ++b) h = (h ^ ((bits >> (8 * b)) & 0xFFu)) * 1099511628211ULL;
  }
  return h;
}

}  // namespace

int main(int argc, char** argv) {
  using namespace karnet;
  const int runs = argc > 1 ? std::atoi(argv[1]) : 3;

  RunSettings settings;
  settings.dx = settings.dy = 100.0f;
  settings.jx = settings.kx = kSize - 1;
  settings.SearchRadius = 2000.0f;
  settings.DecayDistance = 600.0f;
  settings.ZeroCrossingDistance = 1500.0f;
  settings.ErrorVariance = 10.0f;
  settings.CorrelationSampleSize = 20;
  settings.MinData = -5.0f;
  settings.MaxData = 40.0f;
  settings.FilterOperations = 1;  // FilterType 0

  // 2000 distinct data cells with a smooth field plus noise.
  std::vector<float> layer(static_cast<std::size_t>(kSize * kSize), kHole);
  std::mt19937 random(2024);
  std::uniform_int_distribution<int> node(0, kSize - 1);
  std::normal_distribution<float> noise(0.0f, 0.5f);
  for (int placed = 0; placed < kCells;) {
    const int j = node(random), k = node(random);
    float& cell = layer[static_cast<std::size_t>(k * kSize + j)];
    if (cell != kHole) continue;
    cell = 10.0f + 5.0f * static_cast<float>(j) / kSize - 3.0f * static_cast<float>(k) / kSize +
           noise(random);
    ++placed;
  }
  std::vector<float> bed(layer.size(), -20.0f);

  FloatGrid2D bedGrid{0, 0, kSize, kSize, bed.data()};
  LayerAnalysisInput input{&bedGrid, 999.0, static_cast<double>(kHole), 0, 0, 0};

  // Without and with the error field: the estimates must not change a bit, and
  // the error variance should cost little next to the inversions.
  std::vector<float> errors(layer.size(), kHole);
  FloatGrid3D errorField;
  errorField.nj = errorField.nk = kSize;
  errorField.nl = 1;
  errorField.total = kSize * kSize;
  errorField.data = errors.data();
  for (const bool withErrors : {false, true}) {
    input.errorField = withErrors ? &errorField : nullptr;
    double best = 1e30;
    std::uint64_t hash = 0;
    std::int32_t successes = 0, failures = 0;
    for (int r = 0; r < runs; ++r) {
      std::vector<float> work = layer;
      FloatGrid2D grid{0, 0, kSize, kSize, work.data()};
      OaWorkspace ws;
      const auto start = std::chrono::steady_clock::now();
      const std::int32_t nData = countDataCells(grid, input.deleteValue);
      successes = analyseLayer(ws, grid, nData, input, 0, failures, settings);
      const auto stop = std::chrono::steady_clock::now();
      best = std::min(best, std::chrono::duration<double>(stop - start).count());
      hash = hashBits(work);
    }
    std::printf("layer %dx%d, %d data cells, CorrelationSampleSize %d%s: best of %d runs %.3f s\n",
                kSize, kSize, kCells, settings.CorrelationSampleSize,
                withErrors ? ", with error field" : "", runs, best);
    std::printf("estimates %d, failures %d, result hash %016llx\n", successes, failures,
                static_cast<unsigned long long>(hash));
  }
  return 0;
}
