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

// Retries have no bound: a worker has no way to report a failure, and the outputs of a face without
// a pose would be worthless.
void FitTrackedFace(const int32_t* landmarks, const FitWeights& first_weights,
                    const FitWeights& retry_weights, PoseRounds* rounds) {
  bool fitted = rounds->Fit(landmarks, rounds->contour(), first_weights);
  if (fitted) {
    rounds->UpdateContour(landmarks);
    return;
  }
  ShiftedLandmarks shifted(landmarks);
  while (!fitted) {
    const int32_t* moved = shifted.Shift();
    fitted = rounds->Fit(moved, rounds->contour(), retry_weights);
    if (fitted) rounds->UpdateContour(moved);
  }
}

void FitNewFace(const int32_t* landmarks, const FitWeights& weights, PoseRounds* rounds) {
  rounds->StartNewFace();
  bool fitted = rounds->Fit(landmarks, kDefaultContourVertexIndices, weights);
  const auto run_rounds = [&](const int32_t* points) {
    for (int i = 0; i < kNewFaceRounds; ++i) {
      if (fitted) rounds->UpdateContour(points);
      fitted = rounds->Fit(points, rounds->contour(), weights);
    }
  };
  run_rounds(landmarks);
  ShiftedLandmarks shifted(landmarks);
  while (!fitted) run_rounds(shifted.Shift());
  rounds->UpdateContour(landmarks);
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

  if (*task.trackFlag == 0) {
    FitNewFace(task.landmarks, plain, &rounds);
    std::memset(task.identityCoef, 0, kIdentityCount * sizeof(float));
    std::memset(task.expressionCoef, 0, kExpressionCount * sizeof(float));
    *task.trackFlag = 1;
  } else {
    const float outline_width = OutlineWidth(task.landmarks);
    SmoothLandmarks(task, outline_width);
    float previous_pose[kPoseSize];
    std::memcpy(previous_pose, task.pose, sizeof(previous_pose));
    const FitWeights weighted = {1, weights.contour, weights.range, inner};
    FitTrackedFace(task.landmarks, weighted, plain, &rounds);
    SmoothPose(previous_pose, MotionFactor(task.landmarks, task.prevLandmarks, outline_width),
               task.pose);
    rounds.UpdateTransformFromPose();
    RefineShape(task, weights, rounds);
    *task.trackFlag = WrapAdd(*task.trackFlag, 1);
  }
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

  if (*task.trackFlag == 0) {
    FitNewFace(task.landmarks, plain, &rounds);
    *task.trackFlag = 1;
  } else {
    FitTrackedFace(task.landmarks, plain, plain, &rounds);
  }
  FinishFace(task, rounds);
  return nullptr;
}

}  // namespace n3ds
