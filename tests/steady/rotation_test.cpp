// SPDX-License-Identifier: MIT
#include "steady/rotation.h"

#include <gtest/gtest.h>

#include <cmath>

#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using steady::Rotation;
using steady::TurnBy;
using steady::TurnOf;

TEST(SteadyRotation, TurnOfTakesBackWhatTurnByMade) {
  Random random = TestRandom();
  for (int i = 0; i < 1000; i++) {
    const double size = i < 500 ? 2.5 : 1e-4;
    const float w[3] = {static_cast<float>(random.In(-size, size) / 2),
                        static_cast<float>(random.In(-size, size) / 2),
                        static_cast<float>(random.In(-size, size) / 2)};
    float back[3];
    TurnOf(TurnBy(w), back);
    for (int k = 0; k < 3; k++) EXPECT_NEAR(back[k], w[k], 2e-6);
  }
}

TEST(SteadyRotation, NoTurnIsTheIdentity) {
  const float none[3] = {0, 0, 0};
  const Rotation r = TurnBy(none);
  for (int i = 0; i < 9; i++) EXPECT_EQ(r.m[i], i % 4 == 0 ? 1.0f : 0.0f);
}

TEST(SteadyRotation, TurnByFollowsTheRightHand) {
  const float about_z[3] = {0, 0, 1.5707963f};
  const Rotation r = TurnBy(about_z);
  EXPECT_NEAR(r.m[3], 1, 1e-6);  // x goes to y
  EXPECT_NEAR(r.m[1], -1, 1e-6);
  EXPECT_NEAR(r.m[8], 1, 1e-6);
}

TEST(SteadyRotation, OrthonormaliseTakesSmallErrorsOff) {
  Random random = TestRandom();
  const float w[3] = {0.3f, -0.7f, 0.2f};
  Rotation r = TurnBy(w);
  for (float& value : r.m) value += static_cast<float>(random.In(-1e-3, 1e-3));
  steady::Orthonormalise(&r);
  const Rotation one = r * Transposed(r);
  for (int i = 0; i < 9; i++) EXPECT_NEAR(one.m[i], i % 4 == 0 ? 1 : 0, 2e-6);
}

}  // namespace
}  // namespace n3ds::testing
