// SPDX-License-Identifier: MIT
#include "core/contour_correspondence.h"

#include <cmath>

#include "core/convex_hull.h"
#include "core/model_tables.h"
#include "core/nearest_candidate.h"
#include "platform/integer_arithmetic.h"
#include "platform/scratch_array.h"

namespace n3ds {

namespace {

// Probes are set this many mean landmark spacings apart, on edges of up to kLongestProbedEdge
// spacings: longer ones span the open side of the face, where no outline is.
constexpr double kProbeSpacing = 0.3;
constexpr float kLongestProbedEdge = 8.0f;

void ProjectCandidates(const float* vertices, const float* camera, const float* r, const float* t,
                       HullPoint* projected) {
  for (int32_t n = 0; n < kContourCandidateCount; ++n) {
    const float* v = vertices + 3 * static_cast<ptrdiff_t>(kContourCandidateVertexIndices[n]);
    float x = r[0] * v[0] + r[1] * v[1] + r[2] * v[2] + t[0];
    float y = r[3] * v[0] + r[4] * v[1] + r[5] * v[2] + t[1];
    const float z = r[6] * v[0] + r[7] * v[1] + r[8] * v[2] + t[2];
    // A candidate in the camera plane takes part undivided: one odd point harms less than no
    // update.
    if (z != 0.0f) {
      x /= z;
      y /= z;
    }
    projected[n] = {TruncateToInt32(x * camera[0] + camera[2]),
                    TruncateToInt32(y * camera[4] + camera[5]), n};
  }
}

float MeanOutlineSpacing(const int32_t* landmarks) {
  float sum = 0.0f;
  for (int i = 0; i + 1 < kOutlineLandmarkCount; ++i) {
    const auto dx = static_cast<float>(WrapSubtract(landmarks[2 * i + 2], landmarks[2 * i]));
    const auto dy = static_cast<float>(WrapSubtract(landmarks[2 * i + 3], landmarks[2 * i + 1]));
    sum += std::sqrt(dx * dx + dy * dy);
  }
  return static_cast<float>(static_cast<double>(sum) / (kOutlineLandmarkCount - 1));
}

// Number of probes on the hull edge from a to b. A spacing of zero gives none: the ratio is then
// infinite or NaN.
int32_t ProbeCount(const HullPoint& a, const HullPoint& b, float spacing) {
  const double length = std::sqrt(static_cast<double>(SquaredDistance(a.x, a.y, b.x, b.y)));
  const float ratio = static_cast<float>(length) / spacing;
  if (!(static_cast<double>(ratio) > kProbeSpacing && ratio < kLongestProbedEdge)) return 0;
  return TruncateToInt32(static_cast<double>(ratio) / kProbeSpacing);
}

// One coordinate of probe j of n on an edge: each end's share is truncated by itself.
int32_t ProbeCoordinate(int32_t a, int32_t b, int32_t j, int32_t n) {
  return WrapAdd(WrapMultiply(a, j) / (n + 1), WrapMultiply(b, n + 1 - j) / (n + 1));
}

// The candidate that a probe at (x, y) on an edge starting at hull vertex `a` snaps to.
int32_t SnapProbe(const HullPoint* candidates, NearestCandidateSearch* search, const HullPoint& a,
                  int32_t x, int32_t y) {
  const int32_t start_distance = SquaredDistance(a.x, a.y, x, y);
  const FoundCandidate found = search->Find(x, y, {a.index, start_distance});
  int32_t best = found.candidate;
  // Both of the last two are compared with the best of the search, not with each other.
  const int32_t reach = TruncateToInt32(std::sqrt(static_cast<double>(start_distance)));
  for (int32_t n = kSearchedCandidates; n < kContourCandidateCount; ++n) {
    const HullPoint& candidate = candidates[n];
    if (WrapAbs(WrapSubtract(candidate.x, x)) < reach &&
        WrapAbs(WrapSubtract(candidate.y, y)) < reach &&
        SquaredDistance(candidate.x, candidate.y, x, y) < found.squared_distance) {
      best = n;
    }
  }
  return best;
}

// The hull as SearchConvexHull gives it. The edge from the last point back to the first has no
// probes: it closes the open side.
struct Hull {
  const HullPoint* points;
  int32_t count;
};

int32_t CountProbes(const Hull& hull, float spacing) {
  int32_t count = 0;
  for (int32_t i = 0; i + 1 < hull.count; ++i) {
    count += ProbeCount(hull.points[i], hull.points[i + 1], spacing);
  }
  return count;
}

// Writes the candidates that the probes snap to, and returns how many there are. Neighbouring
// probes often snap to the same one, which is then written once: the second would change nothing.
int32_t SnapProbes(const HullPoint* candidates, const Hull& hull, float spacing, int32_t* snapped) {
  NearestCandidateSearch search(candidates);
  int32_t filled = 0;
  for (int32_t i = 0; i + 1 < hull.count; ++i) {
    const HullPoint& a = hull.points[i];
    const HullPoint& b = hull.points[i + 1];
    const int32_t n = ProbeCount(a, b, spacing);
    for (int32_t j = 1; j <= n; ++j) {
      const int32_t candidate = SnapProbe(candidates, &search, a, ProbeCoordinate(a.x, b.x, j, n),
                                          ProbeCoordinate(a.y, b.y, j, n));
      if (filled == 0 || snapped[filled - 1] != candidate) snapped[filled++] = candidate;
    }
  }
  return filled;
}

// The candidate nearest to (x, y) among the hull's points and the `count` others; on a tie the
// first.
int32_t NearestOf(const HullPoint* candidates, const Hull& hull, const int32_t* others,
                  int32_t count, int32_t x, int32_t y) {
  int32_t best = hull.points[0].index;
  int32_t best_distance = SquaredDistance(hull.points[0].x, hull.points[0].y, x, y);
  const auto consider = [&](const HullPoint& point) {
    const int32_t distance = SquaredDistance(point.x, point.y, x, y);
    if (distance >= best_distance) return;
    best_distance = distance;
    best = point.index;
  };
  for (int32_t i = 1; i < hull.count; ++i) consider(hull.points[i]);
  for (int32_t i = 0; i < count; ++i) consider(candidates[others[i]]);
  return best;
}

}  // namespace

int64_t UpdateContourCorrespondence(MHandle memory, const int32_t* landmarks, const float* vertices,
                                    const float* camera, const float* rotation,
                                    const float* translation, int32_t* correspondence) {
  if (landmarks == nullptr || vertices == nullptr || camera == nullptr || rotation == nullptr ||
      translation == nullptr || correspondence == nullptr) {
    return N3DS_NULL_ARGUMENT;
  }
  const ScratchArray<HullPoint> candidates(memory, kContourCandidateCount);
  const ScratchArray<HullPoint> hull_points(memory, kMaxHullPoints + 1);
  if (!candidates || !hull_points) return N3DS_NO_MEMORY;

  ProjectCandidates(vertices, camera, rotation, translation, candidates.get());
  Hull hull = {hull_points.get(), 0};
  const int32_t result =
      SearchConvexHull(candidates.get(), kContourCandidateCount, hull_points.get(), &hull.count);
  if (result != N3DS_OK) return result;
  if (hull.count == 0 || hull.count > kMaxHullPoints) return N3DS_OK;

  const float spacing = MeanOutlineSpacing(landmarks);
  const ScratchArray<int32_t> snapped(memory, static_cast<size_t>(CountProbes(hull, spacing)) + 1);
  if (!snapped) return N3DS_NO_MEMORY;
  const int32_t count = SnapProbes(candidates.get(), hull, spacing, snapped.get());
  for (int i = 0; i < kOutlineLandmarkCount; ++i) {
    const int32_t nearest = NearestOf(candidates.get(), hull, snapped.get(), count,
                                      landmarks[2 * i], landmarks[2 * i + 1]);
    correspondence[i] = kContourCandidateVertexIndices[nearest];
  }
  return N3DS_OK;
}

}  // namespace n3ds
