// Which projection the grid gets, and whether the source must be reprojected.
#include "mkgrid/grid_projection.h"

#include <cpl_conv.h>
#include <strings.h>

#include <cmath>
#include <cstdio>
#include <exception>

namespace karnet::mkgrid {
namespace {

std::string trimmed(const std::string& text) {
  const std::size_t first = text.find_first_not_of(" \t\r\n");
  if (first == std::string::npos) return std::string();
  return text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
}

// karnet's own text for a projected CRS: UTM-<zone>[S] for WGS 84 / UTM,
// EPSG:<code> for other EPSG CRSs, else its WKT.
std::string projectionTextOf(OGRSpatialReferenceH crs) {
  // A CRS without its EPSG code (an ESRI .prj, say) may still be one of
  // EPSG's; the code is taken only when its CRS is the same.
  Srs identified(OSRClone(crs));
  if (OSRGetAuthorityCode(identified.get(), nullptr) == nullptr) {
    int count = 0;
    int* confidence = nullptr;
    OGRSpatialReferenceH* matches = OSRFindMatches(crs, nullptr, &count, &confidence);
    if (count > 0 && confidence[0] >= 90) identified.reset(OSRClone(matches[0]));
    if (matches != nullptr) OSRFreeSRSArray(matches);
    CPLFree(confidence);
  }
  const char* authority = OSRGetAuthorityName(identified.get(), nullptr);
  const char* code = OSRGetAuthorityCode(identified.get(), nullptr);
  if (authority != nullptr && code != nullptr && strcasecmp(authority, "EPSG") == 0) {
    Srs registered(OSRNewSpatialReference(nullptr));
    const int n = std::atoi(code);
    if (OSRImportFromEPSG(registered.get(), n) == OGRERR_NONE && OSRIsSame(registered.get(), crs)) {
      if (n > 32600 && n <= 32660) return "UTM-" + std::to_string(n - 32600);
      if (n > 32700 && n <= 32760) return "UTM-" + std::to_string(n - 32700) + "S";
      return std::string("EPSG:") + code;
    }
  }
  return wktOf(crs);
}

// Longitude and latitude of the middle of the region (for --projection auto).
bool regionCentre(const SourceRaster& source, OGRSpatialReferenceH crs,
                  const MkgridOptions& options, double* longitude, double* latitude,
                  std::string* error) {
  if (options.extent == ExtentKind::Geographic) {
    *longitude = (options.box[0] + options.box[2]) / 2.0;
    *latitude = (options.box[1] + options.box[3]) / 2.0;
    return true;
  }
  if (options.extent == ExtentKind::Projected) {
    *error =
        "--projection auto cannot place --extent-proj (metres of which projection?): "
        "give the projection itself, or the region with --extent in degrees";
    return false;
  }
  if (crs == nullptr) {
    *error = "--projection auto: " + options.input +
             " names no CRS; give it one with "
             "--source-crs, or the region with --extent in degrees";
    return false;
  }
  double x = 0.0, y = 0.0, z = 0.0;
  source.position(source.width / 2.0, source.height / 2.0, &x, &y);
  if (!OSRIsGeographic(crs)) {
    Srs geographic(OSRCloneGeogCS(crs));
    if (geographic) OSRSetAxisMappingStrategy(geographic.get(), OAMS_TRADITIONAL_GIS_ORDER);
    CoordinateTransform toGeographic(
        geographic ? OCTNewCoordinateTransformation(crs, geographic.get()) : nullptr);
    int ok = 0;
    if (!toGeographic || !OCTTransformEx(toGeographic.get(), 1, &x, &y, &z, &ok) || !ok) {
      *error =
          "--projection auto: the middle of " + options.input + " has no longitude and latitude";
      return false;
    }
  }
  *longitude = x;
  *latitude = y;
  return true;
}

}  // namespace

std::string numberText(double value) {
  char text[32];
  std::snprintf(text, sizeof text, "%.10g", value);
  return text;
}

std::string wktOf(OGRSpatialReferenceH srs) {
  char* text = nullptr;
  std::string wkt;
  if (OSRExportToWkt(srs, &text) == OGRERR_NONE && text != nullptr) wkt = text;
  CPLFree(text);
  return wkt;
}

std::string utmZoneOf(double longitude, double latitude) {
  double east = std::fmod(longitude + 180.0, 360.0);
  if (east < 0.0) east += 360.0;
  const int zone = std::min(60, static_cast<int>(std::floor(east / 6.0)) + 1);
  return "UTM-" + std::to_string(zone) + (latitude < 0.0 ? "S" : "N");
}

bool chooseProjection(const SourceRaster& source, const MkgridOptions& options,
                      GridProjection* result, std::string* notes, std::string* error) {
  const std::string& input = options.input;
  std::string message;
  GridProjection out;
  Srs crs;
  if (!options.sourceCrs.empty()) {
    crs = srsFromText(options.sourceCrs, &message);
    if (!crs) {
      *error = "--source-crs " + message;
      return false;
    }
  } else {
    crs = cloneTraditional(source.crs.get());
  }

  // The projection of the grid.
  std::string projection = trimmed(options.projection);
  const bool degrees = crs ? OSRIsGeographic(crs.get()) != 0 : source.looksLikeDegrees();
  if (projection.empty()) {
    if (crs && OSRIsProjected(crs.get())) {
      projection = projectionTextOf(crs.get());
    } else if (degrees) {
      *error = input + ": its coordinates are longitude and latitude in degrees" +
               (crs ? "" : " (it names no CRS, and they look like degrees)") +
               "; karnet's grid is in metres: give its projection with --projection (auto "
               "for the UTM zone of the region, UTM-32N, EPSG:<code>, ...)" +
               (crs ? "" : ", or --projection LOCAL if the coordinates are plain metres");
      return false;
    } else if (crs) {
      *error = input + ": its CRS is neither geographic nor projected; give --projection";
      return false;
    } else {
      projection = "LOCAL";
    }
  }
  const bool local = strcasecmp(projection.c_str(), "LOCAL") == 0;
  if (!crs && !local && degrees) {
    crs = srsFromText("EPSG:4326", &message);
    *notes += "  " + input +
              " names no CRS; its coordinates are taken as WGS 84 longitude "
              "and latitude (give --source-crs otherwise)\n";
  }
  if (local && crs) {
    if (!OSRIsProjected(crs.get())) {
      *error = "--projection LOCAL: " + input +
               " is in longitude and latitude; a LOCAL grid is "
               "plain metres, so give a map projection (auto, UTM-<zone>, EPSG:<code>, ...)";
      return false;
    }
    crs.reset();
    *notes += "  LOCAL: the projected coordinates of " + input + " are taken as plain metres\n";
  }
  if (strcasecmp(projection.c_str(), "auto") == 0) {
    double longitude = 0.0, latitude = 0.0;
    if (!regionCentre(source, crs.get(), options, &longitude, &latitude, error)) return false;
    projection = utmZoneOf(longitude, latitude);
    *notes += "  projection auto: " + projection + " (the region's middle lies at " +
              numberText(longitude) + ", " + numberText(latitude) + ")\n";
  }
  try {
    out.map = std::make_unique<Cartography>(projection, 0.0, 0.0, 0.0);
  } catch (const std::exception& e) {
    *error = "--projection '" + projection + "' is unusable: " + e.what();
    return false;
  }
  if (crs) {
    out.targetCrs = srsFromText(out.map->wkt(), &message);
    if (!out.targetCrs) {
      *error = "--projection '" + projection + "': GDAL cannot take it: " + message;
      return false;
    }
    out.reproject = OSRIsSame(crs.get(), out.targetCrs.get()) == 0;
  }
  out.text = projection;
  out.sourceCrs = std::move(crs);
  *result = std::move(out);
  return true;
}

}  // namespace karnet::mkgrid
