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

}  // namespace n3ds
