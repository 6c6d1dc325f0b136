// SPDX-License-Identifier: MIT
#include "render/camera_image.h"

#include <algorithm>
#include <cstddef>

#include "norvale_3d_sticker_core.h"

namespace n3ds::tool {
namespace {

int BytesAPixel(std::uint32_t format) {
  switch (format) {
    case N3DS_FORMAT_BGR24:
      return 3;
    case N3DS_FORMAT_BGRA32:
      return 4;
    default:
      return 1;
  }
}

int NextEven(int size) { return size + size % 2; }

std::uint32_t Packed(unsigned high, unsigned middle, unsigned low) {
  return high << 16 | middle << 8 | low;
}

std::uint8_t Component(std::uint32_t word, int index) {
  return static_cast<std::uint8_t>(word >> (8 * index));
}

}  // namespace

CameraImage::CameraImage(std::uint32_t format, int width, int height)
    : format_(format), width_(width), height_(height) {
  pixels_.resize(Offset(0, height));
  if (format == N3DS_FORMAT_NV21) chroma_.resize(ChromaOffset(0, height));
}

std::size_t CameraImage::Offset(int x, int y) const {
  return (static_cast<std::size_t>(y) * static_cast<std::size_t>(width_) +
          static_cast<std::size_t>(x)) *
         static_cast<std::size_t>(BytesAPixel(format_));
}

std::size_t CameraImage::ChromaOffset(int x, int y) const {
  return static_cast<std::size_t>(y / 2) * static_cast<std::size_t>(width_) +
         static_cast<std::size_t>(x / 2 * 2);
}

CameraImage CameraImage::ClearBgra32(int width, int height) {
  return {N3DS_FORMAT_BGRA32, width, height};
}

CameraImage CameraImage::Bgr24(const Image& image) {
  CameraImage result(N3DS_FORMAT_BGR24, image.width, image.height);
  for (std::size_t i = 0; i < image.rgba.size() / 4; ++i) {
    for (std::size_t k = 0; k < 3; ++k) result.pixels_[3 * i + k] = image.rgba[4 * i + 2 - k];
  }
  return result;
}

CameraImage CameraImage::Bgra32(const Image& image) {
  CameraImage result(N3DS_FORMAT_BGRA32, image.width, image.height);
  result.pixels_ = image.rgba;
  for (std::size_t i = 0; i < result.pixels_.size(); i += 4) {
    std::swap(result.pixels_[i], result.pixels_[i + 2]);
  }
  return result;
}

CameraImage CameraImage::Nv21(const Image& image) {
  CameraImage result(N3DS_FORMAT_NV21, NextEven(image.width), NextEven(image.height));
  for (int y = 0; y < result.height_; y += 2) {
    for (int x = 0; x < result.width_; x += 2) {
      unsigned u = 0;
      unsigned v = 0;
      for (int k = 0; k < 4; ++k) {
        const int px = x + k % 2;
        const int py = y + k / 2;
        const std::uint8_t* rgb =
            image.Pixel(std::min(px, image.width - 1), std::min(py, image.height - 1));
        const std::uint32_t yuv = RGB2YUV(Packed(rgb[0], rgb[1], rgb[2]));
        result.pixels_[result.Offset(px, py)] = Component(yuv, 2);
        u += Component(yuv, 1);
        v += Component(yuv, 0);
      }
      result.chroma_[result.ChromaOffset(x, y)] = static_cast<std::uint8_t>((v + 2) / 4);
      result.chroma_[result.ChromaOffset(x, y) + 1] = static_cast<std::uint8_t>((u + 2) / 4);
    }
  }
  return result;
}

NSVL_OFFSCREEN CameraImage::Descriptor() {
  NSVL_OFFSCREEN descriptor{};
  descriptor.pixelFormat = format_;
  descriptor.width = width_;
  descriptor.height = height_;
  descriptor.plane[0] = pixels_.data();
  descriptor.pitch[0] = width_ * BytesAPixel(format_);
  if (!chroma_.empty()) {
    descriptor.plane[1] = chroma_.data();
    descriptor.pitch[1] = width_;
  }
  return descriptor;
}

Image CameraImage::ToImage(int width, int height) const {
  Image image(width, height);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      std::uint8_t* rgba = image.Pixel(x, y);
      const std::uint8_t* pixel = &pixels_[Offset(x, y)];
      if (format_ == N3DS_FORMAT_NV21) {
        const std::uint8_t* vu = &chroma_[ChromaOffset(x, y)];
        const std::uint32_t rgb = YUV2RGB(Packed(pixel[0], vu[1], vu[0]));
        for (int k = 0; k < 3; ++k) rgba[k] = Component(rgb, 2 - k);
        continue;
      }
      for (int k = 0; k < 3; ++k) rgba[k] = pixel[2 - k];
      if (format_ == N3DS_FORMAT_BGRA32) rgba[3] = pixel[3];
    }
  }
  return image;
}

}  // namespace n3ds::tool
