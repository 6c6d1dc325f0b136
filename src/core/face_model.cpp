// SPDX-License-Identifier: MIT
#include "core/face_model.h"

#include <cstring>

#if __BYTE_ORDER__ != __ORDER_LITTLE_ENDIAN__
#error "the face model is copied from its little-endian file as it is"
#endif

namespace n3ds {

namespace {

// The file is little-endian, as every processor the engine runs on.
int32_t ReadInt32(const uint8_t* data) {
  int32_t value;
  std::memcpy(&value, data, sizeof(value));
  return value;
}

struct Arrays {
  int16_t* mean;
  int16_t* identity;
  int16_t* expression;
  int16_t* tensor;
};

int16_t* AllocateArray(MHandle memory, size_t count) {
  return static_cast<int16_t*>(MMemAlloc(memory, count * sizeof(int16_t)));
}

void Release(MHandle memory, const Arrays& arrays) {
  MMemFree(memory, arrays.mean);
  MMemFree(memory, arrays.identity);
  MMemFree(memory, arrays.expression);
  MMemFree(memory, arrays.tensor);
}

}  // namespace

int32_t LoadFaceModel(const uint8_t* data, size_t size, TrackingContext* context) {
  using Layout = FaceModelLayout;
  if (size != Layout::kSize) return N3DS_BAD_VALUE;
  if (ReadInt32(data + 4) != kIdentityCount || ReadInt32(data) != kVertexCount ||
      ReadInt32(data + 8) != kExpressionCount) {
    return N3DS_BAD_VALUE;
  }
  void* const memory = context->memory;
  const Arrays arrays = {
      AllocateArray(memory, Layout::kMean), AllocateArray(memory, Layout::kIdentity),
      AllocateArray(memory, Layout::kExpression), AllocateArray(memory, Layout::kTensor)};
  if (arrays.mean == nullptr || arrays.identity == nullptr || arrays.expression == nullptr ||
      arrays.tensor == nullptr) {
    Release(memory, arrays);
    return N3DS_NO_MEMORY;
  }
  std::memcpy(arrays.mean, data + Layout::kMeanOffset, Layout::kMean * sizeof(int16_t));
  std::memcpy(arrays.identity, data + Layout::kIdentityOffset, Layout::kIdentity * sizeof(int16_t));
  std::memcpy(arrays.expression, data + Layout::kExpressionOffset,
              Layout::kExpression * sizeof(int16_t));
  for (size_t i = 0; i < Layout::kTensor; ++i) {
    const auto step = static_cast<int8_t>(data[Layout::kTensorOffset + i]);
    arrays.tensor[i] = static_cast<int16_t>(step * kTensorStep);
  }
  ReleaseFaceModel(context);
  context->meanShape = arrays.mean;
  context->identityBasis = arrays.identity;
  context->expressionBasis = arrays.expression;
  context->tensor = arrays.tensor;
  return N3DS_OK;
}

void ReleaseFaceModel(TrackingContext* context) {
  Release(context->memory,
          {context->meanShape, context->identityBasis, context->expressionBasis, context->tensor});
  context->meanShape = nullptr;
  context->identityBasis = nullptr;
  context->expressionBasis = nullptr;
  context->tensor = nullptr;
}

}  // namespace n3ds
