/* SPDX-License-Identifier: MIT */
/*
 * Norvale 3-D sticker engine: exported engine interface.
 *
 * The host runs its own face detector. Per camera frame it hands over an image descriptor and the
 * 2-D landmarks of up to five faces; the engine returns, per face, OpenGL matrices and 3-D
 * landmarks on which stickers (hats, glasses, masks) sit still, and in mask mode a dense face mesh
 * as well.
 *
 * Calling order (a whole program stands in examples/track_faces.c):
 *
 *   void* engine = Norvale_3DSticker_CreateEngine();
 *   if (Norvale_3DSticker_Initialize(engine, "face_model.bin", 0, 0) == N3DS_OK) {
 *     while (next_frame(&image, points, &face_count))
 *       if (Norvale_3DSticker_Process(engine, &image, face_count, 101, points, NULL, NULL,
 *                                     &matrices) == N3DS_OK)
 *         draw(&matrices);
 *     Norvale_3DSticker_Uninitialize(engine);
 *   }
 *   Norvale_3DSticker_DestroyEngine(engine);
 *
 * Frames (pictures in docs/coordinates.md):
 *   pixel    delivered picture, x right, y down, whole pixels, origin at the upper left corner
 *   upright  the same after un-mirroring and turning by `degree`; what the tracker works in
 *   camera   millimetres, x right, y down, z into the scene; vertical field of view
 *            2 atan(h / (w + h)) for an upright picture of w x h pixels
 *   model    millimetres, x to the image right of a frontal face, y up, z out of the face
 *   OpenGL   eye space of the matrices: x right, y up, z towards the viewer
 * All matrices are 16 floats, column-major, for column vectors: clip = projection * view * model *
 * p.
 *
 * Threads: a call works on threads of its own and returns when all of them are done; nothing runs
 * between calls. One engine must not be called from two threads at once; different engines are
 * independent. No function throws, except CreateEngine, which throws std::bad_alloc on exhaustion.
 *
 * Works for C99 and C++ hosts.
 */
#ifndef NORVALE_3D_STICKER_ENGINE_H
#define NORVALE_3D_STICKER_ENGINE_H

#include <stdint.h>

#define N3DS_API __attribute__((visibility("default")))

/* Result of a call: 0 is success. */
typedef int32_t MRESULT;

enum {
  N3DS_OK = 0,
  N3DS_FAILED = 1,          /* engine: the core failed, or a file could not be read */
  N3DS_NOT_INITIALIZED = 2, /* engine: not initialised, or an output record is missing */
  N3DS_NULL_ENGINE = 5,     /* engine: null engine handle */
  N3DS_NULL_ARGUMENT = -1,  /* core: null argument, or no model loaded */
  N3DS_BAD_VALUE = -2,      /* core: bad size, count or format */
  N3DS_NUMERICAL = -100,    /* core: zero depth, singular matrix, or a task pool error */
  N3DS_NO_MEMORY = -201     /* core: memory exhausted */
};

enum {
  N3DS_MAX_FACES = 5,              /* faces a frame call accepts */
  N3DS_LANDMARKS_101 = 101,        /* landmarks per face: the short layout */
  N3DS_LANDMARKS_165 = 165,        /* landmarks per face: the long layout; no other is accepted */
  N3DS_VERTEX_COUNT = 1812,        /* vertices of the face model */
  N3DS_TRIANGLE_COUNT = 3456,      /* triangles of the face model */
  N3DS_MASK_CORNER_COUNT = 10368,  /* corners of the unrolled mask mesh: 3 per triangle */
  N3DS_FACE_MODEL_BYTES = 2141796, /* size of a face-model file */
  N3DS_FACE_CAPACITY = 10          /* entries declared in the output records */
};

/* Pixel format codes of the image functions; the frame calls carry the code along uninterpreted. */
enum {
  N3DS_FORMAT_BGR24 = 513,  /* 3 bytes a pixel: blue, green, red */
  N3DS_FORMAT_BGRA32 = 770, /* 4 bytes a pixel: blue, green, red, alpha */
  N3DS_FORMAT_NV21 = 2050   /* a luma plane, then half-size chroma pairs, V before U */
};

