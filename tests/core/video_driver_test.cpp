// SPDX-License-Identifier: MIT
// The rigid driver, and what both drivers share.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <vector>

#include "core/face_matching.h"
#include "core/rigid_reference.h"
#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;

using Points = std::vector<int32_t>;
using Frame = std::vector<Points>;
using Driver = MRESULT (*)(void*, const NSVL_OFFSCREEN*, N3DS_LANDMARK*, int32_t);

constexpr Driver kDrivers[] = {N3DS_Build3DFaceForVideo_Rigid, N3DS_Build3DFaceForVideo_Mask};

Points FaceAt(double x, int count = 101) {
  HeadPlace place;
  place.x = x;
  return DetectLandmarks(ModelShape(), place, 640, 480, count);
}
Frame FacesAt(const std::vector<double>& places, int count = 101) {
  Frame frame;
  for (const double x : places) frame.push_back(FaceAt(x, count));
  return frame;
}

MRESULT Track(const Core& core, const Frame& frame, int width = 640, int height = 480,
              Driver driver = N3DS_Build3DFaceForVideo_Rigid) {
  FaceRecords records(frame);
  const NSVL_OFFSCREEN image = ImageOf(width, height);
  return driver(core.handle(), &image, records.get(), records.count());
}

// A copy of everything a context holds.
struct Snapshot {
  std::vector<unsigned char> bytes;
  Points history;
  explicit Snapshot(const TrackingContext& context)
      : bytes(reinterpret_cast<const unsigned char*>(&context),
              reinterpret_cast<const unsigned char*>(&context + 1)) {
    if (context.landmarkHistory != nullptr) {
      history.assign(context.landmarkHistory,
                     context.landmarkHistory + size_t{2 * kSlotCount} * context.landmarkNum);
    }
  }
  bool operator==(const Snapshot& other) const {
    return bytes == other.bytes && history == other.history;
  }
};

TEST(Drivers, NullCoreAndNullImageAreRefused) {
  const auto core = Core::Ready();
  FaceRecords records(FacesAt({0}));
  const NSVL_OFFSCREEN image = ImageOf(640, 480);
  const NSVL_OFFSCREEN bad = ImageOf(0, 0);
  for (const Driver driver : kDrivers) {
    EXPECT_EQ(driver(nullptr, &image, records.get(), 1), N3DS_NULL_ARGUMENT);
    EXPECT_EQ(driver(core->handle(), nullptr, records.get(), 1), N3DS_NULL_ARGUMENT);
    EXPECT_EQ(driver(core->handle(), nullptr, records.get(), 0), N3DS_NULL_ARGUMENT);
    EXPECT_EQ(driver(nullptr, &bad, records.get(), 9), N3DS_NULL_ARGUMENT);
  }
}

TEST(Drivers, AImageWithoutPixelsIsRefused) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, FacesAt({0}), 640, 480, driver), N3DS_OK);
    const Snapshot before(core->context());
    for (const auto& [width, height] :
         {std::make_pair(0, 480), {640, 0}, {-1, 480}, {640, -1}, {INT32_MIN, INT32_MIN}}) {
      EXPECT_EQ(Track(*core, FacesAt({0}), width, height, driver), N3DS_BAD_VALUE);
      EXPECT_EQ(Track(*core, {}, width, height, driver), N3DS_BAD_VALUE);
    }
    EXPECT_EQ(Snapshot(core->context()), before);
  }
}

TEST(Drivers, SixFacesAreRefusedWithoutAnyChange) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, FacesAt({0}), 640, 480, driver), N3DS_OK);
    const Snapshot before(core->context());
    EXPECT_EQ(Track(*core, FacesAt({0, 1, 2, 3, 4, 5}), 640, 480, driver), N3DS_BAD_VALUE);
    const NSVL_OFFSCREEN image = ImageOf(640, 480);
    EXPECT_EQ(driver(core->handle(), &image, nullptr, 6), N3DS_BAD_VALUE);
    EXPECT_EQ(driver(core->handle(), &image, nullptr, INT32_MAX), N3DS_BAD_VALUE);
    EXPECT_EQ(Snapshot(core->context()), before);
  }
}

