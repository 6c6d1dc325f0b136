// SPDX-License-Identifier: MIT
// Convex hull of projected points, by gift wrapping (R. A. Jarvis, "On the identification of the
// convex hull of a finite set of points in the plane", 1973) that prefers the smallest turn.
#pragma once

#include <cstdint>

#include "core/model_tables.h"

namespace n3ds {

struct HullPoint {
  int32_t x;
  int32_t y;
  int32_t index;  // the point's own position in the input
};

// A walk ends when it has more hull points than this, so an output array has room for one more.
constexpr int kMaxHullPoints = kContourCandidateCount - 1;

// Walks round the points, starting at the one with the smallest y towards +x.
//   points  count points; the walk is empty when the start point's index is -1 or it lies at (0, 0)
//   hull    out: room for kMaxHullPoints + 1 points
// Returns 0; -2 for fewer than 4 points or a null array.
int32_t SearchConvexHull(const HullPoint* points, int32_t count, HullPoint* hull,
                         int32_t* hull_count);

}  // namespace n3ds
