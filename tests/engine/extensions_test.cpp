// SPDX-License-Identifier: MIT
// The extensions as a host sees them: options, times, face states, and both trackers through them.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "engine/engine_testing.h"
#include "norvale_3d_sticker_extensions.h"

namespace n3ds::testing {
namespace {

constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
constexpr float kInfinity = std::numeric_limits<float>::infinity();

Norvale_3DSticker_Options OptionsOf(const Engine& engine) {
  Norvale_3DSticker_Options options = {};
  options.size = sizeof(options);
  EXPECT_EQ(Norvale_3DSticker_GetOptions(engine.handle(), &options), N3DS_OK);
  return options;
}

void Choose(const Engine& engine, uint32_t tracker) {
  Norvale_3DSticker_Options options = OptionsOf(engine);
  options.tracker = tracker;
  EXPECT_EQ(Norvale_3DSticker_SetOptions(engine.handle(), &options), N3DS_OK);
}

bool Same(const Norvale_3DSticker_Options& a, const Norvale_3DSticker_Options& b) {
  return std::memcmp(&a, &b, sizeof(a)) == 0;
}

std::vector<Norvale_3DSticker_Face_State> StatesOf(const Engine& engine) {
  std::vector<Norvale_3DSticker_Face_State> states(N3DS_MAX_FACES);
  uint32_t count = 0;
  EXPECT_EQ(Norvale_3DSticker_GetFaceStates(engine.handle(), states.data(), sizeof(states[0]),
                                            N3DS_MAX_FACES, &count),
            N3DS_OK);
  states.resize(count);
  return states;
}

HeadPlace MovingPlace(int frame) {
  const double t = frame / 90.0;
  return {0.2 * Wave(t), 0.08 * Wave(1.3 * t), 0.1 * Wave(0.7 * t), 20 * Wave(0.9 * t), 0, 550};
}

Points FaceAt(const HeadPlace& place, int width = 640, int height = 480) {
  return ToPoints(DetectLandmarks(ModelShape({0.08, -0.05, 0.06}), place, width, height));
}

RigidOutput Track(const Engine& engine, const Points& points) {
  RigidOutput out(101);
  EXPECT_EQ(Process(engine, ImageOf(640, 480), points, 101, &out), N3DS_OK);
  return out;
}

TEST(Extensions, AnEngineStartsWithTheDefaults) {
  const Engine engine;
  const Norvale_3DSticker_Options options = OptionsOf(engine);
  EXPECT_EQ(options.size, 24u);
  EXPECT_EQ(options.tracker, static_cast<uint32_t>(N3DS_TRACKER_CLASSIC));
  EXPECT_EQ(options.refitLimit, 0u);
  EXPECT_EQ(options.focalLength, 0.0f);
  EXPECT_EQ(options.smoothing, 0.5f);
  EXPECT_EQ(options.workers, 0u);
}

TEST(Extensions, OptionsOutliveInitialisationAndUninitialisation) {
  const Engine engine;
  const Norvale_3DSticker_Options chosen = {24, N3DS_TRACKER_STEADY, 7, 900.0f, 0.25f, 1};
  ASSERT_EQ(Norvale_3DSticker_SetOptions(engine.handle(), &chosen), N3DS_OK);
  EXPECT_TRUE(Same(OptionsOf(engine), chosen));
  ASSERT_EQ(engine.Initialize(), N3DS_OK);
  EXPECT_TRUE(Same(OptionsOf(engine), chosen));
  ASSERT_EQ(Norvale_3DSticker_Uninitialize(engine.handle()), N3DS_OK);
  EXPECT_TRUE(Same(OptionsOf(engine), chosen));
}

TEST(Extensions, BadOptionsChangeNothing) {
  const Engine engine;
  const Norvale_3DSticker_Options before = OptionsOf(engine);
  EXPECT_EQ(Norvale_3DSticker_SetOptions(nullptr, &before), N3DS_NULL_ENGINE);
  EXPECT_EQ(Norvale_3DSticker_SetOptions(engine.handle(), nullptr), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(Norvale_3DSticker_GetOptions(engine.handle(), nullptr), N3DS_NULL_ARGUMENT);

  std::vector<Norvale_3DSticker_Options> bad;
  const auto add = [&](auto change) {
    bad.push_back(before);
    change(&bad.back());
  };
  using Options = Norvale_3DSticker_Options;
  for (const uint32_t size : {0u, 20u, 23u, 25u, 28u, 0xFFFFFFFFu}) {
    add([size](Options* o) { o->size = size; });
  }
  for (const uint32_t tracker : {2u, 0xFFFFFFFFu}) {
    add([tracker](Options* o) { o->tracker = tracker; });
  }
  for (const float focal : {-1.0f, kNaN, kInfinity, -kInfinity}) {
    add([focal](Options* o) { o->focalLength = focal; });
  }
  for (const float smoothing : {-0.01f, 1.01f, kNaN, kInfinity}) {
    add([smoothing](Options* o) { o->smoothing = smoothing; });
  }
  for (const uint32_t workers : {2u, 0xFFFFFFFFu}) {
    add([workers](Options* o) { o->workers = workers; });
  }
  for (Norvale_3DSticker_Options options : bad) {
    options.refitLimit = 99;  // must not be taken over
    EXPECT_EQ(Norvale_3DSticker_SetOptions(engine.handle(), &options), N3DS_BAD_VALUE);
    EXPECT_TRUE(Same(OptionsOf(engine), before));
  }
  Norvale_3DSticker_Options small = {20, 9, 9, 9, 9, 9};
  const Norvale_3DSticker_Options untouched = small;
  EXPECT_EQ(Norvale_3DSticker_GetOptions(engine.handle(), &small), N3DS_BAD_VALUE);
  EXPECT_TRUE(Same(small, untouched));
  EXPECT_EQ(Norvale_3DSticker_GetOptions(nullptr, &small), N3DS_NULL_ENGINE);
}

TEST(Extensions, FrameTimesMustNotRunBackwards) {
  const auto engine = Engine::Ready();
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(nullptr, 0), N3DS_NULL_ENGINE);
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), 1000), N3DS_OK);
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), 500), N3DS_OK);  // no frame yet
  Track(*engine, FaceAt({}));
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), 499), N3DS_BAD_VALUE);
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), 500), N3DS_OK);
  Track(*engine, FaceAt({}));
  constexpr int64_t kLast = std::numeric_limits<int64_t>::max();
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), kLast), N3DS_OK);
  Track(*engine, FaceAt({}));
  Track(*engine, FaceAt({}));  // without a time of its own
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), kLast - 1), N3DS_BAD_VALUE);
  Norvale_3DSticker_Uninitialize(engine->handle());
  EXPECT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), -5), N3DS_OK);
}

