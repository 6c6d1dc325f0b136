// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <memory>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/test_random.h"
namespace n3ds::testing {

namespace {

using ::testing::ElementsAre;

struct Block {
  uint64_t size;
  bool used;
};
bool operator==(const Block& a, const Block& b) { return a.size == b.size && a.used == b.used; }
void PrintTo(const Block& block, std::ostream* os) {
  *os << (block.used ? "used " : "free ") << block.size;
}
Block Used(uint64_t size) { return {size, true}; }
Block Free(uint64_t size) { return {size, false}; }

// Reads the chain of a pool as it lies in memory, up to but without its end marker.
std::vector<Block> ReadChain(MHandle pool) {
  std::vector<Block> blocks;
  const unsigned char* at = static_cast<const unsigned char*>(pool);
  for (;;) {
    uint64_t header[2];
    std::memcpy(header, at, sizeof(header));
    if (header[0] == UINT64_MAX) {
      EXPECT_EQ(header[1], 0u) << "end marker";
      return blocks;
    }
    EXPECT_LE(header[1], 1u);
    blocks.push_back({header[0], header[1] == 1});
    at += header[0] + 16;
  }
}

// The same without the copy, for the long walk: does the chain hold exactly these blocks?
bool ChainIs(MHandle pool, const std::vector<Block>& blocks) {
  const unsigned char* at = static_cast<const unsigned char*>(pool);
  uint64_t header[2];
  for (const Block& block : blocks) {
    std::memcpy(header, at, sizeof(header));
    if (header[0] != block.size || header[1] != (block.used ? 1 : 0)) return false;
    at += header[0] + 16;
  }
  std::memcpy(header, at, sizeof(header));
  return header[0] == UINT64_MAX && header[1] == 0;
}

// A pool with `payload` bytes in one free block, in an allocation that is no byte longer.
class Pool {
 public:
  explicit Pool(uint64_t payload)
      : area_(new unsigned char[payload + 32]), handle_(MMemMgrCreate(area_.get(), payload + 32)) {}
  MHandle handle() const { return handle_; }
  void* Alloc(uint32_t size) { return MMemAllocStatic(handle_, size); }
  void Free(void* pointer) { MMemFreeStatic(handle_, pointer); }
  void* Realloc(void* pointer, uint32_t size) { return MMemReallocStatic(handle_, pointer, size); }
  std::vector<Block> Chain() const { return ReadChain(handle_); }
  // Offset of a payload from the first one.
  int64_t Offset(const void* pointer) const {
    return static_cast<const unsigned char*>(pointer) - static_cast<unsigned char*>(handle_) - 16;
  }

