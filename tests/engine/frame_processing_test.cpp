// SPDX-License-Identifier: MIT
// Rigid frames through the exported engine functions.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <type_traits>
#include <vector>

#include "engine/engine_testing.h"
#include "frame_records.h"
#include "support/face_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAreArray;
using ::testing::Ne;

Points FaceAt(double x, int count = 101, double z = 600) {
  HeadPlace place;
  place.x = x;
  place.z = z;
  return ToPoints(DetectLandmarks(ModelShape(), place, 640, 480, count));
}
Points FacesAt(const std::vector<double>& places, int count = 101) {
  Points points;
  for (const double x : places) {
    const Points face = FaceAt(x, count);
    points.insert(points.end(), face.begin(), face.end());
  }
  return points;
}

MRESULT ProcessCounts(const Engine& engine, Points* points, uint32_t faces, uint32_t landmarks,
                      RigidOutput* out, NSVL_OFFSCREEN image = ImageOf(640, 480)) {
  return Norvale_3DSticker_Process(engine.handle(), &image, faces, landmarks,
                                   points == nullptr ? nullptr : points->data(), nullptr, nullptr,
                                   out == nullptr ? nullptr : out->get());
}

TEST(RigidFrame, BeforeInitialisationItIsRefused) {
  const Engine engine;
  RigidOutput out(101);
  Points points = FaceAt(0);
  EXPECT_EQ(ProcessCounts(engine, &points, 1, 101, &out), N3DS_NOT_INITIALIZED);
  EXPECT_EQ(ProcessCounts(engine, nullptr, 0, 101, &out), N3DS_NOT_INITIALIZED);
  EXPECT_TRUE(out.Untouched());
}

TEST(RigidFrame, AMissingOutputRecordIsRefusedOnAnInitialisedEngineToo) {
  const auto engine = Engine::Ready();
  Points points = FaceAt(0);
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, 101, nullptr), N3DS_NOT_INITIALIZED);
  EXPECT_EQ(ProcessCounts(*engine, nullptr, 0, 101, nullptr), N3DS_NOT_INITIALIZED);
  EXPECT_EQ(Norvale_3DSticker_Process(engine->handle(), nullptr, 9, 9, nullptr, nullptr, nullptr,
                                      nullptr),
            N3DS_NOT_INITIALIZED);
}

TEST(RigidFrame, BadFramesFailAndLeaveTheOutputUntouched) {
  const auto engine = Engine::Ready();
  RigidOutput out(101);
  Points points = FacesAt({-200, -100, 0, 100, 200, 0});
  EXPECT_EQ(ProcessCounts(*engine, &points, 6, 101, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, 100, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, 0, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, 102, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, 164, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, 166, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, UINT32_MAX, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, UINT32_MAX, 101, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, &points, 0x80000001u, 101, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, nullptr, 1, 101, &out), N3DS_FAILED);
  EXPECT_EQ(ProcessCounts(*engine, nullptr, 6, 101, &out), N3DS_FAILED);
  for (const auto& [width, height] : {std::make_pair(0, 480), {640, 0}, {-640, 480}, {640, -1}}) {
    EXPECT_EQ(ProcessCounts(*engine, &points, 1, 101, &out, ImageOf(width, height)), N3DS_FAILED);
    EXPECT_EQ(ProcessCounts(*engine, nullptr, 0, 101, &out, ImageOf(width, height)), N3DS_FAILED);
  }
  EXPECT_EQ(Norvale_3DSticker_Process(engine->handle(), nullptr, 1, 101, points.data(), nullptr,
                                      nullptr, out.get()),
            N3DS_FAILED);
  EXPECT_EQ(Norvale_3DSticker_Process(engine->handle(), nullptr, 0, 101, nullptr, nullptr, nullptr,
                                      out.get()),
            N3DS_FAILED);
  EXPECT_TRUE(out.Untouched());
  EXPECT_EQ(ProcessCounts(*engine, &points, 1, 101, &out), N3DS_OK);
}

