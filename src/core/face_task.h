// SPDX-License-Identifier: MIT
// What a worker thread gets to know about its face. All pointers refer to the face's own slot of
// the context, except where they are shared by all faces and only read.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

struct RigidFaceTask {
  MHandle memory;
  const float* meanShapeF;       // shared: mean shape in mm, 5436 floats
  int32_t* landmarks;            // the caller's record; its first 95 points are smoothed in place
  const int32_t* prevLandmarks;  // the face's landmarks of the last frame as they arrived
  const float* camera;           // shared
  float scale;                   // max(width, height) / 640
  N3DS_RIGID_MATRIX* result;     // receives model-view and projection
  float* pose;
  float* poseRef;
  float* identityCoef;
  float* expressionCoef;
  uint64_t* trackState;
  float* shape;
  float* contourState;
  int32_t* fitState;
  const int16_t* meanShape;  // shared, as the three below
  const int16_t* identityBasis;
  const int16_t* expressionBasis;
  const int16_t* tensor;
  int32_t* trackFlag;
};

struct MaskFaceTask {
  MHandle memory;
  const float* meanShapeF;
  int32_t* landmarks;
  const int32_t* prevLandmarks;
  const float* camera;
  float scale;
  N3DS_RIGID_MATRIX* result;
  float* maskPose;
  float* pose;
  float* poseRef;
  float* identityCoef;
  float* expressionCoef;
  float* shape;
  int32_t* fitState;
  const int16_t* meanShape;
  const int16_t* identityBasis;
  const int16_t* expressionBasis;
  const int16_t* tensor;
  int32_t* trackFlag;
};

}  // namespace n3ds
