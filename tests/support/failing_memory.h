// SPDX-License-Identifier: MIT
// Makes one allocation of the engine fail, and finds memory that is not given back. For test
// programs linked with n3ds_fail_allocations (tests/core/CMakeLists.txt), which puts this between
// the engine and MMemAlloc and MMemFree.
#pragma once

#include <cstddef>

namespace n3ds::testing {

// Counts from its construction on; at most one at a time.
class FailingMemory {
 public:
  // The allocation number `failing`, from 1, returns null; 0: none does.
  explicit FailingMemory(int failing = 0);
  ~FailingMemory();
  FailingMemory(const FailingMemory&) = delete;
  FailingMemory& operator=(const FailingMemory&) = delete;

  // Allocations asked for.
  int requests() const;
  // Blocks taken and not freed.
  int outstanding() const;
};

}  // namespace n3ds::testing
