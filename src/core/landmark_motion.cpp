// SPDX-License-Identifier: MIT
#include "core/landmark_motion.h"

#include <cmath>
#include <initializer_list>

#include "core/model_tables.h"
#include "platform/integer_arithmetic.h"

namespace n3ds {

float OutlineWidth(const int32_t* landmarks) {
  const int32_t dx = WrapSubtract(landmarks[0], landmarks[2 * 18]);
  const int32_t dy = WrapSubtract(landmarks[1], landmarks[2 * 18 + 1]);
  return std::sqrt(static_cast<float>(WrapAdd(WrapMultiply(dx, dx), WrapMultiply(dy, dy))));
}

float MotionSum::Size() const { return std::fabs(x) + std::fabs(y); }

void MotionSum::Add(const int32_t* landmarks, const int32_t* previous, int first, int last) {
  for (int k = first; k <= last; k++) {
    x += static_cast<float>(WrapSubtract(landmarks[2 * k], previous[2 * k]));
    y += static_cast<float>(WrapSubtract(landmarks[2 * k + 1], previous[2 * k + 1]));
  }
}

float SteadyPointMotion(const int32_t* landmarks, const int32_t* previous, float outline_width) {
  MotionSum sum;
  for (const int k : {45, 51, 63, 64, 68, 69, 73, 74}) sum.Add(landmarks, previous, k, k);
  return sum.Size() * 100.0f / outline_width;
}

BlendWeights SmoothingWeights(float motion, double slope, float limit) {
  if (!(motion < limit)) return {0.1f, 0.9f};
  const auto previous = static_cast<float>(0.7 - slope * static_cast<double>(motion));
  return {previous, 1.0f - previous};
}

void BlendLandmarks(const BlendWeights& weights, const int32_t* previous, int32_t* landmarks) {
  for (int i = 0; i < 2 * kFitLandmarkCount; i++) {
    landmarks[i] = TruncateToInt32(weights.previous * static_cast<float>(previous[i]) +
                                   weights.current * static_cast<float>(landmarks[i]));
  }
}

}  // namespace n3ds
