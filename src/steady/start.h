// SPDX-License-Identifier: MIT
// Finds a face in its landmarks alone.
#pragma once

#include "steady/face_update.h"

namespace n3ds::steady {

// What is known of a person who was here before: the information of the identity, and the face.
struct KnownPerson {
  const Face* face;
  double information[kIdentityCount * kIdentityCount];
};

// Scratch of a start.
struct StartScratch {
  Face trial;
  Face best;
};

// A cost no fit has.
constexpr float kNoFit = 1e30f;

// Fits a new face, of anybody when `known` is null, and sets its covariance. Returns the robust
// cost; kNoFit when there is no fit: the face then has a pose all the same, but is not valid.
float StartFace(const Tools& tools, const Observation& seen, const KnownPerson* known,
                StartScratch* scratch, Face* face);

}  // namespace n3ds::steady
