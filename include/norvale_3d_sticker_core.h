/* SPDX-License-Identifier: MIT */
/*
 * Norvale 3-D sticker engine: exported core functions.
 *
 * For hosts that want more than the engine interface: the tracking core, the mask image functions,
 * the numerical toolkit, the memory layer, the task pool and the kernels.
 *
 * Conventions, unless a function says otherwise:
 *   - Results: N3DS_OK (0), N3DS_NULL_ARGUMENT (-1), N3DS_BAD_VALUE (-2), N3DS_NUMERICAL (-100),
 *     N3DS_NO_MEMORY (-201). Nothing is written when -1 or -2 is returned.
 *   - Everything is single precision. 3x3 matrices are 9 floats, row by row, for column vectors.
 *     4x4 matrices are 16 floats, column by column (OpenGL).
 *   - A camera matrix K is 3x3; only fx = K[0], cx = K[2], fy = K[4], cy = K[5] are read (pixels).
 *   - A pose is 7 floats qw, qx, qy, qz, tx, ty, tz: a camera-space point is Q = R(q) X + t, in mm,
 *     with x right, y down, z into the scene.
 *   - Buffers belong to the caller; no function keeps a pointer unless it says so.
 *   - Functions hold no state of their own and may run on any thread, one context or pool at a
 * time.
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
 * All memory of the core is taken through a handle. A null handle is the system heap. Any other
 * handle is a pool inside a fixed area of the caller's, a first-fit chain of blocks with 16-byte
 * headers, without a lock: callers who share a pool between threads serialise its use themselves.
 * A core that tracks several faces allocates on its worker threads, so it needs the system heap. */
typedef void* MHandle;

/* Makes a pool in `length` bytes at `area` (start rounded up, length down to a multiple of 8). The
 * area stays the caller's and must outlive the pool. Returns null when area is null or the length
 * left over after 32 bytes of bookkeeping is not positive. */
N3DS_API MHandle MMemMgrCreate(void* area, size_t length);
/* Does nothing: the area belongs to the caller. */
N3DS_API void MMemMgrDestroy(MHandle pool);

/* Allocates `size` bytes, aligned to 8. Null handle: malloc(size); otherwise MMemAllocStatic, which
 * sees the low 32 bits of size. Returns null when memory is exhausted. */
N3DS_API void* MMemAlloc(MHandle memory, size_t size);
/* Frees what MMemAlloc or MMemRealloc with the same handle gave; null is allowed. */
N3DS_API void MMemFree(MHandle memory, void* pointer);
/* As realloc, in the memory of the handle. On failure null, and the old block stays valid. */
N3DS_API void* MMemRealloc(MHandle memory, void* pointer, size_t size);

/* The pool's own operations. A size is rounded up to a multiple of 8; null for a null pool, size 0
 * or exhaustion. Pointers must be live payloads of this pool: this is not checked. */
N3DS_API void* MMemAllocStatic(MHandle pool, uint32_t size);
N3DS_API void MMemFreeStatic(MHandle pool, void* pointer);
N3DS_API void* MMemReallocStatic(MHandle pool, void* pointer, uint32_t size);
/* Size in bytes of the pool's largest free block, 0 when there is none; 2 for a null pool. */
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
 * N3DS_GetRigidMatrix (rigid) or N3DS_GetFace3DModel (mask) -> N3DS_UnInit. */

/* One face's landmarks in whole pixels of the upright, unmirrored picture. */
typedef struct N3DS_LANDMARK {
  int32_t* points; /* count pairs x, y; the core writes its smoothed positions back into them */
  uint32_t count;  /* 101 or 165 */
} N3DS_LANDMARK;

/* One face's matrices as the core reports them. */
typedef struct N3DS_RIGID_MATRIX {
  float modelMatrix[16];      /* model-view matrix moved by +500 along z */
  float viewMatrix[16];       /* identity, but z translation -500 */
  float projectionMatrix[16]; /* near 1, far 5000 */
  float* landmarks3D;         /* caller's buffer, 3 floats per landmark, model frame, mm */
} N3DS_RIGID_MATRIX;

