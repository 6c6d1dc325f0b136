// SPDX-License-Identifier: MIT
// The tables of data/ that belong to every face model: what the file's vertices are joined to,
// where they lie in the texture, and which of them stand for landmarks.
#pragma once

#include <array>
#include <cstddef>
#include <string>
#include <vector>

#include "norvale_3d_sticker_engine.h"
#include "support/vector3.h"

namespace n3ds::tool {

using Triangle = std::array<std::size_t, 3>;  // counter-clockwise seen from outside
using Place = std::array<double, 2>;          // u, v; v downwards

constexpr std::size_t kMeshTriangles = N3DS_TRIANGLE_COUNT;
constexpr std::size_t kMeshCorners = N3DS_MASK_CORNER_COUNT;
static_assert(kMeshCorners == 3 * kMeshTriangles);

// Landmarks with a vertex of their own that does not change with the view: brows, eyes, nose, lips.
constexpr std::size_t kFirstInnerLandmark = 19;
constexpr std::size_t kLastInnerLandmark = 94;

// Corner i of the engine's unrolled mesh is vertex FaceTriangles()[i / 3][i % 3].
const std::vector<Triangle>& FaceTriangles();
const std::vector<Place>& FaceTexture();
const std::vector<std::string>& ExpressionNames();  // in the order of the model file
const std::vector<std::size_t>& ContourCandidates();
// Vertices of the landmarks 0 to 94; those of the outline are where they lie on a frontal face.
const std::vector<std::size_t>& LandmarkVertices();

// Number of a named expression; throws Error that lists the names.
std::size_t ExpressionByName(const std::string& name);

// The vertices of a mesh that is given as x, y, z per corner (none for none).
Points VerticesOfCorners(const std::vector<float>& corners);

}  // namespace n3ds::tool
