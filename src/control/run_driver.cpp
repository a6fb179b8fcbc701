#include "control/run_driver.h"

#include <cstdio>
#include <cstdlib>
#include <new>
#include <stdexcept>
#include <string>

#include "analysis/objective_analysis.h"
#include "control/command_line.h"
#include "control/log.h"
#include "control/progress.h"
#include "control/cross_validate_run.h"
#include "control/ranked_result.h"
#include "control/ranks.h"
#include "control/run_summary.h"
#include "control/signals.h"
#include "control/termination.h"
#include "input/bathymetry_read.h"
#include "input/bathymetry_scan.h"
#include "input/data_scan.h"
#include "input/run_initialise.h"
#include "interp/glo2loc.h"
#include "interp/interp.h"
#include "output/result_attributes.h"
#include "output/result_write.h"
#include "params/run_setup.h"
#include "state/run_context.h"
#include "support/file_check.h"
#include "support/run_error.h"

namespace karnet {
namespace {

struct DescriptionDeleter {
  void operator()(FileDescription* description) const { descriptionFree(description); }
};

RunContext contextOf(Run& run) {
  return RunContext{run.settings, runLog(), run.cartography.get(), run.invocation.threads};
}

}  // namespace

void setupRun(const char* parameterFile, Run& run) {
  std::string parameterProblem;
  const bool read = readParameterFile(parameterFile, run.parameters, &parameterProblem) != 0;
  // The log file was opened without emptying it: one of the run's inputs (as
  // far as the parameter file names them) of the log's name stays as it is,
  // and the log goes to the standard error stream instead.
  const bool logIsInput = logIsOwnInput(run.parameters, parameterFile);
  if (logIsInput) {
    logDiscardHeld();
  } else {
    logRelease();
  }
  if (!read) {
    // The log holds the reason on the line before; the user sees it too.
    throw RunError::fatal("Error in parameter file").withNotice(notice(parameterProblem));
  }
  if (logIsInput) {
    char logFileName[kFileNameSize];
    makeLogFileName(parameterFile, logFileName);
    char message[1024];
    std::snprintf(message, sizeof message,
                  "ERROR: log file %s is one of the run's input files: it is kept, the log is "
                  "shown here",
                  logFileName);
    throw RunError::fatal(message);
  }

  std::unique_ptr<FileDescription, DescriptionDeleter> bathymetry(descriptionNew(2));
  if (bathymetry == nullptr) throw RunError::fatal("Unable to allocate memory");
  // A file that cannot be read leaves the description at its creation values,
  // which the validation below rejects.
  std::string bathymetryProblem;
  const bool bathymetryTaken = bathymetryRead(run.parameters.inputFiles.FileName, *bathymetry, 1,
                                              run.state.bathymetryGrid, &bathymetryProblem) != 0;
  deriveSettings(run.parameters, *bathymetry, run.settings);
  run.state.landValue = run.settings.landValue;

  char message[1024];
  if (checkRunSettings(run.parameters, run.settings, message, sizeof message) == 0) {
    throw RunError::fatal(message).withNotice(
        inputProblemNotices(run.parameters, bathymetryProblem));
  }
  // The result replaces whatever file has its name: one of the run's own files
  // is refused before anything is computed.
  if (resultIsOwnFile(run.parameters, parameterFile)) {
    std::snprintf(message, sizeof message, "ERROR: result file %s is one of the run's own files",
                  run.parameters.outputData.FileName);
    throw RunError::fatal(message);
  }

  // One projection object serves the whole run: its conversions do not depend
  // on the position it was placed at.
  const double longitude = bathymetry->axes[1].origin;
  const double latitude = bathymetry->axes[2].origin;
  try {
    run.cartography = std::make_unique<Cartography>(run.settings.projection, longitude, latitude,
                                                    run.settings.orientation);
  } catch (const std::runtime_error&) {
    throw RunError::fatal("Unable to initialize geo. system");
  }
  run.cartography->geoToProj(longitude, latitude, &run.settings.xOrigo, &run.settings.yOrigo);
  if (bathymetryTaken) {
    descriptionFree(run.state.bathymetryDescription);
    run.state.bathymetryDescription = bathymetry.release();
  }
}

int runPhases(Run& run, RunSummary* summary, std::string* writeProblem) {
  RunState& state = run.state;
  const RunContext context = contextOf(run);
  const RunSettings& settings = run.settings;
  const RunParameters& parameters = run.parameters;
  std::int32_t lastObs = -1, jOff = 0, kOff = 0, lOff = 0;

  progressStatus("Scanning data ...");
  ObservationTally tally;
  dataScan(state, context, parameters.inputFiles.FileName, &lastObs, &jOff, &kOff, &lOff, &tally);
  progressStatus("Scanning bathymetry ...");
  bathymetryScan(jOff, kOff, lOff, state, settings, context.threads);
  progressStatus("Initialising ...");
  // The objective analysis also gives the error variance of its estimates,
  // written beside the result's item; nodes without an estimate keep the fill.
  FloatGrid3D errorField;
  if (settings.Analysis == 0) {
    errorField = state.localValues;
    errorField.data = nullptr;
    // Each process holds the error field of its own levels.
    const LevelRange held =
        state.heldSteps(lOff, std::int64_t{settings.lx} - settings.l0 + 1);
    errorField.l0 = settings.l0 + held.first;
    errorField.nl = held.count;
    errorField.total = state.localValues.layerSize() * held.count;
    grid3DAlloc(errorField);
    grid3DFill(errorField, static_cast<float>(state.deleteValue()), context.threads);
    objectiveAnalysis(lastObs, jOff, kOff, lOff, state, context, &errorField);
  } else {
    interp(lastObs, jOff, kOff, lOff, state, context);
  }
  // Over several processes the levels meet only in the result file.
  if (rankCount() > 1) {
    const int written = writeRankedResult(run.invocation, state, parameters, settings, tally,
                                          errorField.data != nullptr ? &errorField : nullptr,
                                          summary, writeProblem);
    if (errorField.data != nullptr) grid3DFree(errorField);
    return written;
  }
  glo2loc(jOff, kOff, lOff, state, settings, context.threads);
  if (summary != nullptr) {
    summary->resultPath = parameters.outputData.FileName;
    summary->observations = tally;
    countResultNodes(state.bathymetryGrid, state.landValue, settings, state.localValues, summary,
                     context.threads);
  }
  progressStatus("Saving data ...");
  const TextAttributes attributes = resultGlobalAttributes(
      parameters, run.invocation.commandLine, KARNET_VERSION, resultTimestamp());
  const int written =
      resultWrite(parameters.outputData.FileName, *state.resultDescription, 1,
                  parameters.outputData.ItemType, state.localValues, settings.projection,
                  &attributes, errorField.data != nullptr ? &errorField : nullptr, writeProblem,
                  run.invocation.threads);
  if (errorField.data != nullptr) grid3DFree(errorField);
  return written;
}

void runDriver(Run& run) {
  installSignalHandlers();
  // An interrupt reaches a process also while it waits on another.
  ranksSetWaitingCheck(handlePendingSignal);
  runInitialise(run.state, contextOf(run));
  RunSummary summary;
  std::string writeProblem;
  const int written = runPhases(run, &summary, &writeProblem);
  // A run whose result could not be written has not produced what it was for;
  // every process of the run ends as the one that wrote it, which also names
  // the file and why.
  const std::int32_t failed = ranksAgreeOnEnd(written == 0 ? 1 : -1);
  if (failed >= 0) {
    RunError error = RunError::logged("\nERROR while writing result file\n", failed);
    if (written == 0) {
      throw std::move(error).withNotice(
          fileNotice(run.parameters.outputData.FileName, writeProblem));
    }
    throw error;
  }
  releaseAll(run.state);
  restoreSignalHandlers();
  if (rankLeads()) printRunSummary(stderr, summary, run.invocation.quiet);
}

void runProgram(const char* parameterFile, const RunInvocation& invocation) {
  try {
    // Lives until the process ends: exitRun leaves without unwinding.
    static Run run;
    run.invocation = invocation;
    if (run.invocation.threads < 1) run.invocation.threads = 1;
    setupRun(parameterFile, run);
    if (run.invocation.crossValidation.active) {
      // Cross-validation works on every level of the grid in each trial.
      if (rankCount() > 1) {
        throw RunError::fatal("ERROR: cross-validation runs in one process: start it without mpirun");
      }
      crossValidateRun(run, parameterFile);
    } else {
      runDriver(run);
    }
  } catch (const RunError& error) {
    endRun(error);
  } catch (const std::bad_alloc&) {
    endRun(RunError::memory("Memory exhausted\n"));
  } catch (const std::exception& error) {
    // Nothing below throws anything else on purpose; should it happen, the run
    // still ends through its report rather than by an abort.
    endRun(RunError::fatal(std::string("ERROR: ") + error.what()));
  }
  exitRun(0);
}

}  // namespace karnet
