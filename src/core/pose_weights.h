// SPDX-License-Identifier: MIT
// Solver weights and state of the face, read off the landmarks of one frame.
#pragma once

#include <cstdint>

namespace n3ds {

// Where ComputePoseWeights stops early, the initial values remain.
struct PoseWeights {
  int64_t mouth_open = 0;        // 1: the lips are apart
  int64_t frontal = 0;           // 1: the face looks into the camera
  int64_t weighting_switch = 1;  // 0: the face is turned, pitched or distorted
  float contour = 0.0f;          // FitWeights::contour
  float range = 0.0f;  // FitWeights::range: less for an open mouth, which the mean shape lacks
  float inner = 1.0f;  // FitWeights::inner: left half-width over right, 1 for a frontal face
};

// Landmarks: 95 pairs x, y. Returns 0; -1 for null landmarks. Just before a division by a distance
// below 1e-6 it returns 0 and leaves what would have followed as it was.
int32_t ComputePoseWeights(const int32_t* landmarks, PoseWeights* weights);

// Whether the frame may refine the person's identity: mouth shut, frontal, undistorted.
bool AllowsIdentityFit(const PoseWeights& weights);

// The inner weight as the pose fits take it: within [0.1, 10].
float ClampInnerWeight(float weight);

}  // namespace n3ds
