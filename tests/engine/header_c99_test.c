/* SPDX-License-Identifier: MIT */
/* The public headers serve a C99 host: each stands alone, and every function can be named. */
#include "norvale_3d_sticker_core.h"

int main(void) {
  void* engine = Norvale_3DSticker_CreateEngine();
  unsigned char byte = 0;
  Norvale_3DSticker_Matrix_Array out;
  if (engine == NULL) return 1;
  /* These two have C++ names in the library. */
  if (Norvale_3DSticker_InitializeEx(engine, &byte, 1, 0, 0) != N3DS_BAD_VALUE) return 2;
  if (Norvale_3DSticker_InitializeEx(NULL, &byte, 1, 0, 0) != N3DS_NULL_ENGINE) return 3;
  Norvale_3DSticker_SetDegreeAndMirror(engine, 90, 1);
  if (Norvale_3DSticker_Process(engine, NULL, 0, 101, NULL, NULL, NULL, &out) !=
      N3DS_NOT_INITIALIZED) {
    return 4;
  }
  if (mcvDivf32(1.0f, 2.0f) != 0.5f) return 5;
  Norvale_3DSticker_DestroyEngine(engine);
  return 0;
}
