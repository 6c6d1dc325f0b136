// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/guarded_array.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

TEST(ScaleDownBy2, TruncatesTheMean) {
  std::vector<uint8_t> src(16, 0);
  src[0] = src[1] = src[4] = 1;
  src[5] = 2;
  uint8_t dst[4] = {9, 9, 9, 9};
  ASSERT_EQ(mcvScaleDownBy2u8(src.data(), 4, 4, dst), 0);
  EXPECT_EQ(dst[0], 1);
  EXPECT_EQ(dst[1] | dst[2] | dst[3], 0);
}

TEST(ScaleDownBy2, RandomSizes) {
  Random random = TestRandom();
  for (int trial = 0; trial < 60; ++trial) {
    const int width = random.Int(4, 75);
    const int height = random.Int(4, 20);
    GuardedArray<uint8_t> src(random.Integers<uint8_t>(static_cast<size_t>(width) * height));
    GuardedArray<uint8_t> dst(static_cast<size_t>(width / 2) * (height / 2));
    ASSERT_EQ(mcvScaleDownBy2u8(src.data(), width, height, dst.data()), 0);
    for (int y = 0; y < height / 2; ++y) {
      for (int x = 0; x < width / 2; ++x) {
        int sum = 0;
        for (int dy = 0; dy < 2; ++dy) {
          for (int dx = 0; dx < 2; ++dx) sum += src[(2 * y + dy) * width + 2 * x + dx];
        }
        ASSERT_EQ(dst[y * (width / 2) + x], sum / 4) << width << " x " << height;
      }
    }
  }
}

TEST(ScaleDownBy2, BadArguments) {
  std::vector<uint8_t> src(64, 100);
  uint8_t dst[16] = {};
  EXPECT_EQ(mcvScaleDownBy2u8(nullptr, 8, 8, dst), -1);
  EXPECT_EQ(mcvScaleDownBy2u8(src.data(), 8, 8, nullptr), -1);
  EXPECT_EQ(mcvScaleDownBy2u8(nullptr, 3, 3, dst), -1);
  for (const int32_t small : {3, 0, -8}) {
    EXPECT_EQ(mcvScaleDownBy2u8(src.data(), small, 8, dst), -2);
    EXPECT_EQ(mcvScaleDownBy2u8(src.data(), 8, small, dst), -2);
  }
  EXPECT_EQ(dst[0], 0);
}

TEST(BitwiseOr, RandomSizesAndPitches) {
  Random random = TestRandom();
  for (int trial = 0; trial < 60; ++trial) {
    const int width = random.Int(1, 70);
    const int height = random.Int(1, 6);
    const int pitch_a = width + random.Int(0, 9);
    const int pitch_b = width + random.Int(0, 9);
    const int pitch_dst = width + random.Int(0, 9);
    // The last row ends with the image, not with the pitch.
    const auto bytes = [&](int pitch) { return static_cast<size_t>(pitch * (height - 1) + width); };
    GuardedArray<uint8_t> a(random.Integers<uint8_t>(bytes(pitch_a)));
    GuardedArray<uint8_t> b(random.Integers<uint8_t>(bytes(pitch_b)));
    GuardedArray<uint8_t> dst(bytes(pitch_dst));
    dst.Fill(0x5A);
    ASSERT_EQ(
        mcvBitwiseOru8(a.data(), b.data(), dst.data(), width, height, pitch_a, pitch_b, pitch_dst),
        0);
    for (int y = 0; y < height; ++y) {
      for (int x = 0; x < pitch_dst && static_cast<size_t>(y * pitch_dst + x) < dst.size(); ++x) {
        const int expected = x < width ? a[y * pitch_a + x] | b[y * pitch_b + x] : 0x5A;
        ASSERT_EQ(dst[y * pitch_dst + x], expected);
      }
    }
  }
}

TEST(BitwiseOr, WorksInPlace) {
  uint8_t a[3] = {1, 2, 4};
  const uint8_t b[3] = {8, 8, 12};
  ASSERT_EQ(mcvBitwiseOru8(a, b, a, 3, 1, 3, 3, 3), 0);
  EXPECT_EQ(a[0], 9);
  EXPECT_EQ(a[1], 10);
  EXPECT_EQ(a[2], 12);
}