TEST(Drivers, ANegativeFaceCountIsRefused) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    FaceRecords records(FacesAt({0}));
    const NSVL_OFFSCREEN image = ImageOf(640, 480);
    EXPECT_EQ(driver(core->handle(), &image, records.get(), -1), N3DS_BAD_VALUE);
    EXPECT_EQ(driver(core->handle(), &image, records.get(), INT32_MIN), N3DS_BAD_VALUE);
  }
}

TEST(Drivers, NullFacesOrPointsAreRefused) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    FaceRecords records(FacesAt({0, 100}));
    const NSVL_OFFSCREEN image = ImageOf(640, 480);
    EXPECT_EQ(driver(core->handle(), &image, nullptr, 1), N3DS_NULL_ARGUMENT);
    int32_t* points = records[1].points;
    records[1].points = nullptr;
    EXPECT_EQ(driver(core->handle(), &image, records.get(), 2), N3DS_NULL_ARGUMENT);
    EXPECT_EQ(core->context().landmarkNum, 0u);
    records[1].points = points;
    EXPECT_EQ(driver(core->handle(), &image, records.get(), 2), N3DS_OK);
  }
}

TEST(Drivers, ACoreWithoutAModelRefusesFacesAndAcceptsEmptyFrames) {
  for (const Driver driver : kDrivers) {
    const Core core;
    EXPECT_EQ(Track(core, FacesAt({0}), 640, 480, driver), N3DS_NULL_ARGUMENT);
    EXPECT_EQ(Track(core, {}, 640, 480, driver), N3DS_OK);
  }
}

TEST(Drivers, LandmarkCountsMustBe101Or165AndAlike) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    const Snapshot before(core->context());
    for (const size_t count : {0, 1, 95, 100, 102, 164, 166, 1000}) {
      EXPECT_EQ(Track(*core, {Points(2 * count + 1, 0)}, 640, 480, driver), N3DS_BAD_VALUE)
          << count;
    }
    EXPECT_EQ(Track(*core, {FaceAt(0, 101), FaceAt(100, 165)}, 640, 480, driver), N3DS_BAD_VALUE);
    EXPECT_EQ(Track(*core, {FaceAt(0, 165), FaceAt(100, 101)}, 640, 480, driver), N3DS_BAD_VALUE);
    EXPECT_EQ(Track(*core, {FaceAt(0), FaceAt(100), FaceAt(200, 165)}, 640, 480, driver),
              N3DS_BAD_VALUE);
    EXPECT_EQ(Snapshot(core->context()), before);
    EXPECT_EQ(N3DS_Get3DLandmarkNum(core->handle()), 0);
  }
}

TEST(Drivers, TheFirstFrameWithAFaceLatchesTheLandmarkCount) {
  for (const Driver driver : kDrivers) {
    for (const int count : {101, 165}) {
      const auto core = Core::Ready();
      EXPECT_EQ(Track(*core, {}, 640, 480, driver), N3DS_OK);
      EXPECT_EQ(core->context().landmarkNum, 0u);
      ASSERT_EQ(Track(*core, FacesAt({0}, count), 640, 480, driver), N3DS_OK);
      EXPECT_EQ(N3DS_Get3DLandmarkNum(core->handle()), count);
      ASSERT_EQ(Track(*core, FacesAt({0}, 266 - count), 640, 480, driver), N3DS_OK);
      EXPECT_EQ(N3DS_Get3DLandmarkNum(core->handle()), count);
      ASSERT_EQ(Track(*core, {}, 640, 480, driver), N3DS_OK);
      EXPECT_EQ(N3DS_Get3DLandmarkNum(core->handle()), count);
    }
  }
}

TEST(Drivers, FewerLandmarksThanLatchedAreFilledWithZeros) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, FacesAt({0, 150}, 165), 640, 480, driver), N3DS_OK);
    const Frame frame = FacesAt({1, 151}, 101);
    ASSERT_EQ(Track(*core, frame, 640, 480, driver), N3DS_OK);
    for (size_t k = 0; k < 2; k++) {
      const int32_t* kept = core->context().landmarkHistory + k * 330;
      EXPECT_THAT(Points(kept, kept + 202), ElementsAreArray(frame[k]));
      EXPECT_THAT(Points(kept + 202, kept + 330), Each(0));
    }
    ASSERT_EQ(Track(*core, FacesAt({1, 151}, 165), 640, 480, driver), N3DS_OK);
    EXPECT_EQ(core->context().trackFlag[0] != 0, true);
  }
}

