// SPDX-License-Identifier: MIT
#include "steady/frozen.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "steady/quantile.h"

namespace n3ds::steady {

namespace {

// A landmark is frozen when the others have moved by so many pixels since it did. At rest, where a
// landmark stays on its pixel by chance, this takes four frames or more.
constexpr float kMotion = 4.0f;
// A few landmarks may rest by chance or lie where a turn moves nothing.
constexpr float kLeastFrozen = 0.15f;  // share of all
constexpr int kLeastMoving = 30;       // tell what the head does
constexpr int kLongest = 100;          // frames that are counted

}  // namespace

int LeaveOutFrozen(const Observation& seen, Face* face, float* active) {
  std::memcpy(active, seen.active, kMeasurementStride * sizeof(float));
  float motions[kMeasurementStride];
  int moving = 0;
  for (int i = 0; i < kMeasurementStride; i++) {
    const float du = seen.u[i] - face->previous_u[i];
    const float dv = seen.v[i] - face->previous_v[i];
    const float motion = face->age > 0 ? std::sqrt(du * du + dv * dv) : 0.0f;
    const bool still = face->age > 0 && motion == 0;
    face->still_frames[i] = still ? std::min(face->still_frames[i] + 1, kLongest) : 0;
    // The lesser of two frames' motions: a landmark that jumps tells nothing of the head.
    const float steady_motion = std::min(motion, face->previous_motion[i]);
    face->previous_motion[i] = motion;
    if (seen.active[i] > 0 && steady_motion > 0) motions[moving++] = steady_motion;
  }
  std::memcpy(face->previous_u, seen.u, sizeof(face->previous_u));
  std::memcpy(face->previous_v, seen.v, sizeof(face->previous_v));
  if (face->age == 0 || moving < kLeastMoving) return seen.count;

  const float motion = SelectSmallest(motions, moving, moving / 2);
  int frozen = 0;
  for (int i = 0; i < kMeasurementStride; i++) {
    if (!(active[i] > 0) || !(static_cast<float>(face->still_frames[i]) * motion >= kMotion)) {
      continue;
    }
    active[i] = 0;
    frozen++;
  }
  if (static_cast<float>(frozen) >= kLeastFrozen * static_cast<float>(seen.count)) {
    return seen.count - frozen;
  }
  std::memcpy(active, seen.active, kMeasurementStride * sizeof(float));
  return seen.count;
}

}  // namespace n3ds::steady
