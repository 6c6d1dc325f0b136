// SPDX-License-Identifier: MIT
#include "mesh/obj_writer.h"

#include <charconv>

namespace n3ds::tool {
namespace {

// A number with a fixed count of decimals, whatever the locale.
void Write(std::ostream& out, double value, int decimals) {
  char digits[64];
  const auto end =
      std::to_chars(digits, digits + sizeof digits, value, std::chars_format::fixed, decimals).ptr;
  out.write(" ", 1).write(digits, end - digits);
}

}  // namespace

void WriteObjMesh(std::ostream& out, const Points& vertices, const std::vector<Place>& texture,
                  std::size_t before) {
  for (const Vector3& p : vertices) {
    out << 'v';
    for (const double value : p) Write(out, value, 3);
    out << '\n';
  }
  for (const auto& [u, v] : texture) {
    out << "vt";
    Write(out, u, 6);
    Write(out, 1 - v, 6);
    out << '\n';
  }
  for (const Triangle& triangle : FaceTriangles()) {
    out << 'f';
    for (const std::size_t v : triangle) out << ' ' << before + v + 1 << '/' << before + v + 1;
    out << '\n';
  }
}

}  // namespace n3ds::tool
