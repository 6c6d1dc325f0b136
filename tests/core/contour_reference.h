// SPDX-License-Identifier: MIT
// The contour correspondence written down once more, as plainly as it can be, to compare with.
#pragma once

#include <cmath>
#include <cstdint>
#include <vector>

#include "core/hull_reference.h"
#include "core/model_tables.h"

namespace n3ds::testing {

struct ContourResult {
  std::vector<HullPoint> hull;
  std::vector<int32_t> probes;          // candidate numbers, in the order of their making
  std::vector<int32_t> correspondence;  // empty: left as it was
};

inline int32_t SaturatedTruncation(double value) {
  if (std::isnan(value)) return 0;
  if (value >= 2147483647.0) return INT32_MAX;
  if (value <= -2147483648.0) return INT32_MIN;
  return static_cast<int32_t>(value);
}

// Squared distance in 32 bits that wrap.
inline int32_t SquaredGap(const HullPoint& p, int32_t x, int32_t y) {
  const auto dx = static_cast<uint32_t>(p.x) - static_cast<uint32_t>(x);
  const auto dy = static_cast<uint32_t>(p.y) - static_cast<uint32_t>(y);
  return static_cast<int32_t>(dx * dx + dy * dy);
}

inline int32_t Gap(int32_t a, int32_t b) {
  const auto d = static_cast<int32_t>(static_cast<uint32_t>(a) - static_cast<uint32_t>(b));
  return static_cast<int32_t>(d < 0 ? 0u - static_cast<uint32_t>(d) : static_cast<uint32_t>(d));
}

inline int32_t Share(int32_t coordinate, int32_t part, int32_t whole) {
  return static_cast<int32_t>(static_cast<uint32_t>(coordinate) * static_cast<uint32_t>(part)) /
         whole;
}

inline std::vector<HullPoint> ReferenceProjection(const std::vector<float>& vertices,
                                                  const float* k, const float* r, const float* t) {
  std::vector<HullPoint> projected;
  for (const int32_t vertex : kContourCandidateVertexIndices) {
    const float* p = &vertices[static_cast<size_t>(3 * vertex)];
    float x = r[0] * p[0] + r[1] * p[1] + r[2] * p[2] + t[0];
    float y = r[3] * p[0] + r[4] * p[1] + r[5] * p[2] + t[1];
    const float z = r[6] * p[0] + r[7] * p[1] + r[8] * p[2] + t[2];
    if (z != 0) {
      x = x / z;
      y = y / z;
    }
    const float u = x * k[0] + k[2];
    const float v = y * k[4] + k[5];
    projected.push_back({SaturatedTruncation(static_cast<double>(u)),
                         SaturatedTruncation(static_cast<double>(v)),
                         static_cast<int32_t>(projected.size())});
  }
  return projected;
}

inline int32_t ReferenceProbe(const std::vector<HullPoint>& candidates, const HullPoint& a,
                              int32_t x, int32_t y) {
  const int32_t d0 = SquaredGap(a, x, y);
  const int32_t m = SaturatedTruncation(std::sqrt(static_cast<double>(d0)));
  int32_t best = a.index;
  int32_t nearest = d0;
  for (size_t lane = 0; lane < 4; lane++) {
    int64_t lane_nearest = INT64_MAX;
    int32_t lane_best = -1;
    for (size_t n = lane; n < 532; n += 4) {
      const int32_t d = SquaredGap(candidates[n], x, y);
      if (d <= lane_nearest) {
        lane_nearest = d;
        lane_best = static_cast<int32_t>(n);
      }
    }
    if (lane_nearest < nearest) {
      nearest = static_cast<int32_t>(lane_nearest);
      best = lane_best;
    }
  }
  for (const int32_t n : {532, 533}) {
    const HullPoint& c = candidates[static_cast<size_t>(n)];
    if (Gap(c.x, x) < m && Gap(c.y, y) < m && SquaredGap(c, x, y) < nearest) best = n;
  }
  return best;
}

inline ContourResult ReferenceContour(const std::vector<int32_t>& landmarks,
                                      const std::vector<float>& vertices, const float* k,
                                      const float* r, const float* t) {
  ContourResult result;
  const std::vector<HullPoint> candidates = ReferenceProjection(vertices, k, r, t);
  result.hull = ReferenceHull(candidates);
  if (result.hull.empty() || result.hull.size() > 533) return result;

  float length_sum = 0;
  for (size_t i = 0; i < 18; i++) {
    const auto dx = static_cast<float>(landmarks[2 * i + 2] - landmarks[2 * i]);
    const auto dy = static_cast<float>(landmarks[2 * i + 3] - landmarks[2 * i + 1]);
    length_sum += std::sqrt(dx * dx + dy * dy);
  }
  const float spacing = length_sum / 18.0f;

  for (size_t i = 0; i + 1 < result.hull.size(); i++) {
    const HullPoint& a = result.hull[i];
    const HullPoint& b = result.hull[i + 1];
    const double length = std::sqrt(static_cast<double>(SquaredGap(a, b.x, b.y)));
    const float ratio = static_cast<float>(length) / spacing;
    int32_t n = 0;
    if (static_cast<double>(ratio) > 0.3 && ratio < 8.0f) {
      n = static_cast<int32_t>(static_cast<double>(ratio) / 0.3);
    }
    for (int32_t j = 1; j <= n; j++) {
      const int32_t x = Share(a.x, j, n + 1) + Share(b.x, n + 1 - j, n + 1);
      const int32_t y = Share(a.y, j, n + 1) + Share(b.y, n + 1 - j, n + 1);
      result.probes.push_back(ReferenceProbe(candidates, a, x, y));
    }
  }

  for (size_t landmark = 0; landmark < 19; landmark++) {
    const int32_t x = landmarks[2 * landmark];
    const int32_t y = landmarks[2 * landmark + 1];
    std::vector<int32_t> choices;
    for (const HullPoint& p : result.hull) choices.push_back(p.index);
    choices.insert(choices.end(), result.probes.begin(), result.probes.end());
    int32_t best = choices[0];
    for (const int32_t c : choices) {
      if (SquaredGap(candidates[static_cast<size_t>(c)], x, y) <
          SquaredGap(candidates[static_cast<size_t>(best)], x, y)) {
        best = c;
      }
    }
    result.correspondence.push_back(kContourCandidateVertexIndices[best]);
  }
  return result;
}

}  // namespace n3ds::testing
