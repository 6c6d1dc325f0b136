// SPDX-License-Identifier: MIT
#include "core/nearest_candidate.h"

#include <algorithm>
#include <cstddef>

namespace n3ds {

namespace {

// Between coordinates up to this size no squared distance wraps.
constexpr int32_t kLargestCoordinate = 16383;

bool IsPlain(int32_t coordinate) {
  return coordinate >= -kLargestCoordinate && coordinate <= kLargestCoordinate;
}

// Keys order candidates as the rules do: by squared distance, then by class, then from the last to
// the first. On equal distance the start wins.
constexpr int32_t kRanksOfClass = 1024;
constexpr int64_t kRanks = 4 * kRanksOfClass;
constexpr int64_t kStartRank = 0;  // the last candidate's is far above
static_assert(kRanksOfClass > kSearchedCandidates);

int64_t KeyOf(int32_t squared_distance, int64_t rank) { return squared_distance * kRanks + rank; }

int64_t RankOf(int32_t n) { return n % 4 * kRanksOfClass + (kRanksOfClass - 1 - n); }
int32_t CandidateOfRank(int64_t rank) {
  return kRanksOfClass - 1 - static_cast<int32_t>(rank % kRanksOfClass);
}

int64_t KeyOfCandidate(const HullPoint* candidates, int32_t n, int32_t x, int32_t y) {
  return KeyOf(SquaredDistance(candidates[n].x, candidates[n].y, x, y), RankOf(n));
}

// How far outside of an interval a coordinate lies.
int32_t Outside(int32_t low, int32_t high, int32_t value) {
  return std::max(std::max(low - value, value - high), 0);
}

}  // namespace

NearestCandidateSearch::NearestCandidateSearch(const HullPoint* candidates)
    : candidates_(candidates) {
  for (int g = 0; g < kGroups; ++g) {
    const HullPoint* group = candidates + static_cast<ptrdiff_t>(g) * kGroupSize;
    left_[g] = right_[g] = group[0].x;
    top_[g] = bottom_[g] = group[0].y;
    for (int i = 1; i < kGroupSize; ++i) {
      left_[g] = std::min(left_[g], group[i].x);
      right_[g] = std::max(right_[g], group[i].x);
      top_[g] = std::min(top_[g], group[i].y);
      bottom_[g] = std::max(bottom_[g], group[i].y);
    }
    may_skip_ = may_skip_ && IsPlain(left_[g]) && IsPlain(right_[g]) && IsPlain(top_[g]) &&
                IsPlain(bottom_[g]);
  }
}

FoundCandidate NearestCandidateSearch::Find(int32_t x, int32_t y, const FoundCandidate& start) {
  int32_t nearest_possible[kGroups] = {};
  const bool may_skip = may_skip_ && IsPlain(x) && IsPlain(y);
  if (may_skip) {
    for (int g = 0; g < kGroups; ++g) {
      const int32_t dx = Outside(left_[g], right_[g], x);
      const int32_t dy = Outside(top_[g], bottom_[g], y);
      nearest_possible[g] = dx * dx + dy * dy;
    }
  }
  int64_t best = std::min(KeyOf(start.squared_distance, kStartRank),
                          KeyOfCandidate(candidates_, last_found_, x, y));
  for (int g = 0; g < kGroups; ++g) {
    if (may_skip && nearest_possible[g] * kRanks > best) continue;
    for (int32_t n = g * kGroupSize; n < (g + 1) * kGroupSize; ++n) {
      best = std::min(best, KeyOfCandidate(candidates_, n, x, y));
    }
  }
  const int64_t rank = best & (kRanks - 1);  // not a remainder: wrapped distances may be negative
  const auto squared_distance = static_cast<int32_t>((best - rank) / kRanks);
  if (rank == kStartRank) return start;
  last_found_ = CandidateOfRank(rank);
  return {last_found_, squared_distance};
}

}  // namespace n3ds
