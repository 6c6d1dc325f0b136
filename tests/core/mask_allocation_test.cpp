// SPDX-License-Identifier: MIT
// Every allocation of every call of mask mode fails once.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <memory>
#include <vector>

#include "core/model_tables.h"
#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"
#include "support/failing_memory.h"
namespace n3ds::testing {

namespace {

constexpr int kWidth = 1280, kHeight = 720;

std::vector<int32_t> FaceAt(double x) {
  HeadPlace place;
  place.x = x;
  return DetectLandmarks(ModelShape(), place, kWidth, kHeight);
}

// Faces side by side, each moved by `offset` from where it is at 0.
std::vector<std::vector<int32_t>> Faces(int count, double offset) {
  std::vector<std::vector<int32_t>> faces;
  for (int k = 0; k < count; k++) faces.push_back(FaceAt(150.0 * (k - count / 2) + offset));
  return faces;
}

MRESULT Track(const Core& core, int count, double offset) {
  FaceRecords records(Faces(count, offset));
  const NSVL_OFFSCREEN image = ImageOf(kWidth, kHeight);
  return N3DS_Build3DFaceForVideo_Mask(core.handle(), &image, records.get(), count);
}

// Output records of one call.
struct Output {
  std::vector<float> landmarks = std::vector<float>(5 * 3 * 101);
  N3DS_RIGID_MATRIX matrices[5] = {};
  N3DS_3D_MODEL models[5] = {};

  Output() {
    for (int k = 0; k < 5; k++) matrices[k].landmarks3D = &landmarks[static_cast<size_t>(303 * k)];
  }
};

MRESULT BuildMeshes(const Core& core, int count) {
  Output output;
  return N3DS_GetFace3DModel(core.handle(), output.models, output.matrices, count);
}

void ExpectFinite(const Core& core, int count) {
  const TrackingContext& context = core.context();
  for (int k = 0; k < count; k++) {
    for (const float p : context.pose[k]) ASSERT_TRUE(std::isfinite(p));
    for (const float a : context.identityCoef[k]) ASSERT_TRUE(std::isfinite(a));
    for (const float b : context.expressionCoef[k]) ASSERT_TRUE(std::isfinite(b));
    for (const float x : context.shape[k]) ASSERT_TRUE(std::isfinite(x));
  }
}

TEST(MaskAllocation, MeshCallGivesEverythingBackAndWorksAgain) {
  for (const int count : {1, 5}) {
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, count, 0), N3DS_OK);
    int requests = 0;
    {
      const FailingMemory memory;
      ASSERT_EQ(BuildMeshes(*core, count), N3DS_OK);
      requests = memory.requests();
      EXPECT_EQ(memory.outstanding(), 0);
    }
    ASSERT_GT(requests, 3);
    int exhausted = 0;
    for (int failing = 1; failing <= requests; failing++) {
      {
        const FailingMemory memory(failing);
        const MRESULT result = BuildMeshes(*core, count);
        // The task pool's own memory counts as a pool that cannot be started.
        EXPECT_TRUE(result == N3DS_NO_MEMORY || result == N3DS_NUMERICAL) << failing;
        exhausted += result == N3DS_NO_MEMORY ? 1 : 0;
        EXPECT_EQ(memory.outstanding(), 0) << failing << " of " << requests;
      }
      EXPECT_EQ(BuildMeshes(*core, count), N3DS_OK) << failing;
    }
    EXPECT_EQ(exhausted, 3) << "task records, their ids and the product tables";
  }
}

// A core that goes back to where it was before every try.
class Rewinder {
 public:
  explicit Rewinder(Core* core) : core_(*core), context_(core->context()) {
    if (context_.landmarkHistory == nullptr) return;
    history_.assign(context_.landmarkHistory, context_.landmarkHistory + HistorySize());
  }
  void Rewind() {
    TrackingContext& context = core_.context();
    if (context.landmarkHistory != context_.landmarkHistory) {
      MMemFree(context.memory, context.landmarkHistory);
    }
    context = context_;
    std::copy(history_.begin(), history_.end(), context.landmarkHistory);
  }

 private:
  size_t HistorySize() const { return 2 * size_t{kSlotCount} * context_.landmarkNum; }

  Core& core_;
  TrackingContext context_;
  std::vector<int32_t> history_;
};

