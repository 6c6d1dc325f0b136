// SPDX-License-Identifier: MIT
// What is reported of a fitted face: its matrices and 3-D landmarks.
#pragma once

#include <cstdint>

#include "core/tracking_context.h"

namespace n3ds {

// Fills a caller's record from slot `face` of the context; its landmarks3D buffer is set. Landmarks
// are in the model's frame; extra_vertices are as ComputeLandmarks3D takes them.
// Returns 0; -100 when the pose's rotation cannot be inverted: no landmark is written then.
int32_t ReportFace(const TrackingContext& context, int32_t face, const int32_t extra_vertices[4],
                   N3DS_RIGID_MATRIX* record);

// As N3DS_GetRigidMatrix documents it.
MRESULT ReportRigidFaces(const TrackingContext& context, N3DS_RIGID_MATRIX* records,
                         int32_t face_count);

}  // namespace n3ds
