// SPDX-License-Identifier: MIT
// Where outline landmarks may lie: a row of places on the skin for each, from the jaw's or the
// temple's back edge towards the cheek. Made by tools/face_model/outline_rows.py.
#pragma once

#include "steady/layout.h"

namespace n3ds::steady {

// A point on a triangle of the mesh: three vertices and their shares.
struct SurfacePlace {
  int16_t vertices[3];
  float shares[3];
};

extern const SurfacePlace kOutlineRows[kOutlineLandmarkCount][kRowPlaces];

// The way out of the face at each outline landmark: unit vectors x to the image right, y up, of an
// upright frontal face.
extern const float kOutlineNormals[kOutlineLandmarkCount][2];

}  // namespace n3ds::steady
