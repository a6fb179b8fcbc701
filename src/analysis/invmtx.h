#ifndef KARNET_ANALYSIS_INVMTX_H_
#define KARNET_ANALYSIS_INVMTX_H_

#include <cstdint>

#include "analysis/workspace.h"

namespace karnet {

// Inverts in place the n x n block of the float matrix a (row stride ws.limit)
// by Gauss-Jordan elimination with full pivoting, in single precision.
// Returns 0 on success and -1 on failure, with ws.errorText naming the reason:
//   "NOBS < 1 in INVMTX"               n < 1
//   "LIMIT < N in INVMTX"              ws.limit < n
//   "Matrix singular in INVMTX"        a pivot too small
//   "Determinant too large in INVMTX"  scaled down by ten 76 times or more
//                                      (det then holds that count)
// "Determinant very small in INVMTX" (final determinant below 1e-4) is set on
// success. det receives the determinant. The pivot records live in ws.pivot: entry c
// is the row in which column c's pivot was found, entry n + s the pivot column
// of step s.
// Runs the compiled variant that suits n best among those the processor supports.
std::int32_t INVMTX(OaWorkspace& ws, float* a, std::int32_t n, float& det);

// The compiled variants of INVMTX, one per instruction set; all give the same
// bits. kBaseline runs everywhere.
// kAvx2Padded works on a copy of the block with rows padded to whole vectors,
// for blocks of up to 64 rows (beyond, it is kAvx2).
enum class InvmtxVariant { kBaseline, kAvx2, kAvx512, kAvx2Padded };
inline constexpr InvmtxVariant kInvmtxVariants[] = {
    InvmtxVariant::kBaseline, InvmtxVariant::kAvx2, InvmtxVariant::kAvx512,
    InvmtxVariant::kAvx2Padded};

// Whether this build holds the variant and the processor can run it.
bool invmtxVariantAvailable(InvmtxVariant variant);
const char* invmtxVariantName(InvmtxVariant variant);

// INVMTX through the given variant (the baseline when it is not available).
std::int32_t invmtxWith(InvmtxVariant variant, OaWorkspace& ws, float* a, std::int32_t n,
                        float& det);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_INVMTX_H_
