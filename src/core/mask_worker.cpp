// SPDX-License-Identifier: MIT
#include <cstring>

#include "core/face_workers.h"
#include "core/landmark_motion.h"
#include "core/output_matrices.h"
#include "core/pose_rounds.h"
#include "core/pose_weights.h"
#include "core/shape_fitting.h"
#include "core/tracking_context.h"
#include "core/vector3.h"

namespace n3ds {

namespace {

constexpr int kTrackedFaceRounds = 2;

// One past the last brow landmark.
constexpr int kBrowEnd = 39;

// Shares of the pose just fitted and of the last frame's.
constexpr double kNewPose = 0.9;
constexpr double kOldPose = 0.1;

// Shares of the identity so far and of this frame's.
constexpr double kOldIdentity = 0.8;
constexpr double kNewIdentity = 0.2;

// Smoothing is released at half the motion used in rigid mode: lag shows in a mesh on the skin, but
// not in a hat.
constexpr double kMotionSlope = 0.05;
constexpr float kMotionLimit = 12.0f;

float Blend(double a, float x, double b, float y) {
  return static_cast<float>(a * static_cast<double>(x) + b * static_cast<double>(y));
}

// The landmarks with a depth each, for the identity fit. They are the unsmoothed ones, so that
// smoothing does not feed back into the person's shape.
class IdentityLandmarks {
 public:
  explicit IdentityLandmarks(const int32_t* landmarks) : points_{} {
    for (int i = 0; i < kFitLandmarkCount; ++i) {
      points_[3 * i] = static_cast<float>(landmarks[2 * i]);
      points_[3 * i + 1] = static_cast<float>(landmarks[2 * i + 1]);
    }
  }

  // Gives every inner landmark the depth of its mean-shape vertex.
  void SetDepths(const float* mean_shape, const PoseRounds& rounds) {
    for (int i = kOutlineLandmarkCount; i < kFitLandmarkCount; ++i) {
      points_[3 * i + 2] = CameraCoordinate(2, MeanVertex(mean_shape, i), rounds);
    }
  }

  // Puts the brows where the mean shape has them, so that raised or knitted brows are not taken for
  // the person's shape. A brow point in the camera plane keeps its observed position.
  void MoveBrowsToMeanShape(const float* mean_shape, const float* camera,
                            const PoseRounds& rounds) {
    for (int i = kOutlineLandmarkCount; i < kBrowEnd; ++i) {
      const Vector3 v = MeanVertex(mean_shape, i);
      float* p = points_ + 3 * static_cast<ptrdiff_t>(i);
      if (p[2] == 0.0f) continue;
      p[0] = CameraCoordinate(0, v, rounds) * camera[0] / p[2] + camera[2];
      p[1] = camera[4] * CameraCoordinate(1, v, rounds) / p[2] + camera[5];
    }
  }

  const float* get() const { return points_; }

 private:
  static Vector3 MeanVertex(const float* mean_shape, int landmark) {
    return VectorAt(mean_shape, kInnerLandmarkVertexIndices[landmark - kOutlineLandmarkCount]);
  }
  static float CameraCoordinate(int axis, const Vector3& v, const PoseRounds& rounds) {
    return Dot(RowOf(rounds.rotation(), axis), v) + rounds.translation()[axis];
  }

