// SPDX-License-Identifier: MIT
// How far the landmarks lie from the mean face under the engine's poses. The 3-D landmarks that the
// engine hands out cannot tell: the inner ones lie on the rays of the landmarks handed in.
#pragma once

#include <vector>

#include "engine/face_results.h"
#include "model/face_model_file.h"

namespace n3ds::tool {

class MeanFit {
 public:
  explicit MeanFit(const FaceModelFile& model);

  // Appends the distance in the image of each inner landmark to its vertex, in percent of the
  // interpupillary distance; nothing for heads turned by more than kMeshYaw. `result` is finite and
  // of either mode.
  void AddDistances(const TrackHeader& header, const TrackFace& face, const FaceResult& result,
                    std::vector<double>& distances) const;

 private:
  Points mean_;  // upright head frame, mm
};

}  // namespace n3ds::tool
