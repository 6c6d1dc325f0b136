// SPDX-License-Identifier: MIT
// The small refits of identity and expression that the full rigid worker makes every frame. Rigid
// outputs do not use the coefficients; a face that goes on in mask mode starts from them.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// The pose and the landmarks that a refit starts from. Members as the arguments in shape_fitting.h,
// but with landmarks as 95 pairs x, y of integer pixels.
struct RefitView {
  const int32_t* landmarks;
  const int16_t* mean_shape;
  const float* camera;
  const float* rotation;
  const float* translation;
  const int32_t* landmark_vertices;
  float scale;
};

// Refits the identity to the 19 outline landmarks and moves the 16 coefficients by 0.4 of the way.
// A refit without memory or with a singular system counts as all zeros, so the coefficients fade
// while it lasts. No argument but the memory handle may be null.
void RefitIdentityRigid(MHandle memory, const RefitView& view, const int16_t* identity_basis,
                        float* identity_coef);

// Refits the 20 expression coefficients to 60 inner landmarks, without regard to the identity. They
// keep their values without memory or with a singular system. Does nothing when view.mean_shape,
// expression_basis or expression_coef is null.
void RefitExpressionRigid(MHandle memory, const RefitView& view, const int16_t* expression_basis,
                          float* expression_coef);

}  // namespace n3ds
