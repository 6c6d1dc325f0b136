// SPDX-License-Identifier: MIT
// 3-D landmarks of a fitted face: each 2-D landmark put back into space at the depth of its model
// vertex.
#pragma once

#include <cstdint>

namespace n3ds {

struct Landmark3DInput {
  const float* pose;         // 7 floats
  const float* camera;       // 3x3 camera matrix
  const float* vertices;     // the face's shape, mm
  const int32_t* landmarks;  // landmark_count pairs x, y, pixels
  uint32_t landmark_count;   // 101 or 165
};

// Writes 3 floats per landmark in the model's frame, mm. Landmarks 97 to 100 get their depth from
// extra_vertices: kRidgeVertexIndices in rigid mode, kMaskExtraVertexIndices in mask mode.
// Returns 0; -100 when the pose's rotation cannot be inverted: nothing is written then.
int32_t ComputeLandmarks3D(const Landmark3DInput& input, const int32_t extra_vertices[4],
                           float* landmarks_3d);

}  // namespace n3ds
