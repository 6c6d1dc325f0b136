// SPDX-License-Identifier: MIT
// From the image as delivered to the upright, unmirrored frame in which the results are given.
#pragma once

#include <array>
#include <cstdint>
#include <vector>

#include "tracks/track_file.h"

namespace n3ds::tool {

struct PixelPoint {
  double x = 0;
  double y = 0;
};

// A point of the delivered image in the upright frame. Mirroring and turning use the full width
// and height: column 0 maps to column W.
PixelPoint ToUpright(const TrackHeader& header, double x, double y);

// The landmark that takes the place of `landmark` when a face is mirrored (itself on the face's
// midline), for a layout of 101 or 165 landmarks.
int MirrorLandmark(int landmark, int landmarks);

// A face's landmarks in the upright frame and numbering.
std::vector<PixelPoint> UprightLandmarks(const TrackHeader& header, const TrackFace& face);

}  // namespace n3ds::tool
