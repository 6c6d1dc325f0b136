// SPDX-License-Identifier: MIT
#include "core/face_model.h"

#include <gtest/gtest.h>

#include <cstring>
#include <memory>
#include <vector>

#include "support/core_context.h"
#include "support/face_scene.h"

namespace n3ds::testing {
namespace {

constexpr size_t kModelSize = 2141796;

// A model whose values are all different patterns, so that a shifted or mixed up copy shows.
std::vector<uint8_t> PatternModel(uint32_t seed) {
  std::vector<uint8_t> bytes(kModelSize);
  for (size_t i = 0; i < bytes.size(); i++) {
    seed = seed * 1664525 + 1013904223;
    bytes[i] = static_cast<uint8_t>(seed >> 24);
  }
  const int32_t header[3] = {1812, 16, 20};
  std::memcpy(bytes.data(), header, sizeof(header));
  return bytes;
}

void SetHeader(std::vector<uint8_t>* bytes, int32_t vertices, int32_t identity,
               int32_t expression) {
  const int32_t header[3] = {vertices, identity, expression};
  std::memcpy(bytes->data(), header, sizeof(header));
}

MRESULT Load(const Core& core, const std::vector<uint8_t>& bytes) {
  return N3DS_LoadFaceHouse(core.handle(), bytes.data(), bytes.size());
}

void ExpectModel(const TrackingContext& context, const std::vector<uint8_t>& bytes) {
  EXPECT_EQ(std::memcmp(context.meanShape, bytes.data() + 12, 10872), 0);
  EXPECT_EQ(std::memcmp(context.identityBasis, bytes.data() + 10884, 173952), 0);
  EXPECT_EQ(std::memcmp(context.expressionBasis, bytes.data() + 184836, 217440), 0);
  for (size_t i = 0; i < 1739520; i++) {
    const int step = static_cast<int8_t>(bytes[402276 + i]);
    ASSERT_EQ(context.tensor[i], step * 40) << i;
  }
}

TEST(FaceModel, NullArgumentsAreRefused) {
  const Core core;
  EXPECT_EQ(N3DS_LoadFaceHouse(nullptr, ModelBytes().data(), kModelSize), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(N3DS_LoadFaceHouse(core.handle(), nullptr, kModelSize), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(N3DS_LoadFaceHouse(core.handle(), nullptr, 1), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(core.context().meanShape, nullptr);
}

TEST(FaceModel, PartsAreCopiedVerbatimAndTheTensorIsWidened) {
  const Core core;
  const std::vector<uint8_t> bytes = PatternModel(1);
  ASSERT_EQ(Load(core, bytes), N3DS_OK);
  ExpectModel(core.context(), bytes);
}

TEST(FaceModel, TensorStepsAreMultipliedByForty) {
  const Core core;
  std::vector<uint8_t> bytes = PatternModel(2);
  bytes[402276] = 0x80;
  bytes[402277] = 0x7F;
  bytes[402278] = 0xFF;
  bytes[402279] = 0;
  bytes.back() = 0x80;
  ASSERT_EQ(Load(core, bytes), N3DS_OK);
  EXPECT_EQ(core.context().tensor[0], -5120);
  EXPECT_EQ(core.context().tensor[1], 5080);
  EXPECT_EQ(core.context().tensor[2], -40);
  EXPECT_EQ(core.context().tensor[3], 0);
  EXPECT_EQ(core.context().tensor[1739519], -5120);
}

TEST(FaceModel, TheShippedModelLoads) {
  ASSERT_EQ(ModelBytes().size(), kModelSize);
  const std::unique_ptr<Core> core = Core::Ready();
  ExpectModel(core->context(), ModelBytes());
}

TEST(FaceModel, OtherSizesAreRefusedWithoutReadingTheData) {
  const Core core;
  std::vector<uint8_t> bytes = PatternModel(3);
  bytes.push_back(0);
  EXPECT_EQ(Load(core, bytes), N3DS_BAD_VALUE);
  bytes.resize(kModelSize - 1);
  EXPECT_EQ(Load(core, bytes), N3DS_BAD_VALUE);
  const std::unique_ptr<uint8_t[]> one(new uint8_t[1]);
  for (const size_t size : {size_t{0}, size_t{1}, size_t{12}, kModelSize * 2, SIZE_MAX}) {
    EXPECT_EQ(N3DS_LoadFaceHouse(core.handle(), one.get(), size), N3DS_BAD_VALUE) << size;
  }
  EXPECT_EQ(core.context().meanShape, nullptr);
}

TEST(FaceModel, OtherCountsAreRefused) {
  const Core core;
  std::vector<uint8_t> bytes = PatternModel(4);
  for (const int32_t off : {-1, 1, 1 << 30, -2000}) {
    SetHeader(&bytes, 1812 + off, 16, 20);
    EXPECT_EQ(Load(core, bytes), N3DS_BAD_VALUE);
    SetHeader(&bytes, 1812, 16 + off, 20);
    EXPECT_EQ(Load(core, bytes), N3DS_BAD_VALUE);
    SetHeader(&bytes, 1812, 16, 20 + off);
    EXPECT_EQ(Load(core, bytes), N3DS_BAD_VALUE);
  }
  EXPECT_EQ(core.context().meanShape, nullptr);
  SetHeader(&bytes, 1812, 16, 20);
  EXPECT_EQ(Load(core, bytes), N3DS_OK);
}

TEST(FaceModel, UnalignedDataIsRead) {
  const Core core;
  const std::vector<uint8_t> bytes = PatternModel(5);
  std::vector<uint8_t> shifted(1, 0);
  shifted.insert(shifted.end(), bytes.begin(), bytes.end());
  ASSERT_EQ(N3DS_LoadFaceHouse(core.handle(), shifted.data() + 1, kModelSize), N3DS_OK);
  ExpectModel(core.context(), bytes);
}

TEST(FaceModel, LoadingAgainReplacesTheModel) {
  const Core core;
  ASSERT_EQ(Load(core, PatternModel(6)), N3DS_OK);
  const std::vector<uint8_t> second = PatternModel(7);
  ASSERT_EQ(Load(core, second), N3DS_OK);
  ExpectModel(core.context(), second);
}

TEST(FaceModel, ARefusedModelLeavesTheOneBefore) {
  const Core core;
  const std::vector<uint8_t> first = PatternModel(8);
  ASSERT_EQ(Load(core, first), N3DS_OK);
  std::vector<uint8_t> second = PatternModel(9);
  SetHeader(&second, 1812, 16, 21);
  EXPECT_EQ(Load(core, second), N3DS_BAD_VALUE);
  ExpectModel(core.context(), first);
}

TEST(FaceModel, ExhaustedMemoryReleasesWhatWasTaken) {
  // The four arrays need 10,872 + 173,952 + 217,440 + 3,479,040 bytes and their headers.
  const size_t needed[] = {10872, 173952, 217440, 3479040};
  size_t sum = 32 + sizeof(TrackingContext) + 16;
  for (size_t arrays = 0; arrays <= 4; arrays++) {
    std::vector<unsigned char> area(sum + 16);
    const MHandle pool = MMemMgrCreate(area.data(), area.size());
    {
      const Core core(pool);
      const size_t before = GetMaxAllocMemSize(pool);
      const MRESULT result = Load(core, ModelBytes());
      EXPECT_EQ(result, arrays == 4 ? N3DS_OK : N3DS_NO_MEMORY) << arrays;
      if (result != N3DS_OK) {
        EXPECT_EQ(GetMaxAllocMemSize(pool), before) << arrays;
        EXPECT_EQ(core.context().meanShape, nullptr);
        EXPECT_EQ(core.context().tensor, nullptr);
      }
    }
    EXPECT_EQ(GetMaxAllocMemSize(pool), (area.size() & ~size_t{7}) - 32);
    if (arrays < 4) sum += needed[arrays] + 16;
  }
}

TEST(FaceModel, ExhaustedMemoryLeavesTheModelBefore) {
  const size_t one_model = 10872 + 173952 + 217440 + 3479040 + 4 * 16;
  std::vector<unsigned char> area(sizeof(TrackingContext) + 48 + one_model + one_model / 2);
  const MHandle pool = MMemMgrCreate(area.data(), area.size());
  const Core core(pool);
  const std::vector<uint8_t> first = PatternModel(10);
  ASSERT_EQ(Load(core, first), N3DS_OK);
  EXPECT_EQ(Load(core, PatternModel(11)), N3DS_NO_MEMORY);
  ExpectModel(core.context(), first);
}

}  // namespace
}  // namespace n3ds::testing
