// SPDX-License-Identifier: MIT
// What an engine keeps beyond the frame functions: the host's options, the time, who is who, and the
// steady tracker once it is chosen. Between the engine object and the two trackers.
#pragma once

#include <cstdint>
#include <memory>

#include "core/tracking_context.h"
#include "face_ids.h"
#include "frame_clock.h"
#include "norvale_3d_sticker_extensions.h"
#include "steady/tracker.h"

namespace n3ds {

class EngineExtensions {
 public:
  using BuildFunction = MRESULT (*)(void* core, const NSVL_OFFSCREEN* image, N3DS_LANDMARK* faces,
                                    int32_t nFaces);

  // As Norvale_3DSticker_* documents them, for an engine that is not null.
  MRESULT SetOptions(const Norvale_3DSticker_Options* options);
  MRESULT GetOptions(Norvale_3DSticker_Options* options) const;
  MRESULT SetFrameTime(int64_t nanoseconds) { return clock_.SetNext(nanoseconds); }
  MRESULT GetFaceStates(void* core, Norvale_3DSticker_Face_State* states, uint32_t state_size,
                        uint32_t capacity, uint32_t* count) const;

  // Tracks a frame of upright landmarks with the chosen tracker; `build` is the classic one's
  // driver. Returns what it returns.
  MRESULT TrackFrame(BuildFunction build, void* core, const NSVL_OFFSCREEN* image,
                     N3DS_LANDMARK* faces, int32_t nFaces);
  // Reports the frame: as N3DS_GetRigidMatrix and N3DS_GetFace3DModel.
  MRESULT ReportRigid(void* core, N3DS_RIGID_MATRIX* records, int32_t nFaces) const;
  MRESULT ReportMask(void* core, N3DS_3D_MODEL* models, N3DS_RIGID_MATRIX* records, int32_t nFaces);

  // Forgets all tracks and frees the steady tracker, before the core is.
  void Release();

 private:
  struct LastFrame {
    uint32_t face_count = 0;
    uint32_t landmark_count = 0;
    int32_t landmarks[N3DS_MAX_FACES][2 * N3DS_LANDMARKS_165] = {};
  };

  bool IsSteady() const { return options_.tracker == N3DS_TRACKER_STEADY; }
  MRESULT TrackClassic(BuildFunction build, void* core, const NSVL_OFFSCREEN* image,
                       N3DS_LANDMARK* faces, int32_t nFaces);
  MRESULT TrackSteady(void* core, const NSVL_OFFSCREEN* image, N3DS_LANDMARK* faces,
                      int32_t nFaces);
  // Hand the tracks of the last frame from one tracker to the other.
  void CarryToSteady(const TrackingContext& context);
  void CarryToClassic(TrackingContext* context);

  Norvale_3DSticker_Options options_ = {
      sizeof(Norvale_3DSticker_Options), N3DS_TRACKER_CLASSIC, 0, 0.0f, 0.5f, 0};
  FrameClock clock_;
  FaceIds ids_;
  uint32_t last_tracker_ = N3DS_TRACKER_CLASSIC;
  std::unique_ptr<steady::Tracker> steady_;
  float camera_[9] = {};  // of the last steady frame
  LastFrame last_;        // of the steady tracker
};

}  // namespace n3ds
