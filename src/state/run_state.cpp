#include "state/run_state.h"

#include <cstdlib>
#include <new>

namespace karnet {

double RunState::deleteValue() const {
  return resultDescription != nullptr ? resultDescription->deleteValue
                                      : static_cast<double>(kDeleteValueFloat);
}

bool scatterDataAlloc(ScatterData& scatter, std::int64_t count) {
  scatterDataFree(scatter);
  if (count < 0) return false;
  // One entry more than asked for keeps malloc(0) from being ambiguous.
  const std::size_t bytes = static_cast<std::size_t>(count + 1) * sizeof(double);
  if (count > 0 && bytes / sizeof(double) != static_cast<std::size_t>(count + 1)) return false;
  double** arrays[4] = {&scatter.x, &scatter.y, &scatter.z, &scatter.value};
  for (double** a : arrays) {
    *a = static_cast<double*>(std::malloc(bytes));
    if (*a == nullptr) {
      scatterDataFree(scatter);
      return false;
    }
  }
  scatter.capacity = count;
  return true;
}

void scatterDataFree(ScatterData& scatter) {
  double** arrays[4] = {&scatter.x, &scatter.y, &scatter.z, &scatter.value};
  for (double** a : arrays) {
    std::free(*a);
    *a = nullptr;
  }
  scatter.capacity = 0;
}

void releaseAll(RunState& state) {
  grid3DFree(state.basicBathymetry);
  grid3DFree(state.basicValues);
  grid3DFree(state.localValues);
  grid2DFree(state.bathymetryGrid);
  scatterDataFree(state.scatter);
  descriptionFree(state.resultDescription);
  state.resultDescription = nullptr;
  descriptionFree(state.bathymetryDescription);
  state.bathymetryDescription = nullptr;
}

}  // namespace karnet
