// SPDX-License-Identifier: MIT
#include "core/pose_rounds.h"

#include <cstring>

#include "core/contour_correspondence.h"
#include "norvale_3d_sticker_core.h"

namespace n3ds {

const float kStartPose[kPoseSize] = {-0.265f, 0.958f, -0.001f, -0.049f, 0.0f, 0.0f, 800.0f};

PoseRounds::PoseRounds(MHandle memory, const float* vertices, const float* camera, float* pose,
                       int32_t* contour)
    : memory_(memory), vertices_(vertices), camera_(camera), pose_(pose), contour_(contour) {
  std::memset(landmark_vertices_, 0, kOutlineLandmarkCount * sizeof(int32_t));
  std::memcpy(landmark_vertices_ + kOutlineLandmarkCount, kInnerLandmarkVertexIndices,
              sizeof(kInnerLandmarkVertexIndices));
  UpdateTransformFromPose();
}

bool PoseRounds::Fit(const int32_t* landmarks, const int32_t* contour, const FitWeights& weights) {
  return FitRigidPose(memory_, landmarks, vertices_, camera_, rotation_, translation_, pose_,
                      contour, landmark_vertices_, weights) == N3DS_OK;
}

void PoseRounds::UpdateContour(const int32_t* landmarks) {
  // A failed update leaves the correspondence as it was; the next fit goes on with that.
  UpdateContourCorrespondence(memory_, landmarks, vertices_, camera_, rotation_, translation_,
                              contour_);
}

void PoseRounds::StartNewFace() {
  std::memcpy(pose_, kStartPose, sizeof(kStartPose));
  std::memcpy(contour_, kDefaultContourVertexIndices, sizeof(kDefaultContourVertexIndices));
  UpdateTransformFromPose();
}

void PoseRounds::CopyContourToLandmarks() {
  std::memcpy(landmark_vertices_, contour_, kOutlineLandmarkCount * sizeof(int32_t));
}

void PoseRounds::UpdateTransformFromPose() {
  QuatToRotationMatrix(pose_, rotation_);
  std::memcpy(translation_, pose_ + 4, sizeof(translation_));
}

}  // namespace n3ds
