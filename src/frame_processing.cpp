// SPDX-License-Identifier: MIT
// Rigid frames, and the tracking that both modes share.
#include "frame_records.h"
#include "norvale_face_shape_imp.h"

MRESULT CNorvaleFaceShapeImp::TrackFrame(BuildFunction build, NSVL_OFFSCREEN* image,
                                         unsigned int nFaces, unsigned int nLandmarks,
                                         __tag_point* points, n3ds::FrameRecords* records) {
  // Refused before any landmark is read: the core would refuse them too, but only after they were
  // copied into buffers of a fixed size.
  if (image == nullptr || nFaces > N3DS_MAX_FACES) return N3DS_FAILED;
  const NSVL_OFFSCREEN upright = n3ds::UprightImage(*image, degree);
  N3DS_LANDMARK* faces = nullptr;
  if (nFaces > 0 && points != nullptr) {
    if (!n3ds::FrameRecords::Holds(nLandmarks)) return N3DS_FAILED;
    for (unsigned int k = 0; k < nFaces; ++k) {
      N3DS_LANDMARK& face = records->PrepareFace(k, nLandmarks);
      __tag_point* first = points + static_cast<size_t>(k) * nLandmarks;
      // Fails for zero landmarks only, which the core refuses below.
      if (TransformInputInfo(image, nLandmarks, first, face) == 0) break;
    }
    faces = records->landmarks;
  }
  const MRESULT result =
      extensions_.TrackFrame(build, core, &upright, faces, static_cast<int32_t>(nFaces));
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
  if (extensions_.ReportRigid(core, records.matrices, static_cast<int32_t>(nFaces)) != N3DS_OK) {
    return N3DS_FAILED;
  }
  n3ds::ReportMatrices(records, nFaces, nLandmarks, out);
  return N3DS_OK;
}
