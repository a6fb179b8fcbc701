#ifndef KARNET_ANALYSIS_FILTERS_H_
#define KARNET_ANALYSIS_FILTERS_H_

#include <cstdint>

namespace karnet {

// Both filters work in place on an nj x nk field (element k * nj + j) and treat
// cells equal to deleteValue (compared after widening) as holes that they
// never change; any other value, not-a-number included, is valid.

// Shapiro filter of order n: every maximal run of valid cells along a column,
// then along a row, changes by kappa times its n-fold mirrored second
// difference, kappa = (n odd ? 1 : -1) / 2^(2n). lineBuffer must hold
// max(nj, nk) floats.
void shapiroFilter(float* data, std::int32_t nj, std::int32_t nk, std::int32_t n,
                   double deleteValue, float* lineBuffer);

// Replaces buffer[0..m] by its n-fold second difference with mirrored ends;
// runs of one or two values become zeros.
void shapiroOperator(float* buffer, std::int32_t m, std::int32_t n);

// Twelve-point filter: 4 x centre + the eight neighbours, over 12, read from a
// copy of the field; edges repeat the edge node and hole neighbours count as
// the centre.
void twelvePointFilter(float* data, std::int32_t nj, std::int32_t nk, double deleteValue);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_FILTERS_H_
