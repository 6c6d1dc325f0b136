// SPDX-License-Identifier: MIT
// Carries each face's track from the frame before to its place in this frame.
#pragma once

#include <cstdint>

#include "core/tracking_context.h"

namespace n3ds {

// Which face of the last frame each face of this frame continues; -1 for a new face.
struct FaceAssignment {
  int32_t previous[kSlotCount];
};

// Landmark sets are landmark_num pairs x, y each, face after face. Both counts are 0 to 5, else -2.
int32_t AssignFaces(const int32_t* landmarks, uint32_t face_count,
                    const int32_t* previous_landmarks, uint32_t previous_count,
                    uint32_t landmark_num, FaceAssignment* assignment);

// Moves every slot of the context, and of the previous frame's landmarks, to the face that
// continues it; a new face's slot starts from zeros. Returns 0; -201.
int32_t MoveTracks(const FaceAssignment& assignment, uint32_t face_count, TrackingContext* context,
                   int32_t* previous_landmarks);

}  // namespace n3ds
