// SPDX-License-Identifier: MIT
// 3x3 rotations, row by row.
#pragma once

namespace n3ds::steady {

struct Rotation {
  float m[9];
};

Rotation operator*(const Rotation& a, const Rotation& b);
Rotation Transposed(const Rotation& a);

// The turn by |w| rad about w, and back: the turn of at most pi.
Rotation TurnBy(const float* w);
void TurnOf(const Rotation& r, float* w);

// Takes off what rounding has added to a rotation.
void Orthonormalise(Rotation* r);

}  // namespace n3ds::steady