TEST(Drivers, MoreLandmarksThanLatchedAreCutOff) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, FacesAt({0, 150}, 101), 640, 480, driver), N3DS_OK);
    const Frame frame = FacesAt({1, 151}, 165);
    ASSERT_EQ(Track(*core, frame, 640, 480, driver), N3DS_OK);
    for (size_t k = 0; k < 2; k++) {
      const int32_t* kept = core->context().landmarkHistory + k * 202;
      EXPECT_THAT(Points(kept, kept + 202),
                  ElementsAreArray(Points(frame[k].begin(), frame[k].begin() + 202)));
    }
  }
}

TEST(Drivers, TheCountDoesNotChangeTheFit) {
  const auto a = Core::Ready(), b = Core::Ready();
  for (int frame = 0; frame < 3; frame++) {
    ASSERT_EQ(Track(*a, FacesAt({2.0 * frame}, 101)), N3DS_OK);
    ASSERT_EQ(Track(*b, FacesAt({2.0 * frame}, frame == 1 ? 101 : 165)), N3DS_OK);
  }
  EXPECT_EQ(Bits(a->context().pose[0]), Bits(b->context().pose[0]));
}

TEST(Drivers, LandmarksAreKeptAsTheyArrived) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, FacesAt({0}), 640, 480, driver), N3DS_OK);
    // The second frame is smoothed in the caller's record, but not in the history.
    const Points arrived = FaceAt(9);
    FaceRecords records({arrived});
    const NSVL_OFFSCREEN image = ImageOf(640, 480);
    ASSERT_EQ(driver(core->handle(), &image, records.get(), 1), N3DS_OK);
    EXPECT_NE(records.points(0), arrived);
    EXPECT_EQ(Points(core->context().landmarkHistory, core->context().landmarkHistory + 202),
              arrived);
    // Only the 95 that the fit uses are smoothed.
    const Points smoothed = records.points(0);
    EXPECT_THAT(Points(smoothed.begin() + 190, smoothed.end()),
                ElementsAreArray(Points(arrived.begin() + 190, arrived.end())));
  }
}

TEST(Drivers, CameraHasItsCentreInTheImageAndTheMeanOfTheSidesAsFocalLength) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, FacesAt({0}), 640, 480, driver), N3DS_OK);
    EXPECT_THAT(core->context().camera, ElementsAre(560, 0, 320, 0, 560, 240, 0, 0, 1));
    // Odd sides give halves.
    ASSERT_EQ(Track(*core, FacesAt({0}), 641, 480, driver), N3DS_OK);
    EXPECT_THAT(core->context().camera, ElementsAre(560.5, 0, 320.5, 0, 560.5, 240, 0, 0, 1));
    ASSERT_EQ(Track(*core, FacesAt({0}), 641, 483, driver), N3DS_OK);
    EXPECT_THAT(core->context().camera, ElementsAre(562, 0, 320.5, 0, 562, 241.5, 0, 0, 1));
  }
}

TEST(Drivers, AnEmptyFrameEndsAllTracks) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    const Frame frame = FacesAt({-150, 0, 150});
    for (int i = 0; i < 3; i++) ASSERT_EQ(Track(*core, frame, 640, 480, driver), N3DS_OK);
    TrackingContext& context = core->context();
    // Slots beyond the last frame's faces are cleared as well.
    context.trackFlag[4] = 9;
    context.identityCoef[4][3] = 9;
    context.trackState[4][79] = 9;
    context.expressionCoef[0][19] = 9;
    ASSERT_EQ(Track(*core, {}, 640, 480, driver), N3DS_OK);
    EXPECT_EQ(context.faceNum, 0u);
    EXPECT_THAT(context.trackFlag, Each(0));
    for (int slot = 0; slot < kSlotCount; slot++) {
      EXPECT_THAT(context.identityCoef[slot], Each(0.0f));
      EXPECT_THAT(context.expressionCoef[slot], Each(0.0f));
      EXPECT_THAT(context.trackState[slot], Each(0u));
    }
    // The next face starts afresh, as on a new core.
    ASSERT_EQ(Track(*core, FacesAt({20}), 640, 480, driver), N3DS_OK);
    const auto other = Core::Ready();
    ASSERT_EQ(Track(*other, FacesAt({20}), 640, 480, driver), N3DS_OK);
    EXPECT_EQ(Bits(context.pose[0]), Bits(other->context().pose[0]));
    EXPECT_EQ(Bits(context.identityCoef[0]), Bits(other->context().identityCoef[0]));
    EXPECT_EQ(context.trackFlag[0], 1);
  }
}

