// The WKT of a projection text, written beside the projection so that GIS
// tools find the coordinate reference system of a file.
#include <proj.h>

#include <cctype>
#include <cstdlib>
#include <functional>
#include <string>

#include "gridfile/grid_file_internal.h"

namespace karnet {
namespace {

std::string trimmed(const std::string& text) {
  const std::size_t begin = text.find_first_not_of(" \t\r\n");
  if (begin == std::string::npos) return std::string();
  const std::size_t end = text.find_last_not_of(" \t\r\n");
  return text.substr(begin, end - begin + 1);
}

std::string upper(std::string text) {
  for (char& c : text) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return text;
}

// UTM-<zone>, UTM-<zone>N, UTM-<zone>S (zone 1 to 60) as an EPSG code; empty otherwise.
std::string utmDefinition(const std::string& text) {
  const std::string u = upper(text);
  if (u.size() < 5 || u.compare(0, 4, "UTM-") != 0) return std::string();
  std::size_t i = 4;
  int zone = 0;
  std::size_t digits = 0;
  while (i < u.size() && std::isdigit(static_cast<unsigned char>(u[i])) != 0 && digits < 3) {
    zone = zone * 10 + (u[i] - '0');
    ++i;
    ++digits;
  }
  if (digits == 0 || zone < 1 || zone > 60) return std::string();
  bool south = false;
  if (i < u.size()) {
    if (i + 1 != u.size() || (u[i] != 'N' && u[i] != 'S')) return std::string();
    south = u[i] == 'S';
  }
  return "EPSG:" + std::to_string((south ? 32700 : 32600) + zone);
}

}  // namespace

bool grdWithProjectedCrs(const std::string& projection,
                         const std::function<void(PJ_CONTEXT*, PJ*)>& use) {
  const std::string text = trimmed(projection);
  if (text.empty() || upper(text) == "LOCAL") return false;
  std::string definition = utmDefinition(text);
  if (definition.empty()) {
    definition = text;
    // A PROJ string names a CRS only with +type=crs.
    if (definition[0] == '+' && definition.find("+type=crs") == std::string::npos) {
      definition += " +type=crs";
    }
  }
  PJ_CONTEXT* context = proj_context_create();
  if (context == nullptr) return false;
  proj_log_level(context, PJ_LOG_NONE);
  bool used = false;
  PJ* crs = proj_create(context, definition.c_str());
  if (crs != nullptr) {
    if (proj_get_type(crs) == PJ_TYPE_PROJECTED_CRS) {
      use(context, crs);
      used = true;
    }
    proj_destroy(crs);
  }
  proj_context_destroy(context);
  return used;
}

std::string grdProjectionWkt(const std::string& projection) {
  std::string wkt;
  grdWithProjectedCrs(projection, [&wkt](PJ_CONTEXT* context, PJ* crs) {
    const char* text = proj_as_wkt(context, crs, PJ_WKT2_2019, nullptr);
    if (text != nullptr) wkt = text;
  });
  return wkt;
}

std::string grdProjectionSpatialRef(const std::string& projection) {
  std::string wkt;
  grdWithProjectedCrs(projection, [&wkt](PJ_CONTEXT* context, PJ* crs) {
    const char* const options[] = {"MULTILINE=NO", nullptr};
    const char* text = proj_as_wkt(context, crs, PJ_WKT1_GDAL, options);
    if (text == nullptr) text = proj_as_wkt(context, crs, PJ_WKT2_2019, options);
    if (text != nullptr) wkt = text;
  });
  return wkt;
}

}  // namespace karnet
