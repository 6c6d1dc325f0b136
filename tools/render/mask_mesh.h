// SPDX-License-Identifier: MIT
// The engine's dense mesh of one face in the memory of the graphics system, replaced every frame.
// Attribute 0 is the position, 1 the normal, 2 the texture coordinate (v down). Vertex i is corner
// i % 3 of triangle i / 3.
#pragma once

#include <GLES3/gl3.h>

#include <vector>

namespace n3ds::tool {

class MaskMesh {
 public:
  MaskMesh();
  ~MaskMesh();
  MaskMesh(const MaskMesh&) = delete;
  MaskMesh& operator=(const MaskMesh&) = delete;

  // x, y, z and u, v per corner.
  void Update(const std::vector<float>& corners, const std::vector<float>& texture_coordinates);
  void Draw() const;

 private:
  GLuint array_ = 0;
  GLuint buffers_[2] = {};  // positions with normals, and texture coordinates
};

}  // namespace n3ds::tool