 private:
  std::unique_ptr<unsigned char[]> area_;
  MHandle handle_;
};

TEST(MemoryPool, FreshPoolIsOneFreeBlockAndTheEndMarker) {
  alignas(8) unsigned char area[128];
  MHandle pool = MMemMgrCreate(area, sizeof(area));
  ASSERT_EQ(pool, area);
  EXPECT_THAT(ReadChain(pool), ElementsAre(Free(96)));
  uint64_t end[2];
  std::memcpy(end, area + 112, sizeof(end));
  EXPECT_EQ(end[0], UINT64_MAX);
  EXPECT_EQ(end[1], 0u);
}

TEST(MemoryPool, AreaIsCutToMultiplesOfEight) {
  alignas(8) unsigned char area[136];
  MHandle pool = MMemMgrCreate(area + 3, 132);  // 5 bytes skipped, 127 left, 120 usable
  ASSERT_EQ(pool, area + 8);
  EXPECT_THAT(ReadChain(pool), ElementsAre(Free(88)));
}

TEST(MemoryPool, AreaOfThirtyTwoBytesOrLessIsRefused) {
  alignas(8) unsigned char area[64];
  for (size_t length = 0; length <= 39; ++length) {
    EXPECT_EQ(MMemMgrCreate(area, length), nullptr) << length;
  }
  EXPECT_NE(MMemMgrCreate(area, 40), nullptr);
  EXPECT_EQ(MMemMgrCreate(area + 1, 46), nullptr);  // 39 after rounding the start up
  EXPECT_NE(MMemMgrCreate(area + 1, 47), nullptr);
  EXPECT_EQ(MMemMgrCreate(area + 1, 3), nullptr);  // shorter than the rounding
  EXPECT_EQ(MMemMgrCreate(nullptr, 1000), nullptr);
}

TEST(MemoryPool, AreaBeyondTheLastAddressIsRefused) {
  alignas(8) unsigned char area[128];
  std::memset(area, 0x5A, sizeof(area));
  const size_t to_the_end = SIZE_MAX - reinterpret_cast<uintptr_t>(area + 64);
  EXPECT_EQ(MMemMgrCreate(area + 64, SIZE_MAX), nullptr);
  EXPECT_EQ(MMemMgrCreate(area + 64, SIZE_MAX - 7), nullptr);
  EXPECT_EQ(MMemMgrCreate(area + 64, to_the_end + 1), nullptr);
  for (const unsigned char byte : area) EXPECT_EQ(byte, 0x5A);
}

TEST(MemoryPool, SmallestPoolHoldsOneBlockOfEight) {
  Pool pool(8);
  EXPECT_EQ(GetMaxAllocMemSize(pool.handle()), 8u);
  EXPECT_EQ(pool.Alloc(9), nullptr);
  void* p = pool.Alloc(8);
  ASSERT_NE(p, nullptr);
  std::memset(p, 0xFF, 8);
  EXPECT_EQ(pool.Alloc(1), nullptr);
  EXPECT_EQ(GetMaxAllocMemSize(pool.handle()), 0u);
  pool.Free(p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(8)));
}

TEST(MemoryPool, DestroyDoesNothing) {
  Pool pool(64);
  void* p = pool.Alloc(8);
  MMemMgrDestroy(pool.handle());
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(8), Free(40)));
  MMemMgrDestroy(nullptr);
  pool.Free(p);
}

TEST(MemoryPool, RequestsAreRoundedUpToEight) {
  Pool pool(256);
  void* p = pool.Alloc(1);
  void* q = pool.Alloc(8);
  void* r = pool.Alloc(9);
  EXPECT_EQ(pool.Offset(p), 0);
  EXPECT_EQ(pool.Offset(q), 24);
  EXPECT_EQ(pool.Offset(r), 48);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(8), Used(8), Used(16), Free(256 - 32 - 48)));
}

TEST(MemoryPool, RequestNearTwoToTheThirtyTwoFails) {
  Pool pool(256);
  for (const uint32_t size : {UINT32_MAX, UINT32_MAX - 6, UINT32_MAX - 7, 0x80000000u}) {
    EXPECT_EQ(pool.Alloc(size), nullptr) << size;
  }
  void* p = pool.Alloc(8);
  EXPECT_EQ(pool.Realloc(p, UINT32_MAX), nullptr);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(8), Free(232)));
}

TEST(MemoryPool, FirstFitTakesTheEarliestBlockThatIsLargeEnough) {
  Pool pool(1024);
  void* a = pool.Alloc(64);
  pool.Alloc(8);
  void* b = pool.Alloc(128);
  pool.Alloc(8);
  pool.Free(a);
  pool.Free(b);
  EXPECT_EQ(pool.Alloc(72), b);
  EXPECT_EQ(pool.Alloc(8), a);
}

TEST(MemoryPool, RestBelowThirtyTwoGoesWithTheBlock) {
  // With sizes in steps of 8 the largest rest that is not split off is 24.
  Pool whole(64 + 16 + 24);
  ASSERT_NE(whole.Alloc(64), nullptr);
  EXPECT_THAT(whole.Chain(), ElementsAre(Used(104)));

  Pool split(64 + 16 + 32);
  ASSERT_NE(split.Alloc(64), nullptr);
  EXPECT_THAT(split.Chain(), ElementsAre(Used(64), Free(32)));
}

