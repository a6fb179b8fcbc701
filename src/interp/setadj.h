#ifndef KARNET_INTERP_SETADJ_H_
#define KARNET_INTERP_SETADJ_H_

#include <cstdint>

#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

// Observation gridding: bins observations 0..lastObs (basic-grid units in
// state.scatter) to their nearest basic node, averages those sharing a node,
// and completes every column vertically (gap filling between data levels,
// bounded extension towards the bed and up to the top level).
// Rewrites state.basicValues completely; reads state.basicBathymetry,
// state.landValue and the delete value of state.resultDescription.
// An observation whose rounded node lies outside the basic grid is skipped.
void setadj(std::int32_t lastObs, RunState& state, const RunSettings& settings, int threads = 1);

}  // namespace karnet

#endif  // KARNET_INTERP_SETADJ_H_
