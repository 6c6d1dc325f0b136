// SPDX-License-Identifier: MIT
// An array taken from the memory layer and given back at the end of its scope, on every path.
#pragma once

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Test for success with `if (!array)`: it is empty when the memory is exhausted or the size beyond
// what the memory layer can count. The elements are not initialised; Zero() clears them.
template <typename T>
class ScratchArray {
  static_assert(std::is_trivial_v<T>, "scratch memory is never constructed");

 public:
  ScratchArray(MHandle memory, size_t count)
      : memory_(memory), count_(count), data_(Allocate(memory, count)) {}
  ~ScratchArray() {
    if (data_ != nullptr) MMemFree(memory_, data_);
  }
  ScratchArray(const ScratchArray&) = delete;
  ScratchArray& operator=(const ScratchArray&) = delete;

  explicit operator bool() const { return data_ != nullptr; }
  T* get() const { return data_; }
  T& operator[](size_t i) const { return data_[i]; }
  void Zero() const { MMemSet(data_, 0, count_ * sizeof(T)); }

 private:
  // A pool reads sizes as 32 bits and would hand out a smaller block.
  static T* Allocate(MHandle memory, size_t count) {
    const size_t largest = memory == nullptr ? SIZE_MAX : UINT32_MAX;
    if (count > largest / sizeof(T)) return nullptr;
    return static_cast<T*>(MMemAlloc(memory, count * sizeof(T)));
  }

  MHandle memory_;
  size_t count_;
  T* data_;
};

}  // namespace n3ds
