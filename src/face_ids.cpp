// SPDX-License-Identifier: MIT
#include "face_ids.h"

#include <cmath>

#include "steady/people.h"

namespace n3ds {

FaceIds::Entry FaceIds::MakeEntry(const int32_t* landmarks, double now) {
  const auto x = [landmarks](int i) { return static_cast<float>(landmarks[2 * i]); };
  const auto y = [landmarks](int i) { return static_cast<float>(landmarks[2 * i + 1]); };
  // Outer corners of the eyes and the lowest point of the chin: no turn shortens both lengths.
  const float across_x = x(57) - x(39);
  const float across_y = y(57) - y(39);
  const float middle_x = (x(57) + x(39)) / 2;
  const float middle_y = (y(57) + y(39)) / 2;
  const float down_x = x(9) - middle_x;
  const float down_y = y(9) - middle_y;
  Entry entry = {};
  entry.x = middle_x;
  entry.y = middle_y;
  entry.size = std::sqrt(across_x * across_x + across_y * across_y) +
               std::sqrt(down_x * down_x + down_y * down_y);
  entry.seen = now;
  return entry;
}

void FaceIds::Lose(const Entry& entry) {
  Entry* oldest = lost_;
  for (Entry& other : lost_) {
    if (other.id == 0) {
      oldest = &other;
      break;
    }
    if (other.seen < oldest->seen) oldest = &other;
  }
  *oldest = entry;
}

uint64_t FaceIds::Find(const Entry& entry) {
  Entry* nearest = nullptr;
  float nearest_distance = 0;
  for (Entry& other : lost_) {
    if (other.id == 0 || entry.seen - other.seen > steady::kMemory) continue;
    const float dx = entry.x - other.x;
    const float dy = entry.y - other.y;
    const float distance = std::sqrt(dx * dx + dy * dy);
    const bool same_size = entry.size < 1.5f * other.size && other.size < 1.5f * entry.size;
    if (!same_size || !(distance < entry.size)) continue;
    if (nearest != nullptr && !(distance < nearest_distance)) continue;
    nearest = &other;
    nearest_distance = distance;
  }
  if (nearest == nullptr) return ++counter_;
  const uint64_t id = nearest->id;
  nearest->id = 0;
  return id;
}

void FaceIds::Follow(const TrackingContext& context, double now) {
  Entry next[kSlotCount] = {};
  bool continued[kSlotCount] = {};
  for (uint32_t k = 0; k < context.faceNum; k++) {
    const size_t first = 2 * static_cast<size_t>(context.landmarkNum) * k;
    next[k] = MakeEntry(context.landmarkHistory + first, now);
    const int32_t previous = context.previousSlot[k];
    // Two faces may claim the same track; an identifier goes to the first of them.
    if (previous < 0 || previous >= static_cast<int32_t>(live_count_) || continued[previous]) {
      continue;
    }
    continued[previous] = true;
    next[k].id = live_[previous].id;
    next[k].frames = live_[previous].frames;
  }
  for (uint32_t p = 0; p < live_count_; p++) {
    if (!continued[p]) Lose(live_[p]);
  }
  for (uint32_t k = 0; k < context.faceNum; k++) {
    if (next[k].id == 0) next[k].id = Find(next[k]);
    next[k].frames =
        context.fitGivenUp[k] != 0 && context.trackFlag[k] == 0 ? 0 : next[k].frames + 1;
  }
  for (int k = 0; k < kSlotCount; k++) live_[k] = next[k];
  live_count_ = context.faceNum;
}

void FaceIds::Adopt(uint32_t face_count, const uint64_t* ids, const int32_t* const* landmarks,
                    double now) {
  for (uint32_t k = 0; k < face_count; k++) {
    live_[k] = MakeEntry(landmarks[k], now);
    live_[k].id = ids[k];
    live_[k].frames = 1;
  }
  live_count_ = face_count;
}

void FaceIds::Clear() {
  for (uint32_t p = 0; p < live_count_; p++) Lose(live_[p]);
  live_count_ = 0;
}

}  // namespace n3ds
