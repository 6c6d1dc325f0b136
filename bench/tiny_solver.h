// SPDX-License-Identifier: MIT
// Ceres' TinySolver in float on the engine's pose problems, in a file of its own because Eigen
// chooses its instructions when it is compiled.
#pragma once

#include "math/pose_residuals.h"

namespace n3ds::bench {

constexpr int kTinyPoints = 95;  // TinySolver is compiled for this many
constexpr int kTinyResiduals = 2 * kTinyPoints;

// Both refine the seven parameters of the pose with the engine's tolerances and limit of passes,
// and return the passes they took.

// On the engine's own residuals and derivatives, so that only the loops differ.
int SolveTinyOnEngineResiduals(const PoseProblem& problem, float* pose);
// On the plain reprojection error, differentiated by the library, as a host would write it.
int SolveTinyOnReprojectionError(const PoseProblem& problem, float* pose);

}  // namespace n3ds::bench
