// SPDX-License-Identifier: MIT
#include "core/convex_hull.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <set>
#include <vector>

#include "core/hull_reference.h"
#include "norvale_3d_sticker_core.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds {

// In the point's own namespace, where matchers look for them.
static bool operator==(const HullPoint& a, const HullPoint& b) {
  return a.x == b.x && a.y == b.y && a.index == b.index;
}
static void PrintTo(const HullPoint& p, std::ostream* os) {
  *os << '(' << p.x << ',' << p.y << ")#" << p.index;
}

namespace testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

std::vector<HullPoint> Numbered(const std::vector<std::pair<int32_t, int32_t>>& positions) {
  std::vector<HullPoint> points;
  for (const auto& [x, y] : positions) {
    points.push_back({x, y, static_cast<int32_t>(points.size())});
  }
  return points;
}

// The hull, found in an output array of exactly the documented size.
std::vector<HullPoint> Hull(const std::vector<HullPoint>& points) {
  const std::unique_ptr<HullPoint[]> out(new HullPoint[kMaxHullPoints + 1]);
  int32_t count = -7;
  EXPECT_EQ(SearchConvexHull(points.data(), static_cast<int32_t>(points.size()), out.get(), &count),
            N3DS_OK);
  return {out.get(), out.get() + count};
}

std::vector<int32_t> Indices(const std::vector<HullPoint>& hull) {
  std::vector<int32_t> indices;
  for (const HullPoint& p : hull) indices.push_back(p.index);
  return indices;
}

TEST(ConvexHull, FewerThanFourPointsAreRefused) {
  const std::vector<HullPoint> points = Numbered({{5, 1}, {9, 5}, {5, 9}, {1, 5}});
  HullPoint out[4];
  int32_t count = 99;
  for (const int32_t n : {-1, 0, 1, 3}) {
    EXPECT_EQ(SearchConvexHull(points.data(), n, out, &count), N3DS_BAD_VALUE);
  }
  EXPECT_EQ(count, 99);
  EXPECT_EQ(SearchConvexHull(points.data(), 4, out, &count), N3DS_OK);
}

TEST(ConvexHull, NullArraysAreRefused) {
  const std::vector<HullPoint> points = Numbered({{5, 1}, {9, 5}, {5, 9}, {1, 5}});
  HullPoint out[4];
  int32_t count = 99;
  ExpectEachNullRefused(N3DS_BAD_VALUE, SearchConvexHull, points.data(), 4, out, &count);
  EXPECT_EQ(count, 99);
}

TEST(ConvexHull, WalksFromTheTopTowardsTheRight) {
  EXPECT_THAT(Indices(Hull(Numbered({{1, 50}, {50, 99}, {50, 50}, {99, 50}, {50, 1}}))),
              ElementsAre(4, 3, 1, 0));
}

TEST(ConvexHull, FirstOfTheTopmostPointsStarts) {
  // 1 and 2 are equally high; the walk goes on from 1 to 2.
  EXPECT_THAT(Indices(Hull(Numbered({{20, 90}, {10, 5}, {90, 5}, {80, 90}}))),
              ElementsAre(1, 2, 3, 0));
  // The start is the right one here; the other lies straight behind and closes the hull.
  EXPECT_THAT(Indices(Hull(Numbered({{20, 90}, {90, 5}, {10, 5}, {80, 90}}))),
              ElementsAre(1, 3, 0, 2));
}

TEST(ConvexHull, PointsCarryTheirPositions) {
  const std::vector<HullPoint> points = Numbered({{1, 50}, {50, 99}, {50, 50}, {99, 50}, {50, 1}});
  EXPECT_THAT(Hull(points), ElementsAre(points[4], points[3], points[1], points[0]));
}

TEST(ConvexHull, StartPointNumberedMinusOneGivesAnEmptyHull) {
  std::vector<HullPoint> points = Numbered({{1, 50}, {50, 99}, {99, 50}, {50, 1}});
  points[3].index = -1;
  EXPECT_THAT(Hull(points), IsEmpty());
  points[3].index = 3;
  points[1].index = -1;  // not the start point
  EXPECT_EQ(Hull(points).size(), 4u);
}

TEST(ConvexHull, StartPointAtTheOriginGivesAnEmptyHull) {
  EXPECT_THAT(Hull(Numbered({{0, 0}, {50, 10}, {40, 60}, {-20, 30}})), IsEmpty());
  EXPECT_EQ(Hull(Numbered({{1, 0}, {50, 10}, {40, 60}, {-20, 30}})).size(), 4u);
  // The origin elsewhere is a point like any other.
  EXPECT_THAT(Indices(Hull(Numbered({{0, 0}, {50, -10}, {90, 30}, {40, 60}}))),
              ElementsAre(1, 2, 3, 0));
}

