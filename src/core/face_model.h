// SPDX-License-Identifier: MIT
// The face-model file: checks it and unpacks it into the context.
#pragma once

#include <cstddef>
#include <cstdint>

#include "core/tracking_context.h"

namespace n3ds {

// Layout of a face-model file, little-endian, without padding: vertex count, identity count and
// expression count (i32 each); mean shape, identity basis and expression basis (i16, 8 fractional
// bits, mm); interaction tensor (i8, steps of 40/256 mm), identity by expression by coordinate.
struct FaceModelLayout {
  static constexpr size_t kMean = kShapeSize;
  static constexpr size_t kIdentity = static_cast<size_t>(kIdentityCount) * kShapeSize;
  static constexpr size_t kExpression = static_cast<size_t>(kExpressionCount) * kShapeSize;
  static constexpr size_t kTensor = static_cast<size_t>(kIdentityCount) * kExpression;
  static constexpr size_t kMeanOffset = 3 * sizeof(int32_t);
  static constexpr size_t kIdentityOffset = kMeanOffset + kMean * sizeof(int16_t);
  static constexpr size_t kExpressionOffset = kIdentityOffset + kIdentity * sizeof(int16_t);
  static constexpr size_t kTensorOffset = kExpressionOffset + kExpression * sizeof(int16_t);
  static constexpr size_t kSize = kTensorOffset + kTensor;
};
static_assert(FaceModelLayout::kSize == N3DS_FACE_MODEL_BYTES);

// Units of 1/256 mm per step of the file's tensor.
constexpr int kTensorStep = 40;

// Replaces the context's model. Returns 0; -2 for a wrong size or header; -201. The context keeps
// the model it had when this fails.
int32_t LoadFaceModel(const uint8_t* data, size_t size, TrackingContext* context);

void ReleaseFaceModel(TrackingContext* context);

}  // namespace n3ds
