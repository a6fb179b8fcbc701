#ifndef KARNET_INPUT_DATA_SCAN_H_
#define KARNET_INPUT_DATA_SCAN_H_

#include <cstdint>
#include <string>

namespace karnet {

struct RunState;
struct RunContext;

// Where the observations of a run lie, counted while data scanning converts
// them to basic-grid units. Every observation read falls in exactly one of
// inside (in the water of the local grid), outside, onLand and belowBed.
struct ObservationTally {
  std::int64_t read = 0;
  std::int64_t inside = 0;    // binned to a wet column of the local grid, at or above its bed
  std::int64_t outside = 0;   // binned to a column outside the local grid's footprint
  std::int64_t onLand = 0;    // binned to a land column of the local grid
  std::int64_t belowBed = 0;  // in a water column, but deeper than its bed
};

// Reads and rotates the observations into the grid frame, lays the basic grid
// over the observations and the local grid, converts the observations to
// basic-grid units, allocates the basic-grid fields and logs the basic grid.
// Hands back the last observation's index and the basic node of the local
// grid's first node, and counts where the observations lie (when tally is
// given). On failure releases the run's arrays (releaseAll) and throws a
// RunError for the log; that of a bad observation line also carries
// "karnet: FILE:LINE: REASON" for stderr.
void dataScan(RunState& state, const RunContext& context, const char* bathymetryFile,
              std::int32_t* lastObs, std::int32_t* jOff, std::int32_t* kOff,
              std::int32_t* lOff, ObservationTally* tally = nullptr);

// Why an observation line cannot be read ("not a number: \"lon\"", "empty
// line", ...); empty when it holds four finite numbers.
std::string observationLineProblem(const char* line);

// One axis of the basic grid, from the extents of the data on that axis, the
// local grid's first node position, spacing, first index and span.
struct BasicAxis {
  double origin = 0;        // basic grid origin on this axis
  std::int64_t offset = 0;  // basic node of the local grid's first node
  std::int64_t count = 0;   // basic grid node count
  bool originWarning = false;  // data begin above the local grid's first node
};
BasicAxis layBasicAxis(double dataMin, double dataMax, double localFirst, float spacing,
                       std::int32_t firstIndex, std::int32_t lastIndex);

}  // namespace karnet

#endif  // KARNET_INPUT_DATA_SCAN_H_
