#ifndef KARNET_CONTROL_RANKED_RESULT_H_
#define KARNET_CONTROL_RANKED_RESULT_H_

#include "control/run_driver.h"

namespace karnet {

struct RunParameters;
struct RunSettings;
struct RunSummary;
struct ObservationTally;
struct FloatGrid3D;

// The result of a run over several processes, once every process has
// analysed its levels: the others send their levels to the first, which
// writes the result file from them (and counts the summary's nodes on the
// way). errorField, when given, holds the objective analysis' error field of
// this process's levels, written as the file's second item. Returns the writer's result on the first process, 1 on the others.
int writeRankedResult(const RunInvocation& invocation, RunState& state,
                      const RunParameters& parameters, const RunSettings& settings,
                      const ObservationTally& tally, const FloatGrid3D* errorField,
                      RunSummary* summary, std::string* writeProblem = nullptr);

}  // namespace karnet

#endif  // KARNET_CONTROL_RANKED_RESULT_H_
