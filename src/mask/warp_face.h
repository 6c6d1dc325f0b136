// SPDX-License-Identifier: MIT
// Drawing of a mask image over the projection of a face mesh, triangle by triangle.
#pragma once

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Draws the mask over the mesh as seen by camera K (3x3) at rotation R (3x3) and translation t:
// each mesh triangle is filled from the texture triangle of the same number, later triangles over
// earlier ones. The mesh has N3DS_TRIANGLE_COUNT triangles, and no index beyond its vertices.
// `output` is a BGRA image with its own buffer; where no triangle falls it stays as it is. Returns
// N3DS_OK, or N3DS_BAD_VALUE when the mask's own layout has wrong counts.
MRESULT WarpFace(const N3DS_3D_MODEL& model, const N3DS_2D_TEXTURE_MASK& mask, const float* K,
                 const float* R, const float* t, const NSVL_OFFSCREEN& output);

}  // namespace n3ds
