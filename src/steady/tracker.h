// SPDX-License-Identifier: MIT
// The steady tracker: one filter a face over pose, person and expression together. docs/steady.md
// has the formulas.
#pragma once

#include <cstdint>

#include "core/tracking_context.h"
#include "steady/measurements.h"
#include "steady/people.h"

namespace n3ds::steady {

// A frame, with what the host has chosen.
struct FrameInput {
  int32_t width;  // of the upright image, pixels
  int32_t height;
  float focal;      // pixels
  double seconds;   // since the last frame
  float smoothing;  // 0 to 1
  bool threads;     // several faces may be worked on at once
  uint32_t face_count;
  const N3DS_LANDMARK* faces;  // 101 or 165 points each
};

class Tracker {
 public:
  // `context` has a model and outlives the tracker. `ids` counts the identifiers given out.
  Tracker(const TrackingContext& context, uint64_t* ids);

  // Brings the tracks to a frame; face(k) is then the frame's face k.
  void Track(const FrameInput& input);

  uint32_t face_count() const { return face_count_; }
  const Face& face(uint32_t k) const { return *live_[k]; }
  const Model& model() const { return model_; }

  // Lets the next frame's face near these landmarks, 101 pairs x, y, continue another tracker's
  // track. Call for each of its faces in turn, after Forget.
  void Adopt(const int32_t* landmarks, uint64_t id);
  void Forget();

 private:
  static constexpr int kFaceCount = 2 * kSlotCount;  // followed and resting

  // What a thread needs to work on a face.
  struct Bench {
    Workspace work;
    StartScratch start;
    Face candidate;
    Face spare;
  };
  // A face's landmarks as the kernels take them.
  struct alignas(32) Landmarks {
    float u[kMeasurementStride];
    float v[kMeasurementStride];
    float active[kMeasurementStride];  // of a tracked face
  };
  struct Task {
    Tracker* tracker;
    int slot;
    bool changed;  // out: somebody else has taken the face's place
  };

  static void* RunTask(void* argument);
  Tools ToolsOf(int slot);
  Face* TakeStorage();
  void ReadLandmarks(const FrameInput& input);
  void MatchFaces(Face** next);
  void RestUnmatched();
  void ExpireResting();
  void StartMissing(Face** next);
  void UpdateAll(bool threads);
  bool UpdateOne(int slot);

  const TrackingContext& context_;
  uint64_t* ids_;
  double now_ = 0;
  TimeStep time_{};
  double time_seconds_ = -1;
  float time_smoothing_ = -1;
  uint32_t face_count_ = 0;
  Face* live_[kSlotCount] = {};
  Face* resting_[kSlotCount] = {};
  bool used_[kFaceCount] = {};
  Observation seen_[kSlotCount] = {};
  Landmarks landmarks_[kSlotCount];
  Face storage_[kFaceCount];
  Model model_;
  Bench bench_[kSlotCount];
};

}  // namespace n3ds::steady
