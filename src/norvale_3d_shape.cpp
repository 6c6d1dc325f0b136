// SPDX-License-Identifier: MIT
// The exported functions of the tracking core: the lifetime of a context, and thin wrappers.

// The system's assertion handler is declared only where assertions are on.
#undef NDEBUG
#include <cassert>
#include <cstring>

#include "core/dense_model.h"
#include "core/face_model.h"
#include "core/face_report.h"
#include "core/tracking_context.h"
#include "core/video_driver.h"
#include "norvale_3d_sticker_core.h"

namespace {

using n3ds::ContextOf;
using n3ds::TrackingContext;

// A host that cannot give the core its context has no engine to fall back on, so this stops the
// process through the system's assertion handler, in release builds too. The text, file and line of
// the message are part of the interface.
[[noreturn]] void FailAllocation() {
  constexpr const char* kFunction = "MRESULT N3DS_Init(MHandle, void**)";
  constexpr const char* kFile = "norvale_3d_shape";
  constexpr int kLine = 3221;
#ifdef __ANDROID__
  __assert2(kFile, kLine, kFunction, "context != nullptr");
#else
  __assert_fail("context != nullptr", kFile, kLine, kFunction);
#endif
}

}  // namespace

MRESULT N3DS_Init(MHandle memory, void** core) {
  if (core == nullptr) return N3DS_NULL_ARGUMENT;
  auto* context = static_cast<TrackingContext*>(MMemAlloc(memory, sizeof(TrackingContext)));
  if (context == nullptr) FailAllocation();
  std::memset(context, 0, sizeof(*context));
  context->memory = memory;
  *core = context;
  return N3DS_OK;
}

MRESULT N3DS_UnInit(void* core) {
  if (core == nullptr) return N3DS_OK;
  TrackingContext* context = ContextOf(core);
  n3ds::ReleaseFaceModel(context);
  MMemFree(context->memory, context->landmarkHistory);
  MMemFree(context->memory, context);
  return N3DS_OK;
}

MRESULT N3DS_LoadFaceHouse(void* core, const void* data, size_t size) {
  if (core == nullptr || data == nullptr) return N3DS_NULL_ARGUMENT;
  return n3ds::LoadFaceModel(static_cast<const uint8_t*>(data), size, ContextOf(core));
}

MRESULT N3DS_Build3DFaceForVideo_Rigid(void* core, const NSVL_OFFSCREEN* image,
                                       N3DS_LANDMARK* faces, int32_t nFaces) {
  if (core == nullptr || image == nullptr) return N3DS_NULL_ARGUMENT;
  return n3ds::BuildRigidFaces(ContextOf(core), *image, faces, nFaces);
}

MRESULT N3DS_Build3DFaceForVideo_Mask(void* core, const NSVL_OFFSCREEN* image, N3DS_LANDMARK* faces,
                                      int32_t nFaces) {
  if (core == nullptr || image == nullptr) return N3DS_NULL_ARGUMENT;
  return n3ds::BuildMaskFaces(ContextOf(core), *image, faces, nFaces);
}

MRESULT N3DS_GetRigidMatrix(void* core, N3DS_RIGID_MATRIX* records, int32_t nFaces) {
  if (core == nullptr || records == nullptr) return N3DS_NULL_ARGUMENT;
  return n3ds::ReportRigidFaces(*ContextOf(core), records, nFaces);
}

MRESULT N3DS_GetFace3DModel(void* core, N3DS_3D_MODEL* models, N3DS_RIGID_MATRIX* records,
                            int32_t nFaces) {
  if (core == nullptr || models == nullptr || records == nullptr) return N3DS_NULL_ARGUMENT;
  return n3ds::ReportFaceModels(ContextOf(core), models, records, nFaces);
}

int32_t N3DS_Get3DLandmarkNum(void* core) {
  if (core == nullptr) return N3DS_NULL_ARGUMENT;
  return static_cast<int32_t>(ContextOf(core)->landmarkNum);
}
