// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <vector>

#include "core/contour_correspondence.h"
#include "core/dense_model.h"
#include "core/face_workers.h"
#include "core/model_tables.h"
#include "core/pose_fitting.h"
#include "core/pose_weights.h"
#include "core/shape_fitting.h"
#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"
#include "support/test_random.h"
namespace n3ds::testing {

namespace {

using Points = std::vector<int32_t>;

constexpr int kWidth = 1280, kHeight = 720;
constexpr float kScale = 2.0f;

// The model, once for all tests.
const TrackingContext& Model() {
  static const std::unique_ptr<Core> core = Core::Ready();
  return core->context();
}
const std::vector<float>& MeanShape() {
  static const std::vector<float> mean = MeanShapeFloats();
  return mean;
}

// What one face keeps from frame to frame.
struct FaceState {
  float mask_pose[12] = {};
  float pose[7] = {};
  float pose_ref[7] = {};
  float identity[kIdentityCount] = {};
  float expression[kExpressionCount] = {};
  std::vector<float> shape = std::vector<float>(kShapeSize);
  int32_t contour[19] = {};
  int32_t flag = 0;

  // What the dense mesh leaves behind.
  void UpdateShape() {
    int16_t products[kProductCount];
    BuildProductTable(identity, expression, products);
    FaceMeshTask task = {Model().meanShape,
                         Model().identityBasis,
                         Model().expressionBasis,
                         Model().tensor,
                         identity,
                         expression,
                         products,
                         0,
                         kVertexCount,
                         shape.data()};
    n3ds::_GetFace3DModel_Thread(&task);
  }
};

void ExpectSameState(const FaceState& a, const FaceState& b, int frame) {
  ASSERT_EQ(Bits(a.mask_pose), Bits(b.mask_pose)) << frame;
  ASSERT_EQ(Bits(a.pose), Bits(b.pose)) << frame;
  ASSERT_EQ(Bits(a.pose_ref), Bits(b.pose_ref)) << frame;
  ASSERT_EQ(Bits(a.identity), Bits(b.identity)) << frame;
  ASSERT_EQ(Bits(a.expression), Bits(b.expression)) << frame;
  ASSERT_EQ(Bits(a.shape), Bits(b.shape)) << frame;
  ASSERT_TRUE(std::equal(std::begin(a.contour), std::end(a.contour), b.contour)) << frame;
  ASSERT_EQ(a.flag, b.flag) << frame;
}

// One face on its way through the worker, without a driver.
class Face {
 public:
  FaceState state;
  N3DS_RIGID_MATRIX result = {};

  // Runs one frame; returns the landmarks as the worker leaves them.
  Points Run(const Points& landmarks) {
    Points smoothed = landmarks;
    if (previous_.empty()) previous_.assign(landmarks.size(), 0);
    MaskFaceTask task = {nullptr,
                         MeanShape().data(),
                         smoothed.data(),
                         previous_.data(),
                         camera.k,
                         kScale,
                         &result,
                         state.mask_pose,
                         state.pose,
                         state.pose_ref,
                         state.identity,
                         state.expression,
                         state.shape.data(),
                         state.contour,
                         Model().meanShape,
                         Model().identityBasis,
                         Model().expressionBasis,
                         Model().tensor,
                         &state.flag};
    EXPECT_EQ(n3ds::_Build3DFaceForVideo_Mask_Thread(&task), nullptr);
    previous_ = landmarks;
    return smoothed;
  }

  Camera camera{kWidth, kHeight};

 private:
  Points previous_;
};

// The worker written down step by step, with the functions it is made of called one by one.
class ReferenceFace {
 public:
  FaceState state;
  Camera camera{kWidth, kHeight};
  int gates = 0;

