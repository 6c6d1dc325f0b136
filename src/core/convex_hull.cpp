#include "core/convex_hull.h"

#include <cmath>

#include "math/integer_arithmetic.h"
#include "norvale_3d_sticker_core.h"

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

bool IsShort(const Direction& d) { return std::fabs(d.x) < 0.01f && std::fabs(d.y) < 0.01f; }

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

}  // namespace

int32_t SearchConvexHull(const HullPoint* points, int32_t count, HullPoint* hull,
                         int32_t* hull_count) {
  if (count < 4 || points == nullptr || hull == nullptr || hull_count == nullptr) {
    return N3DS_BAD_VALUE;
  }
  HullPoint start = points[0];
  for (int32_t i = 1; i < count; i++) {
    if (points[i].y < start.y) start = points[i];
  }
  *hull_count = 0;
  if (start.index == -1 || (start.x == 0 && start.y == 0)) return N3DS_OK;

  HullPoint current = start;
  HullPoint best =
      start;  // survives a step that accepts no point: the step then repeats the choice
  Direction incoming = {1.0f, 0.0f};
  for (;;) {
    hull[*hull_count] = current;
    float best_score = -1.0f;
    for (int32_t j = 0; j < count; j++) {
      if (j == current.index) continue;
      if (IsShort(incoming)) continue;
      const Direction outgoing = Between(current.x, current.y, points[j]);
      if (IsShort(outgoing)) continue;
      if (incoming.x * outgoing.y < outgoing.x * incoming.y) continue;  // on the outer side
      const float score = TurnScore(incoming, outgoing);
      const double gain = Difference(score, best_score);
      const bool same_turn = std::fabs(gain) < kScoreTolerance;
      if (!(gain > kScoreTolerance || (same_turn && points[j].x <= best.x))) continue;
      best_score = score;
      best = points[j];
      if (static_cast<double>(best_score) > kStraightScore) {
        // Nearly straight on; but if the start lies straighter still, the hull closes here.
        const Direction home = Between(current.x, current.y, start);
        if (Dot(incoming, home) > 0.0f &&
            Difference(TurnScore(incoming, home), best_score) > kScoreTolerance) {
          ++*hull_count;
          return N3DS_OK;
        }
        break;
      }
    }
    ++*hull_count;
    if (best.index == start.index || *hull_count > kMaxHullPoints ||
        (best.x == start.x && best.y == start.y)) {
      return N3DS_OK;
    }
    incoming = Between(current.x, current.y, best);
    current = best;
  }
}

}  // namespace n3ds
