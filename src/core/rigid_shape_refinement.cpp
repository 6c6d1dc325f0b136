// SPDX-License-Identifier: MIT
#include "core/rigid_shape_refinement.h"

#include <algorithm>

#include "core/model_tables.h"
#include "core/projection_rows.h"
#include "platform/scratch_array.h"

namespace n3ds {
namespace {

// Prices of a coefficient, in a picture 640 wide or high.
constexpr float kIdentityWeight = 20000.0f;
constexpr float kExpressionWeight = 5000.0f;

// Share of the identity that stays.
constexpr double kKeptIdentity = 0.6;
constexpr double kNewIdentity = 0.4;

// The ends of the brows, and all of eyes, nose and mouth.
constexpr int kBrowEnds[] = {19, 24, 29, 34};
constexpr int kFirstEyeLandmark = 39;
constexpr int kExpressionLandmarkCount = 4 + kFitLandmarkCount - kFirstEyeLandmark;

// The pose and the landmarks that a system is built from.
struct View {
  const int32_t* landmarks;
  const int16_t* mean_shape;
  const float* camera;
  const float* rotation;
  const float* translation;
  const int32_t* landmark_vertices;
};

// Writes a landmark's two rows, `columns` long, and its two right-hand sides.
void AddLandmark(const View& view, int landmark, const int16_t* basis, int columns, float* rows,
                 float* b) {
  const int32_t vertex = view.landmark_vertices[landmark];
  const LandmarkEquations equations =
      LineariseProjection(view.camera, view.rotation, view.translation,
                          static_cast<float>(view.landmarks[2 * landmark]),
                          static_cast<float>(view.landmarks[2 * landmark + 1]));
  ProjectBasis<2>(basis, columns, vertex, {&equations.x.direction, &equations.y.direction},
                  {rows, rows + columns});
  const Vector3 mean = VertexOf(view.mean_shape, vertex);
  b[0] = RightHandSide(equations.x, mean);
  b[1] = RightHandSide(equations.y, mean);
}

// Writes `columns` rows that pull each coefficient toward zero.
void AddPrior(float weight, int columns, float* rows, float* b) {
  std::fill_n(rows, columns * columns, 0.0f);
  std::fill_n(b, columns, 0.0f);
  for (int k = 0; k < columns; ++k) rows[k * columns + k] = weight;
}

// Solves for the 16 coefficients of the outline; `solution` stays as it is when that fails.
void SolveIdentity(MHandle memory, const View& view, const int16_t* identity_basis, float scale,
                   float* solution) {
  constexpr int kPriorRow = 2 * kOutlineLandmarkCount;
  constexpr int kRows = kPriorRow + kIdentityCount;
  const ScratchArray<float> A(memory, static_cast<size_t>(kRows) * kIdentityCount);
  const ScratchArray<float> b(memory, kRows);
  if (!A || !b) return;
  for (int i = 0; i < kOutlineLandmarkCount; ++i) {
    AddLandmark(view, i, identity_basis, kIdentityCount, A.get() + 2 * i * kIdentityCount,
                b.get() + 2 * i);
  }
  AddPrior(kIdentityWeight * scale, kIdentityCount, A.get() + kPriorRow * kIdentityCount,
           b.get() + kPriorRow);
  SolveLinearAxb(memory, A.get(), kRows, kIdentityCount, solution, b.get());
}

}  // namespace

void RefitIdentityRigid(MHandle memory, const int32_t* landmarks, const int16_t* mean_shape,
                        const int16_t* identity_basis, const float* camera, const float* rotation,
                        const float* translation, const int32_t* landmark_vertices, float scale,
                        float* identity_coef) {
  float solution[kIdentityCount] = {};
  SolveIdentity(memory, {landmarks, mean_shape, camera, rotation, translation, landmark_vertices},
                identity_basis, scale, solution);
  // A solution that could not be had is blended in as zeros on purpose: an identity that the
  // pictures no longer support fades instead of staying for ever.
  for (int k = 0; k < kIdentityCount; ++k) {
    identity_coef[k] = static_cast<float>(kKeptIdentity * static_cast<double>(identity_coef[k]) +
                                          kNewIdentity * static_cast<double>(solution[k]));
  }
}

void RefitExpressionRigid(MHandle memory, const int32_t* landmarks, const int16_t* mean_shape,
                          const int16_t* expression_basis, const float* camera,
                          const float* rotation, const float* translation,
                          const int32_t* landmark_vertices, float scale, float* expression_coef) {
  if (mean_shape == nullptr || expression_basis == nullptr || expression_coef == nullptr) return;
  constexpr int kPriorRow = 2 * kExpressionLandmarkCount;
  constexpr int kRows = kPriorRow + kExpressionCount;
  const ScratchArray<float> A(memory, static_cast<size_t>(kRows) * kExpressionCount);
  const ScratchArray<float> b(memory, kRows);
  if (!A || !b) return;

  const View view = {landmarks, mean_shape, camera, rotation, translation, landmark_vertices};
  int row = 0;
  // The mean shape without the identity's part: what the identity leaves unexplained, the
  // expression may take up.
  const auto add = [&](int landmark) {
    AddLandmark(view, landmark, expression_basis, kExpressionCount,
                A.get() + row * kExpressionCount, b.get() + row);
    row += 2;
  };
  for (const int landmark : kBrowEnds) add(landmark);
  for (int landmark = kFirstEyeLandmark; landmark < kFitLandmarkCount; ++landmark) add(landmark);
  AddPrior(kExpressionWeight * scale, kExpressionCount, A.get() + kPriorRow * kExpressionCount,
           b.get() + kPriorRow);
  SolveLinearAxb(memory, A.get(), kRows, kExpressionCount, expression_coef, b.get());
}

}  // namespace n3ds
