// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <vector>

#include "mask/test_image.h"
#include "norvale_3d_sticker_core.h"
#include "support/null_arguments.h"
#include "support/test_random.h"
namespace n3ds::testing {

namespace {

int BlendReference(int alpha, int image, double shading, int mask) {
  return ((256 - alpha) * image + alpha * static_cast<int>(shading * mask)) / 256;
}

double ShadingReference(int r, int g, int b) {
  const float grey = static_cast<float>(0.3 * b + 0.4 * r + 0.3 * g) / 255.0f;
  return 0.5 + 0.5 * grey;
}

void BlendBgr24Reference(TestImage& image, TestImage& mask, TestImage& output) {
  for (int y = 0; y < mask.height(); ++y) {
    for (int x = 0; x < mask.width(); ++x) {
      const int b = *image.At(0, 3 * x, y), g = *image.At(0, 3 * x + 1, y),
                r = *image.At(0, 3 * x + 2, y);
      const uint8_t* m = mask.Pixel(x, y);
      const double k = ShadingReference(r, g, b);
      const int blended[3] = {BlendReference(m[3], b, k, m[0]), BlendReference(m[3], g, k, m[1]),
                              BlendReference(m[3], r, k, m[2])};
      const int plain[3] = {b, g, r};
      for (int c = 0; c < 3; ++c) {
        *output.At(0, 3 * x + c, y) = static_cast<uint8_t>(m[3] == 0 ? plain[c] : blended[c]);
      }
    }
  }
}

void BlendNv21Reference(TestImage& image, TestImage& mask, TestImage& output) {
  for (int y = 0; y < image.height() / 2; ++y) {
    for (int x = 0; x < image.width() / 2; ++x) {
      bool touched = false;
      for (int i = 0; i < 4; ++i) {
        touched |= mask.Pixel(2 * x + i % 2, 2 * y + i / 2)[3] != 0;
      }
      if (!touched) continue;
      const uint32_t v = *image.At(1, 2 * x, y), u = *image.At(1, 2 * x + 1, y);
      uint32_t sum_u = 0, sum_v = 0;
      for (int i = 0; i < 4; ++i) {
        const int px = 2 * x + i % 2, py = 2 * y + i / 2;
        const uint32_t colour =
            YUV2RGB(static_cast<uint32_t>(*image.At(0, px, py)) << 16 | u << 8 | v);
        const int r = colour >> 16, g = colour >> 8 & 255, b = colour & 255;
        const double k = ShadingReference(r, g, b);
        const uint8_t* m = mask.Pixel(px, py);
        const uint32_t blended = static_cast<uint32_t>(BlendReference(m[3], r, k, m[2]) << 16 |
                                                       BlendReference(m[3], g, k, m[1]) << 8 |
                                                       BlendReference(m[3], b, k, m[0]));
        const uint32_t yuv = RGB2YUV(blended);
        *output.At(0, px, py) = static_cast<uint8_t>(yuv >> 16);
        sum_u += yuv >> 8 & 255;
        sum_v += yuv & 255;
      }
      *output.At(1, 2 * x, y) = static_cast<uint8_t>(sum_v / 4);
      *output.At(1, 2 * x + 1, y) = static_cast<uint8_t>(sum_u / 4);
    }
  }
}

void BlendReference(TestImage& image, TestImage& mask, TestImage& output) {
  if (image.descriptor().pixelFormat == N3DS_FORMAT_BGR24) {
    BlendBgr24Reference(image, mask, output);
  } else {
    BlendNv21Reference(image, mask, output);
  }
}

// A mask with transparent areas, opaque ones and every alpha between them.
TestImage RandomMask(int width, int height, int padding, Random& random) {
  TestImage mask(N3DS_FORMAT_BGRA32, width, height, padding);
  mask.Randomise(random);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      const int kind = (x / 3 + y / 5) % 3;
      if (kind == 0) mask.Pixel(x, y)[3] = 0;
      if (kind == 1) mask.Pixel(x, y)[3] = 255;
    }
  }
  return mask;
}