TEST(MemoryPool, BlockOfNeedPlusHeaderPlusThirtyOneIsHandedOutWhole) {
  // A size that is no multiple of 8 does not come about by itself, so it is written into the only
  // header this path reads.
  alignas(8) unsigned char area[16 + 64 + 16 + 31 + 16];
  uint64_t header[2] = {64 + 16 + 31, 0};
  std::memcpy(area, header, sizeof(header));
  ASSERT_EQ(MMemAllocStatic(area, 64), area + 16);
  std::memcpy(header, area, sizeof(header));
  EXPECT_EQ(header[0], 64u + 16 + 31);
  EXPECT_EQ(header[1], 1u);
}

TEST(MemoryPool, NullPoolAndZeroSizeGiveNull) {
  Pool pool(64);
  EXPECT_EQ(MMemAllocStatic(nullptr, 8), nullptr);
  EXPECT_EQ(pool.Alloc(0), nullptr);
  EXPECT_EQ(MMemReallocStatic(nullptr, &pool, 8), nullptr);
  MMemFreeStatic(nullptr, &pool);
  pool.Free(nullptr);
  EXPECT_EQ(GetMaxAllocMemSize(nullptr), 2u);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(64)));
}

TEST(MemoryPool, EmptyChainGivesNothing) {
  alignas(8) uint64_t end[2] = {UINT64_MAX, 0};
  EXPECT_EQ(MMemAllocStatic(end, 8), nullptr);
  EXPECT_EQ(GetMaxAllocMemSize(end), 0u);
}

TEST(MemoryPool, FreeingTheMiddleOfThreeJoinsBothNeighbours) {
  Pool pool(512);
  void* a = pool.Alloc(32);
  void* b = pool.Alloc(40);
  void* c = pool.Alloc(48);
  pool.Alloc(8);
  pool.Free(a);
  pool.Free(c);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(32), Used(40), Free(48), Used(8), Free(320)));
  pool.Free(b);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(152), Used(8), Free(320)));
}

TEST(MemoryPool, FreeingTheFirstBlockJoinsTheNext) {
  Pool pool(256);
  void* a = pool.Alloc(32);
  void* b = pool.Alloc(32);
  pool.Alloc(8);
  pool.Free(b);
  pool.Free(a);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(80), Used(8), Free(256 - 120)));
}

TEST(MemoryPool, FreeingTheLastBlockStopsAtTheEndMarker) {
  Pool pool(64);
  void* p = pool.Alloc(64);
  pool.Free(p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(64)));
  void* a = pool.Alloc(8);
  void* b = pool.Alloc(40);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(8), Used(40)));
  pool.Free(b);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(8), Free(40)));
  pool.Free(a);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(64)));
}

TEST(MemoryPool, LargestFreeBlockIsReported) {
  Pool pool(512);
  EXPECT_EQ(GetMaxAllocMemSize(pool.handle()), 512u);
  void* a = pool.Alloc(128);
  pool.Alloc(8);
  pool.Free(a);
  EXPECT_EQ(GetMaxAllocMemSize(pool.handle()), 512u - 128 - 8 - 32);
  ASSERT_NE(pool.Alloc(512 - 128 - 8 - 32), nullptr);
  EXPECT_EQ(GetMaxAllocMemSize(pool.handle()), 128u);

  Pool other(256);  // the larger of two free blocks first
  a = other.Alloc(128);
  other.Alloc(8);
  other.Free(a);
  EXPECT_THAT(other.Chain(), ElementsAre(Free(128), Used(8), Free(88)));
  EXPECT_EQ(GetMaxAllocMemSize(other.handle()), 128u);
}

TEST(MemoryPool, ReallocOfNullAllocates) {
  Pool pool(64);
  EXPECT_EQ(pool.Offset(pool.Realloc(nullptr, 5)), 0);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(8), Free(40)));
}

TEST(MemoryPool, ReallocToZeroGivesNullAndKeepsTheBlock) {
  Pool pool(64);
  void* p = pool.Alloc(64);
  EXPECT_EQ(pool.Realloc(p, 0), nullptr);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(64)));
}

