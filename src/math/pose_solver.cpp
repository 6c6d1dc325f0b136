// SPDX-License-Identifier: MIT
// Levenberg-Marquardt with the gain-ratio damping of Madsen, Nielsen and Tingleff, "Methods for
// Non-Linear Least Squares Problems" (2004), algorithm 3.16.
#include "math/pose_solver.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "platform/scratch_array.h"

namespace n3ds {
namespace {

// Relative to the largest diagonal element of J^T J.
constexpr float kInitialDamping = 0.001f;
// The gradient's largest element that counts as zero.
constexpr float kGradientTolerance = 1e-5f;
// A step this small relative to the pose ends the solve; also keeps the bound above 0 for pose 0.
constexpr float kStepTolerance = 1e-5f;
constexpr int32_t kMaxIterations = 20;

float LargestDiagonal(const float* matrix, size_t n) {
  float largest = 0.0f;
  for (size_t i = 0; i < n; ++i) largest = std::max(largest, matrix[i * n + i]);
  return largest;
}

float LargestMagnitude(const float* vector, size_t n) {
  float largest = 0.0f;
  for (size_t i = 0; i < n; ++i) largest = std::max(largest, std::fabs(vector[i]));
  return largest;
}

float Norm(const float* vector, size_t n) {
  float sum = 0.0f;
  for (size_t i = 0; i < n; ++i) sum += vector[i] * vector[i];
  return std::sqrt(sum);
}

// The damping of the normal equations, by the gain ratio of the last step.
class Damping {
 public:
  explicit Damping(float value) : value_(value) {}

  float value() const { return value_; }
  // After a rejected step; the growth doubles from one rejection to the next.
  void Raise() {
    value_ *= static_cast<float>(growth_);
    growth_ *= 2;
  }
  // After an accepted step: up to twice as much when it gained little, a third when it gained all
  // that the linear model promised.
  void Lower(float ratio) {
    // The limit is the double 0.333, which a float exceeds exactly when it is not below 0.333f.
    constexpr float kSmallestShrink = 0.333f;
    static_assert(static_cast<double>(kSmallestShrink) > 0.333);
    const float t = 2.0f * ratio - 1.0f;
    value_ *= std::max(kSmallestShrink, 1.0f - t * t * t);
    growth_ = kFirstGrowth;
  }

 private:
  static constexpr int32_t kFirstGrowth = 2;

