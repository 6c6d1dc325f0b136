// SPDX-License-Identifier: MIT
#include "core/pose_fitting.h"

#include <cmath>
#include <cstring>

#include "core/model_tables.h"
#include "core/tracking_context.h"

namespace n3ds {

namespace {

// The solver leaves the quaternion's squared length n free as a scale of the model. Dividing the
// translation by n, not by its root, keeps every projection: R(q) carries the factor n, and a
// common factor of the camera-space point cancels in the perspective division.
void NormalizePose(float* pose) {
  float n = 0.0f;
  for (int i = 0; i < 4; ++i) n = std::fma(pose[i], pose[i], n);
  if (n == 0.0f) return;
  for (int i = 4; i < kPoseSize; ++i) pose[i] /= n;
  const float length = std::sqrt(n);
  for (int i = 0; i < 4; ++i) pose[i] /= length;
}

}  // namespace

int64_t FitRigidPose(MHandle memory, const int32_t* landmarks, const float* vertices,
                     const float* camera, float* rotation, float* translation, float* pose,
                     const int32_t* contour, int32_t* landmark_vertices,
                     const FitWeights& weights) {
  if (landmarks == nullptr || vertices == nullptr || camera == nullptr || rotation == nullptr ||
      translation == nullptr || pose == nullptr || landmark_vertices == nullptr) {
    return N3DS_NULL_ARGUMENT;
  }
  if (contour != nullptr) {
    std::memcpy(landmark_vertices, contour, kOutlineLandmarkCount * sizeof(int32_t));
  }

  const int first = contour != nullptr ? 0 : kOutlineLandmarkCount;
  const int count = kFitLandmarkCount - first;
  float points_2d[2 * kFitLandmarkCount];
  float points_3d[3 * kFitLandmarkCount];
  for (int i = 0; i < count; ++i) {
    const float* vertex = vertices + 3 * static_cast<ptrdiff_t>(landmark_vertices[first + i]);
    std::memcpy(points_3d + 3 * i, vertex, 3 * sizeof(float));
    points_2d[2 * i] = static_cast<float>(landmarks[2 * (first + i)]);
    points_2d[2 * i + 1] = static_cast<float>(landmarks[2 * (first + i) + 1]);
  }

  float fitted[kPoseSize];
  std::memcpy(fitted, pose, sizeof(fitted));
  MRESULT result = SolveByLM(memory, points_2d, points_3d, count, camera, fitted, weights.contour,
                             weights.range, weights.weighting_switch, weights.inner, kPoseSize);
  if (result != N3DS_OK) return result;
  NormalizePose(fitted);
  std::memcpy(pose, fitted, sizeof(fitted));

  float matrix[9];
  result = QuatToRotationMatrix(fitted, matrix);
  if (result != N3DS_OK) return result;
  std::memcpy(rotation, matrix, sizeof(matrix));
  std::memcpy(translation, fitted + 4, 3 * sizeof(float));
  return N3DS_OK;
}

}  // namespace n3ds
