#ifndef KARNET_INPUT_BATHYMETRY_SCAN_H_
#define KARNET_INPUT_BATHYMETRY_SCAN_H_

#include <cstdint>

namespace karnet {

struct RunState;
struct RunSettings;

// Fills the wet/dry field of the basic grid: inside the local grid's footprint
// and levels, a node of a water column whose level lies above the bed (the
// top level always) holds the column's bed value; every other node holds the
// land value. Levels go to up to `threads` threads.
void bathymetryScan(std::int32_t jOff, std::int32_t kOff, std::int32_t lOff, RunState& state,
                    const RunSettings& settings, int threads = 1);

}  // namespace karnet

#endif  // KARNET_INPUT_BATHYMETRY_SCAN_H_
