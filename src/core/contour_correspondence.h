// SPDX-License-Identifier: MIT
// Ties the 19 outline landmarks to the model vertices that form the silhouette under a pose.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Projects the contour candidates, takes their convex hull, fills its edges with probe points
// snapped to the nearest candidate, and gives each outline landmark the nearest candidate among
// hull and probes.
//   landmarks        95 pairs x, y; only 0 to 18 are read
//   vertices         the face's shape, mm
//   correspondence   19 vertex indices, out
// Returns 0, also when the hull is unusable and the correspondence is left as it was; -1 for a null
// argument; -201.
int64_t UpdateContourCorrespondence(MHandle memory, const int32_t* landmarks, const float* vertices,
                                    const float* camera, const float* rotation,
                                    const float* translation, int32_t* correspondence);

}  // namespace n3ds
