// SPDX-License-Identifier: MIT
#include "render/gpu_mesh.h"

#include <cstdint>

namespace n3ds::tool {

const void* BufferOffset(std::size_t bytes) {
  return reinterpret_cast<const void*>(bytes);  // NOLINT(performance-no-int-to-ptr)
}

GpuMesh::GpuMesh(const Mesh& mesh) : parts_(mesh.parts) {
  glGenVertexArrays(1, &array_);
  glGenBuffers(2, buffers_);
  glBindVertexArray(array_);
  glBindBuffer(GL_ARRAY_BUFFER, buffers_[0]);
  glBufferData(GL_ARRAY_BUFFER, static_cast<GLsizeiptr>(mesh.vertices.size() * sizeof(Vertex)),
               mesh.vertices.data(), GL_STATIC_DRAW);
  glBindBuffer(GL_ELEMENT_ARRAY_BUFFER, buffers_[1]);
  glBufferData(GL_ELEMENT_ARRAY_BUFFER,
               static_cast<GLsizeiptr>(mesh.indices.size() * sizeof(std::uint32_t)),
               mesh.indices.data(), GL_STATIC_DRAW);
  glEnableVertexAttribArray(0);
  glVertexAttribPointer(0, 3, GL_FLOAT, GL_FALSE, sizeof(Vertex), nullptr);
  glEnableVertexAttribArray(1);
  glVertexAttribPointer(1, 3, GL_FLOAT, GL_FALSE, sizeof(Vertex),
                        BufferOffset(offsetof(Vertex, normal)));
  glBindVertexArray(0);
}

GpuMesh::~GpuMesh() {
  glDeleteBuffers(2, buffers_);
  glDeleteVertexArrays(1, &array_);
}

void GpuMesh::DrawPart(const MeshPart& part) const {
  glBindVertexArray(array_);
  glDrawElements(GL_TRIANGLES, static_cast<GLsizei>(part.index_count), GL_UNSIGNED_INT,
                 BufferOffset(part.first_index * sizeof(std::uint32_t)));
}

}  // namespace n3ds::tool
