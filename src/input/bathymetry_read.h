#ifndef KARNET_INPUT_BATHYMETRY_READ_H_
#define KARNET_INPUT_BATHYMETRY_READ_H_

#include <string>

#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {

// Reads a 2-D bathymetry file into description: x and y axes (start 0, factor 1,
// spacing, lastIndex), the geographic origin, the "Q84_Misc" block (left at the
// delete value when the file has none) and the item's minimum and maximum.
// With wantValues, grid is (re)allocated and filled with the item's values.
// 1 on success, 0 on failure; reports nothing itself, but says why in reason
// when one is given ("no 2-D item", "not a regular file", ...).
int bathymetryRead(const char* fileName, FileDescription& description, int wantValues,
                   FloatGrid2D& grid, std::string* reason = nullptr);

}  // namespace karnet

#endif  // KARNET_INPUT_BATHYMETRY_READ_H_
