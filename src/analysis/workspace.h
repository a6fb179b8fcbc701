#ifndef KARNET_ANALYSIS_WORKSPACE_H_
#define KARNET_ANALYSIS_WORKSPACE_H_

#include <cstdint>

#include "params/run_settings.h"

namespace karnet {

// Working storage of the objective analysis for one layer. Every kernel of the
// analysis receives it explicitly, so separate layers can use separate
// workspaces. The arrays come from the checked allocator; they exist between
// workspaceSetUp and workspaceRelease.
struct OaWorkspace {
  // Most data cells used for one estimate; also the row stride of matrix.
  std::int32_t limit = 0;
  // (DecayDistance * 2 * DecayDistance) / (dx * dx): doubled squared decay length.
  float decay2 = 0;
  // (ZeroCrossingDistance^2) / (dx * dx): squared zero-crossing distance.
  float zeroCross2 = 0;

  // Data cells of the layer in collection order (node j, node k, value).
  std::int32_t dataCapacity = 0;  // entries allocated in the data/candidate arrays
  std::int32_t dataCount = 0;     // entries in use
  float* dataX = nullptr;
  float* dataY = nullptr;
  float* dataValue = nullptr;

  // Candidates of the node being estimated and their correlation with it.
  std::int32_t* candIndex = nullptr;
  float* candCorr = nullptr;

  // The cells chosen for the node (limit entries each).
  float* selX = nullptr;
  float* selY = nullptr;
  float* selValue = nullptr;
  float* selCorr = nullptr;

  // limit x limit, row-major with stride limit.
  float* matrix = nullptr;

  // Line buffer of the Shapiro filter, max(nj, nk) entries.
  std::int32_t lineCapacity = 0;
  float* lineBuffer = nullptr;

  // Scratch kept here so that no estimate allocates: the 2 * limit pivot
  // indices of the matrix inversion and the limit row sums / row products of
  // the weighted mean.
  std::int32_t* pivot = nullptr;
  float* rowSum = nullptr;
  float* rowDot = nullptr;

  // Reason of the latest estimator failure (or its warning); never printed.
  const char* errorText = "";
};

// Sets the scalars from the settings and allocates every array: data and
// candidate arrays with nData entries, the chosen-cell arrays with limit
// entries, the matrix with limit * limit and the line buffer with max(nj, nk).
void workspaceSetUp(OaWorkspace& ws, std::int32_t nData, std::int32_t nj, std::int32_t nk,
                    const RunSettings& settings);

// Releases every array of the workspace; the scalars keep their values.
void workspaceRelease(OaWorkspace& ws);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_WORKSPACE_H_
