// SPDX-License-Identifier: MIT
// The pose solver with an account of how the solve went.
#pragma once

#include <cstdint>

#include "math/pose_residuals.h"

namespace n3ds {

// Why a solve ended.
enum class PoseSolverStop {
  kFailed,          // a status other than 0
  kGradient,        // max |g| <= 1e-5
  kStep,            // |h| <= 1e-5 (|pose| + 1e-5)
  kIterationLimit,  // 20 iterations
};

struct PoseSolverSummary {
  PoseSolverStop stop = PoseSolverStop::kFailed;
  int32_t iterations = 0;      // linear systems solved, or tried
  int32_t accepted_steps = 0;  // those that moved the pose
};

// SolveByLM for arguments that have been checked. `pose` has at least seven floats, and at least
// problem.parameter_count; the first parameter_count of them are fitted.
MRESULT SolvePose(MHandle memory, const PoseProblem& problem, float* pose,
                  PoseSolverSummary* summary);

}  // namespace n3ds
