// SPDX-License-Identifier: MIT
// The shipped face model read by the tests' own code, and landmarks of model faces under known poses.
//
// Everything here uses only operations that give the same bits on every machine (no sines, no
// library random distributions), so that golden values hold everywhere.
#pragma once

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "core/model_tables.h"
#include "norvale_3d_sticker_core.h"
#include "support/random.h"

namespace n3ds::testing {

inline std::vector<uint8_t> ReadBytes(const std::string& path) {
  std::vector<uint8_t> bytes;
  std::FILE* file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) return bytes;
  uint8_t buffer[65536];
  for (size_t n; (n = std::fread(buffer, 1, sizeof(buffer), file)) > 0;) {
    bytes.insert(bytes.end(), buffer, buffer + n);
  }
  std::fclose(file);
  return bytes;
}

inline std::string ModelPath() { return N3DS_SOURCE_DIR "/data/face_model.bin"; }

// The bytes of the shipped face model.
inline const std::vector<uint8_t>& ModelBytes() {
  static const std::vector<uint8_t> bytes = ReadBytes(ModelPath());
  return bytes;
}

// Coordinate i of a 16-bit part of the model that starts at `offset`, in 1/256 mm.
inline int16_t ModelInt16(size_t offset, size_t i) {
  int16_t value;
  std::memcpy(&value, ModelBytes().data() + offset + 2 * i, sizeof(value));
  return value;
}

constexpr size_t kMeanOffset = 12;
constexpr size_t kIdentityOffset = 10884;
constexpr size_t kExpressionOffset = 184836;
constexpr size_t kTensorOffset = 402276;

// The shape mean + sum a_k I_k + sum b_j E_j in mm (without the interaction).
inline std::vector<double> ModelShape(const std::vector<double>& identity = {},
                                      const std::vector<double>& expression = {}) {
  std::vector<double> shape(kShapeSize);
  for (size_t i = 0; i < shape.size(); i++) {
    double value = ModelInt16(kMeanOffset, i);
    for (size_t k = 0; k < identity.size(); k++) {
      value += identity[k] * ModelInt16(kIdentityOffset, k * kShapeSize + i);
    }
    for (size_t j = 0; j < expression.size(); j++) {
      value += expression[j] * ModelInt16(kExpressionOffset, j * kShapeSize + i);
    }
    shape[i] = value / 256.0;
  }
  return shape;
}

inline std::vector<float> MeanShapeFloats() {
  std::vector<float> shape(kShapeSize);
  for (size_t i = 0; i < shape.size(); i++) {
    shape[i] = static_cast<float>(ModelInt16(kMeanOffset, i)) * kModelUnit;
  }
  return shape;
}

// A head's place in the camera frame. Turns are tangents of half angles about the camera's axes (0
// is a frontal, upright face; 0.27 is 30 degrees), so that rotations need no trigonometry.
struct HeadPlace {
  double yaw = 0;
  double pitch = 0;
  double roll = 0;
  double x = 0;
  double y = 0;
  double z = 600;
};

struct RigidTransform {
  double r[9];
  double t[3];
};

inline void MultiplyQuaternions(const double* a, const double* b, double* out) {
  out[0] = a[0] * b[0] - a[1] * b[1] - a[2] * b[2] - a[3] * b[3];
  out[1] = a[0] * b[1] + a[1] * b[0] + a[2] * b[3] - a[3] * b[2];
  out[2] = a[0] * b[2] - a[1] * b[3] + a[2] * b[0] + a[3] * b[1];
  out[3] = a[0] * b[3] + a[1] * b[2] - a[2] * b[1] + a[3] * b[0];
}

// Model frame to camera frame.
inline RigidTransform TransformOf(const HeadPlace& place) {
  // Half a turn about x, and the 20 degrees of the mean shape's pitch.
  const double front[4] = {-0.17632698, 1, 0, 0};
  const double pitch[4] = {1, place.pitch, 0, 0};
  const double yaw[4] = {1, 0, place.yaw, 0};
  const double roll[4] = {1, 0, 0, place.roll};
  double a[4], b[4], q[4];
  MultiplyQuaternions(pitch, front, a);
  MultiplyQuaternions(yaw, a, b);
  MultiplyQuaternions(roll, b, q);
  const double w = q[0], x = q[1], y = q[2], z = q[3];
  const double n = w * w + x * x + y * y + z * z;
  return {{(w * w + x * x - y * y - z * z) / n, 2 * (x * y - w * z) / n, 2 * (x * z + w * y) / n,
           2 * (x * y + w * z) / n, (w * w - x * x + y * y - z * z) / n, 2 * (y * z - w * x) / n,
           2 * (x * z - w * y) / n, 2 * (y * z + w * x) / n, (w * w - x * x - y * y + z * z) / n},
          {place.x, place.y, place.z}};
}

struct Vec3 {
  double x, y, z;
};

inline Vec3 VertexOf(const std::vector<double>& shape, int32_t index) {
  const size_t at = 3 * static_cast<size_t>(index);
  return {shape[at], shape[at + 1], shape[at + 2]};
}
inline Vec3 Middle(const Vec3& a, const Vec3& b) {
  return {(a.x + b.x) / 2, (a.y + b.y) / 2, (a.z + b.z) / 2};
}