TEST(MemoryPool, ShrinkingByFortyEightDoesNotSplitByFiftySixDoes) {
  Pool pool(512);
  void* p = pool.Alloc(128);
  pool.Alloc(8);
  EXPECT_EQ(pool.Realloc(p, 80), p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(128), Used(8), Free(344)));
  EXPECT_EQ(pool.Realloc(p, 72), p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(72), Free(40), Used(8), Free(344)));
}

TEST(MemoryPool, ShrinkingJoinsTheFreedTailWithAFreeBlockBehind) {
  Pool pool(512);
  void* p = pool.Alloc(128);
  EXPECT_EQ(pool.Realloc(p, 8), p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(8), Free(488)));
  Pool full(128);
  p = full.Alloc(128);
  EXPECT_EQ(full.Realloc(p, 8), p);  // the end marker stays
  EXPECT_THAT(full.Chain(), ElementsAre(Used(8), Free(104)));
}

TEST(MemoryPool, ReallocToTheSameRoundedSizeChangesNothing) {
  Pool pool(128);
  void* p = pool.Alloc(60);
  const std::vector<Block> before = pool.Chain();
  EXPECT_EQ(pool.Realloc(p, 64), p);
  EXPECT_EQ(pool.Realloc(p, 57), p);
  EXPECT_EQ(pool.Chain(), before);
}

TEST(MemoryPool, GrowingInPlaceSplitsTheRestFromThirtyTwoOn) {
  Pool pool(256);
  void* p = pool.Alloc(64);  // 176 free behind
  EXPECT_EQ(pool.Realloc(p, 208), p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(208), Free(32)));

  Pool whole(256);
  p = whole.Alloc(64);
  EXPECT_EQ(whole.Realloc(p, 216), p);  // rest 24
  EXPECT_THAT(whole.Chain(), ElementsAre(Used(256)));
}

TEST(MemoryPool, GrowingInPlaceDoesNotCountTheHeaderAsRoom) {
  // 64 + 176 fits in place; 8 more would fit only with the 16 bytes of the next header.
  Pool pool(256);
  void* p = pool.Alloc(64);
  EXPECT_EQ(pool.Realloc(p, 240), p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(256)));

  Pool other(256);
  p = other.Alloc(64);
  EXPECT_EQ(other.Realloc(p, 248), nullptr);
  EXPECT_THAT(other.Chain(), ElementsAre(Used(64), Free(176)));
}

TEST(MemoryPool, GrowingWithoutRoomMovesTheContents) {
  Pool pool(512);
  unsigned char* p = static_cast<unsigned char*>(pool.Alloc(64));
  pool.Alloc(8);
  for (int i = 0; i < 64; ++i) p[i] = static_cast<unsigned char>(i);
  unsigned char* q = static_cast<unsigned char*>(pool.Realloc(p, 100));
  ASSERT_EQ(pool.Offset(q), 64 + 16 + 8 + 16);
  for (int i = 0; i < 64; ++i) EXPECT_EQ(q[i], i);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(64), Used(8), Used(104), Free(288)));
}

TEST(MemoryPool, GrowingThatFailsLeavesTheBlockAlone) {
  Pool pool(128);
  unsigned char* p = static_cast<unsigned char*>(pool.Alloc(32));
  pool.Alloc(72 - 16);
  std::memset(p, 0x5A, 32);
  const std::vector<Block> before = pool.Chain();
  EXPECT_EQ(pool.Realloc(p, 40), nullptr);
  EXPECT_EQ(pool.Chain(), before);
  for (int i = 0; i < 32; ++i) EXPECT_EQ(p[i], 0x5A);
}

TEST(MemoryLayer, HandleChoosesBetweenHeapAndPool) {
  Pool pool(256);
  void* p = MMemAlloc(pool.handle(), 20);
  EXPECT_EQ(pool.Offset(p), 0);
  p = MMemRealloc(pool.handle(), p, 40);
  EXPECT_EQ(pool.Offset(p), 0);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(40), Free(200)));
  MMemFree(pool.handle(), p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(256)));

  unsigned char* heap = static_cast<unsigned char*>(MMemAlloc(nullptr, 100));
  ASSERT_NE(heap, nullptr);
  std::memset(heap, 7, 100);
  heap = static_cast<unsigned char*>(MMemRealloc(nullptr, heap, 100000));
  ASSERT_NE(heap, nullptr);
  EXPECT_EQ(heap[99], 7);
  MMemFree(nullptr, heap);
  MMemFree(nullptr, nullptr);
}

