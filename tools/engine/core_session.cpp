#include "engine/core_session.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <fstream>
#include <iterator>
#include <numeric>

#include "engine/face_model_file.h"
#include "support/error.h"
#include "tracks/upright.h"

namespace n3ds::tool {
namespace {

void Check(MRESULT result, const std::string& what) {
  if (result != N3DS_OK) {
    throw Error(what + " (core code " + std::to_string(result) + ")");
  }
}

std::vector<char> ReadBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), {}};
}

}  // namespace

CoreSession::CoreSession(const std::string& model_path, const TrackHeader& header)
    : header_(header) {
  // Says in words what is wrong with a file that the core would refuse with a number.
  ReadFaceModelFile(model_path);
  const std::vector<char> model = ReadBytes(model_path);
  N3DS_Init(nullptr, &core_);
  const MRESULT result = N3DS_LoadFaceHouse(core_, model.data(), model.size());
  if (result != N3DS_OK) {
    N3DS_UnInit(core_);
    Check(result, model_path + ": the core refuses the face model");
  }
}

CoreSession::~CoreSession() { N3DS_UnInit(core_); }

void CoreSession::Process(const TrackFrame& frame) {
  const std::size_t count = frame.faces.size();
  // The core takes upright landmarks and writes into them.
  std::vector<std::vector<std::int32_t>> points(count);
  std::vector<N3DS_LANDMARK> faces(count);
  for (std::size_t i = 0; i < count; ++i) {
    for (const PixelPoint& p : UprightLandmarks(header_, frame.faces[i])) {
      points[i].push_back(static_cast<std::int32_t>(p.x));
      points[i].push_back(static_cast<std::int32_t>(p.y));
    }
    faces[i] = {points[i].data(), static_cast<std::uint32_t>(header_.landmarks)};
  }
  NSVL_OFFSCREEN image{};
  image.width = header_.upright_width();
  image.height = header_.upright_height();
  const std::string name = "frame " + std::to_string(frame.number);
  meshes_.clear();
  Check(N3DS_Build3DFaceForVideo_Mask(core_, &image, faces.data(), static_cast<int>(count)),
        name + ": the core cannot track the faces");

  std::vector<std::vector<float>> landmarks(count);
  std::vector<N3DS_3D_MODEL> meshes(count);
  matrices_.assign(count, {});
  for (std::size_t i = 0; i < count; ++i) {
    landmarks[i].resize(3 * static_cast<std::size_t>(header_.landmarks));
    matrices_[i].landmarks3D = landmarks[i].data();
  }
  Check(N3DS_GetFace3DModel(core_, meshes.data(), matrices_.data(), static_cast<int>(count)),
        name + ": the core cannot build the meshes");
  meshes_ = meshes;
}

std::vector<std::size_t> CoreSession::FarToNear() const {
  std::vector<std::size_t> order(meshes_.size());
  std::iota(order.begin(), order.end(), std::size_t{0});
  std::stable_sort(order.begin(), order.end(), [&](std::size_t a, std::size_t b) {
    return matrices_[a].modelMatrix[14] < matrices_[b].modelMatrix[14];
  });
  return order;
}

void CoreSession::Warp(const NSVL_OFFSCREEN& texture, std::size_t face, NSVL_OFFSCREEN output) {
  N3DS_2D_TEXTURE_MASK mask{};
  mask.image = texture;
  Check(N3DS_WarpFaceMask(core_, &mask, &output, &meshes_[face], output.width, output.height,
                          static_cast<int>(face)),
        "the mask cannot be drawn onto face " + std::to_string(face));
}

void CoreSession::Blend(NSVL_OFFSCREEN mask, NSVL_OFFSCREEN image) {
  Check(N3DS_BlendFaceMask(core_, &image, &mask, &image),
        "the mask cannot be blended into the picture");
}

}  // namespace n3ds::tool
