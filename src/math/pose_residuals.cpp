// SPDX-License-Identifier: MIT
#include "math/pose_residuals.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

#include "platform/integer_arithmetic.h"
#include "platform/scratch_array.h"
#include "platform/simd.h"

namespace n3ds {
namespace {

// Points no farther from the camera plane than this have no projection. The limit is the double
// 1e-6; as the float is the nearest one below it, floats compare with either alike.
constexpr float kZeroDepth = 1e-6f;
static_assert(static_cast<double>(kZeroDepth) < 1e-6);
// Weight of a landmark that is neither eye corner nor nose, when the weighting is on.
constexpr float kOrdinaryFactor = 0.1f;

// Landmarks that define the midline.
constexpr int32_t kChin = 9;
constexpr int32_t kInnerEyeCornerLeft = 45;
constexpr int32_t kInnerEyeCornerRight = 51;

// Landmarks are classed by their number in the arrays as passed; those beyond are ordinary.
constexpr int32_t kClassifiedLandmarks = 95;

enum LandmarkGroup : uint8_t { kOrdinary, kEyeCorner, kNoseLeft, kNoseRight };

struct LandmarkClass {
  LandmarkGroup group = kOrdinary;
  bool moves_with_speech = false;
};

struct LandmarkClasses {
  LandmarkClass of[kClassifiedLandmarks];

