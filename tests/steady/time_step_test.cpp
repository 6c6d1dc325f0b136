// SPDX-License-Identifier: MIT
#include "steady/time_step.h"

#include <gtest/gtest.h>

namespace n3ds::testing {
namespace {

using steady::MakeTimeStep;
using steady::TimeStep;

// Place, speed and acceleration after a step.
struct Motion {
  double place, speed, acceleration;
};
Motion Move(const TimeStep& step, const Motion& from) {
  return {from.place + step.place_by_speed * from.speed +
              step.place_by_acceleration * from.acceleration,
          from.speed + step.speed_by_acceleration * from.acceleration,
          step.acceleration_kept * from.acceleration};
}

TEST(SteadyTimeStep, TwoHalfStepsMoveLikeOne) {
  const Motion start = {1, 0.5, -0.25};
  const Motion whole = Move(MakeTimeStep(0.1, 0.5f), start);
  const TimeStep half = MakeTimeStep(0.05, 0.5f);
  const Motion halves = Move(half, Move(half, start));
  EXPECT_NEAR(halves.place, whole.place, 1e-6);
  EXPECT_NEAR(halves.speed, whole.speed, 1e-6);
  EXPECT_NEAR(halves.acceleration, whole.acceleration, 1e-6);
}

TEST(SteadyTimeStep, TwoHalfStepsBlurLikeOne) {
  const TimeStep whole = MakeTimeStep(2 / 30.0, 0.5f);
  const TimeStep half = MakeTimeStep(1 / 30.0, 0.5f);
  // C = F B F' + B with F the step's map.
  const double f[3][3] = {{1, half.place_by_speed, half.place_by_acceleration},
                          {0, 1, half.speed_by_acceleration},
                          {0, 0, half.acceleration_kept}};
  const int at[3][3] = {{0, 1, 2}, {1, 3, 4}, {2, 4, 5}};
  for (int i = 0; i < 3; i++) {
    for (int j = i; j < 3; j++) {
      double sum = half.blur[at[i][j]];
      for (int k = 0; k < 3; k++) {
        for (int l = 0; l < 3; l++) sum += f[i][k] * f[j][l] * half.blur[at[k][l]];
      }
      const double expected = whole.blur[at[i][j]];
      EXPECT_NEAR(sum, expected, 1e-4 * expected) << i << " " << j;
    }
  }
}

TEST(SteadyTimeStep, OneThirtiethGivesTheAccelerationUnitNoise) {
  const TimeStep step = MakeTimeStep(1 / 30.0, 0.5f);
  EXPECT_NEAR(step.blur[5], 1, 1e-5);
  EXPECT_NEAR(step.expression_blur, 1, 1e-6);
  EXPECT_NEAR(step.length, 1, 1e-6);
}

TEST(SteadyTimeStep, StepsAreHeldInTheirRange) {
  EXPECT_EQ(MakeTimeStep(0, 0.5f).length, 0.1f);
  EXPECT_EQ(MakeTimeStep(1e9, 0.5f).length, 60.0f);
}

TEST(SteadyTimeStep, SmoothingLowersTheNoiseOfTheMotionAlone) {
  const TimeStep still = MakeTimeStep(1 / 30.0, 1.0f);
  const TimeStep middle = MakeTimeStep(1 / 30.0, 0.5f);
  const TimeStep quick = MakeTimeStep(1 / 30.0, 0.0f);
  for (int i = 0; i < 6; i++) {
    EXPECT_LT(still.blur[i], middle.blur[i]);
    EXPECT_LT(middle.blur[i], quick.blur[i]);
  }
  EXPECT_EQ(still.expression_blur, quick.expression_blur);
}

}  // namespace
}  // namespace n3ds::testing
