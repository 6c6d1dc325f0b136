// SPDX-License-Identifier: MIT
// The public headers serve a C++ host that links the shared library.
#include "norvale_3d_sticker_engine.h"
// The engine header above stands alone; the core header brings it along.
#include "norvale_3d_sticker_core.h"

int main() {
  void* engine = Norvale_3DSticker_CreateEngine();
  const unsigned char byte = 0;
  if (Norvale_3DSticker_InitializeEx(engine, &byte, 1, 0, 0) != N3DS_BAD_VALUE) return 1;
  Norvale_3DSticker_SetDegreeAndMirror(engine, 90, 1);
  const float identity[4] = {1, 0, 0, 0};
  float matrix[9];
  if (QuatToRotationMatrix(identity, matrix) != N3DS_OK || matrix[4] != 1.0f) return 2;
  Norvale_3DSticker_DestroyEngine(engine);
  return 0;
}
