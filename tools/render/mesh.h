// SPDX-License-Identifier: MIT
// Triangle meshes with the material of each part.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace n3ds::tool {

struct Vertex {
  std::array<float, 3> position{};
  std::array<float, 3> normal{};
};

struct Material {
  std::array<float, 3> colour = {0.8F, 0.8F, 0.8F};
  float opacity = 1;
  float gloss = 0;  // strength of the highlight, 0 to 1
};

struct MeshPart {
  Material material;
  std::size_t first_index = 0;
  std::size_t index_count = 0;
};

struct Mesh {
  std::vector<Vertex> vertices;
  std::vector<std::uint32_t> indices;  // three a triangle, counter-clockwise seen from outside
  std::vector<MeshPart> parts;         // in order, covering all indices
};

// Sets every vertex normal to the mean of its triangles', weighted by their area.
void ComputeNormals(Mesh& mesh);

// Appends all of `other`, with its parts.
void Append(const Mesh& other, Mesh& mesh);

}  // namespace n3ds::tool
