// Small run states for the interpolation tests: a basic grid with its fields
// and work layers, observations given in basic-grid units.
#ifndef KARNET_TESTS_INTERP_INTERP_FIXTURE_H_
#define KARNET_TESTS_INTERP_INTERP_FIXTURE_H_

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "control/log.h"
#include "control/progress.h"
#include "params/run_settings.h"
#include "state/run_state.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet::testing {

inline constexpr float kEmpty = kDeleteValueFloat;
inline constexpr double kLand = 1.0e10;  // exactly a float, as the bathymetry holds it

struct Observation {
  double x, y, z, value;
};

// Owns a RunState whose basic grid is nj x nk x nl with origin 0 and whose
// local grid is the whole basic grid unless the settings say otherwise.
class TestRun {
 public:
  TestRun(std::int32_t nj, std::int32_t nk, std::int32_t nl) {
    basic(state.basicValues, nj, nk, nl);
    basic(state.basicBathymetry, nj, nk, nl);
    layer(state.layerValues, nj, nk);
    layer(state.layerBathymetry, nj, nk);
    grid3DFill(state.basicBathymetry, static_cast<float>(kLand));
    state.landValue = kLand;
    settings.j0 = 0;
    settings.jx = nj - 1;
    settings.k0 = 0;
    settings.kx = nk - 1;
    settings.l0 = 0;
    settings.lx = nl - 1;
    settings.dx = 1.0f;
    settings.dy = 1.0f;
    settings.dz = 1.0f;
    settings.SearchRadius = 1000.0f;
    settings.MaxExtrapolationDistance[0] = 0.0f;
    settings.MaxExtrapolationDistance[1] = 0.0f;
    settings.FilterOperations = 0;
  }
  ~TestRun() {
    grid3DFree(state.basicValues);
    grid3DFree(state.basicBathymetry);
    grid3DFree(state.localValues);
    grid2DFree(state.layerValues);
    grid2DFree(state.layerBathymetry);
    scatterDataFree(state.scatter);
  }
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

  // Makes column (j, k) wet from level `fromLevel` up to the top, with the bed
  // elevation `bed` (the bathymetry scan's picture of a water column).
  void wetColumn(std::int32_t j, std::int32_t k, std::int32_t fromLevel, float bed) {
    for (std::int32_t l = fromLevel; l < state.basicBathymetry.nl; ++l) {
      state.basicBathymetry.at(j, k, l) = bed;
    }
  }
  void wetEverywhere(float bed) {
    for (std::int32_t k = 0; k < state.basicBathymetry.nk; ++k)
      for (std::int32_t j = 0; j < state.basicBathymetry.nj; ++j) wetColumn(j, k, 0, bed);
  }

  float value(std::int32_t j, std::int32_t k, std::int32_t l) const {
    return state.basicValues.at(j, k, l);
  }

  RunState state;
  RunSettings settings;

 private:
  static void basic(FloatGrid3D& g, std::int32_t nj, std::int32_t nk, std::int32_t nl) {
    g.nj = nj;
    g.nk = nk;
    g.nl = nl;
    g.total = std::int64_t{nj} * nk * nl;
    grid3DAlloc(g);
  }
  static void layer(FloatGrid2D& g, std::int32_t nj, std::int32_t nk) {
    g.nj = nj;
    g.nk = nk;
    grid2DAlloc(g);
  }
};

// Sends the log to a temporary file for the lifetime of the object.
class LogCapture {
 public:
  LogCapture() : file_(std::tmpfile()) { logSetStream(file_); }
  ~LogCapture() {
    logSetStream(nullptr);
    if (file_ != nullptr) std::fclose(file_);
  }
  LogCapture(const LogCapture&) = delete;
  LogCapture& operator=(const LogCapture&) = delete;

  std::string text() const {
    std::fflush(file_);
    std::rewind(file_);
    std::string out;
    char buffer[512];
    std::size_t n;
    while ((n = std::fread(buffer, 1, sizeof buffer, file_)) > 0) out.append(buffer, n);
    return out;
  }

 private:
  std::FILE* file_;
};

// Counts the clock readings of the progress layer: one at every start and one
// at every report.
class ProgressCounter {
 public:
  ProgressCounter() {
    readings = 0;
    progressSetClock(&tick);
  }
  ~ProgressCounter() { progressSetClock(nullptr); }
  ProgressCounter(const ProgressCounter&) = delete;
  ProgressCounter& operator=(const ProgressCounter&) = delete;

  static inline std::int64_t readings = 0;

 private:
  static std::int64_t tick() {
    ++readings;
    return 0;
  }
};

}  // namespace karnet::testing

#endif  // KARNET_TESTS_INTERP_INTERP_FIXTURE_H_
