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

}  // namespace n3ds
