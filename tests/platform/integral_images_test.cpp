// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <cstdint>
#include <type_traits>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/guarded_array.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

constexpr int kUntouched = 0x5A;

struct Source {
  int width;
  int height;
  int pitch;
  std::vector<uint8_t> pixels;
};

Source RandomSource(Random& random, bool padded) {
  Source source;
  source.width = random.Int(1, 40);
  source.height = random.Int(1, 12);
  source.pitch = source.width + (padded ? random.Int(0, 7) : 0);
  source.pixels = random.Integers<uint8_t>(static_cast<size_t>(source.pitch) * (source.height - 1) +
                                           source.width);
  return source;
}

// Sum over the first `rows` rows and `columns` columns, pixel by pixel.
uint64_t SumUpTo(const Source& source, int rows, int columns, bool squares) {
  uint64_t sum = 0;
  for (int y = 0; y < rows; ++y) {
    for (int x = 0; x < columns; ++x) {
      const uint64_t level = source.pixels[y * source.pitch + x];
      sum += squares ? level * level : level;
    }
  }
  return sum;
}

// An output of exactly the entries the layout of this pitch has, up to the last one written.
template <typename Entry>
GuardedArray<Entry> MakeOutput(const Source& source, int pitch) {
  const bool leading = pitch > source.width;
  const size_t rows = static_cast<size_t>(source.height) + (leading ? 1 : 0);
  const size_t columns = static_cast<size_t>(source.width) + (leading ? 1 : 0);
  return GuardedArray<Entry>(pitch * (rows - 1) + columns);
}

template <typename Entry>
void CheckOutput(GuardedArray<Entry>& output, const Source& source, int pitch, bool squares) {
  const int leading = pitch > source.width ? 1 : 0;
  for (int r = 0; r < source.height + leading; ++r) {
    for (int c = 0; c < pitch && static_cast<size_t>(r) * pitch + c < output.size(); ++c) {
      const Entry entry = output[static_cast<size_t>(r) * pitch + c];
      if (c >= source.width + leading) {
        ASSERT_EQ(entry, static_cast<Entry>(kUntouched)) << "padding " << r << ", " << c;
      } else {
        const uint64_t sum = SumUpTo(source, r + 1 - leading, c + 1 - leading, squares);
        ASSERT_EQ(entry, static_cast<Entry>(sum)) << r << ", " << c;
      }
    }
  }
}

TEST(IntegralImage, LeadingZerosAndSums) {
  const uint8_t src[6] = {1, 2, 3, 4, 5, 6};
  uint64_t sum[12];
  uint64_t squares[12];
  ASSERT_EQ(mcvImgIntegralu8(src, 3, 2, sum, squares), 0);
  const uint64_t expected[12] = {0, 0, 0, 0, 0, 1, 3, 6, 0, 5, 12, 21};
  const uint64_t expected_squares[12] = {0, 0, 0, 0, 0, 1, 5, 14, 0, 17, 46, 91};
  for (int i = 0; i < 12; ++i) {
    EXPECT_EQ(sum[i], expected[i]);
    EXPECT_EQ(squares[i], expected_squares[i]);
  }
}

TEST(IntegralImage, RandomSizesWithEitherOutputMissing) {
  Random random = TestRandom();
  for (int trial = 0; trial < 60; ++trial) {
    const Source source = RandomSource(random, false);
    GuardedArray<uint8_t> src(source.pixels);
    const int pitch = source.width + 1;
    auto sum = MakeOutput<uint64_t>(source, pitch);
    auto squares = MakeOutput<uint64_t>(source, pitch);
    ASSERT_EQ(mcvImgIntegralu8(src.data(), source.width, source.height,
                               trial % 3 == 1 ? nullptr : sum.data(),
                               trial % 3 == 2 ? nullptr : squares.data()),
              0);
    if (trial % 3 != 1) CheckOutput(sum, source, pitch, false);
    if (trial % 3 != 2) CheckOutput(squares, source, pitch, true);
  }
}

TEST(IntegralImage, Pitched32BitFormHasLeadingZerosIfThePitchLeavesRoom) {
  Random random = TestRandom();
  for (int trial = 0; trial < 90; ++trial) {
    const Source source = RandomSource(random, true);
    GuardedArray<uint8_t> src(source.pixels);
    const int pitch = source.width + trial % 4;
    auto sum = MakeOutput<uint32_t>(source, pitch);
    auto squares = MakeOutput<uint32_t>(source, pitch);
    sum.Fill(kUntouched);
    squares.Fill(kUntouched);
    ASSERT_EQ(mcvImgIntegralu8v2(src.data(), source.width, source.height, source.pitch,
                                 trial % 3 == 1 ? nullptr : sum.data(), pitch,
                                 trial % 3 == 2 ? nullptr : squares.data()),
              0);
    if (trial % 3 != 1) CheckOutput(sum, source, pitch, false);
    if (trial % 3 != 2) CheckOutput(squares, source, pitch, true);
  }
}