TEST(RigidDriver, OneToThreeFacesAreTrackedByTheFullWorkerFourAndFiveByTheFastOne) {
  for (size_t faces = 1; faces <= 5; faces++) {
    const auto core = Core::Ready();
    Frame frame = FacesAt({-200, -100, 0, 100, 200});
    frame.resize(faces);
    for (int i = 0; i < 3; i++) ASSERT_EQ(Track(*core, frame), N3DS_OK);
    for (size_t k = 0; k < faces; k++) {
      // The full worker counts frames and refits the expression; the fast one does neither.
      const TrackingContext& context = core->context();
      EXPECT_EQ(context.trackFlag[k], faces <= 3 ? 3 : 1) << faces;
      if (faces <= 3) {
        EXPECT_THAT(context.expressionCoef[k], Each(::testing::Ne(0.0f)));
      } else {
        EXPECT_THAT(context.expressionCoef[k], Each(0.0f));
      }
    }
    EXPECT_EQ(core->context().faceNum, faces);
  }
}

TEST(RigidDriver, OfTwoFacesTheNearerInheritsTheTrackAndTheOtherStartsFromZero) {
  const auto core = Core::Ready();
  for (int i = 0; i < 4; i++) ASSERT_EQ(Track(*core, FacesAt({100})), N3DS_OK);
  ASSERT_EQ(core->context().trackFlag[0], 4);
  const auto identity = Bits(core->context().expressionCoef[0]);
  ASSERT_EQ(Track(*core, FacesAt({-100, 102})), N3DS_OK);
  EXPECT_EQ(core->context().trackFlag[0], 1);
  EXPECT_EQ(core->context().trackFlag[1], 5);
  EXPECT_THAT(core->context().expressionCoef[0], Each(0.0f));
  EXPECT_THAT(core->context().expressionCoef[1], Each(::testing::Ne(0.0f)));
}

TEST(RigidDriver, ASingleFaceInheritsTheNearerOfTwoTracks) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, FacesAt({100})), N3DS_OK);
  ASSERT_EQ(Track(*core, FacesAt({-100, 100})), N3DS_OK);
  ASSERT_EQ(Track(*core, FacesAt({-100, 100})), N3DS_OK);
  ASSERT_THAT(core->context().trackFlag[0], 2);
  ASSERT_THAT(core->context().trackFlag[1], 3);
  ASSERT_EQ(Track(*core, FacesAt({98})), N3DS_OK);
  EXPECT_EQ(core->context().trackFlag[0], 4);
}

TEST(RigidDriver, TracksFollowFacesThatChangePlaces) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, FacesAt({-100})), N3DS_OK);
  ASSERT_EQ(Track(*core, FacesAt({-100, 100})), N3DS_OK);
  ASSERT_EQ(core->context().trackFlag[0], 2);
  ASSERT_EQ(core->context().trackFlag[1], 1);
  ASSERT_EQ(Track(*core, FacesAt({100, -100})), N3DS_OK);
  EXPECT_EQ(core->context().trackFlag[0], 2);
  EXPECT_EQ(core->context().trackFlag[1], 3);
}

TEST(RigidDriver, TwoFacesMayContinueTheSameTrack) {
  const auto core = Core::Ready();
  for (int i = 0; i < 4; i++) ASSERT_EQ(Track(*core, FacesAt({-300, 100})), N3DS_OK);
  ASSERT_EQ(Track(*core, FacesAt({98, 102})), N3DS_OK);
  EXPECT_EQ(core->context().trackFlag[0], 5);
  EXPECT_EQ(core->context().trackFlag[1], 5);
}

