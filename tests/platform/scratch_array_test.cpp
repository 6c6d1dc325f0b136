// SPDX-License-Identifier: MIT
#include "platform/scratch_array.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

namespace n3ds::testing {
namespace {

struct Record {
  uint64_t words[3];
};

class ScratchArrayInAPool : public ::testing::Test {
 protected:
  std::vector<uint64_t> area_ = std::vector<uint64_t>(100);
  MHandle pool_ = MMemMgrCreate(area_.data(), area_.size() * sizeof(uint64_t));
  size_t Free() const { return GetMaxAllocMemSize(pool_); }
};

TEST_F(ScratchArrayInAPool, GivesItsMemoryBack) {
  const size_t before = Free();
  {
    const ScratchArray<Record> records(pool_, 5);
    ASSERT_TRUE(records);
    EXPECT_LT(Free(), before);
    records[4].words[2] = 7;
    records.Zero();
    EXPECT_EQ(records.get()[4].words[2], 0u);
  }
  EXPECT_EQ(Free(), before);
}

TEST_F(ScratchArrayInAPool, IsEmptyWhenTheMemoryIsExhausted) {
  const size_t before = Free();
  EXPECT_FALSE(ScratchArray<Record>(pool_, 50));
  EXPECT_EQ(Free(), before);
}

// 2^32 bytes and one element more: what a pool makes of it in 32 bits would fit.
TEST_F(ScratchArrayInAPool, IsEmptyForSizesThatAPoolReadsAsSmallerOnes) {
  EXPECT_FALSE(ScratchArray<uint64_t>(pool_, (size_t{1} << 29) + 1));
  EXPECT_FALSE(ScratchArray<uint8_t>(pool_, (size_t{1} << 32) + 1));
}

TEST(ScratchArray, IsEmptyForSizesBeyondTheAddressSpace) {
  EXPECT_FALSE(ScratchArray<uint64_t>(nullptr, SIZE_MAX / 8 + 2));  // 8 bytes, once it has wrapped
  EXPECT_FALSE(ScratchArray<Record>(nullptr, SIZE_MAX));
}

}  // namespace
}  // namespace n3ds::testing
