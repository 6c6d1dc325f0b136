// SPDX-License-Identifier: MIT
// The tracking of one frame: checks it, matches its faces to the tracks and runs one worker per
// face on a task pool of the frame's own.
#pragma once

#include <cstdint>

#include "core/tracking_context.h"

namespace n3ds {

// As N3DS_Build3DFaceForVideo_Rigid and N3DS_Build3DFaceForVideo_Mask document them.
MRESULT BuildRigidFaces(TrackingContext* context, const NSVL_OFFSCREEN& image, N3DS_LANDMARK* faces,
                        int32_t face_count);
MRESULT BuildMaskFaces(TrackingContext* context, const NSVL_OFFSCREEN& image, N3DS_LANDMARK* faces,
                       int32_t face_count);

// What every driver of frames begins with; the steady tracker's uses them too.

// Whether a frame can be tracked. Returns 0; -1 for missing landmarks or no model; -2 for a size or
// a count out of range. A frame without faces needs neither landmarks nor a model.
MRESULT CheckFrame(const TrackingContext& context, const NSVL_OFFSCREEN& image,
                   const N3DS_LANDMARK* faces, int32_t face_count);

// The camera matrix for an upright image; focal length in pixels, 0 for the assumed one.
void SetCamera(const NSVL_OFFSCREEN& image, float focal_length, float* camera);

// Latches the landmark count of the first frame with a face, and allocates the history for it.
// Returns 0; -201.
MRESULT PrepareHistory(TrackingContext* context, uint32_t landmark_count);

}  // namespace n3ds
