// SPDX-License-Identifier: MIT
#include "core/output_matrices.h"

#include <cstring>

#include "platform/integer_arithmetic.h"

namespace n3ds {

int32_t SolveForModelViewMatrix(const float* rotation, const float* translation, float* out) {
  if (rotation == nullptr || translation == nullptr || out == nullptr) return N3DS_NULL_ARGUMENT;
  const float* r = rotation;
  const float* t = translation;
  const float matrix[16] = {
      r[0], -r[3], -r[6], 0.0f,  //
      r[1], -r[4], -r[7], 0.0f,  //
      r[2], -r[5], -r[8], 0.0f,  //
      t[0], -t[1], -t[2], 1.0f,
  };
  std::memcpy(out, matrix, sizeof(matrix));
  return N3DS_OK;
}

int32_t SolveForProjectionMatrix(const float* camera, int32_t width, int32_t height, float near,
                                 float far, float* out) {
  if (camera == nullptr || out == nullptr) return N3DS_NULL_ARGUMENT;
  // Negated, so that a NaN plane is refused too.
  if (width < 1 || height < 1 || !(near > 0.0f && near < far)) return N3DS_BAD_VALUE;
  const auto w = static_cast<float>(width);
  const auto h = static_cast<float>(height);
  float matrix[16] = {};
  matrix[0] = 2.0f * camera[0] / w;
  matrix[5] = 2.0f * camera[4] / h;
  matrix[8] = static_cast<float>(1.0 - 2.0 * static_cast<double>(camera[2]) / width);
  matrix[9] = static_cast<float>(2.0 * static_cast<double>(camera[5]) / height - 1.0);
  matrix[10] = -(far + near) / (far - near);
  matrix[11] = -1.0f;
  matrix[14] = far * -2.0f * near / (far - near);
  std::memcpy(out, matrix, sizeof(matrix));
  return N3DS_OK;
}

void WriteModelViewAndProjection(const float* rotation, const float* translation,
                                 const float* camera, float* model_view, float* projection) {
  const int32_t width = WrapMultiply(2, TruncateToInt32(camera[2]));
  const int32_t height = WrapMultiply(2, TruncateToInt32(camera[5]));
  SolveForModelViewMatrix(rotation, translation, model_view);
  SolveForProjectionMatrix(camera, width, height, kNearPlane, kFarPlane, projection);
}

void SplitModelView(const N3DS_RIGID_MATRIX& result, N3DS_RIGID_MATRIX* out) {
  std::memcpy(out->modelMatrix, ModelViewOf(result), sizeof(out->modelMatrix));
  std::memcpy(out->projectionMatrix, result.projectionMatrix, sizeof(out->projectionMatrix));
  const float view[16] = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, -kViewDistance, 1};
  std::memcpy(out->viewMatrix, view, sizeof(view));
  for (int column = 0; column < 4; ++column) {
    float* c = out->modelMatrix + 4 * static_cast<ptrdiff_t>(column);
    c[2] += kViewDistance * c[3];
  }
}

void TiltRotation(const float* rotation, float* tilted) {
  for (int row = 0; row < 3; ++row) {
    const float e1 = rotation[3 * row];
    const float e2 = rotation[3 * row + 1];
    const float e3 = rotation[3 * row + 2];
    tilted[3 * row] = e1;
    tilted[3 * row + 1] = kTiltCosine * e2 - kTiltSine * e3;
    tilted[3 * row + 2] = kTiltSine * e2 + kTiltCosine * e3;
  }
}

void TiltPoint(float* point) {
  const float y = point[1];
  const float z = point[2];
  point[1] = kTiltCosine * y - kTiltSine * z;
  point[2] = kTiltSine * y + kTiltCosine * z;
}

}  // namespace n3ds
