// SPDX-License-Identifier: MIT
// What the kernel tests share: arrays that end at an unreadable page, comparison by bits, and
// random values with the awkward ones among them.
#pragma once

#include <sys/mman.h>
#include <unistd.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <stdexcept>
#include <vector>

namespace n3ds::testing {

// `count` elements whose last byte is the last of a page, before a page that may not be touched:
// reading or writing one element too many ends the test in any build, with a sanitizer or without.
template <typename T>
class GuardedArray {
 public:
  explicit GuardedArray(size_t count) : count_(count) {
    const size_t page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    const size_t bytes = count * sizeof(T);
    length_ = (bytes + page - 1) / page * page + page;
    void* area = mmap(nullptr, length_, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (area == MAP_FAILED) throw std::runtime_error("mmap failed");
    area_ = static_cast<unsigned char*>(area);
    mprotect(area_ + length_ - page, page, PROT_NONE);
    data_ = reinterpret_cast<T*>(area_ + length_ - page - bytes);
  }
  explicit GuardedArray(const std::vector<T>& values) : GuardedArray(values.size()) {
    for (size_t i = 0; i < count_; ++i) data_[i] = values[i];
  }
  ~GuardedArray() { munmap(area_, length_); }
  GuardedArray(const GuardedArray&) = delete;
  GuardedArray& operator=(const GuardedArray&) = delete;

  T* data() { return data_; }
  T& operator[](size_t i) { return data_[i]; }
  size_t size() const { return count_; }
  void Fill(T value) {
    for (size_t i = 0; i < count_; ++i) data_[i] = value;
  }
  std::vector<T> Values() const { return std::vector<T>(data_, data_ + count_); }

 private:
  size_t count_;
  size_t length_;
  unsigned char* area_;
  T* data_;
};

// Equal bits, so that -0 differs from 0. Any not-a-number equals any other: which payload an
// operation on two of them keeps is up to the processor and the order of its operands.
inline bool SameBits(float a, float b) {
  if (std::isnan(a) || std::isnan(b)) return std::isnan(a) && std::isnan(b);
  return std::memcmp(&a, &b, sizeof(a)) == 0;
}

// Index of the first element that differs, or -1.
inline int64_t FirstDifference(const std::vector<float>& a, const std::vector<float>& b) {
  if (a.size() != b.size()) return static_cast<int64_t>(std::min(a.size(), b.size()));
  for (size_t i = 0; i < a.size(); ++i) {
    if (!SameBits(a[i], b[i])) return static_cast<int64_t>(i);
  }
  return -1;
}

class RandomValues {
 public:
  explicit RandomValues(uint32_t seed) : engine_(seed) {}

  // Uniform in [low, high].
  int64_t Integer(int64_t low, int64_t high) {
    return low + static_cast<int64_t>(engine_() % (static_cast<uint64_t>(high - low) + 1));
  }
  float Float(float low, float high) {
    return low + (high - low) * (static_cast<float>(engine_() >> 40) * 0x1p-24f);
  }
  std::vector<float> Floats(size_t count, float low = -10.0f, float high = 10.0f) {
    std::vector<float> values(count);
    for (float& value : values) value = Float(low, high);
    return values;
  }
  // Floats of which every tenth or so is a zero of either sign, a denormal, an extreme, an infinity
  // or not a number.
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
      if (Integer(0, 9) == 0) value = kAwkward[Integer(0, 9)];
    }
    return values;
  }
  // Uniform over all values of the integer type.
  template <typename T>
  std::vector<T> Integers(size_t count) {
    std::vector<T> values(count);
    for (T& value : values) value = static_cast<T>(engine_());
    return values;
  }

 private:
  std::mt19937_64 engine_;
};

}  // namespace n3ds::testing
