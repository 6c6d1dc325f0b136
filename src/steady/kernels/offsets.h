// SPDX-License-Identifier: MIT
// What of a person's landmarks no identity and no expression of the model explains: a point of its
// own for each, learnt slowly.
#pragma once

#include "steady/face.h"
#include "steady/kernels/lanes.h"
#include "steady/model.h"
#include "steady/time_step.h"
#include "steady/workspace.h"

namespace n3ds::steady::N3DS_KERNEL_SET {

// Takes out of the offsets whatever the pose and the identity could do: they must never turn the
// head.
inline void RemoveGauge(const Model& model, float* offsets) {
  float shares[kGaugeStride];
  for (int i = 0; i < kGaugeStride; i += 4) {
    F32x8 sum[4] = {Zero(), Zero(), Zero(), Zero()};
    for (int q = 0; q < 3 * kLandmarkStride; q += kLanes) {
      const F32x8 offset = Load(offsets + q);
      for (int k = 0; k < 4; k++) sum[k] = sum[k] + Load(&model.gauge_dual[i + k][q]) * offset;
    }
    SumFour(sum, shares + i);
  }
  for (int q = 0; q < 3 * kLandmarkStride; q += kLanes) {
    F32x8 offset = Load(offsets + q);
    for (int i = 0; i < kGaugeCount; i++) {
      offset = offset - Broadcast(shares[i]) * Load(&model.gauge[i][q]);
    }
    Store(offsets + q, offset);
  }
}

// A Kalman step for each landmark by itself, on the residuals after the update of the face. `noise`
// is the variance of a landmark, px^2.
inline void UpdateOffsets(const Model& model, const TimeStep& time, float noise, Face* face,
                          Workspace* work) {
  alignas(32) float before[3][kLandmarkStride];
  const F32x8 one = Broadcast(1.0f);
  const F32x8 measured = Broadcast(noise);
  float(*d)[kLandmarkStride] = face->offset;
  float(*p)[kLandmarkStride] = face->offset_covariance;
  for (int axis = 0; axis < 3; axis++) {
    for (int i = 0; i < kLandmarkStride; i += kLanes) Store(&before[axis][i], Load(&d[axis][i]));
  }
  constexpr int kFirst = kOutlineLandmarkCount & ~(kLanes - 1);
  for (int i = kFirst; i < kLandmarkStride; i += kLanes) {
    const F32x8 on = Load(&model.has_offset[i]);
    const F32x8 scale = Load(&work->scale[i]) * on;
    const F32x8 ux = scale * Load(&work->ray_u[0][i]);
    const F32x8 uy = scale * Load(&work->ray_u[1][i]);
    const F32x8 uz = scale * Load(&work->ray_u[2][i]);
    const F32x8 vx = scale * Load(&work->ray_v[0][i]);
    const F32x8 vy = scale * Load(&work->ray_v[1][i]);
    const F32x8 vz = scale * Load(&work->ray_v[2][i]);
    const F32x8 xx = Load(&p[0][i]);
    const F32x8 xy = Load(&p[1][i]);
    const F32x8 xz = Load(&p[2][i]);
    const F32x8 yy = Load(&p[3][i]);
    const F32x8 yz = Load(&p[4][i]);
    const F32x8 zz = Load(&p[5][i]);
    const F32x8 ax = xx * ux + xy * uy + xz * uz;
    const F32x8 ay = xy * ux + yy * uy + yz * uz;
    const F32x8 az = xz * ux + yz * uy + zz * uz;
    const F32x8 bx = xx * vx + xy * vy + xz * vz;
    const F32x8 by = xy * vx + yy * vy + yz * vz;
    const F32x8 bz = xz * vx + yz * vy + zz * vz;
    const F32x8 suu = ux * ax + uy * ay + uz * az + measured;
    const F32x8 suv = ux * bx + uy * by + uz * bz;
    const F32x8 svv = vx * bx + vy * by + vz * bz + measured;
    const F32x8 inverse = one / (suu * svv - suv * suv);
    const F32x8 iuu = svv * inverse;
    const F32x8 iuv = Zero() - suv * inverse;
    const F32x8 ivv = suu * inverse;
    const F32x8 u = Load(&work->residual_u[i]) * on;
    const F32x8 v = Load(&work->residual_v[i]) * on;
    const F32x8 square = iuu * u * u + (iuv + iuv) * u * v + ivv * v * v;
    // An outlier, of this landmark alone or of the face, teaches less.
    const F32x8 student = Broadcast(kFreedom + 2) / (Broadcast(kFreedom) + square);
    const F32x8 weight = Load(&work->weight[i]);
    const F32x8 trust =
        IfGreater(weight, Broadcast(kOffsetTrusted), one, weight) * Lesser(student, one) * on;
    const F32x8 kx = ax * iuu + bx * iuv;
    const F32x8 ky = ay * iuu + by * iuv;
    const F32x8 kz = az * iuu + bz * iuv;
    const F32x8 lx = ax * iuv + bx * ivv;
    const F32x8 ly = ay * iuv + by * ivv;
    const F32x8 lz = az * iuv + bz * ivv;
    Store(&d[0][i], Load(&d[0][i]) + trust * (kx * u + lx * v));
    Store(&d[1][i], Load(&d[1][i]) + trust * (ky * u + ly * v));
    Store(&d[2][i], Load(&d[2][i]) + trust * (kz * u + lz * v));
    const F32x8 growth = Broadcast(kOffsetNoise) * on * Broadcast(time.length);
    Store(&p[0][i], xx - trust * (kx * ax + lx * bx) + growth);
    Store(&p[1][i], xy - trust * (kx * ay + lx * by));
    Store(&p[2][i], xz - trust * (kx * az + lx * bz));
    Store(&p[3][i], yy - trust * (ky * ay + ly * by) + growth);
    Store(&p[4][i], yz - trust * (ky * az + ly * bz));
    Store(&p[5][i], zz - trust * (kz * az + lz * bz) + growth);
  }
  RemoveGauge(model, &d[0][0]);
  for (int axis = 0; axis < 3; axis++) {
    for (int i = 0; i < kLandmarkStride; i += kLanes) {
      const F32x8 moved = Load(&d[axis][i]) - Load(&before[axis][i]);
      Store(&face->point[axis][i], Load(&face->point[axis][i]) + moved);
    }
  }
}

}  // namespace n3ds::steady::N3DS_KERNEL_SET
