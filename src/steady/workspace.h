// SPDX-License-Identifier: MIT
// Scratch of one face's update; nothing in it lives on, but for the identity vectors of the inner
// landmarks, which are the model's.
#pragma once

#include "steady/layout.h"

namespace n3ds::steady {

struct alignas(32) Workspace {
  // Points: outline places in the model frame, and identity vectors of all landmarks.
  float place[3][kPlaceStride];
  float identity[kIdentityCount][3][kLandmarkStride];

  // Landmarks under the state's pose: turned about the centre (mm), x / z and y / z, pixels per mm
  // at their depth, pixels.
  float turned[3][kLandmarkStride];
  float slope_x[kLandmarkStride];
  float slope_y[kLandmarkStride];
  float scale[kLandmarkStride];
  float u[kLandmarkStride];
  float v[kLandmarkStride];
  // Rows of the projection's derivative by a point of the model frame, without the scale.
  float ray_u[3][kLandmarkStride];
  float ray_v[3][kLandmarkStride];

  // Measurements: covariance of their noise, residuals, whitening [g1 0; g2 g3] with the square root
  // of the robust weight in it, whitened squared residual, robust weight.
  float noise_uu[kMeasurementStride];
  float noise_uv[kMeasurementStride];
  float noise_vv[kMeasurementStride];
  float residual_u[kMeasurementStride];
  float residual_v[kMeasurementStride];
  float white_u[kMeasurementStride];
  float white_uv[kMeasurementStride];
  float white_v[kMeasurementStride];
  float square[kMeasurementStride];
  float weight[kMeasurementStride];

  // Columns of the linearised measurements by landmark, and whitened by measurement (u, then v).
  float column_u[kColumnCount][kLandmarkStride];
  float column_v[kColumnCount][kLandmarkStride];
  float white_column[kColumnCount][2 * kMeasurementStride];
  // Their products; row kResidualColumn is the gradient.
  float product[kColumnCount][kMeasuredStride];

  // The update: U'U the predicted covariance; U H; M and its factor; W; gradient and step.
  float factor[kStateStride][kStateStride];
  float factor_transposed[kMeasuredSize][kMeasuredStride];
  float factor_product[kMeasuredSize][kMeasuredStride];
  float inner[kMeasuredSize][kMeasuredStride];
  float gain[kMeasuredSize][kStateStride];
  float gradient[kMeasuredStride];
  float step[kStateStride];
  float predicted[kStateStride][kStateStride];

  // Of the start of a new face.
  double normal[kMeasuredSize * kMeasuredSize];
  double last_normal[kMeasuredSize * kMeasuredSize];
};

}  // namespace n3ds::steady
