// SPDX-License-Identifier: MIT
// Random input whose sequences are the same with every compiler and library.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <vector>

namespace n3ds::testing {

// Knuth's 64-bit linear congruential generator; the upper bits are good enough for test data.
class Random {
 public:
  explicit Random(uint64_t seed) : state_(seed * 2862933555777941757u + 3037000493u) {}

  // 31 bits.
  uint32_t Next() {
    state_ = state_ * 6364136223846793005u + 1442695040888963407u;
    return static_cast<uint32_t>(state_ >> 33);
  }
  // All 64 bits.
  uint64_t Word() {
    const uint64_t high = Next(), middle = Next();
    return high << 33 ^ middle << 16 ^ Next() >> 8;
  }
  // In [0, limit).
  uint32_t Below(uint32_t limit) { return Next() % limit; }
  // An integer in [low, high].
  int32_t Int(int32_t low, int32_t high) {
    const auto span = static_cast<uint64_t>(static_cast<int64_t>(high) - low + 1);
    const uint64_t wide = (static_cast<uint64_t>(Next()) << 31) ^ Next();
    return static_cast<int32_t>(low + static_cast<int64_t>(wide % span));
  }
  // In [0, 1).
  double Unit() { return Next() / 2147483648.0; }
  double In(double low, double high) { return low + (high - low) * Unit(); }
  // The same in single precision.
  float Float(float low, float high) {
    return low + (high - low) * (static_cast<float>(Next() >> 7) * 0x1p-24f);
  }
  // Roughly normal with standard deviation 1: the sum of twelve uniforms.
  float Normal() {
    float sum = -6.0f;
    for (int i = 0; i < 12; ++i) sum += Float(0.0f, 1.0f);
    return sum;
  }

  std::vector<float> Floats(size_t count, float low = -10.0f, float high = 10.0f) {
    std::vector<float> values(count);
    for (float& value : values) value = Float(low, high);
    return values;
  }
  // Floats of which every tenth or so is a zero of either sign, a denormal, an extreme, an infinity
  // or NaN.
  std::vector<float> AwkwardFloats(size_t count) {
    using Limits = std::numeric_limits<float>;
    constexpr float kAwkward[] = {0.0f,
                                  -0.0f,
                                  Limits::denorm_min(),
                                  -3.0f * Limits::denorm_min(),
                                  Limits::min(),
                                  Limits::max(),
                                  -Limits::max(),
                                  Limits::infinity(),
                                  -Limits::infinity(),
                                  Limits::quiet_NaN()};
    std::vector<float> values = Floats(count);
    for (float& value : values) {
      if (Below(10) == 0) value = kAwkward[Below(10)];
    }
    return values;
  }
  // Uniform over all values of the integer type.
  template <typename T>
  std::vector<T> Integers(size_t count) {
    std::vector<T> values(count);
    for (T& value : values) value = static_cast<T>(Word() >> (64 - 8 * sizeof(T)));
    return values;
  }

 private:
  uint64_t state_;
};

}  // namespace n3ds::testing
