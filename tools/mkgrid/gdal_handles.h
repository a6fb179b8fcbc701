#ifndef KARNET_TOOLS_MKGRID_GDAL_HANDLES_H_
#define KARNET_TOOLS_MKGRID_GDAL_HANDLES_H_

// Owning wrappers of GDAL's C handles, and GDAL's last error as text.

#include <gdal.h>
#include <gdal_alg.h>
#include <ogr_srs_api.h>

#include <memory>
#include <string>

namespace karnet::mkgrid {

struct DatasetCloser {
  void operator()(void* dataset) const { GDALClose(dataset); }
};
struct SrsReleaser {
  void operator()(void* srs) const { OSRRelease(srs); }
};
struct TransformDestroyer {
  void operator()(void* transform) const { OCTDestroyCoordinateTransformation(transform); }
};

using Dataset = std::unique_ptr<void, DatasetCloser>;
using Srs = std::unique_ptr<void, SrsReleaser>;
using CoordinateTransform = std::unique_ptr<void, TransformDestroyer>;

// Registers GDAL's drivers once and keeps its messages off the terminal: they
// reach the user through lastGdalError in the messages of this program.
void initGdal();

// GDAL's last error message, or fallback when GDAL recorded none.
std::string lastGdalError(const std::string& fallback);

// A copy of srs (null stays null) that takes and gives longitude (easting) first.
Srs cloneTraditional(OGRSpatialReferenceH srs);

// A CRS from any text GDAL takes (EPSG:<code>, a PROJ string, WKT) or karnet's
// UTM-<zone>[N|S]; null with a message when it is not one.
Srs srsFromText(const std::string& text, std::string* error);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_GDAL_HANDLES_H_
