// SPDX-License-Identifier: MIT
// The memory layer: the system heap, or a first-fit chain of blocks in an area of the caller's.
//
// A pool is a row of blocks, each a header followed by its payload; the next header starts where
// the payload ends. The chain closes with a bare header whose size has all bits set. Two free
// blocks are never neighbours: every operation that frees bytes joins them with the free blocks
// next to them.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <new>

#include "norvale_3d_sticker_core.h"

namespace {

struct BlockHeader {
  uint64_t size;  // payload bytes, a multiple of 8; kEndOfChain closes the chain
  uint64_t used;  // 0 free, 1 in use
};
static_assert(sizeof(BlockHeader) == 16, "headers keep payloads aligned to 8");

constexpr uint64_t kEndOfChain = UINT64_MAX;
constexpr uint64_t kHeaderSize = sizeof(BlockHeader);

// Bytes that must be left for the rest of a block to become a free block. Shrinking asks for one
// byte more than allocating; as sizes are multiples of 8, that means 40.
constexpr int64_t kSmallestAllocRest = 32;
constexpr int64_t kSmallestShrinkRest = 33;

// In 64 bits, so that a request just below 2^32 stays a large one.
uint64_t RoundUp8(uint64_t size) { return (size + 7) & ~uint64_t{7}; }

BlockHeader* FirstBlock(MHandle pool) { return static_cast<BlockHeader*>(pool); }

unsigned char* Payload(BlockHeader* block) { return reinterpret_cast<unsigned char*>(block + 1); }

BlockHeader* NextBlock(BlockHeader* block) {
  return reinterpret_cast<BlockHeader*>(Payload(block) + block->size);
}

bool IsEnd(const BlockHeader* block) { return block->size == kEndOfChain; }

bool IsFree(const BlockHeader* block) { return !IsEnd(block) && block->used == 0; }

void AbsorbNextIfFree(BlockHeader* block) {
  const BlockHeader* next = NextBlock(block);
  if (IsFree(next)) block->size += kHeaderSize + next->size;
}

// Bytes left for a payload of their own when `block` is cut down to `need`.
int64_t RestAfter(const BlockHeader* block, uint64_t need) {
  return static_cast<int64_t>(block->size - need - kHeaderSize);
}

// Cuts `block` down to `need` bytes; the rest becomes a free block.
void Split(BlockHeader* block, uint64_t need) {
  const uint64_t rest = block->size - need - kHeaderSize;
  new (Payload(block) + need) BlockHeader{rest, 0};
  block->size = need;
}

// The block of a live payload, and the block before it (null for the first one). There is no test
// for the end of the chain: a pointer of another origin is the caller's error.
BlockHeader* FindBlock(MHandle pool, const void* payload, BlockHeader** previous) {
  *previous = nullptr;
  BlockHeader* block = FirstBlock(pool);
  while (Payload(block) != payload) {
    *previous = block;
    block = NextBlock(block);
  }
  return block;
}

}  // namespace

MHandle MMemMgrCreate(void* area, size_t length) {
  if (area == nullptr) return nullptr;
  const uintptr_t address = reinterpret_cast<uintptr_t>(area);
  if (length > UINTPTR_MAX - address) return nullptr;  // would end beyond the last address
  const size_t skipped = -address & 7;
  if (length < skipped) return nullptr;
  const uint64_t usable = (length - skipped) & ~uint64_t{7};
  if (usable <= 2 * kHeaderSize) return nullptr;

  BlockHeader* first =
      new (static_cast<unsigned char*>(area) + skipped) BlockHeader{usable - 2 * kHeaderSize, 0};
  new (Payload(first) + first->size) BlockHeader{kEndOfChain, 0};
  return first;
}

void MMemMgrDestroy(MHandle) {}

void* MMemAllocStatic(MHandle pool, uint32_t size) {
  if (pool == nullptr || size == 0) return nullptr;
  const uint64_t need = RoundUp8(size);
  for (BlockHeader* block = FirstBlock(pool); !IsEnd(block); block = NextBlock(block)) {
    if (block->used != 0 || static_cast<int64_t>(block->size) < static_cast<int64_t>(need)) {
      continue;
    }
    if (RestAfter(block, need) >= kSmallestAllocRest) Split(block, need);
    block->used = 1;
    return Payload(block);
  }
  return nullptr;
}

void MMemFreeStatic(MHandle pool, void* pointer) {
  if (pool == nullptr || pointer == nullptr) return;
  BlockHeader* previous = nullptr;
  BlockHeader* block = FindBlock(pool, pointer, &previous);
  block->used = 0;
  AbsorbNextIfFree(block);
  if (previous != nullptr) {
    if (previous->used == 0) previous->size += kHeaderSize + block->size;
  }
}

void* MMemReallocStatic(MHandle pool, void* pointer, uint32_t size) {
  if (pool == nullptr || size == 0) return nullptr;
  if (pointer == nullptr) return MMemAllocStatic(pool, size);

  BlockHeader* previous = nullptr;
  BlockHeader* block = FindBlock(pool, pointer, &previous);
  const uint64_t need = RoundUp8(size);
  const uint64_t old_size = block->size;

  if (old_size >= need) {
    if (RestAfter(block, need) >= kSmallestShrinkRest) {
      Split(block, need);
      AbsorbNextIfFree(NextBlock(block));
    }
    return pointer;
  }

  // The next header would become payload too, but its 16 bytes are not counted as room: a block
  // that fits only with them moves.
  const BlockHeader* next = NextBlock(block);
  if (IsFree(next) && need <= old_size + next->size) {
    block->size += kHeaderSize + next->size;
    if (RestAfter(block, need) >= kSmallestAllocRest) Split(block, need);
    return pointer;
  }

  void* moved = MMemAllocStatic(pool, size);
  if (moved == nullptr) return nullptr;
  std::memcpy(moved, pointer, old_size);
  MMemFreeStatic(pool, pointer);
  return moved;
}

size_t GetMaxAllocMemSize(MHandle pool) {
  if (pool == nullptr) return 2;
  uint64_t largest = 0;
  for (BlockHeader* block = FirstBlock(pool); !IsEnd(block); block = NextBlock(block)) {
    if (block->used == 0 && block->size > largest) largest = block->size;
  }
  return largest;
}

void* MMemAlloc(MHandle memory, size_t size) {
  if (memory == nullptr) return std::malloc(size);
  return MMemAllocStatic(memory, static_cast<uint32_t>(size));
}

void MMemFree(MHandle memory, void* pointer) {
  if (memory == nullptr) {
    std::free(pointer);
  } else {
    MMemFreeStatic(memory, pointer);
  }
}

void* MMemRealloc(MHandle memory, void* pointer, size_t size) {
  if (memory == nullptr) return std::realloc(pointer, size);
  return MMemReallocStatic(memory, pointer, static_cast<uint32_t>(size));
}

void* MMemSet(void* destination, int value, size_t size) {
  return std::memset(destination, value, size);
}

void* MMemCpy(void* destination, const void* source, size_t size) {
  return std::memcpy(destination, source, size);
}

void* MMemMove(void* destination, const void* source, size_t size) {
  return std::memmove(destination, source, size);
}

int MMemCmp(const void* a, const void* b, size_t size) { return std::memcmp(a, b, size); }
