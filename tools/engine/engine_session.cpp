// SPDX-License-Identifier: MIT
#include "engine/engine_session.h"

#include <chrono>
#include <cstddef>
#include <cstdio>
#include <memory>

#include "mesh/face_tables.h"
#include "norvale_3d_sticker_extensions.h"
#include "support/error.h"

namespace n3ds::tool {
namespace {

// Why the engine refused a model, in words.
std::string LoadFailure(const std::string& path, MRESULT result) {
  std::FILE* file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) return path + ": the face model cannot be opened";
  std::fclose(file);
  switch (result) {
    case N3DS_BAD_VALUE:
      return path + ": not a face model (wrong size or header; see 'n3ds model info')";
    case N3DS_NO_MEMORY:
      return path + ": no memory for the face model";
    default:
      return path + ": the face model cannot be read (engine code " + std::to_string(result) + ")";
  }
}

}  // namespace

EngineSession::EngineSession(const std::string& model_path, const TrackHeader& header,
                             TrackMode mode, TrackerKind tracker)
    : engine_(Norvale_3DSticker_CreateEngine()), header_(header), mode_(mode) {
  Norvale_3DSticker_Options options{};
  options.size = sizeof(options);
  Norvale_3DSticker_GetOptions(engine_, &options);
  options.tracker = tracker == TrackerKind::kSteady ? N3DS_TRACKER_STEADY : N3DS_TRACKER_CLASSIC;
  Norvale_3DSticker_SetOptions(engine_, &options);
  const MRESULT result = Norvale_3DSticker_Initialize(engine_, model_path.c_str(),
                                                      static_cast<std::uint32_t>(header.degree),
                                                      static_cast<std::uint32_t>(header.mirror));
  if (result != N3DS_OK) {
    Norvale_3DSticker_DestroyEngine(engine_);
    throw Error(LoadFailure(model_path, result));
  }
}

EngineSession::~EngineSession() {
  Norvale_3DSticker_Uninitialize(engine_);
  Norvale_3DSticker_DestroyEngine(engine_);
}

FrameResult EngineSession::Process(const TrackFrame& frame) {
  const auto landmarks = static_cast<std::size_t>(header_.landmarks);
  std::vector<__tag_point> points;
  points.reserve(frame.faces.size() * landmarks);
  for (const TrackFace& face : frame.faces) {
    for (std::size_t k = 0; k < landmarks; ++k) {
      points.push_back({face.points[2 * k], face.points[2 * k + 1]});
    }
  }

  FrameResult result;
  result.number = frame.number;
  result.faces.resize(frame.faces.size());
  Norvale_3DSticker_Matrix_Array out{};
  Norvale_3DSticker_ModelInfo_Array meshes{};
  for (std::size_t i = 0; i < result.faces.size(); ++i) {
    result.faces[i].id = frame.faces[i].id;
    result.faces[i].landmarks3d.resize(3 * landmarks);
    out.faces[i].landmarks3D = result.faces[i].landmarks3d.data();
  }
  NSVL_OFFSCREEN image{};
  image.pixelFormat = N3DS_FORMAT_BGRA32;
  image.width = header_.width;
  image.height = header_.height;

  const auto start = std::chrono::steady_clock::now();
  MRESULT status = N3DS_FAILED;
  switch (mode_) {
    case TrackMode::kRigid:
      status = Norvale_3DSticker_Process(
          engine_, &image, static_cast<std::uint32_t>(frame.faces.size()),
          static_cast<std::uint32_t>(landmarks), points.data(), nullptr, nullptr, &out);
      break;
    case TrackMode::kMask:
      status = Norvale_3DSticker_Process_FaceMask(
          engine_, &image, static_cast<std::uint32_t>(frame.faces.size()),
          static_cast<std::uint32_t>(landmarks), points.data(), nullptr, nullptr, &out, &meshes);
      break;
  }
  const std::chrono::duration<double, std::milli> taken = std::chrono::steady_clock::now() - start;
  result.milliseconds = taken.count();
  result.ok = status == N3DS_OK && out.faceNum == frame.faces.size() &&
              (mode_ != TrackMode::kMask || meshes.modelNum == frame.faces.size());
  if (!result.ok) {
    result.faces.clear();
    return result;
  }
  for (std::size_t i = 0; i < result.faces.size(); ++i) {
    const Norvale_3DSticker_Face_Matrix& matrices = out.faces[i];
    for (std::size_t k = 0; k < 16; ++k) {
      result.faces[i].projection[k] = matrices.projectionMatrix[k];
      result.faces[i].view[k] = matrices.viewMatrix[k];
      result.faces[i].model[k] = matrices.modelMatrix[k];
    }
    if (mode_ == TrackMode::kMask) {
      const Norvale_3DSticker_Face_Model& mesh = meshes.models[i];
      result.faces[i].pitched = true;
      result.faces[i].corners.assign(mesh.vertices, mesh.vertices + 3 * kMeshCorners);
      // The same table for every face and frame.
      if (texture_coordinates_.empty()) {
        texture_coordinates_.assign(mesh.texCoords, mesh.texCoords + 2 * kMeshCorners);
      }
    }
  }
  return result;
}

std::vector<FrameResult> RunTrack(const Track& track, const std::string& model_path, TrackMode mode,
                                  const std::function<void(std::size_t, const FrameResult&)>& use,
                                  TrackerKind tracker) {
  EngineSession session(model_path, track.header, mode, tracker);
  std::vector<FrameResult> results;
  results.reserve(track.frames.size());
  for (std::size_t f = 0; f < track.frames.size(); ++f) {
    results.push_back(session.Process(track.frames[f]));
    if (use) use(f, results.back());
    for (FaceResult& face : results.back().faces) std::vector<float>().swap(face.corners);
  }
  return results;
}

}  // namespace n3ds::tool