  Points Run(const Points& landmarks) {
    Points points = landmarks;
    PoseWeights weights;
    ComputePoseWeights(points.data(), &weights);
    const FitWeights fit = {0, weights.contour, weights.range, 1.0f};
    const bool gate =
        weights.mouth_open == 0 && weights.frontal == 1 && weights.weighting_switch == 1;
    gates += gate ? 1 : 0;
    float triples[95][3] = {};
    for (int i = 0; i < 95; i++) {
      triples[i][0] = static_cast<float>(points[2 * i]);
      triples[i][1] = static_cast<float>(points[2 * i + 1]);
    }
    int32_t table[95] = {};
    std::copy_n(kInnerLandmarkVertexIndices, 76, table + 19);
    float R[9], t[3];
    QuatToRotationMatrix(state.pose_ref, R);
    std::copy_n(state.pose_ref + 4, 3, t);

    const auto fit_pose = [&](const float* shape, const int32_t* contour) {
      FitRigidPose(nullptr, points.data(), shape, camera.k, R, t, state.pose_ref, contour, table,
                   fit);
    };
    const auto update_contour = [&](const float* shape) {
      UpdateContourCorrespondence(nullptr, points.data(), shape, camera.k, R, t, state.contour);
    };
    const auto expression = [&] {
      SolveForExpressionCoef(nullptr, points.data(), Model().meanShape, Model().identityBasis,
                             Model().expressionBasis, Model().tensor, camera.k, R, t,
                             state.identity, state.expression, table, kScale);
    };
    const auto identity = [&](float* out) {
      SolveForIdentityCoef(nullptr, triples[0], Model().meanShape, Model().identityBasis, camera.k,
                           R, t, out, table, kScale);
    };
    const auto depths = [&] {
      for (int i = 19; i < 95; i++) {
        const float* v = &MeanShape()[static_cast<size_t>(3 * table[i])];
        triples[i][2] = R[6] * v[0] + R[7] * v[1] + R[8] * v[2] + t[2];
      }
    };

    if (state.flag == 0) {
      state.shape = MeanShape();
      const float start[7] = {-0.265f, 0.958f, -0.001f, -0.049f, 0, 0, 800};
      std::copy_n(start, 7, state.pose_ref);
      QuatToRotationMatrix(state.pose_ref, R);
      std::copy_n(start + 4, 3, t);
      fit_pose(MeanShape().data(), kDefaultContourVertexIndices);
      for (int round = 0; round < 3; round++) {
        update_contour(MeanShape().data());
        fit_pose(MeanShape().data(), state.contour);
      }
      update_contour(MeanShape().data());
      std::copy_n(state.contour, 19, table);
      std::copy_n(state.pose_ref, 7, state.pose);
      if (gate) {
        depths();
        identity(state.identity);
      } else {
        expression();
      }
      state.flag = 1;
    } else {
      const int64_t dx = points[0] - points[36], dy = points[1] - points[37];
      const float width = std::sqrt(static_cast<float>(dx * dx + dy * dy));
      float sx = 0, sy = 0;
      for (const int k : {45, 51, 63, 64, 68, 69, 73, 74}) {
        sx += static_cast<float>(points[2 * k] - previous_[2 * k]);
        sy += static_cast<float>(points[2 * k + 1] - previous_[2 * k + 1]);
      }
      const float motion = (std::fabs(sx) + std::fabs(sy)) * 100.0f / width;
      float old_weight = 0.1f, new_weight = 0.9f;
      if (motion < 12.0f) {
        old_weight = static_cast<float>(0.7 - 0.05 * static_cast<double>(motion));
        new_weight = 1.0f - old_weight;
      }
      for (int i = 0; i < 190; i++) {
        const float old_part = old_weight * static_cast<float>(previous_[i]);
        const float new_part = new_weight * static_cast<float>(points[i]);
        points[i] = static_cast<int32_t>(old_part + new_part);
      }
      for (int round = 0; round < 2; round++) {
        fit_pose(state.shape.data(), state.contour);
        update_contour(state.shape.data());
      }
      std::copy_n(state.contour, 19, table);
      for (int i = 0; i < 7; i++) {
        state.pose_ref[i] = static_cast<float>(0.9 * static_cast<double>(state.pose_ref[i]) +
                                               0.1 * static_cast<double>(state.pose[i]));
      }
      QuatToRotationMatrix(state.pose_ref, R);
      std::copy_n(state.pose_ref + 4, 3, t);
      std::copy_n(state.pose_ref, 7, state.pose);
      if (gate) {
        depths();
        for (int i = 19; i < 39; i++) {
          const float* v = &MeanShape()[static_cast<size_t>(3 * table[i])];
          const float z = triples[i][2];
          if (z == 0) continue;
          const float x = R[0] * v[0] + R[1] * v[1] + R[2] * v[2] + t[0];
          const float y = R[3] * v[0] + R[4] * v[1] + R[5] * v[2] + t[1];
          triples[i][0] = x * camera.k[0] / z + camera.k[2];
          triples[i][1] = camera.k[4] * y / z + camera.k[5];
        }
        float found[kIdentityCount] = {};
        identity(found);
        for (int k = 0; k < kIdentityCount; k++) {
          state.identity[k] = static_cast<float>(0.8 * static_cast<double>(state.identity[k]) +
                                                 0.2 * static_cast<double>(found[k]));
        }
      }
      expression();
    }
    const float matrix[12] = {R[0], R[1], R[2], t[0], R[3], R[4],
                              R[5], t[1], R[6], R[7], R[8], t[2]};
    std::copy_n(matrix, 12, state.mask_pose);
    previous_ = landmarks;
    return points;
  }

