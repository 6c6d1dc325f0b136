// SPDX-License-Identifier: MIT
#include "model/obj_export.h"

#include <ostream>

#include "mesh/obj_writer.h"
#include "support/atomic_file.h"

namespace n3ds::tool {

void WriteFaceObj(const std::string& path, const Points& face) {
  AtomicFile file(path);
  file.stream() << "# Face, upright head frame: x image right, y up, z out; mm.\n";
  WriteObjMesh(file.stream(), face, FaceTexture());
  file.Commit();
}

}  // namespace n3ds::tool
