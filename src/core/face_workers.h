// SPDX-License-Identifier: MIT
// The workers that fit one face of a frame each, on a thread of a task pool, and the records that
// tell them about the face. A worker takes its record and returns null.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Rounds of contour update and fit that a new face gets after its first fit, in every worker.
constexpr int kNewFaceRounds = 3;

// All pointers refer to the face's own slot of the context, except for the shared ones, which all
// faces read.
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
  uint32_t refitLimit;  // repeats of a failed fit before it is given up; 0: without a limit
  int32_t* fitGivenUp;  // receives 1 if it was, else 0
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

// Rigid mode with one to three faces: smooths landmarks and pose over time and refines the face's
// shape coefficients. Takes a RigidFaceTask.
void* _Build3DFaceForVideo_Rigid_Thread(void* task);

// Rigid mode with four and five faces: fits the pose alone. Takes a RigidFaceTask.
void* _Build3DFaceForVideo_Rigid_Thread_Acce(void* task);

// Mask mode: fits pose, identity and expression. Takes a MaskFaceTask.
void* _Build3DFaceForVideo_Mask_Thread(void* task);

}  // namespace n3ds
