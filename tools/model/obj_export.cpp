#include "model/obj_export.h"

#include <ostream>

#include "eval/text_table.h"
#include "model/face_tables.h"
#include "support/atomic_file.h"

namespace n3ds::tool {

void WriteFaceObj(const std::string& path, const Points& face) {
  AtomicFile file(path);
  std::ostream& out = file.stream();
  out << "# Face, upright head frame: x image right, y up, z out; mm.\n";
  for (const Point3& p : face) {
    out << "v " << Decimal(p[0], 3) << ' ' << Decimal(p[1], 3) << ' ' << Decimal(p[2], 3) << '\n';
  }
  for (const auto& [u, v] : FaceTexture()) {
    // OBJ counts v from below.
    out << "vt " << Decimal(u, 6) << ' ' << Decimal(1 - v, 6) << '\n';
  }
  for (const Triangle& t : FaceTriangles()) {
    out << 'f';
    for (const std::size_t v : t) out << ' ' << v + 1 << '/' << v + 1;
    out << '\n';
  }
  file.Commit();
}

}  // namespace n3ds::tool
