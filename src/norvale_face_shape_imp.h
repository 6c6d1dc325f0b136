// SPDX-License-Identifier: MIT
// The object behind the exported engine handle: owns the tracking core, the model's bytes, the
// orientation of the input and the output memory of mask mode.
//
// Its members are defined in norvale_face_shape_imp.cpp (initialisation, release, version),
// input_orientation.cpp, frame_processing.cpp (rigid frames) and mask_frame_processing.cpp.
#pragma once

#include <cstddef>
#include <cstdint>

#include "engine_extensions.h"
#include "norvale_3d_sticker_core.h"

namespace n3ds {
struct FrameRecords;
}

class CNorvaleFaceShapeImp {
 public:
  CNorvaleFaceShapeImp() = default;
  CNorvaleFaceShapeImp(const CNorvaleFaceShapeImp&) = delete;
  CNorvaleFaceShapeImp& operator=(const CNorvaleFaceShapeImp&) = delete;

  // Engine results as Norvale_3DSticker_* documents them.
  MRESULT Initialize(const char* path, unsigned int degree, unsigned int mirror);
  MRESULT InitializeEx(const unsigned char* data, unsigned int size, unsigned int degree,
                       unsigned int mirror);
  // Always 0. The spelling is part of the interface.
  MRESULT UnInitalize();
  void SetDegreeAndMirror(unsigned int degree, unsigned int mirror);
  static const Norvale_3DSticker_Version* GetVersion();

  MRESULT ProcessFace(NSVL_OFFSCREEN* image, unsigned int nFaces, unsigned int nLandmarks,
                      __tag_point* points, __tag_rect* rects, float* extra,
                      Norvale_3DSticker_Matrix_Array* out);
  MRESULT ProcessFaceMask(NSVL_OFFSCREEN* image, unsigned int nFaces, unsigned int nLandmarks,
                          __tag_point* points, __tag_rect* rects, float* extra,
                          Norvale_3DSticker_Matrix_Array* matrices,
                          Norvale_3DSticker_ModelInfo_Array* models);

  // What lies beyond the frame functions; `core` is null while uninitialised.
  n3ds::EngineExtensions& extensions() { return extensions_; }
  MRESULT GetFaceStates(Norvale_3DSticker_Face_State* states, unsigned int state_size,
                        unsigned int capacity, unsigned int* count) const {
    return extensions_.GetFaceStates(core, states, state_size, capacity, count);
  }

  // Maps one face's landmarks from the delivered image to the upright, unmirrored one, and
  // renumbers them when mirrored. `image` is the delivered image. Returns nonzero; 0, with nothing
  // written, when points or image are null or count is 0.
  int TransformInputInfo(NSVL_OFFSCREEN* image, unsigned int count, __tag_point* points,
                         N3DS_LANDMARK& out) const;

 private:
  static constexpr size_t kMaskVertexFloats = 3 * static_cast<size_t>(N3DS_MASK_CORNER_COUNT);
  static constexpr size_t kMaskTextureFloats = 2 * static_cast<size_t>(N3DS_MASK_CORNER_COUNT);

  using BuildFunction = MRESULT (*)(void* core, const NSVL_OFFSCREEN* image, N3DS_LANDMARK* faces,
                                    int32_t nFaces);

  // First half of a frame call, the same in both modes: maps the landmarks and runs a driver.
  // Returns 0, or 1 for any failure.
  MRESULT TrackFrame(BuildFunction build, NSVL_OFFSCREEN* image, unsigned int nFaces,
                     unsigned int nLandmarks, __tag_point* points, n3ds::FrameRecords* records);
  // Ends an initialisation: stores the orientation, or returns to the uninitialised state.
  MRESULT FinishInitialize(MRESULT result, unsigned int degree, unsigned int mirror);

  uint32_t degree = 0;   // clockwise rotation of the delivered image
  uint32_t mirror = 0;   // 1: mirrored
  void* core = nullptr;  // null while uninitialised
  // The model file's bytes; null while uninitialised. The core unpacks them into arrays of its own
  // and does not read them again; the engine keeps them for as long as it is initialised.
  uint8_t* modelBuffer = nullptr;
  n3ds::EngineExtensions extensions_;
  float maskVertices[N3DS_FACE_CAPACITY][kMaskVertexFloats] = {};
  float maskTexCoords[kMaskTextureFloats] = {};
};
