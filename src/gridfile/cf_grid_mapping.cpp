// The CF grid mapping of a projected CRS: grid_mapping_name and its
// parameters, read from the CRS's conversion as PROJ describes it, so that
// CF tools (CDO, xarray, ncview) know the projection without parsing WKT.
#include <proj.h>

#include <cmath>
#include <cstdlib>
#include <cstring>
#include <map>
#include <numbers>
#include <string>
#include <vector>

#include "gridfile/grid_file_internal.h"

namespace karnet {
namespace {

constexpr double kDegree = std::numbers::pi / 180.0;

// EPSG codes of the conversion methods that CF has a grid mapping for.
enum Method {
  kTransverseMercator = 9807,
  kLambertConic1 = 9801,
  kLambertConic2 = 9802,
  kMercatorA = 9804,
  kMercatorB = 9805,
  kPolarStereographicA = 9810,
  kPolarStereographicB = 9829,
  kAlbers = 9822,
};

// EPSG codes of the conversion parameters.
enum Parameter {
  kLatitudeOfOrigin = 8801,
  kLongitudeOfOrigin = 8802,
  kScaleAtOrigin = 8805,
  kFalseEasting = 8806,
  kFalseNorthing = 8807,
  kLatitudeOfFalseOrigin = 8821,
  kLongitudeOfFalseOrigin = 8822,
  kFirstParallel = 8823,
  kSecondParallel = 8824,
  kEastingAtFalseOrigin = 8826,
  kNorthingAtFalseOrigin = 8827,
  kStandardParallel = 8832,
  kLongitudeOfPoleOrigin = 8833,
};

int epsgCode(const char* authority, const char* code) {
  if (authority == nullptr || code == nullptr || std::strcmp(authority, "EPSG") != 0) return 0;
  return std::atoi(code);
}

// The parameters of a conversion by EPSG code: angles in degrees, lengths in
// metres, scale factors as numbers.
std::map<int, double> conversionParameters(PJ_CONTEXT* context, PJ* conversion) {
  std::map<int, double> values;
  const int count = proj_coordoperation_get_param_count(context, conversion);
  for (int i = 0; i < count; ++i) {
    const char* authority = nullptr;
    const char* code = nullptr;
    const char* category = nullptr;
    double value = 0.0;
    double factor = 1.0;
    if (proj_coordoperation_get_param(context, conversion, i, nullptr, &authority, &code, &value,
                                      nullptr, &factor, nullptr, nullptr, nullptr,
                                      &category) == 0) {
      continue;
    }
    double converted = value * factor;
    if (category != nullptr && std::strcmp(category, "angular") == 0) converted /= kDegree;
    if (std::isfinite(converted)) values[epsgCode(authority, code)] = converted;
  }
  return values;
}

struct MappingBuilder {
  const std::map<int, double>& p;
  std::vector<GrdCfAttribute> out;
  bool complete = true;

