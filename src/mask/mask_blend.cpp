// SPDX-License-Identifier: MIT
// Compositing of a mask image over a camera image: the mask takes on the light of the image
// underneath, then is blended in by its alpha in 8-bit fixed point.
//
// The work is done on strips of pixels, one array per channel: loops of a fixed length over plain
// arrays, which compilers vectorise, and which make it harmless that the output may be the image.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "mask/colour_conversion.h"
#include "norvale_3d_sticker_core.h"

namespace {

constexpr int kStripPixels = 32;  // even, so that 2 x 2 blocks do not straddle strips

struct ColourStrip {
  int32_t r[kStripPixels], g[kStripPixels], b[kStripPixels];
};

struct MaskStrip {
  ColourStrip colour;
  int32_t alpha[kStripPixels];
};

uint8_t* Row(const NSVL_OFFSCREEN& image, int plane, int64_t y) {
  return image.plane[plane] + y * image.pitch[plane];
}

bool IsTransparent(const uint8_t* mask, int pixels) {
  uint8_t alphas = 0;
  for (int i = 0; i < pixels; ++i) alphas |= mask[4 * i + 3];
  return alphas == 0;
}

// Pixels beyond the last stay what they were; their results are not written anywhere.
void Load(const uint8_t* mask, int pixels, MaskStrip* strip) {
  for (int i = 0; i < pixels; ++i) {
    strip->colour.b[i] = mask[4 * i];
    strip->colour.g[i] = mask[4 * i + 1];
    strip->colour.r[i] = mask[4 * i + 2];
    strip->alpha[i] = mask[4 * i + 3];
  }
}

// The weights are 256 - a and a, so that even an opaque mask lets 1/256 of the image through.
void BlendChannel(const double* shading, const int32_t* alpha, const int32_t* mask,
                  int32_t* image) {
  for (int i = 0; i < kStripPixels; ++i) {
    const int32_t shaded = static_cast<int32_t>(shading[i] * mask[i]);
    image[i] = ((256 - alpha[i]) * image[i] + alpha[i] * shaded) >> 8;
  }
}

// The shading factor says how much of the mask's colour is left over a pixel: half over black, all
// over white. These are not the converters' luma weights: red, skin's strongest channel, weighs
// most. A transparent pixel keeps its colour.
void Blend(const MaskStrip& mask, ColourStrip* image) {
  double shading[kStripPixels];
  for (int i = 0; i < kStripPixels; ++i) {
    const float grey =
        static_cast<float>(0.3 * image->b[i] + 0.4 * image->r[i] + 0.3 * image->g[i]) / 255.0f;
    shading[i] = 0.5 + 0.5 * static_cast<double>(grey);
  }
  BlendChannel(shading, mask.alpha, mask.colour.r, image->r);
  BlendChannel(shading, mask.alpha, mask.colour.g, image->g);
  BlendChannel(shading, mask.alpha, mask.colour.b, image->b);
}

void BlendBgr24(const NSVL_OFFSCREEN& image, const NSVL_OFFSCREEN& mask,
                const NSVL_OFFSCREEN& output) {
  MaskStrip mask_strip = {};
  ColourStrip strip = {};
  for (int64_t y = 0; y < mask.height; ++y) {
    for (int64_t x = 0; x < mask.width; x += kStripPixels) {
      const int pixels = static_cast<int>(std::min<int64_t>(kStripPixels, mask.width - x));
      const uint8_t* in = Row(image, 0, y) + 3 * x;
      const uint8_t* over = Row(mask, 0, y) + 4 * x;
      uint8_t* out = Row(output, 0, y) + 3 * x;
      if (IsTransparent(over, pixels)) {
        std::memmove(out, in, 3 * static_cast<size_t>(pixels));
        continue;
      }
      Load(over, pixels, &mask_strip);
      for (int i = 0; i < pixels; ++i) {
        strip.b[i] = in[3 * i];
        strip.g[i] = in[3 * i + 1];
        strip.r[i] = in[3 * i + 2];
      }
      Blend(mask_strip, &strip);
      for (int i = 0; i < pixels; ++i) {
        out[3 * i] = static_cast<uint8_t>(strip.b[i]);
        out[3 * i + 1] = static_cast<uint8_t>(strip.g[i]);
        out[3 * i + 2] = static_cast<uint8_t>(strip.r[i]);
      }
    }
  }
}

// The part of a length that whole blocks of two cover.
int32_t WholeBlocks(int32_t length) { return length - length % 2; }

// Two rows of pixels with the chroma they share, one value per pixel.
struct YuvStrip {
  int32_t y[2][kStripPixels], u[2][kStripPixels], v[2][kStripPixels];
};

// One of the two rows: to colour, blended, and back.
void BlendYuvRow(const MaskStrip& mask, int row, YuvStrip* strip) {
  int32_t *y = strip->y[row], *u = strip->u[row], *v = strip->v[row];
  ColourStrip colour;
  for (int i = 0; i < kStripPixels; ++i) {
    const n3ds::Rgb rgb = n3ds::ToRgb({y[i], u[i], v[i]});
    colour.r[i] = rgb.r;
    colour.g[i] = rgb.g;
    colour.b[i] = rgb.b;
  }
  Blend(mask, &colour);
  for (int i = 0; i < kStripPixels; ++i) {
    const n3ds::Yuv yuv = n3ds::ToYuv({colour.r[i], colour.g[i], colour.b[i]});
    y[i] = yuv.y;
    u[i] = yuv.u;
    v[i] = yuv.v;
  }
}

void LoadYuvRow(const uint8_t* luma, const uint8_t* chroma, int pixels, int row, YuvStrip* strip) {
  for (int i = 0; i < pixels; ++i) {
    strip->y[row][i] = luma[i];
    strip->v[row][i] = chroma[i & ~1];
    strip->u[row][i] = chroma[i | 1];
  }
}

// Writes the 2 x 2 blocks that one of the mask's two rows touches.
void StoreTouchedBlocks(const YuvStrip& strip, const uint8_t* const* mask, int pixels,
                        uint8_t* const* luma, uint8_t* chroma) {
  for (int i = 0; i < pixels; i += 2) {
    if (IsTransparent(mask[0] + 4 * i, 2) && IsTransparent(mask[1] + 4 * i, 2)) continue;
    int32_t u = 0, v = 0;
    for (int row = 0; row < 2; ++row) {
      luma[row][i] = static_cast<uint8_t>(strip.y[row][i]);
      luma[row][i + 1] = static_cast<uint8_t>(strip.y[row][i + 1]);
      u += strip.u[row][i] + strip.u[row][i + 1];
      v += strip.v[row][i] + strip.v[row][i + 1];
    }
    chroma[i] = static_cast<uint8_t>(v >> 2);
    chroma[i + 1] = static_cast<uint8_t>(u >> 2);
  }
}

// Blocks that the mask leaves alone are not written: the output holds the image there already. In a
// block that it touches, transparent pixels make the trip through colour and back like the others,
// because the block's chroma is averaged again. A trailing odd row or column belongs to no block.
void BlendNv21(const NSVL_OFFSCREEN& image, const NSVL_OFFSCREEN& mask,
               const NSVL_OFFSCREEN& output) {
  MaskStrip mask_strips[2] = {};
  YuvStrip strip = {};
  const int64_t width = WholeBlocks(image.width);
  for (int64_t y = 0; y + 1 < image.height; y += 2) {
    for (int64_t x = 0; x < width; x += kStripPixels) {
      const int pixels = static_cast<int>(std::min<int64_t>(kStripPixels, width - x));
      const uint8_t* over[2] = {Row(mask, 0, y) + 4 * x, Row(mask, 0, y + 1) + 4 * x};
      if (IsTransparent(over[0], pixels) && IsTransparent(over[1], pixels)) continue;
      for (int row = 0; row < 2; ++row) {
        LoadYuvRow(Row(image, 0, y + row) + x, Row(image, 1, y / 2) + x, pixels, row, &strip);
        Load(over[row], pixels, &mask_strips[row]);
        BlendYuvRow(mask_strips[row], row, &strip);
      }
      uint8_t* out[2] = {Row(output, 0, y) + x, Row(output, 0, y + 1) + x};
      StoreTouchedBlocks(strip, over, pixels, out, Row(output, 1, y / 2) + x);
    }
  }
}

// Whether the image has that many planes of at least that size.
bool Covers(const NSVL_OFFSCREEN& image, int planes, int32_t width, int32_t height) {
  for (int plane = 0; plane < planes; ++plane) {
    if (image.plane[plane] == nullptr || image.pitch[plane] < 0) return false;
  }
  return image.width >= width && image.height >= height;
}

}  // namespace

MRESULT N3DS_BlendFaceMask(void* /*core*/, NSVL_OFFSCREEN* image, NSVL_OFFSCREEN* mask,
                           NSVL_OFFSCREEN* output) {
  if (image == nullptr || mask == nullptr || output == nullptr) return N3DS_NULL_ARGUMENT;
  const bool packed = image->pixelFormat == N3DS_FORMAT_BGR24;
  if (mask->pixelFormat != N3DS_FORMAT_BGRA32 || image->pixelFormat != output->pixelFormat ||
      (!packed && image->pixelFormat != N3DS_FORMAT_NV21)) {
    return N3DS_BAD_VALUE;
  }
  const int32_t width = packed ? mask->width : WholeBlocks(image->width);
  const int32_t height = packed ? mask->height : WholeBlocks(image->height);
  if (width < 1 || height < 1) return N3DS_OK;
  const int planes = packed ? 1 : 2;
  if (!Covers(*mask, 1, width, height) || !Covers(*image, planes, width, height) ||
      !Covers(*output, planes, width, height)) {
    return N3DS_BAD_VALUE;
  }
  if (packed) {
    BlendBgr24(*image, *mask, *output);
  } else {
    BlendNv21(*image, *mask, *output);
  }
  return N3DS_OK;
}
