// SPDX-License-Identifier: MIT
// Vectors of four floats, four 32-bit and eight 16-bit integers, over SSE2, NEON or plain arrays.
//
// Each operation is defined per lane by plain C++ arithmetic and gives the same bits in all three
// forms; only a NaN's sign and payload are the processor's. Nothing here is fused, and no operation
// mixes lanes but those that say so. Pointers need no more alignment than their element.
#pragma once

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>

// The one choice of instruction sets in the project; N3DS_DISABLE_SIMD turns all of them off.
#if !defined(N3DS_DISABLE_SIMD) && defined(__x86_64__)
#define N3DS_SIMD_SSE2 1
#define N3DS_SIMD_NEON 0
#include <immintrin.h>
#elif !defined(N3DS_DISABLE_SIMD) && defined(__aarch64__)
#define N3DS_SIMD_SSE2 0
#define N3DS_SIMD_NEON 1
#include <arm_neon.h>
#else
#define N3DS_SIMD_SSE2 0
#define N3DS_SIMD_NEON 0
#include "platform/integer_arithmetic.h"
#endif

// Functions marked N3DS_AVX2_CODE may use AVX2 and FMA; call them only where HasAvx2() says so.
#define N3DS_SIMD_AVX2 N3DS_SIMD_SSE2
#if N3DS_SIMD_AVX2
#define N3DS_AVX2_CODE __attribute__((target("avx2,fma")))
#endif

namespace n3ds {

// Whether this processor has AVX2 and FMA, and this build forms that use them.
inline bool HasAvx2() {
#if N3DS_SIMD_AVX2
  static const bool has = __builtin_cpu_supports("avx2") && __builtin_cpu_supports("fma");
  return has;
#else
  return false;
#endif
}

// Mask32x4 holds a truth value per lane, as comparisons give it.

#if N3DS_SIMD_SSE2

struct Mask32x4 {
  __m128 v;
};
inline Mask32x4 operator&(Mask32x4 a, Mask32x4 b) { return {_mm_and_ps(a.v, b.v)}; }
inline Mask32x4 operator|(Mask32x4 a, Mask32x4 b) { return {_mm_or_ps(a.v, b.v)}; }
// Bit i is lane i.
inline unsigned Bits(Mask32x4 a) { return static_cast<unsigned>(_mm_movemask_ps(a.v)); }
inline bool Any(Mask32x4 a) { return Bits(a) != 0; }
inline bool All(Mask32x4 a) { return Bits(a) == 15; }
// The first lane that is true, 4 if none is.
inline int FirstTrue(Mask32x4 a) { return __builtin_ctz(Bits(a) | 16u); }

struct I32x4 {
  __m128i v;

  static I32x4 Load(const int32_t* p) {
    return {_mm_loadu_si128(reinterpret_cast<const __m128i*>(p))};
  }
  static I32x4 Splat(int32_t value) { return {_mm_set1_epi32(value)}; }
  void Store(int32_t* p) const { _mm_storeu_si128(reinterpret_cast<__m128i*>(p), v); }
};
// Sums and differences wrap.
inline I32x4 operator+(I32x4 a, I32x4 b) { return {_mm_add_epi32(a.v, b.v)}; }
inline I32x4 operator-(I32x4 a, I32x4 b) { return {_mm_sub_epi32(a.v, b.v)}; }
// The first and the second of each three numbers at p, four times; all twelve are read.
inline void LoadFirstTwoOfThree(const int32_t* p, I32x4* first, I32x4* second) {
  const __m128 a = _mm_castsi128_ps(I32x4::Load(p).v);                // x0 y0 .. x1
  const __m128 b = _mm_castsi128_ps(I32x4::Load(p + 4).v);            // y1 .. x2 y2
  const __m128 c = _mm_castsi128_ps(I32x4::Load(p + 8).v);            // .. x3 y3 ..
  const __m128 y01 = _mm_shuffle_ps(a, b, _MM_SHUFFLE(0, 0, 1, 1));   // y0 y0 y1 y1
  const __m128 xy23 = _mm_shuffle_ps(b, c, _MM_SHUFFLE(2, 1, 3, 2));  // x2 y2 x3 y3
  first->v = _mm_castps_si128(_mm_shuffle_ps(a, xy23, _MM_SHUFFLE(2, 0, 3, 0)));
  second->v = _mm_castps_si128(_mm_shuffle_ps(y01, xy23, _MM_SHUFFLE(3, 1, 2, 0)));
}

struct I16x8 {
  __m128i v;