TEST(BitwiseOr, NullAndEmpty) {
  const uint8_t a = 1;
  uint8_t dst = 0;
  for (const int32_t height : {1, 0}) {
    ExpectEachNullRefused(-1, mcvBitwiseOru8, &a, &a, &dst, 1, height, 1, 1, 1);
  }
  EXPECT_EQ(mcvBitwiseOru8(&a, &a, &dst, 1, 0, 1, 1, 1), 0);
  EXPECT_EQ(mcvBitwiseOru8(&a, &a, &dst, 0, 1, 1, 1, 1), 0);
  EXPECT_EQ(mcvBitwiseOru8(&a, &a, &dst, 1, -1, 1, 1, 1), 0);
  EXPECT_EQ(dst, 0);
}

TEST(YuyvSplit, SeparatesLumaAndChroma) {
  const std::vector<uint8_t> src = {10, 100, 11, 200, 12, 101, 13, 201};
  std::vector<uint8_t> luma(4);
  std::vector<uint8_t> chroma(4);
  ASSERT_EQ(mcvYUYVToOrgData(src.data(), 4, 1, luma.data(), chroma.data()), 0);
  EXPECT_EQ(luma, (std::vector<uint8_t>{10, 11, 12, 13}));
  EXPECT_EQ(chroma, (std::vector<uint8_t>{100, 200, 101, 201}));
}

TEST(YuyvSplit, RandomSizesKeepEveryRow) {
  Random random = TestRandom();
  for (int trial = 0; trial < 60; ++trial) {
    const int width = random.Int(1, 70);
    const int height = random.Int(1, 6);
    const int src_pitch = (2 * width + 3) / 4 * 4;
    const int dst_pitch = (width + 3) / 4 * 4;
    GuardedArray<uint8_t> src(random.Integers<uint8_t>(static_cast<size_t>(src_pitch) * height));
    GuardedArray<uint8_t> luma(static_cast<size_t>(dst_pitch) * height);
    GuardedArray<uint8_t> chroma(luma.size());
    ASSERT_EQ(mcvYUYVToOrgData(src.data(), width, height, luma.data(), chroma.data()), 0);
    for (int y = 0; y < height; ++y) {
      for (int x = 0; x < width; ++x) {
        ASSERT_EQ(luma[y * dst_pitch + x], src[y * src_pitch + 2 * x]);
        ASSERT_EQ(chroma[y * dst_pitch + x], src[y * src_pitch + 2 * x + 1]);
      }
    }
  }
}

TEST(YuyvSplit, NullAndEmpty) {
  const uint8_t src[4] = {1, 2, 3, 4};
  uint8_t luma = 0;
  uint8_t chroma = 0;
  for (const int32_t height : {1, 0}) {
    ExpectEachNullRefused(-1, mcvYUYVToOrgData, src, 2, height, &luma, &chroma);
  }
  EXPECT_EQ(mcvYUYVToOrgData(src, 2, 0, &luma, &chroma), 0);
  EXPECT_EQ(mcvYUYVToOrgData(src, 2, -1, &luma, &chroma), 0);
  EXPECT_EQ(mcvYUYVToOrgData(src, 0, 1, &luma, &chroma), 0);
  EXPECT_EQ(mcvYUYVToOrgData(src, -7, 1, &luma, &chroma), 0);
  EXPECT_EQ(luma | chroma, 0);
}

// A record with planes of its own.
class Image {
 public:
  explicit Image(const std::array<std::vector<uint8_t>, 3>& pixels, int64_t width) {
    for (size_t i = 0; i < 3; ++i) {
      pixels_[i] = std::make_unique<GuardedArray<uint8_t>>(pixels[i]);
      planes_[i] = {width, static_cast<int64_t>(pixels[i].size()) / width, pixels_[i]->data()};
      record_.plane[i] = &planes_[i];
    }
  }
  mcvMotionRecord* record() { return &record_; }
  mcvMotionPlane& plane(size_t i) { return planes_[i]; }

 private:
  std::array<std::unique_ptr<GuardedArray<uint8_t>>, 3> pixels_;
  std::array<mcvMotionPlane, 3> planes_;
  mcvMotionRecord record_;
};

class DetectMotion : public ::testing::Test {
 protected:
  int32_t Run() {
    return mcvDetectMotion(previous_.record(), current_.record(), next_.record(), mask_.record());
  }
  static Image Zeros() {
    const std::vector<uint8_t> plane(4, 0);
    return Image({plane, plane, plane}, 2);
  }
  Image previous_ = Zeros();
  Image current_ = Zeros();
  Image next_ = Zeros();
  Image mask_ = Zeros();
};

