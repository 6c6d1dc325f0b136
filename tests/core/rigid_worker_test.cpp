// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <vector>

#include "core/face_workers.h"
#include "core/rigid_reference.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAreArray;

using Points = std::vector<int32_t>;
using Worker = void* (*)(void*);

// The model, once for all tests.
const TrackingContext& Model() {
  static const std::unique_ptr<Core> core = Core::Ready();
  return core->context();
}
const std::vector<float>& MeanShape() {
  static const std::vector<float> mean = MeanShapeFloats();
  return mean;
}

// One face on its way through the workers, without a driver.
class Face {
 public:
  Face(int width, int height)
      : camera(width, height), scale_(static_cast<float>(std::max(width, height)) / 640.0f) {}

  // Runs a frame; returns the landmarks as the worker leaves them.
  Points Run(Worker worker, const Points& landmarks, const Points& previous) {
    // Allocations of exactly the 95 points a worker may look at.
    const std::unique_ptr<int32_t[]> now(new int32_t[190]);
    const std::unique_ptr<int32_t[]> before(new int32_t[190]);
    std::copy_n(landmarks.begin(), 190, now.get());
    std::copy_n(previous.begin(), 190, before.get());
    RigidFaceTask task = {nullptr,
                          MeanShape().data(),
                          now.get(),
                          before.get(),
                          camera.k,
                          scale_,
                          &result,
                          pose,
                          pose_ref,
                          identity,
                          expression,
                          track_state,
                          shape.data(),
                          contour_state,
                          contour,
                          Model().meanShape,
                          Model().identityBasis,
                          Model().expressionBasis,
                          Model().tensor,
                          &flag,
                          refit_limit,
                          &given_up};
    EXPECT_EQ(worker(&task), nullptr);
    return {now.get(), now.get() + 190};
  }
  Points RunFull(const Points& landmarks, const Points& previous) {
    return Run(_Build3DFaceForVideo_Rigid_Thread, landmarks, previous);
  }
  Points RunFast(const Points& landmarks) {
    return Run(_Build3DFaceForVideo_Rigid_Thread_Acce, landmarks, Points(190, 0));
  }

  void ExpectIs(const ReferenceRigidFace& other, int frame) const {
    ASSERT_EQ(Bits(pose), Bits(other.pose)) << frame;
    ASSERT_EQ(Bits(pose_ref), Bits(other.pose_ref)) << frame;
    ASSERT_EQ(Bits(identity), Bits(other.identity)) << frame;
    ASSERT_EQ(Bits(expression), Bits(other.expression)) << frame;
    ASSERT_EQ(Bits(shape), Bits(other.shape)) << frame;
    ASSERT_THAT(contour, ElementsAreArray(other.contour)) << frame;
    ASSERT_EQ(Bits(result.modelMatrix), Bits(other.model_view)) << frame;
    ASSERT_EQ(Bits(result.projectionMatrix), Bits(other.projection)) << frame;
    ASSERT_EQ(flag, other.flag) << frame;
  }

  Camera camera;
  N3DS_RIGID_MATRIX result = {};
  float pose[7] = {};
  float pose_ref[7] = {};
  float identity[16] = {};
  float expression[20] = {};
  uint64_t track_state[80] = {};
  std::vector<float> shape = std::vector<float>(kShapeSize, 0.0f);
  float contour_state[57] = {};
  int32_t contour[19] = {};
  int32_t flag = 0;
  uint32_t refit_limit = 0;
  int32_t given_up = -1;

 private:
  float scale_;
};

Points Frontal(int width = 640, int height = 480) {
  return DetectLandmarks(ModelShape(), HeadPlace{}, width, height);
}

Points First95(const Points& landmarks) { return {landmarks.begin(), landmarks.begin() + 190}; }

