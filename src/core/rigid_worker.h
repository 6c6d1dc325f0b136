// SPDX-License-Identifier: MIT
// The per-face tasks of rigid mode. Each takes a RigidFaceTask and returns null.
#pragma once

namespace n3ds {

// Full worker, for frames of one to three faces: smooths landmarks and pose over time and refines
// the face's shape coefficients.
void* _Build3DFaceForVideo_Rigid_Thread(void* task);

// Fast worker, for four and five faces: fits the pose alone.
void* _Build3DFaceForVideo_Rigid_Thread_Acce(void* task);

}  // namespace n3ds
