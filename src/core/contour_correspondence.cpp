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

// The last two of the table are taken only near the hull vertex from which the probe started.
static_assert(kSearchedCandidates + 2 == kContourCandidateCount);

int32_t SquaredDistance(int32_t x0, int32_t y0, int32_t x1, int32_t y1) {
  const int32_t dx = WrapAbs(WrapSubtract(x0, x1));
  const int32_t dy = WrapAbs(WrapSubtract(y0, y1));
  return WrapAdd(WrapMultiply(dx, dx), WrapMultiply(dy, dy));
}

void ProjectCandidates(const float* vertices, const float* camera, const float* r, const float* t,
                       HullPoint* projected) {
  for (int32_t n = 0; n < kContourCandidateCount; n++) {
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
  for (int i = 0; i + 1 < kOutlineLandmarkCount; i++) {
    const auto dx = static_cast<float>(WrapSubtract(landmarks[2 * i + 2], landmarks[2 * i]));
    const auto dy = static_cast<float>(WrapSubtract(landmarks[2 * i + 3], landmarks[2 * i + 1]));
    sum += std::sqrt(dx * dx + dy * dy);
  }
  return static_cast<float>(sum / 18.0);
}

// Number of probes on the hull edge from a to b. A spacing of zero gives none: the ratio is then
// infinite or not a number.
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
  for (int32_t n = kSearchedCandidates; n < kContourCandidateCount; n++) {
    const HullPoint& candidate = candidates[n];
    if (WrapAbs(WrapSubtract(candidate.x, x)) < reach &&
        WrapAbs(WrapSubtract(candidate.y, y)) < reach &&
        SquaredDistance(candidate.x, candidate.y, x, y) < found.squared_distance) {
      best = n;
    }
  }
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
  const ScratchArray<HullPoint> hull(memory, kMaxHullPoints + 1);
  if (!candidates || !hull) return N3DS_NO_MEMORY;

  ProjectCandidates(vertices, camera, rotation, translation, candidates.get());
  int32_t hull_count = 0;
  const int32_t result =
      SearchConvexHull(candidates.get(), kContourCandidateCount, hull.get(), &hull_count);
  if (result != N3DS_OK) return result;
  if (hull_count == 0 || hull_count > kMaxHullPoints) return N3DS_OK;

  const float spacing = MeanOutlineSpacing(landmarks);
  // The edge from the last hull point back to the first has no probes: it closes the open side.
  int32_t probe_count = 0;
  for (int32_t i = 0; i + 1 < hull_count; i++) {
    probe_count += ProbeCount(hull[i], hull[i + 1], spacing);
  }
  const ScratchArray<int32_t> probes(memory, static_cast<size_t>(probe_count) + 1);
  if (!probes) return N3DS_NO_MEMORY;
  NearestCandidateSearch search(candidates.get());
  int32_t filled = 0;
  for (int32_t i = 0; i + 1 < hull_count; i++) {
    const HullPoint& a = hull[i];
    const HullPoint& b = hull[i + 1];
    const int32_t n = ProbeCount(a, b, spacing);
    for (int32_t j = 1; j <= n; j++) {
      const int32_t candidate =
          SnapProbe(candidates.get(), &search, a, ProbeCoordinate(a.x, b.x, j, n),
                    ProbeCoordinate(a.y, b.y, j, n));
      // Neighbouring probes often snap to the same candidate; the second one changes nothing below.
      if (filled == 0 || probes[filled - 1] != candidate) probes[filled++] = candidate;
    }
  }

  for (int landmark = 0; landmark < kOutlineLandmarkCount; landmark++) {
    const int32_t x = landmarks[2 * landmark];
    const int32_t y = landmarks[2 * landmark + 1];
    int32_t best = hull[0].index;
    int32_t best_distance = SquaredDistance(hull[0].x, hull[0].y, x, y);
    const auto consider = [&](const HullPoint& point) {
      const int32_t distance = SquaredDistance(point.x, point.y, x, y);
      if (distance < best_distance) {
        best_distance = distance;
        best = point.index;
      }
    };
    for (int32_t i = 1; i < hull_count; i++) consider(hull[i]);
    for (int32_t i = 0; i < filled; i++) consider(candidates[probes[i]]);
    correspondence[landmark] = kContourCandidateVertexIndices[best];
  }
  return N3DS_OK;
}

}  // namespace n3ds
