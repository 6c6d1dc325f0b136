/* SPDX-License-Identifier: MIT */
/*
 * Norvale 3-D sticker engine: the engine interface.
 *
 * The host runs its own face detector. Per camera frame it passes the image size and the 2-D
 * landmarks of up to five faces; per face the engine returns OpenGL matrices and 3-D landmarks that
 * keep stickers (hats, glasses) in place on the head, and in mask mode a dense face mesh as well.
 *
 * Calling order (see examples/track_faces.c for a complete program):
 *
 *   float landmarks_3d[3 * N3DS_LANDMARKS_101];
 *   Norvale_3DSticker_Matrix_Array out;
 *   void* engine = Norvale_3DSticker_CreateEngine();
 *   out.faces[0].landmarks3D = landmarks_3d;
 *   if (Norvale_3DSticker_Initialize(engine, "face_model.bin", 0, 0) == N3DS_OK) {
 *     while (NextFrame(&image, &face_count, points))
 *       if (Norvale_3DSticker_Process(engine, &image, face_count, N3DS_LANDMARKS_101, points, NULL,
 *                                     NULL, &out) == N3DS_OK)
 *         Draw(&out);
 *     Norvale_3DSticker_Uninitialize(engine);
 *   }
 *   Norvale_3DSticker_DestroyEngine(engine);
 *
 * Frames of reference (drawn in docs/coordinates.md):
 *
 *   delivered  image as the camera delivers it: x right, y down, integer pixels, origin at the
 *              upper left corner
 *   upright    the same image after mirroring back and rotating by `degree`; the tracker and all
 *              results refer to it
 *   camera     mm, x right, y down, z into the scene; the vertical field of view is taken to be
 *              2 atan(h / (w + h)) for an upright image of w x h pixels
 *   model      mm, x to the image right of a frontal face, y up, z out of the face
 *   world      mm, OpenGL axes (x right, y up, z towards the viewer), origin 500 mm in front of the
 *              camera
 *
 * Matrices are 16 floats, column-major, for column vectors:
 * clip = projectionMatrix * viewMatrix * modelMatrix * point.
 *
 * Threads: each frame call starts worker threads and joins them before it returns; nothing runs
 * between calls. One engine must not be called from two threads at once; different engines are
 * independent.
 *
 * Failures: functions return a code and do not throw. There are two exceptions when memory is
 * exhausted: Norvale_3DSticker_CreateEngine throws std::bad_alloc, and initialisation aborts the
 * process if not even the tracker's context (116 kB) can be allocated.
 *
 * A rigid frame refits a face until it finds a pose, without a limit. There are two cases in which
 * it never returns:
 *
 *   - All landmarks of a new face lie within 2 pixels, in an image of up to 640 x 480 pixels. With
 *     all landmarks in one pixel this happened at 36 % of the places tried in and around an image
 *     of 176 x 144 pixels, 19 % for 320 x 240, 4 % for 640 x 480, and nowhere for 1280 x 720. A
 *     detector that fails and leaves zeros is the usual cause. From 3 pixels on it did not happen
 *     in 30,000 trials. Check before the call: leave out a face whose landmarks span less than 20
 *     pixels.
 *   - Memory stays exhausted while a worker thread fits.
 *
 * Mask frames always return. A single failed allocation in a worker thread shows in neither mode:
 * the call returns N3DS_OK, but the numbers differ from those of an undisturbed frame.
 *
 * Output: a fit without a solution prints "zero in LU" or "zero in zc" to standard output. Single
 * lines may be ignored, the fit is repeated; a stream of them is a frame that never returns.
 *
 * The headers serve C99 and C++11 hosts, and may be included inside extern "C".
 */
#ifndef NORVALE_3D_STICKER_ENGINE_H
#define NORVALE_3D_STICKER_ENGINE_H

#include <stdint.h>

/* Linkage of the exported functions; a host may define it before including the headers. */
#ifndef N3DS_API
#define N3DS_API __attribute__((visibility("default")))
#endif

/* Result of a call: N3DS_OK or another code of the enumeration below. */
typedef int32_t MRESULT;

