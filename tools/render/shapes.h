// SPDX-License-Identifier: MIT
// Meshes made by formula: the head under the stickers and the coordinate tripod.
#pragma once

#include <vector>

#include "model/face_model_file.h"
#include "render/mesh.h"

namespace n3ds::tool {

// A face of the model's mesh with its vertices at `points`, 1,812 of them.
Mesh FaceMesh(const Points& points);

// The mean face of the model in the frame of the model matrix.
Mesh FaceMesh(const FaceModelFile& model);

// What the face mesh leaves out of a head: skull and ears, fitted to a mean face whose origin lies
// midway between the tragions. It hides the far sides of hat and glasses; on a photo nothing of it
// is seen.
Mesh SkullMesh();

// The same without what lies under the face: a dense mesh has open eyes and a mouth that opens, and
// it is not the mean face's, so the skull would come through.
Mesh OpenSkullMesh();

// Three arrows along x (red), y (green) and z (blue) from before the tip of the nose.
Mesh TripodMesh();

}  // namespace n3ds::tool