  float points_[3 * kFitLandmarkCount];  // x, y in pixels, depth in mm
};

// The status of a coefficient fit is ignored: a fit that failed has written nothing.
void FitIdentity(const MaskFaceTask& task, const IdentityLandmarks& landmarks,
                 const PoseRounds& rounds, float* identity) {
  SolveForIdentityCoef(task.memory, landmarks.get(), task.meanShape, task.identityBasis,
                       task.camera, rounds.rotation(), rounds.translation(), identity,
                       rounds.landmark_vertices(), task.scale);
}

void FitExpression(const MaskFaceTask& task, const PoseRounds& rounds) {
  SolveForExpressionCoef(task.memory, task.landmarks, task.meanShape, task.identityBasis,
                         task.expressionBasis, task.tensor, task.camera, rounds.rotation(),
                         rounds.translation(), task.identityCoef, task.expressionCoef,
                         rounds.landmark_vertices(), task.scale);
}

// A new face gets its pose from the mean shape, and one of the two coefficient sets; the other
// stays at zero until the next frame.
void StartTrack(const MaskFaceTask& task, const PoseWeights& weights, const FitWeights& fit_weights,
                IdentityLandmarks* identity_landmarks, PoseRounds* rounds) {
  // Until the dense mesh is asked for, the face is the mean one.
  std::memcpy(task.shape, task.meanShapeF, kShapeSize * sizeof(float));
  rounds->StartNewFace();
  rounds->Fit(task.landmarks, kDefaultContourVertexIndices, fit_weights);
  for (int i = 0; i < kNewFaceRounds; ++i) {
    rounds->UpdateContour(task.landmarks);
    rounds->Fit(task.landmarks, rounds->contour(), fit_weights);
  }
  rounds->UpdateContour(task.landmarks);
  rounds->CopyContourToLandmarks();
  std::memcpy(task.pose, task.poseRef, kPoseSize * sizeof(float));

  if (AllowsIdentityFit(weights)) {
    identity_landmarks->SetDepths(task.meanShapeF, *rounds);
    FitIdentity(task, *identity_landmarks, *rounds, task.identityCoef);
  } else {
    FitExpression(task, *rounds);
  }
  *task.trackFlag = 1;
}

void SmoothPose(const MaskFaceTask& task) {
  // The quaternion is not renormalised: its length stays near 1.
  for (int i = 0; i < kPoseSize; ++i) {
    task.poseRef[i] = Blend(kNewPose, task.poseRef[i], kOldPose, task.pose[i]);
  }
  std::memcpy(task.pose, task.poseRef, kPoseSize * sizeof(float));
}

// A fit that failed leaves the zeros it started from, and the identity shrinks by a fifth.
void UpdateIdentity(const MaskFaceTask& task, const PoseRounds& rounds,
                    IdentityLandmarks* landmarks) {
  landmarks->SetDepths(task.meanShapeF, rounds);
  landmarks->MoveBrowsToMeanShape(task.meanShapeF, task.camera, rounds);
  float identity[kIdentityCount] = {};
  FitIdentity(task, *landmarks, rounds, identity);
  for (int k = 0; k < kIdentityCount; ++k) {
    task.identityCoef[k] = Blend(kOldIdentity, task.identityCoef[k], kNewIdentity, identity[k]);
  }
}

void ContinueTrack(const MaskFaceTask& task, const PoseWeights& weights,
                   const FitWeights& fit_weights, IdentityLandmarks* identity_landmarks,
                   PoseRounds* rounds) {
  const float motion =
      SteadyPointMotion(task.landmarks, task.prevLandmarks, OutlineWidth(task.landmarks));
  BlendLandmarks(SmoothingWeights(motion, kMotionSlope, kMotionLimit), task.prevLandmarks,
                 task.landmarks);

  for (int i = 0; i < kTrackedFaceRounds; ++i) {
    rounds->Fit(task.landmarks, rounds->contour(), fit_weights);
    rounds->UpdateContour(task.landmarks);
  }
  rounds->CopyContourToLandmarks();
  SmoothPose(task);
  rounds->UpdateTransformFromPose();

  if (AllowsIdentityFit(weights)) UpdateIdentity(task, *rounds, identity_landmarks);
  FitExpression(task, *rounds);
}

void WriteOutputs(const MaskFaceTask& task, const PoseRounds& rounds) {
  for (int row = 0; row < 3; ++row) {
    float* out = task.maskPose + 4 * static_cast<ptrdiff_t>(row);
    std::memcpy(out, rounds.rotation() + 3 * static_cast<ptrdiff_t>(row), 3 * sizeof(float));
    out[3] = rounds.translation()[row];
  }
  // Built apart and copied: for an image one pixel wide, which has no projection, zeros are
  // reported and not the projection of an earlier frame.
  float model_view[16] = {};
  float projection[16] = {};
  WriteModelViewAndProjection(rounds.rotation(), rounds.translation(), task.camera, model_view,
                              projection);
  std::memcpy(ModelViewOf(task.result), model_view, sizeof(model_view));
  std::memcpy(task.result->projectionMatrix, projection, sizeof(projection));
}

}  // namespace

void* _Build3DFaceForVideo_Mask_Thread(void* argument) {
  const MaskFaceTask& task = *static_cast<const MaskFaceTask*>(argument);
  PoseWeights weights;
  ComputePoseWeights(task.landmarks, &weights);
  // Without the weighting switch the inner weight has no effect.
  const FitWeights fit_weights = {0, weights.contour, weights.range, 1.0f};
  IdentityLandmarks identity_landmarks(task.landmarks);
  const bool is_new = *task.trackFlag == 0;
  PoseRounds rounds(task.memory, is_new ? task.meanShapeF : task.shape, task.camera, task.poseRef,
                    task.fitState);
  if (is_new) {
    StartTrack(task, weights, fit_weights, &identity_landmarks, &rounds);
  } else {
    ContinueTrack(task, weights, fit_weights, &identity_landmarks, &rounds);
  }
  WriteOutputs(task, rounds);
  return nullptr;
}

}  // namespace n3ds