// The whole rigid driver once more: matching and workers as written down in the references.
class ReferenceTracker {
 public:
  explicit ReferenceTracker(const TrackingContext& model) : model_(model), faces_(5) {}

  // Runs a frame; leaves the smoothed landmarks in it.
  void Run(Frame* frame, int width, int height) {
    const size_t count = frame->size();
    if (count == 0) {
      faces_count_ = 0;
      for (ReferenceRigidFace& face : faces_) {
        face.flag = 0;
        face.identity.assign(16, 0.0f);
        face.expression.assign(20, 0.0f);
      }
      return;
    }
    Points now;
    for (const Points& points : *frame) now.insert(now.end(), points.begin(), points.end());
    const size_t stride = (*frame)[0].size();
    history_.resize(5 * stride, 0);
    FaceAssignment assignment;
    EXPECT_EQ(AssignFaces(now.data(), static_cast<uint32_t>(count), history_.data(),
                          static_cast<uint32_t>(faces_count_), static_cast<uint32_t>(stride / 2),
                          &assignment),
              N3DS_OK);
    const int32_t* assigned = assignment.previous;

    const std::vector<ReferenceRigidFace> before = faces_;
    std::vector<Points> previous(count, Points(stride, 0));
    for (size_t j = 0; j < count; j++) {
      ReferenceRigidFace& face = faces_[j];
      if (assigned[j] < 0) {
        face.pose.assign(7, 0.0f);
        face.identity.assign(16, 0.0f);
        face.expression.assign(20, 0.0f);
        face.flag = 0;
        continue;
      }
      const auto p = static_cast<size_t>(assigned[j]);
      face = before[p];
      face.model_view = before[j].model_view;  // the results belong to the place in the frame
      face.projection = before[j].projection;
      std::copy_n(&history_[p * stride], stride, previous[j].begin());
    }
    history_ = now;
    faces_count_ = count;

    const Camera camera(width, height);
    const float scale = static_cast<float>(std::max(width, height)) / 640.0f;
    for (size_t j = 0; j < count; j++) {
      if (count >= 4) {
        faces_[j].RunFast(camera.k, (*frame)[j], &events);
      } else {
        faces_[j].RunFull(model_, camera.k, scale, previous[j], &(*frame)[j], &events);
      }
    }
  }
  const ReferenceRigidFace& face(size_t k) const { return faces_[k]; }

  ReferenceRigidFace::Events events;

 private:
  const TrackingContext& model_;
  std::vector<ReferenceRigidFace> faces_;
  size_t faces_count_ = 0;
  Points history_;
};

void ExpectSame(const TrackingContext& context, const ReferenceTracker& tracker, int frame) {
  for (size_t k = 0; k < 5; k++) {
    const ReferenceRigidFace& face = tracker.face(k);
    ASSERT_EQ(context.trackFlag[k], face.flag) << frame << ", slot " << k;
    ASSERT_EQ(Bits(context.pose[k]), Bits(face.pose)) << frame << ", slot " << k;
    ASSERT_EQ(Bits(context.poseRef[k]), Bits(face.pose_ref)) << frame << ", slot " << k;
    ASSERT_EQ(Bits(context.identityCoef[k]), Bits(face.identity)) << frame << ", slot " << k;
    ASSERT_EQ(Bits(context.expressionCoef[k]), Bits(face.expression)) << frame << ", slot " << k;
    ASSERT_EQ(Bits(context.shape[k]), Bits(face.shape)) << frame << ", slot " << k;
    ASSERT_THAT(context.fitState[k], ElementsAreArray(face.contour)) << frame << ", slot " << k;
    ASSERT_EQ(Bits(context.rigidResult[k].modelMatrix), Bits(face.model_view)) << frame;
    ASSERT_EQ(Bits(context.rigidResult[k].projectionMatrix), Bits(face.projection)) << frame;
  }
}