TEST(FrameRecords, HoldTheLandmarksOfBothLayoutsAndNoMore) {
  EXPECT_TRUE(FrameRecords::Holds(N3DS_LANDMARKS_101));
  EXPECT_TRUE(FrameRecords::Holds(N3DS_LANDMARKS_165));
  EXPECT_FALSE(FrameRecords::Holds(166));
  EXPECT_FALSE(FrameRecords::Holds(UINT32_MAX));
  static_assert(sizeof(FrameRecords::points[0]) == 2 * 165 * sizeof(int32_t));
  static_assert(sizeof(FrameRecords::landmarks_3d[0]) == 3 * 165 * sizeof(float));
  static_assert(!std::is_copy_constructible_v<FrameRecords> &&
                !std::is_copy_assignable_v<FrameRecords>);
}

TEST(RigidFrame, ARefusedFrameLeavesTheTracks) {
  const auto engine = Engine::Ready(), other = Engine::Ready();
  RigidOutput a(101), b(101);
  for (int frame = 0; frame < 3; frame++) {
    Points points = FaceAt(4.0 * frame);
    ASSERT_EQ(ProcessCounts(*engine, &points, 1, 101, &a), N3DS_OK);
    ASSERT_EQ(ProcessCounts(*other, &points, 1, 101, &b), N3DS_OK);
    EXPECT_EQ(ProcessCounts(*other, &points, 1, 100, &b), N3DS_FAILED);
    EXPECT_EQ(ProcessCounts(*other, &points, 6, 101, &b), N3DS_FAILED);
    EXPECT_EQ(ProcessCounts(*other, nullptr, 1, 101, &b), N3DS_FAILED);
  }
  EXPECT_EQ(a.AllBits(), b.AllBits());
}

TEST(RigidFrame, WithoutFacesItSucceedsAndEndsTheTracks) {
  const auto engine = Engine::Ready();
  RigidOutput first(101), out(101), empty(101);
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), FaceAt(0), 101, &first), N3DS_OK);
  for (int i = 0; i < 2; i++) {
    ASSERT_EQ(Process(*engine, ImageOf(640, 480), FaceAt(3), 101, &out), N3DS_OK);
  }
  EXPECT_EQ(Process(*engine, ImageOf(640, 480), {}, 101, &empty), N3DS_OK);
  EXPECT_EQ(empty.face_num(), 0u);
  EXPECT_TRUE(empty.FacesUntouchedFrom(0));
  // The landmark count of an empty frame does not matter.
  EXPECT_EQ(ProcessCounts(*engine, nullptr, 0, 7, &empty), N3DS_OK);
  Points ignored = FaceAt(0);
  EXPECT_EQ(ProcessCounts(*engine, &ignored, 0, 101, &empty), N3DS_OK);
  // The next face is new.
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), FaceAt(0), 101, &out), N3DS_OK);
  EXPECT_EQ(out.AllBits(), first.AllBits());
}

TEST(RigidFrame, ReportsEveryFaceInTheOrderOfTheInput) {
  for (uint32_t faces = 1; faces <= 5; faces++) {
    const auto engine = Engine::Ready();
    RigidOutput out(101);
    std::vector<double> places = {100, -200, 200, 0, -100};
    places.resize(faces);
    ASSERT_EQ(Process(*engine, ImageOf(640, 480), FacesAt(places), 101, &out), N3DS_OK);
    EXPECT_EQ(out.face_num(), faces);
    for (size_t k = 0; k < faces; k++) {
      EXPECT_NEAR(out.face(k).modelMatrix[12], places[k], 6) << k;
      EXPECT_NEAR(out.face(k).modelMatrix[14], -100, 12) << k;
      EXPECT_THAT(out.face(k).viewMatrix,
                  ElementsAreArray({1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, -500, 1}));
      EXPECT_EQ(out.face(k).projectionMatrix[0], 1120.0f / 640.0f);
      EXPECT_EQ(out.face(k).projectionMatrix[11], -1.0f);
      EXPECT_THAT(out.landmarks(k), Each(Ne(RigidOutput::kUntouched)));
    }
    EXPECT_TRUE(out.FacesUntouchedFrom(faces));
  }
}

