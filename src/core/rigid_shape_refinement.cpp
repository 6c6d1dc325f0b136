// SPDX-License-Identifier: MIT
#include "core/rigid_shape_refinement.h"

#include "core/linear_system.h"
#include "core/model_tables.h"
#include "core/projection_rows.h"

namespace n3ds {
namespace {

// Regularisation weights of a coefficient (ridge), for an image whose longer side is 640 pixels.
constexpr float kIdentityWeight = 20000.0f;
constexpr float kExpressionWeight = 5000.0f;

// Shares of the identity so far and of this frame's.
constexpr double kOldIdentity = 0.6;
constexpr double kNewIdentity = 0.4;

// The ends of the brows, and all of eyes, nose and mouth.
constexpr int kBrowEnds[] = {19, 24, 29, 34};
constexpr int kFirstEyeLandmark = 39;
constexpr int kExpressionLandmarkCount = 4 + kFitLandmarkCount - kFirstEyeLandmark;

// Sets rows `row` and `row` + 1 to a landmark's two equations in the basis's coefficients.
template <int kColumns>
void SetLandmark(const RefitView& view, int landmark, const int16_t* basis, int row,
                 const LinearSystem<kColumns>& system) {
  const int32_t vertex = view.landmark_vertices[landmark];
  const LandmarkEquations equations =
      LineariseProjection(view.camera, view.rotation, view.translation,
                          static_cast<float>(view.landmarks[2 * landmark]),
                          static_cast<float>(view.landmarks[2 * landmark + 1]));
  ProjectBasis<2>(basis, kColumns, vertex, {&equations.x.direction, &equations.y.direction},
                  {system.Row(row), system.Row(row) + kColumns});
  const Vector3 mean = VertexOf(view.mean_shape, vertex);
  system.RightSide(row) = RightHandSide(equations.x, mean);
  system.RightSide(row + 1) = RightHandSide(equations.y, mean);
}

// Solves for the 16 coefficients of the outline; `solution` stays as it is when that fails.
void SolveIdentity(MHandle memory, const RefitView& view, const int16_t* identity_basis,
                   float* solution) {
  constexpr int kRidgeRow = 2 * kOutlineLandmarkCount;
  const LinearSystem<kIdentityCount> system(memory, kRidgeRow + kIdentityCount);
  if (!system) return;
  for (int i = 0; i < kOutlineLandmarkCount; ++i) {
    SetLandmark(view, i, identity_basis, 2 * i, system);
  }
  system.SetRidge(kRidgeRow, kIdentityWeight * view.scale);
  system.Solve(solution);
}

}  // namespace

void RefitIdentityRigid(MHandle memory, const RefitView& view, const int16_t* identity_basis,
                        float* identity_coef) {
  float solution[kIdentityCount] = {};
  SolveIdentity(memory, view, identity_basis, solution);
  // A failed solve counts as zeros, so an identity without support fades out.
  for (int k = 0; k < kIdentityCount; ++k) {
    identity_coef[k] = static_cast<float>(kOldIdentity * static_cast<double>(identity_coef[k]) +
                                          kNewIdentity * static_cast<double>(solution[k]));
  }
}

void RefitExpressionRigid(MHandle memory, const RefitView& view, const int16_t* expression_basis,
                          float* expression_coef) {
  if (view.mean_shape == nullptr || expression_basis == nullptr || expression_coef == nullptr) {
    return;
  }
  constexpr int kRidgeRow = 2 * kExpressionLandmarkCount;
  const LinearSystem<kExpressionCount> system(memory, kRidgeRow + kExpressionCount);
  if (!system) return;

  int row = 0;
  // The mean shape without the identity's part: the expression may take up what the identity leaves
  // unexplained.
  const auto set = [&](int landmark) {
    SetLandmark(view, landmark, expression_basis, row, system);
    row += 2;
  };
  for (const int landmark : kBrowEnds) set(landmark);
  for (int landmark = kFirstEyeLandmark; landmark < kFitLandmarkCount; ++landmark) set(landmark);
  system.SetRidge(kRidgeRow, kExpressionWeight * view.scale);
  system.Solve(expression_coef);
}

}  // namespace n3ds
