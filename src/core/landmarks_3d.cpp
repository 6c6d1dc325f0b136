// SPDX-License-Identifier: MIT
#include "core/landmarks_3d.h"

#include <algorithm>
#include <cstring>

#include "core/model_tables.h"
#include "core/vector3.h"
#include "norvale_3d_sticker_core.h"

namespace n3ds {

namespace {

constexpr int kPupilLandmark = 95;  // 95 and 96: the pupils, repeated as 101 and 102
constexpr int kRidgeLandmark = 97;  // 97 to 100
// Landmarks with a vertex of their own.
constexpr int kBaseLandmarkCount = N3DS_LANDMARKS_101;
constexpr int kPupilRepeat = 101;
constexpr int kBetweenOutline = 103;  // 103 to 120: midway between outline points
constexpr int kBetweenRings = 121;    // 121 to 164: midway between points of the four rings

// Share of the back-projected outline point; the rest is the model vertex. The detector's outline
// is trusted round the chin, where it is a landmark of the skin and not of the silhouette.
constexpr float kOutlineShare[kOutlineLandmarkCount] = {
    0,     0,    0,     0,     0, 0.15f, 0.25f, 0.4f, 0.55f,  // image left, ear to chin
    0.7f,                                                     // chin
    0.55f, 0.4f, 0.25f, 0.15f, 0, 0,     0,     0,    0,      // image right, chin to ear
};

// The closed rings of landmarks whose neighbours' midpoints are landmarks 121 to 164.
struct Ring {
  int first;
  int count;
};
constexpr Ring kRings[] = {{39, 12}, {51, 12}, {75, 12}, {87, 8}};  // eyes, outer lip, inner lip

// Takes 2-D landmarks of one face back into the model's frame.
class BackProjection {
 public:
  explicit BackProjection(const Landmark3DInput& input) : input_(input) {}

  int32_t Prepare() {
    QuatToRotationMatrix(input_.pose, rotation_);
    const float* t = input_.pose + 4;
    if (MatrixInverse3X3(rotation_, inverse_) != N3DS_OK) return N3DS_NUMERICAL;
    origin_ = Multiply(inverse_, {t[0], t[1], t[2]});
    return N3DS_OK;
  }

  float DepthOf(const Vector3& v) const { return Dot(RowOf(rotation_, 2), v) + input_.pose[6]; }

  // The landmark's pixel centre at a camera depth.
  Vector3 At(uint32_t landmark, float depth) const {
    const float* k = input_.camera;
    const auto x = static_cast<float>(input_.landmarks[2 * landmark] + 0.5);
    const auto y = static_cast<float>(input_.landmarks[2 * landmark + 1] + 0.5);
    const Vector3 p =
        Multiply(inverse_, {(x - k[2]) * depth / k[0], (y - k[5]) * depth / k[4], depth});
    return {p.x - origin_.x, p.y - origin_.y, p.z - origin_.z};
  }

 private:
  const Landmark3DInput& input_;
  float rotation_[9] = {};
  float inverse_[9] = {};
  Vector3 origin_ = {};
};

Vector3 ModelPoint(const float* vertices, const int32_t extra_vertices[4], int landmark) {
  if (landmark < kOutlineLandmarkCount) {
    return VectorAt(vertices, kDefaultContourVertexIndices[landmark]);
  }
  if (landmark < kFitLandmarkCount) {
    return VectorAt(vertices, kInnerLandmarkVertexIndices[landmark - kOutlineLandmarkCount]);
  }
  if (landmark < kRidgeLandmark) {
    const int32_t* lids = kLidVertexIndices[landmark - kPupilLandmark];
    return Midpoint(VectorAt(vertices, lids[0]), VectorAt(vertices, lids[1]));
  }
  return VectorAt(vertices, extra_vertices[landmark - kRidgeLandmark]);
}

}  // namespace

int32_t ComputeLandmarks3D(const Landmark3DInput& input, const int32_t extra_vertices[4],
                           float* landmarks_3d) {
  BackProjection back_projection(input);
  const int32_t result = back_projection.Prepare();
  if (result != N3DS_OK) return result;

  const auto write = [landmarks_3d](int landmark, const Vector3& p) {
    std::memcpy(landmarks_3d + 3 * static_cast<ptrdiff_t>(landmark), &p, sizeof(p));
  };
  const auto count = static_cast<int>(input.landmark_count);
  float depth[kBaseLandmarkCount];
  Vector3 base[kBaseLandmarkCount];
  for (int i = 0; i < std::min(count, kBaseLandmarkCount); ++i) {
    const Vector3 v = ModelPoint(input.vertices, extra_vertices, i);
    depth[i] = back_projection.DepthOf(v);
    Vector3 p = back_projection.At(static_cast<uint32_t>(i), depth[i]);
    if (i < kOutlineLandmarkCount) {
      const float a = kOutlineShare[i];
      const float b = 1.0f - a;
      p = {a * p.x + b * v.x, a * p.y + b * v.y, a * p.z + b * v.z};
    }
    base[i] = p;
    write(i, p);
  }
  if (count <= kBaseLandmarkCount) return N3DS_OK;

  write(kPupilRepeat, base[kPupilLandmark]);
  write(kPupilRepeat + 1, base[kPupilLandmark + 1]);
  for (int i = kBetweenOutline; i < kBetweenRings; ++i) {
    const int k = i - kBetweenOutline;
    write(i, Midpoint(base[k], base[k + 1]));
  }
  int i = kBetweenRings;
  for (const Ring& ring : kRings) {
    for (int k = 0; k < ring.count; ++k, ++i) {
      const float a = depth[ring.first + k];
      const float b = depth[ring.first + (k + 1) % ring.count];
      write(i, back_projection.At(static_cast<uint32_t>(i), (a + b) * 0.5f));
    }
  }
  return N3DS_OK;
}

}  // namespace n3ds
