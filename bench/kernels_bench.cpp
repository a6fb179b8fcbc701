// Timings of the analysis kernels: the matrix inversion per instruction set,
// the data selection, the quadrant search, and whole layers of both methods.
// Layers are random but fixed (seeded), so a run can be compared with another.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <random>
#include <vector>

#include "analysis/invmtx.h"
#include "analysis/objective_analysis.h"
#include "analysis/select_data.h"
#include "analysis/workspace.h"
#include "control/log.h"
#include "interp/interp.h"
#include "interp/search.h"
#include "interp/interp_fixture.h"

namespace karnet {
namespace {

constexpr float kHole = -1e-30f;

// A layer of nj x nk nodes in which each node holds data with the given
// probability (a smooth field plus noise), the rest empty.
std::vector<float> randomLayer(std::int32_t nj, std::int32_t nk, double density,
                               std::uint32_t seed) {
  std::vector<float> layer(static_cast<std::size_t>(nj) * nk, kHole);
  std::mt19937 random(seed);
  std::bernoulli_distribution hasData(density);
  std::normal_distribution<float> noise(0.0f, 0.5f);
  for (std::int32_t k = 0; k < nk; ++k) {
    for (std::int32_t j = 0; j < nj; ++j) {
      if (!hasData(random)) continue;
      layer[static_cast<std::size_t>(k) * nj + j] =
          10.0f + 5.0f * static_cast<float>(j) / nj - 3.0f * static_cast<float>(k) / nk +
          noise(random);
    }
  }
  return layer;
}

// Settings in node units (dx = 1) with the given search radius and limit.
RunSettings analysisSettings(std::int32_t nj, std::int32_t nk, float radius, std::int32_t limit) {
  RunSettings s;
  s.dx = s.dy = s.dz = 1.0f;
  s.jx = nj - 1;
  s.kx = nk - 1;
  s.SearchRadius = radius;
  s.DecayDistance = radius / 2.0f;
  s.ZeroCrossingDistance = radius * 1.5f;
  s.ErrorVariance = 10.0f;
  s.CorrelationSampleSize = limit;
  s.MinData = -5.0f;
  s.MaxData = 40.0f;
  return s;
}

// Gauss-Jordan inversion of an n x n correlation-like matrix (the run's case;
// workload L mostly inverts n = 6),
// per compiled variant (0 baseline, 1 AVX2, 2 AVX-512, 3 AVX2 on padded rows).
void BM_Invmtx(benchmark::State& state) {
  const auto variant = kInvmtxVariants[state.range(0)];
  const auto n = static_cast<std::int32_t>(state.range(1));
  if (!invmtxVariantAvailable(variant)) {
    state.SkipWithError("variant not available on this processor");
    return;
  }
  state.SetLabel(invmtxVariantName(variant));
  OaWorkspace ws;
  workspaceSetUp(ws, 0, 1, 1, analysisSettings(1, 1, 10.0f, n));
  std::mt19937 random(7);
  std::uniform_real_distribution<float> x(0.0f, 20.0f);
  std::vector<float> px(static_cast<std::size_t>(n)), py(px.size());
  for (std::int32_t i = 0; i < n; ++i) px[i] = x(random), py[i] = x(random);
  std::vector<float> a(static_cast<std::size_t>(n) * n);
  for (std::int32_t i = 0; i < n; ++i)
    for (std::int32_t q = 0; q < n; ++q) {
      const float d2 = (px[i] - px[q]) * (px[i] - px[q]) + (py[i] - py[q]) * (py[i] - py[q]);
      a[static_cast<std::size_t>(i) * n + q] = (i == q ? 0.1f : 0.0f) + std::exp(-d2 / 50.0f);
    }
  float det = 0.0f;
  for (auto _ : state) {
    std::copy(a.begin(), a.end(), ws.matrix);
    benchmark::DoNotOptimize(invmtxWith(variant, ws, ws.matrix, n, det));
    benchmark::ClobberMemory();
  }
  workspaceRelease(ws);
}
BENCHMARK(BM_Invmtx)->ArgsProduct({{0, 1, 2, 3}, {6, 20, 50}});

// Data selection for every node of a 300 x 300 layer, nodes in the layer
// pass's order (column by column). Arguments: data density in per mille,
// search radius in nodes, CorrelationSampleSize.
void BM_SelectData(benchmark::State& state) {
  constexpr std::int32_t kSize = 300;
  const double density = static_cast<double>(state.range(0)) / 1000.0;
  const RunSettings settings = analysisSettings(kSize, kSize, static_cast<float>(state.range(1)),
                                                static_cast<std::int32_t>(state.range(2)));
  const std::vector<float> layer = randomLayer(kSize, kSize, density, 3);
  OaWorkspace ws;
  const auto nData = static_cast<std::int32_t>(
      std::count_if(layer.begin(), layer.end(), [](float v) { return v != kHole; }));
  workspaceSetUp(ws, nData, kSize, kSize, settings);
  std::int32_t i = 0;
  for (std::int32_t j = 0; j < kSize; ++j)
    for (std::int32_t k = 0; k < kSize; ++k) {
      const float v = layer[static_cast<std::size_t>(k) * kSize + j];
      if (v == kHole) continue;
      ws.dataX[i] = static_cast<float>(j), ws.dataY[i] = static_cast<float>(k);
      ws.dataValue[i++] = v;
    }
  ws.dataCount = i;
  workspaceIndexColumns(ws, kSize);
  std::int64_t chosen = 0;
  for (auto _ : state) {
    for (std::int32_t j = 0; j < kSize; ++j)
      for (std::int32_t k = 0; k < kSize; ++k) chosen += selectData(ws, j, k, settings);
  }
  benchmark::DoNotOptimize(chosen);
  state.SetItemsProcessed(state.iterations() * kSize * kSize);
  workspaceRelease(ws);
}
BENCHMARK(BM_SelectData)->Args({20, 10, 20})->Args({250, 20, 50});

// Quadrant search for every empty node of a 1000 x 1000 layer with 2 % data
// and a reach of 10 nodes (workload L), nodes row by row as the bilinear pass
// visits them. Argument: 0 the plain ring walk, 1 the table search (the
// tables built once per pass, as for each layer of a run).
void BM_QuadrantSearch(benchmark::State& state) {
  constexpr std::int32_t kSize = 1000;
  std::vector<float> values = randomLayer(kSize, kSize, 0.02, 5);
  const FloatGrid2D layer{0, 0, kSize, kSize, values.data()};
  const bool indexed = state.range(0) != 0;
  state.SetLabel(indexed ? "tables" : "ring walk");
  SearchTables tables(kSize, kSize);
  std::int32_t jHit[kHitListSize], kHit[kHitListSize];
  std::int64_t hits = 0, searches = 0;
  for (auto _ : state) {
    if (indexed) tables.build(layer, kHole);
    for (std::int32_t k = 0; k < kSize; ++k)
      for (std::int32_t j = 0; j < kSize; ++j) {
        if (values[static_cast<std::size_t>(k) * kSize + j] != kHole) continue;
        hits += indexed ? tables.search(j, k, 10.0f, jHit, kHit)
                        : search(j, k, layer, 10.0f, kHole, jHit, kHit);
        ++searches;
      }
  }
  benchmark::DoNotOptimize(hits);
  state.SetItemsProcessed(searches);
}
BENCHMARK(BM_QuadrantSearch)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

// Casts at a share of the columns of an nj x nk x 1 run.
std::int32_t observeCasts(testing::TestRun& run, double density, std::uint32_t seed) {
  std::vector<testing::Observation> observations;
  const FloatGrid3D& g = run.state.basicValues;
  const std::vector<float> layer = randomLayer(g.nj, g.nk, density, seed);
  for (std::int32_t k = 0; k < g.nk; ++k)
    for (std::int32_t j = 0; j < g.nj; ++j) {
      const float v = layer[static_cast<std::size_t>(k) * g.nj + j];
      if (v != kHole) observations.push_back({double(j), double(k), 0.0, double(v)});
    }
  return run.observe(observations);
}

// One 500 x 500 layer of the bilinear method with 2 % data and a reach of 10
// nodes, observation gridding included.
void BM_BilinearLayer(benchmark::State& state) {
  std::FILE* sink = std::fopen("/dev/null", "w");
  logSetStream(sink);
  testing::TestRun run(500, 500, 1);
  run.settings.SearchRadius = 10.0f;
  const std::int32_t lastObs = observeCasts(run, 0.02, 9);
  for (auto _ : state) interp(lastObs, 0, 0, 0, run.state, run.context());
  state.SetItemsProcessed(state.iterations() * 500 * 500);
  logSetStream(nullptr);
  std::fclose(sink);
}
BENCHMARK(BM_BilinearLayer)->Unit(benchmark::kMillisecond);

// One layer of the objective analysis (analyseLayer). Arguments: layer size,
// data density in per mille, search radius in nodes, CorrelationSampleSize,
// FilterOperations (Shapiro), and 1 to write the error field as well.
void BM_ObjectiveAnalysisLayer(benchmark::State& state) {
  const auto size = static_cast<std::int32_t>(state.range(0));
  RunSettings settings = analysisSettings(size, size, static_cast<float>(state.range(2)),
                                          static_cast<std::int32_t>(state.range(3)));
  settings.FilterOperations = static_cast<std::int32_t>(state.range(4));
  const std::vector<float> layer =
      randomLayer(size, size, static_cast<double>(state.range(1)) / 1000.0, 2024);
  std::vector<float> bed(layer.size(), -20.0f);
  const FloatGrid2D bedGrid{0, 0, size, size, bed.data()};
  LayerAnalysisInput input{&bedGrid, 999.0, static_cast<double>(kHole), 0, 0, 0};
  std::vector<float> errors(layer.size(), kHole);
  FloatGrid3D errorField;
  errorField.nj = errorField.nk = size;
  errorField.nl = 1;
  errorField.total = std::int64_t{size} * size;
  errorField.data = errors.data();
  if (state.range(5) != 0) input.errorField = &errorField;
  std::vector<float> work;
  for (auto _ : state) {
    state.PauseTiming();
    work = layer;
    state.ResumeTiming();
    FloatGrid2D grid{0, 0, size, size, work.data()};
    OaWorkspace ws;
    std::int32_t failures = 0;
    const std::int32_t nData = countDataCells(grid, input.deleteValue);
    benchmark::DoNotOptimize(analyseLayer(ws, grid, nData, input, 0, failures, settings));
  }
  state.SetItemsProcessed(state.iterations() * size * size);
}
BENCHMARK(BM_ObjectiveAnalysisLayer)
    ->Args({300, 20, 10, 20, 0, 0})   // workload L's density and settings
    ->Args({200, 50, 20, 20, 1, 0})   // 2000 cells in 200 x 200, smoothed
    ->Args({200, 50, 20, 20, 1, 1})   // the same with the error field
    ->Args({120, 250, 20, 50, 0, 0})  // dense: hundreds of candidates, 50 chosen
    ->Args({120, 250, 20, 50, 0, 1})  // the same with the error field
    ->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace karnet

BENCHMARK_MAIN();