TEST(RigidFrame, RectanglesAndTheExtraPointerAreNotRead) {
  const auto engine = Engine::Ready(), other = Engine::Ready();
  RigidOutput a(101), b(101);
  Points points = FaceAt(0);
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  ASSERT_EQ(Process(*engine, image, points, 101, &a), N3DS_OK);
  ASSERT_EQ(Norvale_3DSticker_Process(other->handle(), &image, 1, 101, points.data(),
                                      reinterpret_cast<__tag_rect*>(uintptr_t{1}),
                                      reinterpret_cast<float*>(uintptr_t{1}), b.get()),
            N3DS_OK);
  EXPECT_EQ(a.AllBits(), b.AllBits());
}

TEST(RigidFrame, InputIsOnlyRead) {
  const auto engine = Engine::Ready();
  RigidOutput out(101);
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  for (int i = 0; i < 4; i++) image.plane[i] = reinterpret_cast<uint8_t*>(uintptr_t{1});
  const NSVL_OFFSCREEN image_before = image;
  for (int frame = 0; frame < 3; frame++) {
    Points points = FaceAt(frame);
    const Points before = points;
    ASSERT_EQ(Norvale_3DSticker_Process(engine->handle(), &image, 1, 101, points.data(), nullptr,
                                        nullptr, out.get()),
              N3DS_OK);
    EXPECT_EQ(std::memcmp(points.data(), before.data(), points.size() * sizeof(points[0])), 0);
  }
  EXPECT_EQ(std::memcmp(&image, &image_before, sizeof(image)), 0);
}

TEST(RigidFrame, AQuarterTurnSwapsTheImagesSides) {
  for (const uint32_t degree : {90u, 270u}) {
    const auto engine = Engine::Ready(degree, 0);
    RigidOutput out(101);
    // A 480 x 640 upright image, delivered as 640 x 480.
    const Points upright = ToPoints(DetectLandmarks(ModelShape(), HeadPlace{}, 480, 640));
    ASSERT_EQ(
        Process(*engine, ImageOf(640, 480), Deliver(upright, degree, false, 480, 640), 101, &out),
        N3DS_OK);
    EXPECT_EQ(out.face(0).projectionMatrix[0], 1120.0f / 480.0f);
    EXPECT_EQ(out.face(0).projectionMatrix[5], 1120.0f / 640.0f);
    EXPECT_NEAR(out.face(0).modelMatrix[14], -100, 12);
  }
}

TEST(RigidFrame, AnUnusualDegreeKeepsTheImagesSides) {
  for (const uint32_t degree : {180u, 45u}) {
    const auto engine = Engine::Ready(degree, 0);
    RigidOutput out(101);
    ASSERT_EQ(
        Process(*engine, ImageOf(640, 480), Deliver(FaceAt(0), 180, false, 640, 480), 101, &out),
        N3DS_OK);
    EXPECT_EQ(out.face(0).projectionMatrix[0], 1120.0f / 640.0f);
    EXPECT_NEAR(out.face(0).modelMatrix[5], 1, 0.02);
  }
}

// A few frames of two people, upright.
std::vector<Points> Scene(int count, int width, int height) {
  Person left = Person(1).At(-120, 0, 600), right = Person(2).At(110, 20, 700);
  std::vector<Points> frames;
  for (int frame = 0; frame < 6; frame++) {
    Points points = ToPoints(left.Detect(frame, width, height, count, 1));
    const Points other = ToPoints(right.Detect(frame, width, height, count, 1));
    points.insert(points.end(), other.begin(), other.end());
    frames.push_back(points);
  }
  return frames;
}

