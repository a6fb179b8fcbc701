#ifndef KARNET_PARAMS_RUN_SETTINGS_H_
#define KARNET_PARAMS_RUN_SETTINGS_H_

#include <cstdint>

#include "support/date_time.h"

namespace karnet {

// Run-wide settings derived from the parameters and the bathymetry header.
// Written by run setup, read-only afterwards (the phases get them through the
// RunContext).
struct RunSettings {
  std::int32_t j0 = 0, jx = 0, k0 = 0, kx = 0, l0 = 0, lx = 0;
  float dx = 0, dy = 0, dz = 0;
  double xOrigo = 0, yOrigo = 0;
  double orientation = 0;
  double landValue = 0;
  DateTime startDateTime;
  float SearchRadius = 0;
  float MaxExtrapolationDistance[2] = {0, 0};
  std::int32_t Analysis = 1;
  std::int32_t FilterType = 0;
  std::int32_t FilterOperations = 0;
  std::int32_t CorrelationSampleSize = 1;
  float ZeroCrossingDistance = 0;
  float DecayDistance = 0;
  float ErrorVariance = 0;
  float MaxData = 0;
  float MinData = 0;
  char dataFileName[260] = {};
  char projection[1024] = {};
};

}  // namespace karnet

#endif  // KARNET_PARAMS_RUN_SETTINGS_H_
