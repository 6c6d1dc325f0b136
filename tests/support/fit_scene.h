// SPDX-License-Identifier: MIT
// A made-up face model and images of its shapes, for the tests of the coefficient fits.
#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include "support/face_scene.h"
#include "support/random.h"

namespace n3ds::testing {

// Arrays of exactly the model's sizes. The basis vectors are random, so that every coefficient can
// be told from every other; nine tenths of the tensor are zero.
struct FitModel {
  std::vector<int16_t> mean, identity, expression, tensor;

  FitModel() {
    Random random(20231);
    for (int i = 0; i < kShapeSize; ++i) {
      mean.push_back(static_cast<int16_t>(random.Int(-60 * 256, 60 * 256)));
    }
    for (int i = 0; i < kIdentityCount * kShapeSize; ++i) {
      identity.push_back(static_cast<int16_t>(random.Int(-2000, 2000)));
    }
    for (int i = 0; i < kExpressionCount * kShapeSize; ++i) {
      expression.push_back(static_cast<int16_t>(random.Int(-2000, 2000)));
    }
    tensor.resize(static_cast<size_t>(kIdentityCount) * kExpressionCount * kShapeSize);
    for (size_t vertex = 0; vertex < tensor.size() / 3; ++vertex) {
      if (random.Int(0, 9) != 0) continue;
      for (size_t axis = 0; axis < 3; ++axis) {
        // Single zero components do not make a vector zero.
        tensor[3 * vertex + axis] =
            static_cast<int16_t>(random.Int(0, 3) == 0 ? 0 : random.Int(-1000, 1000));
      }
    }
  }

  static const FitModel& Get() {
    static const FitModel model;
    return model;
  }

  // Vertex of the shape in mm; the interaction takes the pairs with an even sum of indices.
  Vec3 Vertex(int32_t vertex, const std::vector<float>& a, const std::vector<float>& b) const {
    double v[3];
    for (int axis = 0; axis < 3; ++axis) {
      const size_t at = 3 * static_cast<size_t>(vertex) + static_cast<size_t>(axis);
      v[axis] = mean[at];
      for (size_t k = 0; k < a.size(); ++k) v[axis] += double{a[k]} * identity[k * kShapeSize + at];
      for (size_t j = 0; j < b.size(); ++j) {
        v[axis] += double{b[j]} * expression[j * kShapeSize + at];
        for (size_t k = j % 2; k < a.size(); k += 2) {
          v[axis] += double{b[j]} * a[k] * tensor[(k * kExpressionCount + j) * kShapeSize + at];
        }
      }
    }
    return {v[0] / 256, v[1] / 256, v[2] / 256};
  }
};

// The pose of an image, and where its landmarks are.
struct FitView {
  std::vector<float> camera = {960, 0, 640, 0, 950, 360, 0, 0, 1};
  std::vector<float> rotation, translation = {5, -8, 600};
  std::vector<int32_t> vertices;

  explicit FitView(uint64_t seed) {
    const RigidTransform pose = TransformOf({0.1, -0.05, 0.03, 0, 0, 0});
    for (const double r : pose.r) rotation.push_back(static_cast<float>(r));
    Random random(seed);
    for (int i = 0; i < kFitLandmarkCount; ++i) {
      vertices.push_back(random.Int(0, kVertexCount - 1));
    }
    // The model's own ends.
    vertices[3] = 0;
    vertices[60] = kVertexCount - 1;
  }

  Vec3 ToCamera(const Vec3& p) const {
    const auto& r = rotation;
    return {r[0] * p.x + r[1] * p.y + r[2] * p.z + translation[0],
            r[3] * p.x + r[4] * p.y + r[5] * p.z + translation[1],
            r[6] * p.x + r[7] * p.y + r[8] * p.z + translation[2]};
  }

  // u, v and depth of each landmark on a shape.
  std::vector<float> Points(const std::vector<float>& a, const std::vector<float>& b) const {
    std::vector<float> points;
    for (const int32_t vertex : vertices) {
      const Vec3 p = ToCamera(FitModel::Get().Vertex(vertex, a, b));
      points.push_back(static_cast<float>(camera[0] * p.x / p.z + camera[2]));
      points.push_back(static_cast<float>(camera[4] * p.y / p.z + camera[5]));
      points.push_back(static_cast<float>(p.z));
    }
    return points;
  }
  std::vector<int32_t> Pixels(const std::vector<float>& a, const std::vector<float>& b) const {
    std::vector<int32_t> pixels;
    const std::vector<float> points = Points(a, b);
    for (size_t i = 0; i < points.size(); i += 3) {
      pixels.push_back(static_cast<int32_t>(std::floor(points[i] + 0.5f)));
      pixels.push_back(static_cast<int32_t>(std::floor(points[i + 1] + 0.5f)));
    }
    return pixels;
  }
};

// The equations of a landmark as they are defined: direction and constant along the image's x and
// y, in plain single precision.
struct ReferenceEquations {
  float direction[2][3];
  float constant[2];
};

inline ReferenceEquations EquationsAt(const FitView& view, float u, float v) {
  const float offset[2] = {u - view.camera[2], v - view.camera[5]};
  const float focal[2] = {view.camera[0], view.camera[4]};
  ReferenceEquations e;
  for (int row = 0; row < 2; ++row) {
    for (int axis = 0; axis < 3; ++axis) {
      e.direction[row][axis] = offset[row] * view.rotation[static_cast<size_t>(6 + axis)] -
                               focal[row] * view.rotation[static_cast<size_t>(3 * row + axis)];
    }
    e.constant[row] =
        offset[row] * view.translation[2] - focal[row] * view.translation[static_cast<size_t>(row)];
  }
  return e;
}

inline float Along(const float* direction, const int16_t* vector) {
  return direction[0] * vector[0] + direction[1] * vector[1] + direction[2] * vector[2];
}

inline std::vector<float> RandomCoefficients(Random* random, int count, double size) {
  std::vector<float> values;
  for (int k = 0; k < count; ++k) values.push_back(static_cast<float>(random->In(-size, size)));
  return values;
}

}  // namespace n3ds::testing
