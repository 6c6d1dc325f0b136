// SPDX-License-Identifier: MIT
// How the state moves and blurs in the time from one frame to the next.
#pragma once

namespace n3ds::steady {

// Time is counted in 1/30 s. The acceleration a decays, a' = -l a; then with e = exp(-l s)
//   place += s v + (l s - 1 + e) / l^2 a,   v += (1 - e) / l a,   a *= e
// is exact, and white noise on a blurs (place, v, a) by the integral over the step of h h',
//   h(t) = ((l t - 1 + exp(-l t)) / l^2, (1 - exp(-l t)) / l, exp(-l t)).
struct TimeStep {
  double steps;          // s
  float length;          // the same
  float place_by_speed;  // s
  float place_by_acceleration;
  float speed_by_acceleration;
  float acceleration_kept;
  // Covariance of (place, v, a) for noise that gives the acceleration unit variance in one step:
  // place-place, place-v, place-a, v-v, v-a, a-a. `smoothing` is in it.
  float blur[6];
  float expression_kept;
  float expression_blur;  // of unit noise a step
  float inflation;        // of the landmarks' noise: a faster camera brings little that is new
  float offset_inflation;
  float noise_rate;  // share of a new noise estimate
};

// `seconds` since the last frame; `smoothing` 0 to 1.
TimeStep MakeTimeStep(double seconds, float smoothing);

}  // namespace n3ds::steady
