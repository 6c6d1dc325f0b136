// SPDX-License-Identifier: MIT
// Landmarks that a detector holds where it saw them last, behind a hand for instance. Nothing about
// their place tells that they are wrong until the head has moved away under them; but a landmark
// that is seen never stays on one pixel while the others move.
#pragma once

#include "steady/face.h"

namespace n3ds::steady {

// Compares the landmarks with those of the frame before. Writes to `active` the measurements to use,
// kMeasurementStride of them: those of `seen` without the frozen ones. Returns how many those are.
int LeaveOutFrozen(const Observation& seen, Face* face, float* active);

}  // namespace n3ds::steady