  constexpr LandmarkClasses() : of() {
    for (const int i : {39, 45, 51, 57}) of[i].group = kEyeCorner;
    for (const int i : {63, 64, 65, 68}) of[i].group = kNoseLeft;
    for (const int i : {69, 72, 73, 74}) of[i].group = kNoseRight;
    for (int i = 5; i <= 13; ++i) of[i].moves_with_speech = true;   // chin
    for (int i = 75; i <= 76; ++i) of[i].moves_with_speech = true;  // mouth
    for (int i = 80; i <= 88; ++i) of[i].moves_with_speech = true;
    for (int i = 90; i <= 94; ++i) of[i].moves_with_speech = true;
  }
};

constexpr LandmarkClasses kClasses;

// Points are worked on in blocks of four, a vector per quantity and a lane per point. Lanes never
// mix, so the results are those of one point at a time.
constexpr int32_t kBlock = 4;

// 1 for temples and cheeks, landmarks 0 to 3 and 15 to 18: where the projection lies farther out
// than the observation, only the distance across the midline counts. In whole blocks.
constexpr float kMayCountAcross[] = {1, 1, 1, 1, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 1, 1, 1, 1, 0};
constexpr int32_t kOutlineEnd = 19;
static_assert(sizeof(kMayCountAcross) / sizeof(kMayCountAcross[0]) >= kOutlineEnd &&
              sizeof(kMayCountAcross) / sizeof(kMayCountAcross[0]) % kBlock == 0);
// g = J^T r, each entry summed in the order of the rows.
void MultiplyTransposed(const float* J, const float* r, size_t rows, size_t columns, float* g) {
  if (columns == kPoseSize) {
    // Columns 0 to 3 and 3 to 6; both compute column 3 alike.
    F32x4 low = F32x4::Splat(0.0f), high = F32x4::Splat(0.0f);
    for (size_t row = 0; row < rows; ++row) {
      const F32x4 residual = F32x4::Splat(r[row]);
      low = low + F32x4::Load(J) * residual;
      high = high + F32x4::Load(J + 3) * residual;
      J += kPoseSize;
    }
    low.Store(g);
    high.Store(g + 3);
    return;
  }
  std::fill_n(g, columns, 0.0f);
  for (size_t row = 0; row < rows; ++row) {
    for (size_t k = 0; k < columns; ++k) g[k] += J[row * columns + k] * r[row];
  }
}

}  // namespace

PoseResiduals::PoseResiduals(const PoseProblem& problem)
    : problem_(problem), middle_(FindMiddleLine(problem)) {
  float by_group[] = {1.0f, 1.0f, 1.0f, 1.0f};
  if (problem.weighting_mode != 0) {
    // The averted side of the nose is seen worse: inner_weight below 1 marks the left one, above 1
    // the right one.
    const float w = problem.inner_weight;
    by_group[kOrdinary] = kOrdinaryFactor;
    by_group[kNoseLeft] = w < 1.0f ? w : 1.0f;
    by_group[kNoseRight] = w >= 1.0f ? 1.0f / w : 1.0f;
  }
  // A factor of 1 changes no bit, so it is multiplied in like any other.
  for (int32_t i = 0; i < kFactorCount; ++i) {
    const LandmarkClass landmark = i < kClassifiedLandmarks ? kClasses.of[i] : LandmarkClass{};
    group_factor_[i] = by_group[landmark.group];
    speech_factor_[i] = landmark.moves_with_speech ? problem.range_weight : 1.0f;
  }
  ordinary_factor_ = by_group[kOrdinary];
}

PoseResiduals::MiddleLine PoseResiduals::FindMiddleLine(const PoseProblem& problem) {
  MiddleLine line;
  // Without the landmarks that define it there is no line, and outline landmarks count as any
  // other.
  if (problem.point_count <= kInnerEyeCornerRight) return line;

  const float* chin = problem.landmarks + 2 * kChin;
  const float* left = problem.landmarks + 2 * kInnerEyeCornerLeft;
  const float* right = problem.landmarks + 2 * kInnerEyeCornerRight;
  const int32_t ax = TruncateToInt32(chin[0]);
  const int32_t ay = TruncateToInt32(chin[1]);
  const int32_t bx = TruncateToInt32(right[0] + left[0]) / 2;
  // The sum takes the x of one corner and the y of the other, which tilts the line. The line only
  // decides which outline landmarks are damped and in which direction.
  const int32_t by = TruncateToInt32(right[0] + left[1] + 1.0f) / 2;

  if (bx == ax) {
    line.kind = Middle::kVertical;
    line.position = static_cast<float>(bx);
  } else if (by == ay) {
    line.kind = Middle::kHorizontal;
    line.position = static_cast<float>(by);
  } else {
    const float run = static_cast<float>(WrapSubtract(bx, ax));
    const float rise = static_cast<float>(WrapSubtract(by, ay));
    line.kind = Middle::kOblique;
    line.slope = rise / run;
    line.offset =
        static_cast<float>(WrapSubtract(WrapMultiply(bx, ay), WrapMultiply(by, ax))) / run;
    line.normal = -1.0f / line.slope;
    line.normal_squared = line.normal * line.normal + 1.0f;
  }
  return line;
}

F32x4 PoseResiduals::DistanceFromMiddle(F32x4 x, F32x4 y) const {
  switch (middle_.kind) {
    case Middle::kNone:
      break;
    case Middle::kVertical:
      return Abs(x - F32x4::Splat(middle_.position));
    case Middle::kHorizontal:
      return Abs(y - F32x4::Splat(middle_.position));
    case Middle::kOblique:
      return Abs(F32x4::Splat(middle_.slope) * x - y + F32x4::Splat(middle_.offset));
  }
  return F32x4::Splat(0.0f);
}

void PoseResiduals::ProjectAcross(Mask32x4 across, F32x4* along_u, F32x4* along_v) const {
  const F32x4 weight = F32x4::Splat(problem_.contour_weight);
  const F32x4 normal = F32x4::Splat(middle_.normal);
  F32x4 u = *along_u, v = *along_v;
  switch (middle_.kind) {
    case Middle::kNone:
      break;
    case Middle::kVertical:
      // The distance along the line is dropped and the one across it counted twice, which keeps the
      // landmark's share in the sum of squares.
      v = u = weight * u;
      break;
    case Middle::kHorizontal:
      u = v = weight * v;
      break;
    case Middle::kOblique:
      u = (u + normal * v) * weight / F32x4::Splat(middle_.normal_squared);
      v = normal * u;
      break;
  }
  *along_u = Select(across, u, *along_u);
  *along_v = Select(across, v, *along_v);
}

// A block of points; when fewer are left, the lanes beyond repeat the last one.
struct PoseResiduals::Points {
  F32x4 X, Y, Z;       // in the model
  F32x4 xc, yc, zc;    // seen from the camera
  F32x4 fx_xc, fy_yc;  // times the focal lengths
  F32x4 u, v;          // projected
  F32x4 ox, oy;        // observed
  F32x4 group_factor, speech_factor;
};

// Derivatives of u and v by each parameter.
struct PoseResiduals::Derivatives {
  F32x4 u[kPoseSize], v[kPoseSize];
};

// A pose and camera, spread over the lanes.
struct PoseResiduals::View {
  F32x4 R[9];
  F32x4 w, x, y, z;
  F32x4 tx, ty, tz;
  F32x4 fx, fy, cx, cy;

