// SPDX-License-Identifier: MIT
#include "render/mask_mesh.h"

#include <cstddef>

#include "mesh/face_tables.h"
#include "render/gpu_mesh.h"
#include "render/mesh.h"
#include "render/shapes.h"

namespace n3ds::tool {
namespace {

// Corners with the normals of the vertices they belong to, so that light runs smoothly over edges.
std::vector<Vertex> CornersWithNormals(const std::vector<float>& corners) {
  const Mesh mesh = FaceMesh(VerticesOfCorners(corners));
  std::vector<Vertex> result;
  result.reserve(mesh.indices.size());
  for (const std::uint32_t index : mesh.indices) result.push_back(mesh.vertices[index]);
  return result;
}

template <typename Value>
void Upload(GLuint buffer, const std::vector<Value>& values) {
  glBindBuffer(GL_ARRAY_BUFFER, buffer);
  glBufferData(GL_ARRAY_BUFFER, static_cast<GLsizeiptr>(values.size() * sizeof(Value)),
               values.data(), GL_STREAM_DRAW);
}

}  // namespace

MaskMesh::MaskMesh() {
  glGenVertexArrays(1, &array_);
  glGenBuffers(2, buffers_);
}

MaskMesh::~MaskMesh() {
  glDeleteBuffers(2, buffers_);
  glDeleteVertexArrays(1, &array_);
}

void MaskMesh::Update(const std::vector<float>& corners,
                      const std::vector<float>& texture_coordinates) {
  glBindVertexArray(array_);
  Upload(buffers_[0], CornersWithNormals(corners));
  glEnableVertexAttribArray(0);
  glVertexAttribPointer(0, 3, GL_FLOAT, GL_FALSE, sizeof(Vertex), nullptr);
  glEnableVertexAttribArray(1);
  glVertexAttribPointer(1, 3, GL_FLOAT, GL_FALSE, sizeof(Vertex),
                        BufferOffset(offsetof(Vertex, normal)));
  Upload(buffers_[1], texture_coordinates);
  glEnableVertexAttribArray(2);
  glVertexAttribPointer(2, 2, GL_FLOAT, GL_FALSE, 0, nullptr);
  glBindVertexArray(0);
}

void MaskMesh::Draw() const {
  glBindVertexArray(array_);
  glDrawArrays(GL_TRIANGLES, 0, static_cast<GLsizei>(kMeshCorners));
}

}  // namespace n3ds::tool
