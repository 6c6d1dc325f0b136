// SPDX-License-Identifier: MIT
// The alternation of pose fit and contour update that every worker is made of.
#pragma once

#include <cstdint>

#include "core/model_tables.h"
#include "core/pose_fitting.h"

namespace n3ds {

// Pose of a new face before its first fit: frontal, 800 mm away. It includes the mean shape's
// pitch.
extern const float kStartPose[7];

// One face's fit in one frame. The pose and the contour correspondence are the face's own and are
// refined in place.
class PoseRounds {
 public:
  // vertices: the shape to fit. The rotation and translation start from the pose.
  PoseRounds(MHandle memory, const float* vertices, const float* camera, float* pose,
             int32_t* contour);

  // Fits the pose with the given correspondence of the outline. False when the fit failed: pose,
  // rotation and translation are then what they were.
  bool Fit(const int32_t* landmarks, const int32_t* contour, const FitWeights& weights);
  // Ties the outline landmarks to the silhouette under the present rotation and translation.
  void UpdateContour(const int32_t* landmarks);
  // Sets the start pose and the default correspondence.
  void StartNewFace();

  int32_t* contour() { return contour_; }
  // Vertex of each of the 95 landmarks as the last fit used them.
  int32_t* landmark_vertices() { return landmark_vertices_; }
  // Takes the kept correspondence into the landmark table without a fit.
  void AdoptContour();
  // Sets rotation and translation from the pose.
  void TakePose();

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
