// SPDX-License-Identifier: MIT
#include "render/shapes.h"

#include <cmath>

#include "mesh/face_tables.h"

namespace n3ds::tool {
namespace {

constexpr float kPi = 3.14159265358979F;

constexpr Material kSkin = {{0.80F, 0.74F, 0.69F}, 1, 0.08F};

// A unit sphere, stretched, turned about y and moved: rows of latitude from the lower pole up.
Mesh Ellipsoid(const std::array<float, 3>& centre, const std::array<float, 3>& half_axes,
               float turn_about_y) {
  constexpr std::size_t kRows = 24;
  constexpr std::size_t kColumns = 48;
  const float cosine = std::cos(turn_about_y);
  const float sine = std::sin(turn_about_y);
  const auto turned = [&](float x, float y, float z) -> std::array<float, 3> {
    return {cosine * x + sine * z, y, cosine * z - sine * x};
  };
  Mesh mesh;
  for (std::size_t r = 0; r <= kRows; ++r) {
    const float latitude = kPi * (static_cast<float>(r) / kRows - 0.5F);
    for (std::size_t c = 0; c <= kColumns; ++c) {
      const float longitude = 2 * kPi * static_cast<float>(c) / kColumns;
      const float x = std::cos(latitude) * std::sin(longitude);
      const float y = std::sin(latitude);
      const float z = std::cos(latitude) * std::cos(longitude);
      Vertex vertex;
      vertex.position = turned(half_axes[0] * x, half_axes[1] * y, half_axes[2] * z);
      for (std::size_t k = 0; k < 3; ++k) vertex.position[k] += centre[k];
      vertex.normal = turned(x / half_axes[0], y / half_axes[1], z / half_axes[2]);
      const float length = std::hypot(vertex.normal[0], vertex.normal[1], vertex.normal[2]);
      for (float& value : vertex.normal) value /= length;
      mesh.vertices.push_back(vertex);
    }
  }
  for (std::size_t r = 0; r < kRows; ++r) {
    for (std::size_t c = 0; c < kColumns; ++c) {
      const auto a = static_cast<std::uint32_t>(r * (kColumns + 1) + c);
      const auto b = static_cast<std::uint32_t>(a + kColumns + 1);
      mesh.indices.insert(mesh.indices.end(), {a, a + 1, b + 1, a, b + 1, b});
    }
  }
  mesh.parts.push_back({kSkin, 0, mesh.indices.size()});
  return mesh;
}

// An arrow from `start` along axis `axis`: a rod and a cone, each a surface of revolution.
Mesh Arrow(const std::array<float, 3>& start, std::size_t axis, const Material& material) {
  constexpr std::uint32_t kSides = 16;
  // Distance along the axis and radius, mm; a pair of equal distances makes a sharp edge.
  constexpr float kProfile[][2] = {{0, 0},     {0, 1.6F},  {30, 1.6F}, {30, 1.6F},
                                   {30, 4.4F}, {30, 4.4F}, {42, 0}};
  constexpr std::uint32_t kRings = sizeof kProfile / sizeof kProfile[0];
  Mesh mesh;
  for (const auto& [along, radius] : kProfile) {
    for (std::uint32_t s = 0; s < kSides; ++s) {
      const float angle = 2 * kPi * static_cast<float>(s) / kSides;
      Vertex vertex;
      vertex.position = start;
      vertex.position[axis] += along;
      vertex.position[(axis + 1) % 3] += radius * std::cos(angle);
      vertex.position[(axis + 2) % 3] += radius * std::sin(angle);
      mesh.vertices.push_back(vertex);
    }
  }
  for (std::uint32_t r = 0; r + 1 < kRings; ++r) {
    for (std::uint32_t s = 0; s < kSides; ++s) {
      const std::uint32_t a = r * kSides + s;
      const std::uint32_t b = r * kSides + (s + 1) % kSides;
      mesh.indices.insert(mesh.indices.end(), {a, b, b + kSides, a, b + kSides, a + kSides});
    }
  }
  ComputeNormals(mesh);
  mesh.parts.push_back({material, 0, mesh.indices.size()});
  return mesh;
}

}  // namespace

Mesh FaceMesh(const Points& points) {
  Mesh mesh;
  for (const Vector3& p : points) {
    mesh.vertices.push_back(
        {{static_cast<float>(p[0]), static_cast<float>(p[1]), static_cast<float>(p[2])}, {}});
  }
  for (const Triangle& triangle : FaceTriangles()) {
    for (const std::size_t v : triangle) mesh.indices.push_back(static_cast<std::uint32_t>(v));
  }
  ComputeNormals(mesh);
  mesh.parts.push_back({kSkin, 0, mesh.indices.size()});
  return mesh;
}

Mesh FaceMesh(const FaceModelFile& model) { return FaceMesh(MeanFace(model)); }

Mesh SkullMesh() {
  // The ellipsoid passes a millimetre under the forehead of the mean face and has the length and
  // breadth of an average head; the ears stand off by 25 degrees behind the tragions.
  Mesh mesh = Ellipsoid({0, 45, -1}, {76, 87, 94}, 0);
  constexpr float kStandOff = 25 * kPi / 180;
  Append(Ellipsoid({80, -1, -12}, {4.5F, 28, 16}, -kStandOff), mesh);
  Append(Ellipsoid({-80, -1, -12}, {4.5F, 28, 16}, kStandOff), mesh);
  return mesh;
}

Mesh OpenSkullMesh() {
  constexpr float kForehead = 75;  // y, a little under the upper edge of the face
  constexpr float kCheek = 30;     // z, a little before its sides
  const Mesh whole = SkullMesh();
  Mesh open;
  open.vertices = whole.vertices;
  for (const MeshPart& part : whole.parts) {
    const std::size_t first = open.indices.size();
    for (std::size_t i = part.first_index; i < part.first_index + part.index_count; i += 3) {
      bool covered = true;
      for (std::size_t k = 0; k < 3; ++k) {
        const auto& p = whole.vertices[whole.indices[i + k]].position;
        covered = covered && p[1] < kForehead && p[2] > kCheek;
      }
      if (covered) continue;
      open.indices.insert(open.indices.end(), &whole.indices[i], &whole.indices[i] + 3);
    }
    open.parts.push_back({part.material, first, open.indices.size() - first});
  }
  return open;
}

Mesh TripodMesh() {
  constexpr std::array<float, 3> kStart = {0, -7, 124};
  Mesh mesh = Arrow(kStart, 0, {{0.85F, 0.15F, 0.12F}, 1, 0.3F});
  Append(Arrow(kStart, 1, {{0.15F, 0.65F, 0.20F}, 1, 0.3F}), mesh);
  Append(Arrow(kStart, 2, {{0.15F, 0.30F, 0.85F}, 1, 0.3F}), mesh);
  return mesh;
}

}  // namespace n3ds::tool
