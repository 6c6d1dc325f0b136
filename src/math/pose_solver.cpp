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

// First damping, relative to the largest diagonal element of J^T J.
constexpr float kDampingSeed = 0.001f;
// The gradient's largest element that counts as zero.
constexpr float kGradientTolerance = 1e-5f;
// A step this small relative to the pose ends the solve; also keeps the bound above 0 for pose 0.
constexpr float kStepTolerance = 1e-5f;
constexpr int32_t kMaxIterations = 20;
// The damping shrinks by at most this after a step that did what the linear model promised.
constexpr float kSmallestShrink = 0.333f;
constexpr double kSmallestShrinkLimit = 0.333;
// Growth of the damping after the first rejected step; it doubles with each further one.
constexpr int32_t kFirstGrowth = 2;

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

}  // namespace

MRESULT SolvePose(MHandle memory, const PoseProblem& problem, float* pose,
                  PoseSolverSummary* summary) {
  const PoseResiduals residuals(problem);
  const int32_t parameters = problem.parameter_count;
  const size_t rows = 2 * static_cast<size_t>(problem.point_count);
  const size_t n = static_cast<size_t>(parameters);
  const size_t pose_size = std::max<size_t>(n, kPoseParameters);

  const ScratchArray<float> J(memory, rows * n);
  const ScratchArray<float> JtJ(memory, n * n);
  const ScratchArray<float> residuals_a(memory, rows);
  const ScratchArray<float> residuals_b(memory, rows);
  const ScratchArray<float> g(memory, n);
  // Not the usual code: hosts know a memory too small for the problem itself as a missing argument.
  if (!J || !JtJ || !residuals_a || !residuals_b || !g) return N3DS_NULL_ARGUMENT;
  const ScratchArray<float> A(memory, n * n);
  const ScratchArray<float> h(memory, n);
  const ScratchArray<float> trial(memory, pose_size);
  if (!A || !h || !trial) return N3DS_NO_MEMORY;
  // Parameters that the pose does not have get no derivative: their columns stay zero.
  if (parameters > kPoseParameters) J.Zero();

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
  float damping = kDampingSeed * LargestDiagonal(JtJ.get(), n);
  if (LargestMagnitude(g.get(), n) <= kGradientTolerance) {
    summary->stop = PoseSolverStop::kGradient;
    return N3DS_OK;
  }

  int32_t growth = kFirstGrowth;
  while (summary->iterations < kMaxIterations) {
    ++summary->iterations;
    std::copy_n(JtJ.get(), n * n, A.get());
    for (size_t j = 0; j < n; ++j) {
      A[j * n + j] += damping;
      // The stored gradient changes its sign on every pass, also after a rejected step. The pass
      // that follows a rejection therefore steps uphill; as a rule it is rejected in its turn, and
      // so a failing linear model raises the damping twice. Thresholds elsewhere are tuned to this.
      g[j] = -g[j];
    }
    status = SolveLinearAxb(memory, A.get(), parameters, parameters, h.get(), g.get());
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

    const float ratio = GainRatio(r, r_trial, rows, h.get(), g.get(), damping, n);
    if (!(ratio > 0.0f)) {  // also when it is not a number
      damping *= static_cast<float>(growth);
      growth *= 2;
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
    const float t = 2.0f * ratio - 1.0f;
    const float shrink = 1.0f - t * t * t;
    damping *= static_cast<double>(shrink) > kSmallestShrinkLimit ? shrink : kSmallestShrink;
    growth = kFirstGrowth;
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
  if (pointCount < 0 || paramCount < 0) return N3DS_BAD_VALUE;
  n3ds::PoseSolverSummary summary;
  return n3ds::SolvePose(memory,
                         {landmarks, modelPoints, pointCount, camera, contourWeight, rangeWeight,
                          weightingMode, innerWeight, paramCount},
                         pose, &summary);
}
