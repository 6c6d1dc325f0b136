// SPDX-License-Identifier: MIT
// What a pass of the pose solver consists of, on one of its problems.
#include <benchmark/benchmark.h>

#include "math/pose_residuals.h"
#include "pose_problems.h"

namespace n3ds::bench {
namespace {

constexpr int kResiduals = 2 * testing::kHeadPoints;

struct Evaluated {
  const ProblemSet& set = ProblemSet::Get();
  const float* pose = set.problems[0].start.data();
  PoseResiduals residuals{set.For(set.problems[0])};
  float r[kResiduals], J[kResiduals * 7], Jt[kResiduals * 7], JtJ[49], g[7];

  Evaluated() { residuals.Linearise(pose, r, J, Jt); }
};

void Residuals(benchmark::State& state) {
  Evaluated e;
  for (auto _ : state) {
    e.residuals.Evaluate(e.pose, e.r);
    benchmark::DoNotOptimize(e.r);
    benchmark::ClobberMemory();
  }
}
BENCHMARK(Residuals)->Unit(benchmark::kMicrosecond);

void ResidualsAndJacobian(benchmark::State& state) {
  Evaluated e;
  for (auto _ : state) {
    e.residuals.Linearise(e.pose, e.r, e.J, e.Jt);
    benchmark::DoNotOptimize(e.Jt);
    benchmark::ClobberMemory();
  }
}
BENCHMARK(ResidualsAndJacobian)->Unit(benchmark::kMicrosecond);

void NormalEquations(benchmark::State& state) {
  Evaluated e;
  for (auto _ : state) {
    e.residuals.FormNormalEquations(e.r, e.J, e.Jt, e.JtJ, e.g);
    benchmark::DoNotOptimize(e.g);
    benchmark::ClobberMemory();
  }
}
BENCHMARK(NormalEquations)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace n3ds::bench

BENCHMARK_MAIN();
