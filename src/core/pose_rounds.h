// SPDX-License-Identifier: MIT
// The alternation of pose fit and contour update that every worker is made of.
#pragma once

#include <cstdint>

#include "core/model_tables.h"
#include "core/pose_fitting.h"
#include "core/tracking_context.h"

namespace n3ds {

// Pose of a new face before its first fit: frontal, 800 mm away. It includes the mean shape's
// pitch.
extern const float kStartPose[kPoseSize];

// One face's fit in one frame. The pose and the contour correspondence are the face's own and are
// refined in place.
class PoseRounds {
 public:
  // vertices: the shape to fit. The rotation and translation start from the pose.
  PoseRounds(MHandle memory, const float* vertices, const float* camera, float* pose,
             int32_t* contour);

  // Fits the pose with the given contour correspondence. False when the fit failed: pose, rotation
  // and translation are then unchanged.
  bool Fit(const int32_t* landmarks, const int32_t* contour, const FitWeights& weights);
  // Ties the outline landmarks to the silhouette under the current rotation and translation.
  void UpdateContour(const int32_t* landmarks);
  // Sets the start pose and the default correspondence.
  void StartNewFace();

  // Copies the face's contour correspondence to the landmark table without a fit.
  void CopyContourToLandmarks();
  // Sets rotation and translation from the pose.
  void UpdateTransformFromPose();

  const int32_t* contour() const { return contour_; }
  // Vertex of each of the 95 landmarks as the last fit used them.
  const int32_t* landmark_vertices() const { return landmark_vertices_; }
  const float* rotation() const { return rotation_; }
  const float* translation() const { return translation_; }

 private:
  MHandle memory_;
  const float* vertices_;
  const float* camera_;
  float* pose_;
  int32_t* contour_;
  int32_t landmark_vertices_[kFitLandmarkCount];
  float rotation_[9];
  float translation_[3];
};

}  // namespace n3ds
