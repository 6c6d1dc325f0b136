#include "eval/mesh_metrics.h"

#include <algorithm>
#include <cmath>
#include <map>
#include <utility>

#include "engine/mesh_tables.h"
#include "tracks/upright.h"

namespace n3ds::tool {
namespace {

constexpr std::size_t kPupils[2] = {95, 96};
constexpr std::size_t kInnerLips[2] = {89, 93};  // their middles, upper and lower

const double kFoldCosine = std::cos(kFoldDegrees / 57.295779513082320876798);

Vector3 VertexAt(const std::vector<float>& vertices, std::size_t v) {
  return {vertices[3 * v], vertices[3 * v + 1], vertices[3 * v + 2]};
}

// Unit normals; zero for a triangle without area, which has no side that could be turned over.
std::vector<Vector3> Normals(const std::vector<float>& vertices) {
  std::vector<Vector3> normals;
  normals.reserve(kMeshTriangles);
  for (const auto& triangle : MeshTriangles()) {
    const Vector3 origin = VertexAt(vertices, triangle[0]);
    Vector3 a = VertexAt(vertices, triangle[1]);
    Vector3 b = VertexAt(vertices, triangle[2]);
    for (std::size_t k = 0; k < 3; ++k) {
      a[k] -= origin[k];
      b[k] -= origin[k];
    }
    Vector3 normal = {a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2],
                      a[0] * b[1] - a[1] * b[0]};
    const double length = Norm(normal);
    for (double& value : normal) value = length > 0 ? value / length : 0;
    normals.push_back(normal);
  }
  return normals;
}

bool AreOpposed(const Vector3& a, const Vector3& b) {
  return a[0] * b[0] + a[1] * b[1] + a[2] * b[2] < kFoldCosine;
}

double Distance(const PixelPoint& a, const PixelPoint& b) {
  return std::hypot(a.x - b.x, a.y - b.y);
}

// Where a landmark of a truth with 3-D points appears in the upright picture.
PixelPoint TruePlace(const TrackHeader& header, const TrackTruth& truth, std::size_t landmark) {
  const double* p = &truth.points3d[3 * landmark];
  return {*header.focal * p[0] / p[2] + header.upright_width() / 2.0,
          *header.focal * p[1] / p[2] + header.upright_height() / 2.0};
}

}  // namespace

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

MeshJudge::MeshJudge(const FaceModelFile& model) {
  // The size does not matter to normals, so the file's units serve.
  mean_normals_ = Normals(std::vector<float>(model.mean.begin(), model.mean.end()));
  std::map<std::pair<std::uint16_t, std::uint16_t>, std::uint16_t> first_at_edge;
  for (std::uint16_t t = 0; t < kMeshTriangles; ++t) {
    const auto& corners = MeshTriangles()[t];
    for (std::size_t k = 0; k < 3; ++k) {
      const auto edge = std::minmax({corners[k], corners[(k + 1) % 3]});
      const auto [place, is_new] = first_at_edge.emplace(edge, t);
      if (!is_new) neighbours_.push_back({place->second, t});
    }
  }
}

bool MeshJudge::IsFolded(const std::vector<float>& vertices) const {
  const std::vector<Vector3> normals = Normals(vertices);
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
    const std::vector<float> vertices = VerticesOfCorners(face.corners);
    if (IsFolded(vertices)) ++score.folded;
    const auto& truth = frame.faces[i].truth;
    if (AbsoluteYaw(truth ? truth->rotation : CameraPose(face).rotation) <= kMeshYaw) {
      AddDistances(header, frame.faces[i], face, vertices, score);
    }
  }
}

void MeshJudge::AddDistances(const TrackHeader& header, const TrackFace& face,
                             const FaceResult& result, const std::vector<float>& vertices,
                             MeshScore& score) const {
  const std::vector<PixelPoint> seen = UprightLandmarks(header, face);
  const double pupils = Distance(seen[kPupils[0]], seen[kPupils[1]]);
  if (pupils == 0) return;
  const auto drawn = [&](std::size_t landmark) {
    const Vector3 v = VertexAt(vertices, LandmarkVertex(landmark));
    return ProjectToPicture(result, header, v[0], v[1], v[2]);
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
