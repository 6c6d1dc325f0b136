// SPDX-License-Identifier: MIT
// Which part of the upright image is drawn, and how large.
#pragma once

#include <cstddef>
#include <optional>
#include <vector>

#include "render/image.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

constexpr int kLargestDrawnSide = 8192;

struct Size {
  int width = 0;
  int height = 0;
};

struct View {
  Size whole;  // of the upright image as it is drawn
  int left = 0;
  int top = 0;
  Size shown;  // of the part that is kept

  // Makes the shown size even, as films need it.
  void MakeEven();
  Image Cut(const Image& whole_image) const;
};

// The whole upright image, as large as it goes into the box; without a box its own size, reduced
// to `default_side`.
View WholeView(const TrackHeader& header, const std::optional<Size>& box, int default_side);

// The heads of the given frames alone, as large as they go into the box (a square of `default_side`
// without one). The whole image where there is no face.
View CloseView(const Track& track, const std::vector<std::size_t>& frames,
               const std::optional<Size>& box, int default_side);

}  // namespace n3ds::tool