 private:
  Points previous_;
};

// A face of the mean shape that looks into the camera with the mouth shut.
Points FrontalFace(double x = 0) {
  HeadPlace place;
  place.x = x;
  return DetectLandmarks(ModelShape(), place, kWidth, kHeight);
}

// The same with the lower lip dropped: the lips are apart.
Points OpenMouth(Points landmarks) {
  const int width = std::abs(landmarks[2 * 75] - landmarks[2 * 81]);
  for (const int k : {82, 83, 84, 85, 86, 92, 93, 94}) landmarks[2 * k + 1] += width / 3;
  return landmarks;
}

template <typename Coefficients>
bool AllZero(const Coefficients& coefficients) {
  return std::all_of(std::begin(coefficients), std::end(coefficients),
                     [](float c) { return c == 0.0f; });
}

TEST(MaskWorker, FollowsItsStepsInEveryBit) {
  int gates = 0, frames = 0;
  for (uint64_t seed = 1; seed <= 4; seed++) {
    Person person(seed);
    Face face;
    ReferenceFace reference;
    for (int frame = 0; frame < 45; frame++) {
      Points landmarks = person.Detect(3 * frame, kWidth, kHeight, 101, 1);
      if (frame % 3 != 0) landmarks = FrontalFace(frame);  // somebody with the mouth shut
      if (frame % 15 == 7) landmarks = OpenMouth(landmarks);
      if (frame % 20 == 11) {
        for (int32_t& c : landmarks) c += 30;  // a jump
      }
      const Points smoothed = face.Run(landmarks);
      ASSERT_EQ(smoothed, reference.Run(landmarks)) << frame;
      ASSERT_NO_FATAL_FAILURE(ExpectSameState(face.state, reference.state, frame));
      face.state.UpdateShape();
      reference.state.UpdateShape();
    }
    gates += reference.gates;
    frames += 45;
  }
  EXPECT_GT(gates, frames / 10) << "frames that refine the identity";
  EXPECT_LT(gates, frames * 9 / 10) << "frames that do not";
}

// ---- The first frame

TEST(MaskWorker, NewFaceThatPassesTheGateGetsItsIdentityFirst) {
  Face face;
  face.Run(FrontalFace());
  EXPECT_FALSE(AllZero(face.state.identity));
  EXPECT_TRUE(AllZero(face.state.expression));
  EXPECT_EQ(face.state.flag, 1);
  face.Run(FrontalFace());
  EXPECT_FALSE(AllZero(face.state.expression)) << "the second frame brings the expression";
  EXPECT_EQ(face.state.flag, 1) << "a flag, not a count";
}

TEST(MaskWorker, NewFaceThatFailsTheGateGetsItsExpressionFirst) {
  Face face;
  face.Run(OpenMouth(FrontalFace()));
  EXPECT_TRUE(AllZero(face.state.identity));
  EXPECT_FALSE(AllZero(face.state.expression));
  EXPECT_EQ(face.state.flag, 1);
}

TEST(MaskWorker, NewFaceIsNotSmoothed) {
  Face face;
  const Points landmarks = FrontalFace();
  EXPECT_EQ(face.Run(landmarks), landmarks);
  EXPECT_EQ(Bits(face.state.pose), Bits(face.state.pose_ref));
  const float* q = face.state.pose;
  EXPECT_NEAR(q[0] * q[0] + q[1] * q[1] + q[2] * q[2] + q[3] * q[3], 1.0f, 1e-5f);
}

TEST(MaskWorker, NewFaceFindsThePoseOfTheHead) {
  for (const double yaw : {-0.2, 0.0, 0.2}) {
    HeadPlace place;
    place.yaw = yaw;
    place.x = 40;
    place.z = 550;
    Face face;
    face.Run(DetectLandmarks(ModelShape(), place, kWidth, kHeight));
    const RigidTransform truth = TransformOf(place);
    for (int row = 0; row < 3; row++) {
      for (int column = 0; column < 3; column++) {
        EXPECT_NEAR(face.state.mask_pose[4 * row + column], truth.r[3 * row + column], 0.05) << yaw;
      }
      EXPECT_NEAR(face.state.mask_pose[4 * row + 3], truth.t[row], row == 2 ? 20 : 4) << yaw;
    }
  }
}

// The landmarks of a face are smoothed with whatever stands in the slot, but a new face's are not
// read: the driver clears them.
TEST(MaskWorker, NewFaceStartsFromTheMeanShapeWhateverTheSlotHeld) {
  Face fresh, used;
  used.state.shape.assign(kShapeSize, 1e6f);
  std::fill(std::begin(used.state.pose_ref), std::end(used.state.pose_ref), -3.0f);
  std::fill(std::begin(used.state.pose), std::end(used.state.pose), 77.0f);
  std::fill(std::begin(used.state.contour), std::end(used.state.contour), 1811);
  fresh.Run(FrontalFace());
  used.Run(FrontalFace());
  ExpectSameState(fresh.state, used.state, 0);
  EXPECT_EQ(Bits(fresh.state.shape), Bits(MeanShape()));
}

// ---- Landmark smoothing

TEST(MaskWorker, StillLandmarksAreHeldAtSeventyPercent) {
  Face face;
  const Points still = FrontalFace();
  face.Run(still);
  const Points smoothed = face.Run(still);
  for (size_t i = 0; i < 190; i++) {
    const auto c = static_cast<float>(still[i]);
    EXPECT_EQ(smoothed[i], static_cast<int32_t>(0.7f * c + (1.0f - 0.7f) * c)) << i;
  }
}

TEST(MaskWorker, FirstNinetyFiveLandmarksOnlyAreSmoothed) {
  Face face;
  const Points first = FrontalFace();
  face.Run(first);
  const Points second = FrontalFace(3);
  const Points smoothed = face.Run(second);
  EXPECT_NE(smoothed[0], second[0]);
  EXPECT_EQ(Points(smoothed.begin() + 190, smoothed.end()),
            Points(second.begin() + 190, second.end()));
}

// Moves the eight steady points, and nothing else, by integer pixels each.
Points WithMotion(Points landmarks, int pixels) {
  for (const int k : {45, 51, 63, 64, 68, 69, 73, 74}) landmarks[2 * k] += pixels;
  return landmarks;
}

// What the eight points' motion is in percent of the outline's width.
float MotionPercent(const Points& landmarks, int pixels) {
  const auto dx = static_cast<float>(landmarks[36] - landmarks[0]);
  const auto dy = static_cast<float>(landmarks[37] - landmarks[1]);
  return 800.0f * static_cast<float>(pixels) / std::sqrt(dx * dx + dy * dy);
}

TEST(MaskWorker, LandmarksFollowAtNinetyPercentFromTwelvePercentMotionOn) {
  for (const int pixels : {6, 20, 100}) {
    Face face;
    const Points before = FrontalFace();
    ASSERT_GT(MotionPercent(before, pixels), 12.0f);
    face.Run(before);
    const Points now = WithMotion(before, pixels);
    const Points smoothed = face.Run(now);
    for (size_t i = 0; i < 190; i++) {
      EXPECT_EQ(smoothed[i], static_cast<int32_t>(0.1f * static_cast<float>(before[i]) +
                                                  0.9f * static_cast<float>(now[i])))
          << i << " at " << pixels;
    }
  }
}

TEST(MaskWorker, WeightOfThePastFallsWithTheMotion) {
  for (const int pixels : {0, 1, 2, 3}) {
    Face face;
    const Points before = FrontalFace();
    ASSERT_LT(MotionPercent(before, pixels), 12.0f);
    face.Run(before);
    Points now = WithMotion(before, pixels);
    now[2 * 30] += 100000;  // no steady point: what it stays behind by shows the weight
    const Points smoothed = face.Run(now);
    const float weight = static_cast<float>(now[2 * 30] - smoothed[2 * 30]) / 100000.0f;
    EXPECT_NEAR(weight, 0.7f - 0.05f * MotionPercent(before, pixels), 1e-4f) << pixels;
  }
}

TEST(MaskWorker, OutlineOfNoWidthGivesTheWeightsOfAFastFace) {
  for (const int moved : {0, 5}) {
    Face face;
    Points before = FrontalFace();
    before[36] = before[0];
    before[37] = before[1];
    face.Run(before);
    Points now = before;
    now[2 * 45] += moved;
    const Points smoothed = face.Run(now);
    for (size_t i = 0; i < 190; i++) {
      EXPECT_EQ(smoothed[i], static_cast<int32_t>(0.1f * static_cast<float>(before[i]) +
                                                  0.9f * static_cast<float>(now[i])))
          << i << ", moved by " << moved;
    }
  }
}

// ---- Identity over time

TEST(MaskWorker, IdentityConvergesByAFifthPerFrame) {
  const Points still = FrontalFace();
  Face face;
  for (int frame = 0; frame < 60; frame++) face.Run(still);  // the pose comes to rest
  float rest[kIdentityCount];
  std::copy_n(face.state.identity, kIdentityCount, rest);
  ASSERT_FALSE(AllZero(rest));
  std::fill_n(face.state.identity, kIdentityCount, 0.0f);
  double remaining = 1.0;
  for (int frame = 0; frame < 12; frame++) {
    face.Run(still);
    remaining *= 0.8;
    for (int k = 0; k < kIdentityCount; k++) {
      EXPECT_NEAR(face.state.identity[k], rest[k] * (1.0 - remaining), 2e-4) << k << ", " << frame;
    }
  }
}

TEST(MaskWorker, IdentityIsFrozenWhileTheGateIsShut) {
  Face face;
  face.Run(FrontalFace());
  float identity[kIdentityCount];
  std::copy_n(face.state.identity, kIdentityCount, identity);
  for (int frame = 0; frame < 5; frame++) {
    float expression[kExpressionCount];
    std::copy_n(face.state.expression, kExpressionCount, expression);
    face.Run(OpenMouth(FrontalFace(frame)));
    EXPECT_EQ(Bits(face.state.identity), Bits(identity)) << frame;
    EXPECT_NE(Bits(face.state.expression), Bits(expression)) << frame;
  }
}

// Raised brows are an expression: they leave the identity of a tracked face as it is.
TEST(MaskWorker, BrowsDoNotDriveTheIdentityOfATrackedFace) {
  Face still, raised;
  still.Run(FrontalFace());
  raised.Run(FrontalFace());
  Points up = FrontalFace();
  for (int k = 19; k < 39; k++) up[2 * k + 1] -= 6;
  Face new_face;
  new_face.Run(up);
  still.Run(FrontalFace());
  raised.Run(up);
  double tracked_change = 0, new_change = 0;
  for (int k = 0; k < kIdentityCount; k++) {
    tracked_change += std::fabs(raised.state.identity[k] - still.state.identity[k]);
    new_change += std::fabs(new_face.state.identity[k] - still.state.identity[k]);
  }
  EXPECT_GT(new_change, 0.1) << "on a first frame they do";
  EXPECT_LT(tracked_change, 0.1 * new_change);
}

// ---- Outputs

TEST(MaskWorker, ABrowInTheCameraPlaneKeepsItsObservedPosition) {
  const Points landmarks = FrontalFace();
  Face face;
  face.Run(landmarks);
  // An unturned pose that puts the vertex of landmark 19 at depth 0. The pose fits fail at such a
  // point and leave the pose, and blending it with itself changes nothing.
  const int32_t vertex = kInnerLandmarkVertexIndices[0];
  const float pose[7] = {1, 0, 0, 0, 0, 0, -MeanShape()[static_cast<size_t>(3 * vertex + 2)]};
  std::copy_n(pose, 7, face.state.pose);
  std::copy_n(pose, 7, face.state.pose_ref);
  std::fill(std::begin(face.state.identity), std::end(face.state.identity), 0.0f);
  face.Run(landmarks);
  ASSERT_EQ(Bits(face.state.pose), Bits(pose));
  EXPECT_FALSE(AllZero(face.state.identity)) << "the identity was fitted";
  for (const float coefficient : face.state.identity) EXPECT_TRUE(std::isfinite(coefficient));
}

TEST(MaskWorker, WritesPoseMatrixModelViewAndProjection) {
  Face face;
  for (float& element : face.result.viewMatrix) element = 5.0f;
  float landmark_buffer = 0;
  face.result.landmarks3D = &landmark_buffer;
  for (int frame = 0; frame < 3; frame++) {
    face.Run(FrontalFace(4 * frame));
    float R[9];
    QuatToRotationMatrix(face.state.pose, R);
    const float* p = face.state.mask_pose;
    for (int row = 0; row < 3; row++) {
      for (int column = 0; column < 3; column++) {
        EXPECT_EQ(p[4 * row + column], R[3 * row + column]) << frame;
        const float sign = row == 0 ? 1.0f : -1.0f;
        EXPECT_EQ(face.result.modelMatrix[4 * column + row], sign * R[3 * row + column]) << frame;
      }
      EXPECT_EQ(p[4 * row + 3], face.state.pose[4 + row]) << frame;
    }
    EXPECT_EQ(face.result.modelMatrix[14], -face.state.pose[6]);
    EXPECT_FLOAT_EQ(face.result.projectionMatrix[0], 2.0f * 1000.0f / kWidth);
  }
  for (const float element : face.result.viewMatrix) EXPECT_EQ(element, 5.0f);
  EXPECT_EQ(face.result.landmarks3D, &landmark_buffer);
}

TEST(MaskWorker, OddImageSizesCountOnePixelLessInTheProjection) {
  Face face;
  face.camera = Camera(641, 479);
  face.Run(DetectLandmarks(ModelShape(), {}, 641, 479));
  EXPECT_EQ(face.result.projectionMatrix[0], 2.0f * 560.0f / 640.0f);
  EXPECT_EQ(face.result.projectionMatrix[5], 2.0f * 560.0f / 478.0f);
}

// ---- Input that cannot be fitted

TEST(MaskWorker, AnImageOfOnePixelHasNoProjection) {
  Face face;
  face.Run(FrontalFace());
  ASSERT_NE(face.result.projectionMatrix[0], 0.0f);
  face.camera = Camera(1, 1);
  face.Run(FrontalFace());
  for (const float element : face.result.projectionMatrix) EXPECT_EQ(element, 0.0f);
  EXPECT_EQ(face.result.modelMatrix[15], 1.0f);
}

TEST(MaskWorker, AllLandmarksOnOnePixelEndInFiniteOutputs) {
  for (const int32_t where : {0, 300}) {
    Face face;
    for (int frame = 0; frame < 4; frame++) {
      face.Run(Points(202, where));
      face.state.UpdateShape();
      for (const float element : face.result.modelMatrix) EXPECT_TRUE(std::isfinite(element));
      for (const float element : face.state.identity) EXPECT_TRUE(std::isfinite(element));
      for (const float element : face.state.expression) EXPECT_TRUE(std::isfinite(element));
    }
  }
}

// For the sanitizers: no overflow, and every frame returns.
TEST(MaskWorker, LandmarksAtTheEndsOfTheirRangeNeitherOverflowNorHang) {
  Random random = TestRandom();
  for (int run = 0; run < 20; run++) {
    Face face;
    for (int frame = 0; frame < 3; frame++) {
      Points landmarks(202);
      for (int32_t& c : landmarks) {
        constexpr int32_t kEnds[] = {INT32_MIN, INT32_MAX, 0, 1 << 20};
        c = kEnds[random.Int(0, 3)];
      }
      face.Run(landmarks);
      face.state.UpdateShape();
    }
  }
}

// ---- Through the driver

void RunFrame(Core* core, const std::vector<Points>& faces, bool with_mesh = true) {
  FaceRecords records(faces);
  const NSVL_OFFSCREEN image = ImageOf(kWidth, kHeight);
  ASSERT_EQ(N3DS_Build3DFaceForVideo_Mask(core->handle(), &image, records.get(), records.count()),
            N3DS_OK);
  if (!with_mesh) return;
  std::vector<N3DS_3D_MODEL> models(faces.size());
  std::vector<N3DS_RIGID_MATRIX> matrices(faces.size());
  std::vector<std::vector<float>> landmarks(faces.size(), std::vector<float>(3 * 165));
  for (size_t k = 0; k < faces.size(); k++) matrices[k].landmarks3D = landmarks[k].data();
  ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), models.data(), matrices.data(), records.count()),
            N3DS_OK);
}

