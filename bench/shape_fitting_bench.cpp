// SPDX-License-Identifier: MIT
// The fits of shape coefficients to one face's landmarks, on the shipped face model.
#include <benchmark/benchmark.h>

#include <cmath>
#include <cstring>
#include <vector>

#include "core/rigid_shape_refinement.h"
#include "core/shape_fitting.h"
#include "support/face_scene.h"

namespace n3ds::bench {
namespace {

using testing::ModelInt16;

std::vector<int16_t> ModelPart(size_t offset, size_t size) {
  std::vector<int16_t> part(size);
  for (size_t i = 0; i < size; ++i) part[i] = ModelInt16(offset, i);
  return part;
}

// A person with an expression, seen by the camera.
struct Scene {
  std::vector<int16_t> mean = ModelPart(testing::kMeanOffset, kShapeSize);
  std::vector<int16_t> identity_basis =
      ModelPart(testing::kIdentityOffset, size_t{kIdentityCount} * kShapeSize);
  std::vector<int16_t> expression_basis =
      ModelPart(testing::kExpressionOffset, size_t{kExpressionCount} * kShapeSize);
  std::vector<int16_t> tensor;
  std::vector<int32_t> landmarks, vertices;
  std::vector<float> points;
  float camera[9] = {960, 0, 640, 0, 960, 360, 0, 0, 1};
  float rotation[9], translation[3];
  float identity[kIdentityCount], expression[kExpressionCount];

  Scene() {
    const size_t size = size_t{kIdentityCount} * kExpressionCount * kShapeSize;
    for (size_t i = 0; i < size; ++i) {
      const auto stored = static_cast<int8_t>(testing::ModelBytes()[testing::kTensorOffset + i]);
      tensor.push_back(static_cast<int16_t>(stored * 40));
    }
    vertices.assign(kDefaultContourVertexIndices, kDefaultContourVertexIndices + 19);
    vertices.insert(vertices.end(), kInnerLandmarkVertexIndices, kInnerLandmarkVertexIndices + 76);
    for (int k = 0; k < kIdentityCount; ++k) identity[k] = k % 2 == 0 ? 0.4f : -0.3f;
    const testing::HeadPlace place = {0.1, 0.05, 0.02, 10, -5, 600};
    const testing::RigidTransform pose = testing::TransformOf(place);
    for (int i = 0; i < 9; ++i) rotation[i] = static_cast<float>(pose.r[i]);
    for (int i = 0; i < 3; ++i) translation[i] = static_cast<float>(pose.t[i]);
    const std::vector<double> shape = testing::ModelShape(
        std::vector<double>(identity, identity + kIdentityCount), {0.5, 0, 0.3, 0, 0, 0.4});
    landmarks = testing::DetectLandmarks(shape, place, 1280, 640);
    for (size_t i = 0; i < kFitLandmarkCount; ++i) {
      const testing::Vec3 p = testing::VertexOf(shape, vertices[i]);
      points.push_back(static_cast<float>(landmarks[2 * i]));
      points.push_back(static_cast<float>(landmarks[2 * i + 1]));
      points.push_back(
          static_cast<float>(pose.r[6] * p.x + pose.r[7] * p.y + pose.r[8] * p.z + pose.t[2]));
    }
  }
};

bool Finite(const float* values, int count) {
  double sum = 0;
  for (int i = 0; i < count; ++i) sum += std::fabs(values[i]);
  return std::isfinite(sum) && sum > 0;
}

void SolveForIdentityCoef(benchmark::State& state) {
  const Scene s;
  float coef[kIdentityCount] = {};
  for (auto _ : state) {
    n3ds::SolveForIdentityCoef(nullptr, s.points.data(), s.mean.data(), s.identity_basis.data(),
                               s.camera, s.rotation, s.translation, coef, s.vertices.data(), 2);
    benchmark::DoNotOptimize(coef);
    benchmark::ClobberMemory();
  }
  if (!Finite(coef, kIdentityCount)) state.SkipWithError("no coefficients");
}
BENCHMARK(SolveForIdentityCoef)->Unit(benchmark::kMicrosecond);

// range: whether the person has identity coefficients, so that the interaction tensor is read.
void SolveForExpressionCoef(benchmark::State& state) {
  const Scene s;
  const float nobody[kIdentityCount] = {};
  float coef[kExpressionCount] = {};
  for (auto _ : state) {
    n3ds::SolveForExpressionCoef(
        nullptr, s.landmarks.data(), s.mean.data(), s.identity_basis.data(),
        s.expression_basis.data(), s.tensor.data(), s.camera, s.rotation, s.translation,
        state.range(0) != 0 ? s.identity : nobody, coef, s.vertices.data(), 2);
    benchmark::DoNotOptimize(coef);
    benchmark::ClobberMemory();
  }
  if (!Finite(coef, kExpressionCount)) state.SkipWithError("no coefficients");
}
BENCHMARK(SolveForExpressionCoef)
    ->ArgName("identity")
    ->Arg(0)
    ->Arg(1)
    ->Unit(benchmark::kMicrosecond);

void RigidRefits(benchmark::State& state) {
  const Scene s;
  const RefitView view = {s.landmarks.data(), s.mean.data(),     s.camera, s.rotation,
                          s.translation,      s.vertices.data(), 2};
  float identity[kIdentityCount] = {}, expression[kExpressionCount] = {};
  for (auto _ : state) {
    RefitIdentityRigid(nullptr, view, s.identity_basis.data(), identity);
    RefitExpressionRigid(nullptr, view, s.expression_basis.data(), expression);
    benchmark::DoNotOptimize(expression);
    benchmark::ClobberMemory();
  }
  if (!Finite(identity, kIdentityCount) || !Finite(expression, kExpressionCount)) {
    state.SkipWithError("no coefficients");
  }
}
BENCHMARK(RigidRefits)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace n3ds::bench

BENCHMARK_MAIN();
