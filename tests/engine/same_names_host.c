/* SPDX-License-Identifier: MIT */
/* A host whose own functions happen to have the names of functions that the engine exports and
 * calls. The engine has to go on calling its own.
 *
 *   same_names_host FACE_MODEL */
#include <stdio.h>
#include <stdlib.h>

#include "norvale_3d_sticker_engine.h"

static void Foreign(const char* name) {
  fprintf(stderr, "the engine called the host's %s\n", name);
  exit(1);
}

#define FOREIGN(name) \
  __attribute__((visibility("default"))) void name(void) { Foreign(#name); }

void MMemAlloc(void);
void MMemFree(void);
void SolveByLM(void);
void MatDecompLU(void);
void QuatToRotationMatrix(void);
void mcvParallelInit(void);
void mcvAddTask(void);
FOREIGN(MMemAlloc)
FOREIGN(MMemFree)
FOREIGN(SolveByLM)
FOREIGN(MatDecompLU)
FOREIGN(QuatToRotationMatrix)
FOREIGN(mcvParallelInit)
FOREIGN(mcvAddTask)

/* Scattered points: every step of a frame is taken, whatever comes of it. */
static void MakeFace(__tag_point* points) {
  for (int k = 0; k < 101; ++k) {
    points[k].x = 540 + (k * 37) % 200;
    points[k].y = 260 + (k * 53) % 200;
  }
}

int main(int argc, char** argv) {
  if (argc != 2) return 2;
  static __tag_point points[101];
  static float landmarks3d[3 * 101];
  NSVL_OFFSCREEN image = {0};
  image.width = 1280;
  image.height = 720;
  MakeFace(points);

  void* engine = Norvale_3DSticker_CreateEngine();
  MRESULT result = Norvale_3DSticker_Initialize(engine, argv[1], 0, 0);
  for (int frame = 0; frame < 3 && result == N3DS_OK; ++frame) {
    Norvale_3DSticker_Matrix_Array out = {0};
    out.faces[0].landmarks3D = landmarks3d;
    result = Norvale_3DSticker_Process(engine, &image, 1, 101, points, NULL, NULL, &out);
  }
  Norvale_3DSticker_DestroyEngine(engine);
  if (result != N3DS_OK) fprintf(stderr, "result %d\n", (int)result);
  return result == N3DS_OK ? 0 : 1;
}
