// SPDX-License-Identifier: MIT
// Faces of an example track, followed in mask mode: what the benchmarks of meshes and mask images
// work on.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "norvale_3d_sticker_core.h"

namespace n3ds::bench {

// The landmarks of one image's faces.
struct TrackedFrame {
  std::vector<__tag_point> points;  // 101 a face, face after face
};

// The frames of examples/tracks (1280 x 720, upright) that show this many faces, 1, 3 or 5, in the
// order of time and then back to the first, so that a benchmark may run round without a jump.
std::vector<TrackedFrame> FramesWithFaces(int face_count);

constexpr int32_t kTrackWidth = 1280;
constexpr int32_t kTrackHeight = 720;

// A core that has followed the faces for one round of those frames, and its meshes.
class TrackedFaces {
 public:
  explicit TrackedFaces(int face_count);
  ~TrackedFaces() { N3DS_UnInit(core_); }
  TrackedFaces(const TrackedFaces&) = delete;
  TrackedFaces& operator=(const TrackedFaces&) = delete;

  void* core() const { return core_; }
  int32_t face_count() const { return face_count_; }
  // Builds the meshes anew; see N3DS_GetFace3DModel.
  MRESULT BuildMeshes() { return N3DS_GetFace3DModel(core_, models_, records_, face_count_); }
  const N3DS_3D_MODEL& model(int face) const { return models_[face]; }

 private:
  int32_t face_count_;
  void* core_ = nullptr;
  N3DS_3D_MODEL models_[N3DS_MAX_FACES] = {};
  N3DS_RIGID_MATRIX records_[N3DS_MAX_FACES] = {};
  std::vector<float> landmarks_3d_[N3DS_MAX_FACES];
};

}  // namespace n3ds::bench
