// SPDX-License-Identifier: MIT
// Integral images in three entry widths.
#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace {

struct Image {
  const uint8_t* pixels;
  int32_t width;
  int32_t height;
  ptrdiff_t pitch;
};

uint32_t Level(uint32_t level) { return level; }
uint32_t Square(uint32_t level) { return level * level; }

// Writes the integral of term(pixel) unless `out` is null. A pitch wider than the image has room
// for the leading row and column of zeros; with a pitch of exactly the width there are none.
template <typename Entry, uint32_t term(uint32_t)>
void Integrate(const Image& image, Entry* out, ptrdiff_t pitch) {
  if (out == nullptr || image.width < 0 || image.height < 0) return;
  const bool leading_zeros = pitch > image.width;
  const Entry* above = nullptr;
  if (leading_zeros) {
    std::fill_n(out, ptrdiff_t{image.width} + 1, Entry{0});
    above = out + 1;
    out += pitch;
  }
  const uint8_t* pixels = image.pixels;
  for (int32_t y = 0; y < image.height; ++y) {
    Entry* row = out;
    if (leading_zeros) *row++ = 0;
    Entry sum = 0;
    for (int32_t x = 0; x < image.width; ++x) {
      sum = static_cast<Entry>(sum + term(pixels[x]));
      row[x] = sum;
    }
    if (above != nullptr) {
      for (int32_t x = 0; x < image.width; ++x) row[x] = static_cast<Entry>(row[x] + above[x]);
    }
    above = row;
    out += pitch;
    pixels += image.pitch;
  }
}

}  // namespace

int32_t mcvImgIntegralu8(const uint8_t* src, int32_t width, int32_t height, uint64_t* sum,
                         uint64_t* squareSum) {
  if (src == nullptr || (sum == nullptr && squareSum == nullptr)) return N3DS_NULL_ARGUMENT;
  const Image image = {src, width, height, width};
  Integrate<uint64_t, Level>(image, sum, ptrdiff_t{width} + 1);
  Integrate<uint64_t, Square>(image, squareSum, ptrdiff_t{width} + 1);
  return N3DS_OK;
}

int32_t mcvImgIntegralu8v2(const uint8_t* src, int32_t width, int32_t height, int32_t srcPitch,
                           uint32_t* sum, int32_t sumPitch, uint32_t* squareSum) {
  if (src == nullptr || (sum == nullptr && squareSum == nullptr)) return N3DS_NULL_ARGUMENT;
  if (srcPitch < width || sumPitch < width) return N3DS_BAD_VALUE;
  const Image image = {src, width, height, srcPitch};
  Integrate<uint32_t, Level>(image, sum, sumPitch);
  Integrate<uint32_t, Square>(image, squareSum, sumPitch);
  return N3DS_OK;
}

int32_t mcvImgIntegralu8v3(const uint8_t* src, int32_t width, int32_t height, int32_t srcPitch,
                           uint16_t* sum, int32_t sumPitch, uint32_t* squareSum,
                           int32_t squareSumPitch) {
  if (src == nullptr || (sum == nullptr && squareSum == nullptr)) return N3DS_NULL_ARGUMENT;
  if (srcPitch < width || (sum != nullptr && sumPitch < width) ||
      (squareSum != nullptr && squareSumPitch < width)) {
    return N3DS_BAD_VALUE;
  }
  const Image image = {src, width, height, srcPitch};
  Integrate<uint16_t, Level>(image, sum, sumPitch);
  Integrate<uint32_t, Square>(image, squareSum, squareSumPitch);
  return N3DS_OK;
}