// People come, go and change their order in the list, `most` at once.
void CompareWithReference(uint64_t seed, int frames, int most, int landmark_count, int width,
                          int height, ReferenceTracker* tracker, const Core& core) {
  Random random(seed);
  std::vector<Person> people;
  for (int k = 0; k < most; k++) {
    people.push_back(
        Person(seed + static_cast<uint64_t>(k)).At(110.0 * (k - 2), 10.0 * k, 600 + 60 * k));
  }
  std::vector<int> present = {0};
  for (int i = 0; i < frames; i++) {
    if (random.Int(0, 5) == 0) {
      present.clear();
      for (int k = 0; k < most; k++) {
        if (random.Int(0, 3) > 0) present.push_back(k);
      }
    }
    for (size_t k = present.size(); k > 1 && random.Int(0, 2) == 0; k--) {
      std::swap(present[k - 1],
                present[static_cast<size_t>(random.Int(0, static_cast<int>(k) - 1))]);
    }
    Frame frame;
    for (const int k : present) {
      frame.push_back(people[static_cast<size_t>(k)].Detect(i, width, height, landmark_count, 1));
    }
    FaceRecords records(frame);
    const NSVL_OFFSCREEN image = ImageOf(width, height);
    ASSERT_EQ(N3DS_Build3DFaceForVideo_Rigid(core.handle(), &image, records.get(), records.count()),
              N3DS_OK);
    tracker->Run(&frame, width, height);
    ASSERT_NO_FATAL_FAILURE(ExpectSame(core.context(), *tracker, i));
    for (size_t k = 0; k < frame.size(); k++) ASSERT_EQ(records.points(k), frame[k]) << i;
  }
}

TEST(RigidDriver, MatchesTheStraightforwardVersionOnPeopleWhoComeAndGo) {
  for (const uint64_t seed : {1, 2, 3}) {
    const auto core = Core::Ready();
    ReferenceTracker tracker(core->context());
    CompareWithReference(seed, 60, static_cast<int>(seed) + 2, seed == 2 ? 165 : 101, 1280, 720,
                         &tracker, *core);
    if (HasFatalFailure()) return;
  }
}

TEST(RigidDriver, MatchesTheStraightforwardVersionWhereFitsFail) {
  // An image of a few pixels: fits fail and are repeated.
  const auto core = Core::Ready();
  ReferenceTracker tracker(core->context());
  CompareWithReference(5, 30, 5, 101, 5, 4, &tracker, *core);
  EXPECT_GT(tracker.events.retries, 20);
}

TEST(RigidDriver, TheImageMayChangeItsSizeBetweenFrames) {
  const auto core = Core::Ready();
  ReferenceTracker tracker(core->context());
  for (int i = 0; i < 6; i++) {
    const int width = i % 2 == 0 ? 640 : 480;
    Frame frame = {DetectLandmarks(ModelShape(), HeadPlace{}, width, 1120 - width)};
    ASSERT_EQ(Track(*core, frame, width, 1120 - width), N3DS_OK);
    tracker.Run(&frame, width, 1120 - width);
    ASSERT_NO_FATAL_FAILURE(ExpectSame(core->context(), tracker, i));
  }
}

TEST(Drivers, CoordinatesAtTheEndsOfTheRangeAreHarmless) {
  Random random = TestRandom();
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    for (int i = 0; i < 10; i++) {
      Frame frame(3, Points(202));
      for (Points& points : frame) {
        for (int32_t& c : points) c = random.Int(INT32_MIN, INT32_MAX);
      }
      ASSERT_EQ(Track(*core, frame, 640, 480, driver), N3DS_OK);
    }
  }
}

TEST(Drivers, TheImagesPixelsAreNotTouched) {
  for (const Driver driver : kDrivers) {
    const auto core = Core::Ready();
    FaceRecords records(FacesAt({0}));
    NSVL_OFFSCREEN image = ImageOf(640, 480);
    image.pixelFormat = 12345;
    for (int i = 0; i < 4; i++) {
      image.plane[i] = reinterpret_cast<uint8_t*>(uintptr_t{1});
      image.pitch[i] = -1;
    }
    EXPECT_EQ(driver(core->handle(), &image, records.get(), 1), N3DS_OK);
  }
}

}  // namespace
}  // namespace n3ds::testing
