// SPDX-License-Identifier: MIT
// Images in the formats of camera buffers, as the library's image functions take them.
#pragma once

#include <cstdint>
#include <vector>

#include "norvale_3d_sticker_engine.h"
#include "render/image.h"

namespace n3ds::tool {

class CameraImage {
 public:
  // Formats: packed blue, green, red (with or without alpha), or a luma plane and one with V and U
  // of every 2 x 2 pixels. The last needs even sizes: an odd image is one pixel larger, with its
  // last row or column twice.
  static CameraImage Bgr24(const Image& image);
  static CameraImage Bgra32(const Image& image);
  static CameraImage Nv21(const Image& image);
  // All zero, hence transparent.
  static CameraImage ClearBgra32(int width, int height);

  int width() const { return width_; }
  int height() const { return height_; }
  // Points into this image.
  NSVL_OFFSCREEN Descriptor();

  // The upper left `width` x `height` pixels in the tool's own format.
  Image ToImage(int width, int height) const;

 private:
  CameraImage(std::uint32_t format, int width, int height);
  std::size_t Offset(int x, int y) const;
  std::size_t ChromaOffset(int x, int y) const;

  std::uint32_t format_;
  int width_;
  int height_;
  std::vector<std::uint8_t> pixels_;  // or luma
  std::vector<std::uint8_t> chroma_;  // NV21 alone
};

}  // namespace n3ds::tool
