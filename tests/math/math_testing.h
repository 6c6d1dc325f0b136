// SPDX-License-Identifier: MIT
// What the tests of the numerical toolkit share.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "norvale_3d_sticker_core.h"

namespace n3ds::testing {

// A generator seeded by the running test's name, so that the order of tests changes nothing and a
// failure can be replayed.
inline std::mt19937 MakeRandom() {
  const auto* info = ::testing::UnitTest::GetInstance()->current_test_info();
  uint32_t seed = 2166136261u;
  for (const char c : std::string(info->test_suite_name()) + "." + info->name()) {
    seed = (seed ^ static_cast<unsigned char>(c)) * 16777619u;
  }
  return std::mt19937(seed);
}

// Spelled out, because the library's distributions differ between standard libraries.
inline float Uniform(std::mt19937& random, float low, float high) {
  return low + (high - low) * (static_cast<float>(random() >> 8) * 0x1p-24f);
}

// Roughly normal with standard deviation 1: the sum of twelve uniforms.
inline float Normal(std::mt19937& random) {
  float sum = -6.0f;
  for (int i = 0; i < 12; ++i) sum += Uniform(random, 0.0f, 1.0f);
  return sum;
}

inline uint32_t Bits(float value) {
  uint32_t bits;
  std::memcpy(&bits, &value, sizeof(bits));
  return bits;
}

inline bool SameBits(const std::vector<float>& a, const std::vector<float>& b) {
  return a.size() == b.size() && std::memcmp(a.data(), b.data(), a.size() * sizeof(float)) == 0;
}

// A memory pool of a given length, to run out of memory with.
class Pool {
 public:
  explicit Pool(size_t length) : area_((length + 7) / 8) {
    handle_ = MMemMgrCreate(area_.data(), length);
    fresh_ = handle_ != nullptr ? GetMaxAllocMemSize(handle_) : 0;
  }
  MHandle handle() const { return handle_; }
  // Whether everything taken from the pool was given back: a fresh pool is one free block.
  bool Untouched() const { return GetMaxAllocMemSize(handle_) == fresh_; }

 private:
  std::vector<uint64_t> area_;
  MHandle handle_ = nullptr;
  size_t fresh_ = 0;
};

// The text a call prints to standard output.
template <typename Call>
std::string PrintedBy(Call call) {
  ::testing::internal::CaptureStdout();
  call();
  return ::testing::internal::GetCapturedStdout();
}

}  // namespace n3ds::testing
