// SPDX-License-Identifier: MIT
#include "engine/core_session.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <fstream>
#include <iterator>
#include <numeric>
#include <utility>

#include "engine/face_results.h"
#include "mesh/face_tables.h"
#include "model/face_model_file.h"
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

using CoreTriangle = std::array<std::uint16_t, 3>;

// Vertices before the viewer: x right, y up, z towards it, mm.
Points BeforeViewer(const N3DS_3D_MODEL& mesh, const N3DS_RIGID_MATRIX& matrices) {
  FaceResult face;
  std::copy_n(matrices.viewMatrix, 16, face.view.begin());
  std::copy_n(matrices.modelMatrix, 16, face.model.begin());
  const std::array<double, 16> m = ModelView(face);
  Points seen(kModelVertices);
  for (std::size_t v = 0; v < seen.size(); ++v) {
    const float* p = mesh.vertices + 3 * v;
    seen[v] = Transformed(m, {p[0], p[1], p[2]});
  }
  return seen;
}

// Positive for a triangle that turns its outside to the viewer: its corners run counter-clockwise
// round the line of sight.
double Facing(const Vector3& a, const Vector3& b, const Vector3& c) { return -Dot(a, Cross(b, c)); }

// As many triangles as the mesh has, the farthest first; those that look away are shrunk to a
// point, which draws nothing.
std::vector<CoreTriangle> VisibleTriangles(const Points& seen) {
  std::vector<std::pair<double, CoreTriangle>> by_depth;
  by_depth.reserve(kMeshTriangles);
  for (const Triangle& t : FaceTriangles()) {
    const Vector3& a = seen[t[0]];
    const Vector3& b = seen[t[1]];
    const Vector3& c = seen[t[2]];
    if (Facing(a, b, c) > 0) {
      const auto vertex = [&t](std::size_t k) { return static_cast<std::uint16_t>(t[k]); };
      by_depth.emplace_back(a[2] + b[2] + c[2], CoreTriangle{vertex(0), vertex(1), vertex(2)});
    }
  }
  std::stable_sort(by_depth.begin(), by_depth.end(),
                   [](const auto& left, const auto& right) { return left.first < right.first; });
  std::vector<CoreTriangle> triangles(kMeshTriangles, CoreTriangle{});
  std::transform(by_depth.begin(), by_depth.end(), triangles.begin(),
                 [](const auto& entry) { return entry.second; });
  return triangles;
}

// The engine's layout as the warp takes a caller's own: v up.
std::vector<float> UpwardCoordinates() {
  std::vector<float> coordinates;
  for (const auto& [u, v] : FaceTexture()) {
    coordinates.push_back(static_cast<float>(u));
    coordinates.push_back(static_cast<float>(1 - v));
  }
  return coordinates;
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
  const std::vector<CoreTriangle> triangles =
      VisibleTriangles(BeforeViewer(meshes_[face], matrices_[face]));
  static const std::vector<float> coordinates = UpwardCoordinates();
  N3DS_2D_TEXTURE_MASK mask{};
  mask.texCoords = coordinates.data();
  mask.texCoordCount = static_cast<std::int64_t>(kModelVertices);
  mask.triangles = triangles[0].data();
  mask.triangleCount = static_cast<std::int64_t>(kMeshTriangles);
  mask.image = texture;
  N3DS_3D_MODEL mesh = meshes_[face];
  mesh.triangles = mask.triangles;
  Check(N3DS_WarpFaceMask(core_, &mask, &output, &mesh, output.width, output.height,
                          static_cast<int>(face)),
        "the mask cannot be drawn onto face " + std::to_string(face));
}

void CoreSession::Blend(NSVL_OFFSCREEN mask, NSVL_OFFSCREEN image) {
  Check(N3DS_BlendFaceMask(core_, &image, &mask, &image),
        "the mask cannot be blended into the image");
}

}  // namespace n3ds::tool
