// SPDX-License-Identifier: MIT
#include "steady/outline_rows.h"

namespace n3ds::steady {

const SurfacePlace kOutlineRows[kOutlineLandmarkCount][kRowPlaces] = {
#include "outline_rows.inc"
};

const float kOutlineNormals[kOutlineLandmarkCount][2] = {
#include "outline_normals.inc"
};

}  // namespace n3ds::steady
