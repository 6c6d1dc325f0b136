// SPDX-License-Identifier: MIT
#include "core/shape_sums.h"

#include "platform/integer_arithmetic.h"

#if !defined(N3DS_DISABLE_SIMD) && defined(__x86_64__)
#include <immintrin.h>
#define N3DS_VECTOR_SUMS 1
#elif !defined(N3DS_DISABLE_SIMD) && defined(__aarch64__)
#include <arm_neon.h>
#define N3DS_VECTOR_SUMS 1
#endif

namespace n3ds {

void AddWeightedPortable(const float* weights, const int16_t* const* vectors, int count,
                         float* sums) {
  for (int i = 0; i < count; i++) {
    float sum = sums[i];
    for (int g = 0; g < kSumGroup; g++) sum += weights[g] * static_cast<float>(vectors[g][i]);
    sums[i] = sum;
  }
}

void AddProductsPortable(const int16_t* weights, const int16_t* const* vectors, int count,
                         int32_t* sums) {
  for (int i = 0; i < count; i++) {
    int32_t sum = sums[i];
    for (int g = 0; g < kSumGroup; g++) sum = WrapAdd(sum, weights[g] * vectors[g][i]);
    sums[i] = sum;
  }
}

#if N3DS_VECTOR_SUMS

namespace {

constexpr int kLanes = 8;  // coordinates of a step

#if defined(__x86_64__)

using Words = __m128i;     // eight vector elements
using FloatSums = __m128;  // four sums
using Products = __m128i;  // four sums

inline Words LoadWords(const int16_t* p) {
  return _mm_loadu_si128(reinterpret_cast<const __m128i*>(p));
}
inline FloatSums LoadFloats(const float* p) { return _mm_loadu_ps(p); }
inline void StoreFloats(float* p, FloatSums v) { _mm_storeu_ps(p, v); }
inline FloatSums AddScaled(FloatSums sums, float weight, __m128i integers) {
  return _mm_add_ps(sums, _mm_mul_ps(_mm_set1_ps(weight), _mm_cvtepi32_ps(integers)));
}
inline FloatSums AddScaledLow(FloatSums sums, float weight, Words words) {
  return AddScaled(sums, weight, _mm_srai_epi32(_mm_unpacklo_epi16(words, words), 16));
}
inline FloatSums AddScaledHigh(FloatSums sums, float weight, Words words) {
  return AddScaled(sums, weight, _mm_srai_epi32(_mm_unpackhi_epi16(words, words), 16));
}

// Four terms at once: the multiply-add of this processor takes pairs of neighbouring elements.
inline void AddTerms(const int16_t* weights, const Words* words, int32_t* sums) {
  Products low = LoadWords(reinterpret_cast<const int16_t*>(sums));
  Products high = LoadWords(reinterpret_cast<const int16_t*>(sums + 4));
  for (int g = 0; g < kSumGroup; g += 2) {
    const __m128i pair =
        _mm_unpacklo_epi16(_mm_set1_epi16(weights[g]), _mm_set1_epi16(weights[g + 1]));
    low = _mm_add_epi32(low, _mm_madd_epi16(_mm_unpacklo_epi16(words[g], words[g + 1]), pair));
    high = _mm_add_epi32(high, _mm_madd_epi16(_mm_unpackhi_epi16(words[g], words[g + 1]), pair));
  }
  _mm_storeu_si128(reinterpret_cast<__m128i*>(sums), low);
  _mm_storeu_si128(reinterpret_cast<__m128i*>(sums + 4), high);
}

// Where the processor has AVX2, steps of twice as many coordinates come first. Only these functions
// may use it; which is decided at run time. They return how far they came.
#define N3DS_VECTOR_CODE __attribute__((target("avx2")))
constexpr int kWideLanes = 16;

N3DS_VECTOR_CODE int AddWeightedWide(const float* weights, const int16_t* const* vectors, int count,
                                     float* sums) {
  int i = 0;
  for (; i + kWideLanes <= count; i += kWideLanes) {
    __m256 low = _mm256_loadu_ps(sums + i);
    __m256 high = _mm256_loadu_ps(sums + i + 8);
    for (int g = 0; g < kSumGroup; g++) {
      const __m256 weight = _mm256_set1_ps(weights[g]);
      const int16_t* v = vectors[g] + i;
      const __m256 low_terms = _mm256_cvtepi32_ps(_mm256_cvtepi16_epi32(LoadWords(v)));
      const __m256 high_terms = _mm256_cvtepi32_ps(_mm256_cvtepi16_epi32(LoadWords(v + 8)));
      low = _mm256_add_ps(low, _mm256_mul_ps(weight, low_terms));
      high = _mm256_add_ps(high, _mm256_mul_ps(weight, high_terms));
    }
    _mm256_storeu_ps(sums + i, low);
    _mm256_storeu_ps(sums + i + 8, high);
  }
  return i;
}

N3DS_VECTOR_CODE int AddProductsWide(const int16_t* weights, const int16_t* const* vectors,
                                     int count, int32_t* sums) {
  __m256i pairs[kSumGroup / 2];
  for (int g = 0; g < kSumGroup; g += 2) {
    pairs[g / 2] =
        _mm256_unpacklo_epi16(_mm256_set1_epi16(weights[g]), _mm256_set1_epi16(weights[g + 1]));
  }
  int i = 0;
  for (; i + kWideLanes <= count; i += kWideLanes) {
    auto* at = reinterpret_cast<__m256i*>(sums + i);
    // Unpacking works in halves: coordinates 0 to 3 and 8 to 11, and the others.
    const __m256i first = _mm256_loadu_si256(at);
    const __m256i second = _mm256_loadu_si256(at + 1);
    __m256i low = _mm256_permute2x128_si256(first, second, 0x20);
    __m256i high = _mm256_permute2x128_si256(first, second, 0x31);
    for (int g = 0; g < kSumGroup; g += 2) {
      const auto* a = reinterpret_cast<const __m256i*>(vectors[g] + i);
      const auto* b = reinterpret_cast<const __m256i*>(vectors[g + 1] + i);
      const __m256i words_a = _mm256_loadu_si256(a);
      const __m256i words_b = _mm256_loadu_si256(b);
      const __m256i pair = pairs[g / 2];
      low = _mm256_add_epi32(low, _mm256_madd_epi16(_mm256_unpacklo_epi16(words_a, words_b), pair));
      high =
          _mm256_add_epi32(high, _mm256_madd_epi16(_mm256_unpackhi_epi16(words_a, words_b), pair));
    }
    _mm256_storeu_si256(at, _mm256_permute2x128_si256(low, high, 0x20));
    _mm256_storeu_si256(at + 1, _mm256_permute2x128_si256(low, high, 0x31));
  }
  return i;
}

bool HasWideForms() {
  static const bool has = __builtin_cpu_supports("avx2") != 0;
  return has;
}

#else

using Words = int16x8_t;
using FloatSums = float32x4_t;

inline Words LoadWords(const int16_t* p) { return vld1q_s16(p); }
inline FloatSums LoadFloats(const float* p) { return vld1q_f32(p); }
inline void StoreFloats(float* p, FloatSums v) { vst1q_f32(p, v); }
inline FloatSums AddScaledLow(FloatSums sums, float weight, Words words) {
  return vaddq_f32(sums, vmulq_n_f32(vcvtq_f32_s32(vmovl_s16(vget_low_s16(words))), weight));
}
inline FloatSums AddScaledHigh(FloatSums sums, float weight, Words words) {
  return vaddq_f32(sums, vmulq_n_f32(vcvtq_f32_s32(vmovl_high_s16(words)), weight));
}

inline void AddTerms(const int16_t* weights, const Words* words, int32_t* sums) {
  int32x4_t low = vld1q_s32(sums);
  int32x4_t high = vld1q_s32(sums + 4);
  for (int g = 0; g < kSumGroup; g++) {
    low = vmlal_n_s16(low, vget_low_s16(words[g]), weights[g]);
    high = vmlal_high_n_s16(high, words[g], weights[g]);
  }
  vst1q_s32(sums, low);
  vst1q_s32(sums + 4, high);
}

constexpr bool HasWideForms() { return false; }
inline int AddWeightedWide(const float*, const int16_t* const*, int, float*) { return 0; }
inline int AddProductsWide(const int16_t*, const int16_t* const*, int, int32_t*) { return 0; }

#endif

// The group's vectors from coordinate i on, for the elements that fill no step.
struct Tail {
  const int16_t* vectors[kSumGroup];

