// SPDX-License-Identifier: MIT
// Every request of an initialisation to the system heap fails once. Linked with --wrap=malloc and
// --wrap=free, so that the requests of the engine's objects pass through here.
#include <gtest/gtest.h>

#include <cstdlib>
#include <memory>
#include <vector>

#include "engine/engine_testing.h"
#include "norvale_3d_sticker_core.h"
#include "support/core_context.h"

namespace {

bool counting = false;
int failing_request = 0;
int requests_made = 0;
int blocks = 0;

}  // namespace

extern "C" {
// NOLINTBEGIN(bugprone-reserved-identifier): the linker's names
void* __real_malloc(size_t size);
void __real_free(void* pointer);
void* __wrap_malloc(size_t size);
void __wrap_free(void* pointer);

void* __wrap_malloc(size_t size) {
  if (counting && ++requests_made == failing_request) return nullptr;
  void* pointer = __real_malloc(size);
  if (counting && pointer != nullptr) ++blocks;
  return pointer;
}

void __wrap_free(void* pointer) {
  if (counting && pointer != nullptr) --blocks;
  __real_free(pointer);
}
// NOLINTEND(bugprone-reserved-identifier)
}

namespace n3ds::testing {
namespace {

// Counts from its construction on; request number `failing` returns null.
class FailingHeap {
 public:
  explicit FailingHeap(int failing = 0) {
    failing_request = failing;
    requests_made = 0;
    blocks = 0;
    counting = true;
  }
  ~FailingHeap() { counting = false; }
};

MRESULT FromFile(const Engine& engine) { return engine.Initialize(); }
MRESULT FromMemory(const Engine& engine) {
  return Norvale_3DSticker_InitializeEx(engine.handle(), ModelBytes().data(),
                                        static_cast<uint32_t>(ModelBytes().size()), 0, 0);
}

bool Works(const Engine& engine) {
  RigidOutput out(101);
  return Process(engine, ImageOf(640, 480),
                 ToPoints(DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480)), 101,
                 &out) == N3DS_OK;
}

class EngineAllocation : public ::testing::TestWithParam<MRESULT (*)(const Engine&)> {};

TEST_P(EngineAllocation, TakesTheContextTheBytesAndTheFourArrays) {
  ModelBytes();
  const Engine engine;
  const FailingHeap heap;
  ASSERT_EQ(GetParam()(engine), N3DS_OK);
  EXPECT_EQ(requests_made, 6);
  EXPECT_EQ(blocks, 6);
  EXPECT_EQ(Norvale_3DSticker_Uninitialize(engine.handle()), N3DS_OK);
  EXPECT_EQ(blocks, 0);
}

TEST_P(EngineAllocation, AnExhaustedHeapLeavesTheEngineUninitialisedAndLosesNothing) {
  ModelBytes();
  for (int failing = 2; failing <= 6; failing++) {
    const Engine engine;
    {
      const FailingHeap heap(failing);
      EXPECT_EQ(GetParam()(engine), N3DS_NO_MEMORY) << failing;
      EXPECT_EQ(blocks, 0) << failing;
    }
    EXPECT_FALSE(Works(engine));
    EXPECT_EQ(GetParam()(engine), N3DS_OK);
    EXPECT_TRUE(Works(engine));
  }
}

TEST_P(EngineAllocation, WithoutMemoryForTheContextTheProcessStops) {
  ModelBytes();
  const Engine engine;
  EXPECT_DEATH(
      {
        const FailingHeap heap(1);
        GetParam()(engine);
      },
      "N3DS_Init");
}

INSTANTIATE_TEST_SUITE_P(, EngineAllocation, ::testing::Values(FromFile, FromMemory),
                         [](const auto& source) { return source.index == 0 ? "File" : "Memory"; });

TEST_P(EngineAllocation, DestroyingAnInitialisedEngineReleasesEverything) {
  ModelBytes();
  const FailingHeap heap;
  auto engine = std::make_unique<Engine>();
  ASSERT_EQ(GetParam()(*engine), N3DS_OK);
  ASSERT_EQ(blocks, 6);
  engine.reset();
  EXPECT_EQ(blocks, 0);
}

TEST(CoreAllocation, LoadingAgainReleasesTheModelBefore) {
  ModelBytes();
  const FailingHeap heap;
  const auto core = Core::Ready();
  ASSERT_EQ(blocks, 5);
  ASSERT_EQ(N3DS_LoadFaceHouse(core->handle(), ModelBytes().data(), ModelBytes().size()), N3DS_OK);
  EXPECT_EQ(blocks, 5);
}

TEST(EngineFrames, AFrameOfTheEngineTakesNothingOfItsOwn) {
  // A frame without faces takes nothing at all: all else is the core's and given back.
  const auto engine = Engine::Ready();
  ASSERT_TRUE(Works(*engine));
  RigidOutput out(101);
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  Points points = ToPoints(DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480));
  const FailingHeap heap;
  EXPECT_EQ(Norvale_3DSticker_Process(engine->handle(), &image, 1, 101, points.data(), nullptr,
                                      nullptr, out.get()),
            N3DS_OK);
  EXPECT_EQ(blocks, 0);
  requests_made = 0;
  EXPECT_EQ(Norvale_3DSticker_Process(engine->handle(), &image, 0, 101, nullptr, nullptr, nullptr,
                                      out.get()),
            N3DS_OK);
  EXPECT_EQ(requests_made, 0);
}

TEST(EngineFrames, AFailureOfTheCoreIsOneAndLeavesTheOutput) {
  // The first three requests of a frame of a tracked face are the driver's.
  const auto engine = Engine::Ready();
  ASSERT_TRUE(Works(*engine));
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  Points points = ToPoints(DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480));
  for (int failing = 1; failing <= 3; failing++) {
    RigidOutput out(101);
    {
      const FailingHeap heap(failing);
      EXPECT_EQ(Norvale_3DSticker_Process(engine->handle(), &image, 1, 101, points.data(), nullptr,
                                          nullptr, out.get()),
                N3DS_FAILED);
      EXPECT_EQ(blocks, 0);
    }
    EXPECT_TRUE(out.Untouched());
    EXPECT_TRUE(Works(*engine));
  }
}

}  // namespace
}  // namespace n3ds::testing
