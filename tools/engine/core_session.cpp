#include "engine/core_session.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <fstream>
#include <iterator>
#include <numeric>
#include <utility>

#include "engine/face_model_file.h"
#include "engine/face_results.h"
#include "engine/mesh_tables.h"
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

using Vector3 = std::array<double, 3>;
using Triangle = std::array<std::uint16_t, 3>;

// Vertices before the viewer: x right, y up, z towards it, mm.
std::vector<Vector3> BeforeViewer(const N3DS_3D_MODEL& mesh, const N3DS_RIGID_MATRIX& matrices) {
  FaceResult face;
  std::copy_n(matrices.viewMatrix, 16, face.view.begin());
  std::copy_n(matrices.modelMatrix, 16, face.model.begin());
  const std::array<double, 16> m = ModelView(face);
  std::vector<Vector3> seen(kModelVertices);
  for (std::size_t v = 0; v < seen.size(); ++v) {
    const float* p = mesh.vertices + 3 * v;
    for (std::size_t row = 0; row < 3; ++row) {
      seen[v][row] = m[row] * double{p[0]} + m[4 + row] * double{p[1]} + m[8 + row] * double{p[2]} +
                     m[12 + row];
    }
  }
  return seen;
}

// Positive for a triangle that turns its outside to the viewer: its corners run counter-clockwise
// round the line of sight.
double Facing(const Vector3& a, const Vector3& b, const Vector3& c) {
  return -(a[0] * (b[1] * c[2] - b[2] * c[1]) + a[1] * (b[2] * c[0] - b[0] * c[2]) +
           a[2] * (b[0] * c[1] - b[1] * c[0]));
}

// As many triangles as the mesh has, the farthest first; those that look away are shrunk to a
// point, which draws nothing.
std::vector<Triangle> VisibleTriangles(const std::vector<Vector3>& seen) {
  std::vector<std::pair<double, Triangle>> by_depth;
  by_depth.reserve(kMeshTriangles);
  for (const Triangle& t : MeshTriangles()) {
    const Vector3& a = seen[t[0]];
    const Vector3& b = seen[t[1]];
    const Vector3& c = seen[t[2]];
    if (Facing(a, b, c) > 0) by_depth.emplace_back(a[2] + b[2] + c[2], t);
  }
  std::stable_sort(by_depth.begin(), by_depth.end(),
                   [](const auto& left, const auto& right) { return left.first < right.first; });
  std::vector<Triangle> triangles(kMeshTriangles, Triangle{});
  std::transform(by_depth.begin(), by_depth.end(), triangles.begin(),
                 [](const auto& entry) { return entry.second; });
  return triangles;
}

// The engine's layout as the warp takes a caller's own: v up.
std::vector<float> UpwardCoordinates() {
  std::vector<float> coordinates;
  for (const auto& [u, v] : MeshTextureCoordinates()) {
    coordinates.push_back(u);
    coordinates.push_back(1 - v);
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
  const std::vector<Triangle> triangles =
      VisibleTriangles(BeforeViewer(meshes_[face], matrices_[face]));
  const std::vector<float> coordinates = UpwardCoordinates();
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
        "the mask cannot be blended into the picture");
}

}  // namespace n3ds::tool