  Tail(const int16_t* const* from, int i) {
    for (int g = 0; g < kSumGroup; g++) vectors[g] = from[g] + i;
  }
};

}  // namespace

void AddWeighted(const float* weights, const int16_t* const* vectors, int count, float* sums) {
  int i = HasWideForms() ? AddWeightedWide(weights, vectors, count, sums) : 0;
  for (; i + kLanes <= count; i += kLanes) {
    FloatSums low = LoadFloats(sums + i);
    FloatSums high = LoadFloats(sums + i + 4);
    for (int g = 0; g < kSumGroup; g++) {
      const Words words = LoadWords(vectors[g] + i);
      low = AddScaledLow(low, weights[g], words);
      high = AddScaledHigh(high, weights[g], words);
    }
    StoreFloats(sums + i, low);
    StoreFloats(sums + i + 4, high);
  }
  AddWeightedPortable(weights, Tail(vectors, i).vectors, count - i, sums + i);
}

void AddProducts(const int16_t* weights, const int16_t* const* vectors, int count, int32_t* sums) {
  int i = HasWideForms() ? AddProductsWide(weights, vectors, count, sums) : 0;
  for (; i + kLanes <= count; i += kLanes) {
    Words words[kSumGroup];
    for (int g = 0; g < kSumGroup; g++) words[g] = LoadWords(vectors[g] + i);
    AddTerms(weights, words, sums + i);
  }
  AddProductsPortable(weights, Tail(vectors, i).vectors, count - i, sums + i);
}

#else

void AddWeighted(const float* weights, const int16_t* const* vectors, int count, float* sums) {
  AddWeightedPortable(weights, vectors, count, sums);
}

void AddProducts(const int16_t* weights, const int16_t* const* vectors, int count, int32_t* sums) {
  AddProductsPortable(weights, vectors, count, sums);
}

#endif

}  // namespace n3ds
