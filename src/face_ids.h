// SPDX-License-Identifier: MIT
// Identifiers of the faces that the classic tracker follows: a face keeps its own while it is
// tracked, and gets it back when one of its place and size turns up soon after it was lost.
#pragma once

#include <cstdint>

#include "core/tracking_context.h"

namespace n3ds {

class FaceIds {
 public:
  // After a frame of the core, whose context tells which face continues which.
  void Follow(const TrackingContext& context, double now);
  // Makes `ids`, of faces at these landmarks (pairs x, y), those of the last frame.
  void Adopt(uint32_t face_count, const uint64_t* ids, const int32_t* const* landmarks, double now);
  // All faces are gone; they may come back.
  void Clear();
  void Reset() {
    Clear();
    for (Entry& entry : lost_) entry.id = 0;
  }

  uint64_t id(uint32_t k) const { return live_[k].id; }
  // Frames in a row of face k.
  uint32_t frames(uint32_t k) const { return live_[k].frames; }
  // Counts the identifiers given out in the engine's life.
  uint64_t* counter() { return &counter_; }

 private:
  struct Entry {
    uint64_t id;  // 0: none
    uint32_t frames;
    float x, y;  // middle of eyes and nose, pixels
    float size;
    double seen;
  };
  static Entry MakeEntry(const int32_t* landmarks, double now);
  void Lose(const Entry& entry);
  uint64_t Find(const Entry& entry);

  Entry live_[kSlotCount] = {};
  Entry lost_[kSlotCount] = {};
  uint32_t live_count_ = 0;
  uint64_t counter_ = 0;
};

}  // namespace n3ds
