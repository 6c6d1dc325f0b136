// SPDX-License-Identifier: MIT
#include "steady/rotation.h"

#include <cmath>

namespace n3ds::steady {

Rotation operator*(const Rotation& a, const Rotation& b) {
  Rotation c;
  for (int i = 0; i < 3; i++) {
    for (int j = 0; j < 3; j++) {
      c.m[3 * i + j] =
          a.m[3 * i] * b.m[j] + a.m[3 * i + 1] * b.m[3 + j] + a.m[3 * i + 2] * b.m[6 + j];
    }
  }
  return c;
}

Rotation Transposed(const Rotation& a) {
  const float* m = a.m;
  return {{m[0], m[3], m[6], m[1], m[4], m[7], m[2], m[5], m[8]}};
}

Rotation TurnBy(const float* w) {
  // In double up to the last step: the sine of a small angle over the angle needs no series then.
  const double x = static_cast<double>(w[0]);
  const double y = static_cast<double>(w[1]);
  const double z = static_cast<double>(w[2]);
  const double square = x * x + y * y + z * z;
  const double angle = std::sqrt(square);
  const bool small = angle < 1e-8;
  const auto s = static_cast<float>(small ? 1 : std::sin(angle) / angle);
  const auto c = static_cast<float>(small ? 0.5 : (1 - std::cos(angle)) / square);
  const auto diagonal = static_cast<float>(small ? 1 : std::cos(angle));
  Rotation r;
  for (int i = 0; i < 3; i++) {
    for (int j = 0; j < 3; j++) r.m[3 * i + j] = c * w[i] * w[j] + (i == j ? diagonal : 0.0f);
  }
  r.m[1] -= s * w[2];
  r.m[3] += s * w[2];
  r.m[2] += s * w[1];
  r.m[6] -= s * w[1];
  r.m[5] -= s * w[0];
  r.m[7] += s * w[0];
  return r;
}

void TurnOf(const Rotation& r, float* w) {
  const float v[3] = {r.m[7] - r.m[5], r.m[2] - r.m[6], r.m[3] - r.m[1]};
  const float sine = 0.5f * std::sqrt(v[0] * v[0] + v[1] * v[1] + v[2] * v[2]);
  const float cosine = 0.5f * (r.m[0] + r.m[4] + r.m[8] - 1.0f);
  const auto angle =
      static_cast<float>(std::atan2(static_cast<double>(sine), static_cast<double>(cosine)));
  const float scale = sine < 1e-6f ? 0.5f : angle / (2.0f * sine);
  for (int i = 0; i < 3; i++) w[i] = scale * v[i];
}

void Orthonormalise(Rotation* r) {
  float* a = r->m;
  float* b = r->m + 3;
  float* c = r->m + 6;
  const float dot = a[0] * b[0] + a[1] * b[1] + a[2] * b[2];
  for (int i = 0; i < 3; i++) {
    const float x = a[i] - 0.5f * dot * b[i];
    const float y = b[i] - 0.5f * dot * a[i];
    a[i] = x;
    b[i] = y;
  }
  const float length_a = std::sqrt(a[0] * a[0] + a[1] * a[1] + a[2] * a[2]);
  const float length_b = std::sqrt(b[0] * b[0] + b[1] * b[1] + b[2] * b[2]);
  for (int i = 0; i < 3; i++) {
    a[i] /= length_a;
    b[i] /= length_b;
  }
  c[0] = a[1] * b[2] - a[2] * b[1];
  c[1] = a[2] * b[0] - a[0] * b[2];
  c[2] = a[0] * b[1] - a[1] * b[0];
}

}  // namespace n3ds::steady
