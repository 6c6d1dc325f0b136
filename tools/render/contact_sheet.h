// SPDX-License-Identifier: MIT
// Many frames on one image: a grid of tiles with the frame's number in the corner.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "render/image.h"

namespace n3ds::tool {

// `tiles` evenly spaced frames of `frames`, first and last included; all of them when there are
// fewer.
std::vector<std::size_t> EvenlySpaced(std::size_t frames, std::size_t tiles);

class ContactSheet {
 public:
  ContactSheet(std::size_t tiles, int tile_width, int tile_height);
  void Add(const Image& tile, std::int64_t frame_number);
  const Image& image() const { return image_; }

 private:
  int columns_;
  int tile_width_;
  int tile_height_;
  int added_ = 0;
  Image image_;
};

}  // namespace n3ds::tool