  View(const float* pose, const float* camera)
      : w(F32x4::Splat(pose[0])),
        x(F32x4::Splat(pose[1])),
        y(F32x4::Splat(pose[2])),
        z(F32x4::Splat(pose[3])),
        tx(F32x4::Splat(pose[4])),
        ty(F32x4::Splat(pose[5])),
        tz(F32x4::Splat(pose[6])),
        fx(F32x4::Splat(camera[0])),
        fy(F32x4::Splat(camera[4])),
        cx(F32x4::Splat(camera[2])),
        cy(F32x4::Splat(camera[5])) {
    float matrix[9];
    QuatToRotationMatrix(pose, matrix);
    for (int i = 0; i < 9; ++i) R[i] = F32x4::Splat(matrix[i]);
  }
};

inline PoseResiduals::Points PoseResiduals::Project(const View& view, int32_t first,
                                                    int32_t count) const {
  // Offsets of the block's points; those beyond the last repeat it.
  const int32_t last = count - 1;
  const int32_t b = std::min(1, last), c = std::min(2, last), d = std::min(3, last);
  const float* m = problem_.model_points + 3 * static_cast<size_t>(first);
  const float* o = problem_.landmarks + 2 * static_cast<size_t>(first);
  Points p;
  p.X = F32x4::Of(m[0], m[3 * b], m[3 * c], m[3 * d]);
  p.Y = F32x4::Of(m[1], m[3 * b + 1], m[3 * c + 1], m[3 * d + 1]);
  p.Z = F32x4::Of(m[2], m[3 * b + 2], m[3 * c + 2], m[3 * d + 2]);
  p.ox = F32x4::Of(o[0], o[2 * b], o[2 * c], o[2 * d]);
  p.oy = F32x4::Of(o[1], o[2 * b + 1], o[2 * c + 1], o[2 * d + 1]);
  if (first < kClassifiedLandmarks) {
    p.group_factor = F32x4::Load(group_factor_ + first);
    p.speech_factor = F32x4::Load(speech_factor_ + first);
  } else {
    p.group_factor = F32x4::Splat(ordinary_factor_);
    p.speech_factor = F32x4::Splat(1.0f);
  }
  p.xc = view.R[0] * p.X + view.R[1] * p.Y + view.R[2] * p.Z + view.tx;
  p.yc = view.R[3] * p.X + view.R[4] * p.Y + view.R[5] * p.Z + view.ty;
  p.zc = view.R[6] * p.X + view.R[7] * p.Y + view.R[8] * p.Z + view.tz;
  p.fx_xc = view.fx * p.xc;
  p.fy_yc = view.fy * p.yc;
  p.u = p.fx_xc / p.zc + view.cx;
  p.v = p.fy_yc / p.zc + view.cy;
  return p;
}

inline PoseResiduals::Derivatives PoseResiduals::Differentiate(const View& view, const Points& p) {
  const F32x4 wX = view.w * p.X, wY = view.w * p.Y, wZ = view.w * p.Z;
  const F32x4 xX = view.x * p.X, xY = view.x * p.Y, xZ = view.x * p.Z;
  const F32x4 yX = view.y * p.X, yY = view.y * p.Y, yZ = view.y * p.Z;
  const F32x4 zX = view.z * p.X, zY = view.z * p.Y, zZ = view.z * p.Z;
  // Half the derivatives of xc, yc, zc by w, x, y, z. Some are the negatives of others, but summed
  // in another order.
  const F32x4 sum = xX + yY + zZ;
  const F32x4 a = wX - zY + yZ, b = zX + wY - xZ, c = xY - yX + wZ;
  const F32x4 xc_z = xZ - wY - zX, yc_x = yX - xY - wZ, zc_y = zY - wX - yZ;

  const F32x4 twice_fx = view.fx + view.fx, twice_fy = view.fy + view.fy;
  const F32x4 xc = p.xc, yc = p.yc, zc = p.zc, zz = p.zc * p.zc, zero = F32x4::Splat(0.0f);
  Derivatives d = {{twice_fx * (a * zc - xc * c) / zz, twice_fx * (sum * zc - xc * b) / zz,
                    twice_fx * (c * zc - xc * zc_y) / zz, twice_fx * (xc_z * zc - xc * sum) / zz,
                    view.fx / zc, zero, -p.fx_xc / zz},
                   {twice_fy * (b * zc - yc * c) / zz, twice_fy * (yc_x * zc - yc * b) / zz,
                    twice_fy * (sum * zc - yc * zc_y) / zz, twice_fy * (a * zc - yc * sum) / zz,
                    zero, view.fy / zc, -p.fy_yc / zz}};
  for (int k = 0; k < kPoseSize; ++k) {
    d.u[k] = d.u[k] * p.group_factor * p.speech_factor;
    d.v[k] = d.v[k] * p.group_factor * p.speech_factor;
  }
  return d;
}

template <bool kDerivatives>
MRESULT PoseResiduals::EvaluatePoints(const float* pose, float* r, float* J, float* Jt) const {
  const View view(pose, problem_.camera);
  for (int32_t first = 0; first < problem_.point_count; first += kBlock) {
    const int32_t wanted = std::min(kBlock, problem_.point_count - first);
    const Points p = Project(view, first, wanted);
    // The points before one without depth are still written.
    const int32_t without_depth = FirstTrue(Abs(p.zc) <= F32x4::Splat(kZeroDepth));
    const int32_t count = std::min(wanted, without_depth);

    const Mask32x4 across = first < kOutlineEnd ? AcrossOf(p, first) : Mask32x4{};
    const bool any_across = first < kOutlineEnd && Any(across);
    F32x4 ru = (p.u - p.ox) * p.group_factor * p.speech_factor;
    F32x4 rv = (p.v - p.oy) * p.group_factor * p.speech_factor;
    if (any_across) ProjectAcross(across, &ru, &rv);
    StorePairs(ru, rv, count, r + 2 * static_cast<size_t>(first));

    if constexpr (kDerivatives) {
      Derivatives d = Differentiate(view, p);
      if (any_across) {
        for (int32_t k = 0; k < kPoseSize; ++k) ProjectAcross(across, &d.u[k], &d.v[k]);
      }
      StoreDerivatives(d, first, count, J, Jt);
      WeightOtherColumns(p, any_across ? &across : nullptr, first, count, J, Jt);
    }
    if (count < wanted) {
      std::puts("zero in zc");
      return N3DS_NUMERICAL;
    }
  }
  return N3DS_OK;
}

inline Mask32x4 PoseResiduals::AcrossOf(const Points& p, int32_t first) const {
  return (F32x4::Load(kMayCountAcross + first) > F32x4::Splat(0.0f)) &
         (DistanceFromMiddle(p.ox, p.oy) < DistanceFromMiddle(p.u, p.v));
}

inline void PoseResiduals::StorePairs(F32x4 u, F32x4 v, int32_t count, float* pairs) {
  const F32x4 low = ZipLow(u, v), high = ZipHigh(u, v);
  if (count == kBlock) {
    low.Store(pairs);
    high.Store(pairs + 4);
    return;
  }
  float block[2 * kBlock];
  low.Store(block);
  high.Store(block + 4);
  std::copy_n(block, 2 * count, pairs);
}

inline void PoseResiduals::StoreDerivatives(const Derivatives& d, int32_t first, int32_t count,
                                            float* J, float* Jt) const {
  const size_t columns = static_cast<size_t>(problem_.parameter_count);
  if (columns != kPoseSize) {
    const size_t known = std::min<size_t>(columns, kPoseSize);
    for (size_t k = 0; k < known; ++k) StoreColumn(d.u[k], d.v[k], k, first, count, J, Jt);
    return;
  }
  constexpr size_t kRowPair = 2 * kPoseSize;
  float part[kBlock * kRowPair];
  float* const block = J + static_cast<size_t>(first) * kRowPair;
  float* row = count == kBlock ? block : part;
  // Columns 0 to 3 and 3 to 6 of each row; column 3 is written twice.
  F32x4 u_low[] = {d.u[0], d.u[1], d.u[2], d.u[3]}, u_high[] = {d.u[3], d.u[4], d.u[5], d.u[6]};
  F32x4 v_low[] = {d.v[0], d.v[1], d.v[2], d.v[3]}, v_high[] = {d.v[3], d.v[4], d.v[5], d.v[6]};
  Transpose(u_low);
  Transpose(u_high);
  Transpose(v_low);
  Transpose(v_high);
  for (int32_t l = 0; l < kBlock; ++l) {
    u_low[l].Store(row);
    u_high[l].Store(row + 3);
    v_low[l].Store(row + 7);
    v_high[l].Store(row + 10);
    row += kRowPair;
  }
  if (count < kBlock) std::copy_n(part, static_cast<size_t>(count) * kRowPair, block);

  if (Jt == nullptr) return;
  const size_t rows = 2 * static_cast<size_t>(problem_.point_count);
  float* column = Jt + 2 * static_cast<size_t>(first);
  for (size_t k = 0; k < kPoseSize; ++k) {
    StorePairs(d.u[k], d.v[k], count, column);
    column += rows;
  }
}

void PoseResiduals::WeightOtherColumns(const Points& p, const Mask32x4* across, int32_t first,
                                       int32_t count, float* J, float* Jt) const {
  const size_t columns = static_cast<size_t>(problem_.parameter_count);
  const float* row = J + 2 * static_cast<size_t>(first) * columns;
  for (size_t k = kPoseSize; k < columns; ++k) {
    float u[kBlock] = {}, v[kBlock] = {};
    for (size_t l = 0; l < static_cast<size_t>(count); ++l) {
      u[l] = row[2 * l * columns + k];
      v[l] = row[(2 * l + 1) * columns + k];
    }
    F32x4 along_u = F32x4::Load(u) * p.group_factor * p.speech_factor;
    F32x4 along_v = F32x4::Load(v) * p.group_factor * p.speech_factor;
    if (across != nullptr) ProjectAcross(*across, &along_u, &along_v);
    StoreColumn(along_u, along_v, k, first, count, J, Jt);
  }
}

void PoseResiduals::StoreColumn(F32x4 along_u, F32x4 along_v, size_t k, int32_t first,
                                int32_t count, float* J, float* Jt) const {
  const size_t columns = static_cast<size_t>(problem_.parameter_count);
  const size_t rows = 2 * static_cast<size_t>(problem_.point_count);
  const size_t first_row = 2 * static_cast<size_t>(first);
  float pairs[2 * kBlock];
  StorePairs(along_u, along_v, kBlock, pairs);
  for (size_t i = 0; i < 2 * static_cast<size_t>(count); ++i) {
    J[(first_row + i) * columns + k] = pairs[i];
    if (Jt != nullptr) Jt[k * rows + first_row + i] = pairs[i];
  }
}

MRESULT PoseResiduals::Evaluate(const float* pose, float* r) const {
  return EvaluatePoints<false>(pose, r, nullptr, nullptr);
}

MRESULT PoseResiduals::Linearise(const float* pose, float* r, float* J, float* Jt) const {
  return EvaluatePoints<true>(pose, r, J, Jt);
}

void PoseResiduals::FormNormalEquations(const float* r, const float* J, const float* Jt, float* JtJ,
                                        float* g) const {
  const int32_t rows = 2 * problem_.point_count, columns = problem_.parameter_count;
  mcvMatrixMulMatrixRowMajor_f32(JtJ, Jt, J, columns, rows, columns);
  MultiplyTransposed(J, r, static_cast<size_t>(rows), static_cast<size_t>(columns), g);
}

}  // namespace n3ds

