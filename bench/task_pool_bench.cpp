// SPDX-License-Identifier: MIT
// What a task pool costs per frame, beside the bare threads it cannot do without.
#include <benchmark/benchmark.h>
#include <pthread.h>
#include <unistd.h>

#include <cstdint>

#include "norvale_3d_sticker_core.h"
#include "platform/cpu_system.h"

namespace {

void* DoNothing(void* argument) { return argument; }

void PoolCreateDestroy(benchmark::State& state) {
  const auto workers = static_cast<uint32_t>(state.range(0));
  for (auto _ : state) {
    void* pool = mcvParallelInit(nullptr, workers);
    if (mcvParallelEngineCores(pool) != workers) state.SkipWithError("wrong number of workers");
    mcvParallelUninit(pool);
  }
}

// A whole frame's use of the pool, with one task per worker that does nothing.
void PoolWithTasks(benchmark::State& state) {
  const auto workers = static_cast<uint32_t>(state.range(0));
  for (auto _ : state) {
    void* pool = mcvParallelInit(nullptr, workers);
    int32_t ids[16];
    for (uint32_t i = 0; i < workers; ++i) ids[i] = mcvAddTask(pool, DoNothing, nullptr);
    for (uint32_t i = 0; i < workers; ++i) {
      if (mcvWaitTask(pool, ids[i]) != 0) state.SkipWithError("task failed");
    }
    mcvParallelUninit(pool);
  }
}

void BareThreads(benchmark::State& state) {
  const auto threads = static_cast<uint32_t>(state.range(0));
  for (auto _ : state) {
    pthread_t handles[16];
    for (uint32_t i = 0; i < threads; ++i) {
      if (pthread_create(&handles[i], nullptr, DoNothing, nullptr) != 0) {
        state.SkipWithError("no thread");
        return;
      }
    }
    for (uint32_t i = 0; i < threads; ++i) pthread_join(handles[i], nullptr);
  }
}

BENCHMARK(PoolCreateDestroy)->Arg(1)->Arg(3)->Arg(5)->UseRealTime()->Unit(benchmark::kMicrosecond);
BENCHMARK(PoolWithTasks)->Arg(1)->Arg(3)->Arg(5)->UseRealTime()->Unit(benchmark::kMicrosecond);
BENCHMARK(BareThreads)->Arg(1)->Arg(3)->Arg(5)->UseRealTime()->Unit(benchmark::kMicrosecond);

}  // namespace

int main(int argc, char** argv) {
  // As on a phone: the pool takes no more workers than there are processors.
  n3ds::cpu_system.count = [](int) { return 8L; };
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}