  static I16x8 Load(const int16_t* p) {
    return {_mm_loadu_si128(reinterpret_cast<const __m128i*>(p))};
  }
};
// Lanes 0 to 3, and 4 to 7.
inline I32x4 WidenLow(I16x8 a) { return {_mm_srai_epi32(_mm_unpacklo_epi16(a.v, a.v), 16)}; }
inline I32x4 WidenHigh(I16x8 a) { return {_mm_srai_epi32(_mm_unpackhi_epi16(a.v, a.v), 16)}; }
// Adds a * s + b * t to the eight sums in low and high; everything wraps.
inline void AddProducts(I16x8 a, int16_t s, I16x8 b, int16_t t, I32x4* low, I32x4* high) {
  const __m128i factors = _mm_unpacklo_epi16(_mm_set1_epi16(s), _mm_set1_epi16(t));
  low->v = _mm_add_epi32(low->v, _mm_madd_epi16(_mm_unpacklo_epi16(a.v, b.v), factors));
  high->v = _mm_add_epi32(high->v, _mm_madd_epi16(_mm_unpackhi_epi16(a.v, b.v), factors));
}

struct F32x4 {
  __m128 v;

  static F32x4 Load(const float* p) { return {_mm_loadu_ps(p)}; }
  static F32x4 Splat(float value) { return {_mm_set1_ps(value)}; }
  static F32x4 Of(float a, float b, float c, float d) { return {_mm_setr_ps(a, b, c, d)}; }
  void Store(float* p) const { _mm_storeu_ps(p, v); }
};
inline F32x4 operator+(F32x4 a, F32x4 b) { return {_mm_add_ps(a.v, b.v)}; }
inline F32x4 operator-(F32x4 a, F32x4 b) { return {_mm_sub_ps(a.v, b.v)}; }
inline F32x4 operator*(F32x4 a, F32x4 b) { return {_mm_mul_ps(a.v, b.v)}; }
inline F32x4 operator/(F32x4 a, F32x4 b) { return {_mm_div_ps(a.v, b.v)}; }
// Changes the sign, also of zeros.
inline F32x4 operator-(F32x4 a) { return {_mm_xor_ps(a.v, _mm_set1_ps(-0.0f))}; }
inline F32x4 Abs(F32x4 a) { return {_mm_andnot_ps(_mm_set1_ps(-0.0f), a.v)}; }
inline F32x4 Sqrt(F32x4 a) { return {_mm_sqrt_ps(a.v)}; }
// a < b ? a : b, and a > b ? a : b: the second of equals, of zeros and where one is NaN.
inline F32x4 Min(F32x4 a, F32x4 b) { return {_mm_min_ps(a.v, b.v)}; }
inline F32x4 Max(F32x4 a, F32x4 b) { return {_mm_max_ps(a.v, b.v)}; }
// False where one is NaN.
inline Mask32x4 operator<(F32x4 a, F32x4 b) { return {_mm_cmplt_ps(a.v, b.v)}; }
inline Mask32x4 operator<=(F32x4 a, F32x4 b) { return {_mm_cmple_ps(a.v, b.v)}; }
inline Mask32x4 operator>(F32x4 a, F32x4 b) { return {_mm_cmpgt_ps(a.v, b.v)}; }
inline Mask32x4 operator>=(F32x4 a, F32x4 b) { return {_mm_cmpge_ps(a.v, b.v)}; }
inline Mask32x4 operator==(F32x4 a, F32x4 b) { return {_mm_cmpeq_ps(a.v, b.v)}; }
// mask ? a : b
inline F32x4 Select(Mask32x4 mask, F32x4 a, F32x4 b) {
  return {_mm_or_ps(_mm_and_ps(mask.v, a.v), _mm_andnot_ps(mask.v, b.v))};
}
// Rounds to nearest.
inline F32x4 ToFloat(I32x4 a) { return {_mm_cvtepi32_ps(a.v)}; }
// a0 b0 a1 b1, and a2 b2 a3 b3.
inline F32x4 ZipLow(F32x4 a, F32x4 b) { return {_mm_unpacklo_ps(a.v, b.v)}; }
inline F32x4 ZipHigh(F32x4 a, F32x4 b) { return {_mm_unpackhi_ps(a.v, b.v)}; }
// The eight bytes at p.
inline void LoadBytes(const uint8_t* p, F32x4* low, F32x4* high) {
  const __m128i zero = _mm_setzero_si128();
  const __m128i words =
      _mm_unpacklo_epi8(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(p)), zero);
  low->v = _mm_cvtepi32_ps(_mm_unpacklo_epi16(words, zero));
  high->v = _mm_cvtepi32_ps(_mm_unpackhi_epi16(words, zero));
}
// Truncates to four bytes, saturating at 0 and 255; NaN gives 0.
inline void StoreBytes(F32x4 a, uint8_t* p) {
  const F32x4 clamped = Min(Max(a, F32x4::Splat(0.0f)), F32x4::Splat(255.0f));
  const __m128i integers = _mm_cvttps_epi32(clamped.v);
  const __m128i words = _mm_packs_epi32(integers, integers);
  const int32_t bytes = _mm_cvtsi128_si32(_mm_packus_epi16(words, words));
  std::memcpy(p, &bytes, sizeof(bytes));
}