// The first frame of a face, and one that continues its track. A worker reports nothing: a frame in
// which only its memory fails succeeds, with the last good values.
TEST(MaskAllocation, FrameCallGivesEverythingBackAndTheNextFrameWorks) {
  for (const int count : {1, 3}) {
    for (const int frames_before : {0, 2}) {
      const auto core = Core::Ready();
      for (int frame = 0; frame < frames_before; frame++) {
        ASSERT_EQ(Track(*core, count, frame), N3DS_OK);
        ASSERT_EQ(BuildMeshes(*core, count), N3DS_OK);
      }
      Rewinder rewinder(core.get());
      // The landmark history, once it is there, stays with the context.
      const int kept = frames_before == 0 ? 1 : 0;
      int requests = 0;
      {
        const FailingMemory memory;
        ASSERT_EQ(Track(*core, count, frames_before), N3DS_OK);
        requests = memory.requests();
        EXPECT_EQ(memory.outstanding(), kept);
      }
      int failures = 0;
      // Three faces at once run the same code in another order, which differs from run to run.
      const int step = count == 1 ? 1 : 7;
      for (int failing = 1; failing <= requests; failing += step) {
        rewinder.Rewind();
        MRESULT result = N3DS_OK;
        {
          const FailingMemory memory(failing);
          result = Track(*core, count, frames_before);
          const bool has_history = core->context().landmarkHistory != nullptr;
          EXPECT_EQ(memory.outstanding(), has_history ? kept : 0) << failing;
        }
        EXPECT_TRUE(result == N3DS_OK || result == N3DS_NO_MEMORY || result == N3DS_NUMERICAL)
            << failing;
        failures += result != N3DS_OK ? 1 : 0;
        ExpectFinite(*core, count);
        ASSERT_EQ(Track(*core, count, frames_before + 1), N3DS_OK) << failing;
        ASSERT_EQ(BuildMeshes(*core, count), N3DS_OK) << failing;
        ExpectFinite(*core, count);
        for (int k = 0; k < count; k++) {
          EXPECT_NEAR(core->context().pose[k][6], 600, 40) << failing << ", face " << k;
        }
      }
      if (count == 1) {
        EXPECT_GE(failures, 5) << "the driver's own blocks, the pool's and the task records";
      }
      EXPECT_LT(failures, requests) << "the workers' blocks";
    }
  }
}

// A still face with the mouth shut, in whose third frame one allocation fails. If it is one of the
// identity fit's, the fit has found nothing, and the identity shrinks by a fifth.
TEST(MaskAllocation, IdentityFitWithoutMemoryShrinksTheIdentityByAFifth) {
  const auto core = Core::Ready();
  for (int frame = 0; frame < 2; frame++) {
    ASSERT_EQ(Track(*core, 1, 0), N3DS_OK);
    ASSERT_EQ(BuildMeshes(*core, 1), N3DS_OK);
  }
  Rewinder rewinder(core.get());
  const float(&identity)[kIdentityCount] = core->context().identityCoef[0];
  float shrunk[kIdentityCount];
  for (int k = 0; k < kIdentityCount; k++) {
    ASSERT_NE(identity[k], 0.0f);
    shrunk[k] = static_cast<float>(0.8 * static_cast<double>(identity[k]));
  }
  int requests = 0;
  {
    const FailingMemory memory;
    ASSERT_EQ(Track(*core, 1, 0), N3DS_OK);
    requests = memory.requests();
    ASSERT_NE(Bits(identity), Bits(shrunk));
  }
  int shrinking = 0;
  for (int failing = 1; failing <= requests; failing++) {
    rewinder.Rewind();
    const FailingMemory memory(failing);
    if (Track(*core, 1, 0) != N3DS_OK) continue;
    shrinking += Bits(identity) == Bits(shrunk) ? 1 : 0;
  }
  EXPECT_GE(shrinking, 2) << "the matrix and the right-hand side, and what the solver takes";
}

TEST(MaskAllocation, WarpReportsThatThereIsNoMemoryForItsOutput) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, 1, 0), N3DS_OK);
  Output output;
  ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), output.models, output.matrices, 1), N3DS_OK);
  std::vector<uint8_t> texture(16 * 16 * 4, 255);
  N3DS_2D_TEXTURE_MASK mask = {};
  mask.image = {N3DS_FORMAT_BGRA32, 16, 16, {texture.data()}, {64}};
  NSVL_OFFSCREEN image = {};
  {
    const FailingMemory memory(1);
    EXPECT_EQ(N3DS_WarpFaceMask(core->handle(), &mask, &image, output.models, 64, 48, 0),
              N3DS_NO_MEMORY);
    EXPECT_EQ(memory.requests(), 1);
    EXPECT_EQ(memory.outstanding(), 0);
    EXPECT_EQ(image.plane[0], nullptr);
  }
  EXPECT_EQ(N3DS_WarpFaceMask(core->handle(), &mask, &image, output.models, 64, 48, 0), N3DS_OK);
  MMemFree(nullptr, image.plane[0]);
}

}  // namespace
}  // namespace n3ds::testing
