// SPDX-License-Identifier: MIT
#include "core/rigid_pose_smoothing.h"

#include <cmath>
#include <initializer_list>

#include "core/landmark_motion.h"

namespace n3ds {

namespace {

// A weight and its complement, as pairs of constants: the complements are what single precision
// gives for 1 - weight of the rounded weight.
constexpr BlendWeights kMostTranslation = {0.8f, 0.19999999f};
constexpr BlendWeights kMostRotation = {0.95f, 0.050000012f};
constexpr float kRotationAtMostTranslation = 0.96f;

// 100 for a turn of one unit of the quaternion, 1 per millimetre.
float PoseChange(const float* previous, const float* pose) {
  float turn = 0.0f;
  for (int i = 0; i < 4; i++) turn += std::fabs(pose[i] - previous[i]);
  float change = 100.0f * turn;
  for (int i = 4; i < 7; i++) change += std::fabs(pose[i] - previous[i]);
  return change;
}

}  // namespace

float MotionFactor(const int32_t* landmarks, const int32_t* previous, float outline_width) {
  constexpr float kReferenceWidth = 800.0f;
  MotionSum eyes;
  for (const int k : {39, 45, 51, 57}) eyes.Add(landmarks, previous, k, k);
  MotionSum lower_face;
  lower_face.Add(landmarks, previous, 3, 15);   // outline round the jaw
  lower_face.Add(landmarks, previous, 75, 94);  // mouth
  const float g = lower_face.Size() * kReferenceWidth / (outline_width * 33.0f);
  if (!(std::fabs(static_cast<double>(g)) > 1e-6 && g < 2.0f)) return 1.0f;
  const float h = eyes.Size() * kReferenceWidth / (outline_width * 4.0f) / g;
  if (h > 10.0f) return 2.0f;
  return h > 2.0f ? 0.75f + 0.125f * h : 1.0f;
}

void SmoothPose(const float* previous, float motion_factor, float* pose) {
  const float change = PoseChange(previous, pose);
  const auto base =
      change < 12.0f ? static_cast<float>(0.8 - 0.05 * static_cast<double>(change)) : 0.2f;
  const float weight = motion_factor * base;
  BlendWeights translation = kMostTranslation;
  float turn = kRotationAtMostTranslation;
  if (!(static_cast<double>(weight) > 0.8)) {
    translation = {weight, 1.0f - weight};
    turn = static_cast<float>(1.2 * static_cast<double>(weight));
  }
  const BlendWeights rotation =
      static_cast<double>(turn) > 0.95 ? kMostRotation : BlendWeights{turn, 1.0f - turn};
  for (int i = 0; i < 7; i++) {
    const BlendWeights& w = i < 4 ? rotation : translation;
    pose[i] = w.previous * previous[i] + w.current * pose[i];
  }
}

}  // namespace n3ds