#elif N3DS_SIMD_NEON

struct Mask32x4 {
  uint32x4_t v;
};
inline Mask32x4 operator&(Mask32x4 a, Mask32x4 b) { return {vandq_u32(a.v, b.v)}; }
inline Mask32x4 operator|(Mask32x4 a, Mask32x4 b) { return {vorrq_u32(a.v, b.v)}; }
inline unsigned Bits(Mask32x4 a) {
  const uint32x4_t weights = {1, 2, 4, 8};
  return vaddvq_u32(vandq_u32(a.v, weights));
}
inline bool Any(Mask32x4 a) { return vmaxvq_u32(a.v) != 0; }
inline bool All(Mask32x4 a) { return vminvq_u32(a.v) != 0; }
inline int FirstTrue(Mask32x4 a) {
  const uint64_t halves = vget_lane_u64(vreinterpret_u64_u16(vmovn_u32(a.v)), 0);
  return halves == 0 ? 4 : __builtin_ctzll(halves) / 16;
}

struct I32x4 {
  int32x4_t v;

  static I32x4 Load(const int32_t* p) { return {vld1q_s32(p)}; }
  static I32x4 Splat(int32_t value) { return {vdupq_n_s32(value)}; }
  void Store(int32_t* p) const { vst1q_s32(p, v); }
};
inline I32x4 operator+(I32x4 a, I32x4 b) { return {vaddq_s32(a.v, b.v)}; }
inline I32x4 operator-(I32x4 a, I32x4 b) { return {vsubq_s32(a.v, b.v)}; }
inline void LoadFirstTwoOfThree(const int32_t* p, I32x4* first, I32x4* second) {
  const int32x4x3_t all = vld3q_s32(p);
  first->v = all.val[0];
  second->v = all.val[1];
}

struct I16x8 {
  int16x8_t v;