class BlendFormats : public ::testing::TestWithParam<uint32_t> {};
INSTANTIATE_TEST_SUITE_P(, BlendFormats, ::testing::Values(N3DS_FORMAT_BGR24, N3DS_FORMAT_NV21),
                         [](const auto& format) {
                           return format.param == N3DS_FORMAT_BGR24 ? "Bgr24" : "Nv21";
                         });

TEST_P(BlendFormats, MatchesTheReferenceOnAllSizes) {
  Random random = TestRandom();
  for (int height = 1; height <= 9; ++height) {
    for (int width = 1; width <= 40; ++width) {
      for (const int padding : {0, 5}) {
        TestImage image(GetParam(), width, height, padding);
        image.Randomise(random);
        TestImage mask = RandomMask(width, height, padding / 2, random);
        TestImage output(GetParam(), width, height, 3 * padding);
        output.Fill(77);
        TestImage expected(output);
        BlendReference(image, mask, expected);
        const auto image_before = image.Bytes(), mask_before = mask.Bytes();
        ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
        ASSERT_EQ(output.Bytes(), expected.Bytes()) << width << " x " << height;
        ASSERT_EQ(image.Bytes(), image_before);
        ASSERT_EQ(mask.Bytes(), mask_before);
      }
    }
  }
}

TEST_P(BlendFormats, InPlaceGivesTheSameImage) {
  Random random = TestRandom();
  for (const auto& [width, height] : {std::pair(1, 1), {2, 2}, {3, 3}, {17, 9}, {64, 32}}) {
    TestImage image(GetParam(), width, height, 1);
    image.Randomise(random);
    TestImage mask = RandomMask(width, height, 0, random);
    TestImage expected(image);
    BlendReference(image, mask, expected);
    ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), image.get()), N3DS_OK);
    ASSERT_EQ(image.Bytes(), expected.Bytes()) << width << " x " << height;
  }
}

TEST_P(BlendFormats, AnyCoreHandleIsAccepted) {
  TestImage image(GetParam(), 4, 4), mask(N3DS_FORMAT_BGRA32, 4, 4);
  int anything = 0;
  EXPECT_EQ(N3DS_BlendFaceMask(&anything, image.get(), mask.get(), image.get()), N3DS_OK);
}

TEST_P(BlendFormats, RejectsNullArgumentsFirst) {
  TestImage image(GetParam(), 4, 4), mask(N3DS_FORMAT_BGR24, 4, 4), output(GetParam(), 4, 4);
  ExpectEachNullRefused(N3DS_NULL_ARGUMENT, N3DS_BlendFaceMask, nullptr, image.get(), mask.get(),
                        output.get());
}

TEST_P(BlendFormats, RejectsAMaskWithoutAlphaAndDifferentFormatsBeforeWriting) {
  Random random = TestRandom();
  TestImage image(GetParam(), 4, 4), output(GetParam(), 4, 4);
  TestImage mask(N3DS_FORMAT_BGRA32, 4, 4), plain_mask(N3DS_FORMAT_BGR24, 4, 4);
  mask.Fill(255);
  plain_mask.Fill(255);
  output.Randomise(random);
  const auto before = output.Bytes();
  EXPECT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), plain_mask.get(), output.get()),
            N3DS_BAD_VALUE);
  for (const uint32_t format : {N3DS_FORMAT_BGR24, N3DS_FORMAT_NV21, N3DS_FORMAT_BGRA32}) {
    if (format == GetParam()) continue;
    TestImage other(format, 4, 4);
    EXPECT_EQ(N3DS_BlendFaceMask(nullptr, other.get(), mask.get(), output.get()), N3DS_BAD_VALUE);
    const auto other_before = other.Bytes();
    EXPECT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), other.get()), N3DS_BAD_VALUE);
    EXPECT_EQ(other.Bytes(), other_before);
  }
  EXPECT_EQ(output.Bytes(), before);
}

