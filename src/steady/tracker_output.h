// SPDX-License-Identifier: MIT
// What a host gets of a face the steady tracker follows.
#pragma once

#include "norvale_3d_sticker_core.h"
#include "steady/face.h"
#include "steady/model.h"

namespace n3ds::steady {

// The pose of the frame that results are in. It is the model's, turned, moved and grown so that the
// mean face lies as well as it can on the person's brows, forehead and nose: what an artist puts on
// the mean face lies on the person's. Growth divides the distance.
struct OutputFrame {
  Rotation rotation;  // to the camera frame
  float translation[3];
  // Of the output frame in the model frame: x_model = growth * turn * x + shift.
  Rotation turn;
  float shift[3];
  float growth;
};
OutputFrame OutputFrameOf(const Model& model, const Face& face);

// Fills a record as the core's report functions do; landmarks3D is set by the caller. `camera` is a
// 3x3 camera matrix; rigid results are tilted to the upright head, mask results are in the frame of
// the mesh.
void ReportFace(const Model& model, const Face& face, const float* camera, bool tilted,
                uint32_t landmark_count, N3DS_RIGID_MATRIX* record);

// The face's mesh in the output frame, kVertexCount vertices.
void BuildMesh(const TrackingContext& context, const Model& model, const Face& face,
               float* vertices);

}  // namespace n3ds::steady
