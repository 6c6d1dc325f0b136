/* SPDX-License-Identifier: MIT */
/* Tracks faces in a sequence of landmarks and prints the position and yaw of each head.
 *
 *   track_faces FACE_MODEL LANDMARKS
 *
 * A host has a camera and a face detector; here a text file replaces both: width, height and
 * landmarks per face, then for every frame the number of faces and x y of all their landmarks.
 * Compiles as C99. */
#include <math.h>
#include <stdio.h>

#include "norvale_3d_sticker_engine.h"

#define MAX_LANDMARKS N3DS_LANDMARKS_165

static __tag_point points[N3DS_MAX_FACES * MAX_LANDMARKS];
static float landmarks3d[N3DS_MAX_FACES][3 * MAX_LANDMARKS];

/* The next frame's landmarks; 0 at the end of the file. */
static int NextFrame(FILE* file, unsigned n_landmarks, unsigned* n_faces) {
  if (fscanf(file, "%u", n_faces) != 1 || *n_faces > N3DS_MAX_FACES) return 0;
  for (unsigned k = 0; k < *n_faces * n_landmarks; ++k) {
    if (fscanf(file, "%d %d", &points[k].x, &points[k].y) != 2) return 0;
  }
  return 1;
}

/* A renderer passes the three matrices to OpenGL. Here they are read: view * model takes points of
 * the head to the camera's OpenGL frame, in millimetres. */
static void PrintFace(int frame, unsigned index, const Norvale_3DSticker_Face_Matrix* face) {
  const float* m = face->modelMatrix;
  const float* v = face->viewMatrix;
  double yaw = atan2((double)m[8], (double)m[10]) * 180.0 / 3.14159265358979;
  printf("frame %d face %u: at %.0f %.0f %.0f mm, yaw %.1f degrees\n", frame, index,
         (double)(m[12] + v[12]), (double)(m[13] + v[13]), (double)(m[14] + v[14]), yaw);
}

int main(int argc, char** argv) {
  if (argc != 3) {
    fprintf(stderr, "usage: track_faces FACE_MODEL LANDMARKS\n");
    return 2;
  }
  FILE* file = fopen(argv[2], "r");
  NSVL_OFFSCREEN image = {0}; /* the engine reads the size only */
  unsigned n_landmarks = 0;
  if (file == NULL || fscanf(file, "%d %d %u", &image.width, &image.height, &n_landmarks) != 3 ||
      n_landmarks > MAX_LANDMARKS) {
    fprintf(stderr, "%s: not a landmark file\n", argv[2]);
    return 1;
  }

  /* One engine per camera: it keeps the tracks of the faces from frame to frame. */
  void* engine = Norvale_3DSticker_CreateEngine();
  MRESULT result = Norvale_3DSticker_Initialize(engine, argv[1], 0, 0);
  if (result != N3DS_OK) fprintf(stderr, "%s: cannot be loaded (%d)\n", argv[1], (int)result);

  /* The 3-D landmarks are written to the host's buffers. */
  Norvale_3DSticker_Matrix_Array out = {0};
  for (int i = 0; i < N3DS_MAX_FACES; ++i) out.faces[i].landmarks3D = landmarks3d[i];

  unsigned n_faces = 0;
  for (int frame = 0; result == N3DS_OK && NextFrame(file, n_landmarks, &n_faces); ++frame) {
    result =
        Norvale_3DSticker_Process(engine, &image, n_faces, n_landmarks, points, NULL, NULL, &out);
    if (result != N3DS_OK) {
      fprintf(stderr, "frame %d failed (%d)\n", frame, (int)result);
      break;
    }
    for (unsigned i = 0; i < out.faceNum; ++i) PrintFace(frame, i, &out.faces[i]);
  }

  Norvale_3DSticker_Uninitialize(engine);
  Norvale_3DSticker_DestroyEngine(engine);
  fclose(file);
  return result == N3DS_OK ? 0 : 1;
}
