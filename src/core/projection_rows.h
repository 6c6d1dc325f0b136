// SPDX-License-Identifier: MIT
// The perspective projection as linear equations in a vertex's position, for the fits of shape
// coefficients; all of them build their systems from these.
//
// A landmark at (u, v) and the vertex X it shows, moved by R and t, satisfy
//   (u - cx) (R2 X + tz) - fx (R0 X + tx) = 0   and   (v - cy) (R2 X + tz) - fy (R1 X + ty) = 0,
// with R0, R1, R2 the rows of R. A shape is a sum of basis vectors, so these are linear in its
// coefficients too. Model arrays stay in 16-bit fixed point with 8 fractional bits; a factor of
// 1/256 is a power of two, so where it is applied makes no difference to any bit.
#pragma once

#include <cstddef>
#include <cstdint>

#include "core/model_tables.h"
#include "core/vector3.h"

namespace n3ds {

// A vertex's vector in one component of the model, in 1/256 mm.
inline Vector3 VertexOf(const int16_t* component, int32_t vertex) {
  const int16_t* v = component + 3 * static_cast<ptrdiff_t>(vertex);
  return {static_cast<float>(v[0]), static_cast<float>(v[1]), static_cast<float>(v[2])};
}

// direction . X + constant = 0, X in mm.
struct ProjectionEquation {
  Vector3 direction;
  float constant;
};

// The equations of one landmark: along the image's x and y.
struct LandmarkEquations {
  ProjectionEquation x, y;
};

inline LandmarkEquations LineariseProjection(const float* camera, const float* rotation,
                                             const float* translation, float u, float v) {
  const Vector3 r0 = RowOf(rotation, 0), r1 = RowOf(rotation, 1), r2 = RowOf(rotation, 2);
  const float fx = camera[0], fy = camera[4];
  const float du = u - camera[2], dv = v - camera[5];
  return {{{du * r2.x - fx * r0.x, du * r2.y - fx * r0.y, du * r2.z - fx * r0.z},
           du * translation[2] - fx * translation[0]},
          {{dv * r2.x - fy * r1.x, dv * r2.y - fy * r1.y, dv * r2.z - fy * r1.z},
           dv * translation[2] - fy * translation[1]}};
}

// row[k] = direction . component k of the basis at the vertex, in mm, for several directions and
// their rows at once, so that each model value is converted once.
template <size_t kRows>
void ProjectBasis(const int16_t* basis, int count, int32_t vertex,
                  const Vector3* const (&directions)[kRows], float* const (&rows)[kRows]) {
  for (int k = 0; k < count; ++k) {
    const Vector3 component = VertexOf(basis + static_cast<ptrdiff_t>(k) * kShapeSize, vertex);
    for (size_t r = 0; r < kRows; ++r) rows[r][k] = Dot(*directions[r], component) * kModelUnit;
  }
}

// The equation's right-hand side after subtracting the mean shape's term.
inline float RightHandSide(const ProjectionEquation& equation, const Vector3& mean) {
  return -Dot(equation.direction, mean) * kModelUnit - equation.constant;
}

}  // namespace n3ds
