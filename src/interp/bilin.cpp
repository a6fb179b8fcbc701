// Bilinear estimate from one data node in each of the four quadrants.
#include "interp/bilin.h"

namespace karnet {

namespace {

// Linear interpolation between two points: (a1 - a0) * (x - x0) / (x1 - x0) + a0,
// the product formed first, every term a float.
inline float along(float a0, float a1, float x, float x0, float x1) {
  return (a1 - a0) * (x - x0) / (x1 - x0) + a0;
}

// Integer difference converted to float afterwards.
inline float diff(std::int32_t a, std::int32_t b) { return static_cast<float>(a - b); }

}  // namespace

float bilin(const std::int32_t* jHit, const std::int32_t* kHit, const float* f,
            std::int32_t j, std::int32_t k) {
  const std::int32_t j1 = jHit[1], j2 = jHit[2], j3 = jHit[3], j4 = jHit[4];
  const std::int32_t k1 = kHit[1], k2 = kHit[2], k3 = kHit[3], k4 = kHit[4];
  const float f1 = f[1], f2 = f[2], f3 = f[3], f4 = f[4];

  // Column j crosses P1-P2 at (j, kA) and P3-P4 at (j, kC).
  const float tA = diff(j, j1), dA = diff(j2, j1);
  const float kA = diff(k2, k1) * tA / dA + static_cast<float>(k1);
  const float fA = (f2 - f1) * tA / dA + f1;
  const float tC = diff(j, j3), dC = diff(j4, j3);
  const float kC = diff(k4, k3) * tC / dC + static_cast<float>(k3);
  const float fC = (f4 - f3) * tC / dC + f3;

  // Row k crosses P2-P3 at (jB, k) and P4-P1 at (jD, k).
  const float tB = diff(k, k2), dB = diff(k3, k2);
  const float jB = diff(j3, j2) * tB / dB + static_cast<float>(j2);
  const float fB = (f3 - f2) * tB / dB + f2;
  const float tD = diff(k, k4), dD = diff(k1, k4);
  const float jD = diff(j1, j4) * tD / dD + static_cast<float>(j4);
  const float fD = (f1 - f4) * tD / dD + f4;

  // Estimate along the column, and the correction along the row from fB.
  const float e1 = along(fA, fC, static_cast<float>(k), kA, kC);
  const float h = (static_cast<float>(j) - jB) * (fD - fB) / (jD - jB);

  // Mean of the two estimates, halved in double.
  const float sum = (e1 + fB) + h;
  return static_cast<float>(static_cast<double>(sum) * 0.5);
}

}  // namespace karnet