TEST(RigidFrame, TurnedAndMirroredDeliveriesGiveTheSameBitsAsTheUprightImage) {
  constexpr int kWidth = 600, kHeight = 800;
  for (const int count : {101, 165}) {
    const auto landmarks = static_cast<uint32_t>(count);
    const std::vector<Points> frames = Scene(count, kWidth, kHeight);
    std::vector<std::vector<uint32_t>> expected;
    {
      const auto engine = Engine::Ready();
      for (const Points& frame : frames) {
        RigidOutput out(landmarks);
        ASSERT_EQ(Process(*engine, ImageOf(kWidth, kHeight), frame, landmarks, &out), N3DS_OK);
        expected.push_back(out.AllBits());
      }
    }
    for (const uint32_t degree : {0u, 90u, 180u, 270u}) {
      for (const bool mirrored : {false, true}) {
        const auto engine = Engine::Ready(degree, mirrored ? 1 : 0);
        const bool quarter = degree == 90 || degree == 270;
        const NSVL_OFFSCREEN image = quarter ? ImageOf(kHeight, kWidth) : ImageOf(kWidth, kHeight);
        for (size_t i = 0; i < frames.size(); i++) {
          Points delivered;
          for (size_t k = 0; k < 2; k++) {
            const auto first = frames[i].begin() + static_cast<int>(k) * count;
            const Points face =
                Deliver(Points(first, first + count), degree, mirrored, kWidth, kHeight);
            delivered.insert(delivered.end(), face.begin(), face.end());
          }
          RigidOutput out(landmarks);
          ASSERT_EQ(Process(*engine, image, delivered, landmarks, &out), N3DS_OK);
          ASSERT_EQ(out.AllBits(), expected[i]) << degree << ' ' << mirrored << ", frame " << i;
        }
      }
    }
  }
}

TEST(RigidFrame, TheOrientationMayChangeBetweenFrames) {
  const std::vector<Points> frames = Scene(101, 600, 800);
  const auto still = Engine::Ready(), turning = Engine::Ready();
  for (size_t i = 0; i < frames.size(); i++) {
    RigidOutput a(101), b(101);
    ASSERT_EQ(Process(*still, ImageOf(600, 800), frames[i], 101, &a), N3DS_OK);
    const auto degree = static_cast<uint32_t>(90 * (i % 4));
    const bool quarter = i % 2 == 1;
    Norvale_3DSticker_SetDegreeAndMirror(turning->handle(), degree, i % 3 == 0 ? 1 : 0);
    Points delivered;
    for (int k = 0; k < 2; k++) {
      const auto first = frames[i].begin() + k * 101;
      const Points face = Deliver(Points(first, first + 101), degree, i % 3 == 0, 600, 800);
      delivered.insert(delivered.end(), face.begin(), face.end());
    }
    ASSERT_EQ(
        Process(*turning, quarter ? ImageOf(800, 600) : ImageOf(600, 800), delivered, 101, &b),
        N3DS_OK);
    EXPECT_EQ(a.AllBits(), b.AllBits()) << i;
  }
}

TEST(RigidFrame, AfterLatching165AFrameOf101FillsExactlyItsOwnLandmarks) {
  const auto engine = Engine::Ready();
  RigidOutput more(165), fewer(101), again(165);
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), FacesAt({0, 150}, 165), 165, &more), N3DS_OK);
  // The buffers end with landmark 100: a sanitizer sees a write beyond.
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), FacesAt({1, 151}, 101), 101, &fewer), N3DS_OK);
  EXPECT_EQ(fewer.face_num(), 2u);
  for (size_t k = 0; k < 2; k++) {
    EXPECT_THAT(fewer.landmarks(k), Each(Ne(RigidOutput::kUntouched)));
  }
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), FacesAt({2, 152}, 165), 165, &again), N3DS_OK);

  // An engine that had 101 from the beginning reports the same.
  const auto other = Engine::Ready();
  RigidOutput first(101), second(101);
  ASSERT_EQ(Process(*other, ImageOf(640, 480), FacesAt({0, 150}, 101), 101, &first), N3DS_OK);
  ASSERT_EQ(Process(*other, ImageOf(640, 480), FacesAt({1, 151}, 101), 101, &second), N3DS_OK);
  EXPECT_EQ(fewer.AllBits(), second.AllBits());
}

