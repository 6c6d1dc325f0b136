// SPDX-License-Identifier: MIT
// An array taken from the memory layer and given back at the end of its scope, on every path.
#pragma once

#include <cstddef>
#include <type_traits>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Test for success with `if (!array)`: it is empty when the memory is exhausted. The elements are
// not initialised; Zero() clears them.
template <typename T>
class ScratchArray {
  static_assert(std::is_trivial_v<T>, "scratch memory is never constructed");

 public:
  ScratchArray(MHandle memory, size_t count)
      : memory_(memory),
        count_(count),
        data_(static_cast<T*>(MMemAlloc(memory, count * sizeof(T)))) {}
  ~ScratchArray() {
    if (data_ != nullptr) MMemFree(memory_, data_);
  }
  ScratchArray(const ScratchArray&) = delete;
  ScratchArray& operator=(const ScratchArray&) = delete;

  explicit operator bool() const { return data_ != nullptr; }
  T* get() const { return data_; }
  T& operator[](size_t i) const { return data_[i]; }
  size_t size() const { return count_; }
  void Zero() const { MMemSet(data_, 0, count_ * sizeof(T)); }

 private:
  MHandle memory_;
  size_t count_;
  T* data_;
};

}  // namespace n3ds