/* One face's dense mesh. */
typedef struct N3DS_3D_MODEL {
  float* vertices;     /* x, y, z per vertex, model frame, mm; belongs to the core, valid until
                          the next frame */
  int64_t vertexCount; /* 1812 */
  const uint16_t* triangles; /* three vertex indices per triangle; a constant table */
  int64_t triangleCount;     /* 3456 */
} N3DS_3D_MODEL;

/* Creates a context that takes its memory from `memory` and hands it out through `core`. Returns 0,
 * or -1 when core is null. An exhausted memory is a fatal assertion. */
N3DS_API MRESULT N3DS_Init(MHandle memory, void** core);
/* Releases a context and all it holds; null is allowed. Returns 0. */
N3DS_API MRESULT N3DS_UnInit(void* core);
/* Loads a face model from `size` bytes at `data`, which are copied. Returns 0; -1 null core or
 * data; -2 for a size or header that is not a face model's; -201. Loading again replaces the model.
 */
N3DS_API MRESULT N3DS_LoadFaceHouse(void* core, const void* data, size_t size);

/* Tracks the faces of one frame: matches them to the tracks of the frame before and fits each on a
 * worker thread.
 *   image   upright picture: only width and height are read, each at least 1
 *   faces   nFaces landmark records, all with the same count; may be null if nFaces is 0
 *   nFaces  0 to 5; 0 ends all tracks
 * Returns 0; -1 null core or image, no model loaded, or null faces with nFaces > 0; -2 bad size,
 * face or landmark count; -201; -100 when the task pool fails. */
N3DS_API MRESULT N3DS_Build3DFaceForVideo_Rigid(void* core, const NSVL_OFFSCREEN* image,
                                                N3DS_LANDMARK* faces, int32_t nFaces);
/* The same in mask mode, which fits the shape of the face as well. */
N3DS_API MRESULT N3DS_Build3DFaceForVideo_Mask(void* core, const NSVL_OFFSCREEN* image,
                                               N3DS_LANDMARK* faces, int32_t nFaces);

/* Reports the matrices and 3-D landmarks of the last rigid frame.
 *   records  nFaces records, each with its landmarks3D buffer set
 * Returns 0; -1 null argument; -2 when nFaces differs from the last frame's; -100 when a rotation
 * cannot be inverted (the records of earlier faces are filled). */
N3DS_API MRESULT N3DS_GetRigidMatrix(void* core, N3DS_RIGID_MATRIX* records, int32_t nFaces);

/* Builds the dense meshes of the last mask frame and reports them with matrices and 3-D landmarks.
 *   models   nFaces records, filled
 *   records  nFaces records, each with its landmarks3D buffer set
 * Returns 0; -1 null argument or no model loaded; -2 when nFaces differs from the last frame's or
 * the task pool cannot be shut down; -100 task pool failure or a rotation that cannot be inverted;
 * -201. After -100 and -201 the records may be partly filled. */
N3DS_API MRESULT N3DS_GetFace3DModel(void* core, N3DS_3D_MODEL* models, N3DS_RIGID_MATRIX* records,
                                     int32_t nFaces);
/* Landmarks per face, latched by the first frame with a face: 101 or 165, 0 before it; -1 for a
 * null core. */
N3DS_API int32_t N3DS_Get3DLandmarkNum(void* core);

/* ---------------------------------------------------------------------------------------------
 * Mask texture */

/* A mask picture and its layout. With texCoords or triangles null the engine's own layout serves
 * (texture vertex i is mesh vertex i) and the counts are not looked at. */
