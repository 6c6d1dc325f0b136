// SPDX-License-Identifier: MIT
// Points and directions in space. Sums are formed from left to right, each operation rounded: the
// order is part of every result.
#pragma once

#include <cstddef>

namespace n3ds {

struct Vector3 {
  float x, y, z;
};

inline float Dot(const Vector3& a, const Vector3& b) { return a.x * b.x + a.y * b.y + a.z * b.z; }

inline Vector3 Midpoint(const Vector3& a, const Vector3& b) {
  return {(a.x + b.x) * 0.5f, (a.y + b.y) * 0.5f, (a.z + b.z) * 0.5f};
}

// Element `index` of an array of x, y, z.
inline Vector3 VectorAt(const float* values, ptrdiff_t index) {
  const float* v = values + 3 * index;
  return {v[0], v[1], v[2]};
}

// Row of a row-major 3x3 matrix.
inline Vector3 RowOf(const float* matrix, int row) { return VectorAt(matrix, row); }

// Row-major 3x3 matrix times vector.
inline Vector3 Multiply(const float* matrix, const Vector3& v) {
  return {Dot(RowOf(matrix, 0), v), Dot(RowOf(matrix, 1), v), Dot(RowOf(matrix, 2), v)};
}

}  // namespace n3ds
