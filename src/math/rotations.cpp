// SPDX-License-Identifier: MIT
// Rotations as quaternions, matrices and Euler angles, and the inverse of a 3x3 matrix.
//
// Quaternions are w, x, y, z; matrices are row-major and act on column vectors; Euler angles are
// roll, pitch, yaw of R = Rz(yaw) Ry(pitch) Rx(roll). Every function reads all of its input before
// it writes, so input and output may be the same array.
#include <cmath>

#include "norvale_3d_sticker_core.h"

MRESULT QuatToRotationMatrix(const float* quat, float* matrix) {
  if (quat == nullptr || matrix == nullptr) return N3DS_NULL_ARGUMENT;
  const float w = quat[0], x = quat[1], y = quat[2], z = quat[3];
  const float ww = w * w, xx = x * x, yy = y * y, zz = z * z;
  const float wx = w * x, wy = w * y, wz = w * z;
  const float xy = x * y, xz = x * z, yz = y * z;
  // The diagonal is made of all four squares, not as 1 - 2 (y^2 + z^2): only so does a quaternion
  // that is not of unit length scale the whole matrix by |q|^2, which the pose solver relies on.
  matrix[0] = ww + xx - yy - zz;
  matrix[1] = 2.0f * (xy - wz);
  matrix[2] = 2.0f * (xz + wy);
  matrix[3] = 2.0f * (xy + wz);
  matrix[4] = ww - xx + yy - zz;
  matrix[5] = 2.0f * (yz - wx);
  matrix[6] = 2.0f * (xz - wy);
  matrix[7] = 2.0f * (yz + wx);
  matrix[8] = ww - xx - yy + zz;
  return N3DS_OK;
}

MRESULT RotationMatrixToQuat(const float* matrix, float* quat) {
  if (matrix == nullptr || quat == nullptr) return N3DS_NULL_ARGUMENT;
  const float m0 = matrix[0], m1 = matrix[1], m2 = matrix[2];
  const float m3 = matrix[3], m4 = matrix[4], m5 = matrix[5];
  const float m6 = matrix[6], m7 = matrix[7], m8 = matrix[8];

  // Four times the square of each component. Dividing by the largest keeps the others accurate.
  const float candidates[4] = {1.0f + m0 + m4 + m8, 1.0f + m0 - m4 - m8, 1.0f - m0 + m4 - m8,
                               1.0f - m0 - m4 + m8};
  int largest = 0;
  for (int i = 1; i < 4; ++i) {
    if (candidates[i] > candidates[largest]) largest = i;
  }

  const float t = candidates[largest];
  const float raw[4][4] = {{t, m7 - m5, m2 - m6, m3 - m1},
                           {m7 - m5, t, m1 + m3, m6 + m2},
                           {m2 - m6, m1 + m3, t, m5 + m7},
                           {m3 - m1, m6 + m2, m5 + m7, t}};
  const float scale = static_cast<float>(std::sqrt(0.25 / static_cast<double>(t)));
  for (int i = 0; i < 4; ++i) quat[i] = raw[largest][i] * scale;
  return N3DS_OK;
}

MRESULT QuatToEuler(const float* quat, float* euler) {
  if (quat == nullptr || euler == nullptr) return N3DS_NULL_ARGUMENT;
  const float w = quat[0], x = quat[1], y = quat[2], z = quat[3];
  const auto roll_sine = static_cast<double>(2.0f * (w * x + y * z));
  const auto roll_cosine = static_cast<double>(1.0f - 2.0f * (x * x + y * y));
  // Not clamped: a quaternion longer than 1 near gimbal lock gives a NaN pitch instead of passing
  // for a right angle.
  const auto pitch_sine = static_cast<double>(2.0f * (w * y - z * x));
  const auto yaw_sine = static_cast<double>(2.0f * (w * z + x * y));
  const auto yaw_cosine = static_cast<double>(1.0f - 2.0f * (y * y + z * z));
  euler[0] = static_cast<float>(std::atan2(roll_sine, roll_cosine));
  euler[1] = static_cast<float>(std::asin(pitch_sine));
  euler[2] = static_cast<float>(std::atan2(yaw_sine, yaw_cosine));
  return N3DS_OK;
}

MRESULT EulerToQuat(const float* euler, float* quat) {
  if (euler == nullptr || quat == nullptr) return N3DS_NULL_ARGUMENT;
  const auto roll = static_cast<double>(euler[0] * 0.5f);
  const auto pitch = static_cast<double>(euler[1] * 0.5f);
  const auto yaw = static_cast<double>(euler[2] * 0.5f);
  const double cr = std::cos(roll), sr = std::sin(roll);
  const double cp = std::cos(pitch), sp = std::sin(pitch);
  const double cy = std::cos(yaw), sy = std::sin(yaw);
  quat[0] = static_cast<float>(cr * cp * cy + sr * sp * sy);
  quat[1] = static_cast<float>(sr * cp * cy - cr * sp * sy);
  quat[2] = static_cast<float>(cr * sp * cy + sr * cp * sy);
  quat[3] = static_cast<float>(cr * cp * sy - sr * sp * cy);
  return N3DS_OK;
}

MRESULT MatrixInverse3X3(const float* matrix, float* inverse) {
  if (matrix == nullptr || inverse == nullptr) return N3DS_NULL_ARGUMENT;
  const float a = matrix[0], b = matrix[1], c = matrix[2];
  const float d = matrix[3], e = matrix[4], f = matrix[5];
  const float g = matrix[6], h = matrix[7], i = matrix[8];
  const float det = a * (e * i - f * h) - b * (d * i - f * g) + c * (d * h - e * g);
  // No tolerance: what is too small depends on the caller's units, so any other value is inverted.
  if (det == 0.0f) return N3DS_NUMERICAL;
  inverse[0] = (e * i - f * h) / det;
  inverse[1] = (c * h - b * i) / det;
  inverse[2] = (b * f - c * e) / det;
  inverse[3] = (f * g - d * i) / det;
  inverse[4] = (a * i - c * g) / det;
  inverse[5] = (c * d - a * f) / det;
  inverse[6] = (d * h - e * g) / det;
  inverse[7] = (b * g - a * h) / det;
  inverse[8] = (a * e - b * d) / det;
  return N3DS_OK;
}
