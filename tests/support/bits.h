// SPDX-License-Identifier: MIT
// Floats compared by their bits: -0 differs from 0, and NaN equals itself.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <vector>

namespace n3ds::testing {

inline uint32_t Bits(float value) {
  uint32_t bits;
  std::memcpy(&bits, &value, sizeof(bits));
  return bits;
}
template <typename Floats>
std::vector<uint32_t> Bits(const Floats& floats, size_t count) {
  std::vector<uint32_t> bits(count);
  for (size_t i = 0; i < count; i++) bits[i] = Bits(floats[i]);
  return bits;
}
inline std::vector<uint32_t> Bits(const std::vector<float>& floats) {
  return Bits(floats, floats.size());
}
template <size_t kCount>
std::vector<uint32_t> Bits(const float (&floats)[kCount]) {
  return Bits(static_cast<const float*>(floats), kCount);
}

inline bool SameBits(const std::vector<float>& a, const std::vector<float>& b) {
  return Bits(a) == Bits(b);
}

// Equal bits, but any NaN equals any other: which payload an operation on two of them keeps is up
// to the processor and the order of its operands.
inline bool SameBitsOrNan(float a, float b) {
  if (std::isnan(a) || std::isnan(b)) return std::isnan(a) && std::isnan(b);
  return Bits(a) == Bits(b);
}

// Index of the first element that differs so, or -1.
inline int64_t FirstDifference(const std::vector<float>& a, const std::vector<float>& b) {
  if (a.size() != b.size()) return static_cast<int64_t>(std::min(a.size(), b.size()));
  for (size_t i = 0; i < a.size(); ++i) {
    if (!SameBitsOrNan(a[i], b[i])) return static_cast<int64_t>(i);
  }
  return -1;
}

}  // namespace n3ds::testing
