// Shared set-up for the objective analysis tests.
#ifndef KARNET_TESTS_ANALYSIS_ANALYSIS_FIXTURES_H_
#define KARNET_TESTS_ANALYSIS_ANALYSIS_FIXTURES_H_

#include <array>
#include <cstdint>
#include <vector>

#include "analysis/workspace.h"
#include "params/run_settings.h"

namespace karnet::testing {

// The delete value as stored in a float cell, and widened.
constexpr float kHole = -1e-30f;
constexpr double kHoleWide = static_cast<double>(kHole);

// Unit node spacing, so that distances in the parameters are in node units.
inline RunSettings withLimit(std::int32_t limit) {
  RunSettings s;
  s.dx = s.dy = s.dz = 1.0f;
  s.SearchRadius = 100.0f;
  s.DecayDistance = 3.0f;
  s.ZeroCrossingDistance = 8.0f;
  s.CorrelationSampleSize = limit;
  s.MinData = -1e6f;
  s.MaxData = 1e6f;
  return s;
}

// A workspace set up for one layer and released when the test ends.
struct ScopedWorkspace {
  ScopedWorkspace(std::int32_t nData, std::int32_t nj, std::int32_t nk, const RunSettings& s) {
    workspaceSetUp(ws, nData, nj, nk, s);
  }
  ~ScopedWorkspace() { workspaceRelease(ws); }
  ScopedWorkspace(const ScopedWorkspace&) = delete;
  ScopedWorkspace& operator=(const ScopedWorkspace&) = delete;

  // Stores the layer's data cells {x, y, value} in the given order.
  void setCells(const std::vector<std::array<float, 3>>& cells) {
    for (std::size_t i = 0; i < cells.size(); ++i) {
      ws.dataX[i] = cells[i][0];
      ws.dataY[i] = cells[i][1];
      ws.dataValue[i] = cells[i][2];
    }
    ws.dataCount = static_cast<std::int32_t>(cells.size());
  }
  OaWorkspace ws;
};

}  // namespace karnet::testing

#endif  // KARNET_TESTS_ANALYSIS_ANALYSIS_FIXTURES_H_
