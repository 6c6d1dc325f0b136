// SPDX-License-Identifier: MIT
#include "core/convex_hull.h"

#include <cmath>

#include "norvale_3d_sticker_core.h"
#include "platform/integer_arithmetic.h"

#if !defined(N3DS_DISABLE_SIMD) && defined(__x86_64__)
#include <emmintrin.h>
#define N3DS_VECTOR_HULL 1
#elif !defined(N3DS_DISABLE_SIMD) && defined(__aarch64__)
#include <arm_neon.h>
#define N3DS_VECTOR_HULL 1
#endif

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

#if N3DS_VECTOR_HULL

constexpr int kLanes = 4;

#if defined(__x86_64__)

using Lanes = __m128;
using Mask = __m128;

// The directions from a point to the kLanes points from `to` on.
inline void Directions(const HullPoint& from, const HullPoint* to, Lanes* x, Lanes* y) {
  const auto* p = reinterpret_cast<const float*>(to);
  const Lanes a = _mm_loadu_ps(p);                                    // x0 y0 .. x1
  const Lanes b = _mm_loadu_ps(p + 4);                                // y1 .. x2 y2
  const Lanes c = _mm_loadu_ps(p + 8);                                // .. x3 y3 ..
  const Lanes y01 = _mm_shuffle_ps(a, b, _MM_SHUFFLE(0, 0, 1, 1));    // y0 y0 y1 y1
  const Lanes xy23 = _mm_shuffle_ps(b, c, _MM_SHUFFLE(2, 1, 3, 2));   // x2 y2 x3 y3
  const Lanes xs = _mm_shuffle_ps(a, xy23, _MM_SHUFFLE(2, 0, 3, 0));  // x0 x1 x2 x3
  const Lanes ys = _mm_shuffle_ps(y01, xy23, _MM_SHUFFLE(3, 1, 2, 0));
  *x = _mm_cvtepi32_ps(_mm_sub_epi32(_mm_castps_si128(xs), _mm_set1_epi32(from.x)));
  *y = _mm_cvtepi32_ps(_mm_sub_epi32(_mm_castps_si128(ys), _mm_set1_epi32(from.y)));
}
inline Lanes Add(Lanes a, Lanes b) { return _mm_add_ps(a, b); }
inline Lanes Multiply(Lanes a, Lanes b) { return _mm_mul_ps(a, b); }
inline Lanes Multiply(Lanes a, float b) { return _mm_mul_ps(a, _mm_set1_ps(b)); }
inline Lanes Abs(Lanes a) { return _mm_andnot_ps(_mm_set1_ps(-0.0f), a); }
inline Mask NotBelow(Lanes a, Lanes b) { return _mm_cmpge_ps(a, b); }
inline Mask Above(Lanes a, Lanes b) { return _mm_cmpgt_ps(a, b); }
// The first lane where both hold; kLanes if there is none.
inline int FirstOfBoth(Mask a, Mask b) {
  return __builtin_ctz(static_cast<unsigned>(_mm_movemask_ps(_mm_and_ps(a, b))) | 1u << kLanes);
}

#else

using Lanes = float32x4_t;
using Mask = uint32x4_t;

inline void Directions(const HullPoint& from, const HullPoint* to, Lanes* x, Lanes* y) {
  const int32x4x3_t points = vld3q_s32(reinterpret_cast<const int32_t*>(to));
  *x = vcvtq_f32_s32(vsubq_s32(points.val[0], vdupq_n_s32(from.x)));
  *y = vcvtq_f32_s32(vsubq_s32(points.val[1], vdupq_n_s32(from.y)));
}
inline Lanes Add(Lanes a, Lanes b) { return vaddq_f32(a, b); }
inline Lanes Multiply(Lanes a, Lanes b) { return vmulq_f32(a, b); }
inline Lanes Multiply(Lanes a, float b) { return vmulq_n_f32(a, b); }
inline Lanes Abs(Lanes a) { return vabsq_f32(a); }
inline Mask NotBelow(Lanes a, Lanes b) { return vcgeq_f32(a, b); }
inline Mask Above(Lanes a, Lanes b) { return vcgtq_f32(a, b); }
inline int FirstOfBoth(Mask a, Mask b) {
  const uint64_t bits = vget_lane_u64(vreinterpret_u64_u16(vmovn_u32(vandq_u32(a, b))), 0);
  return bits == 0 ? kLanes : __builtin_ctzll(bits) / 16;
}

#endif

// How far below the best score a point may be for the vector form to leave it to the exact test:
// the tolerance, and some more for the rounding of this other way to compare.
constexpr float kSkipMargin = 4e-6f;

// The first point from j on that the exact test may accept; skips only points that it would reject.
// Nearly all are on the outer side or have a lower score, and this tells without a division.
int32_t SkipRejected(const HullPoint* points, int32_t j, int32_t count, const HullPoint& from,
                     const Direction& incoming, float incoming_squared, float best_score) {
  const float lowest_score = best_score - kSkipMargin;
  for (; j + kLanes <= count; j += kLanes) {
    Lanes x, y;
    Directions(from, points + j, &x, &y);
    const Mask inner = NotBelow(Multiply(y, incoming.x), Multiply(x, incoming.y));
    const Lanes dot = Add(Multiply(x, incoming.x), Multiply(y, incoming.y));
    const Lanes lengths = Multiply(Add(Multiply(x, x), Multiply(y, y)), incoming_squared);
    const Lanes signed_square = Multiply(dot, Abs(dot));
    const Mask straight = Above(signed_square, Multiply(lengths, lowest_score));
    const int lane = FirstOfBoth(inner, straight);
    if (lane < kLanes) return j + lane;
  }
  return j;
}

#else

int32_t SkipRejected(const HullPoint*, int32_t j, int32_t, const HullPoint&, const Direction&,
                     float, float) {
  return j;
}

#endif

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
    const float incoming_squared = Dot(incoming, incoming);
    const auto skip = [&](int32_t j) {
      return SkipRejected(points, j, count, current, incoming, incoming_squared, best_score);
    };
    for (int32_t j = skip(0); j < count; j = skip(j + 1)) {
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
