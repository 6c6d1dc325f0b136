// SPDX-License-Identifier: MIT
// Fits the rigid head pose of one face to its 95 landmarks.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Weights of the residuals by landmark, as SolveByLM takes them.
struct FitWeights {
  int64_t weighting_switch;  // 1: eye corners and nose count fully, all else a tenth; 0: all alike
  float contour;             // temples and cheeks (0-3, 15-18) that project outside the observation
  float range;               // what moves with speech: chin 5-13, mouth 75, 76, 80-88 and 90-94
  float inner;               // nose, left side (63-65, 68) against right (69, 72-74); only for 1
};

// Minimises the reprojection error over the landmarks, starting from `pose` and refining it.
//   landmarks        95 pairs x, y, pixels
//   vertices         the face's shape, x, y, z per vertex, mm
//   camera           3x3 camera matrix
//   rotation         out: 9 floats, a proper rotation
//   translation      out: 3 floats, mm
//   pose             in: start, out: fitted pose with a unit quaternion
//   contour          19 vertex indices for the outline landmarks, or null: the outline then takes
//                    no part, because its old correspondence may be stale
//   landmark_vertices  95 vertex indices; `contour` is copied over the first 19 and stays there
//                    whatever the outcome. Indices are not checked.
// Returns 0; -1 for a null argument; otherwise the solver's code, with pose and outputs unchanged.
int64_t FitRigidPose(MHandle memory, const int32_t* landmarks, const float* vertices,
                     const float* camera, float* rotation, float* translation, float* pose,
                     const int32_t* contour, int32_t* landmark_vertices, const FitWeights& weights);

}  // namespace n3ds
