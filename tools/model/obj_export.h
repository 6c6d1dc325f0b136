// SPDX-License-Identifier: MIT
// Faces as Wavefront OBJ files.
#pragma once

#include <string>

#include "model/face_shapes.h"

namespace n3ds::tool {

// Writes vertices, texture coordinates and triangles; whole or not at all. Throws Error.
void WriteFaceObj(const std::string& path, const Points& face);

}  // namespace n3ds::tool
