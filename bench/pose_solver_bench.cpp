// SPDX-License-Identifier: MIT
// The pose solver beside Ceres' TinySolver in float, on the same problems: a face of 95 points, its
// landmarks rounded to pixels with noise, and as start the pose of the frame before.
//
// Every row reports what came out beside what it cost: passes, the error left in pixels (root mean
// square over the points) and how far the pose is from the truth in degrees, means over the
// problems.
#include <benchmark/benchmark.h>

#include <cmath>
#include <vector>

#include "math/pose_solver.h"
#include "pose_problems.h"
#include "tiny_solver.h"

namespace n3ds::bench {
namespace {

double ReprojectionError(const Problem& problem, const Pose& pose) {
  const ProblemSet& set = ProblemSet::Get();
  const std::vector<float> at = testing::Project(set.model, set.camera, pose);
  double sum = 0;
  for (size_t i = 0; i < at.size(); ++i) {
    sum += (at[i] - problem.landmarks[i]) * (at[i] - problem.landmarks[i]);
  }
  return std::sqrt(sum / kTinyPoints);
}

// Times `solve`, which refines a pose and returns its passes, over the problems in turn.
void Run(benchmark::State& state, int (*solve)(const PoseProblem&, float*)) {
  const ProblemSet& set = ProblemSet::Get();
  size_t next = 0;
  for (auto _ : state) {
    Pose pose = set.problems[next].start;
    benchmark::DoNotOptimize(solve(set.For(set.problems[next]), pose.data()));
    benchmark::DoNotOptimize(pose.data());
    next = (next + 1) % set.problems.size();
  }
  double passes = 0, error = 0, angle = 0;
  for (const Problem& problem : set.problems) {
    Pose pose = problem.start;
    passes += solve(set.For(problem), pose.data());
    error += ReprojectionError(problem, pose);
    angle += testing::AngleBetween(testing::Normalised(pose), problem.truth) / kDegree;
  }
  const double count = static_cast<double>(set.problems.size());
  if (error / count > 1 || angle / count > 0.5) state.SkipWithError("the poses are wrong");
  state.counters["passes"] = passes / count;
  state.counters["error_px"] = error / count;
  state.counters["off_deg"] = angle / count;
}

int SolveByEngine(const PoseProblem& problem, float* pose) {
  PoseSolverSummary summary;
  SolvePose(nullptr, problem, pose, &summary);
  return summary.iterations;
}

BENCHMARK_CAPTURE(Run, SolveByLM, SolveByEngine)->Unit(benchmark::kMicrosecond);
BENCHMARK_CAPTURE(Run, TinySolver_engine_residuals, SolveTinyOnEngineResiduals)
    ->Unit(benchmark::kMicrosecond);
BENCHMARK_CAPTURE(Run, TinySolver_reprojection_error, SolveTinyOnReprojectionError)
    ->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace n3ds::bench

BENCHMARK_MAIN();