  static I16x8 Load(const int16_t* p) { return {vld1q_s16(p)}; }
};
inline I32x4 WidenLow(I16x8 a) { return {vmovl_s16(vget_low_s16(a.v))}; }
inline I32x4 WidenHigh(I16x8 a) { return {vmovl_high_s16(a.v)}; }
inline void AddProducts(I16x8 a, int16_t s, I16x8 b, int16_t t, I32x4* low, I32x4* high) {
  low->v = vmlal_n_s16(vmlal_n_s16(low->v, vget_low_s16(a.v), s), vget_low_s16(b.v), t);
  high->v = vmlal_high_n_s16(vmlal_high_n_s16(high->v, a.v, s), b.v, t);
}

struct F32x4 {
  float32x4_t v;

  static F32x4 Load(const float* p) { return {vld1q_f32(p)}; }
  static F32x4 Splat(float value) { return {vdupq_n_f32(value)}; }
  static F32x4 Of(float a, float b, float c, float d) { return {float32x4_t{a, b, c, d}}; }
  void Store(float* p) const { vst1q_f32(p, v); }
};
inline F32x4 operator+(F32x4 a, F32x4 b) { return {vaddq_f32(a.v, b.v)}; }
inline F32x4 operator-(F32x4 a, F32x4 b) { return {vsubq_f32(a.v, b.v)}; }
inline F32x4 operator*(F32x4 a, F32x4 b) { return {vmulq_f32(a.v, b.v)}; }
inline F32x4 operator/(F32x4 a, F32x4 b) { return {vdivq_f32(a.v, b.v)}; }
inline F32x4 operator-(F32x4 a) { return {vnegq_f32(a.v)}; }
inline F32x4 Abs(F32x4 a) { return {vabsq_f32(a.v)}; }
inline F32x4 Sqrt(F32x4 a) { return {vsqrtq_f32(a.v)}; }
// Not the processor's own minimum and maximum, which prefer NaN and order the zeros.
inline F32x4 Min(F32x4 a, F32x4 b) { return {vbslq_f32(vcltq_f32(a.v, b.v), a.v, b.v)}; }
inline F32x4 Max(F32x4 a, F32x4 b) { return {vbslq_f32(vcgtq_f32(a.v, b.v), a.v, b.v)}; }
inline Mask32x4 operator<(F32x4 a, F32x4 b) { return {vcltq_f32(a.v, b.v)}; }
inline Mask32x4 operator<=(F32x4 a, F32x4 b) { return {vcleq_f32(a.v, b.v)}; }
inline Mask32x4 operator>(F32x4 a, F32x4 b) { return {vcgtq_f32(a.v, b.v)}; }
inline Mask32x4 operator>=(F32x4 a, F32x4 b) { return {vcgeq_f32(a.v, b.v)}; }
inline Mask32x4 operator==(F32x4 a, F32x4 b) { return {vceqq_f32(a.v, b.v)}; }
inline F32x4 Select(Mask32x4 mask, F32x4 a, F32x4 b) { return {vbslq_f32(mask.v, a.v, b.v)}; }
inline F32x4 ToFloat(I32x4 a) { return {vcvtq_f32_s32(a.v)}; }
inline F32x4 ZipLow(F32x4 a, F32x4 b) { return {vzip1q_f32(a.v, b.v)}; }
inline F32x4 ZipHigh(F32x4 a, F32x4 b) { return {vzip2q_f32(a.v, b.v)}; }
inline void LoadBytes(const uint8_t* p, F32x4* low, F32x4* high) {
  const uint16x8_t words = vmovl_u8(vld1_u8(p));
  low->v = vcvtq_f32_u32(vmovl_u16(vget_low_u16(words)));
  high->v = vcvtq_f32_u32(vmovl_high_u16(words));
}
// The conversions saturate at both ends, and the first makes 0 of NaN.
inline void StoreBytes(F32x4 a, uint8_t* p) {
  const uint16x4_t words = vqmovn_u32(vcvtq_u32_f32(a.v));
  const uint32x2_t pair = vreinterpret_u32_u8(vqmovn_u16(vcombine_u16(words, words)));
  const uint32_t bytes = vget_lane_u32(pair, 0);
  std::memcpy(p, &bytes, sizeof(bytes));
}

