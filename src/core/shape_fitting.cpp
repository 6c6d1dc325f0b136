// SPDX-License-Identifier: MIT
#include "core/shape_fitting.h"

#include "core/linear_system.h"
#include "core/model_tables.h"
#include "core/projection_rows.h"

namespace n3ds {
namespace {

constexpr int kLandmarkRows = 2 * kFitLandmarkCount;
constexpr int kIdentityRows = kLandmarkRows + kInnerLandmarkCount;
constexpr int kExpressionRows = kLandmarkRows + kExpressionCount;

// Weights of a depth error of 1 mm and of an expression coefficient (ridge), for an image whose
// longer side is 640 pixels. Residuals are pixels times mm of depth: at 800 mm, 3000 for a mm stands
// for 3.75 pixels.
constexpr float kDepthWeight = 3000.0f;
constexpr float kExpressionWeight = 10000.0f;

// Of a brow's ten points only the ends and two of the upper edge are reliable; they stand in for the
// others, so that a brow keeps its share of the system. The second half of the table is the first
// for the other brow, ten landmarks on.
struct Substitution {
  int landmark, stand_in;
};
constexpr Substitution kSubstitutions[] = {
    {20, 21}, {23, 22}, {25, 24}, {26, 24}, {27, 19}, {28, 19},
    {30, 31}, {33, 32}, {35, 34}, {36, 34}, {37, 29}, {38, 29},
};

// Whether a landmark's own observation counts.
struct ObservedLandmarks {
  bool of[kFitLandmarkCount];
  constexpr ObservedLandmarks() : of() {
    for (bool& value : of) value = true;
    for (const Substitution& s : kSubstitutions) of[s.landmark] = false;
  }
};
constexpr ObservedLandmarks kObserved;

// Substituted landmarks get the equations of their stand-ins.
template <int kColumns>
void Substitute(const LinearSystem<kColumns>& system) {
  for (const Substitution& s : kSubstitutions) {
    system.CopyTwoRows(2 * s.stand_in, 2 * s.landmark);
  }
}

// Adds the interaction of identity and expression to the expression columns: with identity
// coefficients a, expression j moves a vertex by E_j + sum of a_k T(k, j) over the k with k + j
// even; the model has no other pairs. Block by block of the tensor, which is far larger than any
// cache; each entry of A still takes its terms in increasing k.
void AddInteraction(const int16_t* tensor, const float* identity_coef,
                    const int32_t* landmark_vertices, const LandmarkEquations* equations,
                    const LinearSystem<kExpressionCount>& system) {
  for (int k = 0; k < kIdentityCount; ++k) {
    const float coefficient = identity_coef[k];
    if (coefficient == 0.0f) continue;
    for (int j = k % 2; j < kExpressionCount; j += 2) {
      const int16_t* block =
          tensor + (static_cast<ptrdiff_t>(k) * kExpressionCount + j) * kShapeSize;
      for (int i = 0; i < kFitLandmarkCount; ++i) {
        if (!kObserved.of[i]) continue;
        const int16_t* stored = block + 3 * static_cast<ptrdiff_t>(landmark_vertices[i]);
        if ((stored[0] | stored[1] | stored[2]) == 0) continue;  // most of the tensor is zero
        const Vector3 interaction = VertexOf(block, landmark_vertices[i]);
        float* entry = system.Row(2 * i) + j;
        entry[0] += coefficient * (Dot(equations[i].x.direction, interaction) * kModelUnit);
        entry[kExpressionCount] +=
            coefficient * (Dot(equations[i].y.direction, interaction) * kModelUnit);
      }
    }
  }
}

}  // namespace

int32_t SolveForIdentityCoef(MHandle memory, const float* points, const int16_t* mean_shape,
                             const int16_t* identity_basis, const float* camera,
                             const float* rotation, const float* translation, float* identity_coef,
                             const int32_t* landmark_vertices, float scale) {
  if (points == nullptr || mean_shape == nullptr || identity_basis == nullptr ||
      camera == nullptr || rotation == nullptr || translation == nullptr ||
      identity_coef == nullptr || landmark_vertices == nullptr) {
    return N3DS_NULL_ARGUMENT;
  }
  const LinearSystem<kIdentityCount> system(memory, kIdentityRows);
  if (!system) return N3DS_NO_MEMORY;

  const Vector3 depth = RowOf(rotation, 2);
  const float depth_weight = kDepthWeight * scale;
  for (int i = 0; i < kFitLandmarkCount; ++i) {
    const int32_t vertex = landmark_vertices[i];
    const float* point = points + 3 * i;
    const LandmarkEquations equations =
        LineariseProjection(camera, rotation, translation, point[0], point[1]);
    const Vector3 mean = VertexOf(mean_shape, vertex);
    float* row_x = system.Row(2 * i);
    float* row_y = system.Row(2 * i + 1);
    if (kObserved.of[i]) {
      system.RightSide(2 * i) = RightHandSide(equations.x, mean);
      system.RightSide(2 * i + 1) = RightHandSide(equations.y, mean);
    }
    if (i < kOutlineLandmarkCount) {
      ProjectBasis<2>(identity_basis, kIdentityCount, vertex,
                      {&equations.x.direction, &equations.y.direction}, {row_x, row_y});
      continue;
    }

    // An inner vertex should keep its depth: one view says little about it, and without these rows
    // the fit would explain the image by noses of any length.
    const int depth_index = kLandmarkRows + i - kOutlineLandmarkCount;
    float* depth_row = system.Row(depth_index);
    if (kObserved.of[i]) {
      ProjectBasis<3>(identity_basis, kIdentityCount, vertex,
                      {&equations.x.direction, &equations.y.direction, &depth},
                      {row_x, row_y, depth_row});
    } else {
      ProjectBasis<1>(identity_basis, kIdentityCount, vertex, {&depth}, {depth_row});
    }
    for (int k = 0; k < kIdentityCount; ++k) depth_row[k] *= depth_weight;
    system.RightSide(depth_index) =
        depth_weight * (point[2] - Dot(depth, mean) * kModelUnit - translation[2]);
  }
  Substitute(system);
  system.Solve(identity_coef);
  return N3DS_OK;
}

int32_t SolveForExpressionCoef(MHandle memory, const int32_t* landmarks, const int16_t* mean_shape,
                               const int16_t* identity_basis, const int16_t* expression_basis,
                               const int16_t* tensor, const float* camera, const float* rotation,
                               const float* translation, const float* identity_coef,
                               float* expression_coef, const int32_t* landmark_vertices,
                               float scale) {
  if (landmarks == nullptr || mean_shape == nullptr || identity_basis == nullptr ||
      expression_basis == nullptr || tensor == nullptr || camera == nullptr ||
      rotation == nullptr || translation == nullptr || identity_coef == nullptr ||
      expression_coef == nullptr || landmark_vertices == nullptr) {
    return N3DS_NULL_ARGUMENT;
  }
  const LinearSystem<kExpressionCount> system(memory, kExpressionRows);
  if (!system) return N3DS_NO_MEMORY;

  LandmarkEquations equations[kFitLandmarkCount];
  for (int i = 0; i < kFitLandmarkCount; ++i) {
    if (!kObserved.of[i]) continue;
    const int32_t vertex = landmark_vertices[i];
    equations[i] =
        LineariseProjection(camera, rotation, translation, static_cast<float>(landmarks[2 * i]),
                            static_cast<float>(landmarks[2 * i + 1]));
    const ProjectionEquation &x = equations[i].x, &y = equations[i].y;
    float* row_x = system.Row(2 * i);
    ProjectBasis<2>(expression_basis, kExpressionCount, vertex, {&x.direction, &y.direction},
                    {row_x, row_x + kExpressionCount});

    float along_x[kIdentityCount], along_y[kIdentityCount];
    ProjectBasis<2>(identity_basis, kIdentityCount, vertex, {&x.direction, &y.direction},
                    {along_x, along_y});
    float identity_x = 0.0f, identity_y = 0.0f;
    for (int k = 0; k < kIdentityCount; ++k) {
      identity_x += identity_coef[k] * along_x[k];
      identity_y += identity_coef[k] * along_y[k];
    }
    const Vector3 mean = VertexOf(mean_shape, vertex);
    system.RightSide(2 * i) = RightHandSide(x, mean) - identity_x;
    system.RightSide(2 * i + 1) = RightHandSide(y, mean) - identity_y;
  }
  AddInteraction(tensor, identity_coef, landmark_vertices, equations, system);
  Substitute(system);
  system.SetRidge(kLandmarkRows, kExpressionWeight * scale);
  system.Solve(expression_coef);
  return N3DS_OK;
}

}  // namespace n3ds
