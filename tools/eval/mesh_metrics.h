// SPDX-License-Identifier: MIT
// How well the dense meshes of mask mode fit the landmarks, and whether they are sound.
#pragma once

#include <array>
#include <cstddef>
#include <vector>

#include "engine/face_results.h"
#include "eval/metrics.h"
#include "model/face_model_file.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

// Faces turned further than this are left out of the distances: landmarks of the far side are then
// a detector's guess.
constexpr double kMeshYaw = 40;  // degrees, without sign

// Between the pupils of a face, in pixels: the unit of the distances.
double PupilDistance(const std::vector<PixelPoint>& landmarks);

// Lengths are in percent of the interpupillary distance in the same image.
struct MeshScore {
  std::size_t faces = 0;          // with a finite pose and mesh, at any yaw
  std::size_t not_finite = 0;     // faces with a NaN or infinite value
  std::size_t folded = 0;         // faces with a fold
  std::vector<double> distances;  // landmark to its vertex, inner landmarks, yaw within kMeshYaw
  // The same from where the landmarks truly are, in the faces whose truth tells it: without the
  // detector's noise and rounding.
  std::vector<double> true_distances;
  std::vector<double> mouth_seen;     // between the middles of the inner lips, in the landmarks
  std::vector<double> mouth_of_mesh;  // the same in the mesh, face by face

  void Add(const MeshScore& other);
  // How far the mesh's mouth opens where the landmarks' opens by one: the slope of the regression
  // of the one on the other, 0 without movement.
  double MouthGain() const;
};

// Judges the meshes of one model frame by frame.
class MeshJudge {
 public:
  explicit MeshJudge(const FaceModelFile& model);

  // `result` is of mask mode and belongs to `frame`. The yaw is the truth's where there is one,
  // else the engine's.
  void AddFrame(const TrackHeader& header, const TrackFrame& frame, const FrameResult& result,
                MeshScore& score) const;

  // A triangle of the mesh is turned over against a neighbour or against its place in the mean
  // face.
  bool IsFolded(const Points& vertices) const;

 private:
  void AddDistances(const TrackHeader& header, const TrackFace& face, const FaceResult& result,
                    const Points& vertices, MeshScore& score) const;

  Points mean_normals_;                                 // per triangle, in the model file's frame
  std::vector<std::array<std::size_t, 2>> neighbours_;  // triangles with a common edge
};

}  // namespace n3ds::tool