#else

namespace internal {
// operation(lane of each argument) in every lane.
template <typename Result, typename Operation, typename... Vectors>
inline Result EachLane(Operation operation, const Vectors&... vectors) {
  Result result;
  for (size_t i = 0; i < 4; ++i) result.v[i] = operation(vectors.v[i]...);
  return result;
}
}  // namespace internal

struct Mask32x4 {
  bool v[4];
};
inline Mask32x4 operator&(const Mask32x4& a, const Mask32x4& b) {
  return internal::EachLane<Mask32x4>([](bool x, bool y) { return x && y; }, a, b);
}
inline Mask32x4 operator|(const Mask32x4& a, const Mask32x4& b) {
  return internal::EachLane<Mask32x4>([](bool x, bool y) { return x || y; }, a, b);
}
inline unsigned Bits(const Mask32x4& a) {
  unsigned bits = 0;
  for (unsigned i = 0; i < 4; ++i) bits |= static_cast<unsigned>(a.v[i]) << i;
  return bits;
}
inline bool Any(const Mask32x4& a) { return Bits(a) != 0; }
inline bool All(const Mask32x4& a) { return Bits(a) == 15; }
inline int FirstTrue(const Mask32x4& a) {
  int lane = 0;
  while (lane < 4 && !a.v[lane]) ++lane;
  return lane;
}

struct I32x4 {
  int32_t v[4];

  static I32x4 Load(const int32_t* p) { return {{p[0], p[1], p[2], p[3]}}; }
  static I32x4 Splat(int32_t value) { return {{value, value, value, value}}; }
  void Store(int32_t* p) const { std::memcpy(p, v, sizeof(v)); }
};
inline I32x4 operator+(const I32x4& a, const I32x4& b) {
  return internal::EachLane<I32x4>(WrapAdd, a, b);
}
inline I32x4 operator-(const I32x4& a, const I32x4& b) {
  return internal::EachLane<I32x4>(WrapSubtract, a, b);
}
inline void LoadFirstTwoOfThree(const int32_t* p, I32x4* first, I32x4* second) {
  *first = {{p[0], p[3], p[6], p[9]}};
  *second = {{p[1], p[4], p[7], p[10]}};
}

struct I16x8 {
  int16_t v[8];

  static I16x8 Load(const int16_t* p) {
    I16x8 a;
    std::memcpy(a.v, p, sizeof(a.v));
    return a;
  }
};
inline I32x4 WidenLow(const I16x8& a) { return {{a.v[0], a.v[1], a.v[2], a.v[3]}}; }
inline I32x4 WidenHigh(const I16x8& a) { return {{a.v[4], a.v[5], a.v[6], a.v[7]}}; }
inline void AddProducts(const I16x8& a, int16_t s, const I16x8& b, int16_t t, I32x4* low,
                        I32x4* high) {
  for (size_t i = 0; i < 4; ++i) {
    low->v[i] = WrapAdd(WrapAdd(low->v[i], a.v[i] * s), b.v[i] * t);
    high->v[i] = WrapAdd(WrapAdd(high->v[i], a.v[i + 4] * s), b.v[i + 4] * t);
  }
}

struct F32x4 {
  float v[4];

