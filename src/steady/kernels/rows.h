// SPDX-License-Identifier: MIT
// The linearised measurements: how each moves with the state, whitened, and their products.
#pragma once

#include <cmath>

#include "steady/kernels/residuals.h"

namespace n3ds::steady::N3DS_KERNEL_SET {

// Columns of turn and place: with q = R (x - c) and pixels f q / q.z.
inline void PoseColumns(const Face& face, float depth, Workspace* work) {
  const F32x8 at_x = Broadcast(face.mean.place[0] * depth);
  const F32x8 at_y = Broadcast(face.mean.place[1] * depth);
  const F32x8 away = Broadcast(depth);
  for (int i = 0; i < kLandmarkStride; i += kLanes) {
    const F32x8 scale = Load(&work->scale[i]);
    const F32x8 x = Load(&work->slope_x[i]);
    const F32x8 y = Load(&work->slope_y[i]);
    const F32x8 a = Load(&work->turned[0][i]);
    const F32x8 b = Load(&work->turned[1][i]);
    const F32x8 c = Load(&work->turned[2][i]);
    const F32x8 minus = Zero() - scale;
    Store(&work->column_u[0][i], minus * x * b);
    Store(&work->column_u[1][i], scale * (c + x * a));
    Store(&work->column_u[2][i], minus * b);
    Store(&work->column_v[0][i], minus * (c + y * b));
    Store(&work->column_v[1][i], scale * y * a);
    Store(&work->column_v[2][i], scale * a);
    Store(&work->column_u[3][i], scale * away);
    Store(&work->column_v[3][i], Zero());
    Store(&work->column_u[4][i], Zero());
    Store(&work->column_v[4][i], scale * away);
    Store(&work->column_u[5][i], scale * (at_x - x * away));
    Store(&work->column_v[5][i], scale * (at_y - y * away));
  }
}

inline void ShapeColumns(const Face& face, Workspace* work) {
  for (int i = 0; i < kLandmarkStride; i += kLanes) {
    const F32x8 scale = Load(&work->scale[i]);
    F32x8 u[3];
    F32x8 v[3];
    for (int axis = 0; axis < 3; axis++) {
      u[axis] = scale * Load(&work->ray_u[axis][i]);
      v[axis] = scale * Load(&work->ray_v[axis][i]);
    }
    const auto column = [&](const float(*vector)[kLandmarkStride], int to) {
      const F32x8 x = Load(&vector[0][i]);
      const F32x8 y = Load(&vector[1][i]);
      const F32x8 z = Load(&vector[2][i]);
      Store(&work->column_u[to][i], u[0] * x + u[1] * y + u[2] * z);
      Store(&work->column_v[to][i], v[0] * x + v[1] * y + v[2] * z);
    };
    for (int k = 0; k < kIdentityCount; k++) column(work->identity[k], kIdentityAt + k);
    for (int j = 0; j < kExpressionCount; j++) column(face.personal[j], kExpressionAt + j);
  }
}

inline void WhitenColumns(const Observation& seen, Workspace* work) {
  const int end = MeasurementEnd(seen);
  const auto whiten = [&](const float* u, const float* v, int i, float* column) {
    const F32x8 along_u = Load(u);
    Store(column + i, Load(&work->white_u[i]) * along_u);
    Store(column + end + i, Load(&work->white_uv[i]) * along_u + Load(&work->white_v[i]) * Load(v));
  };
  for (int c = 0; c < kMeasuredSize; c++) {
    for (int i = 0; i < kLandmarkStride; i += kLanes) {
      whiten(&work->column_u[c][i], &work->column_v[c][i], i, work->white_column[c]);
    }
    if (!seen.has_middles) continue;
    alignas(32) float u[kMeasurementStride - kLandmarkStride] = {};
    alignas(32) float v[kMeasurementStride - kLandmarkStride] = {};
    for (int i = 0; i < kMiddleCount; i++) {
      const int a = kMiddles[i].a;
      const int b = kMiddles[i].b;
      u[i] = 0.5f * (work->column_u[c][a] + work->column_u[c][b]);
      v[i] = 0.5f * (work->column_v[c][a] + work->column_v[c][b]);
    }
    for (int i = kLandmarkStride; i < kMeasurementStride; i += kLanes) {
      whiten(u + i - kLandmarkStride, v + i - kLandmarkStride, i, work->white_column[c]);
    }
  }
  for (int i = 0; i < end; i += kLanes) {
    whiten(&work->residual_u[i], &work->residual_v[i], i, work->white_column[kResidualColumn]);
  }
}

// product[i][j] for two columns i and four columns j: each is one sum over the measurements in
// eight parts.
inline void MultiplyColumns(const Workspace& work, int length, int i, int j, float* sums) {
  F32x8 sum[8];
  for (F32x8& s : sum) s = Zero();
  const float* first = work.white_column[i];
  const float* second = work.white_column[i + 1];
  for (int m = 0; m < length; m += kLanes) {
    const F32x8 a = Load(first + m);
    const F32x8 b = Load(second + m);
    for (int k = 0; k < 4; k++) {
      const F32x8 c = Load(&work.white_column[j + k][m]);
      sum[k] = sum[k] + a * c;
      sum[4 + k] = sum[4 + k] + b * c;
    }
  }
  SumFour(sum, sums);
  SumFour(sum + 4, sums + 4);
}

inline void MultiplyRows(const Observation& seen, Workspace* work) {
  const int length = 2 * MeasurementEnd(seen);
  for (int i = 0; i < kColumnCount; i += 2) {
    for (int j = 0; j <= i; j += 4) {
      float sums[8];
      MultiplyColumns(*work, length, i, j, sums);
      for (int k = 0; k < 4; k++) {
        work->product[i][j + k] = sums[k];
        work->product[i + 1][j + k] = sums[4 + k];
      }
    }
  }
  for (int i = 0; i < kMeasuredSize; i++) {
    for (int j = i + 1; j < kMeasuredSize; j++) work->product[i][j] = work->product[j][i];
    // Pads the row with zeros again: products with the residual have no business there.
    for (int j = kMeasuredSize; j < kMeasuredStride; j++) work->product[i][j] = 0;
  }
}

// From the residuals to J'J and the gradient J'r.
inline void LinearRows(const Observation& seen, const Face& face, Workspace* work) {
  PoseColumns(face, static_cast<float>(std::exp(static_cast<double>(face.mean.place[2]))), work);
  ShapeColumns(face, work);
  WhitenColumns(seen, work);
  MultiplyRows(seen, work);
  for (int i = 0; i < kMeasuredStride; i++) {
    work->gradient[i] = i < kMeasuredSize ? work->product[kResidualColumn][i] : 0.0f;
  }
}

}  // namespace n3ds::steady::N3DS_KERNEL_SET
