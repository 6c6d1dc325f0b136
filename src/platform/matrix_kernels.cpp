// SPDX-License-Identifier: MIT
// Dense matrix kernels on top of the float product, and the integer products.
#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "norvale_3d_sticker_core.h"
#include "platform/integer_arithmetic.h"

namespace {

size_t ElementCount(int32_t rows, int32_t cols) {
  return rows < 1 || cols < 1 ? 0 : static_cast<size_t>(rows) * static_cast<size_t>(cols);
}

// dst = operation(a, b) element by element; dst may be a or b.
template <typename T, typename Operation>
int32_t ElementWise(T* dst, const T* a, const T* b, int32_t rows, int32_t cols,
                    Operation operation) {
  if (dst == nullptr || a == nullptr || b == nullptr) return N3DS_NULL_ARGUMENT;
  const size_t count = ElementCount(rows, cols);
  for (size_t i = 0; i < count; ++i) dst[i] = operation(a[i], b[i]);
  return N3DS_OK;
}

template <typename T, typename Operation>
int32_t ElementWise(T* dst, const T* src, int32_t rows, int32_t cols, Operation operation) {
  if (dst == nullptr || src == nullptr) return N3DS_NULL_ARGUMENT;
  const size_t count = ElementCount(rows, cols);
  for (size_t i = 0; i < count; ++i) dst[i] = operation(src[i]);
  return N3DS_OK;
}

float Add(float a, float b) { return a + b; }
float Subtract(float a, float b) { return a - b; }
int32_t Accumulate(int32_t sum, int32_t term) { return n3ds::WrapAdd(sum, term); }
// Sums of fewer than 2^31 terms below 2^31 fit.
int64_t Accumulate(int64_t sum, int32_t term) { return sum + term; }

// Each product is formed in 32 bits, whatever the sum's width.
template <typename Sum, typename Left>
int32_t MultiplyIntegers(Sum* __restrict C, const Left* __restrict A, const int32_t* __restrict B,
                         int32_t m, int32_t k, int32_t n) {
  if (C == nullptr || A == nullptr || B == nullptr) return N3DS_NULL_ARGUMENT;
  std::fill_n(C, ElementCount(m, n), Sum{0});
  if (ElementCount(m, n) == 0) return N3DS_OK;
  for (ptrdiff_t i = 0; i < m; ++i) {
    Sum* row = C + i * n;
    for (ptrdiff_t p = 0; p < k; ++p) {
      const int32_t a = A[i * k + p];
      const int32_t* b = B + p * n;
      for (ptrdiff_t j = 0; j < n; ++j) row[j] = Accumulate(row[j], n3ds::WrapMultiply(a, b[j]));
    }
  }
  return N3DS_OK;
}

}  // namespace

int32_t mcvMatrixAddMatrix_f32(float* dst, const float* a, const float* b, int32_t rows,
                               int32_t cols) {
  return ElementWise(dst, a, b, rows, cols, Add);
}

int32_t mcvMatrixAddMatrix_s32(int32_t* dst, const int32_t* a, const int32_t* b, int32_t rows,
                               int32_t cols) {
  return ElementWise(dst, a, b, rows, cols, n3ds::WrapAdd);
}

int32_t mcvMatrixSubMatrix_f32(float* dst, const float* a, const float* b, int32_t rows,
                               int32_t cols) {
  return ElementWise(dst, a, b, rows, cols, Subtract);
}

int32_t mcvMatrixSubMatrix_s32(int32_t* dst, const int32_t* a, const int32_t* b, int32_t rows,
                               int32_t cols) {
  return ElementWise(dst, a, b, rows, cols, n3ds::WrapSubtract);
}

int32_t mcvMatrixMulScalar_f32(float* dst, const float* src, int32_t rows, int32_t cols, float s) {
  return ElementWise(dst, src, rows, cols, [s](float value) { return value * s; });
}

int32_t mcvMatrixMulScalar_s32(int32_t* dst, const int32_t* src, int32_t s, int32_t rows,
                               int32_t cols) {
  return ElementWise(dst, src, rows, cols,
                     [s](int32_t value) { return n3ds::WrapMultiply(value, s); });
}

int32_t mcvMatrixMulMatrixRowMajor_s32(int32_t* C, const int32_t* A, const int32_t* B, int32_t m,
                                       int32_t k, int32_t n) {
  return MultiplyIntegers(C, A, B, m, k, n);
}

int32_t mcvMatrixMulMatrixRowMajor_s64(int64_t* C, const int16_t* A, const int32_t* B, int32_t m,
                                       int32_t k, int32_t n) {
  return MultiplyIntegers(C, A, B, m, k, n);
}

// Stored column by column, a matrix is its transpose stored row by row, and the transpose of A B is
// B^T A^T. The terms of an entry and their order stay the same.
int32_t mcvMatrixMulMatrixColMajor_f32(float* C, const float* A, const float* B, int32_t m,
                                       int32_t k, int32_t n) {
  return mcvMatrixMulMatrixRowMajor_f32(C, B, A, n, k, m);
}

int32_t mcvMatrixMulMatrixColMajor_s32(int32_t* C, const int32_t* A, const int32_t* B, int32_t m,
                                       int32_t k, int32_t n) {
  return mcvMatrixMulMatrixRowMajor_s32(C, B, A, n, k, m);
}

int32_t mcvMatrixMulAddRowMajor_f32(float* D, const float* A, const float* B, const float* E,
                                    int32_t m, int32_t k, int32_t n) {
  if (E == nullptr) return N3DS_NULL_ARGUMENT;
  const int32_t status = mcvMatrixMulMatrixRowMajor_f32(D, A, B, m, k, n);
  return status != N3DS_OK ? status : mcvMatrixAddMatrix_f32(D, D, E, m, n);
}

int32_t mcvMatrixMulAddRowMajor_s32(int32_t* D, const int32_t* A, const int32_t* B,
                                    const int32_t* E, int32_t m, int32_t k, int32_t n) {
  if (E == nullptr) return N3DS_NULL_ARGUMENT;
  const int32_t status = mcvMatrixMulMatrixRowMajor_s32(D, A, B, m, k, n);
  return status != N3DS_OK ? status : mcvMatrixAddMatrix_s32(D, D, E, m, n);
}
