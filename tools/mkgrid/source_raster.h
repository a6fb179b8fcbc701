#ifndef KARNET_TOOLS_MKGRID_SOURCE_RASTER_H_
#define KARNET_TOOLS_MKGRID_SOURCE_RASTER_H_

#include <string>

#include "mkgrid/gdal_handles.h"

namespace karnet::mkgrid {

// One band of a raster file, ready to be resampled: any raster GDAL reads
// (GeoTIFF, NetCDF variables, ...); ESRI ASCII grids go through this
// program's own strict reader, since GDAL's takes short or garbled files
// without a word.
struct SourceRaster {
  Dataset dataset;
  GDALRasterBandH band = nullptr;
  int width = 0;
  int height = 0;
  double transform[6] = {0, 1, 0, 0, 0, -1};  // GDAL geotransform: pixel/line to x, y
  Srs crs;                                    // null when the file names none
  bool hasNodata = false;
  double nodata = 0.0;
  double scale = 1.0;  // stored value * scale + offset is the value
  double offset = 0.0;
  // Position of the south-west cell's centre; for ESRI ASCII grids exactly as
  // the header gives it (as this program has always placed those grids).
  double southWestX = 0.0;
  double southWestY = 0.0;
  std::string what;  // driver, variable and size, for the summary line

  bool northUp() const {
    return transform[2] == 0.0 && transform[4] == 0.0 && transform[1] > 0.0 && transform[5] < 0.0;
  }
  // x, y of the pixel/line position (p, l).
  void position(double p, double l, double* x, double* y) const {
    *x = transform[0] + p * transform[1] + l * transform[2];
    *y = transform[3] + p * transform[4] + l * transform[5];
  }
  // Without a CRS: whether every corner lies within longitude -180..360 and
  // latitude -90..90, as grids in degrees do.
  bool looksLikeDegrees() const;
};

// Opens path. variable picks a NetCDF (or other multi-variable) file's 2-D
// variable; empty picks the only one there is. false and a message naming
// the file when it is no raster, has no such variable, no georeferencing or
// no cells.
bool openSourceRaster(const std::string& path, const std::string& variable, SourceRaster* source,
                      std::string* error);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_SOURCE_RASTER_H_