enum {
  N3DS_OK = 0,
  N3DS_FAILED = 1,          /* engine: a bad argument, an unreadable file, or the core failed */
  N3DS_NOT_INITIALIZED = 2, /* engine: not initialised, or an output record is null */
  N3DS_NULL_ENGINE = 5,     /* engine: the engine handle is null */
  N3DS_NULL_ARGUMENT = -1,  /* core: an argument is null, or no model is loaded */
  N3DS_BAD_VALUE = -2,      /* core: a bad size, count or format */
  N3DS_NUMERICAL = -100,    /* core: zero depth, a singular matrix, or a task pool error */
  N3DS_NO_MEMORY = -201     /* core: memory exhausted */
};

enum {
  N3DS_MAX_FACES = 5,              /* faces a frame call accepts */
  N3DS_LANDMARKS_101 = 101,        /* landmarks per face, base layout (docs/coordinates.md) */
  N3DS_LANDMARKS_165 = 165,        /* landmarks per face, base layout and 64 points in between */
  N3DS_VERTEX_COUNT = 1812,        /* vertices of the face model */
  N3DS_TRIANGLE_COUNT = 3456,      /* triangles of the face model */
  N3DS_MASK_CORNER_COUNT = 10368,  /* corners of the unrolled mask mesh: 3 per triangle */
  N3DS_FACE_MODEL_BYTES = 2141796, /* size of a face-model file */
  N3DS_FACE_CAPACITY = 10          /* entries of the output records; N3DS_MAX_FACES are used */
};

/* Pixel format codes of the image functions; the frame calls ignore them. */
enum {
  N3DS_FORMAT_BGR24 = 513,  /* 3 bytes per pixel: blue, green, red */
  N3DS_FORMAT_BGRA32 = 770, /* 4 bytes per pixel: blue, green, red, alpha */
  N3DS_FORMAT_NV21 = 2050   /* plane 0: luma; plane 1: half-size chroma pairs, V before U */
};

/* Image descriptor, filled and owned by the host, only read. The frame calls use width and height
 * alone (each at least 1); they never touch the pixels, so the planes may be null. */
typedef struct NSVL_OFFSCREEN {
  uint32_t pixelFormat; /* N3DS_FORMAT_* */
  int32_t width;        /* pixels; frame calls: of the delivered image, before rotation */
  int32_t height;       /* pixels */
  uint8_t* plane[4];    /* pixel planes */
  int32_t pitch[4];     /* bytes from one row to the next, per plane */
} NSVL_OFFSCREEN;

/* A landmark in pixels of the delivered image; it may lie outside of it. */
typedef struct __tag_point { /* NOLINT(bugprone-reserved-identifier): the interface's own name */
  int32_t x;
  int32_t y;
} __tag_point;

/* A face rectangle in pixels of the delivered image. */
typedef struct __tag_rect { /* NOLINT(bugprone-reserved-identifier): the interface's own name */
  int32_t left;
  int32_t top;
  int32_t right;
  int32_t bottom;
} __tag_rect;

/* What a renderer needs for one face. */
typedef struct Norvale_3DSticker_Face_Matrix {
  float projectionMatrix[16]; /* for a viewport that shows the whole upright image (its size
                                 rounded down to even numbers); near 1 mm, far 5000 mm */
  float viewMatrix[16];       /* world to camera; always a translation by -500 along z */
  float modelMatrix[16];      /* model to world; the world origin lies 500 mm in front of the
                                 camera */
  float* landmarks3D;         /* host's buffer, set before the call, which does not change the
                                 pointer: receives x, y, z per landmark, model frame, mm */
} Norvale_3DSticker_Face_Matrix;

/* Output of a frame call, owned by the host. faces[k] belongs to the k-th face passed in. But for
 * landmarks3D nothing has to be set before the call. */
typedef struct Norvale_3DSticker_Matrix_Array {
  uint32_t faceNum; /* faces written; untouched when the call fails */
  Norvale_3DSticker_Face_Matrix faces[N3DS_FACE_CAPACITY];
} Norvale_3DSticker_Matrix_Array;