// A head that looks straight into the camera with its mouth shut, so that all three flags allow the
// identity refit: the model's own landmarks, corrected where the mean face misses a threshold.
Points ShutMouth() {
  Points landmarks = Frontal();
  for (const size_t k : {89, 93}) {
    landmarks[2 * k] = (landmarks[2 * 75] + landmarks[2 * 81]) / 2;
    landmarks[2 * k + 1] = (landmarks[2 * 75 + 1] + landmarks[2 * 81 + 1]) / 2;
  }
  return landmarks;
}
Points OpenMouth() {
  Points landmarks = ShutMouth();
  landmarks[2 * 93 + 1] += 30;
  return landmarks;
}

PoseWeights WeightsOf(const Points& landmarks) {
  PoseWeights weights;
  ComputePoseWeights(landmarks.data(), &weights);
  return weights;
}

TEST(RigidWorkers, ANewFaceIsFittedAndItsFlagSet) {
  for (const Worker worker :
       {_Build3DFaceForVideo_Rigid_Thread, _Build3DFaceForVideo_Rigid_Thread_Acce}) {
    Face face(640, 480);
    face.Run(worker, Frontal(), Points(190, 0));
    EXPECT_EQ(face.flag, 1);
    EXPECT_NEAR(face.pose[6], 600, 12);
    EXPECT_EQ(Bits(face.pose_ref), Bits(face.pose));
    EXPECT_EQ(Bits(face.shape), Bits(MeanShape()));
    // Frontal: the upright head's axes are the camera's with y and z turned over.
    const float* m = face.result.modelMatrix;
    EXPECT_NEAR(m[0], 1, 0.02);
    EXPECT_NEAR(m[5], 1, 0.02);
    EXPECT_NEAR(m[10], 1, 0.02);
    EXPECT_NEAR(m[14], -600, 12);
  }
}

TEST(RigidWorkers, ANewFaceIgnoresWhateverPoseItsSlotHas) {
  Face face(640, 480), other(640, 480);
  std::fill_n(other.pose, 7, 1e30f);
  std::fill_n(other.contour, 19, 3);
  face.RunFull(Frontal(), Points(190, 0));
  other.RunFull(Frontal(), Points(190, 77));
  EXPECT_EQ(Bits(face.pose), Bits(other.pose));
  EXPECT_THAT(other.contour, ElementsAreArray(face.contour));
}

TEST(RigidWorkers, ANewFacesLandmarksAreNotSmoothed) {
  Face face(640, 480);
  EXPECT_EQ(face.RunFull(Frontal(), Points(190, 77)), First95(Frontal()));
}

TEST(FullRigidWorker, ANewFacesCoefficientsAreZeroed) {
  Face face(640, 480);
  std::fill_n(face.identity, 16, 3.0f);
  std::fill_n(face.expression, 20, 3.0f);
  face.RunFull(Frontal(), Points(190, 0));
  EXPECT_THAT(face.identity, Each(0.0f));
  EXPECT_THAT(face.expression, Each(0.0f));
}

TEST(FullRigidWorker, TheFlagCountsTheFrames) {
  Face face(640, 480);
  for (int frame = 1; frame <= 5; frame++) {
    face.RunFull(Frontal(), Frontal());
    EXPECT_EQ(face.flag, frame);
  }
}

TEST(FullRigidWorker, TheFlagWrapsWithoutHarm) {
  Face face(640, 480);
  face.RunFull(Frontal(), Frontal());
  face.flag = INT32_MAX;
  face.RunFull(Frontal(), Frontal());
  EXPECT_EQ(face.flag, INT32_MIN);
  face.RunFull(Frontal(), Frontal());
  EXPECT_EQ(face.flag, INT32_MIN + 1);
}

TEST(FastRigidWorker, TheFlagStaysAtOneAndCoefficientsAreLeftAlone) {
  Face face(640, 480);
  std::fill_n(face.identity, 16, 3.0f);
  std::fill_n(face.expression, 20, 4.0f);
  for (int frame = 0; frame < 3; frame++) {
    face.RunFast(ShutMouth());
    EXPECT_EQ(face.flag, 1);
  }
  EXPECT_THAT(face.identity, Each(3.0f));
  EXPECT_THAT(face.expression, Each(4.0f));
}

