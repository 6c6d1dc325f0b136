// SPDX-License-Identifier: MIT
// The rigid workers written down once more, each as one list of steps, to compare with. The steps
// that have tests of their own (fits, contour updates, weights, refits) are called, not repeated.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <vector>

#include "core/contour_correspondence.h"
#include "core/model_tables.h"
#include "core/output_matrices.h"
#include "core/pose_fitting.h"
#include "core/pose_weights.h"
#include "core/rigid_shape_refinement.h"
#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/face_scene.h"

namespace n3ds::testing {

// Smoothed pose; `width` is the outline's.
inline std::vector<float> ReferencePoseSmoothing(const float* before,
                                                 const std::vector<float>& fitted,
                                                 const std::vector<int32_t>& now,
                                                 const std::vector<int32_t>& previous,
                                                 float width) {
  const auto moves = [&](const std::vector<int>& points) {
    float x = 0, y = 0;
    for (const int k : points) {
      const auto i = static_cast<size_t>(2 * k);
      x += static_cast<float>(now[i] - previous[i]);
      y += static_cast<float>(now[i + 1] - previous[i + 1]);
    }
    return std::fabs(x) + std::fabs(y);
  };
  std::vector<int> lower;
  for (int k = 3; k <= 15; k++) lower.push_back(k);
  for (int k = 75; k <= 94; k++) lower.push_back(k);
  const float eyes = moves({39, 45, 51, 57});
  const float g = moves(lower) * 800 / (width * 33);
  float f = 1;
  if (std::fabs(static_cast<double>(g)) > 1e-6 && g < 2.0f) {
    const float h = eyes * 800 / (width * 4) / g;
    if (h > 10) {
      f = 2;
    } else if (h > 2) {
      f = 0.75f + 0.125f * h;
    }
  }
  const float turn = std::fabs(fitted[0] - before[0]) + std::fabs(fitted[1] - before[1]) +
                     std::fabs(fitted[2] - before[2]) + std::fabs(fitted[3] - before[3]);
  const float d = 100 * turn + std::fabs(fitted[4] - before[4]) + std::fabs(fitted[5] - before[5]) +
                  std::fabs(fitted[6] - before[6]);
  float a = 0.2f;
  if (d < 12) a = static_cast<float>(0.8 - 0.05 * static_cast<double>(d));
  const float b = f * a;
  float old_t = b, new_t = 1 - b, e;
  if (static_cast<double>(b) > 0.8) {
    old_t = 0.8f;
    new_t = 0.19999999f;
    e = 0.96f;
  } else {
    e = static_cast<float>(1.2 * static_cast<double>(b));
  }
  float old_q = e, new_q = 1 - e;
  if (static_cast<double>(e) > 0.95) {
    old_q = 0.95f;
    new_q = 0.050000012f;
  }
  std::vector<float> pose;
  for (size_t i = 0; i < 7; i++) {
    pose.push_back(i < 4 ? old_q * before[i] + new_q * fitted[i]
                         : old_t * before[i] + new_t * fitted[i]);
  }
  return pose;
}

// One face on its way through the rigid workers.
class ReferenceRigidFace {
 public:
  // What the face keeps from frame to frame.
  std::vector<float> pose = std::vector<float>(7, 0.0f);
  std::vector<float> pose_ref = std::vector<float>(7, 0.0f);
  std::vector<float> identity = std::vector<float>(16, 0.0f);
  std::vector<float> expression = std::vector<float>(20, 0.0f);
  std::vector<float> shape = std::vector<float>(5436, 0.0f);
  std::vector<int32_t> contour = std::vector<int32_t>(19, 0);
  int32_t flag = 0;
  // What belongs to the place in the frame.
  std::vector<float> model_view = std::vector<float>(16, 0.0f);
  std::vector<float> projection = std::vector<float>(16, 0.0f);

  // What happened, for tests that must see something happen.
  struct Events {
    int retries = 0;
    int identity_refits = 0;
    int taken_unsmoothed = 0;
  };

