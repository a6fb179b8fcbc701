// Map projections on PROJ. Every Cartography owns its PROJ context, so objects
// on different threads never share PROJ state.
#include "input/cartography.h"

#include <proj.h>
#include <proj_experimental.h>

#include <cctype>
#include <cmath>
#include <limits>
#include <numbers>
#include <stdexcept>
#include <string>
#include <string_view>

namespace karnet {

namespace {

constexpr double kDegree = std::numbers::pi / 180.0;

void discardLog(void* /*data*/, int /*level*/, const char* /*message*/) {}

// PROJ marks a point it cannot transform with HUGE_VAL; callers see NaN.
double finiteOrNaN(double value) {
  return std::isfinite(value) ? value : std::numeric_limits<double>::quiet_NaN();
}

std::string trimmed(std::string_view text) {
  const char* blanks = " \t\r\n\f\v";
  std::size_t first = text.find_first_not_of(blanks);
  if (first == std::string_view::npos) return std::string();
  std::size_t last = text.find_last_not_of(blanks);
  return std::string(text.substr(first, last - first + 1));
}

bool startsWithIgnoringCase(std::string_view text, std::string_view prefix) {
  if (text.size() < prefix.size()) return false;
  for (std::size_t i = 0; i < prefix.size(); ++i) {
    if (std::tolower(static_cast<unsigned char>(text[i])) !=
        std::tolower(static_cast<unsigned char>(prefix[i]))) {
      return false;
    }
  }
  return true;
}

bool equalsIgnoringCase(std::string_view a, std::string_view b) {
  return a.size() == b.size() && startsWithIgnoringCase(a, b);
}

// "UTM-<zone>[N|S]" as an EPSG code of WGS 84 / UTM; throws for a malformed
// zone so that "UTM-61" is not handed to PROJ as something else.
std::string utmCode(std::string_view text) {
  std::string_view rest = text.substr(4);
  std::size_t digits = 0;
  while (digits < rest.size() && digits < 3 && std::isdigit(static_cast<unsigned char>(rest[digits]))) {
    ++digits;
  }
  int zone = 0;
  for (std::size_t i = 0; i < digits; ++i) zone = zone * 10 + (rest[i] - '0');
  std::string_view hemisphere = rest.substr(digits);
  bool south = false;
  if (equalsIgnoringCase(hemisphere, "S")) {
    south = true;
  } else if (!hemisphere.empty() && !equalsIgnoringCase(hemisphere, "N")) {
    throw std::runtime_error("invalid UTM projection " + std::string(text));
  }
  if (digits == 0 || zone < 1 || zone > 60) {
    throw std::runtime_error("invalid UTM zone in " + std::string(text));
  }
  return "EPSG:" + std::to_string((south ? 32700 : 32600) + zone);
}

}  // namespace

struct Cartography::Impl {
  PJ_CONTEXT* context = nullptr;
  PJ* crs = nullptr;        // the projected CRS; null for LOCAL
  PJ* transform = nullptr;  // geographic (lon, lat degrees) -> projected (east, north)
  PJ* factors = nullptr;    // the projection as a plain PROJ operation, for proj_factors
  bool local = false;
  double longitude = 0.0;
  double latitude = 0.0;
  double orientation = 0.0;

  ~Impl() {
    if (factors != nullptr) proj_destroy(factors);
    if (transform != nullptr) proj_destroy(transform);
    if (crs != nullptr) proj_destroy(crs);
    if (context != nullptr) proj_context_destroy(context);
  }

  // object itself; throws when PROJ gave none.
  PJ* owned(PJ* object, const char* what) {
    if (object == nullptr) throw std::runtime_error(what);
    return object;
  }

