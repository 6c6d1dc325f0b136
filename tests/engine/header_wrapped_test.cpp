// SPDX-License-Identifier: MIT
// A C++ host that includes the headers inside its own extern "C", as many apps do with every C
// header, links all functions, those exported under C++ names included.
extern "C" {
#include "norvale_3d_sticker_core.h"
}

int main() {
  void* engine = Norvale_3DSticker_CreateEngine();
  const unsigned char byte = 0;
  if (Norvale_3DSticker_InitializeEx(engine, &byte, 1, 0, 0) != N3DS_BAD_VALUE) return 1;
  Norvale_3DSticker_SetDegreeAndMirror(engine, 90, 1);
  if (mcvDivf32(1.0f, 2.0f) != 0.5f) return 2;
  Norvale_3DSticker_DestroyEngine(engine);
  return 0;
}
