#ifndef KARNET_TOOLS_MKGRID_TARGET_GRID_H_
#define KARNET_TOOLS_MKGRID_TARGET_GRID_H_

#include <cstdint>
#include <string>

#include "mkgrid/options.h"
#include "mkgrid/source_raster.h"

namespace karnet::mkgrid {

// The grid to make and how the source reaches it. Node (i, j), j = 0 the
// southernmost row, lies at origin + i dx ex + j dy ey in the projection,
// with ex = (cos r, -sin r), ey = (sin r, cos r) and r the rotation: the
// frame karnet itself turns its observations into.
struct TargetGrid {
  std::string projection;  // the projection text the file carries
  std::int32_t nx = 0;
  std::int32_t ny = 0;
  double dx = 0.0;  // metres, already rounded to what the file holds (float)
  double dy = 0.0;
  double originX = 0.0;  // the origin node, projected (a CRS-less source's own x, y)
  double originY = 0.0;
  double rotation = 0.0;   // degrees clockwise from the projection's north to the y axis
  double longitude = 0.0;  // the origin node on the earth (x, y for LOCAL)
  double latitude = 0.0;
  double orientation = 0.0;  // degrees clockwise from true north to the y axis
  std::string sourceWkt;     // both empty unless the source must be reprojected
  std::string targetWkt;
  bool copyCells = false;        // the nodes are source cell centres: copied, not resampled
  std::int64_t firstColumn = 0;  // source column of node i = 0 (copyCells)
  std::int64_t firstRowUp = 0;   // source row, counted from the south, of node j = 0
  Resampling method = Resampling::Bilinear;

  // GDAL geotransform of the grid as a raster whose first line is the northernmost row.
  void geoTransform(double transform[6]) const;
};

// Decides the projection, spacing, extent and orientation of the grid from
// the options and the source. false with a message naming the option or the
// file when they do not make a grid; notes collects what was chosen on the
// user's behalf.
bool planGrid(const SourceRaster& source, const MkgridOptions& options, TargetGrid* grid,
              std::string* notes, std::string* error);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_TARGET_GRID_H_
