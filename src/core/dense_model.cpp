// SPDX-License-Identifier: MIT
#include "core/dense_model.h"

#include <algorithm>
#include <cstddef>
#include <limits>

#include "core/face_report.h"
#include "core/landmarks_3d.h"
#include "core/shape_sums.h"
#include "core/tracking_context.h"
#include "platform/integer_arithmetic.h"
#include "platform/scratch_array.h"

namespace n3ds {

namespace {

constexpr int kVerticesPerTask = kVertexCount / kMeshTasksPerFace;
static_assert(kVerticesPerTask * kMeshTasksPerFace == kVertexCount);

// Coordinates that are summed at a time: a task's whole range. The sums then stay in the first
// cache level (16 kB, on the worker's stack) while the model's vectors stream past.
constexpr int kBlock = 3 * kVerticesPerTask;

constexpr float kProductsPerUnit = 32768.0f;  // 15 fractional bits
constexpr float kProductUnit = 1.0f / kProductsPerUnit;

// sums[i] = sum of coefficients[k] * basis[k][first + i] over k in order, from 0.
template <int kCount>
void SumBasis(const float* coefficients, const int16_t* basis, ptrdiff_t first, int count,
              float* sums) {
  static_assert(kCount % kSumGroup == 0);
  std::fill_n(sums, count, 0.0f);
  for (int k = 0; k < kCount; k += kSumGroup) {
    const int16_t* vectors[kSumGroup];
    for (int g = 0; g < kSumGroup; ++g) {
      vectors[g] = basis + static_cast<ptrdiff_t>(k + g) * kShapeSize + first;
    }
    AddWeighted(coefficients + k, vectors, count, sums);
  }
}

// The interaction of identity and expression. Only pairs of even index sum take part, as in the
// expression fit, except that the last identity takes every expression here.
void SumInteraction(const int16_t* products, const int16_t* tensor, ptrdiff_t first, int count,
                    int32_t* sums) {
  std::fill_n(sums, count, 0);
  int16_t weights[kSumGroup] = {};
  const int16_t* vectors[kSumGroup] = {};
  int filled = 0;
  for (int k = 0; k < kIdentityCount; ++k) {
    const bool last = k == kIdentityCount - 1;
    for (int j = last ? 0 : k % 2; j < kExpressionCount; j += last ? 1 : 2) {
      const int pair = k * kExpressionCount + j;
      if (products[pair] == 0) continue;
      weights[filled] = products[pair];
      vectors[filled] = tensor + static_cast<ptrdiff_t>(pair) * kShapeSize + first;
      if (++filled == kSumGroup) {
        AddProducts(weights, vectors, count, sums);
        filled = 0;
      }
    }
  }
  if (filled == 0) return;
  for (int g = filled; g < kSumGroup; ++g) {
    weights[g] = 0;
    vectors[g] = vectors[0];
  }
  AddProducts(weights, vectors, count, sums);
}

void BuildBlock(const FaceMeshTask& task, ptrdiff_t first, int count) {
  float identity[kBlock];
  float expression[kBlock];
  int32_t interaction[kBlock];
  SumBasis<kIdentityCount>(task.identityCoef, task.identityBasis, first, count, identity);
  SumBasis<kExpressionCount>(task.expressionCoef, task.expressionBasis, first, count, expression);
  SumInteraction(task.products, task.tensor, first, count, interaction);
  const int16_t* mean = task.meanShape + first;
  float* shape = task.shape + first;
  for (int i = 0; i < count; ++i) {
    // The scale is a power of two, so this rounds once, where the integer becomes a float.
    const float product_sum = static_cast<float>(interaction[i]) * kProductUnit;
    shape[i] =
        (static_cast<float>(mean[i]) + identity[i] + expression[i] + product_sum) * kModelUnit;
  }
}

void FillTasks(TrackingContext* context, int32_t face, const int16_t* products,
               FaceMeshTask* tasks) {
  for (int quarter = 0; quarter < kMeshTasksPerFace; ++quarter) {
    tasks[quarter] = {context->meanShape,
                      context->identityBasis,
                      context->expressionBasis,
                      context->tensor,
                      context->identityCoef[face],
                      context->expressionCoef[face],
                      products,
                      static_cast<uint32_t>(quarter * kVerticesPerTask),
                      (quarter + 1) * kVerticesPerTask,
                      context->shape[face]};
  }
}

// Queues all tasks and waits for all of them even after a failure: workers still hold the records.
MRESULT RunTasks(TrackingContext* context, void* pool, int32_t face_count) {
  const auto task_count = static_cast<size_t>(face_count) * kMeshTasksPerFace;
  const ScratchArray<FaceMeshTask> tasks(context->memory, task_count);
  const ScratchArray<int32_t> ids(context->memory, task_count);
  const ScratchArray<int16_t> products(context->memory,
                                       static_cast<size_t>(kProductCount * face_count));
  if (!tasks || !ids || !products) return N3DS_NO_MEMORY;
  for (int32_t f = 0; f < face_count; ++f) {
    int16_t* table = products.get() + static_cast<ptrdiff_t>(f) * kProductCount;
    BuildProductTable(context->identityCoef[f], context->expressionCoef[f], table);
    FillTasks(context, f, table, tasks.get() + static_cast<ptrdiff_t>(f) * kMeshTasksPerFace);
  }
  for (size_t i = 0; i < task_count; ++i) {
    ids[i] = mcvAddTask(pool, _GetFace3DModel_Thread, &tasks[i]);
  }
  MRESULT result = N3DS_OK;
  for (size_t i = 0; i < task_count; ++i) {
    if (ids[i] < 0 || mcvWaitTask(pool, ids[i]) != 0) result = N3DS_NUMERICAL;
  }
  return result;
}

MRESULT BuildMeshes(TrackingContext* context, int32_t face_count) {
  void* pool =
      mcvParallelInit(context->memory, static_cast<uint32_t>(kMeshTasksPerFace * face_count));
  if (pool == nullptr) return N3DS_NUMERICAL;
  const MRESULT result = RunTasks(context, pool, face_count);
  if (mcvParallelUninit(pool) != 0 && result == N3DS_OK) return N3DS_BAD_VALUE;
  return result;
}

}  // namespace

void BuildProductTable(const float* identity, const float* expression, int16_t* products) {
  for (int k = 0; k < kIdentityCount; ++k) {
    for (int j = 0; j < kExpressionCount; ++j) {
      const int32_t product = TruncateToInt32(identity[k] * expression[j] * kProductsPerUnit);
      const auto wrapped = static_cast<int16_t>(static_cast<uint16_t>(product));
      products[k * kExpressionCount + j] =
          std::max<int16_t>(wrapped, -std::numeric_limits<int16_t>::max());
    }
  }
}

void* _GetFace3DModel_Thread(void* argument) {
  const FaceMeshTask& task = *static_cast<const FaceMeshTask*>(argument);
  const auto end = 3 * static_cast<ptrdiff_t>(task.endVertex);
  for (auto first = 3 * static_cast<ptrdiff_t>(task.firstVertex); first < end; first += kBlock) {
    BuildBlock(task, first, static_cast<int>(std::min<ptrdiff_t>(kBlock, end - first)));
  }
  return nullptr;
}

MRESULT ReportFaceModels(TrackingContext* context, N3DS_3D_MODEL* models,
                         N3DS_RIGID_MATRIX* records, int32_t face_count) {
  if (face_count < 0 || static_cast<uint32_t>(face_count) != context->faceNum) {
    return N3DS_BAD_VALUE;
  }
  if (!HasModel(*context)) return N3DS_NULL_ARGUMENT;
  // mcvParallelInit would take zero threads for as many as there are processors.
  if (face_count == 0) return N3DS_OK;

  MRESULT result = BuildMeshes(context, face_count);
  for (int32_t f = 0; f < face_count && result == N3DS_OK; ++f) {
    models[f] = {context->shape[f], N3DS_VERTEX_COUNT, &kTriangles[0][0], N3DS_TRIANGLE_COUNT};
    result = ReportFace(*context, f, kMaskExtraVertexIndices, &records[f]);
  }
  return result;
}

}  // namespace n3ds