TEST(FastRigidWorker, ATrackCountedByTheFullWorkerKeepsItsCount) {
  Face face(640, 480);
  for (int frame = 0; frame < 4; frame++) face.RunFull(Frontal(), Frontal());
  face.RunFast(Frontal());
  EXPECT_EQ(face.flag, 4);
}

TEST(FastRigidWorker, NeitherLandmarksNorPoseAreSmoothed) {
  Face face(640, 480);
  face.RunFast(Frontal());
  HeadPlace place;
  place.x = 30;
  const Points moved = DetectLandmarks(ModelShape(), place, 640, 480);
  EXPECT_EQ(face.RunFast(moved), First95(moved));
  EXPECT_NEAR(face.pose[4], 30, 2);
}

TEST(FullRigidWorker, AStillFaceKeepsSevenTenthsOfItsLandmarks) {
  // The sum of the steady points' moves is 0; only landmark 20 moves.
  Face face(640, 480);
  const Points before = Frontal();
  face.RunFull(before, before);
  Points now = before;
  now[40] += 10;
  const Points smoothed = face.RunFull(now, before);
  const float a = 0.7f, b = 1.0f - 0.7f;
  EXPECT_EQ(smoothed[40], static_cast<int32_t>(a * static_cast<float>(before[40]) +
                                               b * static_cast<float>(now[40])));
  EXPECT_GT(smoothed[40], before[40]);
  EXPECT_LT(smoothed[40], before[40] + 5);
}

TEST(FullRigidWorker, AFaceThatJumpsIsTakenUnsmoothed) {
  Face face(640, 480);
  const Points before = Frontal();
  face.RunFull(before, before);
  Points now = before;
  for (size_t i = 0; i < now.size(); i += 2) now[i] += 200;
  // Eight points by 200 pixels are far more than the face's width.
  EXPECT_EQ(face.RunFull(now, before), First95(now));
}

TEST(FullRigidWorker, AnOpenMouthKeepsTheIdentityAndRefitsTheExpression) {
  ASSERT_EQ(WeightsOf(OpenMouth()).mouth_open, 1);
  Face face(640, 480);
  face.RunFull(OpenMouth(), OpenMouth());
  std::fill_n(face.identity, 16, 0.25f);
  face.RunFull(OpenMouth(), OpenMouth());
  EXPECT_THAT(face.identity, Each(0.25f));
  EXPECT_THAT(face.expression, Each(::testing::Ne(0.0f)));
}

TEST(FullRigidWorker, AShutFrontalFaceRefitsTheIdentity) {
  const PoseWeights weights = WeightsOf(ShutMouth());
  ASSERT_EQ(weights.mouth_open, 0);
  ASSERT_EQ(weights.frontal, 1);
  ASSERT_EQ(weights.weighting_switch, 1);
  Face face(640, 480);
  face.RunFull(ShutMouth(), ShutMouth());
  std::fill_n(face.identity, 16, 0.25f);
  face.RunFull(ShutMouth(), ShutMouth());
  EXPECT_THAT(face.identity, Each(::testing::Ne(0.25f)));
}

TEST(FullRigidWorker, ATurnedFaceKeepsTheIdentity) {
  HeadPlace place;
  place.yaw = 0.25;
  Points turned = DetectLandmarks(ModelShape(), place, 640, 480);
  for (const size_t k : {89, 93}) {
    turned[2 * k] = turned[2 * 75];
    turned[2 * k + 1] = turned[2 * 75 + 1];
  }
  const PoseWeights weights = WeightsOf(turned);
  ASSERT_EQ(weights.mouth_open, 0);
  ASSERT_EQ(weights.frontal & weights.weighting_switch, 0);
  Face face(640, 480);
  face.RunFull(turned, turned);
  std::fill_n(face.identity, 16, 0.25f);
  face.RunFull(turned, turned);
  EXPECT_THAT(face.identity, Each(0.25f));
}

