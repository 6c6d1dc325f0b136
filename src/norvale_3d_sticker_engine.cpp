// SPDX-License-Identifier: MIT
// The exported engine functions: thin wrappers around the engine object.
#include "norvale_3d_sticker_engine.h"

#include "norvale_face_shape_imp.h"

namespace {

CNorvaleFaceShapeImp* EngineOf(void* engine) { return static_cast<CNorvaleFaceShapeImp*>(engine); }

}  // namespace

void* Norvale_3DSticker_CreateEngine(void) { return new CNorvaleFaceShapeImp; }

void Norvale_3DSticker_DestroyEngine(void* engine) {
  if (engine == nullptr) return;
  EngineOf(engine)->UnInitalize();
  delete EngineOf(engine);
}

MRESULT Norvale_3DSticker_Initialize(void* engine, const char* path, uint32_t degree,
                                     uint32_t mirror) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->Initialize(path, degree, mirror);
}

MRESULT Norvale_3DSticker_InitializeEx(void* engine, const unsigned char* data, uint32_t size,
                                       uint32_t degree, uint32_t mirror) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->InitializeEx(data, size, degree, mirror);
}

MRESULT Norvale_3DSticker_Uninitialize(void* engine) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->UnInitalize();
}

void Norvale_3DSticker_SetDegreeAndMirror(void* engine, uint32_t degree, uint32_t mirror) {
  if (engine == nullptr) return;
  EngineOf(engine)->SetDegreeAndMirror(degree, mirror);
}

MRESULT Norvale_3DSticker_Process(void* engine, NSVL_OFFSCREEN* image, uint32_t nFaces,
                                  uint32_t nLandmarks, __tag_point* points, __tag_rect* rects,
                                  float* extra, Norvale_3DSticker_Matrix_Array* out) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->ProcessFace(image, nFaces, nLandmarks, points, rects, extra, out);
}

MRESULT Norvale_3DSticker_Process_FaceMask(void* engine, NSVL_OFFSCREEN* image, uint32_t nFaces,
                                           uint32_t nLandmarks, __tag_point* points,
                                           __tag_rect* rects, float* extra,
                                           Norvale_3DSticker_Matrix_Array* matrices,
                                           Norvale_3DSticker_ModelInfo_Array* models) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->ProcessFaceMask(image, nFaces, nLandmarks, points, rects, extra,
                                           matrices, models);
}

const Norvale_3DSticker_Version* Norvale_3DSticker_GetVersion(void) {
  return CNorvaleFaceShapeImp::GetVersion();
}