/* Image descriptor, filled and owned by the host, only read. The frame calls use width and height
 * alone (each at least 1); they never touch the pixels, so the planes may be null. */
typedef struct NSVL_OFFSCREEN {
  uint32_t pixelFormat; /* N3DS_FORMAT_* */
  int32_t width;        /* pixels, as the camera delivers the picture, before it is turned */
  int32_t height;       /* pixels */
  uint8_t* plane[4];    /* pixel planes */
  int32_t pitch[4];     /* bytes from one row to the next, per plane */
} NSVL_OFFSCREEN;

/* A landmark in pixels of the delivered picture; it may lie outside of it. */
typedef struct __tag_point { /* NOLINT(bugprone-reserved-identifier): the interface's own name */
  int32_t x;
  int32_t y;
} __tag_point;

/* A face rectangle in pixels of the delivered picture. */
typedef struct __tag_rect { /* NOLINT(bugprone-reserved-identifier): the interface's own name */
  int32_t left;
  int32_t top;
  int32_t right;
  int32_t bottom;
} __tag_rect;

/* What a renderer needs for one face. */
typedef struct Norvale_3DSticker_Face_Matrix {
  float projectionMatrix[16]; /* perspective, near 1 mm, far 5000 mm */
  float viewMatrix[16];       /* fixed: identity, but z translation -500 */
  float modelMatrix[16];      /* model frame (mm) to 500 mm before the viewer's origin */
  float* landmarks3D; /* host's buffer of 3 * nLandmarks floats, set before the call: x, y, z per
                         landmark, mm. Rigid mode: in the frame of modelMatrix. The pointer itself
                         is never changed. */
} Norvale_3DSticker_Face_Matrix;

/* Output of a frame call, owned by the host. faces[k] belongs to the k-th face passed in. */
typedef struct Norvale_3DSticker_Matrix_Array {
  uint32_t faceNum; /* faces written; untouched when the call fails */
  Norvale_3DSticker_Face_Matrix faces[N3DS_FACE_CAPACITY];
} Norvale_3DSticker_Matrix_Array;

/* One face's mask mesh, as an unrolled triangle list. Both arrays belong to the engine and stay
 * valid until its next frame call, Uninitialize or DestroyEngine. */
typedef struct Norvale_3DSticker_Face_Model {
  float* vertices;     /* vertexNum corners, x, y, z each, mm */
  int32_t vertexNum;   /* 10368 */
  float* texCoords;    /* texCoordNum pairs u, v in 0..1, v down; the same table for every face */
  int32_t texCoordNum; /* 10368 (pairs, not floats) */
} Norvale_3DSticker_Face_Model;

/* Meshes of a mask frame, owned by the host. models[k] belongs to the k-th face passed in. */
typedef struct Norvale_3DSticker_ModelInfo_Array {
  uint32_t modelNum; /* meshes written; untouched when the call fails */
  Norvale_3DSticker_Face_Model models[N3DS_FACE_CAPACITY];
} Norvale_3DSticker_ModelInfo_Array;

/* Version of the library; static storage. */
typedef struct Norvale_3DSticker_Version {
  int64_t major;           /* 1 */
  int64_t minor;           /* 1 */
  int64_t build;           /* 12021 */
  int64_t revision;        /* 63 */
  const char* versionText; /* "Norvale_3DSticker_1.1.12021.63" */
  const char* buildDate;   /* "06/19/2018", month/day/year */
  const char* notice;      /* notice text */
} Norvale_3DSticker_Version;