TEST(IntegralImage, Pitched16BitFormWrapsAndHasTwoPitches) {
  Random random = TestRandom();
  for (int trial = 0; trial < 90; ++trial) {
    const Source source = RandomSource(random, true);  // often beyond 65535 in total
    GuardedArray<uint8_t> src(source.pixels);
    const int pitch = source.width + trial % 3;
    const int square_pitch = source.width + trial / 3 % 3;
    auto sum = MakeOutput<uint16_t>(source, pitch);
    auto squares = MakeOutput<uint32_t>(source, square_pitch);
    sum.Fill(kUntouched);
    squares.Fill(kUntouched);
    ASSERT_EQ(mcvImgIntegralu8v3(src.data(), source.width, source.height, source.pitch, sum.data(),
                                 pitch, squares.data(), square_pitch),
              0);
    CheckOutput(sum, source, pitch, false);
    CheckOutput(squares, source, square_pitch, true);
  }
}

TEST(IntegralImage, SquareSumsOf32BitsWrap) {
  // 67000 pixels of 255 squared pass 2^32.
  const Source source = {1, 67000, 1, std::vector<uint8_t>(67000, 255)};
  std::vector<uint32_t> squares(67000);
  ASSERT_EQ(mcvImgIntegralu8v2(source.pixels.data(), 1, 67000, 1, nullptr, 1, squares.data()), 0);
  EXPECT_EQ(squares.back(), static_cast<uint32_t>(67000ull * 65025));
}

TEST(IntegralImage, NullArguments) {
  const uint8_t src = 1;
  uint64_t sum64[4];
  uint32_t sum32[4];
  uint16_t sum16[4];
  EXPECT_EQ(mcvImgIntegralu8(nullptr, 1, 1, sum64, sum64), -1);
  EXPECT_EQ(mcvImgIntegralu8(&src, 1, 1, nullptr, nullptr), -1);
  EXPECT_EQ(mcvImgIntegralu8v2(nullptr, 1, 1, 1, sum32, 2, sum32), -1);
  EXPECT_EQ(mcvImgIntegralu8v2(&src, 1, 1, 1, nullptr, 2, nullptr), -1);
  EXPECT_EQ(mcvImgIntegralu8v3(nullptr, 1, 1, 1, sum16, 2, sum32, 2), -1);
  EXPECT_EQ(mcvImgIntegralu8v3(&src, 1, 1, 1, nullptr, 2, nullptr, 2), -1);
}

TEST(IntegralImage, PitchBelowWidthIsRefused) {
  const uint8_t src[2] = {1, 2};
  uint32_t sum32[6] = {};
  uint16_t sum16[6] = {};
  EXPECT_EQ(mcvImgIntegralu8v2(src, 2, 1, 1, sum32, 2, sum32), -2);
  EXPECT_EQ(mcvImgIntegralu8v2(src, 2, 1, 2, sum32, 1, sum32), -2);
  EXPECT_EQ(mcvImgIntegralu8v3(src, 2, 1, 1, sum16, 2, sum32, 2), -2);
  EXPECT_EQ(mcvImgIntegralu8v3(src, 2, 1, 2, sum16, 1, sum32, 2), -2);
  EXPECT_EQ(mcvImgIntegralu8v3(src, 2, 1, 2, sum16, 2, sum32, 1), -2);
  EXPECT_EQ(mcvImgIntegralu8v3(src, 2, 1, 2, nullptr, 0, sum32, 2), 0);
  EXPECT_EQ(mcvImgIntegralu8v3(src, 2, 1, 2, sum16, 2, nullptr, 0), 0);
  EXPECT_EQ(sum32[1], 5u);
  EXPECT_EQ(sum16[1], 3u);
}

TEST(IntegralImage, EmptyImagesHaveTheirZerosOnly) {
  const uint8_t src = 1;
  uint64_t sum[4] = {7, 7, 7, 7};
  ASSERT_EQ(mcvImgIntegralu8(&src, 2, 0, sum, nullptr), 0);
  EXPECT_EQ(sum[0] | sum[1] | sum[2], 0u);
  EXPECT_EQ(sum[3], 7u);
  ASSERT_EQ(mcvImgIntegralu8(&src, 0, 3, nullptr, sum), 0);
  EXPECT_EQ(sum[3], 0u);
  sum[0] = 7;
  EXPECT_EQ(mcvImgIntegralu8(&src, -1, 3, sum, sum), 0);
  EXPECT_EQ(mcvImgIntegralu8(&src, 3, -1, sum, sum), 0);
  EXPECT_EQ(sum[0], 7u);
}

}  // namespace
}  // namespace n3ds::testing
