// SPDX-License-Identifier: MIT
// The update of an extended Kalman filter in factored form. With C = U'U the predicted covariance,
// H = J'J the information of the landmarks and g the gradient,
//   M = 1 + U H U' = N'N,   W = N'^-1 U,   step = W'W g,   C = W'W.
// No inverse is formed, C is positive by construction, and as M is at least 1 single precision is
// enough. U goes over the 42 measured numbers; its rows are carried on over speed and acceleration,
// which follow along, and what is left of theirs is their own.
#pragma once

#include <cmath>
#include <cstring>

#include "steady/face.h"
#include "steady/kernels/lanes.h"
#include "steady/time_step.h"
#include "steady/workspace.h"

namespace n3ds::steady::N3DS_KERNEL_SET {

// Upper triangular factor of `rows` rows of a symmetric matrix, `pivots` of them; what the others
// have left stays in them. False when the matrix is not positive.
template <std::size_t kStride>
inline bool Factor(float (*a)[kStride], int pivots, int rows) {
  constexpr int kColumns = static_cast<int>(kStride);
  for (int k = 0; k < pivots; k++) {
    const float pivot = a[k][k];
    if (!(pivot > 0)) return false;
    const F32x8 scale = Broadcast(1.0f / std::sqrt(pivot));
    for (int j = k & ~(kLanes - 1); j < kColumns; j += kLanes) {
      Store(&a[k][j], Load(&a[k][j]) * scale);
    }
    for (int i = k + 1; i < rows; i++) {
      const F32x8 factor = Broadcast(a[k][i]);
      for (int j = i & ~(kLanes - 1); j < kColumns; j += kLanes) {
        Store(&a[i][j], Load(&a[i][j]) - factor * Load(&a[k][j]));
      }
    }
  }
  for (int k = 1; k < pivots; k++) std::memset(a[k], 0, static_cast<size_t>(k) * sizeof(float));
  return true;
}

inline bool FactorCovariance(Workspace* work) {
  if (!Factor<kStateStride>(work->factor, kMeasuredSize, kStateSize)) return false;
  std::memset(work->factor_transposed, 0, sizeof(work->factor_transposed));
  for (int i = 0; i < kMeasuredSize; i++) {
    for (int k = i; k < kMeasuredSize; k++) work->factor_transposed[k][i] = work->factor[i][k];
  }
  return true;
}

constexpr int kMeasuredGroups = kMeasuredStride / kLanes;
constexpr int kStateGroups = kStateStride / kLanes;

// rows[i] = sum over k >= i of left[i][k] right[k], from column group `first` on.
inline void MultiplyRow(const float* left, const float (*right)[kMeasuredStride], int from,
                        float* row) {
  F32x8 sum[kMeasuredGroups];
  for (F32x8& s : sum) s = Zero();
  for (int k = from; k < kMeasuredSize; k++) {
    const F32x8 factor = Broadcast(left[k]);
    for (int q = 0; q < kMeasuredGroups; q++) {
      sum[q] = sum[q] + factor * Load(&right[k][kLanes * q]);
    }
  }
  for (int q = 0; q < kMeasuredGroups; q++) Store(row + kLanes * q, sum[q]);
}

inline void MakeGain(Workspace* work) {
  for (int j = 0; j < kMeasuredSize; j++) {
    F32x8 sum[kStateGroups];
    for (int q = 0; q < kStateGroups; q++) sum[q] = Load(&work->factor[j][kLanes * q]);
    for (int k = 0; k < j; k++) {
      const F32x8 factor = Broadcast(work->inner[k][j]);
      for (int q = 0; q < kStateGroups; q++) {
        sum[q] = sum[q] - factor * Load(&work->gain[k][kLanes * q]);
      }
    }
    const F32x8 scale = Broadcast(1.0f / work->inner[j][j]);
    for (int q = 0; q < kStateGroups; q++) Store(&work->gain[j][kLanes * q], sum[q] * scale);
  }
}

// work->step from the factor, the products and the gradient; work->gain is W.
inline bool SolveStep(Workspace* work) {
  for (int i = 0; i < kMeasuredSize; i++) {
    MultiplyRow(work->factor[i], work->product, i, work->factor_product[i]);
  }
  for (int i = 0; i < kMeasuredSize; i++) {
    MultiplyRow(work->factor_product[i], work->factor_transposed, i, work->inner[i]);
    work->inner[i][i] += 1;
  }
  if (!Factor<kMeasuredStride>(work->inner, kMeasuredSize, kMeasuredSize)) return false;
  MakeGain(work);
  F32x8 step[kStateGroups];
  for (F32x8& s : step) s = Zero();
  for (int k = 0; k < kMeasuredSize; k++) {
    F32x8 parts[4] = {Zero(), Zero(), Zero(), Zero()};
    for (int q = 0; q < kMeasuredGroups; q++) {
      parts[0] = parts[0] + Load(&work->gain[k][kLanes * q]) * Load(work->gradient + kLanes * q);
    }
    float sums[4];
    SumFour(parts, sums);
    const F32x8 along = Broadcast(sums[0]);
    for (int q = 0; q < kStateGroups; q++) {
      step[q] = step[q] + along * Load(&work->gain[k][kLanes * q]);
    }
  }
  for (int q = 0; q < kStateGroups; q++) Store(work->step + kLanes * q, step[q]);
  return true;
}

// The covariance after the update.
inline void Posterior(const Workspace& work, Face* face) {
  for (int i = 0; i < kStateSize; i++) {
    F32x8 sum[kStateGroups];
    for (F32x8& s : sum) s = Zero();
    const int first = i / kLanes;
    for (int k = 0; k < kMeasuredSize; k++) {
      const F32x8 factor = Broadcast(work.gain[k][i]);
      for (int q = first; q < kStateGroups; q++) {
        sum[q] = sum[q] + factor * Load(&work.gain[k][kLanes * q]);
      }
    }
    for (int q = first; q < kStateGroups; q++) {
      const F32x8 own = i < kMeasuredSize ? Zero() : Load(&work.factor[i][kLanes * q]);
      Store(&face->covariance[i][kLanes * q], sum[q] + own);
    }
  }
  for (int i = 0; i < kStateSize; i++) {
    for (int j = i + 1; j < kStateSize; j++) face->covariance[j][i] = face->covariance[i][j];
    // No state number lies in the padding.
    for (int j = kStateSize; j < kStateStride; j++) face->covariance[i][j] = 0;
  }
}

// Moves the covariance over a time step, noise of speed and acceleration apart.
inline void PredictCovariance(const TimeStep& time, Face* face) {
  float(*c)[kStateStride] = face->covariance;
  const float s = time.place_by_speed;
  const float a = time.place_by_acceleration;
  const float b = time.speed_by_acceleration;
  const float kept = time.acceleration_kept;
  for (int i = 0; i < kMotionSize; i++) {
    for (int j = 0; j < kStateStride; j += kLanes) {
      const F32x8 place = Load(&c[i][j]);
      const F32x8 speed = Load(&c[kSpeedAt + i][j]);
      const F32x8 acceleration = Load(&c[kAccelerationAt + i][j]);
      Store(&c[i][j], place + Broadcast(s) * speed + Broadcast(a) * acceleration);
      Store(&c[kSpeedAt + i][j], speed + Broadcast(b) * acceleration);
      Store(&c[kAccelerationAt + i][j], Broadcast(kept) * acceleration);
    }
  }
  for (int i = kExpressionAt; i < kMeasuredSize; i++) {
    for (int j = 0; j < kStateStride; j += kLanes) {
      Store(&c[i][j], Broadcast(time.expression_kept) * Load(&c[i][j]));
    }
  }
  for (int r = 0; r < kStateSize; r++) {
    float* row = c[r];
    for (int i = 0; i < kMotionSize; i++) {
      row[i] += s * row[kSpeedAt + i] + a * row[kAccelerationAt + i];
      row[kSpeedAt + i] += b * row[kAccelerationAt + i];
      row[kAccelerationAt + i] *= kept;
    }
    for (int i = kExpressionAt; i < kMeasuredSize; i++) row[i] *= time.expression_kept;
  }
}

}  // namespace n3ds::steady::N3DS_KERNEL_SET
