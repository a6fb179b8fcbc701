#ifndef KARNET_ANALYSIS_WORKSPACE_H_
#define KARNET_ANALYSIS_WORKSPACE_H_

#include <cstdint>

#include "params/run_settings.h"

namespace karnet {

// Indices the matrix inversion keeps for a matrix of row stride limit.
inline std::int64_t oaPivotEntries(std::int64_t limit) { return 4 * limit; }

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
  // Sort keys of the candidates (an integer image of the correlation above the
  // candidate's position), one entry per data cell.
  std::uint64_t* candKey = nullptr;

  // The cells chosen for the node (limit entries each): their index among the
  // data cells, position, value and correlation with the node.
  std::int32_t* selIndex = nullptr;
  float* selX = nullptr;
  float* selY = nullptr;
  float* selValue = nullptr;
  float* selCorr = nullptr;

  // limit x limit, row-major with stride limit.
  float* matrix = nullptr;
  // Per row of the inverted matrix (limit entries each): its entry sum and its
  // product with the chosen cells' values.
  float* rowSums = nullptr;
  float* rowProducts = nullptr;

  // Line buffer of the Shapiro filter, max(nj, nk) entries.
  std::int32_t lineCapacity = 0;
  float* lineBuffer = nullptr;

  // oaPivotEntries(limit) indices of the matrix inversion (pivot records, the
  // list of free indices and the rows' pivot keys), kept here so that no
  // estimate allocates.
  std::int32_t* pivot = nullptr;

  // correlation(d2) for the integral squared distances d2 = 0 .. corrTableSize-1.
  // Node and cell positions are whole node numbers, so nearly every squared
  // distance of a layer is such an integer; the table spares the exponential.
  std::int32_t corrTableSize = 0;
  float* corrTable = nullptr;

  // Column index of the data cells, built by workspaceIndexColumns when the
  // cells come in column order (x outer, y inner, both ascending): the cells of
  // column x are entries columnStart[x] .. columnStart[x + 1] - 1. Null when the
  // cells are in any other order; the selection then scans every cell.
  std::int32_t columnCount = 0;
  std::int32_t* columnStart = nullptr;

  // The selection's window as it stood at the latest node (cursorJ, cursorK),
  // so that the next node of the same column (the layer pass's order: k rising
  // within a column j) only drops the cells that fell out below and takes in
  // those that came in above, instead of scanning every column again. Any
  // other node starts afresh.
  //   windowCell[0 .. windowCount-1]: the cells inside the window, ascending
  //     (so in collection order); windowLast: the last node row k at which
  //     each of them is still inside.
  //   columnCursor[x]: the first cell of column x above the window;
  //     columnEnter[x]: the node row k at which that cell comes in (INT32_MAX:
  //     none); nextEnter: the least of them.
  // windowCell and windowLast have dataCapacity entries, columnCursor and
  // columnEnter columnCount.
  std::int32_t* windowCell = nullptr;
  std::int32_t* windowLast = nullptr;
  std::int32_t windowCount = 0;
  std::int32_t* columnCursor = nullptr;
  std::int32_t* columnEnter = nullptr;
  std::int32_t nextEnter = 0;
  std::int32_t cursorJ = -1;
  std::int32_t cursorK = 0;

  // rowReach[o] is the largest row offset whose cell, o columns from the node,
  // passes the search radius test (the test's own float arithmetic), for
  // o = 0 .. rowReachCount - 1; made for the squared radius rowReachRadius2,
  // whose reach in whole nodes (along one axis) is rowReachNodes.
  std::int32_t rowReachCount = 0;
  float rowReachRadius2 = 0;
  std::int64_t rowReachNodes = 0;
  std::int32_t* rowReach = nullptr;

  // Reason of the latest estimator failure (or its warning); never printed.
  const char* errorText = "";
};

// Sets the scalars from the settings and allocates every array: data and
// candidate arrays with nData entries, the chosen-cell arrays with limit
// entries, the matrix with limit * limit and the line buffer with max(nj, nk);
// fills the correlation table for the squared distances an nj x nk layer holds.
void workspaceSetUp(OaWorkspace& ws, std::int32_t nData, std::int32_t nj, std::int32_t nk,
                    const RunSettings& settings);

// Builds the column index of the ws.dataCount collected data cells for a layer
// of nj columns, when they lie on whole nodes 0..nj-1 in column order; leaves
// it empty otherwise. Called once the cells of a layer are collected.
void workspaceIndexColumns(OaWorkspace& ws, std::int32_t nj);

// Releases every array of the workspace; the scalars keep their values.
void workspaceRelease(OaWorkspace& ws);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_WORKSPACE_H_