FaceState StateOf(const Core& core, int slot) {
  const TrackingContext& context = core.context();
  FaceState state;
  std::copy_n(context.maskPose[slot], 12, state.mask_pose);
  std::copy_n(context.pose[slot], 7, state.pose);
  std::copy_n(context.poseRef[slot], 7, state.pose_ref);
  std::copy_n(context.identityCoef[slot], kIdentityCount, state.identity);
  std::copy_n(context.expressionCoef[slot], kExpressionCount, state.expression);
  std::copy_n(context.shape[slot], kShapeSize, state.shape.begin());
  std::copy_n(context.fitState[slot], 19, state.contour);
  state.flag = context.trackFlag[slot];
  return state;
}

TEST(MaskDriver, GivesTheWorkerWhatBelongsToTheFace) {
  const auto core = Core::Ready();
  Person person(9);
  Face face;
  for (int frame = 0; frame < 12; frame++) {
    const Points landmarks = person.Detect(frame, kWidth, kHeight, 101, 1);
    RunFrame(core.get(), {landmarks});
    face.Run(landmarks);
    face.state.UpdateShape();
    ASSERT_NO_FATAL_FAILURE(ExpectSameState(StateOf(*core, 0), face.state, frame));
  }
}

TEST(MaskDriver, FiveFacesAtOnceAreTheSameAsEachAlone) {
  std::vector<Person> persons;
  std::vector<std::unique_ptr<Core>> alone;
  for (int k = 0; k < 5; k++) {
    persons.push_back(Person(20 + static_cast<uint64_t>(k)).At(140.0 * (k - 2), 0, 700));
    alone.push_back(Core::Ready());
  }
  const auto together = Core::Ready();
  for (int frame = 0; frame < 8; frame++) {
    std::vector<Points> faces;
    for (Person& person : persons) {
      faces.push_back(person.Detect(2 * frame, kWidth, kHeight, 101, 1));
    }
    RunFrame(together.get(), faces);
    for (size_t k = 0; k < 5; k++) {
      RunFrame(alone[k].get(), {faces[k]});
      ASSERT_NO_FATAL_FAILURE(
          ExpectSameState(StateOf(*together, static_cast<int>(k)), StateOf(*alone[k], 0), frame));
    }
  }
}