/* One face's mask mesh as an unrolled triangle list, three corners per triangle, counter-clockwise
 * seen from outside. Both arrays belong to the engine and stay valid until its next frame call,
 * Uninitialize or DestroyEngine. */
typedef struct Norvale_3DSticker_Face_Model {
  float* vertices;     /* vertexNum corners, x, y, z each, model frame, mm */
  int32_t vertexNum;   /* N3DS_MASK_CORNER_COUNT */
  float* texCoords;    /* texCoordNum pairs u, v in 0..1, v down; the same table for every face */
  int32_t texCoordNum; /* N3DS_MASK_CORNER_COUNT (pairs, not floats) */
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

/* Creates an engine, not yet initialised. Release it with Norvale_3DSticker_DestroyEngine.
 *
 * Never returns null: throws std::bad_alloc when memory is exhausted (1.3 MB), which ends the
 * process of a C host. */
N3DS_API void* Norvale_3DSticker_CreateEngine(void);

/* Uninitialises an engine if necessary and frees it; null is ignored. */
N3DS_API void Norvale_3DSticker_DestroyEngine(void* engine);

/* Loads a face model from a file and makes the engine ready for frames.
 *
 * Uninitialise an initialised engine first: calling this on it leaks the previous model. After a
 * failure the engine is uninitialised. The file is checked by its size and its header only.
 *
 *   engine  handle
 *   path    face-model file: data/face_model.bin, format in docs/formats.md
 *   degree  clockwise rotation that makes the delivered image upright: 0, 90, 180 or 270
 *   mirror  1 if the delivered image is mirrored (previews often are, camera buffers seldom), any
 *           other value if not
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ENGINE  engine is null
 *   N3DS_FAILED       path is null or the file cannot be read
 *   N3DS_BAD_VALUE    the file is no face model: wrong size or header
 *   N3DS_NO_MEMORY    memory is exhausted */
N3DS_API MRESULT Norvale_3DSticker_Initialize(void* engine, const char* path, uint32_t degree,
                                              uint32_t mirror);

/* Releases the model and all tracks; the engine may be initialised again.
 *
 * Returns N3DS_OK, or N3DS_NULL_ENGINE if engine is null. */
N3DS_API MRESULT Norvale_3DSticker_Uninitialize(void* engine);

/* Rigid mode: tracks the heads of one frame.
 *
 * Frames are one sequence in time: each call continues the tracks of the call before. Time itself
 * is not passed: smoothing works per frame, whatever the frame rate. Faces are matched to tracks by
 * position, so their order may change. Use one engine for one mode only: both modes share the
 * tracks. With four or five faces a faster fit without smoothing is used. No confidence is
 * reported: N3DS_OK says that poses were found, not that they are right.
 *
 * The first frame with a face fixes the landmark count until Norvale_3DSticker_Uninitialize. A
 * later frame with the other count is accepted, but missing landmarks count as 0 and surplus ones
 * are ignored.
 *
 * Degenerate landmarks or exhausted memory can keep this call from ever returning: see the top of
 * this header.
 *
 *   engine      handle
 *   image       descriptor of the delivered image; only width and height matter, each at least 1
 *               (an image one pixel wide or high has no projection)
 *   nFaces      0 to N3DS_MAX_FACES; 0 ends all tracks
 *   nLandmarks  landmarks per face: N3DS_LANDMARKS_101 or N3DS_LANDMARKS_165; not looked at if
 *               nFaces is 0
 *   points      nFaces * nLandmarks landmarks of the delivered image, face after face; only read;
 *               may be null if nFaces is 0
 *   rects       not used; may be null
 *   extra       not used; may be null
 *   out         receives one entry per face, in the order of the input; landmarks3D of its first
 *               nFaces entries must point to 3 * nLandmarks floats each
 *
 * Returns N3DS_OK, or, with out untouched,
 *   N3DS_NULL_ENGINE      engine is null
 *   N3DS_NOT_INITIALIZED  the engine is not initialised, or out is null
 *   N3DS_FAILED           image is null, a size or count is out of range, points is null with
 *                         nFaces > 0, or memory or threads are exhausted */
N3DS_API MRESULT Norvale_3DSticker_Process(void* engine, NSVL_OFFSCREEN* image, uint32_t nFaces,
                                           uint32_t nLandmarks, __tag_point* points,
                                           __tag_rect* rects, float* extra,
                                           Norvale_3DSticker_Matrix_Array* out);

/* Mask mode: tracks the heads of one frame, fits the shape of each face and returns it as a mesh.
 *
 * The model frame is that of the mesh here, pitched by 20 degrees against the one of rigid mode
 * (docs/coordinates.md). Everything else is as in Norvale_3DSticker_Process, but this call always
 * returns: a face that cannot be fitted keeps the pose and shape it had.
 *
 *   engine      handle
 *   image       descriptor of the delivered image
 *   nFaces      0 to N3DS_MAX_FACES; 0 ends all tracks
 *   nLandmarks  N3DS_LANDMARKS_101 or N3DS_LANDMARKS_165
 *   points      nFaces * nLandmarks landmarks of the delivered image, face after face
 *   rects       not used; may be null
 *   extra       not used; may be null
 *   matrices    receives matrices and 3-D landmarks per face, as out of Norvale_3DSticker_Process
 *   models      receives one mesh per face; the arrays belong to the engine
 *
 * Returns the codes of Norvale_3DSticker_Process, with both records untouched unless N3DS_OK;
 * N3DS_NOT_INITIALIZED also if models is null. */
N3DS_API MRESULT Norvale_3DSticker_Process_FaceMask(void* engine, NSVL_OFFSCREEN* image,
                                                    uint32_t nFaces, uint32_t nLandmarks,
                                                    __tag_point* points, __tag_rect* rects,
                                                    float* extra,
                                                    Norvale_3DSticker_Matrix_Array* matrices,
                                                    Norvale_3DSticker_ModelInfo_Array* models);

/* The library's version; needs no engine. Returns the same static record on every call.
 *
 * Safe on any thread. The record belongs to the library and must not be written to. */
N3DS_API const Norvale_3DSticker_Version* Norvale_3DSticker_GetVersion(void);

/* The two functions below are exported under their C++ names. A C++ host declares them as such even
 * if it includes this header inside extern "C"; a C host reaches them by their mangled names. */
#ifdef __cplusplus
} /* extern "C" */
extern "C++" {
#define N3DS_CPP_NAME(name)
#else
#define N3DS_CPP_NAME(name) __asm__(name)
#endif

/* Loads a face model from memory and makes the engine ready for frames.
 *
 * As Norvale_3DSticker_Initialize, for a model that is not a file, such as an asset of an app.
 *
 *   engine  handle
 *   data    a face model's bytes; the engine copies them
 *   size    number of bytes, N3DS_FACE_MODEL_BYTES
 *   degree  clockwise rotation that makes the delivered image upright: 0, 90, 180 or 270
 *   mirror  1 if the delivered image is mirrored, any other value if not
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ENGINE  engine is null
 *   N3DS_FAILED       data is null or size is 0
 *   N3DS_BAD_VALUE    the bytes are no face model: wrong size or header
 *   N3DS_NO_MEMORY    memory is exhausted */
N3DS_API MRESULT Norvale_3DSticker_InitializeEx(void* engine, const unsigned char* data,
                                                uint32_t size, uint32_t degree, uint32_t mirror)
    N3DS_CPP_NAME("_Z30Norvale_3DSticker_InitializeExPvPKhjjj");

/* Changes the orientation of the frames to come (the device was rotated, or the camera switched).
 *
 * Tracks go on in upright pixels: after a camera switch pass one frame without faces to end them.
 *
 *   engine  handle; null is ignored
 *   degree  0, 90, 180 or 270; any other value acts as 180
 *   mirror  1 if the delivered image is mirrored, any other value if not */
N3DS_API void Norvale_3DSticker_SetDegreeAndMirror(void* engine, uint32_t degree, uint32_t mirror)
    N3DS_CPP_NAME("_Z36Norvale_3DSticker_SetDegreeAndMirrorPvjj");

#ifdef __cplusplus
} /* extern "C++" */
#endif

#undef N3DS_CPP_NAME

#endif
