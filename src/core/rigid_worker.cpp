// SPDX-License-Identifier: MIT
#include <cstring>

#include "core/face_workers.h"
#include "core/landmark_motion.h"
#include "core/output_matrices.h"
#include "core/pose_rounds.h"
#include "core/pose_weights.h"
#include "core/rigid_pose_smoothing.h"
#include "core/rigid_shape_refinement.h"
#include "core/tracking_context.h"
#include "platform/integer_arithmetic.h"

namespace n3ds {

namespace {

// Landmark smoothing by the motion of the eight steady points in percent of the face's width. The
// motion is a sum, so the face is taken as it is from a move of an eighth of its width on.
constexpr double kMotionSlope = 0.025;
constexpr float kMotionLimit = 24.0f;
constexpr float kUnsmoothedMotion = 100.0f;

// A copy of the landmarks that moves by one pixel in x and y with every failed fit: a degenerate
// system rarely stays so when the observations change.
class ShiftedLandmarks {
 public:
  explicit ShiftedLandmarks(const int32_t* landmarks) {
    std::memcpy(landmarks_, landmarks, sizeof(landmarks_));
  }
  const int32_t* Shift() {
    for (int32_t& coordinate : landmarks_) coordinate = WrapAdd(coordinate, 1);
    return landmarks_;
  }

 private:
  int32_t landmarks_[2 * kFitLandmarkCount];
};

// Counts the repeats of a failed fit. Without a limit they never end: the outputs of a face without
// a pose would be worthless to a host that has not asked to be told.
class Repeats {
 public:
  explicit Repeats(uint32_t limit) : limit_(limit) {}
  bool Next() {
    if (limit_ == 0) return true;
    if (done_ == limit_) return false;
    ++done_;
    return true;
  }

 private:
  uint32_t limit_;
  uint32_t done_ = 0;
};

// False when the fit was given up: the pose is the last one then.
bool FitTrackedFace(const RigidFaceTask& task, const FitWeights& first_weights,
                    const FitWeights& retry_weights, PoseRounds* rounds) {
  bool fitted = rounds->Fit(task.landmarks, rounds->contour(), first_weights);
  if (fitted) {
    rounds->UpdateContour(task.landmarks);
    return true;
  }
  ShiftedLandmarks shifted(task.landmarks);
  Repeats repeats(task.refitLimit);
  while (!fitted && repeats.Next()) {
    const int32_t* moved = shifted.Shift();
    fitted = rounds->Fit(moved, rounds->contour(), retry_weights);
    if (fitted) rounds->UpdateContour(moved);
  }
  return fitted;
}

// False when the fit was given up: the pose is the start pose then.
bool FitNewFace(const RigidFaceTask& task, const FitWeights& weights, PoseRounds* rounds) {
  rounds->StartNewFace();
  bool fitted = rounds->Fit(task.landmarks, kDefaultContourVertexIndices, weights);
  const auto run_rounds = [&](const int32_t* points) {
    for (int i = 0; i < kNewFaceRounds; ++i) {
      if (fitted) rounds->UpdateContour(points);
      fitted = rounds->Fit(points, rounds->contour(), weights);
    }
  };
  run_rounds(task.landmarks);
  ShiftedLandmarks shifted(task.landmarks);
  Repeats repeats(task.refitLimit);
  while (!fitted && repeats.Next()) run_rounds(shifted.Shift());
  if (!fitted) {
    rounds->StartNewFace();
    return false;
  }
  rounds->UpdateContour(task.landmarks);
  return true;
}

// What both workers leave behind for the output stage and the next frame.
void FinishFace(const RigidFaceTask& task, const PoseRounds& rounds) {
  std::memcpy(task.shape, task.meanShapeF, kShapeSize * sizeof(float));
  std::memcpy(task.poseRef, task.pose, kPoseSize * sizeof(float));
  float tilted[9];
  TiltRotation(rounds.rotation(), tilted);
  WriteModelViewAndProjection(tilted, rounds.translation(), task.camera, ModelViewOf(task.result),
                              task.result->projectionMatrix);
}

void RefineShape(const RigidFaceTask& task, const PoseWeights& weights, const PoseRounds& rounds) {
  const RefitView view = {task.landmarks,    task.meanShape,       task.camera,
                          rounds.rotation(), rounds.translation(), rounds.landmark_vertices(),
                          task.scale};
  if (AllowsIdentityFit(weights)) {
    RefitIdentityRigid(task.memory, view, task.identityBasis, task.identityCoef);
  }
  RefitExpressionRigid(task.memory, view, task.expressionBasis, task.expressionCoef);
}

void SmoothLandmarks(const RigidFaceTask& task, float outline_width) {
  const float motion = SteadyPointMotion(task.landmarks, task.prevLandmarks, outline_width);
  if (motion > kUnsmoothedMotion) return;
  BlendLandmarks(SmoothingWeights(motion, kMotionSlope, kMotionLimit), task.prevLandmarks,
                 task.landmarks);
}

}  // namespace

void* _Build3DFaceForVideo_Rigid_Thread(void* argument) {
  const RigidFaceTask& task = *static_cast<const RigidFaceTask*>(argument);
  PoseWeights weights;
  ComputePoseWeights(task.landmarks, &weights);
  const float inner = ClampInnerWeight(weights.inner);
  const FitWeights plain = {0, weights.contour, weights.range, inner};
  PoseRounds rounds(task.memory, task.meanShapeF, task.camera, task.pose, task.fitState);

  bool fitted;
  if (*task.trackFlag == 0) {
    fitted = FitNewFace(task, plain, &rounds);
    std::memset(task.identityCoef, 0, kIdentityCount * sizeof(float));
    std::memset(task.expressionCoef, 0, kExpressionCount * sizeof(float));
    if (fitted) *task.trackFlag = 1;
  } else {
    const float outline_width = OutlineWidth(task.landmarks);
    SmoothLandmarks(task, outline_width);
    float previous_pose[kPoseSize];
    std::memcpy(previous_pose, task.pose, sizeof(previous_pose));
    const FitWeights weighted = {1, weights.contour, weights.range, inner};
    fitted = FitTrackedFace(task, weighted, plain, &rounds);
    if (fitted) {
      SmoothPose(previous_pose, MotionFactor(task.landmarks, task.prevLandmarks, outline_width),
                 task.pose);
      rounds.UpdateTransformFromPose();
      RefineShape(task, weights, rounds);
    }
    *task.trackFlag = WrapAdd(*task.trackFlag, 1);
  }
  *task.fitGivenUp = fitted ? 0 : 1;
  FinishFace(task, rounds);
  return nullptr;
}

void* _Build3DFaceForVideo_Rigid_Thread_Acce(void* argument) {
  const RigidFaceTask& task = *static_cast<const RigidFaceTask*>(argument);
  PoseWeights weights;
  ComputePoseWeights(task.landmarks, &weights);
  // Without the weighting switch the inner weight has no effect.
  const FitWeights plain = {0, weights.contour, weights.range, 1.0f};
  PoseRounds rounds(task.memory, task.meanShapeF, task.camera, task.pose, task.fitState);

  bool fitted;
  if (*task.trackFlag == 0) {
    fitted = FitNewFace(task, plain, &rounds);
    if (fitted) *task.trackFlag = 1;
  } else {
    fitted = FitTrackedFace(task, plain, plain, &rounds);
  }
  *task.fitGivenUp = fitted ? 0 : 1;
  FinishFace(task, rounds);
  return nullptr;
}

}  // namespace n3ds
