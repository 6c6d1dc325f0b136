// SPDX-License-Identifier: MIT
// Life of a core context.
#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/core_context.h"
#include "support/face_scene.h"

namespace n3ds::testing {
namespace {

TEST(CoreLife, ANewContextIsAllZeroButForItsMemory) {
  std::vector<unsigned char> area(2 * sizeof(TrackingContext), 0xEE);
  const MHandle pool = MMemMgrCreate(area.data(), area.size());
  void* core = nullptr;
  ASSERT_EQ(N3DS_Init(pool, &core), N3DS_OK);
  ASSERT_NE(core, nullptr);
  MHandle memory;
  std::memcpy(&memory, core, sizeof(memory));  // the first field
  EXPECT_EQ(memory, pool);
  const auto* bytes = static_cast<const unsigned char*>(core);
  for (size_t i = sizeof(memory); i < sizeof(TrackingContext); i++) ASSERT_EQ(bytes[i], 0) << i;
  EXPECT_EQ(N3DS_UnInit(core), N3DS_OK);
}

TEST(CoreLife, NowhereToPutTheHandleIsRefused) {
  EXPECT_EQ(N3DS_Init(nullptr, nullptr), N3DS_NULL_ARGUMENT);
}

TEST(CoreLife, NullIsReleasedWithoutEffect) { EXPECT_EQ(N3DS_UnInit(nullptr), N3DS_OK); }

TEST(CoreLife, ReleaseGivesTheWholePoolBack) {
  std::vector<unsigned char> area(6 << 20);
  const MHandle pool = MMemMgrCreate(area.data(), area.size());
  const size_t whole = GetMaxAllocMemSize(pool);
  {
    const auto core = Core::Ready(pool);
    FaceRecords faces({DetectLandmarks(ModelShape(), {}, 640, 480)});
    const NSVL_OFFSCREEN image = ImageOf(640, 480);
    ASSERT_EQ(N3DS_Build3DFaceForVideo_Rigid(core->handle(), &image, faces.get(), 1), N3DS_OK);
    EXPECT_LT(GetMaxAllocMemSize(pool), whole);
  }
  EXPECT_EQ(GetMaxAllocMemSize(pool), whole);
}

TEST(CoreLifeDeathTest, AnExhaustedMemoryIsAFatalAssertion) {
  std::vector<unsigned char> area(sizeof(TrackingContext));
  const MHandle pool = MMemMgrCreate(area.data(), area.size());
  void* core = nullptr;
  EXPECT_DEATH(N3DS_Init(pool, &core),
               "norvale_3d_shape:3221: MRESULT N3DS_Init\\(MHandle, void\\*\\*\\): Assertion");
}

}  // namespace
}  // namespace n3ds::testing
