/* SPDX-License-Identifier: MIT */
/*
 * Norvale 3-D sticker engine: the core interface.
 *
 * For hosts that need more than the engine interface: the tracking core, the mask image functions,
 * the numerical toolkit, the memory layer, the task pool and the kernels.
 *
 * Conventions, unless a function says otherwise:
 *
 *   - Nothing is written when N3DS_NULL_ARGUMENT or N3DS_BAD_VALUE is returned.
 *   - Arithmetic is in single precision. 3x3 matrices are 9 floats, row-major, for column vectors.
 *     4x4 matrices are 16 floats, column-major, for column vectors (OpenGL).
 *   - A camera matrix K is 3x3; only fx = K[0], cx = K[2], fy = K[4], cy = K[5] are read (pixels).
 *   - A pose is 7 floats qw, qx, qy, qz, tx, ty, tz: a model point X lies at R(q) X + t in the
 *     camera frame, in mm, with x right, y down, z into the scene.
 *   - Buffers belong to the caller; no function keeps a pointer unless it says so. Input and output
 *     buffers must not overlap unless a function allows it.
 *   - Functions have no global state and may run on any thread; a tracking context or a memory pool
 *     may be used by one thread at a time.
 */
#ifndef NORVALE_3D_STICKER_CORE_H
#define NORVALE_3D_STICKER_CORE_H

#include <stddef.h>
#include <stdint.h>

#include "norvale_3d_sticker_engine.h"

