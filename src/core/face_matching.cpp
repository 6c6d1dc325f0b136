// SPDX-License-Identifier: MIT
#include "core/face_matching.h"

#include <cstring>

#include "platform/integer_arithmetic.h"
#include "platform/scratch_array.h"

namespace n3ds {

namespace {

// Eye corners and the lower nose: they hardly move with the expression.
constexpr int kKeyLandmarks[] = {39, 45, 51, 57, 66, 67, 68, 69, 70, 71};

int32_t FaceDistance(const int32_t* a, const int32_t* b) {
  int32_t sum = 0;
  for (const int k : kKeyLandmarks) {
    sum = WrapAdd(sum, WrapAbs(WrapSubtract(a[2 * k], b[2 * k])));
    sum = WrapAdd(sum, WrapAbs(WrapSubtract(a[2 * k + 1], b[2 * k + 1])));
  }
  return sum;
}

// All that a face takes along. One array of these, filled before any slot is overwritten, lets
// slots change places freely.
struct Track {
  float poseRef[kPoseSize];
  float pose[kPoseSize];
  int32_t fitState[kOutlineLandmarkCount];
  float shape[kShapeSize];
  float identityCoef[kIdentityCount];
  float expressionCoef[kExpressionCount];
  uint64_t trackState[80];
  int32_t trackFlag;
};

// Visits each member of a slot together with its place in a Track.
template <typename Visit>
void ForEachMember(TrackingContext* context, int slot, Track* track, Visit visit) {
  visit(context->poseRef[slot], track->poseRef);
  visit(context->pose[slot], track->pose);
  visit(context->fitState[slot], track->fitState);
  visit(context->shape[slot], track->shape);
  visit(context->identityCoef[slot], track->identityCoef);
  visit(context->expressionCoef[slot], track->expressionCoef);
  visit(context->trackState[slot], track->trackState);
  visit(context->trackFlag[slot], track->trackFlag);
}

template <typename Member>
void CopyMember(const Member& from, Member& to) {
  std::memcpy(&to, &from, sizeof(Member));
}

void ClearSlot(TrackingContext* context, int slot) {
  std::memset(context->pose[slot], 0, sizeof(context->pose[slot]));
  std::memset(context->identityCoef[slot], 0, sizeof(context->identityCoef[slot]));
  std::memset(context->expressionCoef[slot], 0, sizeof(context->expressionCoef[slot]));
  std::memset(context->trackState[slot], 0, sizeof(context->trackState[slot]));
  context->trackFlag[slot] = 0;
}

}  // namespace

int32_t AssignFaces(const int32_t* landmarks, uint32_t face_count,
                    const int32_t* previous_landmarks, uint32_t previous_count,
                    uint32_t landmark_num, FaceAssignment* assignment) {
  if (face_count > kSlotCount || previous_count > kSlotCount) return N3DS_BAD_VALUE;
  const size_t stride = 2 * static_cast<size_t>(landmark_num);
  const auto distance = [=](uint32_t face, uint32_t previous) {
    return FaceDistance(landmarks + face * stride, previous_landmarks + previous * stride);
  };
  int32_t* assigned = assignment->previous;
  for (int32_t slot = 0; slot < kSlotCount; slot++) assigned[slot] = -1;

  if (face_count > previous_count) {
    // Each previous face claims as it scans: a claim is taken back when a nearer face turns up,
    // even if an earlier previous face had claimed it before. The face that loses out starts
    // afresh, which costs one frame's smoothing; a wrong track would cost many.
    for (uint32_t p = 0; p < previous_count; p++) {
      uint32_t best = 0;
      int32_t best_distance = 0;
      for (uint32_t j = 0; j < face_count; j++) {
        const int32_t d = distance(j, p);
        if (j > 0 && d >= best_distance) continue;
        if (j > 0) assigned[best] = -1;
        assigned[j] = static_cast<int32_t>(p);
        best = j;
        best_distance = d;
      }
    }
    return N3DS_OK;
  }
  for (uint32_t j = 0; j < face_count; j++) {
    uint32_t best = 0;
    int32_t best_distance = distance(j, 0);
    for (uint32_t p = 1; p < previous_count; p++) {
      const int32_t d = distance(j, p);
      if (d < best_distance) {
        best = p;
        best_distance = d;
      }
    }
    assigned[j] = static_cast<int32_t>(best);
  }
  return N3DS_OK;
}

int32_t MoveTracks(const FaceAssignment& assignment, uint32_t face_count, TrackingContext* context,
                   int32_t* previous_landmarks) {
  const auto face_total = static_cast<int32_t>(face_count);
  const size_t landmark_bytes = 2 * sizeof(int32_t) * static_cast<size_t>(context->landmarkNum);
  const size_t stride = 2 * static_cast<size_t>(context->landmarkNum);
  // Most frames keep every face in its slot: then nothing is copied.
  bool moves = false;
  for (int32_t j = 0; j < face_total; j++) {
    moves = moves || (assignment.previous[j] >= 0 && assignment.previous[j] != j);
  }
  if (moves) {
    const ScratchArray<Track> tracks(context->memory, kSlotCount);
    const ScratchArray<int32_t> landmarks(context->memory, kSlotCount * stride);
    if (!tracks || !landmarks) return N3DS_NO_MEMORY;
    for (int slot = 0; slot < kSlotCount; slot++) {
      ForEachMember(context, slot, &tracks[static_cast<size_t>(slot)],
                    [](const auto& from, auto& to) { CopyMember(from, to); });
    }
    std::memcpy(landmarks.get(), previous_landmarks, kSlotCount * landmark_bytes);
    for (int32_t j = 0; j < face_total; j++) {
      const int32_t p = assignment.previous[j];
      if (p < 0 || p == j) continue;
      const auto source = static_cast<size_t>(p);
      ForEachMember(context, j, &tracks[source],
                    [](auto& to, const auto& from) { CopyMember(from, to); });
      std::memcpy(previous_landmarks + static_cast<size_t>(j) * stride,
                  landmarks.get() + source * stride, landmark_bytes);
    }
  }
  for (int32_t j = 0; j < face_total; j++) {
    if (assignment.previous[j] >= 0) continue;
    ClearSlot(context, j);
    std::memset(previous_landmarks + static_cast<size_t>(j) * stride, 0, landmark_bytes);
  }
  return N3DS_OK;
}

}  // namespace n3ds
