// SPDX-License-Identifier: MIT
// Mask frames: tracking, dense meshes, and the meshes unrolled for the renderer.
#include <cstring>

#include "frame_records.h"
#include "norvale_face_shape_imp.h"

namespace {

// One face's mesh as a plain triangle list: every corner carries a position of its own.
void UnrollMesh(const N3DS_3D_MODEL& model, float* corners) {
  for (int i = 0; i < N3DS_MASK_CORNER_COUNT; ++i) {
    const float* vertex = model.vertices + 3 * static_cast<ptrdiff_t>(model.triangles[i]);
    std::memcpy(corners + 3 * static_cast<ptrdiff_t>(i), vertex, 3 * sizeof(float));
  }
}

}  // namespace

MRESULT CNorvaleFaceShapeImp::ProcessFaceMask(NSVL_OFFSCREEN* image, unsigned int nFaces,
                                              unsigned int nLandmarks, __tag_point* points,
                                              __tag_rect* /*rects*/, float* /*extra*/,
                                              Norvale_3DSticker_Matrix_Array* matrices,
                                              Norvale_3DSticker_ModelInfo_Array* models) {
  if (core == nullptr || matrices == nullptr || models == nullptr) return N3DS_NOT_INITIALIZED;
  n3ds::FrameRecords records;
  if (TrackFrame(N3DS_Build3DFaceForVideo_Mask, image, nFaces, nLandmarks, points, &records) !=
      N3DS_OK) {
    return N3DS_FAILED;
  }
  N3DS_3D_MODEL meshes[N3DS_FACE_CAPACITY] = {};
  if (extensions_.ReportMask(core, meshes, records.matrices, static_cast<int32_t>(nFaces)) !=
      N3DS_OK) {
    return N3DS_FAILED;
  }
  // Without a face there is no mesh to count the corners of.
  if (nFaces > 0 && 3 * meshes[0].triangleCount != N3DS_MASK_CORNER_COUNT) return N3DS_FAILED;

  n3ds::ReportMatrices(records, nFaces, nLandmarks, matrices);
  models->modelNum = nFaces;
  for (unsigned int k = 0; k < nFaces; ++k) {
    UnrollMesh(meshes[k], maskVertices[k]);
    models->models[k] = {maskVertices[k], N3DS_MASK_CORNER_COUNT, maskTexCoords,
                         N3DS_MASK_CORNER_COUNT};
  }
  return N3DS_OK;
}
