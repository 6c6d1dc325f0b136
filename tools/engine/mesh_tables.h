// The dense mesh as data: its triangles and where the landmarks lie on it. The tables stand in
// data/; the engine has them of its own.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "engine/face_model_file.h"

namespace n3ds::tool {

constexpr std::size_t kMeshTriangles = 3456;
constexpr std::size_t kMeshCorners = 3 * kMeshTriangles;

// Landmarks with a vertex of their own that does not change with the view: brows, eyes, nose, lips.
constexpr std::size_t kFirstInnerLandmark = 19;
constexpr std::size_t kLastInnerLandmark = 94;

// Corner i of the unrolled mesh is vertex MeshTriangles()[i / 3][i % 3]. Counter-clockwise seen
// from outside.
const std::array<std::array<std::uint16_t, 3>, kMeshTriangles>& MeshTriangles();

// u, v of each vertex in the mask picture, v down.
const std::array<std::array<float, 2>, kModelVertices>& MeshTextureCoordinates();

// Vertex of an inner landmark.
std::size_t LandmarkVertex(std::size_t landmark);

// x, y, z per vertex out of x, y, z per corner (none for none).
std::vector<float> VerticesOfCorners(const std::vector<float>& corners);

}  // namespace n3ds::tool
