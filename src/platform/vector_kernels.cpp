// SPDX-License-Identifier: MIT
// Distances, dot products, bit counts and divisions of vectors.
#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "norvale_3d_sticker_core.h"

namespace {

// The float sum takes its terms in order; regrouping them for speed would change its bits.
template <typename T>
double FloatDistance(const T* a, const T* b, int32_t n) {
  float sum = 0.0f;
  for (int32_t i = 0; i < n; ++i) {
    const float difference = static_cast<float>(a[i]) - static_cast<float>(b[i]);
    sum += difference * difference;
  }
  return std::sqrt(static_cast<double>(sum));
}

// Terms below 2^16 that a 32-bit sum certainly holds.
constexpr size_t kTermsPer32Bits = 65536;

template <typename T>
double ByteDistance(const T* a, const T* b, int32_t n) {
  uint64_t sum = 0;
  const size_t count = n > 0 ? static_cast<size_t>(n) : 0;
  for (size_t start = 0; start < count; start += kTermsPer32Bits) {
    const size_t end = std::min(count, start + kTermsPer32Bits);
    uint32_t part = 0;
    for (size_t i = start; i < end; ++i) {
      const int32_t difference = a[i] - b[i];
      part += static_cast<uint32_t>(difference * difference);
    }
    sum += part;
  }
  return std::sqrt(static_cast<double>(sum));
}

template <typename T>
double ShortDistance(const T* a, const T* b, int32_t n) {
  uint64_t sum = 0;
  for (int32_t i = 0; i < n; ++i) {
    // Up to 65535, so the square needs all 32 bits.
    const uint32_t difference = static_cast<uint32_t>(a[i] - b[i]);
    sum += difference * difference;
  }
  return std::sqrt(static_cast<double>(sum));
}

}  // namespace

double mcvVectorDiffNorm2f32(const float* a, const float* b, int32_t n) {
  return FloatDistance(a, b, n);
}

double mcvVectorDiffNorm2u32(const uint32_t* a, const uint32_t* b, int32_t n) {
  return FloatDistance(a, b, n);
}

double mcvVectorDiffNorm2s32(const int32_t* a, const int32_t* b, int32_t n) {
  return FloatDistance(a, b, n);
}

double mcvVectorDiffNorm2Fastu8(const uint8_t* a, const uint8_t* b, int32_t n) {
  return ByteDistance(a, b, n);
}

double mcvVectorDiffNorm2Fasts8(const int8_t* a, const int8_t* b, int32_t n) {
  return ByteDistance(a, b, n);
}

double mcvVectorDiffNorm2Fastu16(const uint16_t* a, const uint16_t* b, int32_t n) {
  return ShortDistance(a, b, n);
}

double mcvVectorDiffNorm2Fasts16(const int16_t* a, const int16_t* b, int32_t n) {
  return ShortDistance(a, b, n);
}

uint64_t mcvDotProducts8(const void* a, const void* b, uint32_t n) {
  if (a == nullptr || b == nullptr) return UINT64_MAX;
  const uint8_t* left = static_cast<const uint8_t*>(a);
  const uint8_t* right = static_cast<const uint8_t*>(b);
  uint64_t sum = 0;
  for (size_t start = 0; start < n; start += kTermsPer32Bits) {
    const size_t end = std::min<size_t>(n, start + kTermsPer32Bits);
    uint32_t part = 0;
    for (size_t i = start; i < end; ++i) part += uint32_t{left[i]} * right[i];
    sum += part;
  }
  return sum;
}

int32_t mcvBitCountu8(const uint8_t* p, uint32_t n) {
  if (p == nullptr) return N3DS_NULL_ARGUMENT;
  uint64_t bits = 0;
  size_t i = 0;
  for (; i + 8 <= n; i += 8) {
    uint64_t word = 0;
    std::memcpy(&word, p + i, sizeof(word));
    bits += static_cast<uint64_t>(__builtin_popcountll(word));
  }
  for (; i < n; ++i) bits += static_cast<uint64_t>(__builtin_popcount(p[i]));
  // From 2^28 bytes on the count may exceed the result's range.
  return bits <= INT32_MAX ? static_cast<int32_t>(bits) : N3DS_BAD_VALUE;
}

float mcvDivf32(float a, float b) { return a / b; }

int32_t mcvVectorDivf32(float* dst, const float* src, int32_t n, float s) {
  for (int32_t i = 0; i < n; ++i) dst[i] = src[i] / s;
  return N3DS_OK;
}
