// SPDX-License-Identifier: MIT
// The residuals that the pose solver minimises: how far a head model's points, moved by a pose and
// projected by a pinhole camera, land from a face's landmarks in the image.
#pragma once

#include <cstddef>
#include <cstdint>

#include "math/pose.h"
#include "norvale_3d_sticker_core.h"
#include "platform/simd.h"

namespace n3ds {

// Beyond it the number of residuals, two per point, is no 32-bit integer.
constexpr int32_t kMaxPoints = INT32_MAX / 2;

// One fit's observations and weights; the arrays belong to the caller of the solver.
struct PoseProblem {
  const float* landmarks;     // x, y per point, pixels
  const float* model_points;  // X, Y, Z per point
  int32_t point_count;
  const float* camera;
  float contour_weight;     // weight of an outline landmark's distance across the midline
  float range_weight;       // weight of the parts that speech moves, the mouth and the chin
  int64_t weighting_mode;   // not 0: landmarks other than eye corners and nose count a tenth
  float inner_weight;       // balance between the two sides of the nose, 1 when alike
  int32_t parameter_count;  // columns of the Jacobian
};

// The residual function of one problem. What no pose changes is worked out once, on construction.
class PoseResiduals {
 public:
  explicit PoseResiduals(const PoseProblem& problem);

  // r: two residuals per point, projected minus observed, weighted. Returns N3DS_NUMERICAL when
  // a point has no depth; the points before it are then written, and none after it.
  MRESULT Evaluate(const float* pose, float* r) const;

  // The same with the Jacobian J of r, 2 point_count x parameter_count, row-major, and its
  // transpose Jt unless that is null. Columns beyond the seventh are weighted like the others, but
  // have no derivative of their own.
  MRESULT Linearise(const float* pose, float* r, float* J, float* Jt) const;

  // J^T J and the gradient g = J^T r of what Linearise gave.
  void FormNormalEquations(const float* r, const float* J, const float* Jt, float* JtJ,
                           float* g) const;

  // Elements of a Jacobian.
  size_t JacobianSize() const {
    return 2 * static_cast<size_t>(problem_.point_count) *
           static_cast<size_t>(problem_.parameter_count);
  }

 private:
  enum class Middle : uint8_t { kNone, kVertical, kHorizontal, kOblique };

  // The line through the middle of the face, from the chin to between the eyes: x = position when
  // vertical, y = position when horizontal, else y = slope x + offset.
  struct MiddleLine {
    Middle kind = Middle::kNone;
    float position = 0.0f;
    float slope = 0.0f;
    float offset = 0.0f;
    float normal = 0.0f;          // the line's normal direction is (1, normal)
    float normal_squared = 1.0f;  // its squared length
  };

  static MiddleLine FindMiddleLine(const PoseProblem& problem);
  // In a unit of the line's own; 0 for all points when there is no line.
  F32x4 DistanceFromMiddle(F32x4 x, F32x4 y) const;
  // Reduces pairs along u and v, residuals or derivatives, to their part across the line, in the
  // lanes of `across`.
  void ProjectAcross(Mask32x4 across, F32x4* along_u, F32x4* along_v) const;

  struct Points;
  struct Derivatives;
  struct View;
  Points Project(const View& view, int32_t first, int32_t count) const;
  static Derivatives Differentiate(const View& view, const Points& p);
  // The block's outline landmarks whose observation lies nearer the line than their projection.
  Mask32x4 AcrossOf(const Points& p, int32_t first) const;
  // Writes u0 v0 u1 v1 .. of `count` points.
  static void StorePairs(F32x4 u, F32x4 v, int32_t count, float* pairs);
  void StoreDerivatives(const Derivatives& d, int32_t first, int32_t count, float* J,
                        float* Jt) const;
  void StoreColumn(F32x4 along_u, F32x4 along_v, size_t k, int32_t first, int32_t count, float* J,
                   float* Jt) const;
  // `across` is null where no lane is set.
  void WeightOtherColumns(const Points& p, const Mask32x4* across, int32_t first, int32_t count,
                          float* J, float* Jt) const;
  template <bool kDerivatives>
  MRESULT EvaluatePoints(const float* pose, float* r, float* J, float* Jt) const;

  PoseProblem problem_;
  // Factors by landmark: for its place, and for its moving with speech. Filled up to whole blocks.
  static constexpr int32_t kFactorCount = 96;
  float group_factor_[kFactorCount];
  float speech_factor_[kFactorCount];
  float ordinary_factor_;  // of landmarks beyond these
  MiddleLine middle_;
};

}  // namespace n3ds
