// SPDX-License-Identifier: MIT
#include "eval/mean_fit.h"

#include <cmath>

#include "eval/mesh_metrics.h"
#include "eval/metrics.h"
#include "mesh/face_tables.h"
#include "tracks/upright.h"

namespace n3ds::tool {

MeanFit::MeanFit(const FaceModelFile& model) : mean_(MeanFace(model)) {}

void MeanFit::AddDistances(const TrackHeader& header, const TrackFace& face,
                           const FaceResult& result, std::vector<double>& distances) const {
  if (AbsoluteYaw(CameraPose(result).rotation) > kMeshYaw) return;
  const std::vector<PixelPoint> seen = UprightLandmarks(header, face);
  const double pupils = PupilDistance(seen);
  if (pupils == 0) return;
  FaceResult head = result;
  head.model = HeadModel(result);
  head.pitched = false;
  for (std::size_t k = kFirstInnerLandmark; k <= kLastInnerLandmark; ++k) {
    const Vector3& v = mean_[LandmarkVertices()[k]];
    const PixelPoint drawn = ProjectToImage(head, header, v[0], v[1], v[2]);
    distances.push_back(100 * std::hypot(drawn.x - seen[k].x, drawn.y - seen[k].y) / pupils);
  }
}

}  // namespace n3ds::tool
