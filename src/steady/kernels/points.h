// SPDX-License-Identifier: MIT
// Where the state puts the face's landmarks, in the model frame, and how they move with identity
// and expression.
#pragma once

#include <cmath>
#include <cstring>

#include "core/output_matrices.h"
#include "steady/face.h"
#include "steady/kernels/lanes.h"
#include "steady/model.h"
#include "steady/workspace.h"

namespace n3ds::steady::N3DS_KERNEL_SET {

// The person's expression vectors: the model's, changed by the identity.
inline void MakePersonal(const Model& model, Face* face) {
  for (int j = 0; j < kExpressionCount; j++) {
    for (int axis = 0; axis < 3; axis++) {
      for (int i = 0; i < kLandmarkStride; i += kLanes) {
        F32x8 sum = Load(&model.expression[j][axis][i]);
        for (int k = 0; k < kIdentityCount; k++) {
          if ((k + j) % 2 != 0 && k != kIdentityCount - 1) continue;  // these do not interact
          sum = sum + Broadcast(face->mean.identity[k]) * Load(&model.interaction[k][j][axis][i]);
        }
        Store(&face->personal[j][axis][i], sum);
      }
    }
  }
  std::memcpy(face->personal_identity, face->mean.identity, sizeof(face->personal_identity));
}

// sums = mean + identity vectors + expression vectors, kStride coordinates.
template <std::size_t kStride>
inline void SumShape(const StateMean& state, const float* mean, const float (*identity)[3][kStride],
                     const float (*expression)[3][kStride], int axis, float* sums) {
  for (std::size_t i = 0; i < kStride; i += kLanes) {
    F32x8 sum = Load(mean + i);
    for (int k = 0; k < kIdentityCount; k++) {
      sum = sum + Broadcast(state.identity[k]) * Load(&identity[k][axis][i]);
    }
    for (int j = 0; j < kExpressionCount; j++) {
      sum = sum + Broadcast(state.expression[j]) * Load(&expression[j][axis][i]);
    }
    Store(sums + i, sum);
  }
}

// How far out each place of the outline's rows lies in the image, mm at the face's depth.
inline void OutwardPlaces(const Model& model, const Face& face, const Workspace& work,
                          float* outward) {
  const float* r = face.mean.rotation.m;
  // The upright head's axis in the image: outward directions turn with the roll alone.
  const float axis_u = r[1] * kTiltCosine - r[2] * kTiltSine;
  const float axis_v = r[4] * kTiltCosine - r[5] * kTiltSine;
  const float length = std::sqrt(axis_u * axis_u + axis_v * axis_v) + 1e-12f;
  const float up_u = axis_u / length;
  const float up_v = axis_v / length;
  const auto depth = static_cast<float>(std::exp(static_cast<double>(face.mean.place[2])));
  const float at[3] = {face.mean.place[0] * depth, face.mean.place[1] * depth, depth};
  float shift[3];
  for (int i = 0; i < 3; i++) {
    shift[i] = at[i] - (r[3 * i] * model.centre[0] + r[3 * i + 1] * model.centre[1] +
                        r[3 * i + 2] * model.centre[2]);
  }
  for (int i = 0; i < kPlaceStride; i += kLanes) {
    const F32x8 x = Load(&work.place[0][i]);
    const F32x8 y = Load(&work.place[1][i]);
    const F32x8 z = Load(&work.place[2][i]);
    const F32x8 camera_z =
        Broadcast(r[6]) * x + Broadcast(r[7]) * y + Broadcast(r[8]) * z + Broadcast(shift[2]);
    const F32x8 near = Broadcast(depth) / Greater(camera_z, Broadcast(1.0f));
    const F32x8 u =
        (Broadcast(r[0]) * x + Broadcast(r[1]) * y + Broadcast(r[2]) * z + Broadcast(shift[0])) *
        near;
    const F32x8 v =
        (Broadcast(r[3]) * x + Broadcast(r[4]) * y + Broadcast(r[5]) * z + Broadcast(shift[1])) *
        near;
    const F32x8 right = Load(&model.place_normal[0][i]);
    const F32x8 up = Load(&model.place_normal[1][i]);
    const F32x8 normal_u = up * Broadcast(up_u) - right * Broadcast(up_v);
    const F32x8 normal_v = right * Broadcast(up_u) + up * Broadcast(up_v);
    Store(outward + i, u * normal_u + v * normal_v);
  }
}

// Shares of a row's places: a soft maximum of how far out they lie.
inline void SoftMaximum(const float* outward, float* shares) {
  float farthest = outward[0];
  for (int s = 1; s < kRowPlaces; s++) {
    if (outward[s] > farthest) farthest = outward[s];
  }
  float sum = 0;
  for (int s = 0; s < kRowPlaces; s++) {
    const float behind = (outward[s] - farthest) / kOutlineSoftness;
    shares[s] =
        behind > -kOutlineReach ? static_cast<float>(std::exp(static_cast<double>(behind))) : 0.0f;
    sum += shares[s];
  }
  const float scale = 1.0f / sum;
  for (int s = 0; s < kRowPlaces; s++) shares[s] *= scale;
}

// Puts an outline landmark where its row lies farthest out; if asked for, with the identity and
// expression vectors of that place. The shares count as constants in the derivatives.
inline void PlaceOutline(const Model& model, int landmark, const float* shares, bool with_vectors,
                         Face* face, Workspace* work) {
  const int first = landmark * kRowPlaces;
  float point[3] = {};
  alignas(32) float vectors[kPlaceVectorStride] = {};
  for (int s = 0; s < kRowPlaces; s++) {
    if (!(shares[s] > 0)) continue;
    for (int axis = 0; axis < 3; axis++) point[axis] += shares[s] * work->place[axis][first + s];
    if (!with_vectors) continue;
    const F32x8 share = Broadcast(shares[s]);
    for (int i = 0; i < kPlaceVectorStride; i += kLanes) {
      Store(vectors + i, Load(vectors + i) + share * Load(&model.place_vectors[first + s][i]));
    }
  }
  for (int axis = 0; axis < 3; axis++) face->point[axis][landmark] = point[axis];
  if (!with_vectors) return;
  for (int axis = 0; axis < 3; axis++) {
    for (int k = 0; k < kIdentityCount; k++) {
      work->identity[k][axis][landmark] = vectors[3 * k + axis];
    }
    for (int j = 0; j < kExpressionCount; j++) {
      face->personal[j][axis][landmark] = vectors[kPlaceExpressionAt + 3 * j + axis];
    }
  }
}

// face->point, and with vectors also the outline's columns of work->identity and face->personal.
inline void FacePoints(const Model& model, bool with_vectors, Face* face, Workspace* work) {
  for (int axis = 0; axis < 3; axis++) {
    SumShape<kLandmarkStride>(face->mean, model.mean[axis], model.identity, face->personal, axis,
                              face->point[axis]);
    for (int i = 0; i < kLandmarkStride; i += kLanes) {
      Store(&face->point[axis][i], Load(&face->point[axis][i]) + Load(&face->offset[axis][i]));
    }
    SumShape<kPlaceStride>(face->mean, model.place_mean[axis], model.place_identity,
                           model.place_expression, axis, work->place[axis]);
  }
  alignas(32) float outward[kPlaceStride];
  OutwardPlaces(model, *face, *work, outward);
  for (int landmark = 0; landmark < kOutlineLandmarkCount; landmark++) {
    float shares[kRowPlaces];
    SoftMaximum(outward + landmark * kRowPlaces, shares);
    PlaceOutline(model, landmark, shares, with_vectors, face, work);
  }
}

}  // namespace n3ds::steady::N3DS_KERNEL_SET
