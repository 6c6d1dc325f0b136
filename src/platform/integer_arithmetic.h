// SPDX-License-Identifier: MIT
// Conversions and integer arithmetic that mean the same on every processor and are never undefined.
#pragma once

#include <cmath>
#include <cstdint>
#include <limits>

namespace n3ds {

// Float to integer as 64-bit Arm converts: toward zero, saturating, 0 for NaN. Plain casts of
// values out of range are undefined and differ between x86-64 and Arm.
inline int32_t TruncateToInt32(double value) {
  constexpr double kLowest = std::numeric_limits<int32_t>::min();
  constexpr double kHighest = std::numeric_limits<int32_t>::max();
  if (value >= kHighest) return std::numeric_limits<int32_t>::max();
  if (value <= kLowest) return std::numeric_limits<int32_t>::min();
  return std::isnan(value) ? 0 : static_cast<int32_t>(value);
}
// The same; the common case goes without the detour over double.
inline int32_t TruncateToInt32(float value) {
  constexpr float kTwoTo31 = 2147483648.0f;
  if (std::fabs(value) < kTwoTo31) return static_cast<int32_t>(value);
  return TruncateToInt32(static_cast<double>(value));
}

// 32-bit arithmetic that wraps.
inline int32_t WrapAdd(int32_t a, int32_t b) {
  return static_cast<int32_t>(static_cast<uint32_t>(a) + static_cast<uint32_t>(b));
}
inline int32_t WrapSubtract(int32_t a, int32_t b) {
  return static_cast<int32_t>(static_cast<uint32_t>(a) - static_cast<uint32_t>(b));
}
inline int32_t WrapMultiply(int32_t a, int32_t b) {
  return static_cast<int32_t>(static_cast<uint32_t>(a) * static_cast<uint32_t>(b));
}
inline int32_t WrapAbs(int32_t a) { return a < 0 ? WrapSubtract(0, a) : a; }

}  // namespace n3ds
