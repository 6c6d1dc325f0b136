// SPDX-License-Identifier: MIT
#include "mesh/face_tables.h"

#include <algorithm>

#include "model/face_model_file.h"
#include "support/error.h"

namespace n3ds::tool {

const std::vector<Triangle>& FaceTriangles() {
  static const std::vector<Triangle> triangles = {
#include "triangles.inc"
  };
  return triangles;
}

const std::vector<Place>& FaceTexture() {
  static const std::vector<Place> texture = {
#include "texture_coordinates.inc"
  };
  return texture;
}

const std::vector<std::string>& ExpressionNames() {
  static const std::vector<std::string> names = {
#include "expression_names.inc"
  };
  return names;
}

const std::vector<std::size_t>& ContourCandidates() {
  static const std::vector<std::size_t> candidates = {
#include "contour_candidate_vertex_indices.inc"
  };
  return candidates;
}

const std::vector<std::size_t>& LandmarkVertices() {
  static const std::vector<std::size_t> vertices = {
#include "default_contour_vertex_indices.inc"
#include "inner_landmark_vertex_indices.inc"
  };
  return vertices;
}

std::size_t ExpressionByName(const std::string& name) {
  const std::vector<std::string>& names = ExpressionNames();
  const auto found = std::find(names.begin(), names.end(), name);
  if (found != names.end()) return static_cast<std::size_t>(found - names.begin());
  std::string known;
  for (const std::string& other : names) known += (known.empty() ? "" : ", ") + other;
  throw Error("there is no expression '" + name + "' (the model has " + known + ")");
}

Points VerticesOfCorners(const std::vector<float>& corners) {
  if (corners.empty()) return {};
  Points vertices(kModelVertices);
  for (std::size_t i = 0; i < kMeshCorners; ++i) {
    const float* p = &corners[3 * i];
    vertices[FaceTriangles()[i / 3][i % 3]] = {p[0], p[1], p[2]};
  }
  return vertices;
}

}  // namespace n3ds::tool
