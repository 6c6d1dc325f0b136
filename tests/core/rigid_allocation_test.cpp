// SPDX-License-Identifier: MIT
// Every allocation of every call of rigid mode fails once.
#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <vector>

#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"
#include "support/failing_memory.h"
namespace n3ds::testing {

namespace {

constexpr int kWidth = 1280, kHeight = 720;

// Faces side by side, each moved by `offset`; the order of their places is `order`.
MRESULT Track(const Core& core, const std::vector<int>& order, double offset) {
  static const std::vector<double> shape = ModelShape();
  std::vector<std::vector<int32_t>> faces;
  for (const int place_index : order) {
    HeadPlace place;
    place.x = 150.0 * (place_index - 2) + offset;
    faces.push_back(DetectLandmarks(shape, place, kWidth, kHeight));
  }
  FaceRecords records(faces);
  const NSVL_OFFSCREEN image = ImageOf(kWidth, kHeight);
  return N3DS_Build3DFaceForVideo_Rigid(core.handle(), &image, records.get(), records.count());
}

MRESULT Report(const Core& core, int32_t faces) {
  std::vector<float> landmarks(5 * 303);
  N3DS_RIGID_MATRIX records[5] = {};
  for (size_t k = 0; k < 5; k++) records[k].landmarks3D = &landmarks[303 * k];
  return N3DS_GetRigidMatrix(core.handle(), records, faces);
}

struct Scene {
  std::vector<int> before;  // faces of two frames before; none: the failing frame is the first
  std::vector<int> order;   // faces of the failing frame
};

std::unique_ptr<Core> Prepare(const Scene& scene) {
  auto core = Core::Ready();
  for (int frame = 0; frame < 2 && !scene.before.empty(); frame++) {
    EXPECT_EQ(Track(*core, scene.before, frame), N3DS_OK);
  }
  return core;
}

// Codes of a frame in which request number 1, 2, ... fails. What must hold whatever fails is
// checked on the way.
//
// `stride`: only every so many-th request of the workers fails; the first 24 reach past the driver's
// and the pool's.
std::vector<MRESULT> FailEachRequest(const Scene& scene, int stride = 1) {
  int requests = 0;
  {
    const auto core = Prepare(scene);
    const FailingMemory memory;
    EXPECT_EQ(Track(*core, scene.order, 2), N3DS_OK);
    requests = memory.requests();
  }
  std::vector<MRESULT> codes;
  for (int failing = 1; failing <= requests; failing += failing < 24 ? 1 : stride) {
    const auto core = Prepare(scene);
    const auto faces = static_cast<uint32_t>(scene.order.size());
    MRESULT code;
    {
      const FailingMemory memory(failing);
      code = Track(*core, scene.order, 2);
      // Only the landmark history may stay, in the context.
      const bool new_history = scene.before.empty() && core->context().landmarkHistory != nullptr;
      EXPECT_EQ(memory.outstanding(), new_history ? 1 : 0) << failing;
    }
    codes.push_back(code);
    if (code == N3DS_OK) {
      EXPECT_EQ(Report(*core, static_cast<int32_t>(faces)), N3DS_OK) << failing;
    }
    // The core goes on as if nothing had happened.
    EXPECT_EQ(Track(*core, scene.order, 3), N3DS_OK) << failing;
    EXPECT_EQ(Report(*core, static_cast<int32_t>(faces)), N3DS_OK) << failing;
    for (uint32_t k = 0; k < faces; k++) {
      const TrackingContext& context = core->context();
      EXPECT_NEAR(context.pose[k][6], 600, 30) << failing << ", face " << k;
      EXPECT_NEAR(context.pose[k][4], 150.0 * (scene.order[k] - 2) + 3, 15) << failing;
    }
  }
  return codes;
}

// The driver's own blocks come first, then the pool's, then the task records', then the workers'.
void ExpectCodes(const std::vector<MRESULT>& codes, size_t driver_blocks) {
  ASSERT_GT(codes.size(), driver_blocks + 2);
  size_t i = 0;
  for (; i < driver_blocks; i++) EXPECT_EQ(codes[i], N3DS_NO_MEMORY) << i;
  size_t pool_blocks = 0;
  for (; i < codes.size() && codes[i] == N3DS_NUMERICAL; i++) pool_blocks++;
  EXPECT_GE(pool_blocks, 1u);
  ASSERT_LT(i, codes.size());
  EXPECT_EQ(codes[i++], N3DS_NO_MEMORY);
  // A worker has no way to report a failure: it repeats the fit.
  for (; i < codes.size(); i++) EXPECT_EQ(codes[i], N3DS_OK) << i;
}

TEST(RigidAllocation, FirstFrameOfAFace) { ExpectCodes(FailEachRequest({{}, {2}}), 4); }

TEST(RigidAllocation, TrackedFace) { ExpectCodes(FailEachRequest({{2}, {2}}), 3); }

TEST(RigidAllocation, FacesThatChangePlaces) { ExpectCodes(FailEachRequest({{1, 3}, {3, 1}}), 5); }

// Five workers ask for the same things, so that every third request finds all kinds.
TEST(RigidAllocation, FiveFacesWithTheFastWorker) {
  ExpectCodes(FailEachRequest({{0, 1, 2, 3, 4}, {0, 1, 2, 3, 4}}, 3), 3);
}

TEST(RigidAllocation, AFailureBeforeTheMatchingLeavesTheTracks) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, {2}, 0), N3DS_OK);
  ASSERT_EQ(Track(*core, {2}, 1), N3DS_OK);
  const TrackingContext& context = core->context();
  const auto pose = Bits(context.pose[0]);
  const std::vector<int32_t> history(context.landmarkHistory, context.landmarkHistory + 202);
  for (int failing = 1; failing <= 5; failing++) {  // the swap below takes five blocks
    const FailingMemory memory(failing);
    EXPECT_EQ(Track(*core, {4, 2}, 2), N3DS_NO_MEMORY) << failing;
    EXPECT_EQ(context.faceNum, 1u);
    EXPECT_EQ(context.trackFlag[0], 2);
    EXPECT_EQ(Bits(context.pose[0]), pose);
    EXPECT_EQ(std::vector<int32_t>(context.landmarkHistory, context.landmarkHistory + 202),
              history);
  }
}

