// SPDX-License-Identifier: MIT
#include "mask/colour_conversion.h"

#include "norvale_3d_sticker_core.h"

namespace {

// Component `index` of a packed word, 0 the lowest byte.
int32_t Component(uint32_t word, int index) {
  return static_cast<int32_t>(word >> (8 * index) & 255);
}

uint32_t Pack(int32_t high, int32_t middle, int32_t low) {
  return static_cast<uint32_t>(high << 16 | middle << 8 | low);
}

}  // namespace

uint32_t RGB2YUV(uint32_t rgb) {
  const n3ds::Yuv yuv = n3ds::ToYuv({Component(rgb, 2), Component(rgb, 1), Component(rgb, 0)});
  return Pack(yuv.y, yuv.u, yuv.v);
}

uint32_t YUV2RGB(uint32_t yuv) {
  const n3ds::Rgb rgb = n3ds::ToRgb({Component(yuv, 2), Component(yuv, 1), Component(yuv, 0)});
  return Pack(rgb.r, rgb.g, rgb.b);
}
