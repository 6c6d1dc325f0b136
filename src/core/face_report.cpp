// SPDX-License-Identifier: MIT
#include "core/face_report.h"

#include "core/landmarks_3d.h"
#include "core/output_matrices.h"

namespace n3ds {

int32_t ReportFace(const TrackingContext& context, int32_t face, const int32_t extra_vertices[4],
                   N3DS_RIGID_MATRIX* record) {
  SplitModelView(context.rigidResult[face], record);
  const size_t first = 2 * static_cast<size_t>(context.landmarkNum) * static_cast<size_t>(face);
  const Landmark3DInput input = {context.pose[face], context.camera, context.shape[face],
                                 context.landmarkHistory + first, context.landmarkNum};
  return ComputeLandmarks3D(input, extra_vertices, record->landmarks3D);
}

MRESULT ReportRigidFaces(const TrackingContext& context, N3DS_RIGID_MATRIX* records,
                         int32_t face_count) {
  if (face_count < 0 || static_cast<uint32_t>(face_count) != context.faceNum) return N3DS_BAD_VALUE;
  for (int32_t k = 0; k < face_count; ++k) {
    const int32_t result = ReportFace(context, k, kRidgeVertexIndices, &records[k]);
    if (result != N3DS_OK) return result;
    for (size_t i = 0; i < context.landmarkNum; ++i) TiltPoint(records[k].landmarks3D + 3 * i);
  }
  return N3DS_OK;
}

}  // namespace n3ds
