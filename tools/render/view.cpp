// SPDX-License-Identifier: MIT
#include "render/view.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "tracks/upright.h"

namespace n3ds::tool {
namespace {

int Scaled(double size, double scale) {
  return std::clamp(static_cast<int>(std::lround(size * scale)), 1, kLargestDrawnSide);
}

// In pixels of the upright image.
struct Region {
  double left = std::numeric_limits<double>::max();
  double top = std::numeric_limits<double>::max();
  double right = std::numeric_limits<double>::lowest();
  double bottom = std::numeric_limits<double>::lowest();

  void Add(const Region& other) {
    left = std::min(left, other.left);
    top = std::min(top, other.top);
    right = std::max(right, other.right);
    bottom = std::max(bottom, other.bottom);
  }
};

// The landmarks reach from the brows to the chin and from ear to ear; shares of their larger extent
// leave room for the rest of the head.
Region HeadRegion(const TrackHeader& header, const TrackFace& face) {
  constexpr double kAside = 0.2;
  constexpr double kAbove = 0.65;
  constexpr double kBelow = 0.15;
  Region region;
  for (const PixelPoint& p : UprightLandmarks(header, face)) region.Add({p.x, p.y, p.x, p.y});
  const double extent = std::max(region.right - region.left, region.bottom - region.top);
  return {region.left - kAside * extent, region.top - kAbove * extent,
          region.right + kAside * extent, region.bottom + kBelow * extent};
}

}  // namespace

void View::MakeEven() {
  for (int* side : {&shown.width, &shown.height}) *side = std::max(2, *side / 2 * 2);
  whole.width = std::max(whole.width, left + shown.width);
  whole.height = std::max(whole.height, top + shown.height);
}

Image View::Cut(const Image& whole_image) const {
  Image cut(shown.width, shown.height);
  for (int row = 0; row < shown.height; ++row) {
    std::copy_n(whole_image.Pixel(left, top + row), 4 * static_cast<std::size_t>(shown.width),
                cut.Pixel(0, row));
  }
  return cut;
}

View WholeView(const TrackHeader& header, const std::optional<Size>& box, int default_side) {
  const double w = header.upright_width();
  const double h = header.upright_height();
  const double scale = box ? std::min(box->width / w, box->height / h)
                           : std::min(1.0, default_side / std::max(w, h));
  View view;
  view.whole = view.shown = {Scaled(w, scale), Scaled(h, scale)};
  return view;
}

View CloseView(const Track& track, const std::vector<std::size_t>& frames,
               const std::optional<Size>& box, int default_side) {
  Region region;
  for (const std::size_t f : frames) {
    for (const TrackFace& face : track.frames[f].faces) {
      region.Add(HeadRegion(track.header, face));
    }
  }
  const double w = track.header.upright_width();
  const double h = track.header.upright_height();
  region.left = std::max(region.left, 0.0);
  region.top = std::max(region.top, 0.0);
  region.right = std::min(region.right, w);
  region.bottom = std::min(region.bottom, h);
  const double region_width = region.right - region.left;
  const double region_height = region.bottom - region.top;
  // No face, or only faces outside of the image.
  if (!(region_width >= 1 && region_height >= 1)) return WholeView(track.header, box, default_side);

  const Size room = box.value_or(Size{default_side, default_side});
  const double scale = std::min(
      {room.width / region_width, room.height / region_height, kLargestDrawnSide / std::max(w, h)});
  View view;
  view.whole = {Scaled(w, scale), Scaled(h, scale)};
  view.shown = {std::min(Scaled(region_width, scale), view.whole.width),
                std::min(Scaled(region_height, scale), view.whole.height)};
  view.left = std::clamp(static_cast<int>(std::lround(region.left * scale)), 0,
                         view.whole.width - view.shown.width);
  view.top = std::clamp(static_cast<int>(std::lround(region.top * scale)), 0,
                        view.whole.height - view.shown.height);
  return view;
}

}  // namespace n3ds::tool
