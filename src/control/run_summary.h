#ifndef KARNET_CONTROL_RUN_SUMMARY_H_
#define KARNET_CONTROL_RUN_SUMMARY_H_

#include <cstdint>
#include <cstdio>
#include <string>

#include "input/data_scan.h"

namespace karnet {

struct FloatGrid2D;
struct FloatGrid3D;
struct RunSettings;

// What a run made, for the lines on stderr at its end.
struct RunSummary {
  std::string resultPath;
  std::int32_t nx = 0, ny = 0, nz = 0;
  std::int64_t wetNodes = 0;        // nodes of the local grid in the water
  std::int64_t estimatedNodes = 0;  // wet nodes that got a value
  ObservationTally observations;
};

// Fewer than this share of the observations inside the grid's footprint
// suggests a wrong projection or zone.
inline constexpr double kInsideShareWarning = 0.05;

// Counts the wet nodes of the local grid (the bathymetry scan's rule: every
// water column is wet at its top level, and below where a level lies above the
// bed) and those of them that hold a value in values (the local grid, level
// l0 first), its levels on up to `threads` threads.
void countResultNodes(const FloatGrid2D& bed, double landValue, const RunSettings& settings,
                      const FloatGrid3D& values, RunSummary* summary, int threads = 1);

// Adds the wet nodes of local level l (the nodes of layer, x fastest, as
// many as bed has) and those of them that hold a value to the summary's counts.
void countResultLevel(const FloatGrid2D& bed, double landValue, const RunSettings& settings,
                      std::int32_t l, const float* layer, RunSummary* summary);

// Writes the summary lines ("karnet: ..."): the result, the grid and the
// observations (not when quiet), and the warning when few observations lie
// inside the grid (always).
void printRunSummary(std::FILE* stream, const RunSummary& summary, bool quiet);

}  // namespace karnet

#endif  // KARNET_CONTROL_RUN_SUMMARY_H_
