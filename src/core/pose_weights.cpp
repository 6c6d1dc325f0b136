// SPDX-License-Identifier: MIT
#include "core/pose_weights.h"

#include <algorithm>
#include <cmath>

#include "norvale_3d_sticker_core.h"
#include "platform/integer_arithmetic.h"

namespace n3ds {

namespace {

constexpr double kSmallestDivisor = 1e-6;
constexpr double kMouthOpenRatio = 0.1;  // lip gap over mouth width

// Frontal: the half-widths are even, and the eyes lie as high above the nose as this share of the
// chin's distance below it.
constexpr double kEvenHalves = 0.75;
constexpr double kLowestEyes = 0.5;
constexpr double kHighestEyes = 0.9;

// Limits beyond which the weighting switch is cleared.
constexpr double kUnevenSides = 1.15;    // longer over shorter distance of a symmetric pair
constexpr double kLongChin = 2.3;        // mouth to chin over mouth to nose
constexpr double kSmallestAngle = 75.0;  // between the lines of eyes and nose, degrees

constexpr float kSmallestInner = 0.1f;
constexpr float kLargestInner = 10.0f;

struct Point {
  int32_t x;
  int32_t y;
};

Point Midpoint(const Point& a, const Point& b) {
  return {WrapAdd(a.x, b.x) / 2, WrapAdd(a.y, b.y) / 2};
}

double Distance(const Point& a, const Point& b) {
  const double dx = WrapSubtract(a.x, b.x);
  const double dy = WrapSubtract(a.y, b.y);
  return std::sqrt(dx * dx + dy * dy);
}

struct Normal {
  float x;
  float y;
};

// Normal of the line through two points, not of unit length.
Normal LineNormal(const Point& a, const Point& b) {
  const int32_t dx = WrapSubtract(a.x, b.x);
  const int32_t dy = WrapSubtract(a.y, b.y);
  if (dx == 0) return {1.0f, 0.0f};
  if (dy == 0) return {0.0f, 1.0f};
  return {static_cast<float>(dy) / static_cast<float>(dx), -1.0f};
}

// Rounding can put the cosine of parallel lines above 1; their angle is then NaN.
double AngleInDegrees(const Normal& a, const Normal& b) {
  const float dot = std::fabs(a.x * b.x + a.y * b.y);
  const float squared_lengths = (a.x * a.x + a.y * a.y) * (b.x * b.x + b.y * b.y);
  const auto cosine = static_cast<float>(static_cast<double>(dot) /
                                         std::sqrt(static_cast<double>(squared_lengths)));
  return std::acos(static_cast<double>(cosine)) * 180.0 / 3.14159;
}

// Clears the switch when the ratio of two distances exceeds the limit. False, and nothing is done,
// when the smaller one is too small to divide by.
bool ClearIfBeyond(double numerator, double denominator, double limit, PoseWeights* weights) {
  if (denominator < kSmallestDivisor) return false;
  if (numerator / denominator > limit) weights->weighting_switch = 0;
  return true;
}
bool ClearIfUneven(double a, double b, PoseWeights* weights) {
  return ClearIfBeyond(std::max(a, b), std::min(a, b), kUnevenSides, weights);
}

// The weighting switch stays for an even, upright face only.
template <typename PointOf>
void CheckSwitch(const PointOf& point, const Point& nose_base, PoseWeights* weights) {
  const Point chin = point(9);
  if (!ClearIfUneven(Distance(chin, point(75)), Distance(chin, point(81)), weights)) return;
  const Point mouth = Midpoint(point(75), point(81));
  if (!ClearIfBeyond(Distance(mouth, chin), Distance(mouth, nose_base), kLongChin, weights)) return;
  if (!ClearIfUneven(Distance(nose_base, point(39)), Distance(nose_base, point(57)), weights)) {
    return;
  }
  const Point left_eye = Midpoint(point(42), point(48));
  const Point right_eye = Midpoint(point(54), point(60));
  const double angle =
      AngleInDegrees(LineNormal(left_eye, right_eye), LineNormal(mouth, nose_base));
  if (angle < kSmallestAngle) weights->weighting_switch = 0;
}

}  // namespace

int32_t ComputePoseWeights(const int32_t* landmarks, PoseWeights* weights) {
  if (landmarks == nullptr) return N3DS_NULL_ARGUMENT;
  const auto point = [landmarks](int k) { return Point{landmarks[2 * k], landmarks[2 * k + 1]}; };

  const auto mouth_width = static_cast<double>(static_cast<float>(Distance(point(75), point(81))));
  if (mouth_width < kSmallestDivisor) return N3DS_OK;
  const double mouth_ratio = Distance(point(89), point(93)) / mouth_width;
  if (mouth_ratio > kMouthOpenRatio) weights->mouth_open = 1;

  const Point nose = Midpoint(point(66), point(71));
  const double left = Distance(point(2), nose);
  const double right = Distance(point(16), nose);
  if (std::max(left, right) < kSmallestDivisor) return N3DS_OK;
  const double symmetry = std::min(left, right) / std::max(left, right);

  weights->contour = 1.0f;
  if (mouth_ratio < kMouthOpenRatio) {
    weights->range = 1.0f;
  } else if (mouth_ratio <= 1.0) {
    weights->range = static_cast<float>(1.1 - mouth_ratio);
  } else {
    weights->range = 0.1f;
  }
  if (right < kSmallestDivisor) return N3DS_OK;
  weights->inner = static_cast<float>(left / right);

  const Point eyes = Midpoint(point(45), point(51));
  const Point nose_base = Midpoint(point(68), point(69));
  const double chin_distance = Distance(point(9), nose_base);
  if (chin_distance < kSmallestDivisor) return N3DS_OK;
  const double pitch_ratio = Distance(eyes, nose_base) / chin_distance;
  if (pitch_ratio > kLowestEyes && symmetry > kEvenHalves && pitch_ratio < kHighestEyes) {
    weights->frontal = 1;
  }
  CheckSwitch(point, nose_base, weights);
  return N3DS_OK;
}

bool AllowsIdentityFit(const PoseWeights& weights) {
  return weights.mouth_open == 0 && weights.frontal == 1 && weights.weighting_switch == 1;
}

float ClampInnerWeight(float weight) {
  // In double, where 0.1 differs from 0.1f.
  if (static_cast<double>(weight) < 0.1) return kSmallestInner;
  return weight > kLargestInner ? kLargestInner : weight;
}

}  // namespace n3ds
