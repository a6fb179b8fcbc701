#ifndef KARNET_TOOLS_MKGRID_GRID_BUILDER_H_
#define KARNET_TOOLS_MKGRID_GRID_BUILDER_H_

#include <cstdint>
#include <string>
#include <vector>

#include "mkgrid/options.h"

namespace karnet::mkgrid {

// A bathymetry ready to be written: node (i, j) is values[j * nx + i], j = 0
// the southernmost row (the origin node's row).
struct Bathymetry {
  std::int32_t nx = 0;
  std::int32_t ny = 0;
  float dx = 0.0f;
  float dy = 0.0f;
  std::string projection;
  double longitude = 0.0;
  double latitude = 0.0;
  double orientation = 0.0;
  float landValue = 0.0f;
  std::string title;
  std::vector<float> values;
};

// Reads the source named in the options and makes the bathymetry: the grid
// planned from the options, the source's values copied or resampled onto it,
// NODATA nodes and nodes outside the source set to the land value. summary
// tells what was read and chosen. false with a message naming the file or
// option at fault.
bool makeBathymetry(const MkgridOptions& options, Bathymetry* result, std::string* summary,
                    std::string* error);

// Writes the bathymetry file: item "bathymetry" on y and x, the "Q84_Misc"
// block (orientation, land value) and the geographic information.
bool writeBathymetry(const std::string& fileName, const Bathymetry& bathymetry, std::string* error);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_GRID_BUILDER_H_