  float value_;
  int32_t growth_ = kFirstGrowth;
};

// What the step did to the sum of squares over what the linear model promised; the factors 1/2 of
// both are left out.
float GainRatio(const float* r, const float* r_new, size_t rows, const float* h, const float* g,
                float damping, size_t n) {
  float gain = 0.0f;
  for (size_t k = 0; k < rows; ++k) gain += r[k] * r[k] - r_new[k] * r_new[k];
  float promised = 0.0f;
  for (size_t j = 0; j < n; ++j) promised += h[j] * (damping * h[j] + g[j]);
  return gain / promised;
}

// h from (JtJ + damping I) h = -g. A is scratch of JtJ's size.
//
// The stored gradient changes its sign here on every pass, also after a rejected step. The pass
// that follows a rejection therefore steps uphill; it is usually rejected too, so one failure
// raises the damping twice.
MRESULT FindStep(MHandle memory, const float* JtJ, float damping, int32_t parameters, float* A,
                 float* g, float* h) {
  const size_t n = static_cast<size_t>(parameters);
  std::copy_n(JtJ, n * n, A);
  for (size_t j = 0; j < n; ++j) {
    A[j * n + j] += damping;
    g[j] = -g[j];
  }
  return SolveLinearAxb(memory, A, parameters, parameters, h, g);
}

}  // namespace

MRESULT SolvePose(MHandle memory, const PoseProblem& problem, float* pose,
                  PoseSolverSummary* summary) {
  const PoseResiduals residuals(problem);
  const int32_t parameters = problem.parameter_count;
  const size_t rows = 2 * static_cast<size_t>(problem.point_count);
  const size_t n = static_cast<size_t>(parameters);
  const size_t pose_size = std::max<size_t>(n, kPoseSize);

  const ScratchArray<float> J(memory, rows * n);
  const ScratchArray<float> JtJ(memory, n * n);
  const ScratchArray<float> residuals_a(memory, rows);
  const ScratchArray<float> residuals_b(memory, rows);
  const ScratchArray<float> g(memory, n);
  // This code, not N3DS_NO_MEMORY, is the documented result of the first allocations.
  if (!J || !JtJ || !residuals_a || !residuals_b || !g) return N3DS_NULL_ARGUMENT;
  const ScratchArray<float> A(memory, n * n);
  const ScratchArray<float> h(memory, n);
  const ScratchArray<float> trial(memory, pose_size);
  if (!A || !h || !trial) return N3DS_NO_MEMORY;
  // Parameters that the pose does not have get no derivative: their columns stay zero.
  if (parameters > kPoseSize) J.Zero();

  float* r = residuals_a.get();
  float* r_trial = residuals_b.get();

  MRESULT status = N3DS_OK;
  {
    const ScratchArray<float> Jt(memory, rows * n);
    status = residuals.Linearise(pose, r, J.get(), Jt.get());
    if (status != N3DS_OK) return status;
    if (!Jt) return N3DS_NO_MEMORY;
    residuals.FormNormalEquations(r, J.get(), Jt.get(), JtJ.get(), g.get());
  }
  Damping damping(kInitialDamping * LargestDiagonal(JtJ.get(), n));
  if (LargestMagnitude(g.get(), n) <= kGradientTolerance) {
    summary->stop = PoseSolverStop::kGradient;
    return N3DS_OK;
  }

  while (summary->iterations < kMaxIterations) {
    ++summary->iterations;
    status = FindStep(memory, JtJ.get(), damping.value(), parameters, A.get(), g.get(), h.get());
    if (status != N3DS_OK) return status;
    if (Norm(h.get(), n) <= kStepTolerance * (Norm(pose, n) + kStepTolerance)) {
      summary->stop = PoseSolverStop::kStep;
      return N3DS_OK;
    }

    std::copy_n(pose, pose_size, trial.get());
    for (size_t j = 0; j < n; ++j) trial[j] += h[j];
    // The derivatives come with the residuals: most steps are accepted, and then both are needed. J
    // is free to be overwritten, since a rejected step goes on with the old J^T J and g.
    const ScratchArray<float> Jt(memory, rows * n);
    status = residuals.Linearise(trial.get(), r_trial, J.get(), Jt.get());
    if (status != N3DS_OK) return status;

    const float ratio = GainRatio(r, r_trial, rows, h.get(), g.get(), damping.value(), n);
    if (!(ratio > 0.0f)) {  // also when it is NaN
      damping.Raise();
      continue;
    }

    std::copy_n(trial.get(), n, pose);
    std::swap(r, r_trial);
    ++summary->accepted_steps;
    if (!Jt) return N3DS_NO_MEMORY;
    residuals.FormNormalEquations(r, J.get(), Jt.get(), JtJ.get(), g.get());
    if (LargestMagnitude(g.get(), n) <= kGradientTolerance) {
      summary->stop = PoseSolverStop::kGradient;
      return N3DS_OK;
    }
    damping.Lower(ratio);
  }
  summary->stop = PoseSolverStop::kIterationLimit;
  return N3DS_OK;
}

}  // namespace n3ds

MRESULT SolveByLM(MHandle memory, const float* landmarks, const float* modelPoints,
                  int32_t pointCount, const float* camera, float* pose, float contourWeight,
                  float rangeWeight, int64_t weightingMode, float innerWeight, int32_t paramCount) {
  if (landmarks == nullptr || modelPoints == nullptr || camera == nullptr || pose == nullptr) {
    return N3DS_NULL_ARGUMENT;
  }
  if (pointCount < 0 || pointCount > n3ds::kMaxPoints || paramCount < 0) return N3DS_BAD_VALUE;
  n3ds::PoseSolverSummary summary;
  return n3ds::SolvePose(memory,
                         {landmarks, modelPoints, pointCount, camera, contourWeight, rangeWeight,
                          weightingMode, innerWeight, paramCount},
                         pose, &summary);
}
