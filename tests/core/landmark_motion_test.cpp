// SPDX-License-Identifier: MIT
#include "core/landmark_motion.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

#include "support/test_random.h"

namespace n3ds::testing {
namespace {

std::vector<int32_t> Landmarks(int32_t value = 0) { return std::vector<int32_t>(190, value); }

void Move(std::vector<int32_t>* landmarks, int k, int32_t dx, int32_t dy) {
  (*landmarks)[static_cast<size_t>(2 * k)] += dx;
  (*landmarks)[static_cast<size_t>(2 * k + 1)] += dy;
}

TEST(OutlineWidth, IsTheDistanceOfTheOutlinesEnds) {
  std::vector<int32_t> landmarks = Landmarks(50);
  Move(&landmarks, 0, -30, 0);
  Move(&landmarks, 18, 0, 40);
  EXPECT_EQ(OutlineWidth(landmarks.data()), 50.0f);
  EXPECT_EQ(OutlineWidth(Landmarks(7).data()), 0.0f);
}

TEST(SteadyPointMotion, IsZeroForAStillFace) {
  const std::vector<int32_t> landmarks = Landmarks(11);
  EXPECT_EQ(SteadyPointMotion(landmarks.data(), landmarks.data(), 200.0f), 0.0f);
}

TEST(SteadyPointMotion, AddsSignedMovesOfEightPointsInPercentOfTheWidth) {
  for (int k = 0; k < 95; k++) {
    std::vector<int32_t> landmarks = Landmarks();
    Move(&landmarks, k, -3, 5);
    const bool counts =
        k == 45 || k == 51 || k == 63 || k == 64 || k == 68 || k == 69 || k == 73 || k == 74;
    EXPECT_EQ(SteadyPointMotion(landmarks.data(), Landmarks().data(), 200.0f), counts ? 4.0f : 0.0f)
        << k;
  }
  // Opposite moves cancel.
  std::vector<int32_t> landmarks = Landmarks();
  Move(&landmarks, 45, 30, 0);
  Move(&landmarks, 51, -30, 0);
  Move(&landmarks, 63, 0, 8);
  EXPECT_EQ(SteadyPointMotion(landmarks.data(), Landmarks().data(), 200.0f), 4.0f);
}

TEST(SteadyPointMotion, IsInfiniteOrNotANumberForAZeroWidth) {
  std::vector<int32_t> landmarks = Landmarks();
  EXPECT_TRUE(std::isnan(SteadyPointMotion(landmarks.data(), Landmarks().data(), 0.0f)));
  Move(&landmarks, 45, 1, 0);
  EXPECT_TRUE(std::isinf(SteadyPointMotion(landmarks.data(), Landmarks().data(), 0.0f)));
}

TEST(SmoothingWeights, AStillFaceKeepsSevenTenthsOfItsPlace) {
  const BlendWeights weights = SmoothingWeights(0.0f, 0.025, 24.0f);
  EXPECT_EQ(weights.previous, 0.7f);
  EXPECT_EQ(weights.current, 1.0f - 0.7f);
}

TEST(SmoothingWeights, FallWithTheMotionUpToTheLimit) {
  const BlendWeights middle = SmoothingWeights(8.0f, 0.025, 24.0f);
  EXPECT_EQ(middle.previous, 0.5f);
  EXPECT_EQ(middle.current, 0.5f);
  const float below = std::nextafter(24.0f, 0.0f);
  EXPECT_EQ(SmoothingWeights(below, 0.025, 24.0f).previous,
            static_cast<float>(0.7 - 0.025 * static_cast<double>(below)));
  const BlendWeights limit = SmoothingWeights(24.0f, 0.025, 24.0f);
  EXPECT_EQ(limit.previous, 0.1f);
  EXPECT_EQ(limit.current, 0.9f);
  EXPECT_EQ(SmoothingWeights(100.0f, 0.025, 24.0f).previous, 0.1f);
}

TEST(SmoothingWeights, TheMaskModesSlopeIsSteeper) {
  EXPECT_EQ(SmoothingWeights(6.0f, 0.05, 12.0f).previous, static_cast<float>(0.7 - 0.05 * 6.0));
  EXPECT_EQ(SmoothingWeights(12.0f, 0.05, 12.0f).previous, 0.1f);
}

TEST(SmoothingWeights, AMotionThatIsNotANumberCountsAsLarge) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  EXPECT_EQ(SmoothingWeights(nan, 0.025, 24.0f).previous, 0.1f);
  EXPECT_EQ(SmoothingWeights(nan, 0.025, 24.0f).current, 0.9f);
  EXPECT_EQ(SmoothingWeights(std::numeric_limits<float>::infinity(), 0.05, 12.0f).current, 0.9f);
}

TEST(BlendLandmarks, TruncatesTowardZero) {
  std::vector<int32_t> landmarks = Landmarks();
  std::vector<int32_t> previous = Landmarks();
  // 0.7 * 10 + 0.3 * 15 = 11.5, and its mirror image.
  landmarks[0] = 15, previous[0] = 10;
  landmarks[1] = -15, previous[1] = -10;
  landmarks[188] = 1, previous[188] = 0;
  landmarks[189] = 100, previous[189] = 200;
  BlendLandmarks({0.7f, 1.0f - 0.7f}, previous.data(), landmarks.data());
  EXPECT_EQ(landmarks[0], 11);
  EXPECT_EQ(landmarks[1], -11);
  EXPECT_EQ(landmarks[188], 0);
  EXPECT_EQ(landmarks[189], 170);
}

TEST(BlendLandmarks, BlendsNinetyFiveLandmarksAndNoMore) {
  std::vector<int32_t> landmarks(202, 100);
  const std::vector<int32_t> previous(202, 0);
  BlendLandmarks({0.5f, 0.5f}, previous.data(), landmarks.data());
  std::vector<int32_t> expected(202, 50);
  std::fill(expected.begin() + 190, expected.end(), 100);
  EXPECT_EQ(landmarks, expected);
}

TEST(BlendLandmarks, ProductsAreRoundedBeforeTheyAreAdded) {
  Random random = TestRandom();
  int differs = 0;
  for (int trial = 0; trial < 3000; trial++) {
    std::vector<int32_t> landmarks = Landmarks(), previous = Landmarks();
    for (int32_t& c : landmarks) c = random.Int(-4000, 4000);
    for (int32_t& c : previous) c = random.Int(-4000, 4000);
    const BlendWeights w = SmoothingWeights(static_cast<float>(random.In(0, 30)), 0.025, 24.0f);
    std::vector<int32_t> expected;
    for (size_t i = 0; i < 190; i++) {
      // volatile: no compiler may fuse these.
      const volatile float kept = w.previous * static_cast<float>(previous[i]);
      const volatile float taken = w.current * static_cast<float>(landmarks[i]);
      const float sum = kept + taken;
      expected.push_back(static_cast<int32_t>(sum));
      const float fused = std::fma(w.previous, static_cast<float>(previous[i]), taken);
      differs += static_cast<int32_t>(fused) != expected.back() ? 1 : 0;
    }
    BlendLandmarks(w, previous.data(), landmarks.data());
    ASSERT_EQ(landmarks, expected) << trial;
  }
  EXPECT_GT(differs, 0);
}

TEST(BlendLandmarks, SaturatesInsteadOfOverflowing) {
  std::vector<int32_t> landmarks = Landmarks(INT32_MAX), previous = Landmarks(INT32_MAX);
  BlendLandmarks({0.7f, 0.3f}, previous.data(), landmarks.data());
  EXPECT_EQ(landmarks[0], INT32_MAX);
  landmarks = Landmarks(INT32_MIN), previous = Landmarks(INT32_MIN);
  BlendLandmarks({0.7f, 0.3f}, previous.data(), landmarks.data());
  EXPECT_EQ(landmarks[0], INT32_MIN);
}

TEST(MotionSum, IsTheSumOfTheAxes) {
  MotionSum sum;
  std::vector<int32_t> landmarks = Landmarks();
  Move(&landmarks, 3, -7, 2);
  Move(&landmarks, 4, 3, 2);
  Move(&landmarks, 5, 100, 100);
  sum.Add(landmarks.data(), Landmarks().data(), 3, 4);
  EXPECT_EQ(sum.x, -4.0f);
  EXPECT_EQ(sum.y, 4.0f);
  EXPECT_EQ(sum.Size(), 8.0f);
}

}  // namespace
}  // namespace n3ds::testing
