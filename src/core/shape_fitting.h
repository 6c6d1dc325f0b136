// SPDX-License-Identifier: MIT
// The coefficient fits of the mask mode: who the person is (identity) and what the face does
// (expression), each one linear least-squares problem under a fixed pose.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Common arguments:
//   mean_shape, identity_basis, expression_basis, tensor   the model, 8 fractional bits
//   camera, rotation, translation   the pose of the mean shape; rotation is 3x3, row-major
//   landmark_vertices   95 vertex indices, not checked
//   scale               the larger of image width and height over 640: keeps the balance between
//                       pixels and priors
// Both return 0, also when the system is singular: the coefficients then keep their values. -1 for
// a null pointer, -201 when there is no memory for the system; nothing is written.

// Fits the 16 identity coefficients to 95 points x, y, z: pixels, and for landmarks 19 to 94 the
// camera depth that the vertex should keep. The expression is left out of this fit.
int32_t SolveForIdentityCoef(MHandle memory, const float* points, const int16_t* mean_shape,
                             const int16_t* identity_basis, const float* camera,
                             const float* rotation, const float* translation, float* identity_coef,
                             const int32_t* landmark_vertices, float scale);

// Fits the 20 expression coefficients to 95 pairs x, y of pixels, for the person that identity_coef
// describes.
int32_t SolveForExpressionCoef(MHandle memory, const int32_t* landmarks, const int16_t* mean_shape,
                               const int16_t* identity_basis, const int16_t* expression_basis,
                               const int16_t* tensor, const float* camera, const float* rotation,
                               const float* translation, const float* identity_coef,
                               float* expression_coef, const int32_t* landmark_vertices,
                               float scale);

}  // namespace n3ds
