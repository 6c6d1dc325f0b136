// SPDX-License-Identifier: MIT
// Fits the rigid head pose of one face to its 95 landmarks.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Weights of the residuals by landmark; SolveByLM says which landmarks they act on.
struct FitWeights {
  int64_t weighting_switch;  // 0 or 1
  float contour;             // w1
  float range;               // w2
  float inner;               // w3
};

// Minimises the reprojection error over the landmarks, starting from `pose` and refining it.
//   landmarks        95 pairs x, y, pixels
//   vertices         the face's shape, x, y, z per vertex, mm
//   camera           3x3 camera matrix
//   rotation         out: 9 floats, a proper rotation
//   translation      out: 3 floats, mm
//   pose             in: start, out: fitted pose with a unit quaternion
//   contour          19 vertex indices for the outline landmarks, or null: then the outline takes
//   no
//                    part, because its old correspondence may be stale
//   landmark_vertices  95 vertex indices; `contour` is copied over the first 19 and stays there
//                    whatever the outcome. Indices are not checked.
// Returns 0; -1 for a null argument; otherwise what the solver returned: pose and outputs are then
// unchanged.
int64_t FitRigidPose(MHandle memory, const int32_t* landmarks, const float* vertices,
                     const float* camera, float* rotation, float* translation, float* pose,
                     const int32_t* contour, int32_t* landmark_vertices, const FitWeights& weights);

}  // namespace n3ds
