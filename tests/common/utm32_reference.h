#ifndef KARNET_TESTS_COMMON_UTM32_REFERENCE_H_
#define KARNET_TESTS_COMMON_UTM32_REFERENCE_H_

#include <proj.h>

#include <numbers>

namespace karnet::test {

inline constexpr double kDegree = std::numbers::pi / 180.0;

// WGS 84 / UTM zone 32N through PROJ's own API, independent of karnet's cartography:
// the reference that result positions are held to.
class Utm32 {
 public:
  Utm32() : context_(proj_context_create()) {
    PJ* op = proj_create_crs_to_crs(context_, "EPSG:4326", "EPSG:32632", nullptr);
    toUtm_ = proj_normalize_for_visualization(context_, op);
    proj_destroy(op);
    plain_ = proj_create(context_, "+proj=utm +zone=32 +datum=WGS84");
  }
  ~Utm32() {
    proj_destroy(plain_);
    proj_destroy(toUtm_);
    proj_context_destroy(context_);
  }
  Utm32(const Utm32&) = delete;
  Utm32& operator=(const Utm32&) = delete;

  PJ_XY forward(double lon, double lat) const {
    return proj_trans(toUtm_, PJ_FWD, proj_coord(lon, lat, 0, 0)).xy;
  }
  PJ_XY inverse(double x, double y) const {
    return proj_trans(toUtm_, PJ_INV, proj_coord(x, y, 0, 0)).xy;
  }
  // Meridian convergence in degrees.
  double convergence(double lon, double lat) const {
    return proj_factors(plain_, proj_coord(lon * kDegree, lat * kDegree, 0, 0))
               .meridian_convergence /
           kDegree;
  }

 private:
  PJ_CONTEXT* context_;
  PJ* toUtm_ = nullptr;
  PJ* plain_ = nullptr;
};

}  // namespace karnet::test

#endif  // KARNET_TESTS_COMMON_UTM32_REFERENCE_H_
