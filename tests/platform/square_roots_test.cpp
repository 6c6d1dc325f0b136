// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/guarded_array.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

float ExpectedInverseSqrt(float x) {
  int64_t bits = 0;
  std::memcpy(&bits, &x, 4);
  bits = static_cast<int32_t>(bits);
  // Floor division is the arithmetic shift; the difference is cut to 32 bits.
  const int64_t half = (bits - (bits & 1)) / 2;
  const uint32_t estimate = static_cast<uint32_t>(0x5F3759DF - half);
  float y = 0.0f;
  std::memcpy(&y, &estimate, 4);
  for (int step = 0; step < 2; ++step) {
    const float xy = x * y;
    const float bracket = std::fma(-y, xy, 3.0f);
    const float product = y * bracket;
    y = product * 0.5f;
  }
  return y;
}

TEST(SquareRoot, IsTheRoundedRoot) {
  EXPECT_EQ(mcvSqrtf32(2.0f), 1.41421354f);
  EXPECT_TRUE(SameBitsOrNan(mcvSqrtf32(-0.0f), -0.0f));
  EXPECT_TRUE(std::isnan(mcvSqrtf32(-1.0f)));
  Random random = TestRandom();
  for (size_t n = 0; n < 40; ++n) {
    GuardedArray<float> src(random.AwkwardFloats(n));
    GuardedArray<float> dst(n);
    std::vector<float> expected(n);
    for (size_t i = 0; i < n; ++i) expected[i] = static_cast<float>(std::sqrt(double{src[i]}));
    ASSERT_EQ(mcvSqrtVectorf32(src.data(), dst.data(), static_cast<int32_t>(n)), 0);
    ASSERT_EQ(FirstDifference(dst.Values(), expected), -1);
    for (size_t i = 0; i < n; ++i) ASSERT_TRUE(SameBitsOrNan(mcvSqrtf32(src[i]), expected[i]));
  }
}

TEST(InverseSquareRoot, IsTheEstimateAndTwoNewtonSteps) {
  EXPECT_FLOAT_EQ(mcvInvSqrtf32(4.0f), 0.4999978f);
  Random random = TestRandom();
  for (size_t n = 0; n < 60; ++n) {
    // Negative values, infinities and NaN too: whatever the steps make of them.
    GuardedArray<float> src(random.AwkwardFloats(n));
    GuardedArray<float> dst(n);
    std::vector<float> expected(n);
    for (size_t i = 0; i < n; ++i) expected[i] = ExpectedInverseSqrt(src[i]);
    ASSERT_EQ(mcvInvSqrtVectorf32(src.data(), dst.data(), static_cast<int32_t>(n)), 0);
    ASSERT_EQ(FirstDifference(dst.Values(), expected), -1);
    for (size_t i = 0; i < n; ++i) ASSERT_TRUE(SameBitsOrNan(mcvInvSqrtf32(src[i]), expected[i]));
  }
}

TEST(InverseSquareRoot, IsCloseOverTheWholeRange) {
  for (float x = 1e-30f; x < 1e30f; x *= 1.37f) {
    const double exact = 1.0 / std::sqrt(double{x});
    EXPECT_NEAR(mcvInvSqrtf32(x) / exact, 1.0, 5e-6) << x;
  }
}

TEST(RootVectors, NullAndEmpty) {
  float f = 1.0f;
  for (const int32_t n : {1, 0, -1}) {
    ExpectEachNullRefused(-1, mcvSqrtVectorf32, &f, &f, n);
    ExpectEachNullRefused(-1, mcvInvSqrtVectorf32, &f, &f, n);
  }
  const float four = 4.0f;
  EXPECT_EQ(mcvSqrtVectorf32(&four, &f, 0), 0);
  EXPECT_EQ(mcvSqrtVectorf32(&four, &f, -1), 0);
  EXPECT_EQ(mcvInvSqrtVectorf32(&four, &f, 0), 0);
  EXPECT_EQ(mcvInvSqrtVectorf32(&four, &f, INT32_MIN), 0);
  EXPECT_EQ(f, 1.0f);
}

int64_t TableEntry(int64_t i) {
  return std::min<int64_t>(std::lround(16.0 * std::sqrt(static_cast<double>(i))), 255);
}

// The ranges one by one, as they are defined.
int64_t ExpectedFastSqrt(int64_t v) {
  if (v < 0) return -2;
  if (v < 256) return TableEntry(v) >> 4;
  if (v < 1024) return TableEntry(v >> 2) >> 3;
  if (v < 4096) return TableEntry(v >> 4) >> 2;
  if (v < 16384) return TableEntry(v >> 6) >> 1;
  if (v < 65536) return TableEntry(v >> 8);
  int shift = 10;
  int64_t factor = 2;
  for (int64_t start = 65536; start <= INT64_MAX / 4 && v >= 4 * start; start *= 4) {
    shift += 2;
    factor *= 2;
  }
  return TableEntry(v >> shift) * factor;
}

TEST(FastSquareRoot, KnownValues) {
  EXPECT_EQ(mcvFastSqrts32(0), 0);
  EXPECT_EQ(mcvFastSqrts32(1), 1);
  EXPECT_EQ(mcvFastSqrts32(255), 15);
  EXPECT_EQ(mcvFastSqrts32(256), 16);
  EXPECT_EQ(mcvFastSqrts32(65535), 255);
  EXPECT_EQ(mcvFastSqrts32(65536), 256);
  EXPECT_EQ(mcvFastSqrts32(1 << 30), 128 * 256);
  EXPECT_EQ(mcvFastSqrts32(INT32_MAX), 180 * 256);
  EXPECT_EQ(mcvFastSqrts32(-1), -2);
  EXPECT_EQ(mcvFastSqrts32(INT32_MIN), -2);
  EXPECT_EQ(mcvFastSqrts64(-1), -2);
  EXPECT_EQ(mcvFastSqrts64(INT64_MIN), -2);
  EXPECT_EQ(mcvFastSqrts64(int64_t{1} << 32), 65536);
  EXPECT_EQ(mcvFastSqrts64(int64_t{1} << 62), int64_t{1} << 31);
  EXPECT_EQ(mcvFastSqrts64(INT64_MAX), int64_t{180} << 24);
}

TEST(FastSquareRoot, FollowsTheRanges) {
  for (int32_t v = 0; v < 70000; ++v) {
    ASSERT_EQ(mcvFastSqrts32(v), ExpectedFastSqrt(v)) << v;
    ASSERT_EQ(mcvFastSqrts64(v), ExpectedFastSqrt(v)) << v;
  }
  Random random = TestRandom();
  for (int power = 16; power < 63; ++power) {
    const int64_t start = int64_t{1} << power;
    for (int trial = 0; trial < 200; ++trial) {
      const int64_t v =
          trial == 0   ? start
          : trial == 1 ? start - 1 + start
                       : start + static_cast<int64_t>(random.Word() % static_cast<uint64_t>(start));
      ASSERT_EQ(mcvFastSqrts64(v), ExpectedFastSqrt(v)) << v;
      if (power < 31) {
        ASSERT_EQ(mcvFastSqrts32(static_cast<int32_t>(v)), ExpectedFastSqrt(v)) << v;
      }
    }
  }
}

}  // namespace
}  // namespace n3ds::testing
