// SPDX-License-Identifier: MIT
// Many frames on one picture: a grid of tiles with the frame's number in the corner.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "render/picture.h"

namespace n3ds::tool {

// `tiles` evenly spaced frames of `frames`, first and last included; all of them when there are
// fewer.
std::vector<std::size_t> EvenlySpaced(std::size_t frames, std::size_t tiles);

class ContactSheet {
 public:
  ContactSheet(std::size_t tiles, int tile_width, int tile_height);
  void Add(const Picture& tile, std::int64_t frame_number);
  const Picture& picture() const { return picture_; }

 private:
  int columns_;
  int tile_width_;
  int tile_height_;
  int added_ = 0;
  Picture picture_;
};

}  // namespace n3ds::tool
