// SPDX-License-Identifier: MIT
// Faces as Wavefront OBJ, for other tools.
#pragma once

#include <cstddef>
#include <ostream>
#include <vector>

#include "mesh/face_tables.h"

namespace n3ds::tool {

// Vertices in mm with three decimals, texture coordinates and the face mesh's triangles. `texture`
// has a place per vertex, v downwards; OBJ counts v from below. `before` is how many vertices the
// file has so far: OBJ numbers them through all its objects.
void WriteObjMesh(std::ostream& out, const Points& vertices, const std::vector<Place>& texture,
                  std::size_t before = 0);

}  // namespace n3ds::tool