#ifdef __cplusplus
extern "C" {
#endif

/* Creates an engine, uninitialised. The host frees it with Norvale_3DSticker_DestroyEngine.
 * Throws std::bad_alloc when memory is exhausted; never returns null. */
N3DS_API void* Norvale_3DSticker_CreateEngine(void);

/* Uninitialises and frees an engine. Null: nothing. */
N3DS_API void Norvale_3DSticker_DestroyEngine(void* engine);

/* Loads a face model and makes the engine ready for frames. An initialised engine must be
 * uninitialised first: no earlier model is released here.
 *   path    face-model file (data/face_model.bin, format in docs/face-model.md)
 *   degree  clockwise turn of the delivered picture: 0, 90, 180 or 270
 *   mirror  1 for a mirrored (front camera) picture, anything else for none
 * Returns 0; 5 null engine; 1 path null, unreadable or short; -1, -2 or -201 when the file is no
 * face model or memory is exhausted. After a failure the engine is uninitialised. */
N3DS_API MRESULT Norvale_3DSticker_Initialize(void* engine, const char* path, uint32_t degree,
                                              uint32_t mirror);

/* Releases the model and all tracks; the engine may be initialised again. Returns 0; 5 null engine.
 */
N3DS_API MRESULT Norvale_3DSticker_Uninitialize(void* engine);

/* Rigid mode: tracks the heads of one frame.
 *   image      descriptor of the delivered picture; only width and height matter
 *   nFaces     0 to 5; 0 ends all tracks
 *   nLandmarks 101 or 165, the same over the life of an initialised engine (layout in
 *              docs/coordinates.md)
 *   points     nFaces * nLandmarks landmarks, face after face; only read; may be null if nFaces is
 * 0 rects      accepted and not read; may be null extra      accepted and not read; may be null out
 * receives one entry per face, in the order of the input Frames are one sequence in time: each call
 * continues the tracks of the one before. A host keeps one engine to one mode. Returns 0; 5 null
 * engine; 2 not initialised or out null; 1 image null, bad counts or sizes, points null with nFaces
 * > 0, or a failure inside. A failed call leaves out untouched. */
N3DS_API MRESULT Norvale_3DSticker_Process(void* engine, NSVL_OFFSCREEN* image, uint32_t nFaces,
                                           uint32_t nLandmarks, __tag_point* points,
                                           __tag_rect* rects, float* extra,
                                           Norvale_3DSticker_Matrix_Array* out);

/* Mask mode: as Norvale_3DSticker_Process, and fits the shape of each face, returned as a mesh.
 *   matrices  as out above; landmarks3D are in the frame of the mesh
 *   models    receives one mesh per face
 * Returns as Norvale_3DSticker_Process; 2 also when models is null. */
N3DS_API MRESULT Norvale_3DSticker_Process_FaceMask(void* engine, NSVL_OFFSCREEN* image,
                                                    uint32_t nFaces, uint32_t nLandmarks,
                                                    __tag_point* points, __tag_rect* rects,
                                                    float* extra,
                                                    Norvale_3DSticker_Matrix_Array* matrices,
                                                    Norvale_3DSticker_ModelInfo_Array* models);

/* The library's version; needs no engine. The same record on every call, rewritten by each, so two
 * threads must not make their first look at the same time. */
N3DS_API const Norvale_3DSticker_Version* Norvale_3DSticker_GetVersion(void);

#ifdef __cplusplus
} /* extern "C" */
#define N3DS_CPP_NAME(name)
#else
/* These two are exported under their C++ names; a C host reaches them by those. */
#define N3DS_CPP_NAME(name) __asm__(name)
#endif

/* As Norvale_3DSticker_Initialize, from memory: `size` bytes at `data`, which the engine copies.
 * Returns 0; 5 null engine; 1 data null or size 0; -2 for anything but a face model; -201. */
N3DS_API MRESULT Norvale_3DSticker_InitializeEx(void* engine, const unsigned char* data,
                                                uint32_t size, uint32_t degree, uint32_t mirror)
    N3DS_CPP_NAME("_Z30Norvale_3DSticker_InitializeExPvPKhjjj");

/* Changes the orientation of the frames to come (a turned phone, the other camera). Values are not
 * checked: a degree other than 0, 90 and 270 turns by 180. Null engine: nothing. */
N3DS_API void Norvale_3DSticker_SetDegreeAndMirror(void* engine, uint32_t degree, uint32_t mirror)
    N3DS_CPP_NAME("_Z36Norvale_3DSticker_SetDegreeAndMirrorPvjj");

#undef N3DS_CPP_NAME

#endif
