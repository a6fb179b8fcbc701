#ifndef KARNET_TOOLS_MKGRID_GRID_PROJECTION_H_
#define KARNET_TOOLS_MKGRID_GRID_PROJECTION_H_

#include <memory>
#include <string>

#include "input/cartography.h"
#include "mkgrid/options.h"
#include "mkgrid/source_raster.h"

namespace karnet::mkgrid {

// The grid's projection and how the source's coordinates relate to it.
struct GridProjection {
  std::string text;                  // the projection text the file carries
  std::unique_ptr<Cartography> map;  // that projection
  Srs sourceCrs;           // null: the source's x, y are taken as the grid's own coordinates
  Srs targetCrs;           // the grid's CRS for GDAL; null with sourceCrs
  bool reproject = false;  // the source's CRS differs from the grid's
};

// The projection named by --projection (auto: the UTM zone of the region's
// middle), else the source's projected CRS, else LOCAL for a source in
// projected-looking coordinates without CRS. A source in degrees without a
// projection is refused; one without CRS but in degrees is taken as WGS 84
// once a projection is given. false with a message naming the option or file.
bool chooseProjection(const SourceRaster& source, const MkgridOptions& options,
                      GridProjection* result, std::string* notes, std::string* error);

// "UTM-<zone>N" or "UTM-<zone>S" of a position (plain 6-degree zones).
std::string utmZoneOf(double longitude, double latitude);

// Text of a number for messages.
std::string numberText(double value);

// WKT of a CRS.
std::string wktOf(OGRSpatialReferenceH srs);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_GRID_PROJECTION_H_