TEST(MaskBlend, RejectsImageFormatsItDoesNotKnow) {
  TestImage mask(N3DS_FORMAT_BGRA32, 4, 4);
  mask.Fill(255);
  for (const uint32_t format : {0u, 512u, 514u, 770u, 2049u, ~0u}) {
    TestImage image(N3DS_FORMAT_BGRA32, 4, 4);
    image.get()->pixelFormat = format;
    const auto before = image.Bytes();
    EXPECT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), image.get()), N3DS_BAD_VALUE);
    EXPECT_EQ(image.Bytes(), before);
  }
}

TEST_P(BlendFormats, RejectsImagesThatAreTooSmallOrHaveNoPixelsBeforeWriting) {
  TestImage image(GetParam(), 4, 4), mask(N3DS_FORMAT_BGRA32, 4, 4), output(GetParam(), 4, 4);
  mask.Fill(255);
  output.Fill(9);
  const auto before = output.Bytes();
  const bool packed = GetParam() == N3DS_FORMAT_BGR24;
  TestImage* const images[] = {&image, &mask, &output};
  for (TestImage* spoilt : images) {
    const NSVL_OFFSCREEN good = spoilt->descriptor();
    const int planes = packed || spoilt == &mask ? 1 : 2;
    for (int field = 0; field < 2 + 2 * planes; ++field) {
      *spoilt->get() = good;
      if (field == 0) spoilt->get()->width = 2;
      if (field == 1) spoilt->get()->height = 2;
      if (field == 2 || field == 4) spoilt->get()->plane[field / 2 - 1] = nullptr;
      if (field == 3 || field == 5) spoilt->get()->pitch[field / 2 - 1] *= -1;
      // The packed format walks the mask's rectangle, the other one the image's.
      const bool walked = packed ? spoilt == &mask : spoilt == &image;
      const MRESULT expected = walked && field < 2 ? N3DS_OK : N3DS_BAD_VALUE;
      const MRESULT status = N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get());
      EXPECT_EQ(status, expected) << "field " << field;
      if (status == N3DS_OK) {
        output.Fill(9);
      } else {
        EXPECT_EQ(output.Bytes(), before) << "field " << field;
      }
    }
    *spoilt->get() = good;
  }
  EXPECT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
}

// A trailing odd row and column need no mask.
TEST(MaskBlend, TwoPlaneMaskMayEndWithTheLastBlock) {
  TestImage image(N3DS_FORMAT_NV21, 5, 5), mask(N3DS_FORMAT_BGRA32, 4, 4);
  EXPECT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), image.get()), N3DS_OK);
}

TEST(MaskBlend, EmptyImagesAreNoError) {
  for (const uint32_t format : {N3DS_FORMAT_BGR24, N3DS_FORMAT_NV21}) {
    for (const int size : {0, -1, INT32_MIN}) {
      NSVL_OFFSCREEN image = {}, mask = {};
      image.pixelFormat = format;
      mask.pixelFormat = N3DS_FORMAT_BGRA32;
      image.width = image.height = mask.width = mask.height = size;
      EXPECT_EQ(N3DS_BlendFaceMask(nullptr, &image, &mask, &image), N3DS_OK);
    }
  }
}

TEST(MaskBlend, OpaqueWhiteOverBlackIsHalfBright) {
  TestImage image(N3DS_FORMAT_BGR24, 1, 1), mask(N3DS_FORMAT_BGRA32, 1, 1);
  mask.Fill(255);
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), image.get()), N3DS_OK);
  EXPECT_EQ(image.Bytes(), (std::vector<uint8_t>{126, 126, 126}));
}

TEST(MaskBlend, OpaqueWhiteOverWhiteLosesNothingButTheLastStep) {
  TestImage image(N3DS_FORMAT_BGR24, 1, 1), mask(N3DS_FORMAT_BGRA32, 1, 1);
  mask.Fill(255);
  image.Fill(255);
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), image.get()), N3DS_OK);
  EXPECT_EQ(image.Bytes(), (std::vector<uint8_t>{255, 255, 255}));
}

TEST(MaskBlend, OpaqueBlackLetsOnePartIn256Through) {
  TestImage image(N3DS_FORMAT_BGR24, 1, 1), mask(N3DS_FORMAT_BGRA32, 1, 1);
  mask.Pixel(0, 0)[3] = 255;
  image.Fill(255);
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), image.get()), N3DS_OK);
  EXPECT_EQ(image.Bytes(), (std::vector<uint8_t>{0, 0, 0}));  // 255 / 256, truncated
}

