// SPDX-License-Identifier: MIT
// The float matrix product: its definition, and the vector form of this build and processor.
#pragma once

#include <cstdint>

namespace n3ds {

// C (m x n) = A (m x k) B (k x n), row-major and dense, m, n >= 1, k >= 0, C apart from A and B.
// Entry (i, j) starts at +0 and takes its k terms in increasing p by fused multiply-adds. Every
// form gives the same bits, except that a NaN's sign and payload are the processor's.
using MatrixProduct = void (*)(float* C, const float* A, const float* B, int32_t m, int32_t k,
                               int32_t n);

// The definition, as plain loops.
void MultiplyPortable(float* C, const float* A, const float* B, int32_t m, int32_t k, int32_t n);

// The vector form; null where the build or the processor has none.
MatrixProduct SimdMatrixProduct();

}  // namespace n3ds