  void open(const std::string& text);
};

void Cartography::Impl::open(const std::string& text) {
  std::string definition = text;
  if (startsWithIgnoringCase(text, "UTM-")) {
    definition = utmCode(text);
  } else if ((startsWithIgnoringCase(text, "+proj=") || startsWithIgnoringCase(text, "proj=")) &&
             text.find("type=crs") == std::string::npos) {
    // A bare PROJ string is an operation for PROJ; as a projection text it
    // means the CRS it defines.
    definition += " +type=crs";
  }

  context = proj_context_create();
  if (context == nullptr) throw std::runtime_error("no PROJ context");
  proj_log_func(context, nullptr, discardLog);
  proj_context_set_enable_network(context, 0);

  PJ* object = owned(proj_create(context, definition.c_str()), "projection not recognised");
  // A compound CRS (with heights) carries the horizontal CRS first; that or
  // the CRS itself may be a bound CRS (+towgs84) around the projected CRS.
  if (proj_get_type(object) == PJ_TYPE_COMPOUND_CRS) {
    PJ* inner = proj_crs_get_sub_crs(context, object, 0);
    proj_destroy(object);
    object = owned(inner, "compound CRS without horizontal part");
  }
  if (proj_get_type(object) == PJ_TYPE_BOUND_CRS) {
    PJ* inner = proj_get_source_crs(context, object);
    proj_destroy(object);
    object = owned(inner, "bound CRS without source");
  }
  crs = object;
  if (proj_get_type(crs) != PJ_TYPE_PROJECTED_CRS) {
    throw std::runtime_error("not a projected CRS: " + text);
  }

  PJ* base = owned(proj_crs_get_geodetic_crs(context, crs), "projected CRS without base");
  // Longitude and latitude are always degrees, whatever unit the base CRS uses.
  PJ* baseDegrees = proj_crs_alter_cs_angular_unit(context, base, "degree", kDegree, "EPSG", "9122");
  proj_destroy(base);
  baseDegrees = owned(baseDegrees, "base CRS cannot use degrees");
  PJ* operation = proj_create_crs_to_crs_from_pj(context, baseDegrees, crs, nullptr, nullptr);
  proj_destroy(baseDegrees);
  operation = owned(operation, "no conversion to the projected CRS");
  // Longitude before latitude, easting before northing.
  transform = proj_normalize_for_visualization(context, operation);
  proj_destroy(operation);
  owned(transform, "conversion cannot be normalised");

  // proj_factors on a CRS object takes the CRS's axis order into account only
  // partly (a northing-first CRS gives nonsense), while on the classic
  // operation of its PROJ string it is exact. CRSs without a PROJ string form
  // fall back to the CRS object itself.
  if (const char* definitionText = proj_as_proj_string(context, crs, PJ_PROJ_5, nullptr)) {
    std::string operation = definitionText;
    const std::size_t at = operation.find(" +type=crs");
    if (at != std::string::npos) operation.erase(at, 10);
    factors = proj_create(context, operation.c_str());
  }
}

Cartography::Cartography(const std::string& projection, double longitude, double latitude,
                         double orientation)
    : impl_(std::make_unique<Impl>()) {
  impl_->longitude = longitude;
  impl_->latitude = latitude;
  impl_->orientation = orientation;
  const std::string text = trimmed(projection);
  if (text.empty()) throw std::runtime_error("empty projection text");
  if (equalsIgnoringCase(text, "LOCAL")) {
    impl_->local = true;
    return;
  }
  impl_->open(text);
}

Cartography::~Cartography() = default;

void Cartography::geoToProj(double longitude, double latitude, double* x, double* y) const {
  if (impl_->local) {
    *x = longitude;
    *y = latitude;
    return;
  }
  PJ_COORD out = proj_trans(impl_->transform, PJ_FWD, proj_coord(longitude, latitude, 0, 0));
  proj_errno_reset(impl_->transform);
  *x = finiteOrNaN(out.xy.x);
  *y = finiteOrNaN(out.xy.y);
}

void Cartography::projToGeo(double x, double y, double* longitude, double* latitude) const {
  if (impl_->local) {
    *longitude = x;
    *latitude = y;
    return;
  }
  PJ_COORD out = proj_trans(impl_->transform, PJ_INV, proj_coord(x, y, 0, 0));
  proj_errno_reset(impl_->transform);
  *longitude = finiteOrNaN(out.xy.x);
  *latitude = finiteOrNaN(out.xy.y);
}

void Cartography::projToGeo(std::size_t count, double* x, double* y) const {
  if (impl_->local || count == 0) return;
  const std::size_t stride = sizeof(double);
  proj_trans_generic(impl_->transform, PJ_INV, x, stride, count, y, stride, count, nullptr, 0,
                     0, nullptr, 0, 0);
  proj_errno_reset(impl_->transform);
  for (std::size_t i = 0; i < count; ++i) {
    x[i] = finiteOrNaN(x[i]);
    y[i] = finiteOrNaN(y[i]);
  }
}

double Cartography::convergence(double longitude, double latitude) const {
  if (impl_->local) return 0.0;
  // proj_factors wants radians, longitude from the base CRS's prime meridian,
  // as the longitudes of this class are.
  PJ* projection = impl_->factors != nullptr ? impl_->factors : impl_->crs;
  proj_errno_reset(projection);
  const PJ_FACTORS factors = proj_factors(
      projection, proj_coord(longitude * kDegree, latitude * kDegree, 0, 0));
  const bool failed = proj_errno(projection) != 0;
  proj_errno_reset(projection);
  if (failed) return std::numeric_limits<double>::quiet_NaN();
  return factors.meridian_convergence / kDegree;
}

std::string Cartography::wkt() const {
  if (impl_->local) return std::string();
  const char* text = proj_as_wkt(impl_->context, impl_->crs, PJ_WKT1_GDAL, nullptr);
  if (text == nullptr) text = proj_as_wkt(impl_->context, impl_->crs, PJ_WKT2_2019, nullptr);
  return text != nullptr ? std::string(text) : std::string();
}

}  // namespace karnet