// Blue, green and red are told apart: a red pixel shades by 0.4, a blue or a green one by 0.3.
TEST(MaskBlend, RedWeighsMostInTheShading) {
  TestImage image(N3DS_FORMAT_BGR24, 3, 1), mask(N3DS_FORMAT_BGRA32, 3, 1);
  mask.Fill(255);
  for (int c = 0; c < 3; ++c) *image.At(0, 3 * c + c, 0) = 255;
  TestImage output(N3DS_FORMAT_BGR24, 3, 1);
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
  const int shaded[3] = {static_cast<int>(255 * 0.65), static_cast<int>(255 * 0.65),
                         static_cast<int>(255 * 0.70)};
  for (int pixel = 0; pixel < 3; ++pixel) {
    for (int c = 0; c < 3; ++c) {
      const int own = c == pixel ? 255 : 0;
      EXPECT_EQ(*output.At(0, 3 * pixel + c, 0), (own + 255 * shaded[pixel]) / 256)
          << "pixel " << pixel << " channel " << c;
    }
  }
}

TEST(MaskBlend, TransparentMaskCopiesAPackedImage) {
  Random random = TestRandom();
  TestImage image(N3DS_FORMAT_BGR24, 31, 7), output(N3DS_FORMAT_BGR24, 31, 7);
  TestImage mask(N3DS_FORMAT_BGRA32, 31, 7);
  image.Randomise(random);
  mask.Randomise(random);
  for (int y = 0; y < 7; ++y) {
    for (int x = 0; x < 31; ++x) mask.Pixel(x, y)[3] = 0;
  }
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
  EXPECT_EQ(output.Bytes(), image.Bytes());
}

TEST(MaskBlend, TransparentMaskLeavesATwoPlaneOutputAlone) {
  Random random = TestRandom();
  TestImage image(N3DS_FORMAT_NV21, 30, 8), output(N3DS_FORMAT_NV21, 30, 8);
  TestImage mask(N3DS_FORMAT_BGRA32, 30, 8);
  image.Randomise(random);
  output.Randomise(random);
  const auto before = output.Bytes();
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
  EXPECT_EQ(output.Bytes(), before);
}

// One opaque pixel makes the whole block take the round trip, and only that block.
TEST(MaskBlend, OneOpaquePixelRewritesItsBlockOnly) {
  Random random = TestRandom();
  TestImage image(N3DS_FORMAT_NV21, 6, 6), mask(N3DS_FORMAT_BGRA32, 6, 6);
  image.Randomise(random);
  for (int i = 0; i < 4; ++i) {
    const int mx = 2 + i % 2, my = 2 + i / 2;
    mask.Fill(0);
    mask.Pixel(mx, my)[3] = 255;
    TestImage output(N3DS_FORMAT_NV21, 6, 6);
    output.Fill(1);
    ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
    for (int y = 0; y < 6; ++y) {
      for (int x = 0; x < 6; ++x) {
        const bool inside = x / 2 == 1 && y / 2 == 1;
        if (!inside) {
          EXPECT_EQ(*output.At(0, x, y), 1) << x << ", " << y;
        } else if (x != mx || y != my) {
          const uint32_t own = static_cast<uint32_t>(*image.At(0, x, y)) << 16 |
                               static_cast<uint32_t>(*image.At(1, 3, 1)) << 8 | *image.At(1, 2, 1);
          EXPECT_EQ(*output.At(0, x, y), RGB2YUV(YUV2RGB(own)) >> 16) << x << ", " << y;
        }
      }
    }
    EXPECT_EQ(*output.At(1, 0, 1), 1);
    EXPECT_EQ(*output.At(1, 4, 1), 1);
  }
}