  // `points` are smoothed in place; `previous` are those of the frame before as they arrived.
  void RunFull(const TrackingContext& model, const float* camera, float scale,
               const std::vector<int32_t>& previous, std::vector<int32_t>* points, Events* events) {
    std::vector<int32_t>& now = *points;
    PoseWeights weights;
    ComputePoseWeights(now.data(), &weights);
    float w3 = weights.inner;
    if (static_cast<double>(w3) < 0.1) w3 = 0.1f;
    if (w3 > 10.0f) w3 = 10.0f;
    Begin();
    if (flag == 0) {
      FitNew(camera, now, weights.contour, weights.range, w3, events);
      identity.assign(16, 0.0f);
      expression.assign(20, 0.0f);
      flag = 1;
      End(camera);
      return;
    }

    const float dx = static_cast<float>(now[0] - now[36]);
    const float dy = static_cast<float>(now[1] - now[37]);
    const float width = std::sqrt(dx * dx + dy * dy);
    float sx = 0, sy = 0;
    for (const size_t k : {45, 51, 63, 64, 68, 69, 73, 74}) {
      sx += static_cast<float>(now[2 * k] - previous[2 * k]);
      sy += static_cast<float>(now[2 * k + 1] - previous[2 * k + 1]);
    }
    const float m = (std::fabs(sx) + std::fabs(sy)) * 100 / width;
    if (m > 100) {
      events->taken_unsmoothed++;
    } else {
      float a = 0.1f, b = 0.9f;
      if (m < 24) {
        a = static_cast<float>(0.7 - 0.025 * static_cast<double>(m));
        b = 1 - a;
      }
      for (size_t i = 0; i < 190; i++) {
        const float kept = a * static_cast<float>(previous[i]);
        const float taken = b * static_cast<float>(now[i]);
        now[i] = static_cast<int32_t>(kept + taken);
      }
    }

    const std::vector<float> before = pose;
    FitTracked(camera, now, {1, weights.contour, weights.range, w3},
               {0, weights.contour, weights.range, w3}, events);
    pose = ReferencePoseSmoothing(before.data(), pose, now, previous, width);
    QuatToRotationMatrix(pose.data(), rotation_);
    std::copy_n(&pose[4], 3, translation_);

    const RefitView view = {now.data(),   model.meanShape, camera, rotation_,
                            translation_, table_,          scale};
    if (weights.mouth_open == 0 && weights.frontal == 1 && weights.weighting_switch == 1) {
      events->identity_refits++;
      RefitIdentityRigid(nullptr, view, model.identityBasis, identity.data());
    }
    RefitExpressionRigid(nullptr, view, model.expressionBasis, expression.data());
    flag++;
    End(camera);
  }

  void RunFast(const float* camera, const std::vector<int32_t>& points, Events* events) {
    PoseWeights weights;
    ComputePoseWeights(points.data(), &weights);
    Begin();
    if (flag == 0) {
      FitNew(camera, points, weights.contour, weights.range, 1.0f, events);
      flag = 1;
    } else {
      const FitWeights plain = {0, weights.contour, weights.range, 1.0f};
      FitTracked(camera, points, plain, plain, events);
    }
    End(camera);
  }

 private:
  void Begin() {
    std::fill_n(table_, 19, 0);
    std::copy_n(kInnerLandmarkVertexIndices, 76, table_ + 19);
  }
  bool Fit(const float* camera, const std::vector<int32_t>& points, const int32_t* outline,
           const FitWeights& weights) {
    return FitRigidPose(nullptr, points.data(), mean_.data(), camera, rotation_, translation_,
                        pose.data(), outline, table_, weights) == N3DS_OK;
  }
  void Update(const float* camera, const std::vector<int32_t>& points) {
    UpdateContourCorrespondence(nullptr, points.data(), mean_.data(), camera, rotation_,
                                translation_, contour.data());
  }
  static void Shift(std::vector<int32_t>* points) {
    for (size_t i = 0; i < 190; i++) (*points)[i]++;
  }

  void FitTracked(const float* camera, const std::vector<int32_t>& points, const FitWeights& first,
                  const FitWeights& again, Events* events) {
    if (Fit(camera, points, contour.data(), first)) {
      Update(camera, points);
      return;
    }
    std::vector<int32_t> shifted = points;
    while (true) {
      events->retries++;
      Shift(&shifted);
      if (!Fit(camera, shifted, contour.data(), again)) continue;
      Update(camera, shifted);
      return;
    }
  }

  void FitNew(const float* camera, const std::vector<int32_t>& points, float w1, float w2, float w3,
              Events* events) {
    const FitWeights weights = {0, w1, w2, w3};
    pose = {-0.265f, 0.958f, -0.001f, -0.049f, 0.0f, 0.0f, 800.0f};
    contour.assign(kDefaultContourVertexIndices, kDefaultContourVertexIndices + 19);
    std::vector<int32_t> tried = points;
    bool fitted = Fit(camera, tried, kDefaultContourVertexIndices, weights);
    while (true) {
      for (int round = 0; round < 3; round++) {
        if (fitted) Update(camera, tried);
        fitted = Fit(camera, tried, contour.data(), weights);
      }
      if (fitted) break;
      events->retries++;
      Shift(&tried);
    }
    Update(camera, points);
  }

  void End(const float* camera) {
    shape = mean_;
    pose_ref = pose;
    float tilted[9];
    for (size_t row = 0; row < 9; row += 3) {
      const float e2 = rotation_[row + 1], e3 = rotation_[row + 2];
      tilted[row] = rotation_[row];
      tilted[row + 1] = 0.9397f * e2 - 0.342f * e3;
      tilted[row + 2] = 0.342f * e2 + 0.9397f * e3;
    }
    SolveForModelViewMatrix(tilted, translation_, model_view.data());
    SolveForProjectionMatrix(camera, 2 * static_cast<int32_t>(camera[2]),
                             2 * static_cast<int32_t>(camera[5]), 1.0f, 5000.0f, projection.data());
  }

  std::vector<float> mean_ = MeanShapeFloats();
  int32_t table_[95] = {};
  float rotation_[9] = {};
  float translation_[3] = {};
};

}  // namespace n3ds::testing