#ifdef __cplusplus
extern "C" {
#endif

/* ---------------------------------------------------------------------------------------------
 * Memory layer
 *
 * All memory of the core is taken through a handle. A null handle is the system heap, which is safe
 * on any thread. Any other handle is a pool in a fixed area of the caller's: a first-fit chain of
 * blocks, each with a header of 16 bytes, without a lock. Callers that share a pool between threads
 * must serialise its use.
 *
 * A tracking context allocates on its worker threads, one per face, so only a context that tracks a
 * single face may live in a pool. It takes about 4.08 MB (either mode, 165 landmarks): make the
 * pool 4,500,000 bytes, plus 4 * width * height for each mask image that N3DS_WarpFaceMask sets up
 * in it. With a single configured processor, whose only worker fits one face after the other, that
 * serves five faces too (4.16 MB). What too small a pool does depends on its size:
 *
 *   below 0.12 MB    N3DS_Init aborts the process
 *   below 4.00 MB    N3DS_LoadFaceHouse returns N3DS_NO_MEMORY
 *   below 4.04 MB    frame calls return N3DS_NO_MEMORY or N3DS_NUMERICAL
 *   4.03 to 4.06 MB  rigid frames never return: the fit is repeated without a limit
 *   below 4.10 MB    frame calls may return N3DS_OK, but leave out steps of the fit */
typedef void* MHandle;

/* Makes a pool in an area of the caller's, which must outlive it.
 *
 *   area    start, rounded up to a multiple of 8
 *   length  bytes, rounded down to a multiple of 8; 32 of them are for bookkeeping
 *
 * Returns null if area is null, would end beyond the last address, or has nothing left after the
 * bookkeeping. */
N3DS_API MHandle MMemMgrCreate(void* area, size_t length);

/* Does nothing: the area of a pool belongs to the caller. */
N3DS_API void MMemMgrDestroy(MHandle pool);

/* Allocates memory, aligned to 8 bytes.
 *
 *   memory  null: as malloc(size); a pool: as MMemAllocStatic
 *   size    bytes; a pool reads the low 32 bits only
 *
 * Returns null when memory is exhausted. */
N3DS_API void* MMemAlloc(MHandle memory, size_t size);

/* Frees a block of the same handle; a null pointer is ignored. */
N3DS_API void MMemFree(MHandle memory, void* pointer);

/* Changes the size of a block of the same handle, which may move; as realloc for a null handle, as
 * MMemReallocStatic for a pool. Returns null on failure; the old block then stays valid. */
N3DS_API void* MMemRealloc(MHandle memory, void* pointer, size_t size);

/* The same operations for pools alone. A size is rounded up to a multiple of 8. Allocation and
 * reallocation return null for a null pool, size 0 or exhaustion. A pointer must be a live block of
 * this pool, which is not checked; freeing a null pointer, or into a null pool, does nothing. */
N3DS_API void* MMemAllocStatic(MHandle pool, uint32_t size);
N3DS_API void MMemFreeStatic(MHandle pool, void* pointer);
N3DS_API void* MMemReallocStatic(MHandle pool, void* pointer, uint32_t size);

/* Returns the size of the largest free block of a pool in bytes, 0 if there is none; 2 for a null
 * pool. */
N3DS_API size_t GetMaxAllocMemSize(MHandle pool);

/* As memset, memcpy, memmove and memcmp. */
N3DS_API void* MMemSet(void* destination, int value, size_t size);
N3DS_API void* MMemCpy(void* destination, const void* source, size_t size);
N3DS_API void* MMemMove(void* destination, const void* source, size_t size);
N3DS_API int MMemCmp(const void* a, const void* b, size_t size);

/* ---------------------------------------------------------------------------------------------
 * Tracking core
 *
 * N3DS_Init -> N3DS_LoadFaceHouse -> per frame N3DS_Build3DFaceForVideo_* and then
 * N3DS_GetRigidMatrix (rigid) or N3DS_GetFace3DModel (mask) -> N3DS_UnInit.
 *
 * The engine interface is a layer on top, which maps landmarks to the upright image. */

/* One face's landmarks in integer pixels of the upright, unmirrored image. */
typedef struct N3DS_LANDMARK {
  int32_t* points; /* count pairs x, y; the core writes its smoothed positions back into them */
  uint32_t count;  /* N3DS_LANDMARKS_101 or N3DS_LANDMARKS_165 */
} N3DS_LANDMARK;

/* One face's matrices as the core reports them. */
typedef struct N3DS_RIGID_MATRIX {
  float modelMatrix[16];      /* model to world; the world origin lies 500 mm in front of the
                                 camera */
  float viewMatrix[16];       /* world to camera; always a translation by -500 along z */
  float projectionMatrix[16]; /* near 1 mm, far 5000 mm */
  float* landmarks3D;         /* caller's buffer, 3 floats per landmark, model frame, mm */
} N3DS_RIGID_MATRIX;

/* One face's dense mesh. */
typedef struct N3DS_3D_MODEL {
  float* vertices;           /* x, y, z per vertex, model frame, mm; belongs to the core, valid
                                until the next frame */
  int64_t vertexCount;       /* N3DS_VERTEX_COUNT */
  const uint16_t* triangles; /* three vertex indices per triangle; a constant table */
  int64_t triangleCount;     /* N3DS_TRIANGLE_COUNT */
} N3DS_3D_MODEL;

/* Creates a tracking context.
 *
 * Aborts the process (assertion) if the context, 116 kB, cannot be allocated.
 *
 *   memory  where the context takes all its memory from; see the memory layer for pools
 *   core    receives the context; release it with N3DS_UnInit
 *
 * Returns N3DS_OK, or N3DS_NULL_ARGUMENT if core is null. */
N3DS_API MRESULT N3DS_Init(MHandle memory, void** core);

/* Releases a context and all it holds; null is ignored. Returns N3DS_OK. */
N3DS_API MRESULT N3DS_UnInit(void* core);

/* Loads a face model; loading again replaces the model. The bytes are copied.
 *
 *   core  context
 *   data  a face model's bytes, format in docs/formats.md; checked by size and header only
 *   size  number of bytes, N3DS_FACE_MODEL_BYTES
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  core or data is null
 *   N3DS_BAD_VALUE      the size or the header is not a face model's
 *   N3DS_NO_MEMORY      memory is exhausted */
N3DS_API MRESULT N3DS_LoadFaceHouse(void* core, const void* data, size_t size);

/* Tracks the faces of one frame: rigid mode fits the pose of the mean head, mask mode fits the
 * shape of the face as well.
 *
 * Matches the faces to the tracks of the frame before, fits each on a worker thread and waits for
 * all of them. N3DS_OK does not say that every fit succeeded: in mask mode a face that cannot be
 * fitted keeps its last pose, and in rigid mode the fit is repeated without a limit. The header of
 * the engine interface says when a rigid frame never returns.
 *
 *   core    context with a face model
 *   image   upright image: only width and height are read, each at least 1
 *   faces   nFaces landmark records, all with the same count; may be null if nFaces is 0
 *   nFaces  0 to N3DS_MAX_FACES; 0 ends all tracks
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  core, image, faces or a face's points are null, or no model is loaded
 *   N3DS_BAD_VALUE      a size, the face count or a landmark count is out of range
 *   N3DS_NO_MEMORY      memory of the frame is exhausted; of a worker's, it is not reported
 *   N3DS_NUMERICAL      the task pool cannot be started or fails */
N3DS_API MRESULT N3DS_Build3DFaceForVideo_Rigid(void* core, const NSVL_OFFSCREEN* image,
                                                N3DS_LANDMARK* faces, int32_t nFaces);
N3DS_API MRESULT N3DS_Build3DFaceForVideo_Mask(void* core, const NSVL_OFFSCREEN* image,
                                               N3DS_LANDMARK* faces, int32_t nFaces);

/* Reports matrices and 3-D landmarks of the last rigid frame.
 *
 *   core     context
 *   records  nFaces records, each with its landmarks3D buffer set
 *   nFaces   face count of the last frame
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  core or records is null
 *   N3DS_BAD_VALUE      nFaces is not the last frame's face count
 *   N3DS_NUMERICAL      a rotation cannot be inverted; the records of earlier faces are filled */
N3DS_API MRESULT N3DS_GetRigidMatrix(void* core, N3DS_RIGID_MATRIX* records, int32_t nFaces);

/* Builds the dense meshes of the last mask frame and reports them with matrices and 3-D landmarks.
 *
 *   core     context
 *   models   nFaces records, filled
 *   records  nFaces records, each with its landmarks3D buffer set
 *   nFaces   face count of the last frame
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  core, models or records is null, or no model is loaded
 *   N3DS_BAD_VALUE      nFaces is not the last frame's face count, or the task pool cannot be shut
 *                       down
 *   N3DS_NUMERICAL      the task pool fails, or a rotation cannot be inverted
 *   N3DS_NO_MEMORY      memory is exhausted
 * After N3DS_NUMERICAL and N3DS_NO_MEMORY the records may be partly filled. */
N3DS_API MRESULT N3DS_GetFace3DModel(void* core, N3DS_3D_MODEL* models, N3DS_RIGID_MATRIX* records,
                                     int32_t nFaces);

/* Returns the number of landmarks per face, fixed by the first frame with a face:
 * N3DS_LANDMARKS_101 or N3DS_LANDMARKS_165; 0 before it; N3DS_NULL_ARGUMENT for a null core. */
N3DS_API int32_t N3DS_Get3DLandmarkNum(void* core);

/* ---------------------------------------------------------------------------------------------
 * Mask images
 *
 * N3DS_WarpFaceMask needs a context that tracked the face in mask mode. The engine interface does
 * not give its context away: its hosts draw the mesh with their renderer, or use the core interface
 * for tracking too. */

/* A mask image and its layout. If texCoords or triangles is null, the engine's own layout is used,
 * which data/face_template.png shows (texture vertex i is mesh vertex i), and the counts are
 * ignored. */
typedef struct N3DS_2D_TEXTURE_MASK {
  const float* texCoords;    /* u, v per texture vertex, 0..1, v up */
  int64_t texCoordCount;     /* N3DS_VERTEX_COUNT */
  const uint16_t* triangles; /* three texture vertices per triangle, in the order of the mesh */
  int64_t triangleCount;     /* N3DS_TRIANGLE_COUNT */
  NSVL_OFFSCREEN image;      /* mask image, N3DS_FORMAT_BGRA32 */
} N3DS_2D_TEXTURE_MASK;

/* Draws a mask image onto a tracked face of the last mask frame, in pixels of the upright image.
 *
 * Triangles are drawn in the order of the list and later ones overwrite earlier ones: where a
 * turned face hides part of itself, pass a list sorted from far to near. Corners outside the output
 * are moved to its border, which distorts the triangles there.
 *
 *   core       context
 *   mask       mask image and layout
 *   output     receives a BGRA image, transparent where the face is not. If plane[0] is null, it is
 *              set up as width x height and its buffer taken from the core's memory: release that
 *              with MMemFree and the handle given to N3DS_Init. Otherwise its own size and pitch
 *              hold, and it must have room for pitch[0] * height bytes.
 *   model      the face's mesh from N3DS_GetFace3DModel, N3DS_TRIANGLE_COUNT triangles
 *   width      of an output that is to be set up, pixels; at least 1 in any case
 *   height     likewise
 *   faceIndex  0 to the last frame's face count - 1
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  core, mask, output, model or, of a tracked face, an array of the model is
 *                       null
 *   N3DS_BAD_VALUE      width, height, faceIndex, or size, pitch, format or plane of the mask image
 *                       is out of range, or a vertex index of the model's triangles
 *   N3DS_NO_MEMORY      no buffer for the output; its other members are set
 * Wrong counts in the mask record, or a face without a track, give a transparent output and
 * N3DS_OK. */
N3DS_API MRESULT N3DS_WarpFaceMask(void* core, const N3DS_2D_TEXTURE_MASK* mask,
                                   NSVL_OFFSCREEN* output, const N3DS_3D_MODEL* model,
                                   int32_t width, int32_t height, int32_t faceIndex);

/* Blends a mask image over a camera image; the mask is shaded by the brightness of the image.
 *
 * N3DS_FORMAT_BGR24: all pixels of the mask's rectangle are written; image and output must be at
 * least as large as the mask. N3DS_FORMAT_NV21: only 2 x 2 blocks that the mask touches are
 * written; mask and output must be at least as large as the image, and an odd last row or column
 * stays as it is.
 *
 *   core    not used; may be null
 *   image   camera image, N3DS_FORMAT_BGR24 or N3DS_FORMAT_NV21
 *   mask    N3DS_FORMAT_BGRA32, for instance from N3DS_WarpFaceMask
 *   output  the image's format; may be the same descriptor as image
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  image, mask or output is null
 *   N3DS_BAD_VALUE      formats are wrong or differ, an image is too small, a plane is null or a
 *                       pitch negative */
N3DS_API MRESULT N3DS_BlendFaceMask(void* core, NSVL_OFFSCREEN* image, NSVL_OFFSCREEN* mask,
                                    NSVL_OFFSCREEN* output);

/* Colour conversion of one packed word: R, G, B in bits 16-23, 8-15, 0-7; Y, U (Cb), V (Cr)
 * likewise. Full-range BT.601 weights in 15-bit fixed point, clamped to 0..255. */
N3DS_API uint32_t RGB2YUV(uint32_t rgb);
N3DS_API uint32_t YUV2RGB(uint32_t yuv);

/* ---------------------------------------------------------------------------------------------
 * Numerical toolkit
 *
 *   memory  handle that scratch memory comes from; null: the system heap */

/* Fits a pose to 2-D points by damped least squares (Levenberg-Marquardt with the gain-ratio
 * damping of Madsen, Nielsen and Tingleff, "Methods for Non-Linear Least Squares Problems", 2004),
 * in at most 20 iterations.
 *
 * The quaternion is used as it is and not normalised: its squared length scales the model.
 * Residuals are weighted by landmark, where a landmark is known by its index in the arrays as
 * passed (layout in docs/coordinates.md). The tracker passes contourWeight 1, rangeWeight 1 for a
 * closed mouth to 0.1 for an open one, and innerWeight from 0.1 to 10.
 *
 *   landmarks      pointCount pairs x, y, pixels
 *   modelPoints    pointCount triples X, Y, Z, mm
 *   pointCount     number of points, 0 to 2^30 - 1
 *   camera         camera matrix
 *   pose           in: start; out: last accepted estimate, also on failure. Seven floats are always
 *                  read, and paramCount if that is more
 *   contourWeight  weight of outline landmarks 0-3 and 15-18 (temples and cheeks) that project
 *                  farther from the midline than they were observed: their residual is reduced to
 *                  its part across the midline, times this weight. The midline runs from landmark 9
 *                  to between 45 and 51. With fewer than 52 points there is no midline, and these
 *                  landmarks count like any other
 *   rangeWeight    factor of the landmarks that move with speech: chin 5-13, mouth 75, 76, 80-88
 *                  and 90-94
 *   weightingMode  0: no further factors, and innerWeight has no effect. Any other value: eye
 *                  corners 39, 45, 51 and 57 have factor 1, the sides of the nose that of
 *                  innerWeight, all other landmarks 0.1
 *   innerWeight    balance of the two sides of the nose: below 1 it is the factor of 63, 64, 65 and
 *                  68, above 1 its inverse is the factor of 69, 72, 73 and 74; the other side has
 *                  factor 1. Not 0
 *   paramCount     7. Fewer: only the first are fitted. More: the surplus ones have no effect on
 *                  the residuals
 *
 * Returns N3DS_OK, also if 20 iterations did not converge, or
 *   N3DS_NULL_ARGUMENT  an argument is null, or no memory for the first work arrays
 *   N3DS_BAD_VALUE      a count is out of range
 *   N3DS_NO_MEMORY      no memory for the other work arrays
 *   N3DS_NUMERICAL      a point at zero depth ("zero in zc" is printed) or a singular system */
N3DS_API MRESULT SolveByLM(MHandle memory, const float* landmarks, const float* modelPoints,
                           int32_t pointCount, const float* camera, float* pose,
                           float contourWeight, float rangeWeight, int64_t weightingMode,
                           float innerWeight, int32_t paramCount);

/* Evaluates the residuals of a pose and, on request, their derivatives.
 *
 *   J     2 pointCount x paramCount, row-major: rows 2i and 2i + 1 are the derivatives of the
 *         residuals of point i along x and y
 *   JtJ   paramCount x paramCount, J^T J
 *   g     paramCount, the gradient J^T r; J, JtJ and g are all null (residuals only) or all set
 *   r     2 pointCount residuals, projected minus observed, weighted
 *   pose  only read; seven floats whatever paramCount says
 *   landmarks, modelPoints, pointCount, camera          as in SolveByLM
 *   contourWeight, rangeWeight, weightingMode           as in SolveByLM
 *   innerWeight, paramCount                             as in SolveByLM
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  r, landmarks, modelPoints, camera or pose is null
 *   N3DS_BAD_VALUE      some of J, JtJ and g are null and some are not, or a count is out of range
 *   N3DS_NUMERICAL      a point at zero depth ("zero in zc" is printed); outputs partly written
 *   N3DS_NO_MEMORY      memory is exhausted */
N3DS_API MRESULT ComputeJacobianEtc(MHandle memory, float* J, float* JtJ, float* g, float* r,
                                    const float* landmarks, const float* modelPoints,
                                    int32_t pointCount, const float* camera, const float* pose,
                                    float contourWeight, float rangeWeight, int64_t weightingMode,
                                    float innerWeight, int32_t paramCount);

/* Solves A x = b; if rows > cols in the least-squares sense, through the normal equations.
 *
 *   A     rows x cols, row-major
 *   rows  at least cols
 *   cols  at least 1; with 0 nothing is written
 *   x     receives cols floats; untouched on failure
 *   b     rows floats
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  A, x or b is null
 *   N3DS_BAD_VALUE      rows < cols, or a size is negative
 *   N3DS_NUMERICAL      a pivot below 1e-6, an absolute limit ("zero in LU" is printed)
 *   N3DS_NO_MEMORY      memory is exhausted */
N3DS_API MRESULT SolveLinearAxb(MHandle memory, const float* A, int32_t rows, int32_t cols,
                                float* x, const float* b);

/* Factorises A = L U without exchanging rows.
 *
 *   A  n x n, row-major
 *   n  at least 0
 *   L  receives n x n, unit lower triangle
 *   U  receives n x n, upper triangle
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  A, L or U is null
 *   N3DS_BAD_VALUE      n is negative
 *   N3DS_NUMERICAL      a pivot below 1e-6 ("zero in LU" is printed); written are the rows before
 *                       it, its own up to the pivot, and the zeros and ones of all rows */
N3DS_API MRESULT MatDecompLU(const float* A, int32_t n, float* L, float* U);

/* Rotations. All return N3DS_OK, or N3DS_NULL_ARGUMENT if a pointer is null. Quaternions are w, x,
 * y, z; Euler angles are radians about x, y and z, in this order in the array, with R = Rz Ry Rx.
 *
 *   QuatToRotationMatrix  does not normalise: the matrix is |q|^2 times a rotation
 *   RotationMatrixToQuat  gives the quaternion whose largest component is positive
 *   QuatToEuler           gives NaN for the angle about y if a quaternion longer than 1 meets an
 *                         angle near 90 degrees
 *   EulerToQuat           the reverse */
N3DS_API MRESULT QuatToRotationMatrix(const float* quat, float* matrix);
N3DS_API MRESULT RotationMatrixToQuat(const float* matrix, float* quat);
N3DS_API MRESULT QuatToEuler(const float* quat, float* euler);
N3DS_API MRESULT EulerToQuat(const float* euler, float* quat);

/* Inverts a 3x3 matrix, which need not be a rotation. Returns N3DS_OK, N3DS_NULL_ARGUMENT, or
 * N3DS_NUMERICAL if the determinant is exactly 0. */
N3DS_API MRESULT MatrixInverse3X3(const float* matrix, float* inverse);

/* ---------------------------------------------------------------------------------------------
 * Task pool
 *
 * mcvParallelInit -> mcvAddTask for each task -> mcvWaitTask for each id -> mcvParallelUninit.
 *
 * Any thread may add tasks and wait for them, a task of the pool included; a task must not wait for
 * one that needs its own worker. At most N3DS_POOL_CAPACITY tasks may be pending, and as many
 * finished but not waited for: of further ones the id is lost ("Task lost" is printed), and waiting
 * for it blocks indefinitely.
 *
 * Shut a pool down only when no other thread is inside mcvAddTask or mcvWaitTask or will call them,
 * and never from a task of the pool. Tasks that are still pending are dropped, and a thread that
 * waits for one blocks indefinitely. A call of mcvAddTask whose task has started no longer uses
 * the pool. */
typedef void* (*mcvTaskFunction)(void* argument); /* the result is ignored */

enum {
  N3DS_POOL_STOPPING = -3, /* the pool is being shut down */
  N3DS_POOL_FULL = -4,     /* N3DS_POOL_CAPACITY tasks are pending */
  N3DS_POOL_CAPACITY = 32  /* tasks that may be pending, and ids that may await mcvWaitTask */
};

/* Starts a pool of worker threads.
 *
 *   memory   handle that the pool's own memory comes from, also when it is shut down
 *   threads  number of workers: at most the configured processors and at most 16; 0: as many as
 *            processors are online, at most 16
 *
 * Returns null if memory or threads are exhausted. */
N3DS_API void* mcvParallelInit(MHandle memory, uint32_t threads);

/* Stops the workers after the tasks that they are running, joins them and frees the pool.
 *
 * Returns N3DS_OK, N3DS_NULL_ARGUMENT for a null pool, or N3DS_POOL_STOPPING if another call is
 * already doing so. */
N3DS_API int32_t mcvParallelUninit(void* pool);

/* Queues a task, which a worker runs as function(argument).
 *
 * Returns its id (at least 0), N3DS_NULL_ARGUMENT for a null pool or function, or
 * N3DS_POOL_FULL. */
N3DS_API int32_t mcvAddTask(void* pool, mcvTaskFunction function, void* argument);

/* Waits until the task of an id has finished. Each id can be waited for once; waiting for an id
 * that was never issued, or was waited for before, blocks indefinitely.
 *
 * Returns N3DS_OK, or N3DS_NULL_ARGUMENT for a null pool. */
N3DS_API int32_t mcvWaitTask(void* pool, int32_t id);

/* Returns the number of workers; 0 for a null pool. */
N3DS_API uint32_t mcvParallelEngineCores(void* pool);

/* As MMemAlloc and MMemFree. */
N3DS_API void* mcvMemAlloc(MHandle memory, size_t size);
N3DS_API void mcvMemFree(MHandle memory, void* pointer);

/* mcvTryFireCpu brings offline CPU cores online through sysfs, where permissions allow;
 * mcvTryRestoreCpu takes them offline again. Both stop silently at the first file that cannot be
 * opened; a null pool is ignored. The frame calls use neither. */
N3DS_API void mcvTryFireCpu(void* pool);
N3DS_API void mcvTryRestoreCpu(void* pool);

/* ---------------------------------------------------------------------------------------------
 * Kernels
 *
 * Matrices are row-major and dense unless a function says otherwise. Integer arithmetic wraps.
 * Functions that return int32_t return N3DS_OK unless they say otherwise.
 *
 *   dst         output; in element-wise kernels it may be one of the inputs
 *   src, a, b   inputs
 *   n           number of elements
 *   rows, cols  size of all matrices of the call
 *   width       of an image, pixels
 *   height      of an image, pixels */

/* Element by element: sum, difference, product with a scalar. N3DS_NULL_ARGUMENT if a matrix is
 * null; nothing is written if a size is below 1.
 *
 *   s  the scalar; in the s32 form it comes before the sizes */
N3DS_API int32_t mcvMatrixAddMatrix_f32(float* dst, const float* a, const float* b, int32_t rows,
                                        int32_t cols);
N3DS_API int32_t mcvMatrixAddMatrix_s32(int32_t* dst, const int32_t* a, const int32_t* b,
                                        int32_t rows, int32_t cols);
N3DS_API int32_t mcvMatrixSubMatrix_f32(float* dst, const float* a, const float* b, int32_t rows,
                                        int32_t cols);
N3DS_API int32_t mcvMatrixSubMatrix_s32(int32_t* dst, const int32_t* a, const int32_t* b,
                                        int32_t rows, int32_t cols);
N3DS_API int32_t mcvMatrixMulScalar_f32(float* dst, const float* src, int32_t rows, int32_t cols,
                                        float s);
N3DS_API int32_t mcvMatrixMulScalar_s32(int32_t* dst, const int32_t* src, int32_t s, int32_t rows,
                                        int32_t cols);

/* Matrix product C = A B, row-major or, in the ColMajor forms, with all three matrices
 * column-major. N3DS_NULL_ARGUMENT if a matrix is null.
 *
 * f32: each element sums its k terms in order by fused multiply-adds. s64: products are formed in
 * 32 bits (wrapping) and summed in 64.
 *
 *   C        m x n; must not overlap A or B; set to zero if k < 1, not written if m or n < 1
 *   A        m x k
 *   B        k x n
 *   m, k, n  sizes */
N3DS_API int32_t mcvMatrixMulMatrixRowMajor_f32(float* C, const float* A, const float* B, int32_t m,
                                                int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulMatrixRowMajor_s32(int32_t* C, const int32_t* A, const int32_t* B,
                                                int32_t m, int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulMatrixRowMajor_s64(int64_t* C, const int16_t* A, const int32_t* B,
                                                int32_t m, int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulMatrixColMajor_f32(float* C, const float* A, const float* B, int32_t m,
                                                int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulMatrixColMajor_s32(int32_t* C, const int32_t* A, const int32_t* B,
                                                int32_t m, int32_t k, int32_t n);

/* D = A B + E, the product formed first (zero for k < 1). N3DS_NULL_ARGUMENT if a matrix is null.
 *
 *   D        m x n; must not overlap A, B or E
 *   A        m x k
 *   B        k x n
 *   E        m x n
 *   m, k, n  sizes */
N3DS_API int32_t mcvMatrixMulAddRowMajor_f32(float* D, const float* A, const float* B,
                                             const float* E, int32_t m, int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulAddRowMajor_s32(int32_t* D, const int32_t* A, const int32_t* B,
                                             const int32_t* E, int32_t m, int32_t k, int32_t n);

/* Returns the Euclidean distance of two vectors; 0 for n < 1. Pointers are not checked. The u32 and
 * s32 forms convert each element to float first; the Fast forms sum the squares exactly as
 * integers. */
N3DS_API double mcvVectorDiffNorm2f32(const float* a, const float* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2u32(const uint32_t* a, const uint32_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2s32(const int32_t* a, const int32_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fastu8(const uint8_t* a, const uint8_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fasts8(const int8_t* a, const int8_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fastu16(const uint16_t* a, const uint16_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fasts16(const int16_t* a, const int16_t* b, int32_t n);

/* Returns the sum of products of n bytes, which are read as unsigned whatever the name says;
 * UINT64_MAX if a or b is null. */
N3DS_API uint64_t mcvDotProducts8(const void* a, const void* b, uint32_t n);

/* Returns the number of set bits in the n bytes at p; N3DS_NULL_ARGUMENT if p is null;
 * N3DS_BAD_VALUE if the number exceeds INT32_MAX, which takes 2^28 bytes. */
N3DS_API int32_t mcvBitCountu8(const uint8_t* p, uint32_t n);

/* Square roots of one value or n of them. The vector forms return N3DS_NULL_ARGUMENT for a null
 * pointer. The Inv forms give 1 / sqrt(x) by the bit-shift estimate and two Newton steps, right to
 * 5 digits: 0.4999978 for x = 4. */
N3DS_API float mcvSqrtf32(float x);
N3DS_API int32_t mcvSqrtVectorf32(const float* src, float* dst, int32_t n);
N3DS_API float mcvInvSqrtf32(float x);
N3DS_API int32_t mcvInvSqrtVectorf32(const float* src, float* dst, int32_t n);

/* Integer square root of v by table, with at most 8 significant bits; N3DS_BAD_VALUE for a negative
 * v. */
N3DS_API int32_t mcvFastSqrts32(int32_t v);
N3DS_API int64_t mcvFastSqrts64(int64_t v);

/* Returns a / b. */
N3DS_API float mcvDivf32(float a, float b);

/* dst = src / s, element by element. Pointers are not checked.
 *
 *   s  divisor */
N3DS_API int32_t mcvVectorDivf32(float* dst, const float* src, int32_t n, float s);

/* Halves an 8-bit image: each output byte is the truncated mean of a 2 x 2 block. Rows are width
 * and width / 2 bytes. N3DS_NULL_ARGUMENT for a null pointer; N3DS_BAD_VALUE for a width or height
 * below 4. */
N3DS_API int32_t mcvScaleDownBy2u8(const uint8_t* src, int32_t width, int32_t height, uint8_t* dst);

/* dst = a | b, row by row. N3DS_NULL_ARGUMENT for a null pointer.
 *
 *   pitchA    bytes from one row of a to the next
 *   pitchB    likewise of b
 *   pitchDst  likewise of dst */
N3DS_API int32_t mcvBitwiseOru8(const uint8_t* a, const uint8_t* b, uint8_t* dst, int32_t width,
                                int32_t height, int32_t pitchA, int32_t pitchB, int32_t pitchDst);

/* Integral image and integral image of the squares, in three entry widths.
 *
 * Entry (r, c) is the sum over the rows above r and the columns left of c, so there are height + 1
 * rows and width + 1 columns and the first ones are zero. v2 and v3 have pitches and entries that
 * wrap; with a pitch of exactly width they leave the zeros out: height rows, and entry (r, c)
 * includes row r and column c.
 *
 *   src             8-bit image
 *   srcPitch        bytes from one row of src to the next; without it: width
 *   sum             receives the sums, or null
 *   sumPitch        entries from one row to the next; in v2 for both outputs; without it: width + 1
 *   squareSum       receives the sums of squares, or null
 *   squareSumPitch  entries from one row of squareSum to the next
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  src is null, or both outputs are
 *   N3DS_BAD_VALUE      a pitch is below width; v3 looks at the pitches of its set outputs only */
N3DS_API int32_t mcvImgIntegralu8(const uint8_t* src, int32_t width, int32_t height, uint64_t* sum,
                                  uint64_t* squareSum);
N3DS_API int32_t mcvImgIntegralu8v2(const uint8_t* src, int32_t width, int32_t height,
                                    int32_t srcPitch, uint32_t* sum, int32_t sumPitch,
                                    uint32_t* squareSum);
N3DS_API int32_t mcvImgIntegralu8v3(const uint8_t* src, int32_t width, int32_t height,
                                    int32_t srcPitch, uint16_t* sum, int32_t sumPitch,
                                    uint32_t* squareSum, int32_t squareSumPitch);

/* Splits packed Y0 U Y1 V into a luma and a chroma plane of the same size (U in even, V in odd
 * columns; every row kept). N3DS_NULL_ARGUMENT for a null pointer.
 *
 *   src        rows of 2 * width bytes, rounded up to a multiple of 4
 *   width      pixels; if odd, one byte of padding per output row is written
 *   height     rows
 *   lumaDst    receives rows of width bytes, rounded up to a multiple of 4
 *   chromaDst  likewise */
N3DS_API int32_t mcvYUYVToOrgData(const uint8_t* src, int32_t width, int32_t height,
                                  uint8_t* lumaDst, uint8_t* chromaDst);

/* One 8-bit plane of an image for mcvDetectMotion; rows follow each other without padding. */
typedef struct mcvMotionPlane {
  int64_t width;
  int64_t height;
  uint8_t* pixels;
} mcvMotionPlane;

/* An image of three planes, for instance luma and two chroma planes; sizes may differ per plane. */
typedef struct mcvMotionRecord {
  mcvMotionPlane* plane[3];
} mcvMotionRecord;

/* Motion mask by double frame difference: in each plane a pixel of the result is 255 where the
 * middle image differs by more than 16 levels from both its neighbours in time, else 0.
 *
 *   previous, current, next  images in order of time
 *   result                   receives the mask; its planes have the sizes of the images' planes
 *
 * Returns N3DS_OK, or
 *   N3DS_NULL_ARGUMENT  a record, one of its planes or a plane's pixels are null
 *   N3DS_BAD_VALUE      the sizes of a plane differ between the records, are below 1, or their
 *                       product exceeds INT64_MAX */
N3DS_API int32_t mcvDetectMotion(const mcvMotionRecord* previous, const mcvMotionRecord* current,
                                 const mcvMotionRecord* next, mcvMotionRecord* result);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif
