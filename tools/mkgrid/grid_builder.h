#ifndef KARNET_TOOLS_MKGRID_GRID_BUILDER_H_
#define KARNET_TOOLS_MKGRID_GRID_BUILDER_H_

#include <cstdint>
#include <string>
#include <vector>

#include "mkgrid/esri_ascii.h"

namespace karnet::mkgrid {

enum class OriginSource {
  Grid,        // the south-west cell centre of the .asc, in projected coordinates
  Geographic,  // originA, originB are longitude and latitude in degrees
  Projected,   // originA, originB are projected x and y
};

struct BuildOptions {
  std::string projection = "LOCAL";
  OriginSource origin = OriginSource::Grid;
  double originA = 0.0;
  double originB = 0.0;
  bool hasOrientation = false;  // else the meridian convergence at the origin
  double orientation = 0.0;
  double landValue = 0.0;       // NODATA cells become this value
  bool negate = false;          // store -value (grids of positive depths)
  std::string title;
};

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

// Turns the .asc grid into a bathymetry: rows flipped to run south to north,
// NODATA cells set to the land value, the origin placed on the earth through
// the projection. false with a message when the projection is unusable or
// the origin or a value cannot be represented.
bool buildBathymetry(const EsriGrid& grid, const BuildOptions& options, Bathymetry* result,
                     std::string* error);

// Writes the bathymetry file: item "bathymetry" on y and x, the "Q84_Misc"
// block (orientation, land value) and the geographic information.
bool writeBathymetry(const std::string& fileName, const Bathymetry& bathymetry,
                     std::string* error);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_GRID_BUILDER_H_
