#ifndef KARNET_INPUT_RUN_INITIALISE_H_
#define KARNET_INPUT_RUN_INITIALISE_H_

namespace karnet {

struct RunState;
struct RunContext;

// Opens and counts the observation file, allocates the observation arrays,
// builds the result description (its origin through the run's map projection)
// and allocates the local result grid. Throws a RunError for the log
// ("\nERROR: ...\n") on failure.
void runInitialise(RunState& state, const RunContext& context);

}  // namespace karnet

#endif  // KARNET_INPUT_RUN_INITIALISE_H_
