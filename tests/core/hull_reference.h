// SPDX-License-Identifier: MIT
// The convex hull walk written down once more, as plainly as it can be, to compare with.
#pragma once

#include <cmath>
#include <cstdint>
#include <vector>

#include "core/convex_hull.h"

namespace n3ds::testing {

// Differences that exceed 32 bits wrap.
inline float Wrapped(int64_t difference) {
  return static_cast<float>(static_cast<int32_t>(static_cast<uint32_t>(difference)));
}

inline std::vector<HullPoint> ReferenceHull(const std::vector<HullPoint>& points) {
  std::vector<HullPoint> hull;
  if (points.size() < 4) return hull;

  size_t first = 0;
  for (size_t i = 1; i < points.size(); i++) {
    if (points[i].y < points[first].y) first = i;
  }
  const HullPoint start = points[first];
  if (start.index == -1) return hull;
  if (start.x == 0 && start.y == 0) return hull;

  HullPoint current = start;
  HullPoint chosen = start;
  float ax = 1;
  float ay = 0;
  while (true) {
    hull.push_back(current);
    float best = -1;
    for (size_t j = 0; j < points.size(); j++) {
      if (static_cast<int64_t>(j) == current.index) continue;
      if (std::fabs(ax) < 0.01 && std::fabs(ay) < 0.01) continue;
      const float bx = Wrapped(int64_t{points[j].x} - current.x);
      const float by = Wrapped(int64_t{points[j].y} - current.y);
      if (std::fabs(bx) < 0.01 && std::fabs(by) < 0.01) continue;
      const float across = ax * by;
      const float back = bx * ay;
      if (across < back) continue;

      const float dot = ax * bx + ay * by;
      const float square = dot * dot;
      const float lengths = (ax * ax + ay * ay) * (bx * bx + by * by);
      float score = square / lengths;
      if (dot < 0) score = -score;

      bool take = false;
      const float lead = score - best;
      if (static_cast<double>(lead) > 1e-6) take = true;
      if (std::fabs(static_cast<double>(lead)) < 1e-6 && points[j].x <= chosen.x) take = true;
      if (!take) continue;
      best = score;
      chosen = points[j];
      if (static_cast<double>(best) > 0.996) {
        const float dx = Wrapped(int64_t{start.x} - current.x);
        const float dy = Wrapped(int64_t{start.y} - current.y);
        const float home = ax * dx + ay * dy;
        if (home > 0) {
          const float cosine2 = home * home / ((ax * ax + ay * ay) * (dx * dx + dy * dy));
          if (static_cast<double>(cosine2 - best) > 1e-6) return hull;
        }
        break;
      }
    }
    if (chosen.index == start.index) return hull;
    if (hull.size() > 533) return hull;
    if (chosen.x == start.x && chosen.y == start.y) return hull;
    ax = Wrapped(int64_t{chosen.x} - current.x);
    ay = Wrapped(int64_t{chosen.y} - current.y);
    current = chosen;
  }
}

}  // namespace n3ds::testing