TEST(MaskBlend, TrailingOddRowAndColumnOfATwoPlaneImageStay) {
  TestImage image(N3DS_FORMAT_NV21, 5, 3), mask(N3DS_FORMAT_BGRA32, 5, 3);
  mask.Fill(255);
  TestImage output(N3DS_FORMAT_NV21, 5, 3);
  output.Fill(9);
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
  for (int y = 0; y < 3; ++y) EXPECT_EQ(*output.At(0, 4, y), 9);
  for (int x = 0; x < 5; ++x) EXPECT_EQ(*output.At(0, x, 2), 9);
  for (int x = 0; x < 6; ++x) EXPECT_EQ(*output.At(1, x, 1), 9);
  EXPECT_EQ(*output.At(1, 4, 0), 9);
  EXPECT_NE(*output.At(0, 0, 0), 9);
}

TEST(MaskBlend, OneRowOfATwoPlaneImageIsLeftAlone) {
  TestImage image(N3DS_FORMAT_NV21, 8, 1), mask(N3DS_FORMAT_BGRA32, 8, 1);
  mask.Fill(255);
  const auto before = image.Bytes();
  EXPECT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), image.get()), N3DS_OK);
  EXPECT_EQ(image.Bytes(), before);
}

// The packed format goes by the mask's size, so a smaller mask leaves the rest of the output as it
// was; the two-plane format goes by the image's.
TEST(MaskBlend, PackedFormatWalksTheMaskTwoPlaneFormatTheImage) {
  TestImage image(N3DS_FORMAT_BGR24, 6, 4), output(N3DS_FORMAT_BGR24, 6, 4);
  TestImage small(N3DS_FORMAT_BGRA32, 3, 2);
  image.Fill(50);
  output.Fill(9);
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), small.get(), output.get()), N3DS_OK);
  for (int y = 0; y < 4; ++y) {
    for (int byte = 0; byte < 18; ++byte) {
      EXPECT_EQ(*output.At(0, byte, y), y < 2 && byte < 9 ? 50 : 9) << byte << ", " << y;
    }
  }

  TestImage yuv(N3DS_FORMAT_NV21, 2, 2), yuv_output(N3DS_FORMAT_NV21, 6, 4);
  TestImage large(N3DS_FORMAT_BGRA32, 6, 4);
  large.Fill(255);
  yuv.Fill(128);
  yuv_output.Fill(9);
  ASSERT_EQ(N3DS_BlendFaceMask(nullptr, yuv.get(), large.get(), yuv_output.get()), N3DS_OK);
  for (int y = 0; y < 4; ++y) {
    for (int x = 0; x < 6; ++x) {
      EXPECT_EQ(*yuv_output.At(0, x, y) != 9, x < 2 && y < 2) << x << ", " << y;
    }
  }
}

// Every alpha with every image and mask level, as one image per alpha.
TEST(MaskBlend, EveryAlphaWithEveryPairOfLevels) {
  TestImage image(N3DS_FORMAT_BGR24, 256, 256), mask(N3DS_FORMAT_BGRA32, 256, 256);
  TestImage output(N3DS_FORMAT_BGR24, 256, 256), expected(N3DS_FORMAT_BGR24, 256, 256);
  for (int alpha = 0; alpha < 256; alpha += 5) {
    for (int y = 0; y < 256; ++y) {
      for (int x = 0; x < 256; ++x) {
        *image.At(0, 3 * x, y) = static_cast<uint8_t>(x);
        *image.At(0, 3 * x + 1, y) = static_cast<uint8_t>(255 - x);
        *image.At(0, 3 * x + 2, y) = static_cast<uint8_t>(x * y);
        mask.Pixel(x, y)[0] = static_cast<uint8_t>(y);
        mask.Pixel(x, y)[1] = static_cast<uint8_t>(x + y);
        mask.Pixel(x, y)[2] = static_cast<uint8_t>(x - y);
        mask.Pixel(x, y)[3] = static_cast<uint8_t>(alpha);
      }
    }
    BlendBgr24Reference(image, mask, expected);
    ASSERT_EQ(N3DS_BlendFaceMask(nullptr, image.get(), mask.get(), output.get()), N3DS_OK);
    ASSERT_EQ(output.Bytes(), expected.Bytes()) << alpha;
  }
}

}  // namespace
}  // namespace n3ds::testing
