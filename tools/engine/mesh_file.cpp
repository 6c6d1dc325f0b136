#include "engine/mesh_file.h"

#include <array>
#include <charconv>
#include <cstddef>

#include "engine/face_model_file.h"
#include "engine/mesh_tables.h"

namespace n3ds::tool {
namespace {

// A number with a fixed count of decimals, whatever the locale.
void Write(std::ostream& out, double value, int decimals) {
  char digits[64];
  const auto end =
      std::to_chars(digits, digits + sizeof digits, value, std::chars_format::fixed, decimals).ptr;
  out.write(" ", 1).write(digits, end - digits);
}

// Column-major, from the mesh's frame to that of the file.
std::array<double, 16> Placing(const FaceResult& face, MeshSpace space) {
  if (space == MeshSpace::kViewer) return ModelView(face);
  // The upright head's axes as columns; their transpose goes the other way.
  FaceResult at_rest;
  at_rest.model = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1};
  at_rest.pitched = face.pitched;
  const Matrix4 axes = HeadModel(at_rest);
  std::array<double, 16> placing{};
  for (std::size_t k = 0; k < 16; ++k) placing[k] = double{axes[4 * (k % 4) + k / 4]};
  return placing;
}

}  // namespace

void WriteMeshObj(std::ostream& out, const FrameResult& frame,
                  const std::vector<float>& texture_coordinates, MeshSpace space) {
  out << "# frame " << frame.number << "; mm\n";
  std::vector<std::array<float, 2>> texture(kModelVertices);
  for (std::size_t i = 0; i < texture_coordinates.size() / 2; ++i) {
    texture[MeshTriangles()[i / 3][i % 3]] = {texture_coordinates[2 * i],
                                              texture_coordinates[2 * i + 1]};
  }
  std::size_t first = 1;
  for (const FaceResult& face : frame.faces) {
    out << "o face_" << face.id << '\n';
    const std::vector<float> vertices = VerticesOfCorners(face.corners);
    const std::array<double, 16> m = Placing(face, space);
    for (std::size_t i = 0; i < vertices.size(); i += 3) {
      out << 'v';
      for (std::size_t row = 0; row < 3; ++row) {
        double value = m[12 + row];
        for (std::size_t k = 0; k < 3; ++k) value += m[4 * k + row] * double{vertices[i + k]};
        Write(out, value, 3);
      }
      out << '\n';
    }
    for (const auto& [u, v] : texture) {
      out << "vt";
      Write(out, double{u}, 6);
      Write(out, 1 - double{v}, 6);
      out << '\n';
    }
    out << "s 1\n";
    for (const auto& triangle : MeshTriangles()) {
      out << 'f';
      for (const std::uint16_t v : triangle) out << ' ' << first + v << '/' << first + v;
      out << '\n';
    }
    first += kModelVertices;
  }
}

}  // namespace n3ds::tool
