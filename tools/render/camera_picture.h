// SPDX-License-Identifier: MIT
// Pictures in the formats of camera buffers, as the library's image functions take them.
#pragma once

#include <cstdint>
#include <vector>

#include "norvale_3d_sticker_engine.h"
#include "render/picture.h"

namespace n3ds::tool {

class CameraPicture {
 public:
  // Formats: packed blue, green, red (with or without alpha), or a luma plane and one with V and U
  // of every 2 x 2 pixels. The last needs even sizes: an odd picture is one pixel larger, with its
  // last row or column twice.
  static CameraPicture Bgr24(const Picture& picture);
  static CameraPicture Bgra32(const Picture& picture);
  static CameraPicture Nv21(const Picture& picture);
  // All zero, hence transparent.
  static CameraPicture ClearBgra32(int width, int height);

  int width() const { return width_; }
  int height() const { return height_; }
  // Points into this picture.
  NSVL_OFFSCREEN Descriptor();

  // The upper left `width` x `height` pixels in the tool's own format.
  Picture ToPicture(int width, int height) const;

 private:
  CameraPicture(std::uint32_t format, int width, int height);
  std::size_t Offset(int x, int y) const;
  std::size_t ChromaOffset(int x, int y) const;

  std::uint32_t format_;
  int width_;
  int height_;
  std::vector<std::uint8_t> pixels_;  // or luma
  std::vector<std::uint8_t> chroma_;  // NV21 alone
};

}  // namespace n3ds::tool
