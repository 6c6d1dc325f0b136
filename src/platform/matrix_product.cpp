// SPDX-License-Identifier: MIT
// The float matrix product, the one kernel the fitting spends its time in.
//
// Its operands are small (7 x 190 by 190 x 7 up to 20 x 210 by 210 x 20, and the same with one
// column), so there is no packing: a tile of C stays in registers while p runs over all k terms.
// Lanes are different columns of C, or different rows when there is one column, never different
// terms of one sum, so vectors change nothing in the result.
#include "platform/matrix_product.h"

#include <algorithm>
#include <cmath>
#include <cstddef>

#include "norvale_3d_sticker_core.h"
#include "platform/simd.h"

// The vector form is written over AVX2 or NEON; with SSE2 alone, which has no fused multiply-add,
// or without SIMD there is none.
#if N3DS_SIMD_AVX2
#define N3DS_PRODUCT_CODE N3DS_AVX2_CODE
#elif N3DS_SIMD_NEON
#define N3DS_PRODUCT_CODE
#endif

namespace n3ds {

void MultiplyPortable(float* C, const float* A, const float* B, int32_t m, int32_t k, int32_t n) {
  const ptrdiff_t columns = n;
  std::fill_n(C, m * columns, 0.0f);
  for (int32_t i = 0; i < m; ++i) {
    for (int32_t p = 0; p < k; ++p) {
      const float a = A[i * ptrdiff_t{k} + p];
      const float* b = B + p * columns;
      for (int32_t j = 0; j < n; ++j) C[j] = std::fma(a, b[j], C[j]);
    }
    C += columns;
  }
}

#ifdef N3DS_PRODUCT_CODE
namespace {

// The accumulators only live in registers if the loops over them are gone before the optimiser
// looks at the arrays; gcc 12 at -O3 stores all of them in every step otherwise.
#define N3DS_UNROLL _Pragma("GCC unroll 16")
#define N3DS_PRODUCT_INLINE N3DS_PRODUCT_CODE __attribute__((always_inline)) inline

// A thin vector type: the tiles below are written once over these few operations.
#if N3DS_SIMD_AVX2

using Lanes = __m256;
constexpr int kLanes = 8;
constexpr int kWidestTile = 3;  // blocks of kLanes columns: 4 x 3 accumulators of 16 registers
constexpr int kTileRows = 4;    // rows of a tile two or more blocks wide
constexpr int kNarrowRows = 8;  // rows of a tile one block wide
using PartialMask = __m256i;    // which lanes of a partial block exist

N3DS_PRODUCT_INLINE Lanes Zero() { return _mm256_setzero_ps(); }
N3DS_PRODUCT_INLINE Lanes Load(const float* p) { return _mm256_loadu_ps(p); }
N3DS_PRODUCT_INLINE Lanes Broadcast(const float* p) { return _mm256_broadcast_ss(p); }
N3DS_PRODUCT_INLINE void Store(float* p, Lanes v) { _mm256_storeu_ps(p, v); }
N3DS_PRODUCT_INLINE Lanes MultiplyAdd(Lanes a, Lanes b, Lanes c) {
  return _mm256_fmadd_ps(a, b, c);
}
N3DS_PRODUCT_INLINE PartialMask MaskOfFirst(int count) {
  const __m256i lane = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7);
  return _mm256_cmpgt_epi32(_mm256_set1_epi32(count), lane);
}
N3DS_PRODUCT_INLINE Lanes LoadPartial(const float* p, PartialMask mask) {
  return _mm256_maskload_ps(p, mask);
}
N3DS_PRODUCT_INLINE void StorePartial(float* p, PartialMask mask, Lanes v) {
  _mm256_maskstore_ps(p, mask, v);
}
// Four columns of kLanes rows: lane r of out[t] is rows[r][t].
N3DS_PRODUCT_INLINE void LoadColumns(const float* const* rows, ptrdiff_t offset, Lanes* out) {
  Lanes v[4];
  for (int r = 0; r < 4; ++r) {
    const __m256 low = _mm256_castps128_ps256(_mm_loadu_ps(rows[r] + offset));
    v[r] = _mm256_insertf128_ps(low, _mm_loadu_ps(rows[r + 4] + offset), 1);
  }
  const __m256 low01 = _mm256_unpacklo_ps(v[0], v[1]);
  const __m256 high01 = _mm256_unpackhi_ps(v[0], v[1]);
  const __m256 low23 = _mm256_unpacklo_ps(v[2], v[3]);
  const __m256 high23 = _mm256_unpackhi_ps(v[2], v[3]);
  out[0] = _mm256_shuffle_ps(low01, low23, 0x44);
  out[1] = _mm256_shuffle_ps(low01, low23, 0xEE);
  out[2] = _mm256_shuffle_ps(high01, high23, 0x44);
  out[3] = _mm256_shuffle_ps(high01, high23, 0xEE);
}

#else  // NEON

using Lanes = float32x4_t;
constexpr int kLanes = 4;
constexpr int kWidestTile = 5;  // 4 x 5 accumulators of 32 registers
constexpr int kTileRows = 4;
constexpr int kNarrowRows = 8;
using PartialMask = int;  // how many lanes exist

N3DS_PRODUCT_INLINE Lanes Zero() { return vdupq_n_f32(0.0f); }
N3DS_PRODUCT_INLINE Lanes Load(const float* p) { return vld1q_f32(p); }
N3DS_PRODUCT_INLINE Lanes Broadcast(const float* p) { return vld1q_dup_f32(p); }
N3DS_PRODUCT_INLINE void Store(float* p, Lanes v) { vst1q_f32(p, v); }
N3DS_PRODUCT_INLINE Lanes MultiplyAdd(Lanes a, Lanes b, Lanes c) { return vfmaq_f32(c, a, b); }
N3DS_PRODUCT_INLINE PartialMask MaskOfFirst(int count) { return count; }
N3DS_PRODUCT_INLINE Lanes LoadPartial(const float* p, PartialMask count) {
  if (count == 1) return vld1q_lane_f32(p, Zero(), 0);
  const Lanes two = vcombine_f32(vld1_f32(p), vdup_n_f32(0.0f));
  return count == 2 ? two : vld1q_lane_f32(p + 2, two, 2);
}
N3DS_PRODUCT_INLINE void StorePartial(float* p, PartialMask count, Lanes v) {
  vst1q_lane_f32(p, v, 0);
  if (count > 1) vst1q_lane_f32(p + 1, v, 1);
  if (count > 2) vst1q_lane_f32(p + 2, v, 2);
}
N3DS_PRODUCT_INLINE void LoadColumns(const float* const* rows, ptrdiff_t offset, Lanes* out) {
  const float32x4x2_t v02 = vzipq_f32(Load(rows[0] + offset), Load(rows[2] + offset));
  const float32x4x2_t v13 = vzipq_f32(Load(rows[1] + offset), Load(rows[3] + offset));
  const float32x4x2_t low = vzipq_f32(v02.val[0], v13.val[0]);
  const float32x4x2_t high = vzipq_f32(v02.val[1], v13.val[1]);
  out[0] = low.val[0];
  out[1] = low.val[1];
  out[2] = high.val[0];
  out[3] = high.val[1];
}

#endif

// Groups of kLanes rows the one-column form takes at once: as many as hide the latency of the one
// chain of additions in each.
constexpr int kMostRowGroups = 3;

// Pointers to `count` rows of A from its first; rows beyond the last are the last again, so that a
// tile always has all its rows and no load leaves A.
template <int count>
N3DS_PRODUCT_INLINE void RowPointers(const float* A, int32_t rows, int32_t k, const float** out) {
  for (int r = 0; r < count; ++r) out[r] = A + std::min(r, rows - 1) * ptrdiff_t{k};
}

// `rows` (at most kRows) rows of C by kBlocks blocks of columns from column j on. The last block of
// a row of C ends with the row, over columns of the block before it where the width asks for that:
// both compute them alike.
template <int kRows, int kBlocks>
N3DS_PRODUCT_CODE void MultiplyTile(float* C, const float* A, const float* B, int32_t rows,
                                    int32_t k, int32_t n, int32_t j) {
  ptrdiff_t column[size_t{kBlocks}];
  N3DS_UNROLL
  for (int b = 0; b < kBlocks; ++b) column[b] = std::min(j + b * kLanes, n - kLanes);
  const float* row[size_t{kRows}];
  RowPointers<kRows>(A, rows, k, row);

  Lanes sum[size_t{kRows}][size_t{kBlocks}];
  N3DS_UNROLL
  for (int r = 0; r < kRows; ++r) {
    N3DS_UNROLL
    for (int b = 0; b < kBlocks; ++b) sum[r][b] = Zero();
  }
  for (ptrdiff_t p = 0; p < k; ++p) {
    Lanes factor[size_t{kBlocks}];
    N3DS_UNROLL
    for (int b = 0; b < kBlocks; ++b) factor[b] = Load(B + column[b]);
    N3DS_UNROLL
    for (int r = 0; r < kRows; ++r) {
      const Lanes a = Broadcast(row[r] + p);
      N3DS_UNROLL
      for (int b = 0; b < kBlocks; ++b) sum[r][b] = MultiplyAdd(a, factor[b], sum[r][b]);
    }
    B += n;
  }
  N3DS_UNROLL
  for (int r = 0; r < kRows; ++r) {
    N3DS_UNROLL
    for (int b = 0; b < kBlocks; ++b) {
      if (r < rows) Store(C + r * ptrdiff_t{n} + column[b], sum[r][b]);
    }
  }
}

// The same for all n < kLanes columns.
N3DS_PRODUCT_CODE void MultiplyNarrowTile(float* C, const float* A, const float* B, int32_t rows,
                                          int32_t k, int32_t n) {
  const PartialMask mask = MaskOfFirst(n);
  const float* row[kNarrowRows];
  RowPointers<kNarrowRows>(A, rows, k, row);

  Lanes sum[kNarrowRows];
  N3DS_UNROLL
  for (int r = 0; r < kNarrowRows; ++r) sum[r] = Zero();
  for (ptrdiff_t p = 0; p < k; ++p) {
    const Lanes factor = LoadPartial(B, mask);
    N3DS_UNROLL
    for (int r = 0; r < kNarrowRows; ++r) {
      sum[r] = MultiplyAdd(Broadcast(row[r] + p), factor, sum[r]);
    }
    B += n;
  }
  N3DS_UNROLL
  for (int r = 0; r < kNarrowRows; ++r) {
    if (r < rows) StorePartial(C + r * ptrdiff_t{n}, mask, sum[r]);
  }
}

// `rows` (at most kGroups * kLanes) entries of a single column; lanes are rows.
template <int kGroups>
N3DS_PRODUCT_CODE void MultiplyColumnTile(float* C, const float* A, const float* B, int32_t rows,
                                          int32_t k) {
  const float* row[size_t{kGroups * kLanes}];
  RowPointers<kGroups * kLanes>(A, rows, k, row);

  Lanes sum[size_t{kGroups}];
  N3DS_UNROLL
  for (int g = 0; g < kGroups; ++g) sum[g] = Zero();
  ptrdiff_t p = 0;
  for (; p + 4 <= k; p += 4) {
    N3DS_UNROLL
    for (int g = 0; g < kGroups; ++g) {
      Lanes a[4];
      LoadColumns(row + g * kLanes, p, a);
      N3DS_UNROLL
      for (int t = 0; t < 4; ++t) sum[g] = MultiplyAdd(a[t], Broadcast(B + p + t), sum[g]);
    }
  }
  float entries[size_t{kGroups * kLanes}];
  for (; p < k; ++p) {
    N3DS_UNROLL
    for (int r = 0; r < kGroups * kLanes; ++r) entries[r] = row[r][p];
    N3DS_UNROLL
    for (int g = 0; g < kGroups; ++g) {
      sum[g] = MultiplyAdd(Load(entries + g * kLanes), Broadcast(B + p), sum[g]);
    }
  }
  N3DS_UNROLL
  for (int g = 0; g < kGroups; ++g) Store(entries + g * kLanes, sum[g]);
  std::copy_n(entries, rows, C);
}

// All rows of `blocks` blocks of columns from column j on.
template <int kBlocks = 1>
N3DS_PRODUCT_CODE void MultiplyColumns(int blocks, float* C, const float* A, const float* B,
                                       int32_t m, int32_t k, int32_t n, int32_t j) {
  if constexpr (kBlocks < kWidestTile) {
    if (blocks > kBlocks) {
      MultiplyColumns<kBlocks + 1>(blocks, C, A, B, m, k, n, j);
      return;
    }
  }
  constexpr int kRows = kBlocks == 1 ? kNarrowRows : kTileRows;
  for (int32_t i = 0; i < m;) {
    const int32_t rows = std::min(kRows, m - i);
    MultiplyTile<kRows, kBlocks>(C + i * ptrdiff_t{n}, A + i * ptrdiff_t{k}, B, rows, k, n, j);
    i += rows;
  }
}

// `rows` rows, which take `groups` groups of lanes, of a single column.
template <int kGroups = 1>
N3DS_PRODUCT_CODE void MultiplyRowGroups(int groups, float* C, const float* A, const float* B,
                                         int32_t rows, int32_t k) {
  if constexpr (kGroups < kMostRowGroups) {
    if (groups > kGroups) {
      MultiplyRowGroups<kGroups + 1>(groups, C, A, B, rows, k);
      return;
    }
  }
  MultiplyColumnTile<kGroups>(C, A, B, rows, k);
}

N3DS_PRODUCT_CODE void MultiplyVector(float* C, const float* A, const float* B, int32_t m,
                                      int32_t k, int32_t n) {
  if (n == 1) {
    for (int32_t i = 0; i < m;) {
      const int32_t rows = std::min(kMostRowGroups * kLanes, m - i);
      MultiplyRowGroups((rows - 1) / kLanes + 1, C + i, A + i * ptrdiff_t{k}, B, rows, k);
      i += rows;
    }
  } else if (n < kLanes) {
    for (int32_t i = 0; i < m;) {
      const int32_t rows = std::min(kNarrowRows, m - i);
      MultiplyNarrowTile(C + i * ptrdiff_t{n}, A + i * ptrdiff_t{k}, B, rows, k, n);
      i += rows;
    }
  } else {
    for (int32_t j = 0; j < n;) {
      // What is left goes at once if it fits. Otherwise a tile one block below the widest, so that
      // the last one is never a lone block: four go as 2 + 2, not as 3 + 1.
      const int32_t blocks_left = (n - j - 1) / kLanes + 1;
      const int32_t blocks = blocks_left <= kWidestTile ? blocks_left : kWidestTile - 1;
      MultiplyColumns(blocks, C, A, B, m, k, n, j);
      j += std::min(blocks * kLanes, n - j);
    }
  }
}

}  // namespace
#endif  // N3DS_PRODUCT_CODE

MatrixProduct SimdMatrixProduct() {
#if N3DS_SIMD_AVX2
  return HasAvx2() ? MultiplyVector : nullptr;
#elif N3DS_SIMD_NEON
  return MultiplyVector;
#else
  return nullptr;
#endif
}

}  // namespace n3ds

int32_t mcvMatrixMulMatrixRowMajor_f32(float* C, const float* A, const float* B, int32_t m,
                                       int32_t k, int32_t n) {
  if (C == nullptr || A == nullptr || B == nullptr) return N3DS_NULL_ARGUMENT;
  if (m < 1 || n < 1) return N3DS_OK;
  static const n3ds::MatrixProduct multiply = [] {
    const n3ds::MatrixProduct simd = n3ds::SimdMatrixProduct();
    return simd != nullptr ? simd : n3ds::MultiplyPortable;
  }();
  multiply(C, A, B, m, std::max(k, 0), n);
  return N3DS_OK;
}
