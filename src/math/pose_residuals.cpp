#include "math/pose_residuals.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>

#include "math/integer_arithmetic.h"
#include "platform/scratch_array.h"

namespace n3ds {
namespace {

// Points as near the camera plane as this have no projection. Compared in double.
constexpr double kZeroDepth = 1e-6;
// Weight of a landmark that is neither eye corner nor nose, when the weighting is on.
constexpr float kOrdinaryFactor = 0.1f;

// Landmarks that define the middle line.
constexpr int32_t kChin = 9;
constexpr int32_t kInnerEyeCornerLeft = 45;
constexpr int32_t kInnerEyeCornerRight = 51;

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

// Seven derivatives and one unused, so that whole vectors are worked on.
constexpr int32_t kLanes = 8;

void Scale(float* values, int32_t count, float factor) {
  for (int32_t k = 0; k < count; ++k) values[k] *= factor;
}

// g = J^T r, each entry summed in the order of the rows.
void MultiplyTransposed(const float* J, const float* r, size_t rows, size_t columns, float* g) {
  for (size_t first = 0; first < columns; first += kLanes) {
    const size_t count = std::min<size_t>(columns - first, kLanes);
    float sums[kLanes] = {};
    for (size_t row = 0; row < rows; ++row) {
      const float* derivatives = J + row * columns + first;
      for (size_t k = 0; k < count; ++k) sums[k] += derivatives[k] * r[row];
    }
    std::copy_n(sums, count, g + first);
  }
}

}  // namespace

PoseResiduals::PoseResiduals(const PoseProblem& problem)
    : problem_(problem), group_factor_{1.0f, 1.0f, 1.0f, 1.0f}, middle_(FindMiddleLine(problem)) {
  if (problem.weighting_mode != 0) {
    // The side of the nose that is turned away is seen worse: inner_weight below 1 marks the left
    // one, above 1 the right one.
    const float w = problem.inner_weight;
    group_factor_[kOrdinary] = kOrdinaryFactor;
    group_factor_[kNoseLeft] = w < 1.0f ? w : 1.0f;
    group_factor_[kNoseRight] = w >= 1.0f ? 1.0f / w : 1.0f;
  }
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

void PoseResiduals::ProjectAcross(float* along_u, float* along_v, int32_t count) const {
  const float weight = problem_.contour_weight;
  switch (middle_.kind) {
    case Middle::kNone:
      break;
    case Middle::kVertical:
      // The distance along the line is dropped and the one across it counted twice, which keeps the
      // landmark's share in the sum of squares.
      for (int32_t k = 0; k < count; ++k) along_v[k] = along_u[k] = weight * along_u[k];
      break;
    case Middle::kHorizontal:
      for (int32_t k = 0; k < count; ++k) along_u[k] = along_v[k] = weight * along_v[k];
      break;
    case Middle::kOblique:
      for (int32_t k = 0; k < count; ++k) {
        along_u[k] = (along_u[k] + middle_.normal * along_v[k]) * weight / middle_.normal_squared;
        along_v[k] = middle_.normal * along_u[k];
      }
      break;
  }
}

template <bool kDerivatives>
MRESULT PoseResiduals::EvaluatePoints(const float* pose, float* r, float* J) const {
  float R[9];
  QuatToRotationMatrix(pose, R);
  const float w = pose[0], x = pose[1], y = pose[2], z = pose[3];
  const float tx = pose[4], ty = pose[5], tz = pose[6];
  const float fx = problem_.camera[0], cx = problem_.camera[2];
  const float fy = problem_.camera[4], cy = problem_.camera[5];
  const float twice_fx = 2.0f * fx, twice_fy = 2.0f * fy;
  const int32_t columns = problem_.parameter_count;

  for (int32_t i = 0; i < problem_.point_count; ++i) {
    const float* model = problem_.model_points + 3 * static_cast<size_t>(i);
    const float X = model[0], Y = model[1], Z = model[2];
    const float xc = R[0] * X + R[1] * Y + R[2] * Z + tx;
    const float yc = R[3] * X + R[4] * Y + R[5] * Z + ty;
    const float zc = R[6] * X + R[7] * Y + R[8] * Z + tz;
    if (std::fabs(static_cast<double>(zc)) <= kZeroDepth) {
      std::puts("zero in zc");
      return N3DS_NUMERICAL;
    }
    const float fx_xc = fx * xc, fy_yc = fy * yc;
    const float u = fx_xc / zc + cx;
    const float v = fy_yc / zc + cy;
    const float ox = problem_.landmarks[2 * static_cast<size_t>(i)];
    const float oy = problem_.landmarks[2 * static_cast<size_t>(i) + 1];
    float ru = u - ox, rv = v - oy;

    // Landmarks without a class are neither outline nor moved by speech.
    const LandmarkClass landmark = i < kClassifiedLandmarks ? kClasses.of[i] : LandmarkClass{};
    // A factor of 1 changes no bit, so it is multiplied in like any other.
    const float group_factor = group_factor_[landmark.group];
    const float speech_factor = landmark.moves_with_speech ? problem_.range_weight : 1.0f;
    const bool across = landmark.outline && LiesInside(u, v, ox, oy);

    ru = ru * group_factor * speech_factor;
    rv = rv * group_factor * speech_factor;
    if (across) ProjectAcross(&ru, &rv, 1);
    r[2 * static_cast<size_t>(i)] = ru;
    r[2 * static_cast<size_t>(i) + 1] = rv;

    if constexpr (kDerivatives) {
      const float wX = w * X, wY = w * Y, wZ = w * Z;
      const float xX = x * X, xY = x * Y, xZ = x * Z;
      const float yX = y * X, yY = y * Y, yZ = y * Z;
      const float zX = z * X, zY = z * Y, zZ = z * Z;
      // Half the derivatives of xc, yc, zc by w, x, y, z.
      const float sum = xX + yY + zZ;
      const float p = wX - zY + yZ, q = zX + wY - xZ, s = xY - yX + wZ;
      const float dx[4] = {p, sum, s, xZ - wY - zX};
      const float dy[4] = {q, yX - xY - wZ, sum, p};
      const float dz[4] = {s, q, zY - wX - yZ, sum};
      const float zz = zc * zc;

      float du[kLanes], dv[kLanes];
      for (int k = 0; k < 4; ++k) {
        du[k] = twice_fx * (dx[k] * zc - xc * dz[k]) / zz;
        dv[k] = twice_fy * (dy[k] * zc - yc * dz[k]) / zz;
      }
      du[4] = fx / zc;
      du[5] = 0.0f;
      du[6] = -fx_xc / zz;
      du[7] = 0.0f;
      dv[4] = 0.0f;
      dv[5] = fy / zc;
      dv[6] = -fy_yc / zz;
      dv[7] = 0.0f;

      Scale(du, kLanes, group_factor);
      Scale(dv, kLanes, group_factor);
      Scale(du, kLanes, speech_factor);
      Scale(dv, kLanes, speech_factor);
      if (across) ProjectAcross(du, dv, kLanes);

      float* row_u = J + 2 * static_cast<size_t>(i) * static_cast<size_t>(columns);
      float* row_v = row_u + columns;
      if (columns == kPoseParameters) {
        std::memcpy(row_u, du, kPoseParameters * sizeof(float));
        std::memcpy(row_v, dv, kPoseParameters * sizeof(float));
      } else {
        const int32_t known = std::min(columns, kPoseParameters);
        std::copy_n(du, known, row_u);
        std::copy_n(dv, known, row_v);
        // Columns of parameters that the pose does not have: the caller's values, weighted.
        const int32_t others = columns - known;
        for (float* row : {row_u + known, row_v + known}) {
          Scale(row, others, group_factor);
          Scale(row, others, speech_factor);
        }
        if (across) ProjectAcross(row_u + known, row_v + known, others);
      }
    }
  }
  return N3DS_OK;
}

MRESULT PoseResiduals::Evaluate(const float* pose, float* r) const {
  return EvaluatePoints<false>(pose, r, nullptr);
}

MRESULT PoseResiduals::Evaluate(MHandle memory, const float* pose, float* r, float* J, float* JtJ,
                                float* g) const {
  if (const MRESULT status = EvaluatePoints<true>(pose, r, J); status != N3DS_OK) return status;

  const size_t rows = 2 * static_cast<size_t>(problem_.point_count);
  const size_t columns = static_cast<size_t>(problem_.parameter_count);
  {
    const ScratchArray<float> transpose(memory, columns * rows);
    if (!transpose) return N3DS_NO_MEMORY;
    for (size_t row = 0; row < rows; ++row) {
      for (size_t k = 0; k < columns; ++k) transpose[k * rows + row] = J[row * columns + k];
    }
    mcvMatrixMulMatrixRowMajor_f32(JtJ, transpose.get(), J, problem_.parameter_count,
                                   static_cast<int32_t>(rows), problem_.parameter_count);
  }
  MultiplyTransposed(J, r, rows, columns, g);
  return N3DS_OK;
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
  return derivatives ? residuals.Evaluate(memory, pose, r, J, JtJ, g) : residuals.Evaluate(pose, r);
}
