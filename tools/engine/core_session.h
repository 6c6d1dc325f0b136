// SPDX-License-Identifier: MIT
// Mask mode through the library's core functions, for what the engine interface does not hand out:
// the mask image functions work on the core and its meshes.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

class CoreSession {
 public:
  // Throws Error when the model cannot be loaded.
  CoreSession(const std::string& model_path, const TrackHeader& header);
  ~CoreSession();
  CoreSession(const CoreSession&) = delete;
  CoreSession& operator=(const CoreSession&) = delete;

  // Tracks the faces of a frame and builds their meshes. Frames are one sequence in time. Throws
  // Error when the core fails.
  void Process(const TrackFrame& frame);

  std::size_t faces() const { return meshes_.size(); }
  // Faces of the last frame, the farthest first.
  std::vector<std::size_t> FarToNear() const;

  // N3DS_WarpFaceMask onto `output` and N3DS_BlendFaceMask onto `image`. Throw Error. The warp
  // draws one triangle over the other in the order of its lists; they are handed in the farthest
  // first and without those that look away, or the far cheek of a turned head would show through.
  void Warp(const NSVL_OFFSCREEN& texture, std::size_t face, NSVL_OFFSCREEN output);
  void Blend(NSVL_OFFSCREEN mask, NSVL_OFFSCREEN image);

 private:
  void* core_ = nullptr;
  TrackHeader header_;
  std::vector<N3DS_3D_MODEL> meshes_;
  std::vector<N3DS_RIGID_MATRIX> matrices_;
};

}  // namespace n3ds::tool
