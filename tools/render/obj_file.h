// SPDX-License-Identifier: MIT
// Wavefront OBJ files with their material library, as far as stickers need them: v, vn, f (polygons
// of any size, v//vn or v/vt/vn), usemtl and mtllib; newmtl, Kd, d and Ns in the library. Other
// statements are passed over.
#pragma once

#include <string>

#include "render/mesh.h"

namespace n3ds::tool {

// Throws Error with file and line.
Mesh ReadObj(const std::string& path);

}  // namespace n3ds::tool
