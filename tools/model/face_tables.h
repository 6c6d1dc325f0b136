// The tables of data/ that belong to every face model: what the file's vertices are joined to,
// where they lie in the texture, and which of them stand for landmarks.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace n3ds::tool {

using Triangle = std::array<std::size_t, 3>;  // counter-clockwise seen from outside
using Place = std::array<double, 2>;          // u, v; v downwards

const std::vector<Triangle>& FaceTriangles();
const std::vector<Place>& FaceTexture();
const std::vector<std::string>& ExpressionNames();  // in the order of the model file
const std::vector<std::size_t>& ContourCandidates();
// Vertices of the landmarks 0 to 94.
const std::vector<std::size_t>& LandmarkVertices();

// Number of a named expression; throws Error that lists the names.
std::size_t ExpressionByName(const std::string& name);

}  // namespace n3ds::tool