TEST(MaskDriver, EmptyFrameMakesTheNextFaceNew) {
  const auto core = Core::Ready();
  const auto fresh = Core::Ready();
  for (int frame = 0; frame < 5; frame++) RunFrame(core.get(), {FrontalFace(5 * frame)});
  const NSVL_OFFSCREEN image = ImageOf(kWidth, kHeight);
  ASSERT_EQ(N3DS_Build3DFaceForVideo_Mask(core->handle(), &image, nullptr, 0), N3DS_OK);
  EXPECT_EQ(core->context().trackFlag[0], 0);
  EXPECT_TRUE(AllZero(core->context().identityCoef[0]));
  EXPECT_TRUE(AllZero(core->context().expressionCoef[0]));
  RunFrame(core.get(), {FrontalFace(-30)});
  RunFrame(fresh.get(), {FrontalFace(-30)});
  ExpectSameState(StateOf(*core, 0), StateOf(*fresh, 0), 0);
}

TEST(MaskDriver, FramesWithoutTheDenseMeshBetweenFitTheMeanShape) {
  const auto core = Core::Ready();
  for (int frame = 0; frame < 5; frame++) {
    RunFrame(core.get(), {FrontalFace(frame)}, false);
    EXPECT_EQ(Bits(core->context().shape[0]), Bits(MeanShape())) << frame;
    const float* pose = core->context().pose[0];
    EXPECT_NEAR(pose[6], 600, 15) << frame;
    EXPECT_NEAR(pose[4], frame, 2) << frame;
  }
}

