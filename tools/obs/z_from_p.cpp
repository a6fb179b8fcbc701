// Height from pressure after TEOS-10 (IOC, SCOR and IAPSO 2010; Roquet et al. 2015 for the
// polynomial of specific volume). Written from the published algorithm:
//   h(p)  = integral from 0 to p of v(SSO, 0, p') dp'   (p' in Pa)
//   g(φ)  = 9.780327 (1 + 5.2792e-3 sin²φ + 2.32e-5 sin⁴φ)
//   gravity at height z: g(φ) (1 - γ z), γ = 2.26e-7 m⁻¹
//   z solves  g (z - γ z² / 2) + h = 0, taking the root near -h/g.
#include "obs/z_from_p.h"

#include <cmath>
#include <numbers>

namespace karnet::obs {

namespace {

constexpr double kGamma = 2.26e-7;            // vertical gradient of gravity, per metre
constexpr double kPascalPerDecibar = 1.0e4;

}  // namespace

double enthalpyStandardOcean(double p) {
  // v(SSO, 0, p) = sum v0k s^k with s = p / 1e4 dbar; the coefficients below are v0k / (k + 1),
  // so that s * (...) is the integral over s. The integral over p in Pa is 1e4 dbar * 1e4 Pa/dbar
  // times that.
  constexpr double h1 = 9.726613854843870e-4;    // v000
  constexpr double h2 = -2.252956605630465e-5;   // v001 / 2
  constexpr double h3 = 2.376909655387404e-6;    // v002 / 3
  constexpr double h4 = -1.664294869986011e-7;   // v003 / 4
  constexpr double h5 = -5.988108894465758e-9;   // v004 / 5
  constexpr double h6 = -2.10787688100e-9;       // v005 / 6
  constexpr double h7 = 2.80192913290e-10;      // v006 / 7
  const double s = p * 1.0e-4;
  const double integral = s * (h1 + s * (h2 + s * (h3 + s * (h4 + s * (h5 + s * (h6 + h7 * s))))));
  return integral * kPascalPerDecibar * 1.0e4;
}

double zFromPressure(double p, double lat) {
  const double sinLat = std::sin(lat * (std::numbers::pi / 180.0));
  const double sin2 = sinLat * sinLat;
  const double g = 9.780327 * (1.0 + (5.2792e-3 + 2.32e-5 * sin2) * sin2);
  // a z² + g z + h = 0 with a = -γ g / 2; the root written so that it does not cancel.
  const double a = -0.5 * kGamma * g;
  const double h = enthalpyStandardOcean(p);
  return -2.0 * h / (g + std::sqrt(g * g - 4.0 * a * h));
}

}  // namespace karnet::obs
