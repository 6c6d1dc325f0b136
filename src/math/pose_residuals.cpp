// SPDX-License-Identifier: MIT
#include "math/pose_residuals.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>

#include "platform/integer_arithmetic.h"
#include "platform/scratch_array.h"

namespace n3ds {
namespace {

// Points as near the camera plane as this have no projection. The limit is the double 1e-6; a float
// does not exceed it exactly when it does not exceed the float, which is the nearest one below.
constexpr float kZeroDepth = 1e-6f;
static_assert(static_cast<double>(kZeroDepth) < 1e-6);
// Weight of a landmark that is neither eye corner nor nose, when the weighting is on.
constexpr float kOrdinaryFactor = 0.1f;

// Landmarks that define the middle line.
constexpr int32_t kChin = 9;
constexpr int32_t kInnerEyeCornerLeft = 45;
constexpr int32_t kInnerEyeCornerRight = 51;
constexpr int32_t kLastOutlineLandmark = 18;

// Landmarks are classed by their number in the arrays as passed; those beyond are ordinary.
constexpr int32_t kClassifiedLandmarks = 95;

enum LandmarkGroup : uint8_t { kOrdinary, kEyeCorner, kNoseLeft, kNoseRight };

struct LandmarkClass {
  LandmarkGroup group = kOrdinary;
  bool moves_with_speech = false;
  bool outline = false;  // temple or cheek: may be damped to its distance across the middle line
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
    for (const int i : {0, 1, 2, 3, 15, 16, 17, 18}) of[i].outline = true;
  }
};

constexpr LandmarkClasses kClasses;

// Points are worked on in blocks of four, a vector per quantity and a lane per point: one algorithm
// on every processor. Lanes never mix, so the results are those of one point at a time.
constexpr int32_t kBlock = 4;
using Lanes __attribute__((vector_size(kBlock * sizeof(float)))) = float;

Lanes Splat(float value) { return Lanes{value, value, value, value}; }

Lanes LoadLanes(const float* values) {
  Lanes lanes;
  std::memcpy(&lanes, values, sizeof(lanes));
  return lanes;
}

void StoreLanes(float* values, Lanes lanes) { std::memcpy(values, &lanes, sizeof(lanes)); }

// Four rows of four become four columns.
struct Quad {
  Lanes row[kBlock];
};
Quad Transpose(Lanes a, Lanes b, Lanes c, Lanes d) {
  const Lanes ac_low = __builtin_shufflevector(a, c, 0, 4, 1, 5);
  const Lanes ac_high = __builtin_shufflevector(a, c, 2, 6, 3, 7);
  const Lanes bd_low = __builtin_shufflevector(b, d, 0, 4, 1, 5);
  const Lanes bd_high = __builtin_shufflevector(b, d, 2, 6, 3, 7);
  return {{__builtin_shufflevector(ac_low, bd_low, 0, 4, 1, 5),
           __builtin_shufflevector(ac_low, bd_low, 2, 6, 3, 7),
           __builtin_shufflevector(ac_high, bd_high, 0, 4, 1, 5),
           __builtin_shufflevector(ac_high, bd_high, 2, 6, 3, 7)}};
}

// g = J^T r, each entry summed in the order of the rows.
void MultiplyTransposed(const float* J, const float* r, size_t rows, size_t columns, float* g) {
  if (columns == kPoseParameters) {
    // Columns 0 to 3 and 3 to 6; both compute column 3 alike.
    Lanes low = Splat(0.0f), high = Splat(0.0f);
    for (size_t row = 0; row < rows; ++row) {
      const Lanes residual = Splat(r[row]);
      low += LoadLanes(J) * residual;
      high += LoadLanes(J + 3) * residual;
      J += kPoseParameters;
    }
    StoreLanes(g, low);
    StoreLanes(g + 3, high);
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
    // The side of the nose that is turned away is seen worse: inner_weight below 1 marks the left
    // one, above 1 the right one.
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
  // The x of one corner and the y of the other is what this weighting was tuned with. It tilts the
  // line, but only decides which outline landmarks are damped and in which direction.
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

bool PoseResiduals::LiesInside(float u, float v, float ox, float oy) const {
  switch (middle_.kind) {
    case Middle::kNone:
      return false;
    case Middle::kVertical:
      return std::fabs(ox - middle_.position) < std::fabs(u - middle_.position);
    case Middle::kHorizontal:
      return std::fabs(oy - middle_.position) < std::fabs(v - middle_.position);
    case Middle::kOblique:
      return std::fabs(middle_.slope * ox - oy + middle_.offset) <
             std::fabs(middle_.slope * u - v + middle_.offset);
  }
  return false;
}

void PoseResiduals::ProjectAcross(float* along_u, float* along_v) const {
  const float weight = problem_.contour_weight;
  switch (middle_.kind) {
    case Middle::kNone:
      break;
    case Middle::kVertical:
      // The distance along the line is dropped and the one across it counted twice, which keeps the
      // landmark's share in the sum of squares.
      *along_v = *along_u = weight * *along_u;
      break;
    case Middle::kHorizontal:
      *along_u = *along_v = weight * *along_v;
      break;
    case Middle::kOblique:
      *along_u = (*along_u + middle_.normal * *along_v) * weight / middle_.normal_squared;
      *along_v = middle_.normal * *along_u;
      break;
  }
}

// A block of points; when fewer are left, the lanes beyond repeat the last one.
struct PoseResiduals::Points {
  Lanes X, Y, Z;       // in the model
  Lanes xc, yc, zc;    // seen from the camera
  Lanes fx_xc, fy_yc;  // times the focal lengths
  Lanes u, v;          // projected
  Lanes ox, oy;        // observed
  Lanes group_factor, speech_factor;
};

// Derivatives of u and v by each parameter.
struct PoseResiduals::Derivatives {
  Lanes u[kPoseParameters], v[kPoseParameters];
};

// A pose and camera, spread over the lanes.
struct PoseResiduals::View {
  Lanes R[9];
  Lanes w, x, y, z;
  Lanes tx, ty, tz;
  Lanes fx, fy, cx, cy;

  View(const float* pose, const float* camera)
      : w(Splat(pose[0])),
        x(Splat(pose[1])),
        y(Splat(pose[2])),
        z(Splat(pose[3])),
        tx(Splat(pose[4])),
        ty(Splat(pose[5])),
        tz(Splat(pose[6])),
        fx(Splat(camera[0])),
        fy(Splat(camera[4])),
        cx(Splat(camera[2])),
        cy(Splat(camera[5])) {
    float matrix[9];
    QuatToRotationMatrix(pose, matrix);
    for (int i = 0; i < 9; ++i) R[i] = Splat(matrix[i]);
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
  p.X = Lanes{m[0], m[3 * b], m[3 * c], m[3 * d]};
  p.Y = Lanes{m[1], m[3 * b + 1], m[3 * c + 1], m[3 * d + 1]};
  p.Z = Lanes{m[2], m[3 * b + 2], m[3 * c + 2], m[3 * d + 2]};
  p.ox = Lanes{o[0], o[2 * b], o[2 * c], o[2 * d]};
  p.oy = Lanes{o[1], o[2 * b + 1], o[2 * c + 1], o[2 * d + 1]};
  if (first < kClassifiedLandmarks) {
    p.group_factor = LoadLanes(group_factor_ + first);
    p.speech_factor = LoadLanes(speech_factor_ + first);
  } else {
    p.group_factor = Splat(ordinary_factor_);
    p.speech_factor = Splat(1.0f);
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
  const Lanes wX = view.w * p.X, wY = view.w * p.Y, wZ = view.w * p.Z;
  const Lanes xX = view.x * p.X, xY = view.x * p.Y, xZ = view.x * p.Z;
  const Lanes yX = view.y * p.X, yY = view.y * p.Y, yZ = view.y * p.Z;
  const Lanes zX = view.z * p.X, zY = view.z * p.Y, zZ = view.z * p.Z;
  // Half the derivatives of xc, yc, zc by w, x, y, z. Some are the negatives of others, but summed
  // in another order.
  const Lanes sum = xX + yY + zZ;
  const Lanes a = wX - zY + yZ, b = zX + wY - xZ, c = xY - yX + wZ;
  const Lanes xc_z = xZ - wY - zX, yc_x = yX - xY - wZ, zc_y = zY - wX - yZ;

  const Lanes twice_fx = view.fx + view.fx, twice_fy = view.fy + view.fy;
  const Lanes xc = p.xc, yc = p.yc, zc = p.zc, zz = p.zc * p.zc, zero = Splat(0.0f);
  Derivatives d = {{twice_fx * (a * zc - xc * c) / zz, twice_fx * (sum * zc - xc * b) / zz,
                    twice_fx * (c * zc - xc * zc_y) / zz, twice_fx * (xc_z * zc - xc * sum) / zz,
                    view.fx / zc, zero, -p.fx_xc / zz},
                   {twice_fy * (b * zc - yc * c) / zz, twice_fy * (yc_x * zc - yc * b) / zz,
                    twice_fy * (sum * zc - yc * zc_y) / zz, twice_fy * (a * zc - yc * sum) / zz,
                    zero, view.fy / zc, -p.fy_yc / zz}};
  for (int k = 0; k < kPoseParameters; ++k) {
    d.u[k] = d.u[k] * p.group_factor * p.speech_factor;
    d.v[k] = d.v[k] * p.group_factor * p.speech_factor;
  }
  return d;
}

template <bool kDerivatives>
MRESULT PoseResiduals::EvaluatePoints(const float* pose, float* r, float* J, float* Jt) const {
  const View view(pose, problem_.camera);
  for (int32_t first = 0; first < problem_.point_count; first += kBlock) {
    const int32_t count = std::min(kBlock, problem_.point_count - first);
    const Points p = Project(view, first, count);
    const auto zero = (p.zc <= Splat(kZeroDepth)) & (p.zc >= Splat(-kZeroDepth));
    if ((zero[0] | zero[1] | zero[2] | zero[3]) != 0) {
      std::puts("zero in zc");
      return N3DS_NUMERICAL;
    }

    Lanes ru = (p.u - p.ox) * p.group_factor * p.speech_factor;
    Lanes rv = (p.v - p.oy) * p.group_factor * p.speech_factor;
    bool across[kBlock] = {};
    if (first <= kLastOutlineLandmark) {
      for (int32_t l = 0; l < count; ++l) {
        across[l] = kClasses.of[first + l].outline && LiesInside(p.u[l], p.v[l], p.ox[l], p.oy[l]);
        if (!across[l]) continue;
        float along_u = ru[l], along_v = rv[l];
        ProjectAcross(&along_u, &along_v);
        ru[l] = along_u;
        rv[l] = along_v;
      }
    }
    float* residuals = r + 2 * static_cast<size_t>(first);
    if (count == kBlock) {
      StoreLanes(residuals, __builtin_shufflevector(ru, rv, 0, 4, 1, 5));
      StoreLanes(residuals + 4, __builtin_shufflevector(ru, rv, 2, 6, 3, 7));
    } else {
      for (int32_t l = 0; l < count; ++l) {
        residuals[2 * l] = ru[l];
        residuals[2 * l + 1] = rv[l];
      }
    }

    if constexpr (kDerivatives) {
      Derivatives d = Differentiate(view, p);
      if (first <= kLastOutlineLandmark) {
        for (int32_t l = 0; l < count; ++l) {
          if (!across[l]) continue;
          for (int32_t k = 0; k < kPoseParameters; ++k) {
            float along_u = d.u[k][l], along_v = d.v[k][l];
            ProjectAcross(&along_u, &along_v);
            d.u[k][l] = along_u;
            d.v[k][l] = along_v;
          }
        }
      }
      Store(d, first, count, J, Jt);
      if (problem_.parameter_count > kPoseParameters) {
        WeightOtherColumns(p, across, first, count, J, Jt);
      }
    }
  }
  return N3DS_OK;
}

inline void PoseResiduals::Store(const Derivatives& d, int32_t first, int32_t count, float* J,
                                 float* Jt) const {
  const size_t columns = static_cast<size_t>(problem_.parameter_count);
  const size_t rows = 2 * static_cast<size_t>(problem_.point_count);
  const size_t first_row = 2 * static_cast<size_t>(first);
  float* row = J + first_row * columns;
  if (columns == kPoseParameters && count == kBlock) {
    // Columns 0 to 3 and 3 to 6 of each row; column 3 is written twice.
    const Quad u_low = Transpose(d.u[0], d.u[1], d.u[2], d.u[3]);
    const Quad u_high = Transpose(d.u[3], d.u[4], d.u[5], d.u[6]);
    const Quad v_low = Transpose(d.v[0], d.v[1], d.v[2], d.v[3]);
    const Quad v_high = Transpose(d.v[3], d.v[4], d.v[5], d.v[6]);
    for (int32_t l = 0; l < kBlock; ++l) {
      StoreLanes(row, u_low.row[l]);
      StoreLanes(row + 3, u_high.row[l]);
      StoreLanes(row + 7, v_low.row[l]);
      StoreLanes(row + 10, v_high.row[l]);
      row += 2 * kPoseParameters;
    }
    if (Jt == nullptr) return;
    for (size_t k = 0; k < kPoseParameters; ++k) {
      float* column = Jt + k * rows + first_row;
      StoreLanes(column, __builtin_shufflevector(d.u[k], d.v[k], 0, 4, 1, 5));
      StoreLanes(column + 4, __builtin_shufflevector(d.u[k], d.v[k], 2, 6, 3, 7));
    }
    return;
  }
  const size_t known = std::min<size_t>(columns, kPoseParameters);
  for (int32_t l = 0; l < count; ++l) {
    for (size_t k = 0; k < known; ++k) {
      const float along_u = d.u[k][l], along_v = d.v[k][l];
      row[k] = along_u;
      row[columns + k] = along_v;
      if (Jt == nullptr) continue;
      Jt[k * rows + first_row + 2 * static_cast<size_t>(l)] = along_u;
      Jt[k * rows + first_row + 2 * static_cast<size_t>(l) + 1] = along_v;
    }
    row += 2 * columns;
  }
}

void PoseResiduals::WeightOtherColumns(const Points& p, const bool* across, int32_t first,
                                       int32_t count, float* J, float* Jt) const {
  const size_t columns = static_cast<size_t>(problem_.parameter_count);
  const size_t rows = 2 * static_cast<size_t>(problem_.point_count);
  for (int32_t l = 0; l < count; ++l) {
    const size_t row = 2 * static_cast<size_t>(first + l);
    for (size_t k = kPoseParameters; k < columns; ++k) {
      float* along_u = J + row * columns + k;
      float* along_v = along_u + columns;
      *along_u = *along_u * p.group_factor[l] * p.speech_factor[l];
      *along_v = *along_v * p.group_factor[l] * p.speech_factor[l];
      if (across[l]) ProjectAcross(along_u, along_v);
      if (Jt == nullptr) continue;
      Jt[k * rows + row] = *along_u;
      Jt[k * rows + row + 1] = *along_v;
    }
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
  if (pointCount < 0 || paramCount < 0) return N3DS_BAD_VALUE;

  const n3ds::PoseResiduals residuals({landmarks, modelPoints, pointCount, camera, contourWeight,
                                       rangeWeight, weightingMode, innerWeight, paramCount});
  if (!derivatives) return residuals.Evaluate(pose, r);
  const n3ds::ScratchArray<float> transpose(memory, residuals.JacobianSize());
  // A point without depth is the graver news, so the points are gone through all the same.
  const MRESULT status = residuals.Linearise(pose, r, J, transpose.get());
  if (status != N3DS_OK) return status;
  if (!transpose) return N3DS_NO_MEMORY;
  residuals.FormNormalEquations(r, J, transpose.get(), JtJ, g);
  return N3DS_OK;
}
