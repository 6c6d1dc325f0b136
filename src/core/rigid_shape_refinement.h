// SPDX-License-Identifier: MIT
// The small refits of identity and expression that the full rigid worker makes every frame, so that
// the 3-D landmarks follow the face.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Arguments as in shape_fitting.h, but with landmarks as 95 pairs x, y of whole pixels. None may be
// null but the memory handle, where it says so.

// Refits the identity to the 19 outline landmarks and moves the 16 coefficients by 0.4 of the way.
// A refit without memory or with a singular system counts as all zeros, so the coefficients fade
// while it lasts.
void RefitIdentityRigid(MHandle memory, const int32_t* landmarks, const int16_t* mean_shape,
                        const int16_t* identity_basis, const float* camera, const float* rotation,
                        const float* translation, const int32_t* landmark_vertices, float scale,
                        float* identity_coef);

// Refits the 20 expression coefficients to 60 inner landmarks, without regard to the identity. They
// keep their values without memory or with a singular system. Does nothing when mean_shape,
// expression_basis or expression_coef is null.
void RefitExpressionRigid(MHandle memory, const int32_t* landmarks, const int16_t* mean_shape,
                          const int16_t* expression_basis, const float* camera,
                          const float* rotation, const float* translation,
                          const int32_t* landmark_vertices, float scale, float* expression_coef);

}  // namespace n3ds
