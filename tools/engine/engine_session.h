// One run of the engine over a track, through its public functions only.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "engine/face_results.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

// What the engine fits. Every mode yields matrices and 3-D landmarks.
enum class TrackMode { kRigid };

// The model that comes with the source tree.
std::string DefaultModelPath();

class EngineSession {
 public:
  // Throws Error when the model cannot be loaded.
  EngineSession(const std::string& model_path, const TrackHeader& header, TrackMode mode);
  ~EngineSession();
  EngineSession(const EngineSession&) = delete;
  EngineSession& operator=(const EngineSession&) = delete;

  // Frames are one sequence in time. A failed call is reported in the result, not thrown.
  FrameResult Process(const TrackFrame& frame);

 private:
  void* engine_;
  TrackHeader header_;
  TrackMode mode_;
};

// Runs a whole track; `step` is called after each frame.
std::vector<FrameResult> RunTrack(const Track& track, const std::string& model_path, TrackMode mode,
                                  const std::function<void()>& step = {});

}  // namespace n3ds::tool
