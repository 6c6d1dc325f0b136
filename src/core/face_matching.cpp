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

// What a face keeps when it changes slots. An array of these, filled before any slot is overwritten,
// lets slots change places freely.
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

template <typename Member>
void Copy(const Member& from, Member& to) {
  std::memcpy(&to, &from, sizeof(Member));
}

void SaveTrack(const TrackingContext& context, int slot, Track* track) {
  Copy(context.poseRef[slot], track->poseRef);
  Copy(context.pose[slot], track->pose);
  Copy(context.fitState[slot], track->fitState);
  Copy(context.shape[slot], track->shape);
  Copy(context.identityCoef[slot], track->identityCoef);
  Copy(context.expressionCoef[slot], track->expressionCoef);
  Copy(context.trackState[slot], track->trackState);
  Copy(context.trackFlag[slot], track->trackFlag);
}

void RestoreTrack(const Track& track, int slot, TrackingContext* context) {
  Copy(track.poseRef, context->poseRef[slot]);
  Copy(track.pose, context->pose[slot]);
  Copy(track.fitState, context->fitState[slot]);
  Copy(track.shape, context->shape[slot]);
  Copy(track.identityCoef, context->identityCoef[slot]);
  Copy(track.expressionCoef, context->expressionCoef[slot]);
  Copy(track.trackState, context->trackState[slot]);
  Copy(track.trackFlag, context->trackFlag[slot]);
}

void ClearSlot(TrackingContext* context, int slot) {
  std::memset(context->pose[slot], 0, sizeof(context->pose[slot]));
  std::memset(context->identityCoef[slot], 0, sizeof(context->identityCoef[slot]));
  std::memset(context->expressionCoef[slot], 0, sizeof(context->expressionCoef[slot]));
  std::memset(context->trackState[slot], 0, sizeof(context->trackState[slot]));
  context->trackFlag[slot] = 0;
}

// The element of 0 to count - 1 with the smallest distance; on a tie the first.
template <typename Distance>
uint32_t Nearest(uint32_t count, const Distance& distance) {
  uint32_t best = 0;
  int32_t best_distance = distance(0);
  for (uint32_t k = 1; k < count; ++k) {
    const int32_t d = distance(k);
    if (d >= best_distance) continue;
    best = k;
    best_distance = d;
  }
  return best;
}

// Moves the slots of faces that changed places; `previous_landmarks` likewise.
MRESULT MoveSlots(const FaceAssignment& assignment, uint32_t face_count, TrackingContext* context,
                  int32_t* previous_landmarks) {
  const size_t stride = 2 * static_cast<size_t>(context->landmarkNum);
  const ScratchArray<Track> tracks(context->memory, kSlotCount);
  const ScratchArray<int32_t> landmarks(context->memory, kSlotCount * stride);
  if (!tracks || !landmarks) return N3DS_NO_MEMORY;
  for (int slot = 0; slot < kSlotCount; ++slot) {
    SaveTrack(*context, slot, &tracks[static_cast<size_t>(slot)]);
  }
  std::memcpy(landmarks.get(), previous_landmarks, kSlotCount * stride * sizeof(int32_t));
  for (uint32_t j = 0; j < face_count; ++j) {
    const int32_t p = assignment.previous[j];
    if (p < 0 || static_cast<uint32_t>(p) == j) continue;
    const auto source = static_cast<size_t>(p);
    RestoreTrack(tracks[source], static_cast<int>(j), context);
    std::memcpy(previous_landmarks + j * stride, landmarks.get() + source * stride,
                stride * sizeof(int32_t));
  }
  return N3DS_OK;
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
  for (int32_t slot = 0; slot < kSlotCount; ++slot) assigned[slot] = -1;

  if (face_count <= previous_count) {
    for (uint32_t j = 0; j < face_count; ++j) {
      const auto to_previous = [&](uint32_t p) { return distance(j, p); };
      assigned[j] = static_cast<int32_t>(Nearest(previous_count, to_previous));
    }
    return N3DS_OK;
  }
  // Each previous face claims as it scans: a claim is taken back when a nearer face turns up, even
  // if an earlier previous face had claimed it before. The face that loses its track starts afresh,
  // which shows for some 40 frames in mask mode; a wrong track would mix two persons.
  for (uint32_t p = 0; p < previous_count; ++p) {
    uint32_t best = 0;
    int32_t best_distance = 0;
    for (uint32_t j = 0; j < face_count; ++j) {
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

int32_t MoveTracks(const FaceAssignment& assignment, uint32_t face_count, TrackingContext* context,
                   int32_t* previous_landmarks) {
  // Most frames keep every face in its slot: then nothing is copied.
  bool moves = false;
  for (uint32_t j = 0; j < face_count; ++j) {
    const int32_t p = assignment.previous[j];
    moves = moves || (p >= 0 && static_cast<uint32_t>(p) != j);
  }
  if (moves) {
    const MRESULT result = MoveSlots(assignment, face_count, context, previous_landmarks);
    if (result != N3DS_OK) return result;
  }
  const size_t stride = 2 * static_cast<size_t>(context->landmarkNum);
  for (uint32_t j = 0; j < face_count; ++j) {
    if (assignment.previous[j] >= 0) continue;
    ClearSlot(context, static_cast<int>(j));
    std::memset(previous_landmarks + j * stride, 0, stride * sizeof(int32_t));
  }
  return N3DS_OK;
}

}  // namespace n3ds
