// SPDX-License-Identifier: MIT

#include "support/failing_memory.h"

#include <atomic>

#include "norvale_3d_sticker_core.h"

namespace {

std::atomic<bool> counting{false};
std::atomic<int> failing_request{0};
std::atomic<int> requests_made{0};
std::atomic<int> blocks{0};

}  // namespace

// The linker sends the engine's calls of MMemAlloc and MMemFree here.
extern "C" {
// NOLINTBEGIN(bugprone-reserved-identifier): the linker's names
void* __real_MMemAlloc(MHandle memory, size_t size);
void __real_MMemFree(MHandle memory, void* pointer);
void* __wrap_MMemAlloc(MHandle memory, size_t size);
void __wrap_MMemFree(MHandle memory, void* pointer);

void* __wrap_MMemAlloc(MHandle memory, size_t size) {
  if (counting && ++requests_made == failing_request) return nullptr;
  void* pointer = __real_MMemAlloc(memory, size);
  if (counting && pointer != nullptr) ++blocks;
  return pointer;
}

void __wrap_MMemFree(MHandle memory, void* pointer) {
  if (counting && pointer != nullptr) --blocks;
  __real_MMemFree(memory, pointer);
}
// NOLINTEND(bugprone-reserved-identifier)
}

namespace n3ds::testing {

FailingMemory::FailingMemory(int failing) {
  failing_request = failing;
  requests_made = 0;
  blocks = 0;
  counting = true;
}

FailingMemory::~FailingMemory() { counting = false; }

int FailingMemory::requests() const { return requests_made; }
int FailingMemory::outstanding() const { return blocks; }

}  // namespace n3ds::testing
