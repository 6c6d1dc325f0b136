// SPDX-License-Identifier: MIT
// The dense meshes of a frame as a Wavefront OBJ file, for other tools.
#pragma once

#include <ostream>
#include <vector>

#include "engine/face_results.h"

namespace n3ds::tool {

// Where the vertices are. Both in mm, x to the image right, y up, z towards the viewer: from the
// viewer's place with the head's pose, or in the upright head with its origin between the ears.
enum class MeshSpace { kViewer, kHead };

// An object a face, each with the same vertex order, triangles and texture coordinates (v up, as
// OBJ has it). `texture_coordinates`: u, v per corner, v down. Every face must be finite.
void WriteMeshObj(std::ostream& out, const FrameResult& frame,
                  const std::vector<float>& texture_coordinates, MeshSpace space);

}  // namespace n3ds::tool
