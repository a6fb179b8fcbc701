// Row sums of the inverted correlation matrix, for the estimate and its error
// variance.
#include "analysis/row_sums.h"

namespace karnet {
namespace {

// Rows i .. i + R - 1: each row's sums over its columns in turn, the rows of
// the block worked on side by side so that their chains of additions overlap
// instead of waiting on one another.
template <int R, bool WithProducts, bool WithSums, typename Sum>
inline void rowBlock(const float* a, std::int64_t stride, const float* values, std::int32_t i,
                     std::int32_t columns, Sum* products, Sum* sums) {
  Sum product[R] = {};
  Sum sum[R] = {};
  for (std::int32_t j = 0; j < columns; ++j) {
    // values is not read (and may be null) without products.
    const Sum v = WithProducts ? static_cast<Sum>(values[j]) : Sum{};
    for (int r = 0; r < R; ++r) {
      const auto x = static_cast<Sum>(a[(i + r) * stride + j]);
      if constexpr (WithProducts) product[r] = product[r] + x * v;
      if constexpr (WithSums) sum[r] = sum[r] + x;
    }
  }
  for (int r = 0; r < R; ++r) {
    if constexpr (WithProducts) products[i + r] = product[r];
    if constexpr (WithSums) sums[i + r] = sum[r];
  }
}

constexpr int kBlock = 4;

template <bool WithProducts, bool WithSums, typename Sum>
void rowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
             std::int32_t columns, Sum* products, Sum* sums) {
  std::int32_t i = 0;
  for (; i + kBlock <= rows; i += kBlock) {
    rowBlock<kBlock, WithProducts, WithSums>(a, stride, values, i, columns, products, sums);
  }
  for (; i < rows; ++i) {
    rowBlock<1, WithProducts, WithSums>(a, stride, values, i, columns, products, sums);
  }
}

}  // namespace

void floatRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                  std::int32_t columns, float* sums, float* products) {
  if (sums == nullptr) {
    rowSums<true, false>(a, stride, values, rows, columns, products, sums);
  } else {
    rowSums<true, true>(a, stride, values, rows, columns, products, sums);
  }
}

void doubleRowSums(const float* a, std::int64_t stride, const float* values, std::int32_t rows,
                   std::int32_t columns, double* products, double* sums) {
  if (sums == nullptr) {
    rowSums<true, false>(a, stride, values, rows, columns, products, sums);
  } else if (products == nullptr) {
    rowSums<false, true>(a, stride, values, rows, columns, products, sums);
  } else {
    rowSums<true, true>(a, stride, values, rows, columns, products, sums);
  }
}

}  // namespace karnet
