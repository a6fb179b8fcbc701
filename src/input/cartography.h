#ifndef KARNET_INPUT_CARTOGRAPHY_H_
#define KARNET_INPUT_CARTOGRAPHY_H_

#include <cstddef>
#include <memory>
#include <string>

namespace karnet {

// A map projection on PROJ: LOCAL (identity), UTM-<zone>[N|S], EPSG:<code>,
// a PROJ string or WKT of a projected CRS.
class Cartography {
 public:
  // Throws std::runtime_error when the projection text is not usable.
  Cartography(const std::string& projection, double longitude, double latitude,
              double orientation);
  ~Cartography();
  Cartography(const Cartography&) = delete;
  Cartography& operator=(const Cartography&) = delete;

  void geoToProj(double longitude, double latitude, double* x, double* y) const;
  void projToGeo(double x, double y, double* longitude, double* latitude) const;
  // projToGeo of count points in place: x becomes the longitude, y the
  // latitude (NaN where PROJ cannot transform a point). One PROJ call for all.
  void projToGeo(std::size_t count, double* x, double* y) const;
  // Meridian convergence in degrees (clockwise from true north to grid north).
  double convergence(double longitude, double latitude) const;
  // WKT of the projected CRS, empty when there is none (LOCAL).
  std::string wkt() const;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace karnet

#endif  // KARNET_INPUT_CARTOGRAPHY_H_
