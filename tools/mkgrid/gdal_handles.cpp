// GDAL set-up, errors and CRS texts.
#include "mkgrid/gdal_handles.h"

#include <cpl_error.h>

#include <mutex>

#include "input/cartography.h"

namespace karnet::mkgrid {

void initGdal() {
  static std::once_flag once;
  std::call_once(once, [] {
    GDALAllRegister();
    CPLSetErrorHandler(CPLQuietErrorHandler);
  });
}

std::string lastGdalError(const std::string& fallback) {
  const char* message = CPLGetLastErrorMsg();
  return message != nullptr && message[0] != '\0' ? std::string(message) : fallback;
}

Srs cloneTraditional(OGRSpatialReferenceH srs) {
  if (srs == nullptr) return Srs();
  Srs copy(OSRClone(srs));
  if (copy) OSRSetAxisMappingStrategy(copy.get(), OAMS_TRADITIONAL_GIS_ORDER);
  return copy;
}

Srs srsFromText(const std::string& text, std::string* error) {
  initGdal();
  std::string definition = text;
  if (text.size() > 4 && (text.compare(0, 4, "UTM-") == 0 || text.compare(0, 4, "utm-") == 0)) {
    // karnet's own UTM texts: Cartography knows them and gives the CRS as WKT.
    try {
      definition = Cartography(text, 0.0, 0.0, 0.0).wkt();
    } catch (const std::exception& e) {
      *error = "'" + text + "': " + e.what();
      return Srs();
    }
  }
  Srs srs(OSRNewSpatialReference(nullptr));
  CPLErrorReset();
  if (!srs || OSRSetFromUserInput(srs.get(), definition.c_str()) != OGRERR_NONE) {
    *error =
        "'" + text + "' is not a coordinate reference system: " + lastGdalError("not recognised");
    return Srs();
  }
  OSRSetAxisMappingStrategy(srs.get(), OAMS_TRADITIONAL_GIS_ORDER);
  return srs;
}

}  // namespace karnet::mkgrid
