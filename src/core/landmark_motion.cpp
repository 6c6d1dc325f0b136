// SPDX-License-Identifier: MIT
#include "core/landmark_motion.h"

#include <cmath>

#include "core/model_tables.h"
#include "platform/integer_arithmetic.h"

namespace n3ds {

namespace {

// Inner eye corners, upper nose and nostrils: they hardly move with the expression.
constexpr int kSteadyLandmarks[] = {45, 51, 63, 64, 68, 69, 73, 74};

constexpr double kStillWeight = 0.7;  // of the previous frame, for a face that is still
constexpr BlendWeights kFastWeights = {0.1f, 0.9f};  // for one that moves fast

constexpr int kLastOutlineLandmark = kOutlineLandmarkCount - 1;

}  // namespace

float OutlineWidth(const int32_t* landmarks) {
  const int32_t dx = WrapSubtract(landmarks[0], landmarks[2 * kLastOutlineLandmark]);
  const int32_t dy = WrapSubtract(landmarks[1], landmarks[2 * kLastOutlineLandmark + 1]);
  return std::sqrt(static_cast<float>(WrapAdd(WrapMultiply(dx, dx), WrapMultiply(dy, dy))));
}

float MotionSum::Size() const { return std::fabs(x) + std::fabs(y); }

void MotionSum::Add(const int32_t* landmarks, const int32_t* previous, int first, int last) {
  for (int k = first; k <= last; ++k) {
    x += static_cast<float>(WrapSubtract(landmarks[2 * k], previous[2 * k]));
    y += static_cast<float>(WrapSubtract(landmarks[2 * k + 1], previous[2 * k + 1]));
  }
}

float SteadyPointMotion(const int32_t* landmarks, const int32_t* previous, float outline_width) {
  MotionSum sum;
  for (const int k : kSteadyLandmarks) sum.Add(landmarks, previous, k, k);
  return sum.Size() * 100.0f / outline_width;
}

BlendWeights SmoothingWeights(float motion, double slope, float limit) {
  if (!(motion < limit)) return kFastWeights;
  const auto previous = static_cast<float>(kStillWeight - slope * static_cast<double>(motion));
  return {previous, 1.0f - previous};
}

void BlendLandmarks(const BlendWeights& weights, const int32_t* previous, int32_t* landmarks) {
  for (int i = 0; i < 2 * kFitLandmarkCount; ++i) {
    landmarks[i] = TruncateToInt32(weights.previous * static_cast<float>(previous[i]) +
                                   weights.current * static_cast<float>(landmarks[i]));
  }
}

}  // namespace n3ds
