// SPDX-License-Identifier: MIT
// An image in memory, and PNG and JPEG files.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace n3ds::tool {

struct Image {
  int width = 0;
  int height = 0;
  std::vector<std::uint8_t> rgba;  // rows from the top, 4 bytes a pixel

  Image() = default;
  Image(int w, int h)
      : width(w),
        height(h),
        rgba(4 * static_cast<std::size_t>(w) * static_cast<std::size_t>(h), 255) {}

  std::uint8_t* Pixel(int x, int y) {
    return &rgba[4 * (static_cast<std::size_t>(y) * static_cast<std::size_t>(width) +
                      static_cast<std::size_t>(x))];
  }
  const std::uint8_t* Pixel(int x, int y) const { return const_cast<Image*>(this)->Pixel(x, y); }
};

// Reads a PNG or JPEG file, told apart by its first bytes. Throws Error.
Image ReadImage(const std::string& path);
// Writes a PNG through a temporary. Throws Error.
void WritePng(const std::string& path, const Image& image);
// The same for a JPEG. Alpha is dropped.
void WriteJpeg(const std::string& path, const Image& image);

// The image un-mirrored and turned clockwise like the landmarks of a track: first mirrored left
// to right if `mirror`, then turned by `degree` (0, 90, 180 or 270).
Image Upright(const Image& delivered, int degree, bool mirror);

// Copies `source` into `target` with its upper left corner at (x, y); it must fit.
void Paste(const Image& source, int x, int y, Image& target);

}  // namespace n3ds::tool