// Frames of one person through worker and reference.
struct Totals {
  int frames = 0;
  ReferenceRigidFace::Events events;
};
void CompareSequence(int width, int height, int frames, int noise, bool fast_at_times,
                     Person* person, Totals* totals) {
  Face face(width, height);
  ReferenceRigidFace reference;
  const float scale = static_cast<float>(std::max(width, height)) / 640.0f;
  Points previous(202, 0);
  for (int frame = 0; frame < frames; frame++) {
    const Points landmarks = person->Detect(frame, width, height, 101, noise);
    if (fast_at_times && frame % 7 >= 4) {
      face.RunFast(landmarks);
      reference.RunFast(face.camera.k, landmarks, &totals->events);
    } else {
      const Points smoothed = face.RunFull(landmarks, previous);
      Points expected = landmarks;
      reference.RunFull(Model(), face.camera.k, scale, previous, &expected, &totals->events);
      ASSERT_EQ(smoothed, First95(expected)) << frame;
    }
    face.ExpectIs(reference, frame);
    if (::testing::Test::HasFatalFailure()) return;
    previous = landmarks;
    totals->frames++;
  }
}

TEST(RigidWorkers, MatchTheStraightforwardVersionOnMovingFaces) {
  Totals totals;
  for (uint64_t seed = 0; seed < 6; seed++) {
    Person person = Person(seed);
    const int width = seed % 2 == 0 ? 640 : 1081;
    ASSERT_NO_FATAL_FAILURE(CompareSequence(width, 720, 40, 1, seed % 3 == 2, &person, &totals));
  }
  EXPECT_EQ(totals.frames, 240);
}

TEST(RigidWorkers, MatchTheStraightforwardVersionOnJumpyLandmarks) {
  Totals totals;
  Person person(11);
  ASSERT_NO_FATAL_FAILURE(CompareSequence(640, 480, 60, 25, false, &person, &totals));
  EXPECT_GT(totals.events.taken_unsmoothed, 0);
}

TEST(RigidWorkers, FailedFitsAreRepeatedWithLandmarksMovedByOnePixel) {
  // In an image of a few pixels the normal equations often lose their rank, until the landmarks
  // move. The repeats have no bound, and with the shipped model seed 6 never gets out of them.
  Totals totals;
  for (uint64_t seed = 7; seed < 19; seed++) {
    Person person(seed);
    const int size = 3 + static_cast<int>(seed % 4);
    ASSERT_NO_FATAL_FAILURE(CompareSequence(size, size, 10, 0, seed % 2 == 0, &person, &totals));
  }
  EXPECT_GT(totals.events.retries, 20);
}

TEST(RigidWorkers, MatchTheStraightforwardVersionWhereTheIdentityIsRefitted) {
  Totals totals;
  Face face(640, 480);
  ReferenceRigidFace reference;
  Random random = TestRandom();
  Points previous(202, 0);
  for (int frame = 0; frame < 30; frame++) {
    Points landmarks = frame % 10 == 9 ? OpenMouth() : ShutMouth();
    for (int32_t& c : landmarks) c += random.Int(-1, 1);
    face.RunFull(landmarks, previous);
    Points expected = landmarks;
    reference.RunFull(Model(), face.camera.k, 1.0f, previous, &expected, &totals.events);
    ASSERT_NO_FATAL_FAILURE(face.ExpectIs(reference, frame));
    previous = landmarks;
  }
  EXPECT_GT(totals.events.identity_refits, 10);
  EXPECT_LT(totals.events.identity_refits, 29);
}

}  // namespace
}  // namespace n3ds::testing
