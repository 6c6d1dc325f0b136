// SPDX-License-Identifier: MIT
#include "core/model_tables.h"

namespace n3ds {

const int32_t kDefaultContourVertexIndices[kOutlineLandmarkCount] = {
#include "default_contour_vertex_indices.inc"
};

const int32_t kInnerLandmarkVertexIndices[kInnerLandmarkCount] = {
#include "inner_landmark_vertex_indices.inc"
};

const int32_t kLidVertexIndices[2][2] = {
#include "lid_vertex_indices.inc"
};

const int32_t kRidgeVertexIndices[4] = {
#include "ridge_vertex_indices.inc"
};

const int32_t kMaskExtraVertexIndices[4] = {
#include "mask_extra_vertex_indices.inc"
};

const int32_t kContourCandidateVertexIndices[kContourCandidateCount] = {
#include "contour_candidate_vertex_indices.inc"
};

constexpr uint16_t kTriangles[N3DS_TRIANGLE_COUNT][3] = {
#include "triangles.inc"
};

constexpr float kTextureCoordinates[kVertexCount][2] = {
#include "texture_coordinates.inc"
};

namespace {

constexpr CornerTextureTable UnrollTextureCoordinates() {
  CornerTextureTable table{};
  for (size_t i = 0; i < N3DS_MASK_CORNER_COUNT; ++i) {
    const uint16_t vertex = kTriangles[i / 3][i % 3];
    table[2 * i] = kTextureCoordinates[vertex][0];
    table[2 * i + 1] = kTextureCoordinates[vertex][1];
  }
  return table;
}

}  // namespace

constexpr CornerTextureTable kCornerTextureCoordinates = UnrollTextureCoordinates();

}  // namespace n3ds
