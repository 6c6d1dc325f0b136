#include "engine/mesh_tables.h"

#include <algorithm>

namespace n3ds::tool {
namespace {

constexpr std::array<std::array<std::uint16_t, 3>, kMeshTriangles> kTriangles = {{
#include "triangles.inc"
}};

constexpr std::array<std::array<float, 2>, kModelVertices> kTextureCoordinates = {{
#include "texture_coordinates.inc"
}};

constexpr std::uint16_t kInnerLandmarkVertices[kLastInnerLandmark - kFirstInnerLandmark + 1] = {
#include "inner_landmark_vertex_indices.inc"
};

}  // namespace

const std::array<std::array<std::uint16_t, 3>, kMeshTriangles>& MeshTriangles() {
  return kTriangles;
}

const std::array<std::array<float, 2>, kModelVertices>& MeshTextureCoordinates() {
  return kTextureCoordinates;
}

std::size_t LandmarkVertex(std::size_t landmark) {
  return kInnerLandmarkVertices[landmark - kFirstInnerLandmark];
}

std::vector<float> VerticesOfCorners(const std::vector<float>& corners) {
  if (corners.empty()) return {};
  std::vector<float> vertices(kModelCoordinates);
  for (std::size_t i = 0; i < kMeshCorners; ++i) {
    const std::size_t vertex = kTriangles[i / 3][i % 3];
    std::copy_n(&corners[3 * i], 3, &vertices[3 * vertex]);
  }
  return vertices;
}

}  // namespace n3ds::tool