TEST(RigidAllocation, AFailureAfterTheMatchingHasTakenTheNewLandmarksAlready) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, {2}, 0), N3DS_OK);
  const TrackingContext& context = core->context();
  const std::vector<int32_t> history(context.landmarkHistory, context.landmarkHistory + 202);
  {
    const FailingMemory memory(6);  // the first block of the pool
    EXPECT_EQ(Track(*core, {4, 2}, 2), N3DS_NUMERICAL);
  }
  EXPECT_EQ(context.faceNum, 2u);
  EXPECT_NE(std::vector<int32_t>(context.landmarkHistory, context.landmarkHistory + 202), history);
  // The new face has no pose yet, so nothing can be reported of it.
  EXPECT_EQ(Report(*core, 2), N3DS_NUMERICAL);
  EXPECT_EQ(Track(*core, {4, 2}, 3), N3DS_OK);
  EXPECT_EQ(Report(*core, 2), N3DS_OK);
}

TEST(RigidAllocation, ALatchedCountStaysWhenTheHistoryCannotBeHad) {
  const auto core = Core::Ready();
  {
    const FailingMemory memory(1);
    EXPECT_EQ(Track(*core, {2}, 0), N3DS_NO_MEMORY);
  }
  EXPECT_EQ(core->context().landmarkHistory, nullptr);
  EXPECT_EQ(core->context().landmarkNum, 101u);
  EXPECT_EQ(core->context().faceNum, 0u);
  EXPECT_EQ(Track(*core, {2}, 0), N3DS_OK);
}

TEST(RigidAllocation, EmptyFramesAndReportsTakeNoMemory) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, {1, 2, 3}, 0), N3DS_OK);
  const FailingMemory memory;
  EXPECT_EQ(Report(*core, 3), N3DS_OK);
  EXPECT_EQ(Track(*core, {}, 0), N3DS_OK);
  EXPECT_EQ(memory.requests(), 0);
}

TEST(RigidAllocation, LoadingAModelGivesEverythingBack) {
  for (int failing = 1; failing <= 4; failing++) {
    const Core core;
    {
      const FailingMemory memory(failing);
      EXPECT_EQ(N3DS_LoadFaceHouse(core.handle(), ModelBytes().data(), ModelBytes().size()),
                N3DS_NO_MEMORY);
      EXPECT_EQ(memory.outstanding(), 0);
    }
    EXPECT_EQ(core.context().meanShape, nullptr);
    EXPECT_EQ(N3DS_LoadFaceHouse(core.handle(), ModelBytes().data(), ModelBytes().size()), N3DS_OK);
  }
}

TEST(RigidAllocation, ACoreGivesEverythingBackInTheEnd) {
  const FailingMemory memory;
  {
    const auto core = Core::Ready();
    for (int frame = 0; frame < 3; frame++) ASSERT_EQ(Track(*core, {1, 3}, frame), N3DS_OK);
    EXPECT_EQ(memory.outstanding(), 6);  // the context, the model's four arrays and the history
  }
  EXPECT_EQ(memory.outstanding(), 0);
}

// The landmark track of one face in a pool of the caller's instead of the system heap.
TEST(RigidAllocation, AOneFaceCoreRunsInAPoolOfItsOwn) {
  std::vector<unsigned char> area(8 << 20);
  const MHandle pool = MMemMgrCreate(area.data(), area.size());
  const size_t whole = GetMaxAllocMemSize(pool);
  {
    const auto in_pool = Core::Ready(pool);
    const auto on_heap = Core::Ready();
    for (int frame = 0; frame < 4; frame++) {
      ASSERT_EQ(Track(*in_pool, {2}, 3 * frame), N3DS_OK);
      ASSERT_EQ(Track(*on_heap, {2}, 3 * frame), N3DS_OK);
      EXPECT_EQ(Bits(in_pool->context().pose[0]), Bits(on_heap->context().pose[0]));
      EXPECT_EQ(Report(*in_pool, 1), N3DS_OK);
    }
  }
  EXPECT_EQ(GetMaxAllocMemSize(pool), whole);
}

// Pools that are too small for the driver's part of a first frame. (One that has room for the
// driver but not for a fit would keep the worker repeating without end.)
TEST(RigidAllocation, APoolTooSmallForTheDriverIsRefusedWithoutLoss) {
  const size_t model = sizeof(TrackingContext) + 10872 + 173952 + 217440 + 3479040 + 5 * 16;
  const size_t history = 5 * 202 * 4 + 16;
  const size_t mean = 5436 * 4 + 16;
  int refused = 0;
  for (size_t extra = 0; extra < 3 * history + mean; extra += 256) {
    std::vector<unsigned char> area(model + 64 + extra);
    const MHandle pool = MMemMgrCreate(area.data(), area.size());
    const size_t whole = GetMaxAllocMemSize(pool);
    {
      const auto core = Core::Ready(pool);
      EXPECT_EQ(Track(*core, {2}, 0), N3DS_NO_MEMORY) << extra;
      refused++;
    }
    EXPECT_EQ(GetMaxAllocMemSize(pool), whole);
  }
  EXPECT_GT(refused, 50);
}

}  // namespace
}  // namespace n3ds::testing
