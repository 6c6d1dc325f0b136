// SPDX-License-Identifier: MIT
// The dense meshes of a mask frame, beside the same sum as a matrix-vector product in Eigen. The
// counter `difference` is the largest between both, in mm.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cmath>
#include <vector>

#include "core/dense_model.h"
#include "core/tracking_context.h"
#include "eigen_mesh.h"
#include "tracked_faces.h"

namespace n3ds::bench {
namespace {

// The engine keeps products of coefficients with 15 fractional bits, cut off; Eigen does not.
constexpr double kAllowedDifference = 0.02;  // mm

EigenMesh PeerOf(const TrackingContext& context) {
  return {context.meanShape, context.identityBasis, context.expressionBasis, context.tensor};
}

double LargestDifference(const float* a, const float* b) {
  double largest = 0;
  for (int i = 0; i < kShapeSize; ++i) {
    const double difference = std::fabs(double{a[i]} - double{b[i]});
    if (!std::isfinite(difference)) return difference;
    largest = std::max(largest, difference);
  }
  return largest;
}

// Both build all faces' meshes on one thread; the check compares them.
void Report(const TrackedFaces& faces, const EigenMesh& peer, const float* shapes,
            benchmark::State& state) {
  const TrackingContext& context = *ContextOf(faces.core());
  double difference = 0;
  std::vector<float> other(kShapeSize);
  for (int f = 0; f < faces.face_count(); ++f) {
    peer.Build(context.identityCoef[f], context.expressionCoef[f], other.data());
    const float* shape = shapes + static_cast<ptrdiff_t>(f) * kShapeSize;
    for (const float* mesh : {shape, static_cast<const float*>(other.data())}) {
      const double d = LargestDifference(mesh, context.shape[f]);
      if (!(d < kAllowedDifference)) state.SkipWithError("the meshes differ");
      difference = std::max(difference, d);
    }
  }
  state.counters["difference"] = difference;
}

void EngineSum(benchmark::State& state) {
  const TrackedFaces faces(static_cast<int>(state.range(0)));
  const TrackingContext& context = *ContextOf(faces.core());
  std::vector<float> shapes(static_cast<size_t>(faces.face_count()) * kShapeSize);
  for (auto _ : state) {
    for (int f = 0; f < faces.face_count(); ++f) {
      int16_t products[kProductCount];
      BuildProductTable(context.identityCoef[f], context.expressionCoef[f], products);
      FaceMeshTask task = {context.meanShape,
                           context.identityBasis,
                           context.expressionBasis,
                           context.tensor,
                           context.identityCoef[f],
                           context.expressionCoef[f],
                           products,
                           0,
                           kVertexCount,
                           shapes.data() + static_cast<ptrdiff_t>(f) * kShapeSize};
      _GetFace3DModel_Thread(&task);
    }
    benchmark::ClobberMemory();
  }
  Report(faces, PeerOf(context), shapes.data(), state);
}

void EigenProduct(benchmark::State& state) {
  const TrackedFaces faces(static_cast<int>(state.range(0)));
  const TrackingContext& context = *ContextOf(faces.core());
  const EigenMesh peer = PeerOf(context);
  std::vector<float> shapes(static_cast<size_t>(faces.face_count()) * kShapeSize);
  for (auto _ : state) {
    for (int f = 0; f < faces.face_count(); ++f) {
      peer.Build(context.identityCoef[f], context.expressionCoef[f],
                 shapes.data() + static_cast<ptrdiff_t>(f) * kShapeSize);
    }
    benchmark::ClobberMemory();
  }
  Report(faces, peer, shapes.data(), state);
}

// As hosts call it: with a pool of threads, matrices and 3-D landmarks.
void GetFace3DModel(benchmark::State& state) {
  TrackedFaces faces(static_cast<int>(state.range(0)));
  for (auto _ : state) {
    if (faces.BuildMeshes() != N3DS_OK) state.SkipWithError("no meshes");
  }
}

BENCHMARK(EngineSum)->ArgName("faces")->Arg(1)->Arg(5)->Unit(benchmark::kMicrosecond);
BENCHMARK(EigenProduct)->ArgName("faces")->Arg(1)->Arg(5)->Unit(benchmark::kMicrosecond);
BENCHMARK(GetFace3DModel)
    ->ArgName("faces")
    ->Arg(1)
    ->Arg(5)
    ->Unit(benchmark::kMicrosecond)
    ->MeasureProcessCPUTime()
    ->UseRealTime();

}  // namespace
}  // namespace n3ds::bench

BENCHMARK_MAIN();