  void name(const char* text) { out.push_back({"grid_mapping_name", text, {}}); }
  void number(const char* attribute, int code) {
    const auto it = p.find(code);
    if (it == p.end()) {
      complete = false;
      return;
    }
    out.push_back({attribute, std::string(), {it->second}});
  }
  void numbers(const char* attribute, std::vector<int> codes) {
    GrdCfAttribute a{attribute, std::string(), {}};
    for (int code : codes) {
      const auto it = p.find(code);
      if (it == p.end()) {
        complete = false;
        return;
      }
      a.numbers.push_back(it->second);
    }
    out.push_back(a);
  }
  void fixed(const char* attribute, double value) {
    out.push_back({attribute, std::string(), {value}});
  }
  double value(int code, double fallback) const {
    const auto it = p.find(code);
    return it == p.end() ? fallback : it->second;
  }
};

// The CF attributes of a conversion; empty when CF has no mapping for it.
std::vector<GrdCfAttribute> cfParameters(int method, const std::map<int, double>& p) {
  MappingBuilder b{p, {}, true};
  switch (method) {
    case kTransverseMercator:
      b.name("transverse_mercator");
      b.number("latitude_of_projection_origin", kLatitudeOfOrigin);
      b.number("longitude_of_central_meridian", kLongitudeOfOrigin);
      b.number("scale_factor_at_central_meridian", kScaleAtOrigin);
      b.number("false_easting", kFalseEasting);
      b.number("false_northing", kFalseNorthing);
      break;
    case kLambertConic1:
      // CF's one-parallel form has no scale factor: only a scale of 1 fits it.
      if (b.value(kScaleAtOrigin, 0.0) != 1.0) return {};
      b.name("lambert_conformal_conic");
      b.number("standard_parallel", kLatitudeOfOrigin);
      b.number("latitude_of_projection_origin", kLatitudeOfOrigin);
      b.number("longitude_of_central_meridian", kLongitudeOfOrigin);
      b.number("false_easting", kFalseEasting);
      b.number("false_northing", kFalseNorthing);
      break;
    case kLambertConic2:
    case kAlbers:
      b.name(method == kAlbers ? "albers_conical_equal_area" : "lambert_conformal_conic");
      b.numbers("standard_parallel", {kFirstParallel, kSecondParallel});
      b.number("latitude_of_projection_origin", kLatitudeOfFalseOrigin);
      b.number("longitude_of_central_meridian", kLongitudeOfFalseOrigin);
      b.number("false_easting", kEastingAtFalseOrigin);
      b.number("false_northing", kNorthingAtFalseOrigin);
      break;
    case kMercatorA:
      if (b.value(kLatitudeOfOrigin, 0.0) != 0.0) return {};
      b.name("mercator");
      b.number("longitude_of_projection_origin", kLongitudeOfOrigin);
      b.number("scale_factor_at_projection_origin", kScaleAtOrigin);
      b.number("false_easting", kFalseEasting);
      b.number("false_northing", kFalseNorthing);
      break;
    case kMercatorB:
      b.name("mercator");
      b.number("standard_parallel", kFirstParallel);
      b.number("longitude_of_projection_origin", kLongitudeOfOrigin);
      b.number("false_easting", kFalseEasting);
      b.number("false_northing", kFalseNorthing);
      break;
    case kPolarStereographicA: {
      const double latitude = b.value(kLatitudeOfOrigin, 0.0);
      if (std::fabs(latitude) != 90.0) return {};
      b.name("polar_stereographic");
      b.fixed("latitude_of_projection_origin", latitude);
      b.number("straight_vertical_longitude_from_pole", kLongitudeOfOrigin);
      b.number("scale_factor_at_projection_origin", kScaleAtOrigin);
      b.number("false_easting", kFalseEasting);
      b.number("false_northing", kFalseNorthing);
      break;
    }
    case kPolarStereographicB: {
      const double parallel = b.value(kStandardParallel, 0.0);
      b.name("polar_stereographic");
      b.fixed("latitude_of_projection_origin", parallel < 0.0 ? -90.0 : 90.0);
      b.number("standard_parallel", kStandardParallel);
      b.number("straight_vertical_longitude_from_pole", kLongitudeOfPoleOrigin);
      b.number("false_easting", kFalseEasting);
      b.number("false_northing", kFalseNorthing);
      break;
    }
    default:
      return {};
  }
  if (!b.complete) return {};
  return b.out;
}

// semi_major_axis, inverse_flattening and longitude_of_prime_meridian of the CRS.
void addEarthShape(PJ_CONTEXT* context, PJ* crs, std::vector<GrdCfAttribute>& out) {
  if (PJ* ellipsoid = proj_get_ellipsoid(context, crs)) {
    double semiMajor = 0.0, semiMinor = 0.0, inverseFlattening = 0.0;
    int computed = 0;
    if (proj_ellipsoid_get_parameters(context, ellipsoid, &semiMajor, &semiMinor, &computed,
                                      &inverseFlattening) != 0) {
      out.push_back({"semi_major_axis", std::string(), {semiMajor}});
      if (inverseFlattening > 0.0) {
        out.push_back({"inverse_flattening", std::string(), {inverseFlattening}});
      } else {
        out.push_back({"semi_minor_axis", std::string(), {semiMinor}});
      }
    }
    proj_destroy(ellipsoid);
  }
  if (PJ* meridian = proj_get_prime_meridian(context, crs)) {
    double longitude = 0.0, factor = 1.0;
    if (proj_prime_meridian_get_parameters(context, meridian, &longitude, &factor, nullptr) !=
        0) {
      out.push_back({"longitude_of_prime_meridian", std::string(), {longitude * factor / kDegree}});
    }
    proj_destroy(meridian);
  }
}

}  // namespace

std::vector<GrdCfAttribute> grdCfGridMapping(const std::string& projection) {
  std::vector<GrdCfAttribute> attributes;
  grdWithProjectedCrs(projection, [&attributes](PJ_CONTEXT* context, PJ* crs) {
    PJ* conversion = proj_crs_get_coordoperation(context, crs);
    if (conversion == nullptr) return;
    const char* authority = nullptr;
    const char* code = nullptr;
    if (proj_coordoperation_get_method_info(context, conversion, nullptr, &authority, &code) !=
        0) {
      attributes = cfParameters(epsgCode(authority, code),
                                conversionParameters(context, conversion));
    }
    proj_destroy(conversion);
    if (!attributes.empty()) addEarthShape(context, crs, attributes);
  });
  return attributes;
}

}  // namespace karnet
