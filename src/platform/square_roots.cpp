// SPDX-License-Identifier: MIT
// Square roots: exact, fast reciprocal, and by table.
#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstring>

#include "norvale_3d_sticker_core.h"
#include "platform/integer_arithmetic.h"

namespace {

// Halving the bits of a float halves its exponent; the constant turns that into the first estimate
// of 1 / sqrt(x), within 3.5 %, and each Newton step squares the error.
constexpr int32_t kInverseSqrtMagic = 0x5F3759DF;

inline float NewtonStep(float x, float y) { return y * std::fma(-y, x * y, 3.0f) * 0.5f; }

inline float InverseSqrt(float x) {
  int32_t bits = 0;
  std::memcpy(&bits, &x, sizeof(bits));
  bits = n3ds::WrapSubtract(kInverseSqrtMagic, bits >> 1);
  float y = 0.0f;
  std::memcpy(&y, &bits, sizeof(y));
  return NewtonStep(x, NewtonStep(x, y));
}

// 16 sqrt(i), rounded: the largest r with r - 1/2 <= 16 sqrt(i), which squared and in integers is
// r (r - 1) < 256 i. 255 is reached at i = 254 and never exceeded.
constexpr std::array<uint8_t, 256> MakeSqrtTable() {
  std::array<uint8_t, 256> table{};
  int r = 0;
  for (int i = 0; i < 256; ++i) {
    while ((r + 1) * r < 256 * i) ++r;
    table[static_cast<size_t>(i)] = static_cast<uint8_t>(r);
  }
  return table;
}
constexpr std::array<uint8_t, 256> kSqrtTable = MakeSqrtTable();
static_assert(kSqrtTable[1] == 16 && kSqrtTable[64] == 128 && kSqrtTable[255] == 255);

// Shifts v right by the smallest even number that leaves 8 bits, and the root left by half of it.
int64_t SqrtByTable(int64_t v) {
  if (v < 0) return N3DS_BAD_VALUE;
  const int bits = v == 0 ? 0 : 64 - __builtin_clzll(static_cast<uint64_t>(v));
  const int half_shift = std::max(bits - 8 + 1, 0) / 2;
  const int64_t root = kSqrtTable[static_cast<size_t>(v >> (2 * half_shift))];
  // The table's roots carry 4 bits of fraction.
  return half_shift < 4 ? root >> (4 - half_shift) : root << (half_shift - 4);
}

}  // namespace

float mcvSqrtf32(float x) { return std::sqrt(x); }

int32_t mcvSqrtVectorf32(const float* src, float* dst, int32_t n) {
  if (src == nullptr || dst == nullptr) return N3DS_NULL_ARGUMENT;
  for (int32_t i = 0; i < n; ++i) dst[i] = std::sqrt(src[i]);
  return N3DS_OK;
}

float mcvInvSqrtf32(float x) { return InverseSqrt(x); }

int32_t mcvInvSqrtVectorf32(const float* src, float* dst, int32_t n) {
  if (src == nullptr || dst == nullptr) return N3DS_NULL_ARGUMENT;
  for (int32_t i = 0; i < n; ++i) dst[i] = InverseSqrt(src[i]);
  return N3DS_OK;
}

int32_t mcvFastSqrts32(int32_t v) { return static_cast<int32_t>(SqrtByTable(v)); }

int64_t mcvFastSqrts64(int64_t v) { return SqrtByTable(v); }
