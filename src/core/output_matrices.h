// SPDX-License-Identifier: MIT
// From a fitted pose to what OpenGL takes.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Clip planes of the projection matrices handed out, mm.
constexpr float kNearPlane = 1.0f;
constexpr float kFarPlane = 5000.0f;

// The output view matrix looks from this far back; the model matrix is moved the other way.
constexpr float kViewDistance = 500.0f;

// The model's mean shape is pitched against an upright head by 20 degrees about x; the rigid
// outputs take this tilt back. Cosine and sine with four digits are part of the result.
constexpr float kTiltCosine = 0.9397f;
constexpr float kTiltSine = 0.342f;

// diag(1, -1, -1, 1) [R t; 0 1], column by column: from the camera's axes (y down, z into the
// scene) to OpenGL's. Returns 0; -1 for a null argument.
int32_t SolveForModelViewMatrix(const float* rotation, const float* translation, float* out);

// OpenGL perspective projection of a camera matrix for an image of width x height pixels.
// Returns 0; -1 null camera or out; -2 for a size below 1, near <= 0 or near >= far.
int32_t SolveForProjectionMatrix(const float* camera, int32_t width, int32_t height, float near,
                                 float far, float* out);

// Both matrices of a pose. The image size is taken from the principal point, so an odd size counts
// one pixel less; an image one pixel wide or high has no projection, which then keeps its values.
void WriteModelViewAndProjection(const float* rotation, const float* translation,
                                 const float* camera, float* model_view, float* projection);

// A worker's record in the context holds the model-view matrix where a caller's record holds the
// model matrix.
inline float* ModelViewOf(N3DS_RIGID_MATRIX* result) { return result->modelMatrix; }
inline const float* ModelViewOf(const N3DS_RIGID_MATRIX& result) { return result.modelMatrix; }

// Splits a worker's record into model, view and projection matrix; landmarks3D is not touched.
void SplitModelView(const N3DS_RIGID_MATRIX& result, N3DS_RIGID_MATRIX* out);

// R times the 20-degree tilt: the rotation of the upright head.
void TiltRotation(const float* rotation, float* tilted);
// A point of the model's frame in the frame of the upright head.
void TiltPoint(float* point);

}  // namespace n3ds