typedef struct N3DS_2D_TEXTURE_MASK {
  const float* texCoords;    /* u, v per texture vertex, 0..1, v up */
  int64_t texCoordCount;     /* 1812 */
  const uint16_t* triangles; /* three texture vertices per triangle, in the order of the mesh */
  int64_t triangleCount;     /* 3456 */
  NSVL_OFFSCREEN image;      /* mask picture, N3DS_FORMAT_BGRA32 */
} N3DS_2D_TEXTURE_MASK;

/* Draws a mask picture onto a tracked face of the last mask frame, in upright image coordinates.
 * Triangles are drawn in the order of the list and later ones overwrite earlier ones: where a
 * turned face hides a part of itself, hand over a list sorted from far to near. The last row and
 * column of the output are never drawn.
 *   output     BGRA picture, transparent where the face is not. If plane[0] is null it is set up as
 *              width x height and its buffer taken from the core's memory; release it with MMemFree
 *              and the handle given to N3DS_Init. Otherwise its own size and pitch hold.
 *   model      the face's mesh from N3DS_GetFace3DModel
 *   faceIndex  0 to the last frame's face count - 1
 * Returns 0; -1 null argument; -2 bad size, format or index; -201. Wrong counts in the texture
 * record or a face without a track give a clear output and 0. */
N3DS_API MRESULT N3DS_WarpFaceMask(void* core, const N3DS_2D_TEXTURE_MASK* mask,
                                   NSVL_OFFSCREEN* output, const N3DS_3D_MODEL* model,
                                   int32_t width, int32_t height, int32_t faceIndex);

/* Blends a mask picture (N3DS_FORMAT_BGRA32) over an image, shaded by the image's own brightness.
 *   core    not used; may be null
 *   image   N3DS_FORMAT_BGR24 or N3DS_FORMAT_NV21
 *   output  same format; may be the same descriptor as image. BGR24: all pixels under the mask's
 *           rectangle are written. NV21: only 2 x 2 blocks that the mask touches are written.
 * BGR24: image and output must be at least as large as the mask; NV21: the mask at least as large
 * as the image; neither is checked. Returns 0; -1 null argument; -2 wrong or different formats. */
N3DS_API MRESULT N3DS_BlendFaceMask(void* core, NSVL_OFFSCREEN* image, NSVL_OFFSCREEN* mask,
                                    NSVL_OFFSCREEN* output);

/* Colour conversion of one packed word: R, G, B in bits 16-23, 8-15, 0-7; Y, U (Cb), V (Cr)
 * likewise. Full-range BT.601 weights in 15-bit fixed point, clamped to 0..255. */
N3DS_API uint32_t RGB2YUV(uint32_t rgb);
N3DS_API uint32_t YUV2RGB(uint32_t yuv);

/* ---------------------------------------------------------------------------------------------
 * Numerical toolkit
 *
 * `memory` is where scratch memory comes from. */

/* Fits a pose to 2-D points by damped least squares (Levenberg-Marquardt with the gain-ratio
 * damping of Madsen, Nielsen and Tingleff, "Methods for Non-Linear Least Squares Problems", 2004).
 *   landmarks      pointCount pairs x, y, pixels
 *   modelPoints    pointCount triples X, Y, Z, mm
 *   pose           paramCount floats, in: start, out: last accepted estimate. The quaternion is
 * used as it is and not normalised: its squared length scales the model. contourWeight,
 * rangeWeight, innerWeight, weightingMode weights by landmark index; weightingMode 0 switches the
 * inner weights off paramCount     7 Returns 0, also when 20 iterations did not converge; -1 null
 * argument or no memory for the first work arrays; -2 negative count; -201; -100 for a point at
 * zero depth ("zero in zc" is printed) or a singular system. */
N3DS_API MRESULT SolveByLM(MHandle memory, const float* landmarks, const float* modelPoints,
                           int32_t pointCount, const float* camera, float* pose,
                           float contourWeight, float rangeWeight, int64_t weightingMode,
                           float innerWeight, int32_t paramCount);