TEST(MemoryLayer, PoolSeesTheLowThirtyTwoBitsOfASize) {
  Pool pool(256);
  void* p = MMemAlloc(pool.handle(), (uint64_t{1} << 32) + 16);
  EXPECT_EQ(pool.Offset(p), 0);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(16), Free(224)));
  EXPECT_EQ(MMemAlloc(pool.handle(), uint64_t{1} << 32), nullptr);
  EXPECT_EQ(MMemRealloc(pool.handle(), p, (uint64_t{1} << 32) + 24), p);
  EXPECT_THAT(pool.Chain(), ElementsAre(Used(24), Free(216)));
}

TEST(MemoryLayer, MemoryFunctionsAreTheStandardOnes) {
  char text[8] = "abcdefg";
  EXPECT_EQ(MMemSet(text, 'x', 2), text);
  EXPECT_STREQ(text, "xxcdefg");
  EXPECT_EQ(MMemMove(text + 1, text, 4), text + 1);
  EXPECT_STREQ(text, "xxxcdfg");
  EXPECT_EQ(MMemCpy(text, "12", 2), text);
  EXPECT_STREQ(text, "12xcdfg");
  EXPECT_LT(MMemCmp("abc", "abd", 3), 0);
  EXPECT_GT(MMemCmp("abe", "abd", 3), 0);
  EXPECT_EQ(MMemCmp("abe", "abd", 2), 0);
  EXPECT_GT(MMemCmp("\xff", "\x01", 1), 0);  // bytes are unsigned
}

// The chain as a list of sizes, with the same rules written over indices instead of addresses.
class ChainModel {
 public:
  explicit ChainModel(uint64_t payload) : blocks_{{payload, false}} {}
  const std::vector<Block>& blocks() const { return blocks_; }

  // Offset of a block's payload from the first payload.
  int64_t Offset(size_t index) const {
    uint64_t offset = 0;
    for (size_t i = 0; i < index; ++i) offset += blocks_[i].size + 16;
    return static_cast<int64_t>(offset);
  }
  size_t IndexOf(int64_t offset) const {
    size_t index = 0;
    for (int64_t at = 0; at != offset; ++index)
      at += static_cast<int64_t>(blocks_[index].size) + 16;
    return index;
  }
  int64_t Alloc(uint64_t size) {
    const uint64_t need = Round(size);
    for (size_t i = 0; i < blocks_.size(); ++i) {
      if (blocks_[i].used || blocks_[i].size < need) continue;
      CutIfRestReaches(i, need, 32);
      blocks_[i].used = true;
      return Offset(i);
    }
    return -1;
  }
  void Free(int64_t offset) {
    const size_t i = IndexOf(offset);
    blocks_[i].used = false;
    JoinFreeSuccessor(i);
    if (i > 0 && !blocks_[i - 1].used) JoinFreeSuccessor(i - 1);
  }
  int64_t Realloc(int64_t offset, uint64_t size) {
    const size_t i = IndexOf(offset);
    const uint64_t need = Round(size);
    if (need <= blocks_[i].size) {
      if (CutIfRestReaches(i, need, 33)) JoinFreeSuccessor(i + 1);
      return offset;
    }
    const bool next_is_free = i + 1 < blocks_.size() && !blocks_[i + 1].used;
    if (next_is_free && blocks_[i].size + blocks_[i + 1].size >= need) {
      JoinFreeSuccessor(i);
      CutIfRestReaches(i, need, 32);
      return offset;
    }
    const int64_t moved = Alloc(size);
    if (moved >= 0) Free(offset);
    return moved;
  }