TEST(Extensions, FaceStatesRefuseWhatTheyCannotFill) {
  const auto engine = Engine::Ready();
  Track(*engine, FaceAt({}));
  Norvale_3DSticker_Face_State states[2];
  std::memset(static_cast<void*>(states), 0x5A, sizeof(states));
  const std::vector<uint8_t> before(sizeof(states), 0x5A);
  const auto untouched = [&] { return std::memcmp(states, before.data(), sizeof(states)) == 0; };
  uint32_t count = 77;
  constexpr uint32_t kSize = sizeof(states[0]);
  EXPECT_EQ(kSize, 192u);
  void* handle = engine->handle();
  EXPECT_EQ(Norvale_3DSticker_GetFaceStates(nullptr, states, kSize, 2, &count), N3DS_NULL_ENGINE);
  EXPECT_EQ(Norvale_3DSticker_GetFaceStates(handle, nullptr, kSize, 2, &count), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(Norvale_3DSticker_GetFaceStates(handle, states, kSize, 2, nullptr), N3DS_NULL_ARGUMENT);
  for (const uint32_t size : {0u, kSize - 4, kSize + 4}) {
    EXPECT_EQ(Norvale_3DSticker_GetFaceStates(handle, states, size, 2, &count), N3DS_BAD_VALUE);
  }
  const Engine uninitialised;
  EXPECT_EQ(Norvale_3DSticker_GetFaceStates(uninitialised.handle(), states, kSize, 2, &count),
            N3DS_NOT_INITIALIZED);
  EXPECT_EQ(count, 77u);
  EXPECT_TRUE(untouched());
  EXPECT_EQ(Norvale_3DSticker_GetFaceStates(handle, nullptr, kSize, 0, &count), N3DS_OK);
  EXPECT_EQ(count, 1u);
  EXPECT_EQ(Norvale_3DSticker_GetFaceStates(handle, states, kSize, 2, &count), N3DS_OK);
  EXPECT_FALSE(untouched());
  EXPECT_EQ(std::memcmp(&states[1], before.data(), kSize), 0);
}

TEST(Extensions, ExpressionsHaveTheNamesOfTheModel) {
  EXPECT_STREQ(Norvale_3DSticker_GetExpressionName(0), "jaw_open");
  EXPECT_STREQ(Norvale_3DSticker_GetExpressionName(19), "eye_blink_R");
  EXPECT_EQ(Norvale_3DSticker_GetExpressionName(20), nullptr);
  EXPECT_EQ(Norvale_3DSticker_GetExpressionName(0xFFFFFFFFu), nullptr);
}

class BothTrackers : public ::testing::TestWithParam<uint32_t> {
 protected:
  static std::unique_ptr<Engine> Ready() {
    auto engine = Engine::Ready();
    Choose(*engine, GetParam());
    return engine;
  }
};

TEST_P(BothTrackers, StatesTellWhereTheHeadIs) {
  const auto engine = Ready();
  // Half-angle tangents: 0.27 is 30 degrees.
  const HeadPlace place = {0.13, 0, 0, 60, -40, 600};
  for (int frame = 0; frame < 40; frame++) Track(*engine, FaceAt(place));
  const Norvale_3DSticker_Face_State state = StatesOf(*engine).at(0);
  EXPECT_EQ(state.id, 1u);
  EXPECT_EQ(state.framesTracked, 40u);
  EXPECT_EQ(state.isNew, 0u);
  EXPECT_GT(state.confidence, 0.6f);
  EXPECT_GE(state.misfit, 0);
  EXPECT_LT(state.misfit, 6);
  const RigidTransform truth = TransformOf(place);
  // A turn to the image right takes the nose, z of the model, to positive x.
  const double yaw = std::atan2(truth.r[2] * 0.9397 + truth.r[1] * -0.342,
                                -(truth.r[8] * 0.9397 + truth.r[7] * -0.342)) *
                     57.29578;
  EXPECT_NEAR(state.yaw, yaw, 4);
  EXPECT_NEAR(state.pitch, 0, 6);
  EXPECT_NEAR(state.roll, 0, 3);
  EXPECT_NEAR(state.headPosition[0], 60, 15);
  EXPECT_NEAR(state.headPosition[1], -40, 15);
  EXPECT_NEAR(state.headPosition[2], 600, 60);
}

TEST_P(BothTrackers, AnglesHaveTheSignsTheHeaderGivesThem) {
  const auto engine = Ready();
  const auto after = [&](const HeadPlace& place) {
    Track(*engine, {});
    for (int frame = 0; frame < 100; frame++) Track(*engine, {});
    for (int frame = 0; frame < 20; frame++) Track(*engine, FaceAt(place));
    return StatesOf(*engine).at(0);
  };
  const Norvale_3DSticker_Face_State straight = after({});
  const Norvale_3DSticker_Face_State turned = after({0, 0, 0.13, 0, 0, 600});
  EXPECT_GT(turned.roll, straight.roll + 10);  // clockwise: about z into the scene
  // A head whose nose lies further up in the image than its middle looks up.
  const Norvale_3DSticker_Face_State nodding = after({0, 0.13, 0, 0, 0, 600});
  const RigidTransform truth = TransformOf({0, 0.13, 0, 0, 0, 600});
  const double nose_y = truth.r[5] * 0.9397 + truth.r[4] * -0.342;
  EXPECT_GT((nodding.pitch - straight.pitch) * (nose_y < 0 ? 1 : -1), 10);
}

TEST_P(BothTrackers, AFaceKeepsItsIdentifierThroughAShortGapAndLosesItInALongOne) {
  const auto engine = Ready();
  for (int frame = 0; frame < 40; frame++) Track(*engine, FaceAt(MovingPlace(frame)));
  EXPECT_EQ(StatesOf(*engine).at(0).id, 1u);
  for (int frame = 0; frame < 30; frame++) Track(*engine, {});
  EXPECT_TRUE(StatesOf(*engine).empty());
  Track(*engine, FaceAt(MovingPlace(40)));
  EXPECT_EQ(StatesOf(*engine).at(0).id, 1u);
  EXPECT_EQ(StatesOf(*engine).at(0).isNew, 1u);
  for (int frame = 0; frame < 90; frame++) Track(*engine, {});
  Track(*engine, FaceAt(MovingPlace(40)));
  EXPECT_EQ(StatesOf(*engine).at(0).id, 2u);
  Norvale_3DSticker_Uninitialize(engine->handle());
  ASSERT_EQ(engine->Initialize(), N3DS_OK);
  Track(*engine, FaceAt({}));
  EXPECT_EQ(StatesOf(*engine).at(0).id, 3u);
}

TEST_P(BothTrackers, TheGapCountsInTheHostsTime) {
  const auto engine = Ready();
  int64_t now = 0;
  const auto track = [&](const Points& points, int64_t milliseconds) {
    now += milliseconds * 1000000;
    ASSERT_EQ(Norvale_3DSticker_SetFrameTime(engine->handle(), now), N3DS_OK);
    Track(*engine, points);
  };
  for (int frame = 0; frame < 40; frame++) track(FaceAt({}), 33);
  track({}, 33);
  track(FaceAt({}), 2900);
  EXPECT_EQ(StatesOf(*engine).at(0).id, 2u);
}

TEST_P(BothTrackers, TakeTheHostsFocalLength) {
  const auto engine = Ready();
  Norvale_3DSticker_Options options = OptionsOf(*engine);
  for (int frame = 0; frame < 20; frame++) Track(*engine, FaceAt({}));
  const float assumed = StatesOf(*engine).at(0).headPosition[2];
  options.focalLength = 840;  // 1.5 times the assumed one
  ASSERT_EQ(Norvale_3DSticker_SetOptions(engine->handle(), &options), N3DS_OK);
  RigidOutput out = Track(*engine, FaceAt({}));
  EXPECT_EQ(out.face(0).projectionMatrix[0], 2.0f * 840.0f / 640.0f);
  EXPECT_EQ(out.face(0).projectionMatrix[5], 2.0f * 840.0f / 480.0f);
  for (int frame = 0; frame < 60; frame++) Track(*engine, FaceAt({}));
  EXPECT_NEAR(StatesOf(*engine).at(0).headPosition[2] / assumed, 1.5, 0.12);
}

INSTANTIATE_TEST_SUITE_P(Extensions, BothTrackers,
                         ::testing::Values(N3DS_TRACKER_CLASSIC, N3DS_TRACKER_STEADY),
                         [](const auto& tracker) {
                           return std::string(tracker.param == 0 ? "Classic" : "Steady");
                         });

// How far the second model matrix has moved a point in front of the face, mm.
double Moved(const RigidOutput& a, const RigidOutput& b) {
  const float point[3] = {0, 40, 90};
  double sum = 0;
  for (int row = 0; row < 3; row++) {
    double at[2] = {};
    for (const int which : {0, 1}) {
      const float* m = (which == 0 ? a : b).face(0).modelMatrix;
      at[which] = m[12 + row];
      for (int k = 0; k < 3; k++) at[which] += static_cast<double>(m[4 * k + row]) * point[k];
    }
    sum += (at[1] - at[0]) * (at[1] - at[0]);
  }
  return std::sqrt(sum);
}

TEST(TrackerSwitch, MovesStickersByNoMoreThanTheTrackersDiffer) {
  const auto classic = Engine::Ready();
  const auto steady = Engine::Ready();
  const auto both = Engine::Ready();
  Choose(*steady, N3DS_TRACKER_STEADY);
  RigidOutput last(101);
  double differ = 0;
  for (int frame = 0; frame < 120; frame++) {
    if (frame == 40) Choose(*both, N3DS_TRACKER_STEADY);
    if (frame == 80) Choose(*both, N3DS_TRACKER_CLASSIC);
    const Points points = FaceAt(MovingPlace(frame));
    const RigidOutput a = Track(*classic, points);
    const RigidOutput b = Track(*steady, points);
    RigidOutput c = Track(*both, points);
    differ = std::max(differ, Moved(a, b));
    if (frame > 0) {
      EXPECT_LT(Moved(last, c), differ + 8) << frame;
    }
    EXPECT_EQ(StatesOf(*both).at(0).id, 1u);
    last = std::move(c);
  }
}

TEST(TrackerSwitch, CarriesMaskTracksToo) {
  const auto engine = Engine::Ready();
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  for (int frame = 0; frame < 60; frame++) {
    if (frame == 20) Choose(*engine, N3DS_TRACKER_STEADY);
    if (frame == 40) Choose(*engine, N3DS_TRACKER_CLASSIC);
    Points points = FaceAt(MovingPlace(frame));
    RigidOutput out(101);
    Norvale_3DSticker_ModelInfo_Array models = {};
    ASSERT_EQ(Norvale_3DSticker_Process_FaceMask(engine->handle(), &image, 1, 101, points.data(),
                                                 nullptr, nullptr, out.get(), &models),
              N3DS_OK);
    ASSERT_EQ(models.modelNum, 1u);
    for (int i = 0; i < 3 * models.models[0].vertexNum; i++) {
      ASSERT_TRUE(std::isfinite(models.models[0].vertices[i]));
    }
    EXPECT_EQ(StatesOf(*engine).at(0).id, 1u);
  }
}

TEST(TrackerSwitch, SurvivesFramesWithoutFaces) {
  const auto engine = Engine::Ready();
  for (int round = 0; round < 4; round++) {
    Choose(*engine, round % 2 == 0 ? N3DS_TRACKER_STEADY : N3DS_TRACKER_CLASSIC);
    Track(*engine, {});
    Track(*engine, FaceAt({}));
    Track(*engine, {});
  }
  EXPECT_TRUE(StatesOf(*engine).empty());
}

// All landmarks in one pixel: a fit that never succeeds at some places of a small image.
Points OnePixel(int x, int y) { return Points(101, __tag_point{x, y}); }

TEST(RefitLimit, EndsAFitThatWouldNeverEnd) {
  const auto engine = Engine::Ready();
  Norvale_3DSticker_Options options = OptionsOf(*engine);
  options.refitLimit = 3;
  ASSERT_EQ(Norvale_3DSticker_SetOptions(engine->handle(), &options), N3DS_OK);
  int given_up = 0;
  for (int x = 0; x < 176; x += 16) {
    for (int y = 0; y < 144; y += 16) {
      RigidOutput none(101);
      Process(*engine, ImageOf(176, 144), {}, 101, &none);
      Points points = OnePixel(x, y);
      const Points face = ToPoints(DetectLandmarks(ModelShape(), HeadPlace{}, 176, 144));
      points.insert(points.end(), face.begin(), face.end());
      RigidOutput out(101);
      ASSERT_EQ(Process(*engine, ImageOf(176, 144), points, 101, &out), N3DS_OK);
      const std::vector<Norvale_3DSticker_Face_State> states = StatesOf(*engine);
      ASSERT_EQ(states.size(), 2u);
      EXPECT_GT(states[1].confidence, 0.3f);  // the other face is tracked all the same
      if (states[0].confidence > 0) continue;
      given_up++;
      EXPECT_EQ(states[0].framesTracked, 0u);
      EXPECT_EQ(states[0].isNew, 1u);
      EXPECT_FLOAT_EQ(out.face(0).modelMatrix[14], -300);  // the start pose: 800 mm away
    }
  }
  EXPECT_GT(given_up, 0);
}

TEST(RefitLimit, ChangesNothingWhereFitsSucceed) {
  const auto free = Engine::Ready();
  const auto limited = Engine::Ready();
  Norvale_3DSticker_Options options = OptionsOf(*limited);
  options.refitLimit = 1;
  ASSERT_EQ(Norvale_3DSticker_SetOptions(limited->handle(), &options), N3DS_OK);
  for (int frame = 0; frame < 30; frame++) {
    const Points points = FaceAt(MovingPlace(frame));
    EXPECT_EQ(Track(*free, points).AllBits(), Track(*limited, points).AllBits());
  }
}

TEST(SteadyEngine, WorkersChangeNothing) {
  const auto alone = Engine::Ready();
  const auto many = Engine::Ready();
  Choose(*many, N3DS_TRACKER_STEADY);
  Norvale_3DSticker_Options options = OptionsOf(*many);
  options.workers = 1;
  ASSERT_EQ(Norvale_3DSticker_SetOptions(alone->handle(), &options), N3DS_OK);
  for (int frame = 0; frame < 20; frame++) {
    Points points;
    for (int k = 0; k < 5; k++) {
      HeadPlace place = MovingPlace(frame + 7 * k);
      place.x = 140.0 * (k - 2);
      place.z = 700;
      const Points face = FaceAt(place);
      points.insert(points.end(), face.begin(), face.end());
    }
    EXPECT_EQ(Track(*alone, points).AllBits(), Track(*many, points).AllBits());
  }
}

TEST(SteadyEngine, RefusesTheFramesTheClassicTrackerRefuses) {
  for (const uint32_t tracker : {N3DS_TRACKER_CLASSIC, N3DS_TRACKER_STEADY}) {
    const auto engine = Engine::Ready();
    Choose(*engine, tracker);
    RigidOutput out(101);
    const Points face = FaceAt({});
    EXPECT_EQ(Process(*engine, ImageOf(0, 480), face, 101, &out), N3DS_FAILED);
    EXPECT_EQ(Process(*engine, ImageOf(640, -1), face, 101, &out), N3DS_FAILED);
    EXPECT_EQ(
        Process(*engine, ImageOf(640, 480), Points(face.begin(), face.begin() + 100), 100, &out),
        N3DS_FAILED);
    NSVL_OFFSCREEN image = ImageOf(640, 480);
    EXPECT_EQ(Norvale_3DSticker_Process(engine->handle(), &image, 1, 101, nullptr, nullptr, nullptr,
                                        out.get()),
              N3DS_FAILED);
    EXPECT_TRUE(out.Untouched());
  }
}

}  // namespace
}  // namespace n3ds::testing
