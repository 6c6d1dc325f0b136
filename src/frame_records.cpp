// SPDX-License-Identifier: MIT
#include "frame_records.h"

#include <cstddef>
#include <cstring>

namespace n3ds {

FrameRecords::FrameRecords() : matrices{} {
  for (int k = 0; k < N3DS_MAX_FACES; ++k) landmarks[k] = {points[k], 0};
  for (int k = 0; k < N3DS_FACE_CAPACITY; ++k) matrices[k].landmarks3D = landmarks_3d[k];
}

N3DS_LANDMARK& FrameRecords::PrepareFace(uint32_t k, uint32_t landmark_count) {
  std::memset(landmarks_3d[k], 0, 3 * sizeof(float) * landmark_count);
  landmarks[k].count = landmark_count;
  return landmarks[k];
}

NSVL_OFFSCREEN UprightImage(const NSVL_OFFSCREEN& image, uint32_t degree) {
  NSVL_OFFSCREEN upright = {};
  upright.pixelFormat = image.pixelFormat;
  const bool quarter_turn = degree == 90 || degree == 270;
  upright.width = quarter_turn ? image.height : image.width;
  upright.height = quarter_turn ? image.width : image.height;
  for (int i = 0; i < 2; ++i) {
    upright.plane[i] = image.plane[i];
    upright.pitch[i] = image.pitch[i];
  }
  return upright;
}

void ReportMatrices(const FrameRecords& records, uint32_t face_count, uint32_t landmark_count,
                    Norvale_3DSticker_Matrix_Array* out) {
  out->faceNum = face_count;
  for (uint32_t k = 0; k < face_count; ++k) {
    const N3DS_RIGID_MATRIX& from = records.matrices[k];
    Norvale_3DSticker_Face_Matrix& to = out->faces[k];
    std::memcpy(to.projectionMatrix, from.projectionMatrix, sizeof(to.projectionMatrix));
    std::memcpy(to.viewMatrix, from.viewMatrix, sizeof(to.viewMatrix));
    std::memcpy(to.modelMatrix, from.modelMatrix, sizeof(to.modelMatrix));
    std::memcpy(to.landmarks3D, from.landmarks3D, 3 * sizeof(float) * landmark_count);
  }
}

}  // namespace n3ds
