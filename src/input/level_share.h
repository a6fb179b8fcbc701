#ifndef KARNET_INPUT_LEVEL_SHARE_H_
#define KARNET_INPUT_LEVEL_SHARE_H_

#include <cstdint>
#include <vector>

#include "state/level_partition.h"

namespace karnet {

struct FloatGrid2D;
struct RunState;
struct RunSettings;

// Wet nodes of each local level l0 .. lx (element l - l0) by the wet/dry rule
// of the bathymetry scan: every water column at the top level, and at each
// lower level whose height lies above its bed.
std::vector<std::int64_t> wetNodesPerLevel(const FloatGrid2D& bed, double landValue,
                                           const RunSettings& settings);

// Decides which levels of the basic grid (nl of them, the local grid's first
// level at basic level lOff) this process holds: all of them when it runs
// alone; otherwise the local grid's levels are shared out over `ranks`
// processes in contiguous blocks balanced by wet nodes, rank 0 the top block,
// each further rank the block below the one before, and rank `rank` holds its
// block. Sets state.basicLevels, state.levelOwners and state.window and
// returns the held range.
LevelRange shareBasicLevels(RunState& state, const RunSettings& settings, std::int32_t nl,
                            std::int32_t jOff, std::int32_t kOff, std::int32_t lOff, int ranks,
                            int rank);

}  // namespace karnet

#endif  // KARNET_INPUT_LEVEL_SHARE_H_
