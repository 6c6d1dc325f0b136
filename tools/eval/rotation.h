// SPDX-License-Identifier: MIT
// 3x3 rotations, row-major, in double: what judging poses needs and no more.
#pragma once

#include <array>
#include <vector>

#include "support/vector3.h"

namespace n3ds::tool {

using Matrix3 = std::array<double, 9>;

Matrix3 Transposed(const Matrix3& m);
Matrix3 Multiplied(const Matrix3& a, const Matrix3& b);
Vector3 Multiplied(const Matrix3& m, const Vector3& v);

// Rotation by `degrees` about an axis of any length but 0.
Matrix3 RotationAbout(const Vector3& axis, double degrees);

// The rotation vector (axis times angle in degrees) of a rotation, exact to rounding from 0 to just
// below 180 degrees.
Vector3 RotationVector(const Matrix3& rotation);
double RotationAngle(const Matrix3& rotation);  // degrees, 0 to 180

// The rotation with the smallest sum of squared (chordal) distances to all of `rotations`, of which
// there is at least one: the orthogonal factor of their sum.
Matrix3 MeanRotation(const std::vector<Matrix3>& rotations);

}  // namespace n3ds::tool
