// SPDX-License-Identifier: MIT
// One rigid frame, whole and by its parts: matching, pose fit, contour; and one mask frame. What
// the task pool costs is in task_pool_bench.
#include <benchmark/benchmark.h>

#include <vector>

#include "core/contour_correspondence.h"
#include "core/face_matching.h"
#include "core/pose_fitting.h"
#include "core/pose_rounds.h"
#include "support/face_scene.h"
#include "tracked_faces.h"

namespace {

using n3ds::bench::FramesWithFaces;
using n3ds::bench::kTrackHeight;
using n3ds::bench::kTrackWidth;
using n3ds::testing::ModelBytes;

// An engine with an image to process and room for its results.
struct Host {
  void* engine = Norvale_3DSticker_CreateEngine();
  NSVL_OFFSCREEN image = {};
  Norvale_3DSticker_Matrix_Array matrices = {};
  Norvale_3DSticker_ModelInfo_Array models = {};
  float landmarks_3d[N3DS_MAX_FACES][3 * 101];

  Host() {
    Norvale_3DSticker_InitializeEx(engine, ModelBytes().data(),
                                   static_cast<uint32_t>(ModelBytes().size()), 0, 0);
    image.width = kTrackWidth;
    image.height = kTrackHeight;
    for (int k = 0; k < N3DS_MAX_FACES; k++) matrices.faces[k].landmarks3D = landmarks_3d[k];
  }
  ~Host() { Norvale_3DSticker_DestroyEngine(engine); }
  Host(const Host&) = delete;
  Host& operator=(const Host&) = delete;
};

// One, three and five faces, each with a worker thread: what all threads use counts.
void WithWorkers(benchmark::internal::Benchmark* bench) {
  bench->Arg(1)->Arg(3)->Arg(5)->Unit(benchmark::kMicrosecond);
  bench->MeasureProcessCPUTime()->UseRealTime();
}

void RigidFrame(benchmark::State& state) {
  const auto face_count = static_cast<uint32_t>(state.range(0));
  auto frames = FramesWithFaces(static_cast<int>(face_count));
  Host host;
  size_t frame = 0;
  for (auto _ : state) {
    const MRESULT result =
        Norvale_3DSticker_Process(host.engine, &host.image, face_count, 101,
                                  frames[frame].points.data(), nullptr, nullptr, &host.matrices);
    if (result != N3DS_OK) state.SkipWithError("frame failed");
    frame = (frame + 1) % frames.size();
  }
}
BENCHMARK(RigidFrame)->Apply(WithWorkers);

// Faces of the example tracks, with expressions and noise.
void MaskFrame(benchmark::State& state) {
  const auto face_count = static_cast<uint32_t>(state.range(0));
  auto frames = FramesWithFaces(static_cast<int>(face_count));
  Host host;
  size_t frame = 0;
  for (auto _ : state) {
    const MRESULT result = Norvale_3DSticker_Process_FaceMask(
        host.engine, &host.image, face_count, 101, frames[frame].points.data(), nullptr, nullptr,
        &host.matrices, &host.models);
    if (result != N3DS_OK || host.models.modelNum != face_count) {
      state.SkipWithError("frame failed");
    }
    frame = (frame + 1) % frames.size();
  }
}
BENCHMARK(MaskFrame)->Apply(WithWorkers);

void* DoNothing(void*) { return nullptr; }

// The life of a frame's pool, a task for each face that does nothing.
void Pool(benchmark::State& state) {
  const auto face_count = static_cast<int32_t>(state.range(0));
  for (auto _ : state) {
    void* pool = mcvParallelInit(nullptr, static_cast<uint32_t>(face_count));
    int32_t ids[N3DS_MAX_FACES];
    for (int32_t i = 0; i < face_count; i++) {
      ids[i] = mcvAddTask(pool, DoNothing, nullptr);
    }
    for (int32_t i = 0; i < face_count; i++) {
      if (mcvWaitTask(pool, ids[i]) != 0) state.SkipWithError("task failed");
    }
    if (mcvParallelUninit(pool) != 0) state.SkipWithError("no pool");
  }
}
BENCHMARK(Pool)->Apply(WithWorkers);

void Matching(benchmark::State& state) {
  const auto face_count = static_cast<uint32_t>(state.range(0));
  const auto frames = FramesWithFaces(static_cast<int>(face_count));
  n3ds::FaceAssignment assignment;
  size_t frame = 1;
  for (auto _ : state) {
    n3ds::AssignFaces(&frames[frame].points[0].x, face_count, &frames[frame - 1].points[0].x,
                      face_count, 101, &assignment);
    benchmark::DoNotOptimize(assignment);
    frame = frame % (frames.size() - 1) + 1;
  }
}
BENCHMARK(Matching)->Arg(1)->Arg(3)->Arg(5)->Unit(benchmark::kMicrosecond);

// A tracked face: every fit starts from the pose of the frame before.
struct TrackedFace {
  std::vector<float> shape = n3ds::testing::MeanShapeFloats();
  std::vector<n3ds::bench::TrackedFrame> frames = FramesWithFaces(1);
  float camera[9] = {(kTrackWidth + kTrackHeight) / 2.0f,
                     0,
                     kTrackWidth / 2.0f,
                     0,
                     (kTrackWidth + kTrackHeight) / 2.0f,
                     kTrackHeight / 2.0f,
                     0,
                     0,
                     1};
  float pose[7] = {};
  int32_t contour[n3ds::kOutlineLandmarkCount] = {};
  n3ds::PoseRounds rounds{nullptr, shape.data(), camera, pose, contour};

  TrackedFace() {
    rounds.StartNewFace();
    for (int i = 0; i < 4; i++) {
      Fit(0);
      rounds.UpdateContour(&frames[0].points[0].x);
    }
  }
  bool Fit(size_t frame) {
    return rounds.Fit(&frames[frame].points[0].x, contour, {0, 1.0f, 1.0f, 1.0f});
  }
};

void PoseFit(benchmark::State& state) {
  TrackedFace face;
  size_t frame = 0;
  for (auto _ : state) {
    if (!face.Fit(frame)) state.SkipWithError("fit failed");
    frame = (frame + 1) % face.frames.size();
  }
}
BENCHMARK(PoseFit)->Unit(benchmark::kMicrosecond);

void Contour(benchmark::State& state) {
  TrackedFace face;
  for (auto _ : state) face.rounds.UpdateContour(&face.frames[0].points[0].x);
}
BENCHMARK(Contour)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
