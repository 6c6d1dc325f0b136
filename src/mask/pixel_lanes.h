// SPDX-License-Identifier: MIT
// A pixel's four channels as four floats, in the vector form of this processor or plainly. All
// forms give the same bytes.
#pragma once

#include <cstdint>
#include <cstring>

#if !defined(N3DS_DISABLE_SIMD) && defined(__x86_64__)
#include <emmintrin.h>
#elif !defined(N3DS_DISABLE_SIMD) && defined(__aarch64__)
#include <arm_neon.h>
#endif

namespace n3ds {

#if !defined(N3DS_DISABLE_SIMD) && defined(__x86_64__)

using PixelLanes = __m128;

// The pixels at `p` and right of it.
inline void LoadPixelPair(const uint8_t* p, PixelLanes* left, PixelLanes* right) {
  const __m128i zero = _mm_setzero_si128();
  const __m128i words =
      _mm_unpacklo_epi8(_mm_loadl_epi64(reinterpret_cast<const __m128i*>(p)), zero);
  *left = _mm_cvtepi32_ps(_mm_unpacklo_epi16(words, zero));
  *right = _mm_cvtepi32_ps(_mm_unpackhi_epi16(words, zero));
}
// a * s + b * t, each product rounded.
inline PixelLanes Mix(PixelLanes a, float s, PixelLanes b, float t) {
  return _mm_add_ps(_mm_mul_ps(a, _mm_set1_ps(s)), _mm_mul_ps(b, _mm_set1_ps(t)));
}
// Truncates, after clamping to 0..255; not-a-number gives 0 (the maximum's second operand).
inline void StorePixel(PixelLanes value, uint8_t* p) {
  const __m128 clamped = _mm_min_ps(_mm_max_ps(value, _mm_setzero_ps()), _mm_set1_ps(255.0f));
  const __m128i words = _mm_packs_epi32(_mm_cvttps_epi32(clamped), _mm_setzero_si128());
  const int32_t pixel = _mm_cvtsi128_si32(_mm_packus_epi16(words, words));
  std::memcpy(p, &pixel, sizeof pixel);
}

#elif !defined(N3DS_DISABLE_SIMD) && defined(__aarch64__)

using PixelLanes = float32x4_t;

inline void LoadPixelPair(const uint8_t* p, PixelLanes* left, PixelLanes* right) {
  const uint16x8_t words = vmovl_u8(vld1_u8(p));
  *left = vcvtq_f32_u32(vmovl_u16(vget_low_u16(words)));
  *right = vcvtq_f32_u32(vmovl_high_u16(words));
}
inline PixelLanes Mix(PixelLanes a, float s, PixelLanes b, float t) {
  return vaddq_f32(vmulq_n_f32(a, s), vmulq_n_f32(b, t));
}
// The conversions saturate at both ends, and not-a-number gives 0.
inline void StorePixel(PixelLanes value, uint8_t* p) {
  const uint16x4_t words = vqmovn_u32(vcvtq_u32_f32(value));
  const uint32x2_t pixel = vreinterpret_u32_u8(vqmovn_u16(vcombine_u16(words, words)));
  const uint32_t bytes = vget_lane_u32(pixel, 0);
  std::memcpy(p, &bytes, sizeof bytes);
}

#else

struct PixelLanes {
  float channel[4];
};

inline void LoadPixelPair(const uint8_t* p, PixelLanes* left, PixelLanes* right) {
  for (int c = 0; c < 4; ++c) {
    left->channel[c] = p[c];
    right->channel[c] = p[c + 4];
  }
}
inline PixelLanes Mix(const PixelLanes& a, float s, const PixelLanes& b, float t) {
  PixelLanes sum;
  for (int c = 0; c < 4; ++c) sum.channel[c] = a.channel[c] * s + b.channel[c] * t;
  return sum;
}
inline void StorePixel(const PixelLanes& value, uint8_t* p) {
  for (int c = 0; c < 4; ++c) {
    float clamped = value.channel[c] > 0.0f ? value.channel[c] : 0.0f;
    clamped = clamped < 255.0f ? clamped : 255.0f;
    p[c] = static_cast<uint8_t>(clamped);
  }
}

#endif

}  // namespace n3ds
