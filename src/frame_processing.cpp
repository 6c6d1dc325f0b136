// SPDX-License-Identifier: MIT
#include "frame_processing.h"

#include <cstring>

#include "norvale_face_shape_imp.h"

namespace n3ds {

FrameRecords::FrameRecords() : landmarks_3d{}, matrices{} {
  for (int k = 0; k < N3DS_MAX_FACES; k++) landmarks[k] = {points[k], 0};
  for (int k = 0; k < N3DS_FACE_CAPACITY; k++) matrices[k].landmarks3D = landmarks_3d[k];
}

NSVL_OFFSCREEN UprightImage(const NSVL_OFFSCREEN& image, uint32_t degree) {
  NSVL_OFFSCREEN upright = {};
  upright.pixelFormat = image.pixelFormat;
  const bool quarter_turn = degree == 90 || degree == 270;
  upright.width = quarter_turn ? image.height : image.width;
  upright.height = quarter_turn ? image.width : image.height;
  for (int i = 0; i < 2; i++) {
    upright.plane[i] = image.plane[i];
    upright.pitch[i] = image.pitch[i];
  }
  return upright;
}

void ReportMatrices(const FrameRecords& records, uint32_t face_count, uint32_t landmark_count,
                    Norvale_3DSticker_Matrix_Array* out) {
  out->faceNum = face_count;
  for (uint32_t k = 0; k < face_count; k++) {
    const N3DS_RIGID_MATRIX& from = records.matrices[k];
    Norvale_3DSticker_Face_Matrix& to = out->faces[k];
    std::memcpy(to.projectionMatrix, from.projectionMatrix, sizeof(to.projectionMatrix));
    std::memcpy(to.viewMatrix, from.viewMatrix, sizeof(to.viewMatrix));
    std::memcpy(to.modelMatrix, from.modelMatrix, sizeof(to.modelMatrix));
    std::memcpy(to.landmarks3D, from.landmarks3D, 3 * sizeof(float) * landmark_count);
  }
}

}  // namespace n3ds

MRESULT CNorvaleFaceShapeImp::TrackFrame(BuildFunction build, NSVL_OFFSCREEN* image,
                                         unsigned int nFaces, unsigned int nLandmarks,
                                         __tag_point* points, n3ds::FrameRecords* records) const {
  // Refused before any landmark is read: the core would refuse them all the same, and a host's
  // wrong count says nothing about how many points there are.
  if (image == nullptr || nFaces > N3DS_MAX_FACES) return N3DS_FAILED;
  const NSVL_OFFSCREEN upright = n3ds::UprightImage(*image, degree);
  N3DS_LANDMARK* faces = nullptr;
  if (nFaces > 0 && points != nullptr) {
    if (nLandmarks > n3ds::kMaxLandmarkCount) return N3DS_FAILED;
    for (unsigned int k = 0; k < nFaces; k++) {
      N3DS_LANDMARK& face = records->landmarks[k];
      face.count = nLandmarks;
      __tag_point* first = points + static_cast<size_t>(k) * nLandmarks;
      if (TransformInputInfo(image, nLandmarks, first, face) == 0) break;
    }
    faces = records->landmarks;
  }
  const MRESULT result = build(core, &upright, faces, static_cast<int32_t>(nFaces));
  return result == N3DS_OK ? N3DS_OK : N3DS_FAILED;
}

MRESULT CNorvaleFaceShapeImp::ProcessFace(NSVL_OFFSCREEN* image, unsigned int nFaces,
                                          unsigned int nLandmarks, __tag_point* points,
                                          __tag_rect* /*rects*/, float* /*extra*/,
                                          Norvale_3DSticker_Matrix_Array* out) {
  if (out == nullptr || core == nullptr) return N3DS_NOT_INITIALIZED;
  n3ds::FrameRecords records;
  if (TrackFrame(N3DS_Build3DFaceForVideo_Rigid, image, nFaces, nLandmarks, points, &records) !=
      N3DS_OK) {
    return N3DS_FAILED;
  }
  if (N3DS_GetRigidMatrix(core, records.matrices, static_cast<int32_t>(nFaces)) != N3DS_OK) {
    return N3DS_FAILED;
  }
  n3ds::ReportMatrices(records, nFaces, nLandmarks, out);
  return N3DS_OK;
}
