// SPDX-License-Identifier: MIT
// Dense linear systems: LU factorisation without pivoting (Doolittle), square systems, and least
// squares through the normal equations.
#include <algorithm>
#include <cmath>
#include <cstdio>

#include "norvale_3d_sticker_core.h"
#include "platform/scratch_array.h"

namespace {

using n3ds::ScratchArray;

// Absolute, whatever the size of the matrix: callers rely on it as the singularity test, so that a
// system without enough evidence in it fails instead of giving wild values.
constexpr double kMinPivot = 1e-6;

// The zeros and the one that are fixed in row i of L and U.
void WriteFixedParts(size_t i, size_t n, float* L, float* U) {
  std::fill_n(U + i * n, i, 0.0f);
  L[i * n + i] = 1.0f;
  std::fill_n(L + i * n + i + 1, n - i - 1, 0.0f);
}

// x from L U x = rhs. y is scratch of n floats.
void SubstituteLU(const float* L, const float* U, size_t n, const float* rhs, float* y, float* x) {
  for (size_t i = 0; i < n; ++i) {
    float sum = 0.0f;
    for (size_t k = 0; k < i; ++k) sum += L[i * n + k] * y[k];
    y[i] = rhs[i] - sum;
  }
  for (size_t i = n; i-- > 0;) {
    float sum = 0.0f;
    for (size_t k = i + 1; k < n; ++k) sum += U[i * n + k] * x[k];
    x[i] = (y[i] - sum) / U[i * n + i];
  }
}

// Factorises the cols x cols matrix `square` and solves for the right-hand side.
MRESULT FactoriseAndSolve(MHandle memory, const float* square, int32_t cols, float* L, float* U,
                          const float* rhs, float* x) {
  if (const MRESULT status = MatDecompLU(square, cols, L, U); status != N3DS_OK) return status;
  const size_t n = static_cast<size_t>(cols);
  const ScratchArray<float> y(memory, n);
  if (!y) return N3DS_NO_MEMORY;
  SubstituteLU(L, U, n, rhs, y.get(), x);
  return N3DS_OK;
}

}  // namespace

MRESULT MatDecompLU(const float* A, int32_t n, float* L, float* U) {
  if (A == nullptr || L == nullptr || U == nullptr) return N3DS_NULL_ARGUMENT;
  if (n < 0) return N3DS_BAD_VALUE;
  const size_t size = static_cast<size_t>(n);

  for (size_t i = 0; i < size; ++i) {
    const float* a = A + i * size;
    float* l = L + i * size;
    float* u = U + i * size;
    // The row of L first gathers the sums of L(i,k) U(k,j) over k, for the columns of both rows,
    // row of U by row of U; each sum still takes its terms in increasing k, as the definition does
    // that goes column by column.
    std::fill_n(l, size, 0.0f);
    for (size_t k = 0; k < i; ++k) {
      const float* upper = U + k * size;
      const float lower = (a[k] - l[k]) / upper[k];
      l[k] = lower;
      for (size_t j = k + 1; j < size; ++j) l[j] += lower * upper[j];
    }
    u[i] = a[i] - l[i];
    if (std::fabs(static_cast<double>(u[i])) < kMinPivot) {
      std::puts("zero in LU");
      for (size_t row = i; row < size; ++row) WriteFixedParts(row, size, L, U);
      return N3DS_NUMERICAL;
    }
    for (size_t j = i + 1; j < size; ++j) u[j] = a[j] - l[j];
    WriteFixedParts(i, size, L, U);
  }
  return N3DS_OK;
}

MRESULT SolveLinearAxb(MHandle memory, const float* A, int32_t rows, int32_t cols, float* x,
                       const float* b) {
  if (A == nullptr || x == nullptr || b == nullptr) return N3DS_NULL_ARGUMENT;
  if (rows < cols || rows < 0 || cols < 0) return N3DS_BAD_VALUE;
  if (cols == 0) return N3DS_OK;  // nothing to solve for
  const size_t m = static_cast<size_t>(rows), n = static_cast<size_t>(cols);

  const ScratchArray<float> L(memory, n * n);
  const ScratchArray<float> U(memory, n * n);
  if (!L || !U) return N3DS_NO_MEMORY;
  if (rows == cols) return FactoriseAndSolve(memory, A, cols, L.get(), U.get(), b, x);

  const ScratchArray<float> normal(memory, n * n);
  const ScratchArray<float> moment(memory, n);
  const ScratchArray<float> transpose(memory, n * m);
  if (!normal || !moment || !transpose) return N3DS_NO_MEMORY;
  for (size_t c = 0; c < n; ++c) {
    for (size_t r = 0; r < m; ++r) transpose[c * m + r] = A[r * n + c];
  }
  MRESULT status =
      mcvMatrixMulMatrixRowMajor_f32(normal.get(), transpose.get(), A, cols, rows, cols);
  if (status != N3DS_OK) return status;
  status = mcvMatrixMulMatrixRowMajor_f32(moment.get(), transpose.get(), b, cols, rows, 1);
  if (status != N3DS_OK) return status;
  return FactoriseAndSolve(memory, normal.get(), cols, L.get(), U.get(), moment.get(), x);
}
