// SPDX-License-Identifier: MIT
#include "engine/mesh_file.h"

#include <array>
#include <cstddef>

#include "mesh/obj_writer.h"
#include "model/face_model_file.h"

namespace n3ds::tool {
namespace {

// Column-major, from the mesh's frame to that of the file.
std::array<double, 16> Placing(const FaceResult& face, MeshSpace space) {
  if (space == MeshSpace::kViewer) return ModelView(face);
  // The upright head's axes as columns; their transpose goes the other way.
  FaceResult at_rest;
  at_rest.model = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1};
  at_rest.pitched = face.pitched;
  const Matrix4 axes = HeadModel(at_rest);
  std::array<double, 16> placing{};
  for (std::size_t k = 0; k < 16; ++k) placing[k] = double{axes[4 * (k % 4) + k / 4]};
  return placing;
}

}  // namespace

void WriteMeshObj(std::ostream& out, const FrameResult& frame,
                  const std::vector<float>& texture_coordinates, MeshSpace space) {
  out << "# frame " << frame.number << "; mm\n";
  std::vector<Place> texture(kModelVertices);
  for (std::size_t i = 0; i < texture_coordinates.size() / 2; ++i) {
    texture[FaceTriangles()[i / 3][i % 3]] = {texture_coordinates[2 * i],
                                              texture_coordinates[2 * i + 1]};
  }
  std::size_t written = 0;
  for (const FaceResult& face : frame.faces) {
    const std::array<double, 16> placing = Placing(face, space);
    Points vertices = VerticesOfCorners(face.corners);
    for (Vector3& p : vertices) p = Transformed(placing, p);
    out << "o face_" << face.id << "\ns 1\n";
    WriteObjMesh(out, vertices, texture, written);
    written += vertices.size();
  }
}

}  // namespace n3ds::tool