/* Residuals of a pose and, on request, their derivatives; arguments as above.
 *   J    2 pointCount x paramCount, row-major: rows 2i, 2i + 1 are du, dv of point i
 *   JtJ  paramCount x paramCount;  g  paramCount, the gradient J^T r
 *        J, JtJ and g are all null (residuals only) or all set
 *   r    2 pointCount residuals, projected minus observed, weighted
 * Returns 0; -2 for a mix of null and set outputs or a negative count; -1; -100 for a point at zero
 * depth (arrays partly written); -201. */
N3DS_API MRESULT ComputeJacobianEtc(MHandle memory, float* J, float* JtJ, float* g, float* r,
                                    const float* landmarks, const float* modelPoints,
                                    int32_t pointCount, const float* camera, const float* pose,
                                    float contourWeight, float rangeWeight, int64_t weightingMode,
                                    float innerWeight, int32_t paramCount);

/* Solves A x = b, A rows x cols row-major; in the least-squares sense, through the normal
 * equations, when rows > cols. cols must be at least 1. Returns 0; -1; -2 when rows < cols or
 * negative; -100 for a pivot below 1e-6 (absolute; "zero in LU" is printed); -201. x is untouched
 * on failure. */
N3DS_API MRESULT SolveLinearAxb(MHandle memory, const float* A, int32_t rows, int32_t cols,
                                float* x, const float* b);
/* Factorises the n x n matrix A into unit lower triangle L and upper triangle U, n x n each,
 * without exchanging rows. Returns 0; -1; -2 when n < 0; -100 for a pivot below 1e-6. */
N3DS_API MRESULT MatDecompLU(const float* A, int32_t n, float* L, float* U);

/* Rotation matrix of a quaternion w, x, y, z that is not normalised: |q|^2 times a rotation. */
N3DS_API MRESULT QuatToRotationMatrix(const float* quat, float* matrix);
/* Quaternion of a rotation matrix; its largest component comes out positive. */
N3DS_API MRESULT RotationMatrixToQuat(const float* matrix, float* quat);
/* Euler angles in radians, about x, y and z, with R = Rz Ry Rx. A quaternion longer than 1 can make
 * the angle about y not a number. */
N3DS_API MRESULT QuatToEuler(const float* quat, float* euler);
/* The reverse. */
N3DS_API MRESULT EulerToQuat(const float* euler, float* quat);
/* Inverse of any 3x3 matrix; -100 when the determinant is exactly 0. */
N3DS_API MRESULT MatrixInverse3X3(const float* matrix, float* inverse);

/* ---------------------------------------------------------------------------------------------
 * Task pool
 *
 * mcvParallelInit -> mcvAddTask for each task -> mcvWaitTask for each id -> mcvParallelUninit. Any
 * thread may add and wait. At most 32 tasks may be pending, and at most 32 finished but not waited
 * for. Tasks still pending at shutdown are dropped. */
typedef void* (*mcvTaskFunction)(void* argument); /* the result is ignored */

/* Starts a pool of `threads` workers, at most the configured processors and at most 16; 0: as many
 * as processors are online, at most 16. Returns null on failure. */
N3DS_API void* mcvParallelInit(MHandle memory, uint32_t threads);
/* Stops the workers, waits for them and frees the pool. Returns 0; -1 null; -3 when another call is
 * already doing so. */
N3DS_API int32_t mcvParallelUninit(void* pool);
/* Queues a task. Returns its id (at least 0); -1 null pool or function; -4 when 32 tasks are
 * pending.
 */
N3DS_API int32_t mcvAddTask(void* pool, mcvTaskFunction function, void* argument);
/* Waits until the task of that id has finished. Returns 0; -1 null pool. Each id can be waited for
 * once; an id that was never given out is waited for for ever. */
N3DS_API int32_t mcvWaitTask(void* pool, int32_t id);
/* Number of workers; 0 for a null pool. */
N3DS_API uint32_t mcvParallelEngineCores(void* pool);
/* As MMemAlloc and MMemFree. */
N3DS_API void* mcvMemAlloc(MHandle memory, size_t size);
N3DS_API void mcvMemFree(MHandle memory, void* pointer);
/* Switches processor cores that are offline on, through the kernel's per-core switch, as far as it
 * may be written; mcvTryRestoreCpu puts them back. The frame calls use neither. */
