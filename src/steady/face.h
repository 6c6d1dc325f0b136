// SPDX-License-Identifier: MIT
// What the steady tracker knows of one face, and of one frame.
#pragma once

#include <cstdint>

#include "steady/layout.h"
#include "steady/rotation.h"
#include "steady/tuning.h"

namespace n3ds::steady {

// The state's mean. The camera frame is that of the upright image: x right, y down, z forward.
struct StateMean {
  Rotation rotation;  // model frame to camera frame
  float place[3];     // of the model's centre: x / z, y / z, log z, z in mm
  float identity[kIdentityCount];
  float expression[kExpressionCount];
  float speed[kMotionSize];         // of turn and place, per 1/30 s
  float acceleration[kMotionSize];  // per square of that
};

// Landmarks of a frame and its camera.
struct Observation {
  const float* u;  // pixels of the upright image, kMeasurementStride of each
  const float* v;
  const float* active;  // 1 for measurements that there are, 0 for others
  int count;            // of active measurements
  bool has_middles;     // the 165-point layout
  float focal;          // pixels
  float centre_u;
  float centre_v;
};

struct alignas(32) Face {
  float covariance[kStateSize + 2][kStateStride];
  // Deviation of each landmark from the fitted model, mm, model frame, and its covariance: xx, xy,
  // xz, yy, yz, zz.
  float offset[3][kLandmarkStride];
  float offset_covariance[6][kLandmarkStride];
  // Expression vectors of this person, and the identity they were made for. Those of the outline
  // belong to the place where it lay last.
  float personal[kExpressionCount][3][kLandmarkStride];
  float personal_identity[kIdentityCount];
  // The fitted landmarks, model frame, offsets included.
  float point[3][kLandmarkStride];

  StateMean mean;
  float noise;              // variance of the detector's landmarks, px^2
  float misfit_ratio;       // how much worse than its noise the face fits: a quantile, 1 is usual
  float usual_misfit;       // slow mean of that
  float identity_surprise;  // of the last step
  int bad_frames;           // in a row, in which it may be somebody else
  int age;                  // frames tracked

  // The landmarks as they arrived, for matching.
  float last_u[kLandmarkStride];
  float last_v[kLandmarkStride];
  double last_seen;  // s
  // The frame before's, how far each had moved then, and for how many frames it has not moved at all.
  float previous_u[kMeasurementStride];
  float previous_v[kMeasurementStride];
  float previous_motion[kMeasurementStride];
  int still_frames[kMeasurementStride];
  uint64_t id;
  bool valid;        // false: the state is of no use
  float confidence;  // 0 to 1
  float misfit;      // pixels, root mean square
};

// Jaw and mouth to one side: they have no preferred one and no limits.
inline bool IsSideways(int expression) { return expression == 2 || expression == 12; }
inline bool IsBlink(int expression) { return expression == 17 || expression == 19; }
// Squared distance of an identity from the mean person.
inline float SquaredIdentity(const StateMean& mean) {
  float sum = 0;
  for (const float value : mean.identity) sum += value * value;
  return sum;
}

inline float RestOf(int expression) { return IsSideways(expression) ? 0.0f : kExpressionRest; }

}  // namespace n3ds::steady
