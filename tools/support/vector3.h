// SPDX-License-Identifier: MIT
// Points and directions in space.
#pragma once

#include <array>
#include <cmath>
#include <cstddef>
#include <vector>

namespace n3ds::tool {

using Vector3 = std::array<double, 3>;
using Points = std::vector<Vector3>;

inline Vector3 operator-(const Vector3& a, const Vector3& b) {
  return {a[0] - b[0], a[1] - b[1], a[2] - b[2]};
}

inline Vector3& AddScaled(double factor, const Vector3& b, Vector3& sum) {
  for (std::size_t k = 0; k < 3; ++k) sum[k] += factor * b[k];
  return sum;
}

inline double Dot(const Vector3& a, const Vector3& b) {
  return a[0] * b[0] + a[1] * b[1] + a[2] * b[2];
}

inline Vector3 Cross(const Vector3& a, const Vector3& b) {
  return {a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2], a[0] * b[1] - a[1] * b[0]};
}

inline double Length(const Vector3& a) { return std::sqrt(Dot(a, a)); }

}  // namespace n3ds::tool
