// Arithmetic of points and directions in space.
#pragma once

#include <cmath>
#include <cstddef>

#include "engine/face_model_file.h"

namespace n3ds::tool {

inline Point3 operator-(const Point3& a, const Point3& b) {
  return {a[0] - b[0], a[1] - b[1], a[2] - b[2]};
}

inline Point3& AddScaled(double factor, const Point3& b, Point3& sum) {
  for (std::size_t k = 0; k < 3; ++k) sum[k] += factor * b[k];
  return sum;
}

inline double Dot(const Point3& a, const Point3& b) {
  return a[0] * b[0] + a[1] * b[1] + a[2] * b[2];
}

inline Point3 Cross(const Point3& a, const Point3& b) {
  return {a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2], a[0] * b[1] - a[1] * b[0]};
}

inline double Length(const Point3& a) { return std::sqrt(Dot(a, a)); }

}  // namespace n3ds::tool
