#ifndef KARNET_CONTROL_RUN_DRIVER_H_
#define KARNET_CONTROL_RUN_DRIVER_H_

#include <cstdint>

namespace karnet {

struct RunState;

// Installs the signal handlers, initialises the run, runs the phases, frees the
// run arrays and ends the process ("Successful", exit code 0). Every error ends
// the process from where it occurs.
[[noreturn]] void runDriver();

// Scanning, bathymetry scan, interpolation, extraction and result file, in order.
// Returns the result writer's result.
int runPhases();

void freeRunArrays(RunState& state);

// "\nERROR: %s\n" to the log, then exitRun(1).
[[noreturn]] void reportInitError(std::int32_t lineNumber, const char* message);

}  // namespace karnet

#endif  // KARNET_CONTROL_RUN_DRIVER_H_
