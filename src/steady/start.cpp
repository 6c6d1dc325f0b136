// SPDX-License-Identifier: MIT
#include "steady/start.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "core/output_matrices.h"
#include "steady/dense_solver.h"
#include "steady/tuning.h"

namespace n3ds::steady {

namespace {

struct Vector2 {
  float x, y;
};
float Length(const Vector2& v) { return std::sqrt(v.x * v.x + v.y * v.y); }
Vector2 operator-(const Vector2& a, const Vector2& b) { return {a.x - b.x, a.y - b.y}; }
Vector2 Middle(const Vector2& a, const Vector2& b) { return {(a.x + b.x) / 2, (a.y + b.y) / 2}; }

// A frontal face in the camera frame, the model's pitch included.
constexpr Rotation kFrontal = {{1, 0, 0, 0, -kTiltCosine, kTiltSine, 0, -kTiltSine, -kTiltCosine}};

// What eyes, mouth and nose tell of a pose.
struct PoseGuess {
  float roll;  // rad
  float yaw;
  float place[3];
};

PoseGuess GuessPose(const Model& model, const Observation& seen) {
  const auto at = [&seen](int landmark) { return Vector2{seen.u[landmark], seen.v[landmark]}; };
  const Vector2 left_eye = Middle(at(39), at(45));
  const Vector2 right_eye = Middle(at(51), at(57));
  const Vector2 eyes = Middle(left_eye, right_eye);
  const Vector2 mouth = Middle(at(75), at(81));
  const Vector2 down = mouth - eyes;

  // Of the two lengths that tell the size, the one that a turn has shortened less.
  const float eye_distance = std::fabs(model.mean[0][39] + model.mean[0][45]);
  const float face_height =
      std::fabs((model.mean[1][39] + model.mean[1][45]) / 2 - model.mean[1][75]);
  const float pixels_per_mm =
      std::max({Length(right_eye - left_eye) / eye_distance, Length(down) / face_height, 1e-3f});
  const float depth = seen.focal / pixels_per_mm;

  // The nose's tip stands off the line from the eyes to the mouth by its depth times the yaw's sine.
  const Vector2 tip = at(100) - eyes;
  const float off = (tip.x * down.y - tip.y * down.x) / (Length(down) + 1e-6f);
  const float sine = std::clamp(off / pixels_per_mm / kNoseDepth, -0.9f, 0.9f);

  Vector2 nose = {0, 0};
  for (int landmark = 66; landmark < 72; landmark++) {
    nose.x += seen.u[landmark] / 6;
    nose.y += seen.v[landmark] / 6;
  }
  PoseGuess guess;
  guess.roll =
      static_cast<float>(std::atan2(static_cast<double>(-down.x), static_cast<double>(down.y)));
  guess.yaw = -static_cast<float>(std::asin(static_cast<double>(sine)));
  guess.place[0] = (nose.x - seen.centre_u) / seen.focal;
  guess.place[1] = (nose.y - seen.centre_v) / seen.focal;
  guess.place[2] = static_cast<float>(std::log(static_cast<double>(depth)));
  return guess;
}

void ClearFace(const KnownPerson* known, Face* face) {
  const uint64_t id = face->id;
  std::memset(static_cast<void*>(face), 0, sizeof(*face));
  face->id = id;
  face->mean.rotation = kFrontal;
  for (int j = 0; j < kExpressionCount; j++) face->mean.expression[j] = RestOf(j);
  face->noise = kFirstNoise;
  face->usual_misfit = 1;
  if (known != nullptr) {
    std::memcpy(face->mean.identity, known->face->mean.identity, sizeof(face->mean.identity));
    std::memcpy(face->offset, known->face->offset, sizeof(face->offset));
    std::memcpy(face->offset_covariance, known->face->offset_covariance,
                sizeof(face->offset_covariance));
    face->noise = known->face->noise;
    return;
  }
  for (int landmark = kOutlineLandmarkCount; landmark < kLandmarkCount; landmark++) {
    for (const int diagonal : {0, 3, 5}) {
      face->offset_covariance[diagonal][landmark] = kOffsetSpread * kOffsetSpread;
    }
  }
}

// Adds what is believed before the landmarks are seen to the normal equations.
void AddPriors(const KnownPerson* known, const StateMean& mean, double* a, double* x) {
  const auto cell = [a](int i, int j) -> double& { return a[i * kMeasuredSize + j]; };
  for (int i = 0; i < kIdentityCount; i++) {
    const int row = kIdentityAt + i;
    if (known == nullptr) {
      cell(row, row) += 1;
      x[row] -= static_cast<double>(mean.identity[i]);
      continue;
    }
    for (int j = 0; j < kIdentityCount; j++) {
      const double information = known->information[i * kIdentityCount + j];
      cell(row, kIdentityAt + j) += information;
      x[row] -= information * static_cast<double>(mean.identity[j] - known->face->mean.identity[j]);
    }
  }
  constexpr double kInformation =
      1 / (static_cast<double>(kExpressionSpread) * static_cast<double>(kExpressionSpread));
  for (int j = 0; j < kExpressionCount; j++) {
    const int row = kExpressionAt + j;
    cell(row, row) += kInformation;
    x[row] -= kInformation * static_cast<double>(mean.expression[j] - RestOf(j));
  }
}

bool IsPlausible(const StateMean& mean) {
  return std::isfinite(mean.place[2]) && std::isfinite(mean.rotation.m[0]);
}

// Fills the workspace's normal equations at the face, and their right side x, for step number `step`.
void SetUpStep(const Tools& tools, const Observation& seen, const KnownPerson* known, int step,
               Face* face, double* x) {
  Workspace* const work = tools.work;
  double* const a = work->normal;
  const bool pose_only = step < kPoseSteps;
  tools.kernels.face_points(tools.model, true, face, work);
  tools.kernels.residuals(tools.model, seen, pose_only ? kWideNoise : kFirstNoise, kNoiseInflation,
                          step > kPoseSteps, face, work);
  tools.kernels.linear_rows(seen, *face, work);
  AddExpressionLimits(face->mean, work);
  for (int i = 0; i < kMeasuredSize; i++) {
    for (int j = 0; j < kMeasuredSize; j++) {
      a[i * kMeasuredSize + j] = static_cast<double>(work->product[i][j]);
    }
    x[i] = static_cast<double>(work->gradient[i]);
  }
  for (int i = 0; i < kMotionSize; i++) {
    double& diagonal = a[i * (kMeasuredSize + 1)];
    diagonal = diagonal * (step <= kPoseSteps ? 1.05 : 1) + 1e-3;
  }
  AddPriors(known, face->mean, a, x);
  if (pose_only) {
    for (int i = kIdentityAt; i < kMeasuredSize; i++) a[i * (kMeasuredSize + 1)] += 1e6;
  }
}

// The robust cost of the face as it is, and for a stranger that of the identity.
float StartCost(const Tools& tools, const Observation& seen, const KnownPerson* known, Face* face) {
  const Workspace& work = *tools.work;
  tools.kernels.face_points(tools.model, false, face, tools.work);
  tools.kernels.residuals(tools.model, seen, kFirstNoise, kNoiseInflation, true, face, tools.work);
  double cost = 0;
  for (int i = 0; i < kMeasurementStride; i++) {
    if (!(seen.active[i] > 0)) continue;
    cost += static_cast<double>(kFreedom + 2) *
            std::log(1 + static_cast<double>(work.square[i]) / static_cast<double>(kFreedom));
  }
  if (known == nullptr) {
    for (const float value : face->mean.identity) {
      cost += static_cast<double>(value) * static_cast<double>(value);
    }
  }
  return std::isfinite(cost) && cost < static_cast<double>(kNoFit) ? static_cast<float>(cost)
                                                                   : kNoFit;
}

// Damped Gauss-Newton steps; ends before the last two once the face has settled, unless told to go
// to the end. Keeps the last normal equations in the workspace. Returns StartCost.
float FitSteps(const Tools& tools, const Observation& seen, const KnownPerson* known, int steps,
               bool to_the_end, Face* face) {
  Workspace* const work = tools.work;
  for (int step = 0; step < steps; step++) {
    double x[kMeasuredSize];
    SetUpStep(tools, seen, known, step, face, x);
    std::memcpy(work->last_normal, work->normal, sizeof(work->last_normal));
    if (!FactorSymmetric(work->normal, kMeasuredSize)) return kNoFit;
    SolveFactored(work->normal, kMeasuredSize, x);
    const double turn = std::sqrt(x[0] * x[0] + x[1] * x[1] + x[2] * x[2]);
    const auto longest = static_cast<double>(kLongestTurn);
    const double scale = turn > longest ? longest / turn : 1;
    float move[kMeasuredSize];
    for (int i = 0; i < kMeasuredSize; i++) move[i] = static_cast<float>(x[i] * scale);
    ApplyStep(move, &face->mean);
    if (!IsPlausible(face->mean)) return kNoFit;
    const bool settled = step > kPoseSteps && turn < static_cast<double>(kSmallTurn);
    if (settled && !to_the_end && step < steps - 2) break;
  }
  return StartCost(tools, seen, known, face);
}

// The covariance of the last fit; nothing is known of the movement.
bool SetCovariance(Workspace* work, Face* face) {
  if (!FactorSymmetric(work->last_normal, kMeasuredSize)) return false;
  InvertFactored(work->last_normal, kMeasuredSize, work->normal);
  std::memset(face->covariance, 0, sizeof(face->covariance));
  for (int i = 0; i < kMeasuredSize; i++) {
    for (int j = i; j < kMeasuredSize; j++) {
      const auto value = static_cast<float>(work->normal[i * kMeasuredSize + j]);
      face->covariance[i][j] = value;
      face->covariance[j][i] = value;
    }
  }
  for (int i = 0; i < kMotionSize; i++) {
    const bool turn = i < 3;
    face->covariance[kSpeedAt + i][kSpeedAt + i] = turn ? kFirstTurnSpeed : kFirstPlaceSpeed;
    face->covariance[kAccelerationAt + i][kAccelerationAt + i] =
        turn ? kFirstTurnAcceleration : kFirstPlaceAcceleration;
  }
  return true;
}

}  // namespace

float StartFace(const Tools& tools, const Observation& seen, const KnownPerson* known,
                StartScratch* scratch, Face* face) {
  const PoseGuess guess = GuessPose(tools.model, seen);
  const auto clear = [&] {
    ClearFace(known, face);
    std::memcpy(face->mean.place, guess.place, sizeof(guess.place));
  };
  clear();
  float best_cost = kNoFit;
  const float poor = kPoorStart * static_cast<float>(seen.count);
  for (const float yaw : {guess.yaw, 0.0f, 0.7f, -0.7f}) {
    Face* const trial = &scratch->trial;
    *trial = *face;
    const float about_v[3] = {0, yaw, 0};
    const float about_view[3] = {0, 0, guess.roll};
    trial->mean.rotation = TurnBy(about_view) * (TurnBy(about_v) * kFrontal);
    tools.kernels.make_personal(tools.model, trial);
    const float cost = FitSteps(tools, seen, known, kFirstSteps, false, trial);
    if (cost < best_cost) {
      best_cost = cost;
      scratch->best = *trial;
    }
    if (best_cost < poor) break;
  }
  if (best_cost < kNoFit) {
    *face = scratch->best;
    tools.kernels.make_personal(tools.model, face);
    const float cost = FitSteps(tools, seen, known, kLastSteps, true, face);
    face->valid = cost < kNoFit && SetCovariance(tools.work, face) && IsExplained(seen, *face);
    if (face->valid) return cost;
  }
  clear();
  return kNoFit;
}

}  // namespace n3ds::steady
