#ifndef KARNET_INPUT_RUN_INITIALISE_H_
#define KARNET_INPUT_RUN_INITIALISE_H_

namespace karnet {

struct RunState;
struct RunSettings;

// Opens and counts the observation file, allocates the observation arrays,
// builds the result description, places the map projection at (0, 0) and
// allocates the local result grid. Ends the run through reportInitError on failure.
void runInitialise(RunState& state, const RunSettings& settings);

}  // namespace karnet

#endif  // KARNET_INPUT_RUN_INITIALISE_H_
