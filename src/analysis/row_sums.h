#ifndef KARNET_ANALYSIS_ROW_SUMS_H_
#define KARNET_ANALYSIS_ROW_SUMS_H_

#include <cstdint>

namespace karnet {

// Sums over the first `rows` rows of a (row stride `stride`), each row's sum
// formed over its columns j = 0 .. columns-1 in turn, one addition after the
// other (several rows are worked on side by side, each in its own order).

// In single precision: sums[i] = sum of a(i, j) (not formed when sums is
// null); products[i] = sum of a(i, j) * values[j].
void floatRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                  std::int32_t columns, float* sums, float* products);

// In double precision, from the float entries: products[i] = sum of
// a(i, j) * values[j]; sums[i] = sum of a(i, j). Either of products and sums
// may be null (then not formed; values is not read without products).
void doubleRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                   std::int32_t columns, double* products, double* sums);

// The same double sums from a matrix stored column by column: entry (i, j) at
// aT[j * stride + i]. Each row's sums are formed in the same order, so they
// have the same bits; here the rows of a column are loaded side by side. With
// vectorised, the processor's vector body where it has one.
void doubleColumnSums(const float* aT, std::int64_t stride, const float* values,
                      std::int32_t rows, std::int32_t columns, double* products, double* sums,
                      bool vectorised = true);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_ROW_SUMS_H_
