// SPDX-License-Identifier: MIT
// The engine's constant tables. Their values are in data/, one file per table.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "norvale_3d_sticker_engine.h"

namespace n3ds {

// Millimetres per unit of the model's 16-bit coordinates, which have 8 fractional bits.
constexpr float kModelUnit = 1.0f / 256.0f;

constexpr int kVertexCount = N3DS_VERTEX_COUNT;
constexpr int kShapeSize = 3 * kVertexCount;  // coordinates of a shape: x, y, z per vertex
constexpr int kIdentityCount = 16;
constexpr int kExpressionCount = 20;

constexpr int kOutlineLandmarkCount = 19;  // landmarks 0 to 18
constexpr int kInnerLandmarkCount = 76;    // landmarks 19 to 94
constexpr int kFitLandmarkCount = kOutlineLandmarkCount + kInnerLandmarkCount;
constexpr int kContourCandidateCount = 534;

// Vertex of each outline landmark of a frontal face, before a correspondence exists.
extern const int32_t kDefaultContourVertexIndices[kOutlineLandmarkCount];
// Vertex of each inner landmark; entry 0 belongs to landmark 19.
extern const int32_t kInnerLandmarkVertexIndices[kInnerLandmarkCount];
// Vertices of landmarks 95 and 96: the middles of the upper and the lower lid of each eye.
extern const int32_t kLidVertexIndices[2][2];
// Vertices of landmarks 97 to 100.
extern const int32_t kRidgeVertexIndices[4];
// The same in mask mode, where they start with the lid vertices of landmark 96: 97 and 98 lie at
// the depth of an eye, 99 and 100 at that of the upper half of the ridge.
extern const int32_t kMaskExtraVertexIndices[4];
// Vertices where the silhouette can arise, ascending; the position is the candidate number.
extern const int32_t kContourCandidateVertexIndices[kContourCandidateCount];

// Vertex indices of the mesh's triangles, counter-clockwise seen from outside.
extern const uint16_t kTriangles[N3DS_TRIANGLE_COUNT][3];
// Texture coordinates u, v of each vertex, v down.
extern const float kTextureCoordinates[kVertexCount][2];

// The tables unrolled by triangle corner: u, v of vertex kTriangles[i / 3][i % 3].
using CornerTextureTable = std::array<float, 2 * static_cast<size_t>(N3DS_MASK_CORNER_COUNT)>;
extern const CornerTextureTable kCornerTextureCoordinates;

}  // namespace n3ds
