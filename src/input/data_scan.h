#ifndef KARNET_INPUT_DATA_SCAN_H_
#define KARNET_INPUT_DATA_SCAN_H_

#include <cstdint>

namespace karnet {

struct RunState;
struct RunContext;

// Reads and rotates the observations into the grid frame, lays the basic grid
// over the observations and the local grid, converts the observations to
// basic-grid units, allocates the basic-grid fields and logs the basic grid.
// Hands back the last observation's index and the basic node of the local
// grid's first node. On failure releases the run's arrays (releaseAll) and
// throws a RunError for the log.
void dataScan(RunState& state, const RunContext& context, const char* bathymetryFile,
              std::int32_t* lastObs, std::int32_t* jOff, std::int32_t* kOff,
              std::int32_t* lOff);

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
