#ifndef KARNET_CONTROL_RUN_DRIVER_H_
#define KARNET_CONTROL_RUN_DRIVER_H_

#include <cstdint>
#include <string>

namespace karnet {

struct RunState;
struct RunSummary;

// How the program was started, as far as the run needs it.
struct RunInvocation {
  std::string commandLine;  // program and arguments, recorded in the result's history
  bool quiet = false;       // no summary on stderr at the end of the run
};

// Installs the signal handlers, initialises the run, runs the phases, frees the
// run arrays, writes the summary to stderr and ends the process ("Successful",
// exit code 0). Every error ends the process from where it occurs.
[[noreturn]] void runDriver(const RunInvocation& invocation = RunInvocation{});

// Scanning, bathymetry scan, interpolation, extraction and result file, in order.
// Returns the result writer's result; fills summary when given.
int runPhases(const RunInvocation& invocation = RunInvocation{}, RunSummary* summary = nullptr);

void freeRunArrays(RunState& state);

// "\nERROR: %s\n" to the log, then exitRun(1).
[[noreturn]] void reportInitError(std::int32_t lineNumber, const char* message);

}  // namespace karnet

#endif  // KARNET_CONTROL_RUN_DRIVER_H_
