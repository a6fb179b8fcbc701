#ifndef KARNET_TOOLS_MKGRID_RESAMPLE_H_
#define KARNET_TOOLS_MKGRID_RESAMPLE_H_

#include <string>
#include <vector>

#include "mkgrid/source_raster.h"
#include "mkgrid/target_grid.h"

namespace karnet::mkgrid {

// The source's stored values at the grid's nodes, node (i, j) at j * nx + i
// (j = 0 the southernmost row): copied where the nodes are the source's cell
// centres, else resampled by GDAL's warper. NaN marks nodes without a value
// (NODATA cells, outside the source). Scale and offset are not applied yet.
bool resampleSource(const SourceRaster& source, const TargetGrid& grid, std::vector<double>* values,
                    std::string* error);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_RESAMPLE_H_
