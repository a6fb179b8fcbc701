// Small run states for the interpolation tests: a basic grid with its fields
// and work layers, observations given in basic-grid units.
#ifndef KARNET_TESTS_INTERP_INTERP_FIXTURE_H_
#define KARNET_TESTS_INTERP_INTERP_FIXTURE_H_

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "control/log.h"
#include "params/run_settings.h"
#include "state/run_context.h"
#include "state/run_state.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet::testing {

inline constexpr float kEmpty = kDeleteValueFloat;
inline constexpr double kLand = 1.0e10;  // exactly a float, as the bathymetry holds it

struct Observation {
  double x, y, z, value;
};

// Owns a RunState whose basic grid is nj x nk x nl with origin 0, every level
// of every column wet above a bed at `bed` (kLand: all dry); the local grid is
// the whole basic grid, node spacing 1.
class TestRun {
 public:
  TestRun(std::int32_t nj, std::int32_t nk, std::int32_t nl, float bed = -50.0f) {
    for (FloatGrid3D* g : {&state.basicValues, &state.basicBathymetry}) {
      *g = FloatGrid3D{0, 0, 0, nj, nk, nl, 1, 1, 1, std::int64_t{nj} * nk * nl, nullptr};
      grid3DAlloc(*g);
    }
    grid3DFill(state.basicBathymetry, bed);
    state.landValue = kLand;
    settings.jx = nj - 1;
    settings.kx = nk - 1;
    settings.lx = nl - 1;
    settings.dx = settings.dy = settings.dz = 1.0f;
    settings.SearchRadius = 1000.0f;
  }
  ~TestRun() { releaseAll(state); }
  TestRun(const TestRun&) = delete;
  TestRun& operator=(const TestRun&) = delete;

  // Puts the observations into the scatter arrays; returns lastObs.
  std::int32_t observe(const std::vector<Observation>& observations) {
    scatterDataAlloc(state.scatter, static_cast<std::int64_t>(observations.size()));
    for (std::size_t i = 0; i < observations.size(); ++i) {
      state.scatter.x[i] = observations[i].x;
      state.scatter.y[i] = observations[i].y;
      state.scatter.z[i] = observations[i].z;
      state.scatter.value[i] = observations[i].value;
    }
    return static_cast<std::int32_t>(observations.size()) - 1;
  }

  // Gives column (j, k) the bed `bed` from level `fromLevel` up (the bathymetry
  // scan's picture of a water column; kLand makes it dry).
  void setBed(std::int32_t j, std::int32_t k, double bed, std::int32_t fromLevel = 0) {
    for (std::int32_t l = fromLevel; l < state.basicBathymetry.nl; ++l)
      state.basicBathymetry.at(j, k, l) = static_cast<float>(bed);
  }

  float value(std::int32_t j, std::int32_t k, std::int32_t l) const {
    return state.basicValues.at(j, k, l);
  }
  // The context of a run of these settings, its report going to the log.
  RunContext context(int threads = 1) const { return RunContext{settings, runLog(), nullptr, threads}; }

  std::vector<float> values() const {
    return {state.basicValues.data, state.basicValues.data + state.basicValues.total};
  }

  RunState state;
  RunSettings settings;
};

// Sends the log to a temporary file for the lifetime of the object.
struct LogCapture {
  LogCapture() { logSetStream(file); }
  ~LogCapture() {
    logSetStream(nullptr);
    std::fclose(file);
  }
  std::string text() const {
    std::string out(1 << 16, '\0');
    std::rewind(file);
    out.resize(std::fread(out.data(), 1, out.size(), file));
    return out;
  }
  std::FILE* file = std::tmpfile();
};

}  // namespace karnet::testing

#endif  // KARNET_TESTS_INTERP_INTERP_FIXTURE_H_
