// SPDX-License-Identifier: MIT
// Arrays that end at an unreadable page.
#pragma once

#include <sys/mman.h>
#include <unistd.h>

#include <cstddef>
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

}  // namespace n3ds::testing
