#ifndef KARNET_INTERP_GLO2LOC_H_
#define KARNET_INTERP_GLO2LOC_H_

#include <cstdint>

#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

// Copies the local grid's window, starting at basic node (jOff, kOff, lOff),
// out of state.basicValues into every node of state.localValues; levels go to
// up to `threads` threads.
void glo2loc(std::int32_t jOff, std::int32_t kOff, std::int32_t lOff, RunState& state,
             const RunSettings& settings, int threads = 1);

}  // namespace karnet

#endif  // KARNET_INTERP_GLO2LOC_H_