TEST(ConvexHull, AllPointsAtOnePlaceGiveTheStartAlone) {
  EXPECT_THAT(Indices(Hull(Numbered({{7, 7}, {7, 7}, {7, 7}, {7, 7}, {7, 7}}))), ElementsAre(0));
}

TEST(ConvexHull, CollinearMiddlePointBeforeTheStartIsDropped) {
  // On the way back from 3 to the start 0, point 4 lies almost on the line, but the start is
  // straighter ahead.
  const std::vector<HullPoint> hull =
      Hull(Numbered({{100, 10}, {400, 200}, {300, 400}, {100, 400}, {101, 200}}));
  EXPECT_EQ(Indices(hull), Indices(ReferenceHull(Numbered(
                               {{100, 10}, {400, 200}, {300, 400}, {100, 400}, {101, 200}}))));
  EXPECT_THAT(Indices(hull), ElementsAre(0, 1, 2, 3));
}

TEST(ConvexHull, NearlyStraightStepIsTakenWithoutLookingFurther) {
  // From the start 0 both 1 and 2 are nearly straight on; 1 comes first although 2 turns less.
  EXPECT_THAT(Indices(Hull(Numbered({{10, 10}, {110, 13}, {210, 12}, {150, 300}}))),
              ElementsAre(0, 1, 3));
  // In the other order 2 is met first.
  EXPECT_THAT(Indices(Hull(Numbered({{10, 10}, {210, 12}, {110, 13}, {150, 300}}))),
              ElementsAre(0, 1, 3));
}

TEST(ConvexHull, EqualTurnGoesToThePointFartherLeft) {
  // 1, 2 and 3 lie in the same direction from the start, 45 degrees down to the left.
  EXPECT_THAT(Indices(Hull(Numbered({{300, 10}, {250, 60}, {200, 110}, {150, 160}}))).front(), 0);
  EXPECT_EQ(Indices(Hull(Numbered({{300, 10}, {250, 60}, {200, 110}, {150, 160}}))),
            Indices(ReferenceHull(Numbered({{300, 10}, {250, 60}, {200, 110}, {150, 160}}))));
}

TEST(ConvexHull, StepWithoutAnAcceptablePointRepeatsTheLastChoiceUntilTheArrayIsFull) {
  // Numbers that are not positions: a walk that can neither go on nor close runs to the limit.
  Random random = TestRandom();
  int full = 0;
  for (int trial = 0; trial < 3000; trial++) {
    const int n = random.Int(4, 9);
    std::vector<HullPoint> points;
    for (int i = 0; i < n; i++) {
      points.push_back({random.Int(1, 6), random.Int(1, 6), random.Int(0, n - 1)});
    }
    const std::vector<HullPoint> hull = Hull(points);
    ASSERT_EQ(hull, ReferenceHull(points)) << trial;
    full += hull.size() > kMaxHullPoints ? 1 : 0;
  }
  EXPECT_GT(full, 20);
}

TEST(ConvexHull, MoreThanFiveHundredThirtyThreePointsEndTheWalk) {
  // 600 points in a row round a circle, each a corner of the hull.
  std::vector<std::pair<int32_t, int32_t>> positions;
  for (int i = 0; i < 600; i++) {
    // Rational points of a circle, in one sweep from below.
    const double t = -1.0 + 2.0 * (i % 300 + 0.5) / 300;
    const double s = i < 300 ? 1.0 : -1.0;
    positions.push_back({static_cast<int32_t>(s * 30000000 * (1 - t * t) / (1 + t * t)),
                         static_cast<int32_t>(s * 30000000 * 2 * t / (1 + t * t))});
  }
  const std::vector<HullPoint> points = Numbered(positions);
  const std::vector<HullPoint> hull = Hull(points);
  EXPECT_EQ(hull, ReferenceHull(points));
  EXPECT_EQ(hull.size(), 534u);
}

