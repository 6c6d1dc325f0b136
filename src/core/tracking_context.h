// SPDX-License-Identifier: MIT
// What the tracking core keeps from frame to frame.
#pragma once

#include <cstdint>

#include "core/model_tables.h"
#include "math/pose.h"
#include "norvale_3d_sticker_core.h"

namespace n3ds {

constexpr int kSlotCount = N3DS_MAX_FACES;

// The core's handle points to one of these; N3DS_Init fills it with zeros. After a frame, slot k of
// every per-slot array holds the track of the frame's face k.
struct TrackingContext {
  MHandle memory;                             // of every allocation of the core
  N3DS_RIGID_MATRIX rigidResult[kSlotCount];  // ModelViewOf() and projection; the rest is unused
  uint32_t landmarkNum;                       // latched by the first frame with a face; 0 before it
  float camera[9];                            // camera matrix of the last frame
  float maskPose[kSlotCount][12];             // mask mode: [R | t], row by row
  float poseRef[kSlotCount][kPoseSize];  // mask mode: the pose being fitted; rigid: equal to pose
  float pose[kSlotCount][kPoseSize];     // the face's smoothed pose
  int32_t fitState[kSlotCount][kOutlineLandmarkCount];  // contour correspondence: vertex indices
  int32_t* landmarkHistory;  // last frame: kSlotCount x landmarkNum pairs x, y
  int16_t* meanShape;        // the model, 8 fractional bits
  int16_t* identityBasis;
  int16_t* expressionBasis;
  int16_t* tensor;
  float shape[kSlotCount][kShapeSize];  // the face's vertices, mm
  float contourState[kSlotCount][57];   // reserved
  float identityCoef[kSlotCount][kIdentityCount];
  float expressionCoef[kSlotCount][kExpressionCount];
  uint64_t trackState[kSlotCount][80];  // reserved
  int32_t trackFlag[kSlotCount];        // 0: new face; otherwise tracked
  uint32_t faceNum;                     // faces in the last frame
  float focalLength;                    // pixels; 0: assumed from the image's size
  uint32_t refitLimit;                  // repeats of a failed rigid fit; 0: without a limit
  int32_t previousSlot[kSlotCount];     // slot each face had in the frame before; -1: new
  int32_t fitGivenUp[kSlotCount];       // rigid mode: 1 if the face's fit was given up
};

inline TrackingContext* ContextOf(void* core) { return static_cast<TrackingContext*>(core); }

inline bool HasModel(const TrackingContext& context) {
  return context.meanShape != nullptr && context.identityBasis != nullptr &&
         context.expressionBasis != nullptr && context.tensor != nullptr;
}

}  // namespace n3ds
