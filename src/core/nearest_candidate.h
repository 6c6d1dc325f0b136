// SPDX-License-Identifier: MIT
// The contour candidate that lies nearest to a point of the image.
#pragma once

#include <cstdint>

#include "core/convex_hull.h"
#include "core/model_tables.h"
#include "platform/integer_arithmetic.h"

namespace n3ds {

// The candidates that are searched. The last two of the table are not: they are taken only near the
// hull vertex from which a probe starts.
constexpr int kSearchedCandidates = kContourCandidateCount - 2;

// Between pixels; wraps.
inline int32_t SquaredDistance(int32_t x0, int32_t y0, int32_t x1, int32_t y1) {
  const int32_t dx = WrapSubtract(x0, x1);
  const int32_t dy = WrapSubtract(y0, y1);
  return WrapAdd(WrapMultiply(dx, dx), WrapMultiply(dy, dy));
}

struct FoundCandidate {
  int32_t candidate;
  int32_t squared_distance;
};

// Candidate n belongs to class n % 4. Ties go to the lower class, and within a class to the higher
// number.
//
// Most candidates are never looked at: they are searched in groups of neighbours on the face, and a
// group whose bounding rectangle is farther away than the nearest candidate so far is left out.
class NearestCandidateSearch {
 public:
  // `candidates` must outlive the search.
  explicit NearestCandidateSearch(const HullPoint* candidates);

  // The candidate nearest to (x, y) among those nearer than `start`, or `start` itself.
  FoundCandidate Find(int32_t x, int32_t y, const FoundCandidate& start);

 private:
  static constexpr int kGroupSize = 28;
  static constexpr int kGroups = kSearchedCandidates / kGroupSize;
  static_assert(kGroups * kGroupSize == kSearchedCandidates && kGroupSize % 4 == 0);

  const HullPoint* candidates_;
  int32_t last_found_ = 0;  // neighbouring points find neighbouring candidates
  bool may_skip_ = true;    // whether squared distances can be compared as such
  int32_t left_[kGroups], right_[kGroups], top_[kGroups], bottom_[kGroups];
};

}  // namespace n3ds
