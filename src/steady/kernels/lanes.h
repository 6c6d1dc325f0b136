// SPDX-License-Identifier: MIT
// Eight floats worked on at once, the one vector type of the kernels: a register of AVX2 in sources
// compiled for it, two F32x4 in others. Every operation rounds each lane once, as the same operation
// on a float does, and sums over lanes have one order: results are the same bits everywhere.
//
// Included by sources that define N3DS_KERNEL_SET, the namespace of their copy of the kernels.
#pragma once

#include "platform/simd.h"
#include "steady/layout.h"

#define N3DS_LANE_INLINE __attribute__((always_inline)) inline

namespace n3ds::steady::N3DS_KERNEL_SET {

#if N3DS_SIMD_AVX2 && defined(__AVX2__)

struct F32x8 {
  __m256 v;
};

// Addresses of Load and Store are multiples of 32 bytes.
N3DS_LANE_INLINE F32x8 Broadcast(float x) { return {_mm256_set1_ps(x)}; }
N3DS_LANE_INLINE F32x8 Load(const float* p) { return {_mm256_load_ps(p)}; }
N3DS_LANE_INLINE void Store(float* p, F32x8 a) { _mm256_store_ps(p, a.v); }
N3DS_LANE_INLINE F32x8 operator+(F32x8 a, F32x8 b) { return {_mm256_add_ps(a.v, b.v)}; }
N3DS_LANE_INLINE F32x8 operator-(F32x8 a, F32x8 b) { return {_mm256_sub_ps(a.v, b.v)}; }
N3DS_LANE_INLINE F32x8 operator*(F32x8 a, F32x8 b) { return {_mm256_mul_ps(a.v, b.v)}; }
N3DS_LANE_INLINE F32x8 operator/(F32x8 a, F32x8 b) { return {_mm256_div_ps(a.v, b.v)}; }
N3DS_LANE_INLINE F32x8 Root(F32x8 a) { return {_mm256_sqrt_ps(a.v)}; }
// a > b ? a : b in every lane, so b where one is NaN; the other alike.
N3DS_LANE_INLINE F32x8 Greater(F32x8 a, F32x8 b) { return {_mm256_max_ps(a.v, b.v)}; }
N3DS_LANE_INLINE F32x8 Lesser(F32x8 a, F32x8 b) { return {_mm256_min_ps(a.v, b.v)}; }
// a > b ? x : y.
N3DS_LANE_INLINE F32x8 IfGreater(F32x8 a, F32x8 b, F32x8 x, F32x8 y) {
  return {_mm256_blendv_ps(y.v, x.v, _mm256_cmp_ps(a.v, b.v, _CMP_GT_OQ))};
}
// sums[i] = ((0 + 1) + (2 + 3)) + ((4 + 5) + (6 + 7)) over the lanes of a[i], of four vectors.
N3DS_LANE_INLINE void SumFour(const F32x8* a, float* sums) {
  const __m256 pairs = _mm256_hadd_ps(a[0].v, a[1].v);
  const __m256 others = _mm256_hadd_ps(a[2].v, a[3].v);
  const __m256 halves = _mm256_hadd_ps(pairs, others);
  _mm_storeu_ps(sums, _mm_add_ps(_mm256_castps256_ps128(halves), _mm256_extractf128_ps(halves, 1)));
}

#else

struct F32x8 {
  F32x4 low;
  F32x4 high;
};

N3DS_LANE_INLINE F32x8 Broadcast(float x) { return {F32x4::Splat(x), F32x4::Splat(x)}; }
N3DS_LANE_INLINE F32x8 Load(const float* p) { return {F32x4::Load(p), F32x4::Load(p + 4)}; }
N3DS_LANE_INLINE void Store(float* p, F32x8 a) {
  a.low.Store(p);
  a.high.Store(p + 4);
}
N3DS_LANE_INLINE F32x8 operator+(F32x8 a, F32x8 b) { return {a.low + b.low, a.high + b.high}; }
N3DS_LANE_INLINE F32x8 operator-(F32x8 a, F32x8 b) { return {a.low - b.low, a.high - b.high}; }
N3DS_LANE_INLINE F32x8 operator*(F32x8 a, F32x8 b) { return {a.low * b.low, a.high * b.high}; }
N3DS_LANE_INLINE F32x8 operator/(F32x8 a, F32x8 b) { return {a.low / b.low, a.high / b.high}; }
N3DS_LANE_INLINE F32x8 Root(F32x8 a) { return {Sqrt(a.low), Sqrt(a.high)}; }
N3DS_LANE_INLINE F32x8 Greater(F32x8 a, F32x8 b) {
  return {Max(a.low, b.low), Max(a.high, b.high)};
}
N3DS_LANE_INLINE F32x8 Lesser(F32x8 a, F32x8 b) { return {Min(a.low, b.low), Min(a.high, b.high)}; }
N3DS_LANE_INLINE F32x8 IfGreater(F32x8 a, F32x8 b, F32x8 x, F32x8 y) {
  return {Select(a.low > b.low, x.low, y.low), Select(a.high > b.high, x.high, y.high)};
}
// Per lane, the sum over the lanes of one of the four vectors.
N3DS_LANE_INLINE F32x4 SumLanes(F32x4 a, F32x4 b, F32x4 c, F32x4 d) {
  const F32x4 ac_low = ZipLow(a, c);
  const F32x4 ac_high = ZipHigh(a, c);
  const F32x4 bd_low = ZipLow(b, d);
  const F32x4 bd_high = ZipHigh(b, d);
  return (ZipLow(ac_low, bd_low) + ZipHigh(ac_low, bd_low)) +
         (ZipLow(ac_high, bd_high) + ZipHigh(ac_high, bd_high));
}
N3DS_LANE_INLINE void SumFour(const F32x8* a, float* sums) {
  const F32x4 low = SumLanes(a[0].low, a[1].low, a[2].low, a[3].low);
  const F32x4 high = SumLanes(a[0].high, a[1].high, a[2].high, a[3].high);
  (low + high).Store(sums);
}

#endif

N3DS_LANE_INLINE F32x8 Zero() { return Broadcast(0.0f); }

}  // namespace n3ds::steady::N3DS_KERNEL_SET
