// SPDX-License-Identifier: MIT
#include "core/shape_sums.h"

#include "platform/integer_arithmetic.h"
#include "platform/simd.h"

namespace n3ds {

void AddWeightedPortable(const float* weights, const int16_t* const* vectors, int count,
                         float* sums) {
  for (int i = 0; i < count; ++i) {
    float sum = sums[i];
    for (int g = 0; g < kSumGroup; ++g) sum += weights[g] * static_cast<float>(vectors[g][i]);
    sums[i] = sum;
  }
}

void AddProductsPortable(const int16_t* weights, const int16_t* const* vectors, int count,
                         int32_t* sums) {
  for (int i = 0; i < count; ++i) {
    int32_t sum = sums[i];
    for (int g = 0; g < kSumGroup; ++g) sum = WrapAdd(sum, weights[g] * vectors[g][i]);
    sums[i] = sum;
  }
}

namespace {

constexpr int kLanes = 8;  // coordinates of a step

#if N3DS_SIMD_AVX2

// Where the processor has AVX2, steps of twice as many coordinates come first. These functions
// return how far they came.
constexpr int kWideLanes = 16;

N3DS_AVX2_CODE int AddWeightedWide(const float* weights, const int16_t* const* vectors, int count,
                                   float* sums) {
  int i = 0;
  for (; i + kWideLanes <= count; i += kWideLanes) {
    __m256 low = _mm256_loadu_ps(sums + i);
    __m256 high = _mm256_loadu_ps(sums + i + 8);
    for (int g = 0; g < kSumGroup; ++g) {
      const __m256 weight = _mm256_set1_ps(weights[g]);
      const int16_t* v = vectors[g] + i;
      const __m256 low_terms = _mm256_cvtepi32_ps(_mm256_cvtepi16_epi32(I16x8::Load(v).v));
      const __m256 high_terms = _mm256_cvtepi32_ps(_mm256_cvtepi16_epi32(I16x8::Load(v + 8).v));
      low = _mm256_add_ps(low, _mm256_mul_ps(weight, low_terms));
      high = _mm256_add_ps(high, _mm256_mul_ps(weight, high_terms));
    }
    _mm256_storeu_ps(sums + i, low);
    _mm256_storeu_ps(sums + i + 8, high);
  }
  return i;
}

N3DS_AVX2_CODE int AddProductsWide(const int16_t* weights, const int16_t* const* vectors, int count,
                                   int32_t* sums) {
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

#else

int AddWeightedWide(const float*, const int16_t* const*, int, float*) { return 0; }
int AddProductsWide(const int16_t*, const int16_t* const*, int, int32_t*) { return 0; }

#endif

// The group's vectors from coordinate i on, for the elements that fill no step.
struct Tail {
  const int16_t* vectors[kSumGroup];

  Tail(const int16_t* const* from, int i) {
    for (int g = 0; g < kSumGroup; ++g) vectors[g] = from[g] + i;
  }
};

}  // namespace

void AddWeighted(const float* weights, const int16_t* const* vectors, int count, float* sums) {
  int i = HasAvx2() ? AddWeightedWide(weights, vectors, count, sums) : 0;
  for (; i + kLanes <= count; i += kLanes) {
    F32x4 low = F32x4::Load(sums + i), high = F32x4::Load(sums + i + 4);
    for (int g = 0; g < kSumGroup; ++g) {
      const F32x4 weight = F32x4::Splat(weights[g]);
      const I16x8 elements = I16x8::Load(vectors[g] + i);
      low = low + weight * ToFloat(WidenLow(elements));
      high = high + weight * ToFloat(WidenHigh(elements));
    }
    low.Store(sums + i);
    high.Store(sums + i + 4);
  }
  AddWeightedPortable(weights, Tail(vectors, i).vectors, count - i, sums + i);
}

void AddProducts(const int16_t* weights, const int16_t* const* vectors, int count, int32_t* sums) {
  static_assert(kSumGroup % 2 == 0);
  int i = HasAvx2() ? AddProductsWide(weights, vectors, count, sums) : 0;
  for (; i + kLanes <= count; i += kLanes) {
    I32x4 low = I32x4::Load(sums + i), high = I32x4::Load(sums + i + 4);
    for (int g = 0; g < kSumGroup; g += 2) {
      AddProducts(I16x8::Load(vectors[g] + i), weights[g], I16x8::Load(vectors[g + 1] + i),
                  weights[g + 1], &low, &high);
    }
    low.Store(sums + i);
    high.Store(sums + i + 4);
  }
  AddProductsPortable(weights, Tail(vectors, i).vectors, count - i, sums + i);
}

}  // namespace n3ds
