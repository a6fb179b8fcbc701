#ifndef KARNET_STATE_RUN_STATE_H_
#define KARNET_STATE_RUN_STATE_H_

#include <algorithm>
#include <cstdint>
#include <cstdio>

#include <vector>

#include "state/basic_bed.h"
#include "state/level_partition.h"
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
  // The bathymetry file's description as run setup read it (with its values
  // in bathymetryGrid), when that read succeeded; data scanning takes it
  // instead of reading the file again.
  FileDescription* bathymetryDescription = nullptr;
  std::FILE* observationFile = nullptr;
  double landValue = 0;

  // The basic grid's levels and how they are shared out. basicBathymetry and
  // basicValues hold the levels basicValues.l0 .. l0 + nl - 1 of this process:
  // all basicLevels of them in a one-process run, one block of the local
  // grid's levels per rank in a run over several (levelOwners, rank order).
  // basicLevels 0 means the grids hold every level (state built by hand).
  std::int32_t basicLevels = 0;
  std::vector<LevelRange> levelOwners;
  // Where the local grid lies in the basic grid (set by data scanning).
  LocalWindow window;

  // Levels of the whole basic grid, held here or not.
  std::int32_t basicLevelCount() const { return basicLevels > 0 ? basicLevels : basicValues.nl; }
  // The layers of a layer pass over the local grid's levels (pass step s is
  // basic level lOff + s, s = 0 .. steps - 1) that this process holds: the
  // steps first .. first + count - 1.
  LevelRange heldSteps(std::int32_t lOff, std::int64_t steps) const {
    const std::int64_t first = std::max<std::int64_t>(std::int64_t{basicValues.l0} - lOff, 0);
    const std::int64_t end =
        std::min<std::int64_t>(std::int64_t{basicValues.l0} + basicValues.nl - lOff, steps);
    if (end <= first) return LevelRange{0, 0};
    return LevelRange{static_cast<std::int32_t>(first), static_cast<std::int32_t>(end - first)};
  }

  // True when this process holds every level of the basic grid.
  bool holdsAllLevels() const {
    return basicValues.l0 == 0 && basicValues.nl == basicLevelCount();
  }

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
