// SPDX-License-Identifier: MIT
// Reports the matrices and 3-D landmarks of the last rigid frame.
#include "core/face_report.h"
#include "core/landmarks_3d.h"
#include "core/output_matrices.h"
#include "core/tracking_context.h"

MRESULT N3DS_GetRigidMatrix(void* core, N3DS_RIGID_MATRIX* records, int32_t nFaces) {
  if (core == nullptr || records == nullptr) return N3DS_NULL_ARGUMENT;
  const n3ds::TrackingContext& context = *n3ds::ContextOf(core);
  if (nFaces < 0 || static_cast<uint32_t>(nFaces) != context.faceNum) return N3DS_BAD_VALUE;
  for (int32_t k = 0; k < nFaces; k++) {
    const int32_t result = n3ds::ReportFace(context, k, n3ds::kRidgeVertexIndices, &records[k]);
    if (result != N3DS_OK) return result;
    for (uint32_t i = 0; i < context.landmarkNum; i++) {
      n3ds::TiltPoint(records[k].landmarks3D + 3 * static_cast<size_t>(i));
    }
  }
  return N3DS_OK;
}