TEST(MaskDriver, SmoothedLandmarksAreWrittenBackToTheCaller) {
  const auto core = Core::Ready();
  RunFrame(core.get(), {FrontalFace()});
  const Points moved = FrontalFace(2);
  FaceRecords records({moved});
  const NSVL_OFFSCREEN image = ImageOf(kWidth, kHeight);
  ASSERT_EQ(N3DS_Build3DFaceForVideo_Mask(core->handle(), &image, records.get(), 1), N3DS_OK);
  EXPECT_NE(records.points(0), moved);
  // The history keeps them as they arrived.
  EXPECT_TRUE(std::equal(moved.begin(), moved.end(), core->context().landmarkHistory));
}

// Distances between where a shape's inner landmark vertices fall in the image and what the
// detector saw, in percent of the distance between the pupils.
void AddErrors(const TrackingContext& context, const float* pose, const float* shape,
               const Points& seen, std::vector<double>* errors) {
  float R[9];
  QuatToRotationMatrix(pose, R);
  const float *t = pose + 4, *k = context.camera;
  const double pupils =
      std::hypot(seen[2 * 95] - seen[2 * 96], seen[2 * 95 + 1] - seen[2 * 96 + 1]);
  for (int i = 0; i < 76; i++) {
    const float* v = shape + 3 * kInnerLandmarkVertexIndices[i];
    const double x = R[0] * v[0] + R[1] * v[1] + R[2] * v[2] + t[0];
    const double y = R[3] * v[0] + R[4] * v[1] + R[5] * v[2] + t[1];
    const double z = R[6] * v[0] + R[7] * v[1] + R[8] * v[2] + t[2];
    const int32_t* p = seen.data() + 2 * (19 + i);
    errors->push_back(std::hypot(k[0] * x / z + k[2] - p[0], k[4] * y / z + k[5] - p[1]) * 100 /
                      pupils);
  }
}

