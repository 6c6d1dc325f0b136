// SPDX-License-Identifier: MIT
// A memory pool of a given length, to run out of memory with.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "norvale_3d_sticker_core.h"

namespace n3ds::testing {

class MemoryPool {
 public:
  explicit MemoryPool(size_t length) : area_((length + 7) / 8) {
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

}  // namespace n3ds::testing
