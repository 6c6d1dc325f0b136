// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>

#include "norvale_3d_sticker_core.h"
namespace n3ds::testing {

namespace {

int Clamp(double value) { return static_cast<int>(std::clamp(value, 0.0, 255.0)); }

// The real-valued conversion that the fixed-point one stands for.
struct Triple {
  double a, b, c;
};
Triple ExactYuv(double r, double g, double b) {
  const double y = 0.299 * r + 0.587 * g + 0.114 * b;
  return {y, (b - y) * 0.5643 + 128, (r - y) * 0.7133 + 128};
}
Triple ExactRgb(double y, double u, double v) {
  return {y + 1.402 * (v - 128), y - 0.34414 * (u - 128) - 0.71414 * (v - 128),
          y + 1.772 * (u - 128)};
}

// Floor division, to stand for an arithmetic shift without being one.
int64_t Floor(int64_t value, int64_t divisor) {
  return value >= 0 ? value / divisor : -((-value + divisor - 1) / divisor);
}

uint32_t ReferenceYuv(int64_t r, int64_t g, int64_t b) {
  const int64_t sum = 9798 * r + 19235 * g + 3736 * b;
  const int64_t t = Floor(sum, 256);
  const int64_t u = Floor(Floor((128 * b - t) * 18492, 128) + 16384, 32768) + 128;
  const int64_t v = Floor(Floor((128 * r - t) * 23372, 128) + 16384, 32768) + 128;
  const int64_t y = Floor(sum + 16384, 32768);
  return static_cast<uint32_t>(y * 65536 + std::clamp<int64_t>(u, 0, 255) * 256 +
                               std::clamp<int64_t>(v, 0, 255));
}

uint32_t ReferenceRgb(int64_t y, int64_t u, int64_t v) {
  const int64_t sums[3] = {32768 * y + 45941 * (v - 128) + 16384,
                           32768 * y - 11277 * (u - 128) - 23401 * (v - 128) + 16384,
                           32768 * y + 58065 * (u - 128) + 16384};
  uint32_t word = 0;
  for (const int64_t sum : sums) {
    int64_t value = Floor(sum, 32768);
    if (value < 0 || value > 255) value = sum > 32767 ? 255 : 0;
    word = word << 8 | static_cast<uint32_t>(value);
  }
  return word;
}

TEST(ColourConversion, BlackAndWhiteAreNeutral) {
  EXPECT_EQ(RGB2YUV(0xFFFFFF), 0xFF8080u);
  EXPECT_EQ(RGB2YUV(0x000000), 0x008080u);
  EXPECT_EQ(YUV2RGB(0x008080), 0x000000u);
  EXPECT_EQ(YUV2RGB(0xFF8080), 0xFFFFFFu);
}

TEST(ColourConversion, EveryGreyKeepsItsLevelAndNeutralChroma) {
  for (uint32_t level = 0; level < 256; ++level) {
    const uint32_t grey = level * 0x010101;
    EXPECT_EQ(RGB2YUV(grey), level << 16 | 0x8080) << level;
    EXPECT_EQ(YUV2RGB(level << 16 | 0x8080), grey) << level;
  }
}

TEST(ColourConversion, ChromaOfPureColoursIsInItsPlace) {
  EXPECT_GT(RGB2YUV(0x0000FF) >> 8 & 255, 250u) << "blue lifts U";
  EXPECT_GT(RGB2YUV(0xFF0000) & 255, 250u) << "red lifts V";
  EXPECT_LT(RGB2YUV(0x00FF00) >> 8 & 255, 60u) << "green lowers U";
  EXPECT_LT(RGB2YUV(0x00FF00) & 255, 60u) << "green lowers V";
}

TEST(ColourConversion, OutOfRangeColoursAreClamped) {
  EXPECT_EQ(YUV2RGB(0xFF80FF) >> 16, 255u) << "red above 255";
  EXPECT_EQ(YUV2RGB(0x008000) >> 16, 0u) << "red below 0";
  EXPECT_EQ(YUV2RGB(0xFFFF80) & 255, 255u) << "blue above 255";
  EXPECT_EQ(YUV2RGB(0x000080) & 255, 0u) << "blue below 0";
  EXPECT_EQ(YUV2RGB(0xFF0000) >> 8 & 255, 255u) << "green above 255";
  EXPECT_EQ(YUV2RGB(0x00FFFF) >> 8 & 255, 0u) << "green below 0";
}

TEST(ColourConversion, TopByteOfTheWordIsIgnored) {
  EXPECT_EQ(RGB2YUV(0xAB123456), RGB2YUV(0x123456));
  EXPECT_EQ(YUV2RGB(0xAB123456), YUV2RGB(0x123456));
}

// All 2^24 words against the same sums in 64 bits without shifts.
TEST(ColourConversion, EveryWordMatchesTheReference) {
  for (uint32_t word = 0; word < 1u << 24; ++word) {
    const int64_t a = word >> 16, b = word >> 8 & 255, c = word & 255;
    ASSERT_EQ(RGB2YUV(word), ReferenceYuv(a, b, c)) << std::hex << word;
    ASSERT_EQ(YUV2RGB(word), ReferenceRgb(a, b, c)) << std::hex << word;
  }
}

TEST(ColourConversion, StaysWithinOneLevelOfTheRealValuedConversion) {
  for (uint32_t word = 0; word < 1u << 24; word += 7) {
    const int a = static_cast<int>(word >> 16), b = static_cast<int>(word >> 8 & 255),
              c = static_cast<int>(word & 255);
    const Triple yuv = ExactYuv(a, b, c);
    const uint32_t got = RGB2YUV(word);
    ASSERT_LE(std::abs(static_cast<int>(got >> 16) - Clamp(yuv.a)), 1) << std::hex << word;
    ASSERT_LE(std::abs(static_cast<int>(got >> 8 & 255) - Clamp(yuv.b)), 1) << std::hex << word;
    ASSERT_LE(std::abs(static_cast<int>(got & 255) - Clamp(yuv.c)), 1) << std::hex << word;

    const Triple rgb = ExactRgb(a, b, c);
    const uint32_t colour = YUV2RGB(word);
    ASSERT_LE(std::abs(static_cast<int>(colour >> 16) - Clamp(rgb.a)), 1) << std::hex << word;
    ASSERT_LE(std::abs(static_cast<int>(colour >> 8 & 255) - Clamp(rgb.b)), 1) << std::hex << word;
    ASSERT_LE(std::abs(static_cast<int>(colour & 255) - Clamp(rgb.c)), 1) << std::hex << word;
  }
}

}  // namespace
}  // namespace n3ds::testing
