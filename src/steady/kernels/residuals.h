// SPDX-License-Identifier: MIT
// How far the landmarks lie from where the state puts them, in units of what each may be off by.
#pragma once

#include <cmath>

#include "core/output_matrices.h"
#include "steady/kernels/lanes.h"
#include "steady/measurements.h"
#include "steady/model.h"
#include "steady/quantile.h"
#include "steady/workspace.h"

namespace n3ds::steady::N3DS_KERNEL_SET {

// Camera depths below this, mm, are none: a point there has no place in the image.
constexpr float kLeastDepth = 1.0f;

inline void ProjectLandmarks(const Model& model, const Observation& seen, const Face& face,
                             float depth, Workspace* work) {
  const float* r = face.mean.rotation.m;
  const F32x8 at_x = Broadcast(face.mean.place[0] * depth);
  const F32x8 at_y = Broadcast(face.mean.place[1] * depth);
  const F32x8 focal = Broadcast(seen.focal);
  for (int i = 0; i < kLandmarkStride; i += kLanes) {
    const F32x8 x = Load(&face.point[0][i]) - Broadcast(model.centre[0]);
    const F32x8 y = Load(&face.point[1][i]) - Broadcast(model.centre[1]);
    const F32x8 z = Load(&face.point[2][i]) - Broadcast(model.centre[2]);
    const F32x8 turned_x = Broadcast(r[0]) * x + Broadcast(r[1]) * y + Broadcast(r[2]) * z;
    const F32x8 turned_y = Broadcast(r[3]) * x + Broadcast(r[4]) * y + Broadcast(r[5]) * z;
    const F32x8 turned_z = Broadcast(r[6]) * x + Broadcast(r[7]) * y + Broadcast(r[8]) * z;
    const F32x8 near =
        Broadcast(1.0f) / Greater(turned_z + Broadcast(depth), Broadcast(kLeastDepth));
    const F32x8 slope_x = (turned_x + at_x) * near;
    const F32x8 slope_y = (turned_y + at_y) * near;
    Store(&work->turned[0][i], turned_x);
    Store(&work->turned[1][i], turned_y);
    Store(&work->turned[2][i], turned_z);
    Store(&work->slope_x[i], slope_x);
    Store(&work->slope_y[i], slope_y);
    Store(&work->scale[i], focal * near);
    Store(&work->u[i], focal * slope_x + Broadcast(seen.centre_u));
    Store(&work->v[i], focal * slope_y + Broadcast(seen.centre_v));
    for (int axis = 0; axis < 3; axis++) {
      Store(&work->ray_u[axis][i], Broadcast(r[axis]) - slope_x * Broadcast(r[6 + axis]));
      Store(&work->ray_v[axis][i], Broadcast(r[3 + axis]) - slope_y * Broadcast(r[6 + axis]));
    }
  }
}

// The offsets' uncertainty as it is seen in the image, to the landmarks' own measurements.
inline void ProjectOffsetNoise(const Face& face, Workspace* work) {
  for (int i = 0; i < kLandmarkStride; i += kLanes) {
    const F32x8 xx = Load(&face.offset_covariance[0][i]);
    const F32x8 xy = Load(&face.offset_covariance[1][i]);
    const F32x8 xz = Load(&face.offset_covariance[2][i]);
    const F32x8 yy = Load(&face.offset_covariance[3][i]);
    const F32x8 yz = Load(&face.offset_covariance[4][i]);
    const F32x8 zz = Load(&face.offset_covariance[5][i]);
    const F32x8 ux = Load(&work->ray_u[0][i]);
    const F32x8 uy = Load(&work->ray_u[1][i]);
    const F32x8 uz = Load(&work->ray_u[2][i]);
    const F32x8 vx = Load(&work->ray_v[0][i]);
    const F32x8 vy = Load(&work->ray_v[1][i]);
    const F32x8 vz = Load(&work->ray_v[2][i]);
    const F32x8 ax = xx * ux + xy * uy + xz * uz;
    const F32x8 ay = xy * ux + yy * uy + yz * uz;
    const F32x8 az = xz * ux + yz * uy + zz * uz;
    const F32x8 bx = xx * vx + xy * vy + xz * vz;
    const F32x8 by = xy * vx + yy * vy + yz * vz;
    const F32x8 bz = xz * vx + yz * vy + zz * vz;
    const F32x8 scale = Load(&work->scale[i]);
    const F32x8 square = scale * scale;
    Store(&work->noise_uu[i], square * (ux * ax + uy * ay + uz * az));
    Store(&work->noise_uv[i], square * (vx * ax + vy * ay + vz * az));
    Store(&work->noise_vv[i], square * (vx * bx + vy * by + vz * bz));
  }
}

struct OutlineNoise {
  float across;  // variances, px^2
  float along;
};

// An outline measurement may slide along the outline, whose direction is that of its neighbours.
inline void SetOutlineNoise(const OutlineNoise& noise, int from, int to, int measurement,
                            Workspace* work) {
  const float du = work->u[to] - work->u[from];
  const float dv = work->v[to] - work->v[from];
  const float square = du * du + dv * dv + 1e-12f;
  const float uu = du * du / square;
  const float uv = du * dv / square;
  const float vv = dv * dv / square;
  work->noise_uu[measurement] = noise.across * vv + noise.along * uu;
  work->noise_uv[measurement] = (noise.along - noise.across) * uv;
  work->noise_vv[measurement] = noise.across * uu + noise.along * vv;
}

inline void SetNoise(const Face& face, const Observation& seen, float pixels_per_mm,
                     Workspace* work) {
  ProjectOffsetNoise(face, work);
  const float* r = face.mean.rotation.m;
  const float turned = std::fabs(r[1] * kTiltSine + r[2] * kTiltCosine);
  const float beyond = turned > kOutlineTurnedFrom ? turned - kOutlineTurnedFrom : 0.0f;
  const float across = pixels_per_mm * (kOutlineNormal + kOutlineTurned * beyond);
  const float along = pixels_per_mm * kOutlineAlong;
  const OutlineNoise outline = {across * across, along * along};
  constexpr int kLast = kOutlineLandmarkCount - 1;
  for (int i = 0; i <= kLast; i++) {
    SetOutlineNoise(outline, i > 0 ? i - 1 : 0, i < kLast ? i + 1 : kLast, i, work);
  }
  const float model = pixels_per_mm * pixels_per_mm * kModelNoise * kModelNoise;
  if (seen.has_middles) {
    for (int i = 0; i < kMiddleCount; i++) {
      const int a = kMiddles[i].a;
      const int b = kMiddles[i].b;
      const int to = kLandmarkStride + i;
      if (b < kOutlineLandmarkCount) {
        SetOutlineNoise(outline, a > 0 ? a - 1 : 0, b < kLast ? b + 1 : kLast, to, work);
      } else {
        work->noise_uu[to] = 0.25f * (work->noise_uu[a] + work->noise_uu[b]) + model;
        work->noise_uv[to] = 0.25f * (work->noise_uv[a] + work->noise_uv[b]);
        work->noise_vv[to] = 0.25f * (work->noise_vv[a] + work->noise_vv[b]) + model;
      }
    }
  }
  for (int i = kOutlineLandmarkCount; i < kLandmarkStride; i++) {
    work->noise_uu[i] += model;
    work->noise_vv[i] += model;
  }
}

inline int MeasurementEnd(const Observation& seen) {
  return seen.has_middles ? kMeasurementStride : kLandmarkStride;
}

inline void SetResiduals(const Observation& seen, Workspace* work) {
  for (int i = 0; i < kLandmarkStride; i += kLanes) {
    const F32x8 active = Load(seen.active + i);
    Store(&work->residual_u[i], active * (Load(seen.u + i) - Load(&work->u[i])));
    Store(&work->residual_v[i], active * (Load(seen.v + i) - Load(&work->v[i])));
  }
  if (!seen.has_middles) return;
  for (int i = 0; i < kMiddleCount; i++) {
    const int a = kMiddles[i].a;
    const int b = kMiddles[i].b;
    const int to = kLandmarkStride + i;
    work->residual_u[to] = seen.u[to] - 0.5f * (work->u[a] + work->u[b]);
    work->residual_v[to] = seen.v[to] - 0.5f * (work->v[a] + work->v[b]);
  }
  for (int i = kLandmarkStride + kMiddleCount; i < kMeasurementStride; i++) {
    work->residual_u[i] = 0;
    work->residual_v[i] = 0;
    work->noise_uu[i] = 0;
    work->noise_uv[i] = 0;
    work->noise_vv[i] = 0;
  }
}

// The inverse of the noise's lower Cholesky factor, and the squared residuals in units of it.
inline void Whiten(const Observation& seen, float base, Workspace* work) {
  const F32x8 one = Broadcast(1.0f);
  for (int i = 0; i < MeasurementEnd(seen); i += kLanes) {
    const F32x8 uu = Load(&work->noise_uu[i]) + Broadcast(base);
    const F32x8 uv = Load(&work->noise_uv[i]);
    const F32x8 vv = Load(&work->noise_vv[i]) + Broadcast(base);
    const F32x8 factor_u = Root(uu);
    const F32x8 factor_uv = uv / factor_u;
    const F32x8 factor_v = Root(Greater(vv - factor_uv * factor_uv, Broadcast(1e-6f)));
    const F32x8 u = Load(&work->residual_u[i]) / factor_u;
    const F32x8 v = (Load(&work->residual_v[i]) - factor_uv * u) / factor_v;
    Store(&work->square[i], Lesser(u * u + v * v, Broadcast(1e30f)));
    Store(&work->white_u[i], one / factor_u);
    Store(&work->white_v[i], one / factor_v);
    Store(&work->white_uv[i], Zero() - factor_uv / (factor_u * factor_v));
  }
}

// The part of the face's own misfit that a quantile tells, by which the weights are relative: a head
// that really moves fast is off everywhere, and then no point is an outlier.
inline float MisfitRatio(const Observation& seen, const Workspace& work) {
  float squares[kMeasurementStride];
  int count = 0;
  for (int i = 0; i < MeasurementEnd(seen); i++) {
    if (seen.active[i] > 0) squares[count++] = work.square[i];
  }
  const auto rank = static_cast<int>(kQuantile * static_cast<float>(count));
  return SelectSmallest(squares, count, rank) / kQuantileOfTwo;
}

// Puts the robust weights into the whitening.
inline void Weigh(const Observation& seen, float pixels_per_mm, float base, float misfit,
                  Workspace* work) {
  const float scale = misfit > 1.0f ? misfit : 1.0f;
  const float gate = kGate * kGate * pixels_per_mm * pixels_per_mm * scale + kGateNoise * base;
  const F32x8 one = Broadcast(1.0f);
  for (int i = 0; i < MeasurementEnd(seen); i += kLanes) {
    const F32x8 student =
        Broadcast(kFreedom + 2) / (Broadcast(kFreedom) + Load(&work->square[i]) / Broadcast(scale));
    const F32x8 u = Load(&work->residual_u[i]);
    const F32x8 v = Load(&work->residual_v[i]);
    const F32x8 off = (u * u + v * v) / Broadcast(gate);
    Store(&work->weight[i], Lesser(student, Broadcast(kHighestWeight)) / (one + off * off));
  }
}

// Projects the face's points and compares them with the landmarks: all of `work` from the turned
// points to the weights. Without `robust` all weights are 1.
inline void Residuals(const Model& model, const Observation& seen, float noise, float inflation,
                      bool robust, Face* face, Workspace* work) {
  const auto depth = static_cast<float>(std::exp(static_cast<double>(face->mean.place[2])));
  const float pixels_per_mm = seen.focal / depth;
  const float base = inflation * (noise + kRounding);
  ProjectLandmarks(model, seen, *face, depth, work);
  SetNoise(*face, seen, pixels_per_mm, work);
  SetResiduals(seen, work);
  Whiten(seen, base, work);
  face->misfit_ratio = MisfitRatio(seen, *work);
  if (robust) {
    Weigh(seen, pixels_per_mm, base, face->misfit_ratio, work);
  } else {
    for (float& weight : work->weight) weight = 1;
  }
  for (int i = 0; i < MeasurementEnd(seen); i += kLanes) {
    const F32x8 root = Root(Load(&work->weight[i])) * Load(seen.active + i);
    Store(&work->white_u[i], Load(&work->white_u[i]) * root);
    Store(&work->white_uv[i], Load(&work->white_uv[i]) * root);
    Store(&work->white_v[i], Load(&work->white_v[i]) * root);
  }
}

}  // namespace n3ds::steady::N3DS_KERNEL_SET
