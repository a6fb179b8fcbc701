#ifndef KARNET_ANALYSIS_OBJECTIVE_ANALYSIS_H_
#define KARNET_ANALYSIS_OBJECTIVE_ANALYSIS_H_

#include <cstdint>
#include <string>

#include "analysis/workspace.h"
#include "params/run_settings.h"
#include "state/run_state.h"
#include "support/float_grid.h"

namespace karnet {

struct RunContext;
class WorkProgress;

// Objective analysis: grids the observations (setadj), then fills every wet
// node of the local grid's footprint layer by layer with an optimal
// interpolation estimate from the layer's data cells, smooths, clips to
// [MinData, MaxData], blanks dry nodes and writes each layer back into
// state.basicValues. Ends with the statistics block in the context's report.
// (jOff, kOff, lOff) is the basic node of the local grid's first node. Uses
// context.threads threads; the result does not depend on them. errorField,
// when given, is a grid of the local grid's shape (filled with the delete value
// beforehand) that receives the relative error variance of every successful
// estimate at its node. Throws the
// RunError of a cancel, an interrupt or a failed allocation.
void objectiveAnalysis(std::int32_t lastObs, std::int32_t jOff, std::int32_t kOff,
                       std::int32_t lOff, RunState& state, const RunContext& context,
                       FloatGrid3D* errorField = nullptr);

// Number of cells of the grid that hold a value (differ from deleteValue).
std::int32_t countDataCells(const FloatGrid2D& grid, double deleteValue);

// What one layer's analysis needs besides the layer itself.
struct LayerAnalysisInput {
  const FloatGrid2D* bathymetry = nullptr;  // the layer's bed, same shape as the grid
  double landValue = 0;                     // bed value of a dry node
  double deleteValue = 0;                   // value of an empty cell
  std::int32_t jOff = 0;                    // basic node of the local grid's first node
  std::int32_t kOff = 0;
  std::int32_t lOff = 0;
  // When set: the local grid's error field; every successful estimate at
  // footprint node (j, k) of layer l writes its relative error variance to
  // local node (j - jOff, k - kOff, l - lOff).
  FloatGrid3D* errorField = nullptr;
};

// How one layer's analysis runs: the threads that share its nodes, the
// progress of the whole pass (null: none) and the messages it leaves for the
// caller to pass on ("Uppsss..." lines for standard output).
struct LayerTeam {
  int threads = 1;
  WorkProgress* progress = nullptr;
  std::string messages;
};

// Analyses the layer held in grid (origin (0, 0), basic layer l) in place:
// estimates at the wet footprint nodes from the nData data cells of the layer,
// smoothing of the whole layer, clipping at the wet footprint nodes. ws is set
// up at the start and released at the end. Returns the number of successful
// estimates and stores the number of failed ones in failures.
// On one thread; its messages go to standard output.
std::int32_t analyseLayer(OaWorkspace& ws, FloatGrid2D& grid, std::int32_t nData,
                          const LayerAnalysisInput& input, std::int32_t l,
                          std::int32_t& failures, const RunSettings& settings);
// The same with the nodes shared out over team.threads threads, each with
// storage of its own; the result is the same for any number of threads.
std::int32_t analyseLayer(OaWorkspace& ws, FloatGrid2D& grid, std::int32_t nData,
                          const LayerAnalysisInput& input, std::int32_t l,
                          std::int32_t& failures, const RunSettings& settings, LayerTeam& team);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_OBJECTIVE_ANALYSIS_H_