TEST_F(DetectMotion, MarksPixelsThatDifferFromBothNeighbours) {
  previous_.plane(0).pixels[0] = 17;  // current 0, next 0: differs from one only
  current_.plane(0).pixels[1] = 17;   // from both
  current_.plane(0).pixels[2] = 16;   // not by more than 16
  previous_.plane(2).pixels[3] = 255;
  next_.plane(2).pixels[3] = 17;
  mask_.plane(0).pixels[0] = 99;
  ASSERT_EQ(Run(), 0);
  EXPECT_EQ(mask_.plane(0).pixels[0], 0);
  EXPECT_EQ(mask_.plane(0).pixels[1], 255);
  EXPECT_EQ(mask_.plane(0).pixels[2], 0);
  EXPECT_EQ(mask_.plane(2).pixels[3], 255);
}

TEST_F(DetectMotion, RandomImagesWithPlanesOfDifferentSizes) {
  Random random = TestRandom();
  for (int trial = 0; trial < 40; ++trial) {
    const int64_t width = random.Int(1, 40);
    const auto planes = [&](int64_t h0, int64_t h1, int64_t h2) {
      // Levels from a narrow band, so that differences lie around the threshold.
      std::array<std::vector<uint8_t>, 3> pixels;
      const int64_t heights[3] = {h0, h1, h2};
      for (size_t i = 0; i < 3; ++i) {
        pixels[i].resize(static_cast<size_t>(width * heights[i]));
        for (uint8_t& pixel : pixels[i]) pixel = static_cast<uint8_t>(random.Int(100, 140));
      }
      return Image(pixels, width);
    };
    Image previous = planes(3, 2, 5);
    Image current = planes(3, 2, 5);
    Image next = planes(3, 2, 5);
    Image mask = planes(3, 2, 5);
    ASSERT_EQ(mcvDetectMotion(previous.record(), current.record(), next.record(), mask.record()),
              0);
    for (size_t i = 0; i < 3; ++i) {
      for (int64_t p = 0; p < width * mask.plane(i).height; ++p) {
        const int now = current.plane(i).pixels[p];
        const bool moves = std::abs(now - previous.plane(i).pixels[p]) > 16 &&
                           std::abs(now - next.plane(i).pixels[p]) > 16;
        ASSERT_EQ(mask.plane(i).pixels[p], moves ? 255 : 0);
      }
    }
  }
}

TEST_F(DetectMotion, NullRecordPlaneOrPixels) {
  ExpectEachNullRefused(-1, mcvDetectMotion, previous_.record(), current_.record(), next_.record(),
                        mask_.record());
  for (Image* image : {&previous_, &current_, &next_, &mask_}) {
    for (size_t i = 0; i < 3; ++i) {
      image->record()->plane[i] = nullptr;
      EXPECT_EQ(Run(), -1);
      image->record()->plane[i] = &image->plane(i);
      uint8_t* pixels = image->plane(i).pixels;
      image->plane(i).pixels = nullptr;
      image->plane(i).width = 5;  // the null counts before the size
      EXPECT_EQ(Run(), -1);
      image->plane(i).pixels = pixels;
      image->plane(i).width = 2;
    }
  }
  EXPECT_EQ(Run(), 0);
}

TEST_F(DetectMotion, SizesThatDifferOrAreEmpty) {
  for (Image* image : {&previous_, &current_, &next_, &mask_}) {
    for (size_t i = 0; i < 3; ++i) {
      image->plane(i).width = 1;
      EXPECT_EQ(Run(), -2);
      image->plane(i).width = 2;
      image->plane(i).height = 1;
      EXPECT_EQ(Run(), -2);
      image->plane(i).height = 2;
    }
  }
  for (const int64_t size : {int64_t{0}, int64_t{-2}}) {
    for (Image* image : {&previous_, &current_, &next_, &mask_}) image->plane(1).width = size;
    EXPECT_EQ(Run(), -2);
    for (Image* image : {&previous_, &current_, &next_, &mask_}) {
      image->plane(1).width = 2;
      image->plane(1).height = size;
    }
    EXPECT_EQ(Run(), -2);
  }
}

TEST_F(DetectMotion, SizesWhoseProductOverflowsAreRefused) {
  for (Image* image : {&previous_, &current_, &next_, &mask_}) {
    image->plane(2).width = image->plane(2).height = int64_t{1} << 40;
  }
  EXPECT_EQ(Run(), -2);
}

}  // namespace
}  // namespace n3ds::testing