// Where the landmarks (101 or 165) lie on a shape.
inline std::vector<Vec3> LandmarkPoints(const std::vector<double>& shape, int count) {
  std::vector<Vec3> points;
  for (const int32_t v : kDefaultContourVertexIndices) points.push_back(VertexOf(shape, v));
  for (const int32_t v : kInnerLandmarkVertexIndices) points.push_back(VertexOf(shape, v));
  for (const auto& lids : kLidVertexIndices) {
    points.push_back(Middle(VertexOf(shape, lids[0]), VertexOf(shape, lids[1])));
  }
  for (const int32_t v : kRidgeVertexIndices) points.push_back(VertexOf(shape, v));
  if (count == 101) return points;
  points.push_back(points[95]);
  points.push_back(points[96]);
  for (size_t k = 0; k < 18; k++) points.push_back(Middle(points[k], points[k + 1]));
  const auto ring = [&points](size_t first, size_t last) {
    for (size_t k = first; k < last; k++) points.push_back(Middle(points[k], points[k + 1]));
    points.push_back(Middle(points[last], points[first]));
  };
  ring(39, 50);
  ring(51, 62);
  ring(75, 86);
  ring(87, 94);
  return points;
}

// Pinhole projection as the engine sees an image of width x height, before rounding.
inline void Project(const RigidTransform& pose, const Vec3& p, int width, int height, double* u,
                    double* v) {
  const double f = (width + height) / 2.0;
  const double x = pose.r[0] * p.x + pose.r[1] * p.y + pose.r[2] * p.z + pose.t[0];
  const double y = pose.r[3] * p.x + pose.r[4] * p.y + pose.r[5] * p.z + pose.t[1];
  const double z = pose.r[6] * p.x + pose.r[7] * p.y + pose.r[8] * p.z + pose.t[2];
  *u = f * x / z + width / 2.0;
  *v = f * y / z + height / 2.0;
}

// Landmarks of a face as a detector would report them: rounded, each coordinate off by up to
// `noise` pixels.
inline std::vector<int32_t> DetectLandmarks(const std::vector<double>& shape,
                                            const HeadPlace& place, int width, int height,
                                            int count = 101, int noise = 0,
                                            Random* random = nullptr) {
  std::vector<int32_t> landmarks;
  const RigidTransform pose = TransformOf(place);
  for (const Vec3& p : LandmarkPoints(shape, count)) {
    double u, v;
    Project(pose, p, width, height, &u, &v);
    for (const double c : {u, v}) {
      const int32_t offset = noise > 0 ? random->Int(-noise, noise) : 0;
      landmarks.push_back(static_cast<int32_t>(std::floor(c + 0.5)) + offset);
    }
  }
  return landmarks;
}

// A smooth wave of period 1 between -1 and 1: parabolas in place of a sine.
inline double Wave(double t) {
  const double u = 2 * (t - std::floor(t));
  return u < 1 ? 4 * u * (1 - u) : -4 * (u - 1) * (2 - u);
}

// A person who moves smoothly, turns the head and talks; `seed` makes persons differ.
class Person {
 public:
  explicit Person(uint64_t seed) : random_(seed) {
    identity_.resize(kIdentityCount);
    for (double& a : identity_) a = random_.In(-0.6, 0.6);
    for (double& p : phase_) p = random_.Unit();
    home_ = {0, 0, 0, 0, 0, 600};
  }
  Person At(double x, double y, double z) && {
    home_.x = x;
    home_.y = y;
    home_.z = z;
    return std::move(*this);
  }
  HeadPlace PlaceAt(int frame) const {
    const double t = frame / 90.0;
    HeadPlace place = home_;
    place.yaw += 0.25 * Wave(t + phase_[0]);
    place.pitch += 0.1 * Wave(1.3 * t + phase_[1]);
    place.roll += 0.08 * Wave(0.7 * t + phase_[2]);
    place.x += 25 * Wave(0.9 * t + phase_[3]);
    place.y += 15 * Wave(1.1 * t + phase_[4]);
    place.z += 40 * Wave(0.5 * t + phase_[5]);
    return place;
  }
  std::vector<double> ShapeAt(int frame) const {
    std::vector<double> expression(kExpressionCount);
    for (size_t j = 0; j < expression.size(); j++) {
      const double phase = phase_[6] + 0.37 * static_cast<double>(j);
      const double wave = Wave(frame / 20.0 + phase);
      expression[j] = wave > 0.5 ? wave - 0.5 : 0;
    }
    return ModelShape(identity_, expression);
  }
  std::vector<int32_t> Detect(int frame, int width, int height, int count, int noise) {
    return DetectLandmarks(ShapeAt(frame), PlaceAt(frame), width, height, count, noise, &random_);
  }

 private:
  Random random_;
  std::vector<double> identity_;
  double phase_[7] = {};
  HeadPlace home_;
};

// The camera matrix the drivers set up.
struct Camera {
  float k[9];
  Camera(int width, int height)
      : k{static_cast<float>(width + height) / 2,
          0,
          static_cast<float>(width) / 2,
          0,
          static_cast<float>(width + height) / 2,
          static_cast<float>(height) / 2,
          0,
          0,
          1} {}
};

inline NSVL_OFFSCREEN ImageOf(int32_t width, int32_t height) {
  NSVL_OFFSCREEN image = {};
  image.pixelFormat = N3DS_FORMAT_NV21;
  image.width = width;
  image.height = height;
  return image;
}

}  // namespace n3ds::testing