double Quantile(std::vector<double> values, double q) {
  std::sort(values.begin(), values.end());
  return values[static_cast<size_t>(q * static_cast<double>(values.size() - 1))];
}

// Talking people: the mesh falls on the landmarks, and closer than the mean shape under a pose of
// its own.
TEST(MaskDriver, MeshFallsOnTheLandmarks) {
  std::vector<double> mesh_errors, mean_errors;
  for (uint64_t seed = 40; seed < 44; seed++) {
    const auto core = Core::Ready();
    const auto rigid = Core::Ready();
    Person person(seed);
    for (int frame = 0; frame < 40; frame++) {
      const Points seen = person.Detect(frame, kWidth, kHeight, 101, 0);
      RunFrame(core.get(), {seen});
      FaceRecords records({seen});
      const NSVL_OFFSCREEN image = ImageOf(kWidth, kHeight);
      ASSERT_EQ(N3DS_Build3DFaceForVideo_Rigid(rigid->handle(), &image, records.get(), 1), N3DS_OK);
      if (frame < 10) continue;
      AddErrors(core->context(), core->context().pose[0], core->context().shape[0], seen,
                &mesh_errors);
      AddErrors(rigid->context(), rigid->context().pose[0], MeanShape().data(), seen, &mean_errors);
    }
  }
  EXPECT_LT(Quantile(mesh_errors, 0.5), 6.0);
  EXPECT_LT(Quantile(mesh_errors, 0.5), 0.8 * Quantile(mean_errors, 0.5));
  EXPECT_LT(Quantile(mesh_errors, 0.95), 0.9 * Quantile(mean_errors, 0.95));
}

}  // namespace
}  // namespace n3ds::testing
