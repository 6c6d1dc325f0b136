// SPDX-License-Identifier: MIT
#include "render/mesh.h"

#include <cmath>

namespace n3ds::tool {

void ComputeNormals(Mesh& mesh) {
  for (Vertex& vertex : mesh.vertices) vertex.normal = {0, 0, 0};
  for (std::size_t i = 0; i + 2 < mesh.indices.size(); i += 3) {
    std::array<Vertex*, 3> corner{};
    for (std::size_t k = 0; k < 3; ++k) corner[k] = &mesh.vertices[mesh.indices[i + k]];
    std::array<float, 3> a{};
    std::array<float, 3> b{};
    for (std::size_t k = 0; k < 3; ++k) {
      a[k] = corner[1]->position[k] - corner[0]->position[k];
      b[k] = corner[2]->position[k] - corner[0]->position[k];
    }
    // Its length is twice the triangle's area.
    const std::array<float, 3> cross = {a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2],
                                        a[0] * b[1] - a[1] * b[0]};
    for (Vertex* vertex : corner) {
      for (std::size_t k = 0; k < 3; ++k) vertex->normal[k] += cross[k];
    }
  }
  for (Vertex& vertex : mesh.vertices) {
    const float length = std::hypot(vertex.normal[0], vertex.normal[1], vertex.normal[2]);
    if (length == 0) continue;
    for (float& value : vertex.normal) value /= length;
  }
}

void Append(const Mesh& other, Mesh& mesh) {
  const auto first_vertex = static_cast<std::uint32_t>(mesh.vertices.size());
  const std::size_t first_index = mesh.indices.size();
  mesh.vertices.insert(mesh.vertices.end(), other.vertices.begin(), other.vertices.end());
  for (const std::uint32_t index : other.indices) mesh.indices.push_back(first_vertex + index);
  for (MeshPart part : other.parts) {
    part.first_index += first_index;
    mesh.parts.push_back(part);
  }
}

}  // namespace n3ds::tool