TEST(ConvexHull, MatchesTheStraightforwardWalkOnRandomPoints) {
  Random random = TestRandom();
  for (int trial = 0; trial < 4000; trial++) {
    const int n = random.Int(4, 60);
    const int32_t size = 1 << random.Int(1, 24);
    std::vector<std::pair<int32_t, int32_t>> positions;
    for (int i = 0; i < n; i++)
      positions.push_back({random.Int(-size, size), random.Int(-size, size)});
    // Some points twice, some in a row.
    for (int i = random.Int(0, 3); i > 0; i--) {
      positions[static_cast<size_t>(random.Int(0, n - 1))] = positions[static_cast<size_t>(i)];
    }
    const std::vector<HullPoint> points = Numbered(positions);
    ASSERT_EQ(Hull(points), ReferenceHull(points)) << trial;
  }
}

TEST(ConvexHull, CoordinatesAtTheEndsOfTheRangeAreHarmless) {
  Random random = TestRandom();
  const int32_t values[] = {INT32_MIN, INT32_MIN + 1, -1, 0, 1, INT32_MAX - 1, INT32_MAX};
  for (int trial = 0; trial < 500; trial++) {
    std::vector<std::pair<int32_t, int32_t>> positions;
    for (int i = 0; i < 8; i++)
      positions.push_back({values[random.Int(0, 6)], values[random.Int(0, 6)]});
    const std::vector<HullPoint> points = Numbered(positions);
    ASSERT_EQ(Hull(points), ReferenceHull(points)) << trial;
  }
}

// Twice the signed area of a, b, c; positive when c lies on the inner side of the walk a, b.
int64_t Cross(const HullPoint& a, const HullPoint& b, const HullPoint& c) {
  return static_cast<int64_t>(b.x - a.x) * (c.y - a.y) -
         static_cast<int64_t>(b.y - a.y) * (c.x - a.x);
}

// The true hull by Andrew's monotone chain, without collinear points, from the topmost point on.
std::vector<HullPoint> TrueHull(std::vector<HullPoint> points) {
  std::sort(points.begin(), points.end(), [](const HullPoint& a, const HullPoint& b) {
    return a.x != b.x ? a.x < b.x : a.y < b.y;
  });
  std::vector<HullPoint> hull;
  for (int pass = 0; pass < 2; pass++) {
    const size_t base = hull.size();
    for (const HullPoint& p : points) {
      while (hull.size() >= base + 2 && Cross(hull[hull.size() - 2], hull.back(), p) <= 0) {
        hull.pop_back();
      }
      hull.push_back(p);
    }
    hull.pop_back();
    std::reverse(points.begin(), points.end());
  }
  const auto top = std::min_element(
      hull.begin(), hull.end(), [](const HullPoint& a, const HullPoint& b) { return a.y < b.y; });
  std::rotate(hull.begin(), top, hull.end());
  return hull;
}

double Cosine(double ax, double ay, double bx, double by) {
  return (ax * bx + ay * by) / std::sqrt((ax * ax + ay * ay) * (bx * bx + by * by));
}

// Whether the hull turns by more than 6 degrees at every corner, the first step out of +x included,
// and no other point lies within 1 degree of an edge as seen from the edge's start. Then no step
// stops early and no two points tie.
bool IsClear(const std::vector<HullPoint>& hull, const std::vector<HullPoint>& points) {
  double ax = 1, ay = 0;
  for (size_t i = 0; i < hull.size(); i++) {
    const HullPoint& from = hull[i];
    const HullPoint& to = hull[(i + 1) % hull.size()];
    const double bx = to.x - from.x, by = to.y - from.y;
    if (Cosine(ax, ay, bx, by) > 0.9945) return false;
    for (const HullPoint& p : points) {
      if (p.index == from.index || p.index == to.index) continue;
      if (Cosine(bx, by, p.x - from.x, p.y - from.y) > 0.99984) return false;
    }
    ax = bx;
    ay = by;
  }
  return true;
}

TEST(ConvexHull, IsTheTrueHullWhereverEveryCornerTurnsClearly) {
  Random random = TestRandom();
  int compared = 0;
  for (int trial = 0; trial < 3000; trial++) {
    std::set<std::pair<int32_t, int32_t>> positions;
    const int n = random.Int(4, 25);
    while (positions.size() < static_cast<size_t>(n)) {
      positions.insert({random.Int(1, 2000), random.Int(1, 2000)});
    }
    const std::vector<HullPoint> points =
        Numbered(std::vector<std::pair<int32_t, int32_t>>(positions.begin(), positions.end()));
    const std::vector<HullPoint> expected = TrueHull(points);
    if (!IsClear(expected, points)) continue;
    compared++;
    ASSERT_EQ(Hull(points), expected) << trial;
  }
  EXPECT_GT(compared, 500);
}

}  // namespace
}  // namespace testing
}  // namespace n3ds
