// SPDX-License-Identifier: MIT
// One run of the engine over a track, through its public functions only.
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

#include "engine/face_results.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

// What the engine fits. Every mode yields matrices and 3-D landmarks,
// mask mode dense meshes as well.
enum class TrackMode { kRigid, kMask };

// Which of its trackers the engine uses.
enum class TrackerKind { kClassic, kSteady };

class EngineSession {
 public:
  // Throws Error when the model cannot be loaded.
  EngineSession(const std::string& model_path, const TrackHeader& header, TrackMode mode,
                TrackerKind tracker = TrackerKind::kClassic);
  ~EngineSession();
  EngineSession(const EngineSession&) = delete;
  EngineSession& operator=(const EngineSession&) = delete;

  // Frames are one sequence in time. A failed call is reported in the result, not thrown.
  FrameResult Process(const TrackFrame& frame);

  // u, v per corner of a mesh, v down; empty before the first mask frame with a face.
  const std::vector<float>& texture_coordinates() const { return texture_coordinates_; }

 private:
  void* engine_;
  TrackHeader header_;
  TrackMode mode_;
  std::vector<float> texture_coordinates_;
};

// Runs a whole track; `use` is called with the number of each frame in the list and its result.
// Meshes are dropped after it: those of a whole track would fill the memory.
std::vector<FrameResult> RunTrack(
    const Track& track, const std::string& model_path, TrackMode mode,
    const std::function<void(std::size_t, const FrameResult&)>& use = {},
    TrackerKind tracker = TrackerKind::kClassic);

}  // namespace n3ds::tool
