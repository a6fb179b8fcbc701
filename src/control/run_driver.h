#ifndef KARNET_CONTROL_RUN_DRIVER_H_
#define KARNET_CONTROL_RUN_DRIVER_H_

#include <memory>
#include <string>

#include "control/cross_validate_request.h"
#include "input/cartography.h"
#include "params/run_parameters.h"
#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

struct RunSummary;

// How the program was started, as far as the run needs it.
struct RunInvocation {
  std::string commandLine;  // program and arguments, recorded in the result's history
  bool quiet = false;       // no summary on stderr at the end of the run
  int threads = 1;          // threads of the layer loops
  CrossValidationRequest crossValidation;  // --cross-validate, --sweep: no result, a table
};

// Everything one run holds from its setup to its end. The driver owns it; the
// phases get the arrays by reference and the rest through a RunContext.
struct Run {
  RunParameters parameters{};
  RunSettings settings;
  std::unique_ptr<Cartography> cartography;
  RunState state;
  RunInvocation invocation;
};

// Reads the parameter file and the bathymetry header, derives and validates
// the settings and places the map projection at the bathymetry origin.
// Throws a RunError on failure.
void setupRun(const char* parameterFile, Run& run);

// Installs the signal handlers, initialises the run, runs the phases, frees
// the run arrays, restores the handlers and writes the summary to stderr.
// Throws a RunError on failure.
void runDriver(Run& run);

// Scanning, bathymetry scan, interpolation, extraction and result file, in
// order. Returns the result writer's result; fills summary when given, and
// writeProblem with why the result could not be written.
int runPhases(Run& run, RunSummary* summary = nullptr, std::string* writeProblem = nullptr);

// The whole run of a parameter file as invoked: setup and driver, then the
// end of the process, "Successful" with exit code 0 or, for an error thrown
// anywhere below, its log lines, message and exit code. The one place where a
// run ends.
[[noreturn]] void runProgram(const char* parameterFile, const RunInvocation& invocation);

}  // namespace karnet

#endif  // KARNET_CONTROL_RUN_DRIVER_H_
