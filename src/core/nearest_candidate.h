// SPDX-License-Identifier: MIT
// The contour candidate that lies nearest to a point of the picture.
#pragma once

#include <cstdint>

#include "core/convex_hull.h"

namespace n3ds {

// The candidates that are searched; the last two of the table have a rule of their own.
constexpr int kSearchedCandidates = 532;

struct FoundCandidate {
  int32_t candidate;
  int32_t squared_distance;  // wraps, as all squared distances between pixels here
};

// Candidates in fours next to each other fall into four classes by their number modulo 4. Among
// equally near ones the first class wins, and in a class the last number: the order is part of the
// result.
//
// Most candidates are never looked at: they come in groups of neighbours on the face, each in a
// rectangle, and a rectangle that is farther away than the nearest candidate so far holds no
// nearer one.
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
