// SPDX-License-Identifier: MIT
// What the steady tracker takes from a face model, once a model: the vectors of its landmarks and
// outline places apart by coordinate, and two matrices that follow from the model alone.
#pragma once

#include <cstdint>

#include "core/tracking_context.h"
#include "steady/layout.h"

namespace n3ds::steady {

// Lengths are mm; identity is in standard deviations of the population, of which the model file's
// coefficients are an eighth.
// The kernels load whole groups: every array they read starts at a multiple of 32 bytes.
struct alignas(32) Model {
  // Landmarks.
  float mean[3][kLandmarkStride];
  float identity[kIdentityCount][3][kLandmarkStride];
  float expression[kExpressionCount][3][kLandmarkStride];
  // Change of an expression vector by an identity value; zero where the two do not interact.
  float interaction[kIdentityCount][kExpressionCount][3][kLandmarkStride];

  // Places of the outline's rows. Expressions there take no part in the interaction.
  float place_mean[3][kPlaceStride];
  float place_identity[kIdentityCount][3][kPlaceStride];
  float place_expression[kExpressionCount][3][kPlaceStride];
  // The same identity and expression vectors once more, one place after the other.
  float place_vectors[kPlaceCount][kPlaceVectorStride];
  // The way out of the face at each place: x to the right, y up, of an upright frontal face.
  float place_normal[2][kPlaceStride];

  // 1 for landmarks that may deviate from the model: the inner ones without the pupils.
  float has_offset[kLandmarkStride];

  // Offsets of the landmarks that are turns, shifts, sizes or identities; x, y, z of all landmarks
  // one after the other. Taking gauge' (gauge_dual offsets) off an offset leaves none of them.
  float gauge[kGaugeStride][3 * kLandmarkStride];
  float gauge_dual[kGaugeStride][3 * kLandmarkStride];

  // The head turns about this point: the middle of eyes and nose.
  float centre[3];

  // Turn (3), shift (3) and growth (1) that take the mean's upper face to a person's, by identity:
  // what is put on the mean face by a sticker's artist then lies on the person's.
  float output_frame[7][kIdentityCount];

  // Share of the landmarks' offsets that a vertex of the mesh takes: kOffsetNeighbours landmarks.
  static constexpr int kOffsetNeighbours = 6;
  int16_t neighbour[kVertexCount][kOffsetNeighbours];
  float neighbour_share[kVertexCount][kOffsetNeighbours];
};

// Fills the tables from the context's loaded face model.
void BuildModel(const TrackingContext& context, Model* model);

}  // namespace n3ds::steady
