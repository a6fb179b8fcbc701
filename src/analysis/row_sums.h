#ifndef KARNET_ANALYSIS_ROW_SUMS_H_
#define KARNET_ANALYSIS_ROW_SUMS_H_

#include <cstdint>

namespace karnet {

// Sums over the first `rows` rows of a (row stride `stride`), each row's sum
// formed over its columns j = 0 .. columns-1 in turn, one addition after the
// other. Rows are summed side by side (eight at a time on
// processors with AVX2, their columns gathered), which changes no row's own
// order of operations, so every body gives the same bits; `vectorised` false
// asks for the plain one.

// In single precision: sums[i] = sum of a(i, j); products[i] = sum of
// a(i, j) * values[j].
void floatRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                  std::int32_t columns, float* sums, float* products, bool vectorised = true);

// In double precision, from the float entries: products[i] = sum of
// a(i, j) * values[j]; sums[i] = sum of a(i, j).
void doubleRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                   std::int32_t columns, double* products, double* sums, bool vectorised = true);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_ROW_SUMS_H_