N3DS_API void mcvTryFireCpu(void* pool);
N3DS_API void mcvTryRestoreCpu(void* pool);

/* ---------------------------------------------------------------------------------------------
 * Kernels
 *
 * Matrices are row-major and dense. Matrix kernels return 0, or -1 when a matrix is null; with a
 * dimension below 1 they return 0 and write nothing, but a product with k < 1 sets C to zero.
 * Integer arithmetic wraps. Outputs must not overlap inputs of a product. */
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
/* The scalar comes before the sizes. */
N3DS_API int32_t mcvMatrixMulScalar_s32(int32_t* dst, const int32_t* src, int32_t s, int32_t rows,
                                        int32_t cols);
/* C (m x n) = A (m x k) B (k x n). Each entry sums its k terms in order by fused multiply-adds. */
N3DS_API int32_t mcvMatrixMulMatrixRowMajor_f32(float* C, const float* A, const float* B, int32_t m,
                                                int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulMatrixRowMajor_s32(int32_t* C, const int32_t* A, const int32_t* B,
                                                int32_t m, int32_t k, int32_t n);
/* Products are formed in 32 bits (wrapping) and summed in 64. */
N3DS_API int32_t mcvMatrixMulMatrixRowMajor_s64(int64_t* C, const int16_t* A, const int32_t* B,
                                                int32_t m, int32_t k, int32_t n);
/* The same products with all three matrices stored column by column. */
N3DS_API int32_t mcvMatrixMulMatrixColMajor_f32(float* C, const float* A, const float* B, int32_t m,
                                                int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulMatrixColMajor_s32(int32_t* C, const int32_t* A, const int32_t* B,
                                                int32_t m, int32_t k, int32_t n);
/* D = A B + E, the product formed first (zero for k < 1). */
N3DS_API int32_t mcvMatrixMulAddRowMajor_f32(float* D, const float* A, const float* B,
                                             const float* E, int32_t m, int32_t k, int32_t n);
N3DS_API int32_t mcvMatrixMulAddRowMajor_s32(int32_t* D, const int32_t* A, const int32_t* B,
                                             const int32_t* E, int32_t m, int32_t k, int32_t n);

/* Euclidean distance of two vectors of n elements; 0 for n < 1. No null check. The u32 and s32
 * forms convert each element to float first; the Fast forms sum the squares exactly as integers. */
N3DS_API double mcvVectorDiffNorm2f32(const float* a, const float* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2u32(const uint32_t* a, const uint32_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2s32(const int32_t* a, const int32_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fastu8(const uint8_t* a, const uint8_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fasts8(const int8_t* a, const int8_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fastu16(const uint16_t* a, const uint16_t* b, int32_t n);
N3DS_API double mcvVectorDiffNorm2Fasts16(const int16_t* a, const int16_t* b, int32_t n);
/* Sum of products of bytes, which are read as unsigned whatever the name says. All bits set for a
 * null pointer. */
N3DS_API uint64_t mcvDotProducts8(const void* a, const void* b, uint32_t n);
/* Number of set bits in n bytes; -1 for null. */
N3DS_API int32_t mcvBitCountu8(const uint8_t* p, uint32_t n);
N3DS_API float mcvSqrtf32(float x);
N3DS_API int32_t mcvSqrtVectorf32(const float* src, float* dst, int32_t n);
/* 1 / sqrt(x) by the bit-shift estimate and two Newton steps: 0.4999978 for 4. */
N3DS_API float mcvInvSqrtf32(float x);
N3DS_API int32_t mcvInvSqrtVectorf32(const float* src, float* dst, int32_t n);
N3DS_API float mcvDivf32(float a, float b);
/* dst = src / s. Always 0; no null check. */
N3DS_API int32_t mcvVectorDivf32(float* dst, const float* src, int32_t n, float s);
/* Integer square root by table, with at most 8 significant bits; -2 for a negative value. */
N3DS_API int32_t mcvFastSqrts32(int32_t v);
N3DS_API int64_t mcvFastSqrts64(int64_t v);

/* Halves an 8-bit picture: each output byte is the truncated mean of a 2 x 2 block. Rows are width
 * and width / 2 bytes. Returns 0; -1 null; -2 for a width or height below 4. */
N3DS_API int32_t mcvScaleDownBy2u8(const uint8_t* src, int32_t width, int32_t height, uint8_t* dst);
/* dst = a | b, row by row; pitches in bytes. Returns 0; -1 null. */
N3DS_API int32_t mcvBitwiseOru8(const uint8_t* a, const uint8_t* b, uint8_t* dst, int32_t width,
                                int32_t height, int32_t pitchA, int32_t pitchB, int32_t pitchDst);
/* Integral picture and integral of squares, (width + 1) x (height + 1) entries each: entry (r, c)
 * is the sum over the rows above r and the columns left of c. Either output may be null, not both
 * (-1). */
N3DS_API int32_t mcvImgIntegralu8(const uint8_t* src, int32_t width, int32_t height, uint64_t* sum,
                                  uint64_t* squareSum);
/* As mcvImgIntegralu8 with 32-bit entries (wrapping) and pitches: srcPitch in bytes, sumPitch in
 * entries, for both outputs. With sumPitch > width the layout has the leading zero row and column
 * and height + 1 rows; with sumPitch == width entry (r, c) is the sum up to and including row r and
 * column c, height rows. Returns 0; -1; -2 when a pitch is below width. */
N3DS_API int32_t mcvImgIntegralu8v2(const uint8_t* src, int32_t width, int32_t height,
                                    int32_t srcPitch, uint32_t* sum, int32_t sumPitch,
                                    uint32_t* squareSum);
/* As v2 with 16-bit sums (wrapping) and a pitch for each output, which only counts if the output is
 * set. */
N3DS_API int32_t mcvImgIntegralu8v3(const uint8_t* src, int32_t width, int32_t height,
                                    int32_t srcPitch, uint16_t* sum, int32_t sumPitch,
                                    uint32_t* squareSum, int32_t squareSumPitch);
/* Splits packed Y0 U Y1 V into a luma plane and a chroma plane of the same size (U at even, V at
 * odd columns; every row kept). Source rows are 2 width bytes, output rows width bytes, each
 * rounded up to a multiple of 4. An odd width writes one byte of padding per row, the second half
 * of its last pair. Returns 0; -1 null. */
N3DS_API int32_t mcvYUYVToOrgData(const uint8_t* src, int32_t width, int32_t height,
                                  uint8_t* lumaDst, uint8_t* chromaDst);

/* One 8-bit plane of a picture for mcvDetectMotion; rows follow each other without padding. */
typedef struct mcvMotionPlane {
  int64_t width;
  int64_t height;
  uint8_t* pixels;
} mcvMotionPlane;

/* A picture of three planes, for instance luma and two chroma planes; sizes may differ per plane.
 */
typedef struct mcvMotionRecord {
  mcvMotionPlane* plane[3];
} mcvMotionRecord;

/* Motion mask by double frame difference: in each plane a result pixel is 255 where the middle
 * picture differs by more than 16 levels from both its neighbours in time, else 0.
 *   previous, current, next  pictures in order of time
 *   result                   mask, written; its planes have the sizes of the pictures' planes
 * Returns 0; -1 when a record, one of its planes or a plane's pixels are null; -2 when the sizes of
 * a plane differ between the records or are below 1. */
N3DS_API int32_t mcvDetectMotion(const mcvMotionRecord* previous, const mcvMotionRecord* current,
                                 const mcvMotionRecord* next, mcvMotionRecord* result);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif
