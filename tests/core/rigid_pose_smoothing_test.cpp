// SPDX-License-Identifier: MIT
#include "core/rigid_pose_smoothing.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <vector>

namespace n3ds::testing {
namespace {

TEST(SmoothPose, TheSmallestMoveHasTheLargestWeights) {
  const float previous[7] = {0, 0, 0, 0, 0, 0, 0};
  float pose[7] = {0, 0, 0, 1e-6f, 0, 0, 1e-6f};
  SmoothPose(previous, 1.0f, pose);
  EXPECT_EQ(pose[3], 0.050000012f * 1e-6f + 0.95f * 0.0f);
  const float d = 100.0f * 1e-6f + 1e-6f;  // the pose change
  const float a = static_cast<float>(0.8 - 0.05 * static_cast<double>(d));
  ASSERT_LT(static_cast<double>(a), 0.8);
  EXPECT_EQ(pose[6], (1.0f - a) * 1e-6f);
}

TEST(SmoothPose, WeightAboveEightTenthsIsCutToThePairsOfConstants) {
  const float previous[7] = {1, 1, 1, 1, 2, 2, 2};
  float pose[7] = {1, 1, 1, 1, 2, 2, 2};  // no change: base weight 0.8, above 0.8 in double
  SmoothPose(previous, 1.0f, pose);
  EXPECT_EQ(pose[0], 0.95f * 1.0f + 0.050000012f * 1.0f);
  EXPECT_EQ(pose[4], 0.8f * 2.0f + 0.19999999f * 2.0f);

  // The same through a factor above 1.
  float moved[7] = {1, 1, 1, 1, 7, 2, 2};  // change 5: base weight 0.55, times 2
  SmoothPose(previous, 2.0f, moved);
  EXPECT_EQ(moved[4], 0.8f * 2.0f + 0.19999999f * 7.0f);
  EXPECT_EQ(moved[0], 0.95f + 0.050000012f);
}

TEST(SmoothPose, ThePairsOfConstantsShowInEveryBit) {
  constexpr float kTurn = 9.5367431640625e-7f;
  const float previous[7] = {0, 0, 0, 0, 0, 0, 0};
  // A change of 5: base weight 0.55, times 1.5 is 0.825, times 2 is 1.1.
  for (const float factor : {1.5f, 2.0f}) {
    float pose[7] = {kTurn, 0, 0, 0, 5, 0, 0};
    SmoothPose(previous, factor, pose);
    EXPECT_EQ(pose[4], 0.19999999f * 5.0f);
    EXPECT_EQ(pose[0], 0.050000012f * kTurn);
  }
}

TEST(SmoothPose, BaseWeightFallsByOneTwentiethPerUnitOfChange) {
  const float previous[7] = {0, 0, 0, 0, 0, 0, 0};
  float pose[7] = {0, 0, 0, 0, 0, 4, 0};
  SmoothPose(previous, 1.0f, pose);
  const float a = static_cast<float>(0.8 - 0.05 * 4.0);
  EXPECT_EQ(pose[5], (1.0f - a) * 4.0f);
}

TEST(SmoothPose, ATurnCountsAHundredfold) {
  const float previous[7] = {0, 0, 0, 0, 0, 0, 0};
  float pose[7] = {0.03125f, -0.03125f, 0, 0, 0, 0, 0};
  SmoothPose(previous, 1.0f, pose);  // change 6.25
  const float a = static_cast<float>(0.8 - 0.05 * 6.25);
  const float e = static_cast<float>(1.2 * static_cast<double>(a));
  EXPECT_EQ(pose[0], (1.0f - e) * 0.03125f);
  EXPECT_EQ(pose[1], (1.0f - e) * -0.03125f);
}

TEST(SmoothPose, FromAChangeOfTwelveOnAFifthIsKept) {
  const float previous[7] = {0, 0, 0, 0, 0, 0, 0};
  float pose[7] = {0, 0, 0, 0, 12, 0, 0};
  SmoothPose(previous, 1.0f, pose);
  EXPECT_EQ(pose[4], (1.0f - 0.2f) * 12.0f);
  float far[7] = {0, 0, 0, 0, 0, 0, 1000};
  SmoothPose(previous, 1.0f, far);
  EXPECT_EQ(far[6], (1.0f - 0.2f) * 1000.0f);
  float below[7] = {0, 0, 0, 0, 11.5f, 0, 0};
  SmoothPose(previous, 1.0f, below);
  EXPECT_EQ(below[4], (1.0f - static_cast<float>(0.8 - 0.05 * 11.5)) * 11.5f);
}

TEST(SmoothPose, RotationKeepsOneAndAFifthTimesTheWeightUpToNinetyFivePercent) {
  // The quaternion's change is a power of two, too small to matter, that shows its weight exactly.
  constexpr float kTurn = 9.5367431640625e-7f;
  const float previous[7] = {0, 0, 0, 0, 0, 0, 0};
  const auto rotation_weight = [&](float move) {
    float pose[7] = {kTurn, 0, 0, 0, move, 0, 0};
    SmoothPose(previous, 1.0f, pose);
    return pose[0] / kTurn;
  };
  // A move of 0.2 gives a translation weight of 0.79 and a rotation weight of 0.948; 0.1 gives
  // 0.795 and 0.954, which is cut.
  const float change = 100.0f * kTurn + 0.2f;
  const float a = static_cast<float>(0.8 - 0.05 * static_cast<double>(change));
  const float e = static_cast<float>(1.2 * static_cast<double>(a));
  ASSERT_LT(static_cast<double>(e), 0.95);
  EXPECT_EQ(rotation_weight(0.2f), 1.0f - e);
  EXPECT_EQ(rotation_weight(0.1f), 0.050000012f);
}

TEST(SmoothPose, QuaternionIsNotRenormalised) {
  const float previous[7] = {1, 0, 0, 0, 0, 0, 0};
  float pose[7] = {0, 1, 0, 0, 0, 0, 0};
  SmoothPose(previous, 1.0f, pose);  // change 200: weight 0.2, rotation 0.24
  const float e = static_cast<float>(1.2 * static_cast<double>(0.2f));
  EXPECT_EQ(pose[0], e);
  EXPECT_EQ(pose[1], 1.0f - e);
  EXPECT_LT(pose[0] * pose[0] + pose[1] * pose[1], 0.7f);
}

// Landmarks of which the eye corners moved by (eye, 0) and jaw and mouth by (lower, 0) each.
struct Moved {
  std::vector<int32_t> now = std::vector<int32_t>(190, 500);
  std::vector<int32_t> before = std::vector<int32_t>(190, 500);
  Moved(int32_t eye, int32_t lower) {
    for (int k = 0; k < 95; k++) {
      if (k == 39 || k == 45 || k == 51 || k == 57) now[static_cast<size_t>(2 * k)] += eye;
      if ((k >= 3 && k <= 15) || k >= 75) now[static_cast<size_t>(2 * k + 1)] += lower;
    }
  }
  float Factor(float width) const { return MotionFactor(now.data(), before.data(), width); }
};

TEST(MotionFactor, IsOneForAStillFaceAndAZeroWidth) {
  EXPECT_EQ(Moved(0, 0).Factor(200), 1.0f);
  EXPECT_EQ(Moved(5, 0).Factor(200), 1.0f);  // nothing to compare the eyes with
  EXPECT_EQ(Moved(0, 0).Factor(0), 1.0f);
  EXPECT_EQ(Moved(5, 5).Factor(0), 1.0f);
}

TEST(MotionFactor, IsOneWhenTheLowerFaceMoves) {
  // 800 / 400 per pixel: a move of 1 is 2.
  EXPECT_EQ(Moved(100, 1).Factor(400), 1.0f);
  EXPECT_EQ(Moved(100, 1).Factor(401), 2.0f);
}

TEST(MotionFactor, GrowsWithTheEyesMoveOverTheLowerFaces) {
  // Equal moves of all points give a ratio of about 1.
  EXPECT_EQ(Moved(1, 1).Factor(800), 1.0f);
  EXPECT_EQ(Moved(2, 1).Factor(800), 1.0f);  // 2 is not above 2
  EXPECT_EQ(Moved(3, 1).Factor(800), 0.75f + 0.125f * 3.0f);
  EXPECT_EQ(Moved(10, 1).Factor(800), 0.75f + 0.125f * 10.0f);
  EXPECT_EQ(Moved(11, 1).Factor(800), 2.0f);
  EXPECT_EQ(Moved(-11, -1).Factor(800), 2.0f);
  EXPECT_EQ(Moved(11, 1).Factor(8e6f), 2.0f);  // a lower face's move of a ten-thousandth counts
  EXPECT_EQ(Moved(11, 1).Factor(8e9f), 1.0f);  // one of a ten-millionth is none
}

TEST(MotionFactor, LooksAtEyeCornersJawAndMouthOnly) {
  for (int k = 0; k < 95; k++) {
    const bool eye = k == 39 || k == 45 || k == 51 || k == 57;
    const bool lower = (k >= 3 && k <= 15) || k >= 75;
    Moved moved(0, 1);
    moved.now[static_cast<size_t>(2 * k)] += 40;
    const float factor = moved.Factor(8000);  // the lower face's move stays small
    const float ratio = lower ? 0.0f : 10.0f;
    EXPECT_EQ(factor, eye ? 0.75f + 0.125f * ratio : 1.0f) << k;
  }
}

}  // namespace
}  // namespace n3ds::testing
