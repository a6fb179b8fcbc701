#include "control/run_driver.h"

#include <cstdio>
#include <cstdlib>

#include "analysis/objective_analysis.h"
#include "control/log.h"
#include "control/progress.h"
#include "control/ranked_result.h"
#include "control/ranks.h"
#include "control/run_summary.h"
#include "control/signals.h"
#include "control/termination.h"
#include "input/bathymetry_scan.h"
#include "input/data_scan.h"
#include "input/run_initialise.h"
#include "interp/glo2loc.h"
#include "interp/interp.h"
#include "output/result_attributes.h"
#include "output/result_write.h"
#include "params/run_parameters.h"
#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

void reportInitError(std::int32_t /*lineNumber*/, const char* message) {
  logPrintf("\nERROR: %s\n", message);
  exitRun(1);
}

int runPhases(const RunInvocation& invocation, RunSummary* summary) {
  RunState& state = runState();
  const RunSettings& settings = runSettings;
  std::int32_t lastObs = -1, jOff = 0, kOff = 0, lOff = 0;

  progressStatus("Scanning data ...");
  ObservationTally tally;
  dataScan(state, settings, runParameters.inputFiles.FileName, &lastObs, &jOff, &kOff, &lOff,
           &tally);
  progressStatus("Scanning bathymetry ...");
  bathymetryScan(jOff, kOff, lOff, state, settings);
  progressStatus("Initialising ...");
  if (settings.Analysis == 0) {
    objectiveAnalysis(lastObs, jOff, kOff, lOff, state, settings);
  } else {
    interp(lastObs, jOff, kOff, lOff, state, settings);
  }
  // Over several processes the levels meet only in the result file.
  if (rankCount() > 1) return writeRankedResult(invocation, state, runParameters, settings, tally, summary);
  glo2loc(jOff, kOff, lOff, state, settings);
  if (summary != nullptr) {
    summary->resultPath = runParameters.outputData.FileName;
    summary->observations = tally;
    countResultNodes(state.bathymetryGrid, state.landValue, settings, state.localValues, summary);
  }
  progressStatus("Saving data ...");
  const TextAttributes attributes = resultGlobalAttributes(
      runParameters, invocation.commandLine, KARNET_VERSION, resultTimestamp());
  return resultWrite(runParameters.outputData.FileName, *state.resultDescription, 1,
                     runParameters.outputData.ItemType, state.localValues, settings.projection,
                     &attributes);
}

void freeRunArrays(RunState& state) {
  grid3DFree(state.localValues);
  scatterDataFree(state.scatter);
  descriptionFree(state.resultDescription);
  state.resultDescription = nullptr;
}

void runDriver(const RunInvocation& invocation) {
  installSignalHandlers();
  runInitialise(runState(), runSettings);
  RunSummary summary;
  const int written = runPhases(invocation, &summary);
  // A run whose result could not be written has not produced what it was for;
  // every process of the run ends as the one that wrote it.
  const std::int32_t failed = ranksAgreeOnEnd(written == 0 ? 1 : -1);
  if (failed >= 0) {
    logWrite("\nERROR while writing result file\n");
    exitRun(failed);
  }
  freeRunArrays(runState());
  restoreSignalHandlers();
  if (rankLeads()) printRunSummary(stderr, summary, invocation.quiet);
  exitRun(0);
}

}  // namespace karnet
