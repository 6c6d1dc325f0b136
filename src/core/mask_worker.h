// SPDX-License-Identifier: MIT
// The per-face task of mask mode.
#pragma once

namespace n3ds {

// Takes a MaskFaceTask and returns null.
void* _Build3DFaceForVideo_Mask_Thread(void* task);

}  // namespace n3ds
