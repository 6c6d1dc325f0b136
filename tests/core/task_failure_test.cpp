// SPDX-License-Identifier: MIT
// Failures of the task pool under the drivers and the dense mesh. Linked with --wrap, so that the
// engine's calls of the pool's functions pass through here.
#include <gtest/gtest.h>

#include <memory>

#include "norvale_3d_sticker_core.h"
#include "support/core_context.h"
#include "support/face_scene.h"

namespace {

// The next call of one of the pool's functions reports a failure, after it has done its work.
enum class Failing { kNothing, kAdd, kWait, kUninit };
Failing failing = Failing::kNothing;

bool FailsNow(Failing function) {
  if (failing != function) return false;
  failing = Failing::kNothing;
  return true;
}

}  // namespace

extern "C" {
// NOLINTBEGIN(bugprone-reserved-identifier): the linker's names
int32_t __real_mcvAddTask(void* pool, mcvTaskFunction function, void* argument);
int32_t __real_mcvWaitTask(void* pool, int32_t id);
int32_t __real_mcvParallelUninit(void* pool);
int32_t __wrap_mcvAddTask(void* pool, mcvTaskFunction function, void* argument);
int32_t __wrap_mcvWaitTask(void* pool, int32_t id);
int32_t __wrap_mcvParallelUninit(void* pool);

int32_t __wrap_mcvAddTask(void* pool, mcvTaskFunction function, void* argument) {
  return FailsNow(Failing::kAdd) ? -1 : __real_mcvAddTask(pool, function, argument);
}

int32_t __wrap_mcvWaitTask(void* pool, int32_t id) {
  const int32_t result = __real_mcvWaitTask(pool, id);
  return FailsNow(Failing::kWait) ? -1 : result;
}

int32_t __wrap_mcvParallelUninit(void* pool) {
  const int32_t result = __real_mcvParallelUninit(pool);
  return FailsNow(Failing::kUninit) ? -1 : result;
}
// NOLINTEND(bugprone-reserved-identifier)
}

namespace n3ds::testing {
namespace {

using Driver = MRESULT (*)(void*, const NSVL_OFFSCREEN*, N3DS_LANDMARK*, int32_t);

constexpr Driver kDrivers[] = {N3DS_Build3DFaceForVideo_Rigid, N3DS_Build3DFaceForVideo_Mask};
constexpr Failing kFailures[] = {Failing::kAdd, Failing::kWait, Failing::kUninit};

MRESULT TrackTwoFaces(const Core& core, Driver driver) {
  HeadPlace right;
  right.x = 150;
  FaceRecords records({DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480),
                       DetectLandmarks(ModelShape(), right, 640, 480)});
  const NSVL_OFFSCREEN image = ImageOf(640, 480);
  return driver(core.handle(), &image, records.get(), records.count());
}

TEST(TaskFailures, FailTheFrameAndLeaveTheCoreUsable) {
  for (const Driver driver : kDrivers) {
    for (const Failing function : kFailures) {
      const auto core = Core::Ready();
      failing = function;
      EXPECT_EQ(TrackTwoFaces(*core, driver), N3DS_NUMERICAL);
      EXPECT_EQ(failing, Failing::kNothing) << "the function was called";
      EXPECT_EQ(TrackTwoFaces(*core, driver), N3DS_OK);
    }
  }
}

TEST(TaskFailures, FailTheDenseMeshAndLeaveTheCoreUsable) {
  const auto core = Core::Ready();
  ASSERT_EQ(TrackTwoFaces(*core, N3DS_Build3DFaceForVideo_Mask), N3DS_OK);
  float landmarks[2][3 * N3DS_LANDMARKS_101];
  N3DS_3D_MODEL models[2] = {};
  N3DS_RIGID_MATRIX records[2] = {};
  for (int k = 0; k < 2; k++) records[k].landmarks3D = landmarks[k];
  for (const Failing function : kFailures) {
    failing = function;
    EXPECT_EQ(N3DS_GetFace3DModel(core->handle(), models, records, 2),
              function == Failing::kUninit ? N3DS_BAD_VALUE : N3DS_NUMERICAL);
    EXPECT_EQ(failing, Failing::kNothing) << "the function was called";
    EXPECT_EQ(N3DS_GetFace3DModel(core->handle(), models, records, 2), N3DS_OK);
  }
}

}  // namespace
}  // namespace n3ds::testing
