#ifndef KARNET_STATE_RUN_STATE_H_
#define KARNET_STATE_RUN_STATE_H_

#include <cstdint>
#include <cstdio>

#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {

// The observations: one entry per observation line; after data scanning x, y, z
// are in basic-grid units and value is as read.
struct ScatterData {
  double* x = nullptr;
  double* y = nullptr;
  double* z = nullptr;
  double* value = nullptr;
  std::int64_t capacity = 0;  // entries allocated in each array
};

// The run-wide arrays and grids that the phases share. The run driver owns the
// run's one instance; kernels take it by reference so that tests can build
// their own. The work layers of the layer passes are not here: each thread
// that analyses a layer has its own.
struct RunState {
  ScatterData scatter;
  FloatGrid2D bathymetryGrid;
  FloatGrid3D basicBathymetry;
  FloatGrid3D basicValues;
  FloatGrid3D localValues;
  FileDescription* resultDescription = nullptr;
  std::FILE* observationFile = nullptr;
  double landValue = 0;

  // Delete value of the result description (the float -1e-30 widened).
  double deleteValue() const;
};

// Releases everything allocated so far (grids, observations, result description);
// what was never allocated is skipped, nothing is released twice.
void releaseAll(RunState& state);

// Allocates the four observation arrays with room for count entries (heap).
// Returns false when the memory is not available.
bool scatterDataAlloc(ScatterData& scatter, std::int64_t count);
void scatterDataFree(ScatterData& scatter);

}  // namespace karnet

#endif  // KARNET_STATE_RUN_STATE_H_
