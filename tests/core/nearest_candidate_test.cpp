// SPDX-License-Identifier: MIT
#include "core/nearest_candidate.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "core/contour_reference.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

// Four searches side by side, each keeping the last of equally near candidates; then the first of
// them that is nearest.
FoundCandidate FindInFourClasses(const std::vector<HullPoint>& candidates, int32_t x, int32_t y,
                                 const FoundCandidate& start) {
  FoundCandidate best = start;
  for (int32_t lane = 0; lane < 4; lane++) {
    FoundCandidate lane_best = start;
    for (int32_t n = lane; n < kSearchedCandidates; n += 4) {
      const int32_t distance = SquaredGap(candidates[static_cast<size_t>(n)], x, y);
      if (distance <= lane_best.squared_distance) lane_best = {n, distance};
    }
    if (lane_best.squared_distance < best.squared_distance) best = lane_best;
  }
  return best;
}

// Candidates around a centre, with `spread` of 0 all in one place; neighbours in number are
// neighbours in place, as on a face, or not at all.
std::vector<HullPoint> Candidates(int32_t centre, int32_t spread, bool ordered, Random* random) {
  std::vector<HullPoint> candidates(kSearchedCandidates);
  for (int32_t n = 0; n < kSearchedCandidates; n++) {
    const int32_t offset = ordered ? n / 7 : 0;
    candidates[static_cast<size_t>(n)] = {centre + offset + random->Int(-spread, spread),
                                          offset - centre + random->Int(-spread, spread), n};
  }
  return candidates;
}

void ExpectSameFinds(const std::vector<HullPoint>& candidates, int32_t centre, int32_t reach,
                     Random* random) {
  NearestCandidateSearch search(candidates.data());
  for (int i = 0; i < 40; i++) {
    const int32_t x = centre + random->Int(-reach, reach);
    const int32_t y = random->Int(-reach, reach) - centre;
    const int32_t from = random->Int(0, kSearchedCandidates - 1);
    const FoundCandidate start = {1000 + from,
                                  SquaredGap(candidates[static_cast<size_t>(from)], x, y)};
    const FoundCandidate expected = FindInFourClasses(candidates, x, y, start);
    const FoundCandidate actual = search.Find(x, y, start);
    ASSERT_EQ(actual.candidate, expected.candidate) << x << ' ' << y;
    ASSERT_EQ(actual.squared_distance, expected.squared_distance) << x << ' ' << y;
  }
}

TEST(NearestCandidate, IsTheOneOfFourSearchesSideBySide) {
  Random random = TestRandom();
  for (const bool ordered : {false, true}) {
    for (const int32_t spread : {0, 1, 3, 10, 100, 2000}) {
      for (const int32_t reach : {2, 60, 3000}) {
        for (int trial = 0; trial < 10; trial++) {
          ExpectSameFinds(Candidates(random.Int(-500, 500), spread, ordered, &random), 0, reach,
                          &random);
        }
      }
    }
  }
}

// Around 16383 squared distances begin to wrap; a group's rectangle says nothing from there on.
TEST(NearestCandidate, SquaredDistancesMayWrap) {
  Random random = TestRandom();
  for (const int32_t size : {16300, 16383, 16384, 30000, 46341, 1 << 20, 1 << 30}) {
    for (int trial = 0; trial < 20; trial++) {
      ExpectSameFinds(Candidates(0, size, false, &random), 0, size, &random);
      ExpectSameFinds(Candidates(0, 200, true, &random), 0, size, &random);
      ExpectSameFinds(Candidates(size, 200, true, &random), -size, 500, &random);
    }
  }
}

TEST(NearestCandidate, ACandidateAsFarAsTheStartDoesNotReplaceIt) {
  std::vector<HullPoint> candidates(kSearchedCandidates, HullPoint{100, 100, 0});
  NearestCandidateSearch search(candidates.data());
  EXPECT_EQ(search.Find(97, 96, {777, 25}).candidate, 777);
  EXPECT_EQ(search.Find(97, 96, {777, 26}).candidate, 528);
  EXPECT_EQ(search.Find(97, 96, {777, 26}).squared_distance, 25);
  EXPECT_EQ(search.Find(100, 100, {777, 0}).candidate, 777);
  EXPECT_EQ(search.Find(100, 100, {777, -1}).squared_distance, -1);
}

}  // namespace
}  // namespace n3ds::testing
