// SPDX-License-Identifier: MIT
// A mesh in the memory of the graphics system. Attribute 0 is the position, 1 the normal.
#pragma once

#include <GLES3/gl3.h>

#include <cstddef>
#include <vector>

#include "render/mesh.h"

namespace n3ds::tool {

// OpenGL takes a place in the bound buffer as a pointer.
const void* BufferOffset(std::size_t bytes);

class GpuMesh {
 public:
  explicit GpuMesh(const Mesh& mesh);
  ~GpuMesh();
  GpuMesh(const GpuMesh&) = delete;
  GpuMesh& operator=(const GpuMesh&) = delete;

  const std::vector<MeshPart>& parts() const { return parts_; }
  void DrawPart(const MeshPart& part) const;

 private:
  GLuint array_ = 0;
  GLuint buffers_[2] = {};
  std::vector<MeshPart> parts_;
};

}  // namespace n3ds::tool
