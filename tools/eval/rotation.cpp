// SPDX-License-Identifier: MIT
#include "eval/rotation.h"

#include <cmath>
#include <cstddef>

namespace n3ds::tool {
namespace {

constexpr double kDegreesPerRadian = 57.295779513082320876798;

// Transposed inverse: the cofactors over the determinant.
Matrix3 InverseTransposed(const Matrix3& m) {
  Matrix3 cofactor = {
      m[4] * m[8] - m[5] * m[7], m[5] * m[6] - m[3] * m[8], m[3] * m[7] - m[4] * m[6],
      m[2] * m[7] - m[1] * m[8], m[0] * m[8] - m[2] * m[6], m[1] * m[6] - m[0] * m[7],
      m[1] * m[5] - m[2] * m[4], m[2] * m[3] - m[0] * m[5], m[0] * m[4] - m[1] * m[3]};
  const double det = m[0] * cofactor[0] + m[1] * cofactor[1] + m[2] * cofactor[2];
  for (double& value : cofactor) value /= det;
  return cofactor;
}

}  // namespace

Matrix3 Transposed(const Matrix3& m) {
  return {m[0], m[3], m[6], m[1], m[4], m[7], m[2], m[5], m[8]};
}

Matrix3 Multiplied(const Matrix3& a, const Matrix3& b) {
  Matrix3 product{};
  for (std::size_t r = 0; r < 3; ++r) {
    for (std::size_t c = 0; c < 3; ++c) {
      for (std::size_t k = 0; k < 3; ++k) product[3 * r + c] += a[3 * r + k] * b[3 * k + c];
    }
  }
  return product;
}

Vector3 Multiplied(const Matrix3& m, const Vector3& v) {
  return {m[0] * v[0] + m[1] * v[1] + m[2] * v[2], m[3] * v[0] + m[4] * v[1] + m[5] * v[2],
          m[6] * v[0] + m[7] * v[1] + m[8] * v[2]};
}

Matrix3 RotationAbout(const Vector3& axis, double degrees) {
  const double n = Length(axis);
  const double x = axis[0] / n;
  const double y = axis[1] / n;
  const double z = axis[2] / n;
  const double c = std::cos(degrees / kDegreesPerRadian);
  const double s = std::sin(degrees / kDegreesPerRadian);
  const double d = 1 - c;
  return {c + x * x * d,     x * y * d - z * s, x * z * d + y * s, y * x * d + z * s, c + y * y * d,
          y * z * d - x * s, z * x * d - y * s, z * y * d + x * s, c + z * z * d};
}

Vector3 RotationVector(const Matrix3& r) {
  // Sine from the skew part, cosine from the trace: the pair keeps small angles exact, where the
  // arc cosine alone would lose half the digits.
  Vector3 v = {r[7] - r[5], r[2] - r[6], r[3] - r[1]};
  const double twice_sine = Length(v);
  const double angle = std::atan2(twice_sine, r[0] + r[4] + r[8] - 1) * kDegreesPerRadian;
  if (twice_sine == 0) return {angle, 0, 0};  // 0, or half a turn whose axis is not needed here
  for (double& value : v) value *= angle / twice_sine;
  return v;
}

double RotationAngle(const Matrix3& rotation) { return Length(RotationVector(rotation)); }

Matrix3 MeanRotation(const std::vector<Matrix3>& rotations) {
  Matrix3 mean{};
  for (const Matrix3& rotation : rotations) {
    for (std::size_t i = 0; i < 9; ++i) mean[i] += rotation[i];
  }
  for (double& value : mean) value /= static_cast<double>(rotations.size());
  // Newton's iteration for the orthogonal factor; it doubles the digits in each round.
  constexpr int kRounds = 30;
  for (int round = 0; round < kRounds; ++round) {
    const Matrix3 other = InverseTransposed(mean);
    for (std::size_t i = 0; i < 9; ++i) mean[i] = (mean[i] + other[i]) / 2;
  }
  return mean;
}

}  // namespace n3ds::tool
