#ifndef KARNET_INTERP_INTERP_H_
#define KARNET_INTERP_INTERP_H_

#include <cstdint>

#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

struct RunContext;

// Bilinear / distance-weighted analysis: grids the observations (setadj), then
// fills every empty wet node of the local grid's footprint layer by layer from
// the quadrant neighbours of the layer as it was before the layer's pass,
// empties dry footprint nodes, smooths each layer FilterOperations times and
// writes it back into state.basicValues. Ends with the statistics block in the
// context's report. (jOff, kOff, lOff) is the basic node of the local grid's
// first node. Uses context.threads threads; the result does not depend on them.
// Throws the RunError of a cancel or an interrupt seen between rows.
void interp(std::int32_t lastObs, std::int32_t jOff, std::int32_t kOff, std::int32_t lOff,
            RunState& state, const RunContext& context);

}  // namespace karnet

#endif  // KARNET_INTERP_INTERP_H_
