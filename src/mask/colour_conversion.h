// SPDX-License-Identifier: MIT
// Full-range BT.601 colour conversion in 15-bit fixed point. Components are 0..255. Inline, so that
// loops over them vectorise; RGB2YUV and YUV2RGB export them for packed words.
#pragma once

#include <cstdint>

namespace n3ds {

struct Rgb {
  int32_t r, g, b;
};
struct Yuv {
  int32_t y, u, v;
};

namespace internal {
constexpr int32_t kHalf = 1 << 14;  // rounds a value with 15 fractional bits

constexpr int32_t ClampToByte(int32_t value) {
  const int32_t lower = value < 0 ? 0 : value;
  return lower > 255 ? 255 : lower;
}
}  // namespace internal

// No product exceeds 31 bits: the largest, 23372 * 32640 in V, is below 2^30.
constexpr Yuv ToYuv(const Rgb& colour) {
  using internal::ClampToByte;
  using internal::kHalf;
  // The weights sum to 32769, not 32768; white still rounds to 255.
  const int32_t luma = 9798 * colour.r + 19235 * colour.g + 3736 * colour.b;
  const int32_t luma7 = luma >> 8;  // 7 fractional bits
  const int32_t u = ((((128 * colour.b - luma7) * 18492) >> 7) + kHalf) >> 15;
  const int32_t v = ((((128 * colour.r - luma7) * 23372) >> 7) + kHalf) >> 15;
  return {(luma + kHalf) >> 15, ClampToByte(u + 128), ClampToByte(v + 128)};
}

constexpr Rgb ToRgb(const Yuv& colour) {
  using internal::ClampToByte;
  using internal::kHalf;
  const int32_t y = colour.y * 32768 + kHalf;
  const int32_t u = colour.u - 128;
  const int32_t v = colour.v - 128;
  return {ClampToByte((y + 45941 * v) >> 15), ClampToByte((y - 11277 * u - 23401 * v) >> 15),
          ClampToByte((y + 58065 * u) >> 15)};
}

}  // namespace n3ds
