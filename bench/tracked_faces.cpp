// SPDX-License-Identifier: MIT
#include "tracked_faces.h"

#include <algorithm>
#include <stdexcept>

#include "support/face_scene.h"
#include "tracks/track_file.h"

namespace n3ds::bench {

namespace {

const char* TrackOf(int face_count) {
  switch (face_count) {
    case 1:
      return "synthetic_natural";
    case 3:
      return "synthetic_three";
    default:
      return "synthetic_five_cross";
  }
}

// Persons in the order of their numbers: a track lists them in any order.
TrackedFrame InOrder(tool::TrackFrame frame) {
  std::sort(frame.faces.begin(), frame.faces.end(),
            [](const auto& a, const auto& b) { return a.id < b.id; });
  TrackedFrame ordered;
  for (const tool::TrackFace& face : frame.faces) {
    for (size_t i = 0; i + 1 < face.points.size(); i += 2) {
      ordered.points.push_back({face.points[i], face.points[i + 1]});
    }
  }
  return ordered;
}

}  // namespace

std::vector<TrackedFrame> FramesWithFaces(int face_count) {
  const tool::Track track = tool::ReadTrackFile(std::string(N3DS_SOURCE_DIR "/examples/tracks/") +
                                                TrackOf(face_count) + ".track.jsonl");
  std::vector<TrackedFrame> frames;
  for (const tool::TrackFrame& frame : track.frames) {
    if (frame.faces.size() == static_cast<size_t>(face_count)) frames.push_back(InOrder(frame));
  }
  if (frames.empty() || track.header.width != kTrackWidth || track.header.height != kTrackHeight) {
    throw std::runtime_error(track.name + " is not the track it was");
  }
  for (size_t i = frames.size(); i-- > 1;) frames.push_back(frames[i]);
  return frames;
}

TrackedFaces::TrackedFaces(int face_count) : face_count_(face_count) {
  const std::vector<uint8_t>& model = testing::ModelBytes();
  if (N3DS_Init(nullptr, &core_) != N3DS_OK ||
      N3DS_LoadFaceHouse(core_, model.data(), model.size()) != N3DS_OK) {
    throw std::runtime_error("no core");
  }
  for (int f = 0; f < face_count; f++) {
    landmarks_3d_[f].resize(size_t{3} * 101);
    records_[f].landmarks3D = landmarks_3d_[f].data();
  }
  NSVL_OFFSCREEN image = {};
  image.width = kTrackWidth;
  image.height = kTrackHeight;
  for (TrackedFrame& frame : FramesWithFaces(face_count)) {
    N3DS_LANDMARK faces[N3DS_MAX_FACES];
    for (int f = 0; f < face_count; f++) {
      faces[f] = {&frame.points[size_t{101} * static_cast<size_t>(f)].x, 101};
    }
    if (N3DS_Build3DFaceForVideo_Mask(core_, &image, faces, face_count) != N3DS_OK) {
      throw std::runtime_error("a frame failed");
    }
  }
  if (BuildMeshes() != N3DS_OK) throw std::runtime_error("no meshes");
}

}  // namespace n3ds::bench
