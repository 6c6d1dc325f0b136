// SPDX-License-Identifier: MIT
#include "steady/time_step.h"

#include <algorithm>
#include <cmath>

#include "steady/tuning.h"

namespace n3ds::steady {

namespace {

constexpr double kStepsPerSecond = 30;

// The knob's ends scale the standard deviation of the process noise by this and by its inverse.
constexpr double kSmoothingRange = 4;

// By Simpson's rule: the closed form is a difference of nearly equal exponentials.
void IntegrateBlur(double s, double scale, float* blur) {
  constexpr int kIntervals = 16;
  const double l = kAccelerationDecay;
  double sum[6] = {};
  for (int i = 0; i <= kIntervals; i++) {
    const double t = s * i / kIntervals;
    const int middle = i % 2 == 1 ? 4 : 2;
    const double weight = i == 0 || i == kIntervals ? 1 : middle;
    const double a = std::exp(-l * t);
    const double v = (1 - a) / l;
    const double p = (l * t - 1 + a) / (l * l);
    const double products[6] = {p * p, p * v, p * a, v * v, v * a, a * a};
    for (int k = 0; k < 6; k++) sum[k] += weight * products[k];
  }
  for (int k = 0; k < 6; k++) blur[k] = static_cast<float>(sum[k] * scale * s / (3 * kIntervals));
}

}  // namespace

TimeStep MakeTimeStep(double seconds, float smoothing) {
  const double s = std::min(std::max(seconds * kStepsPerSecond, kShortestStep), kLongestStep);
  const double l = kAccelerationDecay;
  const double kept = std::exp(-l * s);
  TimeStep step;
  step.steps = s;
  step.length = static_cast<float>(s);
  step.place_by_speed = static_cast<float>(s);
  step.place_by_acceleration = static_cast<float>((l * s - 1 + kept) / (l * l));
  step.speed_by_acceleration = static_cast<float>((1 - kept) / l);
  step.acceleration_kept = static_cast<float>(kept);
  const double unit = 2 * l / (1 - std::exp(-2 * l));
  const double knob = std::pow(kSmoothingRange, 2 * (1 - 2 * static_cast<double>(smoothing)));
  IntegrateBlur(s, unit * knob, step.blur);
  step.expression_kept = static_cast<float>(std::exp(-kExpressionDecay * s));
  step.expression_blur = static_cast<float>((1 - std::exp(-2 * kExpressionDecay * s)) /
                                            (1 - std::exp(-2 * kExpressionDecay)));
  step.inflation = std::max(1.0f, static_cast<float>(static_cast<double>(kNoiseInflation) / s));
  step.offset_inflation = static_cast<float>(static_cast<double>(kOffsetInflation) / s);
  step.noise_rate = static_cast<float>(1 - std::pow(kNoiseMemory, s));
  return step;
}

}  // namespace n3ds::steady