TEST(RigidFrame, AfterLatching101AFrameOf165LeavesZerosForTheOthers) {
  const auto engine = Engine::Ready();
  RigidOutput fewer(101), more(165);
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), FacesAt({0, 150}, 101), 101, &fewer), N3DS_OK);
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), FacesAt({1, 151}, 165), 165, &more), N3DS_OK);
  EXPECT_EQ(more.face_num(), 2u);
  for (size_t k = 0; k < 2; k++) {
    const std::vector<float> landmarks = more.landmarks(k);
    EXPECT_THAT(std::vector<float>(landmarks.begin(), landmarks.begin() + 303),
                Each(Ne(RigidOutput::kUntouched)));
    EXPECT_THAT(std::vector<float>(landmarks.begin() + 303, landmarks.end()), Each(0.0f));
  }
}

TEST(RigidFrame, FiveCrossingFacesKeepTheirTracks) {
  // Five people at different distances walk across each other's paths, listed in another order in
  // every frame. No pose may jump to another person's.
  const auto engine = Engine::Ready();
  Random random = TestRandom();
  std::vector<size_t> order = {0, 1, 2, 3, 4};
  for (int frame = 0; frame < 60; frame++) {
    HeadPlace places[5];
    for (size_t k = 0; k < 5; k++) {
      const double t = frame / 59.0;
      const double from = -240 + 120.0 * static_cast<double>(k);
      places[k].x = from + (-2 * from) * t;  // everyone ends where the one opposite began
      places[k].y = 40.0 * (static_cast<double>(k % 3) - 1);
      places[k].z = 600 + 120.0 * static_cast<double>(k);
      places[k].yaw = 0.1 * Wave(t + 0.2 * static_cast<double>(k));
    }
    std::swap(order[static_cast<size_t>(random.Int(0, 4))],
              order[static_cast<size_t>(random.Int(0, 4))]);
    Points points;
    for (const size_t person : order) {
      const Points face = ToPoints(DetectLandmarks(ModelShape(), places[person], 1280, 720));
      points.insert(points.end(), face.begin(), face.end());
    }
    RigidOutput out(101);
    ASSERT_EQ(Process(*engine, ImageOf(1280, 720), points, 101, &out), N3DS_OK);
    ASSERT_EQ(out.face_num(), 5u);
    for (size_t k = 0; k < 5; k++) {
      const HeadPlace& truth = places[order[k]];
      EXPECT_NEAR(out.face(k).modelMatrix[12], truth.x, 0.02 * truth.z) << frame;
      EXPECT_NEAR(out.face(k).modelMatrix[13], -truth.y, 0.02 * truth.z) << frame;
      EXPECT_NEAR(out.face(k).modelMatrix[14], 500 - truth.z, 0.04 * truth.z) << frame;
      // The sine of the turn about the upward axis, which runs against the camera's.
      EXPECT_NEAR(out.face(k).modelMatrix[8], -2 * truth.yaw, 0.08) << frame;
    }
  }
}

TEST(RigidFrame, AStillFaceSitsStill) {
  const auto engine = Engine::Ready();
  RigidOutput before(101), out(101);
  for (int frame = 0; frame < 30; frame++) {
    ASSERT_EQ(Process(*engine, ImageOf(640, 480), FaceAt(20), 101, frame < 29 ? &before : &out),
              N3DS_OK);
  }
  for (int i = 0; i < 16; i++) {
    EXPECT_NEAR(out.face(0).modelMatrix[i], before.face(0).modelMatrix[i], 0.02) << i;
  }
}

TEST(RigidFrame, EveryOutputIsFiniteOnMovingFaces) {
  const auto engine = Engine::Ready();
  for (const Points& frame : Scene(165, 600, 800)) {
    RigidOutput out(165);
    ASSERT_EQ(Process(*engine, ImageOf(600, 800), frame, 165, &out), N3DS_OK);
    for (size_t k = 0; k < 2; k++) {
      for (const float c : out.landmarks(k)) ASSERT_TRUE(std::isfinite(c));
      for (const float c : out.face(k).modelMatrix) ASSERT_TRUE(std::isfinite(c));
    }
  }
}

}  // namespace
}  // namespace n3ds::testing
