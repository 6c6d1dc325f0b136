// SPDX-License-Identifier: MIT
// How well things hold to a head: four points fixed to it (the nose bridge, above the forehead, in
// front of each ear) are drawn by an estimated pose and compared with where they are in the true
// image.
//
// An estimator attaches to the mean head. On a person the bridge is where the person's own nose
// bridge is; the other points are the mean head's, enlarged about the point midway between the ears
// as the person's eyes and nose are larger than the mean's. Nothing is taken off beforehand: head
// frames that differ by a constant count as error, because stickers would be off by it.
#pragma once

#include <array>
#include <vector>

#include "eval/metrics.h"
#include "eval/rotation.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

struct AttachmentScore {
  std::vector<double> errors;  // mean of the four points, percent of the interpupillary distance
  // Second differences of the error from frame to frame, mean of the four points, in pixels at a
  // width of the face of 200 pixels.
  std::vector<double> jitter;
};

// `mean` are the 101 mean landmarks, mm. Adds the track's figures to `score`.
void AddAttachment(const JudgedTrack& judged, const std::vector<Vector3>& mean,
                   AttachmentScore& score);

}  // namespace n3ds::tool
