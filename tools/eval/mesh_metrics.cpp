// SPDX-License-Identifier: MIT
#include "eval/mesh_metrics.h"

#include <algorithm>
#include <cmath>

#include "mesh/face_tables.h"
#include "mesh/mesh_shape.h"
#include "mesh/mesh_topology.h"
#include "tracks/upright.h"

namespace n3ds::tool {
namespace {

constexpr std::size_t kPupils[2] = {95, 96};
constexpr std::size_t kInnerLips[2] = {89, 93};  // their middles, upper and lower

const double kFoldCosine = std::cos(kFoldDegrees / 57.295779513082320876798);

bool AreOpposed(const Vector3& a, const Vector3& b) { return Dot(a, b) < kFoldCosine; }

double Distance(const PixelPoint& a, const PixelPoint& b) {
  return std::hypot(a.x - b.x, a.y - b.y);
}

// Where a landmark of a truth with 3-D points appears in the upright image.
PixelPoint TruePlace(const TrackHeader& header, const TrackTruth& truth, std::size_t landmark) {
  const double* p = &truth.points3d[3 * landmark];
  return {*header.focal * p[0] / p[2] + header.upright_width() / 2.0,
          *header.focal * p[1] / p[2] + header.upright_height() / 2.0};
}

}  // namespace

double PupilDistance(const std::vector<PixelPoint>& landmarks) {
  return Distance(landmarks[kPupils[0]], landmarks[kPupils[1]]);
}

void MeshScore::Add(const MeshScore& other) {
  const auto append = [](std::vector<double>& to, const std::vector<double>& from) {
    to.insert(to.end(), from.begin(), from.end());
  };
  faces += other.faces;
  not_finite += other.not_finite;
  folded += other.folded;
  append(distances, other.distances);
  append(true_distances, other.true_distances);
  append(mouth_seen, other.mouth_seen);
  append(mouth_of_mesh, other.mouth_of_mesh);
}

double MeshScore::MouthGain() const {
  const auto count = static_cast<double>(mouth_seen.size());
  double mean_seen = 0;
  double mean_mesh = 0;
  for (std::size_t k = 0; k < mouth_seen.size(); ++k) {
    mean_seen += mouth_seen[k] / count;
    mean_mesh += mouth_of_mesh[k] / count;
  }
  double product = 0;
  double square = 0;
  for (std::size_t k = 0; k < mouth_seen.size(); ++k) {
    product += (mouth_seen[k] - mean_seen) * (mouth_of_mesh[k] - mean_mesh);
    square += (mouth_seen[k] - mean_seen) * (mouth_seen[k] - mean_seen);
  }
  return square > 0 ? product / square : 0;
}

MeshJudge::MeshJudge(const FaceModelFile& model) : neighbours_(Neighbours(FaceTriangles())) {
  // The size does not matter to normals, so the file's units serve.
  Points mean(kModelVertices);
  for (std::size_t v = 0; v < mean.size(); ++v) {
    for (std::size_t k = 0; k < 3; ++k) mean[v][k] = model.mean[3 * v + k];
  }
  mean_normals_ = MeasureFacets(mean, FaceTriangles()).normals;
}

// A triangle without area has no side that could be turned over: its normal is zero.
bool MeshJudge::IsFolded(const Points& vertices) const {
  const Points normals = MeasureFacets(vertices, FaceTriangles()).normals;
  for (std::size_t t = 0; t < normals.size(); ++t) {
    if (AreOpposed(normals[t], mean_normals_[t])) return true;
  }
  return std::any_of(neighbours_.begin(), neighbours_.end(), [&](const auto& pair) {
    return AreOpposed(normals[pair[0]], normals[pair[1]]);
  });
}

void MeshJudge::AddFrame(const TrackHeader& header, const TrackFrame& frame,
                         const FrameResult& result, MeshScore& score) const {
  for (std::size_t i = 0; i < result.faces.size(); ++i) {
    const FaceResult& face = result.faces[i];
    if (!IsFinite(face)) {
      ++score.not_finite;
      continue;
    }
    ++score.faces;
    const Points vertices = VerticesOfCorners(face.corners);
    if (IsFolded(vertices)) ++score.folded;
    const auto& truth = frame.faces[i].truth;
    if (AbsoluteYaw(truth ? truth->rotation : CameraPose(face).rotation) <= kMeshYaw) {
      AddDistances(header, frame.faces[i], face, vertices, score);
    }
  }
}

void MeshJudge::AddDistances(const TrackHeader& header, const TrackFace& face,
                             const FaceResult& result, const Points& vertices,
                             MeshScore& score) const {
  const std::vector<PixelPoint> seen = UprightLandmarks(header, face);
  const double pupils = PupilDistance(seen);
  if (pupils == 0) return;
  const auto drawn = [&](std::size_t landmark) {
    const Vector3& v = vertices[LandmarkVertices()[landmark]];
    return ProjectToImage(result, header, v[0], v[1], v[2]);
  };
  const bool is_known = face.truth && !face.truth->points3d.empty() && header.focal;
  for (std::size_t k = kFirstInnerLandmark; k <= kLastInnerLandmark; ++k) {
    score.distances.push_back(100 * Distance(drawn(k), seen[k]) / pupils);
    if (!is_known) continue;
    score.true_distances.push_back(100 * Distance(drawn(k), TruePlace(header, *face.truth, k)) /
                                   pupils);
  }
  score.mouth_seen.push_back(100 * Distance(seen[kInnerLips[0]], seen[kInnerLips[1]]) / pupils);
  score.mouth_of_mesh.push_back(100 * Distance(drawn(kInnerLips[0]), drawn(kInnerLips[1])) /
                                pupils);
}

}  // namespace n3ds::tool
