// SPDX-License-Identifier: MIT
// One face, one frame: predict the state, take the landmarks in, learn noise and offsets.
#pragma once

#include "steady/face.h"
#include "steady/kernels/kernels.h"
#include "steady/model.h"
#include "steady/time_step.h"
#include "steady/workspace.h"

namespace n3ds::steady {

// What every step works with. One thread has one.
struct Tools {
  const Model& model;
  const Kernels& kernels;
  Workspace* work;
};

enum class Outcome {
  kUpdated,
  kUnexplained,  // these are not the face's landmarks: the state is what it was, at rest
  kFailed,       // the arithmetic broke down: the state is of no use
};

// Brings the face to the frame's landmarks. A face of age 0, just started on the same frame, is not
// moved. Leaves the weights of the landmarks in the workspace, and the face's points, misfit and
// confidence up to date.
Outcome UpdateFace(const Tools& tools, const Observation& seen, const TimeStep& time, Face* face);

// True when enough of the landmarks lie where the face would have them, by the last residuals.
bool IsExplained(const Observation& seen, const Face& face);

// Sets the points of a face whose state is shown without landmarks behind it.
void ShowUnexplained(const Tools& tools, Face* face);

// Adds a step of the measured state, kMeasuredSize numbers.
void ApplyStep(const float* step, StateMean* mean);

// Keeps expressions in their range: adds to the products and the gradient of the workspace.
void AddExpressionLimits(const StateMean& mean, Workspace* work);

// How badly the face as it is fits the landmarks: robust cost plus the logarithms of what was
// allowed for. Differences of two faces' costs on the same landmarks are log likelihood ratios, by
// -2. Leaves residuals and weights in the workspace.
float FitCost(const Tools& tools, const Observation& seen, Face* face);

}  // namespace n3ds::steady
