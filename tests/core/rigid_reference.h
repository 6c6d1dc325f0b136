// SPDX-License-Identifier: MIT
// The rigid workers written down once more, each as one list of steps, to compare with. The steps
// that have tests of their own (fits, contour updates, weights, smoothing, refits) are called, not
// repeated.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <vector>

#include "core/contour_correspondence.h"
#include "core/landmark_motion.h"
#include "core/model_tables.h"
#include "core/output_matrices.h"
#include "core/pose_fitting.h"
#include "core/pose_weights.h"
#include "core/rigid_pose_smoothing.h"
#include "core/rigid_shape_refinement.h"
#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/face_scene.h"

namespace n3ds::testing {

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

    const float width = OutlineWidth(now.data());
    const float m = SteadyPointMotion(now.data(), previous.data(), width);
    if (m > 100) {
      events->taken_unsmoothed++;
    } else {
      BlendLandmarks(SmoothingWeights(m, 0.025, 24), previous.data(), now.data());
    }

    const std::vector<float> before = pose;
    FitTracked(camera, now, {1, weights.contour, weights.range, w3},
               {0, weights.contour, weights.range, w3}, events);
    SmoothPose(before.data(), MotionFactor(now.data(), previous.data(), width), pose.data());
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
