#include "control/ranked_result.h"

#include "control/progress.h"
#include "control/ranks.h"
#include "control/run_summary.h"
#include "output/level_gather.h"
#include "output/result_attributes.h"
#include "output/result_write.h"
#include "params/run_parameters.h"
#include "params/run_settings.h"
#include "state/run_state.h"

namespace karnet {

int writeRankedResult(const RunInvocation& invocation, RunState& state,
                      const RunParameters& parameters, const RunSettings& settings,
                      const ObservationTally& tally, const FloatGrid3D* errorField,
                      RunSummary* summary, std::string* writeProblem) {
  const FileDescription& description = *state.resultDescription;
  const std::int32_t nx = description.axes[1].lastIndex + 1;
  const std::int32_t ny = description.axes[2].lastIndex + 1;
  const std::int32_t nz = description.axes[3].lastIndex + 1;
  // The analysis is done: the wet/dry field is not needed any more, and its
  // room serves the result file that rank 0 builds.
  grid3DFree(state.basicBathymetry);
  LevelGather gather(state, nx, ny, nz, errorField);
  if (!rankLeads()) {
    gather.sendHeld();
    return 1;
  }

  RunSummary counted;
  counted.resultPath = parameters.outputData.FileName;
  counted.observations = tally;
  counted.nx = nx;
  counted.ny = ny;
  counted.nz = nz;
  const FloatGrid2D& bed = state.bathymetryGrid;
  const bool countable = bed.nj == nx && bed.nk == ny && bed.data != nullptr;
  const ResultLevelSource gathered = gather.source();
  const ResultLevelSource levels = [&](std::int32_t s, float* buffer) {
    if (!gathered(s, buffer)) return false;
    if (countable) countResultLevel(bed, state.landValue, settings, settings.l0 + s, buffer, &counted);
    return true;
  };

  progressStatus("Saving data ...");
  const TextAttributes attributes = resultGlobalAttributes(
      parameters, invocation.commandLine, KARNET_VERSION, resultTimestamp());
  const ResultLevelSource errors = gather.errorSource();
  const int written =
      resultWriteLevels(parameters.outputData.FileName, description,
                        parameters.outputData.ItemType, levels, settings.projection, &attributes,
                        errorField != nullptr ? &errors : nullptr, writeProblem,
                        invocation.threads);
  // A writer that stopped early leaves levels on their way.
  gather.drain();
  if (summary != nullptr) *summary = counted;
  return written;
}

}  // namespace karnet
