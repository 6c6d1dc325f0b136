// SPDX-License-Identifier: MIT
#include "steady/face_update.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "steady/dense_solver.h"
#include "steady/measurements.h"
#include "steady/quantile.h"
#include "steady/tuning.h"

namespace n3ds::steady {

namespace {

void PredictMean(const TimeStep& time, StateMean* mean) {
  float move[kMotionSize];
  for (int i = 0; i < kMotionSize; i++) {
    move[i] =
        time.place_by_speed * mean->speed[i] + time.place_by_acceleration * mean->acceleration[i];
    mean->speed[i] += time.speed_by_acceleration * mean->acceleration[i];
    mean->acceleration[i] *= time.acceleration_kept;
  }
  mean->rotation = TurnBy(move) * mean->rotation;
  for (int i = 0; i < 3; i++) mean->place[i] += move[3 + i];
  for (int j = 0; j < kExpressionCount; j++) {
    const float rest = RestOf(j);
    mean->expression[j] = rest + time.expression_kept * (mean->expression[j] - rest);
  }
}

void AddProcessNoise(const TimeStep& time, float (*c)[kStateStride]) {
  for (int k = kIdentityAt; k < kExpressionAt; k++) {
    c[k][k] += kIdentityNoise * kIdentityNoise * time.length;
  }
  for (int j = 0; j < kExpressionCount; j++) {
    const float noise = IsBlink(j) ? kBlinkNoise : kExpressionNoise;
    c[kExpressionAt + j][kExpressionAt + j] += noise * noise * time.expression_blur;
  }
  constexpr float kNoise[kMotionSize] = {kTurnNoise,  kTurnNoise,  kTurnNoise,
                                         kPlaceNoise, kPlaceNoise, kDepthNoise};
  constexpr int kBlurOf[3][3] = {{0, 1, 2}, {1, 3, 4}, {2, 4, 5}};
  for (int i = 0; i < kMotionSize; i++) {
    const int rows[3] = {i, kSpeedAt + i, kAccelerationAt + i};
    const float variance = kNoise[i] * kNoise[i];
    for (int a = 0; a < 3; a++) {
      for (int b = 0; b < 3; b++) c[rows[a]][rows[b]] += variance * time.blur[kBlurOf[a][b]];
    }
  }
}

// Rows and columns of pose, speed and acceleration, `scale` times as uncertain.
void WidenPose(float scale, float (*c)[kStateStride]) {
  const auto widen = [&](int k) {
    for (int j = 0; j < kStateStride; j++) c[k][j] *= scale;
    for (int j = 0; j < kStateSize; j++) c[j][k] *= scale;
  };
  for (int i = 0; i < kMotionSize; i++) widen(i);
  for (int i = kSpeedAt; i < kStateSize; i++) widen(i);
}

// What the measured state is ahead of another, in the coordinates of a step.
void StepBetween(const StateMean& from, const StateMean& to, float* step) {
  TurnOf(to.rotation * Transposed(from.rotation), step);
  for (int i = 0; i < 3; i++) step[3 + i] = to.place[i] - from.place[i];
  for (int k = 0; k < kIdentityCount; k++) {
    step[kIdentityAt + k] = to.identity[k] - from.identity[k];
  }
  for (int j = 0; j < kExpressionCount; j++) {
    step[kExpressionAt + j] = to.expression[j] - from.expression[j];
  }
}

// The mean square of the pose's step in units of its predicted deviation, from the first rows of
// the factor.
float PoseSurprise(const Workspace& work) {
  float y[kMotionSize];
  float sum = 0;
  for (int i = 0; i < kMotionSize; i++) {
    float t = work.step[i];
    for (int k = 0; k < i; k++) t -= work.factor[k][i] * y[k];
    y[i] = t / work.factor[i][i];
    sum += y[i] * y[i];
  }
  return sum / kMotionSize;
}

// The same, not divided, of the identity's step against its predicted covariance.
float IdentitySurprise(const float (*predicted)[kStateStride], const float* step) {
  double block[kIdentityCount * kIdentityCount];
  double x[kIdentityCount];
  for (int i = 0; i < kIdentityCount; i++) {
    for (int j = 0; j < kIdentityCount; j++) {
      block[i * kIdentityCount + j] =
          static_cast<double>(predicted[kIdentityAt + i][kIdentityAt + j]);
    }
    x[i] = static_cast<double>(step[i]);
  }
  if (!FactorSymmetric(block, kIdentityCount)) return 0;
  SolveFactored(block, kIdentityCount, x);
  double sum = 0;
  for (int i = 0; i < kIdentityCount; i++) sum += x[i] * static_cast<double>(step[i]);
  return static_cast<float>(sum);
}

// Gauss-Newton from the predicted state. When the pose turns out to have moved by much more than
// was predicted, the prediction is widened to what was seen and the step is taken again about the
// new state. Only while the face as a whole misfits: a few wrong points surprise nobody.
bool SolveState(const Tools& tools, const Observation& seen, const TimeStep& time, Face* face) {
  Workspace* const work = tools.work;
  const StateMean predicted = face->mean;
  float widening = 1;
  float misfit_at_prediction = 0;
  for (int solve = 0; solve < kMostSolves; solve++) {
    std::memcpy(work->factor, work->predicted, sizeof(work->predicted));
    if (widening > 1) WidenPose(std::sqrt(widening), work->factor);
    if (!tools.kernels.factor_covariance(work)) return false;
    tools.kernels.face_points(tools.model, true, face, work);
    tools.kernels.residuals(tools.model, seen, face->noise, time.inflation, true, face, work);
    tools.kernels.linear_rows(seen, *face, work);
    AddExpressionLimits(face->mean, work);
    if (solve == 0) {
      misfit_at_prediction = face->misfit_ratio;
    } else {
      float ahead[kMeasuredStride] = {};
      StepBetween(predicted, face->mean, ahead);
      for (int i = 0; i < kMeasuredSize; i++) {
        float pull = 0;
        for (int j = 0; j < kMeasuredSize; j++) pull += work->product[i][j] * ahead[j];
        work->gradient[i] += pull;
      }
    }
    if (!tools.kernels.solve_step(work)) return false;
    face->mean = predicted;
    ApplyStep(work->step, &face->mean);
    for (int i = 0; i < kMotionSize; i++) {
      face->mean.speed[i] += work->step[kSpeedAt + i];
      face->mean.acceleration[i] += work->step[kAccelerationAt + i];
    }
    const float surprise = PoseSurprise(*work);
    const bool again = surprise > kSurprise && widening < kMostSurprise && misfit_at_prediction > 1;
    if (!again) break;
    widening = std::min(kMostSurprise, widening * surprise);
  }
  return true;
}

constexpr int kInnerEnd = kLandmarkCount;

// The detector's noise, from a low quantile of what is left of the residuals: it holds with more
// than half of the points wrong.
void LearnNoise(const Observation& seen, const TimeStep& time, float pixels_per_mm,
                const Workspace& work, Face* face) {
  constexpr int kEnough = 40;
  float squares[2 * kLandmarkCount];
  const auto collect = [&](float trusted) {
    int count = 0;
    for (int i = kOutlineLandmarkCount; i < kInnerEnd; i++) {
      if (!(seen.active[i] > 0) || !(work.weight[i] > trusted)) continue;
      squares[count++] = work.residual_u[i] * work.residual_u[i];
      squares[count++] = work.residual_v[i] * work.residual_v[i];
    }
    return count;
  };
  int count = collect(kTrusted);
  if (count < kEnough) count = collect(-1);
  const auto rank = static_cast<int>(kQuantile * static_cast<float>(count));
  const float model = pixels_per_mm * pixels_per_mm * kModelNoise * kModelNoise * 0.5f;
  const float variance = SelectSmallest(squares, count, rank) / kQuantileOfOne - kRounding - model;
  const float rate =
      face->age < kNoiseWarmUp ? 1.0f / static_cast<float>(face->age + 2) : time.noise_rate;
  face->noise += (std::max(variance, kLeastNoise) - face->noise) * rate;
}

// Root mean square of the inner landmarks' residuals, px.
float Misfit(const Observation& seen, const Workspace& work) {
  float sum = 0;
  int count = 0;
  for (int i = kOutlineLandmarkCount; i < kInnerEnd; i++) {
    if (!(seen.active[i] > 0)) continue;
    sum += work.residual_u[i] * work.residual_u[i] + work.residual_v[i] * work.residual_v[i];
    count++;
  }
  return std::sqrt(sum / static_cast<float>(count));
}

// Near 1 where all inner landmarks lie as the detector's noise allows; the share of those that do,
// and less where the face as a whole does not fit.
float Confidence(const Observation& seen, const Workspace& work, const Face& face) {
  int count = 0;
  int trusted = 0;
  for (int i = kOutlineLandmarkCount; i < kInnerEnd; i++) {
    if (!(seen.active[i] > 0)) continue;
    count++;
    if (work.weight[i] > kOffsetTrusted) trusted++;
  }
  const float share = static_cast<float>(trusted) / static_cast<float>(count);
  return share * std::min(1.0f, kUsualMisfit / face.misfit_ratio);
}

bool IsFinite(const Face& face) {
  const StateMean& mean = face.mean;
  float sum = mean.rotation.m[0] + mean.rotation.m[4] + mean.rotation.m[8] + face.misfit_ratio;
  for (const float value : mean.place) sum += value;
  for (const float value : mean.identity) sum += value;
  for (const float value : mean.expression) sum += value;
  for (const auto& axis : face.point) {
    for (const float value : axis) sum += value;
  }
  return std::isfinite(sum) && std::fabs(mean.place[2]) < kFarthestLog;
}

}  // namespace

bool IsExplained(const Observation& seen, const Face& face) {
  const auto depth = static_cast<float>(std::exp(static_cast<double>(face.mean.place[2])));
  return face.misfit_ratio < kMostMisfit && depth > kNearestFace &&
         seen.focal / depth > kSmallestFace && SquaredIdentity(face.mean) < kUnlikeAnybody;
}

void ShowUnexplained(const Tools& tools, Face* face) {
  tools.kernels.face_points(tools.model, false, face, tools.work);
  face->confidence = 0;
}

void ApplyStep(const float* step, StateMean* mean) {
  mean->rotation = TurnBy(step) * mean->rotation;
  Orthonormalise(&mean->rotation);
  for (int i = 0; i < 3; i++) mean->place[i] += step[3 + i];
  for (int k = 0; k < kIdentityCount; k++) mean->identity[k] += step[kIdentityAt + k];
  for (int j = 0; j < kExpressionCount; j++) mean->expression[j] += step[kExpressionAt + j];
}

void AddExpressionLimits(const StateMean& mean, Workspace* work) {
  constexpr float kWeight = 1.0f / (kExpressionBarrier * kExpressionBarrier);
  for (int j = 0; j < kExpressionCount; j++) {
    if (IsSideways(j)) continue;
    const float value = mean.expression[j];
    const float lowest = IsBlink(j) ? kLowestBlink : kLowestExpression;
    const float limit = value < lowest ? lowest : kHighestExpression;
    if (value >= lowest && value <= kHighestExpression) continue;
    work->product[kExpressionAt + j][kExpressionAt + j] += kWeight;
    work->gradient[kExpressionAt + j] += kWeight * (limit - value);
  }
}

float FitCost(const Tools& tools, const Observation& seen, Face* face) {
  Workspace* const work = tools.work;
  tools.kernels.face_points(tools.model, false, face, work);
  tools.kernels.residuals(tools.model, seen, kFirstNoise, kNoiseInflation, true, face, work);
  constexpr float kBase = kNoiseInflation * (kFirstNoise + kRounding);
  double cost = 0;
  for (int i = 0; i < kMeasurementStride; i++) {
    if (!(seen.active[i] > 0)) continue;
    const auto square = static_cast<double>(work->square[i]);
    const float determinant = (work->noise_uu[i] + kBase) * (work->noise_vv[i] + kBase) -
                              work->noise_uv[i] * work->noise_uv[i];
    cost +=
        static_cast<double>(kFreedom + 2) * std::log(1 + square / static_cast<double>(kFreedom)) +
        std::log(std::max(static_cast<double>(determinant), 1e-6));
  }
  return static_cast<float>(cost);
}

Outcome UpdateFace(const Tools& tools, const Observation& seen, const TimeStep& time, Face* face) {
  Workspace* const work = tools.work;
  const StateMean before = face->mean;
  float moved = 0;
  for (int k = 0; k < kIdentityCount; k++) {
    moved = std::max(moved, std::fabs(face->mean.identity[k] - face->personal_identity[k]));
  }
  if (moved > kIdentityStep) tools.kernels.make_personal(tools.model, face);
  const bool tracked = face->age > 0;
  if (tracked) {
    PredictMean(time, &face->mean);
    tools.kernels.predict_covariance(time, face);
    std::memcpy(work->predicted, face->covariance, sizeof(work->predicted));
    AddProcessNoise(time, work->predicted);
    if (!SolveState(tools, seen, time, face)) return Outcome::kFailed;
  }
  tools.kernels.face_points(tools.model, false, face, work);
  tools.kernels.residuals(tools.model, seen, face->noise, time.inflation, true, face, work);
  if (!IsFinite(*face)) return Outcome::kFailed;
  if (!IsExplained(seen, *face)) {
    face->mean = before;
    std::fill_n(face->mean.speed, kMotionSize, 0.0f);
    std::fill_n(face->mean.acceleration, kMotionSize, 0.0f);
    if (tracked) std::memcpy(face->covariance, work->predicted, sizeof(face->covariance));
    face->misfit = Misfit(seen, *work);
    ShowUnexplained(tools, face);
    return Outcome::kUnexplained;
  }
  if (tracked) {
    tools.kernels.posterior(*work, face);
    face->identity_surprise = IdentitySurprise(work->predicted, work->step + kIdentityAt);
  }
  const auto depth = static_cast<float>(std::exp(static_cast<double>(face->mean.place[2])));
  const float pixels_per_mm = seen.focal / depth;
  face->misfit = Misfit(seen, *work);
  face->confidence = Confidence(seen, *work, *face);
  LearnNoise(seen, time, pixels_per_mm, *work, face);
  const float landmark_noise =
      time.offset_inflation *
      (face->noise + kRounding + pixels_per_mm * pixels_per_mm * kModelNoise * kModelNoise);
  tools.kernels.update_offsets(tools.model, time, landmark_noise, face, work);
  face->age++;
  return Outcome::kUpdated;
}

}  // namespace n3ds::steady
