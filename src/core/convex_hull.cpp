// SPDX-License-Identifier: MIT
#include "core/convex_hull.h"

#include <cmath>

#include "norvale_3d_sticker_core.h"
#include "platform/integer_arithmetic.h"
#include "platform/simd.h"

namespace n3ds {

namespace {

struct Direction {
  float x;
  float y;
};

Direction Between(int32_t from_x, int32_t from_y, const HullPoint& to) {
  return {static_cast<float>(WrapSubtract(to.x, from_x)),
          static_cast<float>(WrapSubtract(to.y, from_y))};
}

// Directions between pixels are integers, so only one of no length is shorter than this.
constexpr float kShortestDirection = 0.01f;

bool IsShort(const Direction& d) {
  return std::fabs(d.x) < kShortestDirection && std::fabs(d.y) < kShortestDirection;
}

float Dot(const Direction& a, const Direction& b) { return a.x * b.x + a.y * b.y; }

// Cosine of the turn from a to b, squared but with its sign: ordered as the cosine, without a root.
float TurnScore(const Direction& a, const Direction& b) {
  const float dot = Dot(a, b);
  const float squared = dot * dot / (Dot(a, a) * Dot(b, b));
  return dot < 0.0f ? -squared : squared;
}

// Scores closer than this count as the same turn.
constexpr double kScoreTolerance = 1e-6;
// A turn as small as this is taken without looking further.
constexpr double kStraightScore = 0.996;

double Difference(float a, float b) { return static_cast<double>(a - b); }

constexpr int kLanes = 4;  // points tested at once

// How far below the best score a point may be for the vector form to leave it to the exact test:
// the tolerance, and some more for the rounding of this other way to compare.
constexpr float kSkipMargin = 4e-6f;

// The first point from j on that the exact test may accept; skips only points that it would reject.
// Nearly all are on the outer side or have a lower score, and this tells without a division.
int32_t SkipRejected(const HullPoint* points, int32_t j, int32_t count, const HullPoint& from,
                     const Direction& incoming, float incoming_squared, float best_score) {
  const float lowest_score = best_score - kSkipMargin;
  const F32x4 incoming_x = F32x4::Splat(incoming.x), incoming_y = F32x4::Splat(incoming.y);
  const I32x4 from_x = I32x4::Splat(from.x), from_y = I32x4::Splat(from.y);
  for (; j + kLanes <= count; j += kLanes) {
    I32x4 to_x, to_y;
    LoadFirstTwoOfThree(&points[j].x, &to_x, &to_y);
    const F32x4 x = ToFloat(to_x - from_x), y = ToFloat(to_y - from_y);
    const Mask32x4 inner = y * incoming_x >= x * incoming_y;
    const F32x4 dot = x * incoming_x + y * incoming_y;
    const F32x4 lengths = (x * x + y * y) * F32x4::Splat(incoming_squared);
    const Mask32x4 straight = dot * Abs(dot) > lengths * F32x4::Splat(lowest_score);
    const int lane = FirstTrue(inner & straight);
    if (lane < kLanes) return j + lane;
  }
  return j;
}

// Whether a point of that score is preferred to the best one of the step.
bool IsBetter(float score, const HullPoint& point, float best_score, const HullPoint& best) {
  const double gain = Difference(score, best_score);
  return gain > kScoreTolerance || (std::fabs(gain) < kScoreTolerance && point.x <= best.x);
}

// Chooses the point that follows `current` in a walk that arrived along `incoming`. *best stays
// what it was when no point is accepted; such a step repeats the choice before it. Returns whether
// the hull closes instead, because the start lies straighter ahead than a point that is nearly so.
bool ChooseNext(const HullPoint* points, int32_t count, const HullPoint& start,
                const HullPoint& current, const Direction& incoming, HullPoint* best) {
  if (IsShort(incoming)) return false;
  const float incoming_squared = Dot(incoming, incoming);
  float best_score = -1.0f;
  const auto skip = [&](int32_t j) {
    return SkipRejected(points, j, count, current, incoming, incoming_squared, best_score);
  };
  for (int32_t j = skip(0); j < count; j = skip(j + 1)) {
    const Direction outgoing = Between(current.x, current.y, points[j]);
    if (j == current.index || IsShort(outgoing)) continue;
    if (incoming.x * outgoing.y < outgoing.x * incoming.y) continue;  // on the outer side
    const float score = TurnScore(incoming, outgoing);
    if (!IsBetter(score, points[j], best_score, *best)) continue;
    best_score = score;
    *best = points[j];
    if (static_cast<double>(best_score) > kStraightScore) {
      const Direction home = Between(current.x, current.y, start);
      return Dot(incoming, home) > 0.0f &&
             Difference(TurnScore(incoming, home), best_score) > kScoreTolerance;
    }
  }
  return false;
}

}  // namespace

int32_t SearchConvexHull(const HullPoint* points, int32_t count, HullPoint* hull,
                         int32_t* hull_count) {
  if (count < 4 || points == nullptr || hull == nullptr || hull_count == nullptr) {
    return N3DS_BAD_VALUE;
  }
  HullPoint start = points[0];
  for (int32_t i = 1; i < count; ++i) {
    if (points[i].y < start.y) start = points[i];
  }
  *hull_count = 0;
  if (start.index == -1 || (start.x == 0 && start.y == 0)) return N3DS_OK;

  HullPoint current = start;
  HullPoint best = start;
  Direction incoming = {1.0f, 0.0f};
  for (;;) {
    hull[*hull_count] = current;
    ++*hull_count;
    if (ChooseNext(points, count, start, current, incoming, &best)) return N3DS_OK;
    if (best.index == start.index || *hull_count > kMaxHullPoints ||
        (best.x == start.x && best.y == start.y)) {
      return N3DS_OK;
    }
    incoming = Between(current.x, current.y, best);
    current = best;
  }
}

}  // namespace n3ds
