// SPDX-License-Identifier: MIT
// Which measurement is which landmark of the two layouts.
#pragma once

#include "steady/face.h"

namespace n3ds::steady {

// Measurement kLandmarkStride + i lies midway between landmarks a and b.
struct Middle {
  int a;
  int b;
};
extern const Middle kMiddles[kMiddleCount];

// 1 for the measurements that are used, 0 for the others: the pupils and what pads the arrays, and
// the middles of the 101-point layout.
const float* ActiveMeasurements(bool has_middles);
int ActiveCount(bool has_middles);

// Landmarks as measurements. Coordinates beyond any image are held at its limit, so that nothing
// that is computed from them overflows.
//   landmarks  101 or 165 pairs x, y, pixels of the upright image
//   u, v       out: kMeasurementStride each
void FillMeasurements(const int* landmarks, int count, float* u, float* v);

}  // namespace n3ds::steady
