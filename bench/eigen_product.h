// SPDX-License-Identifier: MIT
// Eigen's product of the same row-major arrays.
#pragma once

namespace n3ds::bench {

// C (m x n) = A (m x k) B (k x n) as Eigen does it for sizes known at run time: its blocked
// product, or for one column its matrix-vector product.
void EigenProduct(float* C, const float* A, const float* B, int m, int k, int n);

}  // namespace n3ds::bench