MRESULT ComputeJacobianEtc(MHandle memory, float* J, float* JtJ, float* g, float* r,
                           const float* landmarks, const float* modelPoints, int32_t pointCount,
                           const float* camera, const float* pose, float contourWeight,
                           float rangeWeight, int64_t weightingMode, float innerWeight,
                           int32_t paramCount) {
  const bool derivatives = J != nullptr;
  if ((JtJ != nullptr) != derivatives || (g != nullptr) != derivatives) return N3DS_BAD_VALUE;
  if (r == nullptr || landmarks == nullptr || modelPoints == nullptr || camera == nullptr ||
      pose == nullptr) {
    return N3DS_NULL_ARGUMENT;
  }
  if (pointCount < 0 || pointCount > n3ds::kMaxPoints || paramCount < 0) return N3DS_BAD_VALUE;

  const n3ds::PoseResiduals residuals({landmarks, modelPoints, pointCount, camera, contourWeight,
                                       rangeWeight, weightingMode, innerWeight, paramCount});
  if (!derivatives) return residuals.Evaluate(pose, r);
  const n3ds::ScratchArray<float> transpose(memory, residuals.JacobianSize());
  // Zero depth takes precedence over a failed allocation, so the points are evaluated first.
  const MRESULT status = residuals.Linearise(pose, r, J, transpose.get());
  if (status != N3DS_OK) return status;
  if (!transpose) return N3DS_NO_MEMORY;
  residuals.FormNormalEquations(r, J, transpose.get(), JtJ, g);
  return N3DS_OK;
}
