// SPDX-License-Identifier: MIT
// The dense mesh of a face from its identity and expression coefficients.
#pragma once

#include <cstdint>

#include "core/tracking_context.h"

namespace n3ds {

constexpr int kProductCount = kIdentityCount * kExpressionCount;

// Vertex ranges that a face's mesh is built in, one task each.
constexpr int kMeshTasksPerFace = 4;

struct FaceMeshTask {
  const int16_t* meanShape;  // the model, 8 fractional bits
  const int16_t* identityBasis;
  const int16_t* expressionBasis;
  const int16_t* tensor;
  const float* identityCoef;
  const float* expressionCoef;
  const int16_t* products;  // the face's product table
  uint32_t firstVertex;
  int32_t endVertex;  // exclusive
  float* shape;       // the face's whole shape, mm; only the range is written
};

// Products identity[k] * expression[j] at k * 20 + j, with 15 fractional bits in 16: values outside
// -1..1 wrap, and -32768 becomes -32767.
void BuildProductTable(const float* identity, const float* expression, int16_t* products);

// Takes a FaceMeshTask, computes the vertices of its range and returns null.
void* _GetFace3DModel_Thread(void* task);

// As N3DS_GetFace3DModel documents it.
MRESULT ReportFaceModels(TrackingContext* context, N3DS_3D_MODEL* models,
                         N3DS_RIGID_MATRIX* records, int32_t face_count);

}  // namespace n3ds
