// SPDX-License-Identifier: MIT
#include "core/rigid_pose_smoothing.h"

#include <cmath>

#include "core/landmark_motion.h"
#include "core/tracking_context.h"

namespace n3ds {

namespace {

// Weights of previous and new pose, as pairs of constants: the second is what single precision gives
// for 1 minus the rounded first.
constexpr BlendWeights kMostTranslation = {0.8f, 0.19999999f};
constexpr BlendWeights kMostRotation = {0.95f, 0.050000012f};

// The previous translation's weight falls from kStillWeight by kWeightSlope per unit of change, and
// is kFastWeight from kFastChange on; the rotation is held back kRotationShare times as much.
constexpr double kStillWeight = 0.8;
constexpr double kWeightSlope = 0.05;
constexpr float kFastChange = 12.0f;
constexpr float kFastWeight = 0.2f;
constexpr double kRotationShare = 1.2;
constexpr float kRotationAtMostTranslation = 0.96f;

// Motions are compared on a face of this outline width, as the mean move of a landmark.
constexpr float kReferenceWidth = 800.0f;
constexpr int kEyeCorners[] = {39, 45, 51, 57};
constexpr int kJaw[] = {3, 15};     // outline landmarks, first and last
constexpr int kMouth[] = {75, 94};  // first and last
constexpr float kEyeCornerCount = 4.0f;
constexpr float kLowerFaceCount = 33.0f;
static_assert(kLowerFaceCount == kJaw[1] - kJaw[0] + 1 + kMouth[1] - kMouth[0] + 1);

constexpr double kSmallestMotion = 1e-6;  // of the lower face, to divide by
constexpr float kLowerFaceMoves = 2.0f;   // from here on the whole face moves: the factor is 1

// 100 for a turn of one unit of the quaternion, 1 per millimetre.
float PoseChange(const float* previous, const float* pose) {
  float turn = 0.0f;
  for (int i = 0; i < 4; ++i) turn += std::fabs(pose[i] - previous[i]);
  float change = 100.0f * turn;
  for (int i = 4; i < kPoseSize; ++i) change += std::fabs(pose[i] - previous[i]);
  return change;
}

}  // namespace

float MotionFactor(const int32_t* landmarks, const int32_t* previous, float outline_width) {
  MotionSum eyes;
  for (const int k : kEyeCorners) eyes.Add(landmarks, previous, k, k);
  MotionSum lower_face;
  lower_face.Add(landmarks, previous, kJaw[0], kJaw[1]);
  lower_face.Add(landmarks, previous, kMouth[0], kMouth[1]);
  const float lower_motion =
      lower_face.Size() * kReferenceWidth / (outline_width * kLowerFaceCount);
  // Negated, so that a NaN motion gives 1.
  if (!(std::fabs(static_cast<double>(lower_motion)) > kSmallestMotion &&
        lower_motion < kLowerFaceMoves)) {
    return 1.0f;
  }
  const float ratio =
      eyes.Size() * kReferenceWidth / (outline_width * kEyeCornerCount) / lower_motion;
  // Linear between a ratio of 2 and one of 10.
  if (ratio > 10.0f) return 2.0f;
  return ratio > 2.0f ? 0.75f + 0.125f * ratio : 1.0f;
}

void SmoothPose(const float* previous, float motion_factor, float* pose) {
  const float change = PoseChange(previous, pose);
  const float base =
      change < kFastChange
          ? static_cast<float>(kStillWeight - kWeightSlope * static_cast<double>(change))
          : kFastWeight;
  const float weight = motion_factor * base;
  BlendWeights translation = kMostTranslation;
  float turn = kRotationAtMostTranslation;
  if (!(static_cast<double>(weight) > 0.8)) {
    translation = {weight, 1.0f - weight};
    turn = static_cast<float>(kRotationShare * static_cast<double>(weight));
  }
  const BlendWeights rotation =
      static_cast<double>(turn) > 0.95 ? kMostRotation : BlendWeights{turn, 1.0f - turn};
  for (int i = 0; i < kPoseSize; ++i) {
    const BlendWeights& w = i < 4 ? rotation : translation;
    pose[i] = w.previous * previous[i] + w.current * pose[i];
  }
}

}  // namespace n3ds
