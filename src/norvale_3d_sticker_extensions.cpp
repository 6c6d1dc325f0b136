// SPDX-License-Identifier: MIT
// The exported functions of the extensions: thin wrappers around the engine object.
#include "norvale_3d_sticker_extensions.h"

#include "norvale_face_shape_imp.h"

namespace {

constexpr const char* kExpressionNames[N3DS_EXPRESSION_COUNT] = {
#include "expression_names.inc"
};

CNorvaleFaceShapeImp* EngineOf(void* engine) { return static_cast<CNorvaleFaceShapeImp*>(engine); }

}  // namespace

MRESULT Norvale_3DSticker_SetOptions(void* engine, const Norvale_3DSticker_Options* options) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->extensions().SetOptions(options);
}

MRESULT Norvale_3DSticker_GetOptions(void* engine, Norvale_3DSticker_Options* options) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->extensions().GetOptions(options);
}

MRESULT Norvale_3DSticker_SetFrameTime(void* engine, int64_t nanoseconds) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->extensions().SetFrameTime(nanoseconds);
}

MRESULT Norvale_3DSticker_GetFaceStates(void* engine, Norvale_3DSticker_Face_State* states,
                                        uint32_t stateSize, uint32_t capacity, uint32_t* count) {
  if (engine == nullptr) return N3DS_NULL_ENGINE;
  return EngineOf(engine)->GetFaceStates(states, stateSize, capacity, count);
}

const char* Norvale_3DSticker_GetExpressionName(uint32_t index) {
  return index < N3DS_EXPRESSION_COUNT ? kExpressionNames[index] : nullptr;
}