  static F32x4 Load(const float* p) { return {{p[0], p[1], p[2], p[3]}}; }
  static F32x4 Splat(float value) { return {{value, value, value, value}}; }
  static F32x4 Of(float a, float b, float c, float d) { return {{a, b, c, d}}; }
  void Store(float* p) const { std::memcpy(p, v, sizeof(v)); }
};
inline F32x4 operator+(const F32x4& a, const F32x4& b) {
  return internal::EachLane<F32x4>([](float x, float y) { return x + y; }, a, b);
}
inline F32x4 operator-(const F32x4& a, const F32x4& b) {
  return internal::EachLane<F32x4>([](float x, float y) { return x - y; }, a, b);
}
inline F32x4 operator*(const F32x4& a, const F32x4& b) {
  return internal::EachLane<F32x4>([](float x, float y) { return x * y; }, a, b);
}
inline F32x4 operator/(const F32x4& a, const F32x4& b) {
  return internal::EachLane<F32x4>([](float x, float y) { return x / y; }, a, b);
}
inline F32x4 operator-(const F32x4& a) {
  return internal::EachLane<F32x4>([](float x) { return -x; }, a);
}
inline F32x4 Abs(const F32x4& a) {
  return internal::EachLane<F32x4>([](float x) { return std::fabs(x); }, a);
}
inline F32x4 Sqrt(const F32x4& a) {
  return internal::EachLane<F32x4>([](float x) { return std::sqrt(x); }, a);
}
inline F32x4 Min(const F32x4& a, const F32x4& b) {
  return internal::EachLane<F32x4>([](float x, float y) { return x < y ? x : y; }, a, b);
}
inline F32x4 Max(const F32x4& a, const F32x4& b) {
  return internal::EachLane<F32x4>([](float x, float y) { return x > y ? x : y; }, a, b);
}
inline Mask32x4 operator<(const F32x4& a, const F32x4& b) {
  return internal::EachLane<Mask32x4>([](float x, float y) { return x < y; }, a, b);
}
inline Mask32x4 operator<=(const F32x4& a, const F32x4& b) {
  return internal::EachLane<Mask32x4>([](float x, float y) { return x <= y; }, a, b);
}
inline Mask32x4 operator>(const F32x4& a, const F32x4& b) { return b < a; }
inline Mask32x4 operator>=(const F32x4& a, const F32x4& b) { return b <= a; }
inline Mask32x4 operator==(const F32x4& a, const F32x4& b) {
  return internal::EachLane<Mask32x4>([](float x, float y) { return x == y; }, a, b);
}
inline F32x4 Select(const Mask32x4& mask, const F32x4& a, const F32x4& b) {
  return internal::EachLane<F32x4>([](bool m, float x, float y) { return m ? x : y; }, mask, a, b);
}
inline F32x4 ToFloat(const I32x4& a) {
  return internal::EachLane<F32x4>([](int32_t x) { return static_cast<float>(x); }, a);
}
inline F32x4 ZipLow(const F32x4& a, const F32x4& b) { return {{a.v[0], b.v[0], a.v[1], b.v[1]}}; }
inline F32x4 ZipHigh(const F32x4& a, const F32x4& b) { return {{a.v[2], b.v[2], a.v[3], b.v[3]}}; }
inline void LoadBytes(const uint8_t* p, F32x4* low, F32x4* high) {
  for (size_t i = 0; i < 4; ++i) {
    low->v[i] = p[i];
    high->v[i] = p[i + 4];
  }
}
inline void StoreBytes(const F32x4& a, uint8_t* p) {
  const F32x4 clamped = Min(Max(a, F32x4::Splat(0.0f)), F32x4::Splat(255.0f));
  for (size_t i = 0; i < 4; ++i) p[i] = static_cast<uint8_t>(clamped.v[i]);
}

#endif

// Swaps rows and columns.
inline void Transpose(F32x4 (&rows)[4]) {
  const F32x4 ac_low = ZipLow(rows[0], rows[2]), ac_high = ZipHigh(rows[0], rows[2]);
  const F32x4 bd_low = ZipLow(rows[1], rows[3]), bd_high = ZipHigh(rows[1], rows[3]);
  rows[0] = ZipLow(ac_low, bd_low);
  rows[1] = ZipHigh(ac_low, bd_low);
  rows[2] = ZipLow(ac_high, bd_high);
  rows[3] = ZipHigh(ac_high, bd_high);
}

}  // namespace n3ds