 private:
  static uint64_t Round(uint64_t size) { return (size + 7) / 8 * 8; }
  bool CutIfRestReaches(size_t i, uint64_t need, uint64_t limit) {
    if (blocks_[i].size < need + 16 + limit) return false;
    const uint64_t rest = blocks_[i].size - need - 16;
    blocks_[i].size = need;
    blocks_.insert(blocks_.begin() + static_cast<ptrdiff_t>(i) + 1, Block{rest, false});
    return true;
  }
  void JoinFreeSuccessor(size_t i) {
    if (i + 1 >= blocks_.size() || blocks_[i + 1].used) return;
    blocks_[i].size += 16 + blocks_[i + 1].size;
    blocks_.erase(blocks_.begin() + static_cast<ptrdiff_t>(i) + 1);
  }

  std::vector<Block> blocks_;
};

struct LiveBlock {
  int64_t offset;
  uint32_t size;
  unsigned char fill;
};

TEST(MemoryPool, FollowsTheModelOverRandomOperations) {
  constexpr uint64_t kPayload = 16 * 1024;
  Pool pool(kPayload);
  ChainModel model(kPayload);
  unsigned char* const base = static_cast<unsigned char*>(pool.handle()) + 16;
  Random random = TestRandom();
  const auto below = [&random](uint32_t limit) { return random.Below(limit); };
  // Mostly small sizes around the splitting limits, some that only fit a nearly empty pool.
  const auto random_size = [&below] {
    return 1 + (below(20) == 0 ? below(6000) : below(8) == 0 ? below(600) : below(120));
  };
  const auto fill = [base](const LiveBlock& block) {
    std::memset(base + block.offset, block.fill, block.size);
  };
  const auto holds = [base](const LiveBlock& block, int64_t offset, uint32_t count) {
    for (uint32_t i = 0; i < count; ++i) {
      if (base[offset + i] != block.fill) return false;
    }
    return true;
  };

  std::vector<LiveBlock> live;
  int failed_allocs = 0;
  int moved_blocks = 0;
  int failed_reallocs = 0;
  for (int operation = 0; operation < 100000; ++operation) {
    const uint32_t kind = below(10);
    if (live.empty() || kind < 4) {
      const uint32_t size = random_size();
      void* p = pool.Alloc(size);
      const int64_t offset = p == nullptr ? -1 : pool.Offset(p);
      ASSERT_EQ(offset, model.Alloc(size)) << "alloc in operation " << operation;
      if (offset < 0) {
        ++failed_allocs;
      } else {
        live.push_back({offset, size, static_cast<unsigned char>(operation)});
        fill(live.back());
      }
    } else if (kind < 7) {
      const size_t index = below(static_cast<uint32_t>(live.size()));
      ASSERT_TRUE(holds(live[index], live[index].offset, live[index].size));
      pool.Free(base + live[index].offset);
      model.Free(live[index].offset);
      live[index] = live.back();
      live.pop_back();
    } else {
      LiveBlock& block = live[below(static_cast<uint32_t>(live.size()))];
      const uint32_t size = random_size();
      void* p = pool.Realloc(base + block.offset, size);
      const int64_t offset = p == nullptr ? -1 : pool.Offset(p);
      ASSERT_EQ(offset, model.Realloc(block.offset, size)) << "realloc in operation " << operation;
      if (offset < 0) {
        ++failed_reallocs;
        ASSERT_TRUE(holds(block, block.offset, block.size));
      } else {
        ASSERT_TRUE(holds(block, offset, std::min(size, block.size)));
        if (offset != block.offset) ++moved_blocks;
        block = {offset, size, static_cast<unsigned char>(operation)};
        fill(block);
      }
    }
    if (!ChainIs(pool.handle(), model.blocks())) {
      ASSERT_EQ(pool.Chain(), model.blocks()) << "after operation " << operation;
    }
  }
  // The walk must have seen every outcome, and a chain of some length.
  EXPECT_GT(failed_allocs, 100);
  EXPECT_GT(failed_reallocs, 100);
  EXPECT_GT(moved_blocks, 1000);
  EXPECT_GT(live.size(), 20u);

  for (const LiveBlock& block : live) pool.Free(base + block.offset);
  EXPECT_THAT(pool.Chain(), ElementsAre(Free(kPayload)));
}

}  // namespace
}  // namespace n3ds::testing
