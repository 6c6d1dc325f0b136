// SPDX-License-Identifier: MIT
#include "platform/task_pool.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <set>
#include <thread>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "platform/cpu_testing.h"
#include "support/watchdog.h"

// The linker sends the pool's thread calls here (--wrap), so that a test can count them and make
// the system refuse a thread.
namespace {
int create_calls_until_refusal = -1;  // -1: never
int threads_created = 0;
int threads_joined = 0;
}  // namespace

extern "C" {
// NOLINTBEGIN(bugprone-reserved-identifier): the linker's names
int __real_pthread_create(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*);
int __real_pthread_join(pthread_t, void**);

int __wrap_pthread_create(pthread_t* thread, const pthread_attr_t* attributes,
                          void* (*function)(void*), void* argument) {
  if (create_calls_until_refusal == 0) return EAGAIN;
  if (create_calls_until_refusal > 0) --create_calls_until_refusal;
  ++threads_created;
  return __real_pthread_create(thread, attributes, function, argument);
}

int __wrap_pthread_join(pthread_t thread, void** result) {
  ++threads_joined;
  return __real_pthread_join(thread, result);
}
// NOLINTEND(bugprone-reserved-identifier)
}

namespace n3ds::testing {
namespace {

using ::testing::ElementsAre;

// Holds whoever passes until it is opened.
class Gate {
 public:
  void Pass() {
    std::unique_lock<std::mutex> lock(mutex_);
    ++arrived_;
    changed_.notify_all();
    changed_.wait(lock, [this] { return open_; });
  }
  void Open() {
    const std::lock_guard<std::mutex> lock(mutex_);
    open_ = true;
    changed_.notify_all();
  }
  // Until `count` threads stand at the gate or have passed it.
  void AwaitArrivals(int count) {
    std::unique_lock<std::mutex> lock(mutex_);
    changed_.wait(lock, [this, count] { return arrived_ >= count; });
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  int arrived_ = 0;
  bool open_ = false;
};

void* PassGate(void* gate) {
  static_cast<Gate*>(gate)->Pass();
  return nullptr;
}

void* Increment(void* counter) {
  ++*static_cast<std::atomic<int>*>(counter);
  return counter;
}

class TaskPools : public ::testing::Test {
 protected:
  TaskPools() {
    create_calls_until_refusal = -1;
    threads_created = 0;
    threads_joined = 0;
  }
  // A pool of `workers` workers on a machine with enough processors.
  static TaskPool* MakePool(uint32_t workers) {
    TaskPool* pool = static_cast<TaskPool*>(mcvParallelInit(nullptr, workers));
    EXPECT_NE(pool, nullptr);
    EXPECT_EQ(mcvParallelEngineCores(pool), workers);
    return pool;
  }
  static uint32_t WorkersFor(uint32_t requested) {
    void* pool = mcvParallelInit(nullptr, requested);
    const uint32_t workers = mcvParallelEngineCores(pool);
    EXPECT_EQ(mcvParallelUninit(pool), 0);
    return workers;
  }
  static void AwaitFinished(TaskPool* pool, uint32_t count) {
    for (;;) {
      pthread_mutex_lock(&pool->doneLock);
      const bool reached = pool->doneCount >= count;
      pthread_mutex_unlock(&pool->doneLock);
      if (reached) return;
      std::this_thread::yield();
    }
  }
  static void AwaitCount(const std::atomic<int>& counter, int value) {
    while (counter != value) std::this_thread::yield();
  }
  // The finished ids from the oldest on.
  static std::vector<int32_t> FinishedIds(TaskPool* pool) {
    std::vector<int32_t> ids;
    pthread_mutex_lock(&pool->doneLock);
    for (uint32_t i = 0; i < pool->doneCount; ++i) {
      ids.push_back(pool->doneIds[(pool->doneHead + i) % kTaskRingSize]);
    }
    pthread_mutex_unlock(&pool->doneLock);
    return ids;
  }

  FakeCpus cpus_{64, 64};

 private:
  // A hundred times what the slowest of these tests takes.
  Watchdog watchdog_{60};
};

TEST_F(TaskPools, StartsAsManyWorkersAsRequestedAndConfigured) {
  cpus_.SetCounts(8, 8);
  EXPECT_EQ(WorkersFor(4), 4u);
  EXPECT_EQ(WorkersFor(8), 8u);
  EXPECT_EQ(WorkersFor(9), 8u);
  EXPECT_EQ(WorkersFor(UINT32_MAX), 8u);
  cpus_.SetCounts(2, 2);
  EXPECT_EQ(WorkersFor(4), 2u);
  cpus_.SetCounts(8, 1);  // configured ones count, also when offline
  EXPECT_EQ(WorkersFor(4), 4u);
  cpus_.SetCounts(-1, -1);
  EXPECT_EQ(WorkersFor(4), 1u);
}

TEST_F(TaskPools, StartsAtMostSixteenWorkers) {
  cpus_.SetCounts(64, 64);
  EXPECT_EQ(WorkersFor(40), 16u);
}

TEST_F(TaskPools, ZeroRequestedMeansTheOnlineProcessors) {
  cpus_.SetCounts(8, 3);
  EXPECT_EQ(WorkersFor(0), 3u);
  cpus_.SetCounts(64, 40);
  EXPECT_EQ(WorkersFor(0), 16u);
  cpus_.SetCounts(0, 0);
  EXPECT_EQ(WorkersFor(0), 1u);
}

TEST_F(TaskPools, FreshPoolIsEmpty) {
  cpus_.SetCounts(40, 12);
  TaskPool* pool = MakePool(2);
  EXPECT_EQ(pool->taskCount, 0u);
  EXPECT_EQ(pool->doneCount, 0u);
  EXPECT_EQ(pool->nextTaskId, 0);
  EXPECT_EQ(pool->onlineCpus, 12u);
  EXPECT_EQ(pool->configuredCpus, 16u);
  EXPECT_EQ(pool->cpusFired, 0u);
  EXPECT_EQ(pool->memory, nullptr);
  EXPECT_EQ(pool->threadArgs[1]->index, 1u);
  EXPECT_EQ(pool->threadArgs[1]->pool, pool);
  EXPECT_EQ(pool->threadArgs[2], nullptr);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
  EXPECT_EQ(threads_created, 2);
  EXPECT_EQ(threads_joined, 2);
}

TEST_F(TaskPools, RunsEveryTaskOnce) {
  for (const uint32_t workers : {1u, 3u, 16u}) {
    TaskPool* pool = MakePool(workers);
    std::array<std::atomic<int>, 32> counters = {};
    std::vector<int32_t> ids;
    for (std::atomic<int>& counter : counters) {
      ids.push_back(mcvAddTask(pool, Increment, &counter));
    }
    for (int32_t i = 0; i < 32; ++i) {
      EXPECT_EQ(ids[static_cast<size_t>(i)], i);
      EXPECT_EQ(mcvWaitTask(pool, i), 0);
      EXPECT_EQ(counters[static_cast<size_t>(i)], 1);
    }
    EXPECT_EQ(mcvParallelUninit(pool), 0);
  }
}

TEST_F(TaskPools, WorkersRunAtTheSameTime) {
  TaskPool* pool = MakePool(4);
  Gate gate;
  for (int i = 0; i < 4; ++i) mcvAddTask(pool, PassGate, &gate);
  gate.AwaitArrivals(4);  // never comes about if one worker runs them in turn
  gate.Open();
  for (int32_t id = 0; id < 4; ++id) EXPECT_EQ(mcvWaitTask(pool, id), 0);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, RingsWrapAround) {
  TaskPool* pool = MakePool(2);
  std::atomic<int> counter = 0;
  for (int round = 0; round < 40; ++round) {
    int32_t ids[3];
    for (int32_t& id : ids) id = mcvAddTask(pool, Increment, &counter);
    for (const int32_t id : ids) EXPECT_EQ(mcvWaitTask(pool, id), 0);
  }
  EXPECT_EQ(counter, 120);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, ThirtyThirdPendingTaskIsRefused) {
  TaskPool* pool = MakePool(1);
  Gate first;
  Gate second;
  std::atomic<int> counter = 0;
  const int32_t blocked = mcvAddTask(pool, PassGate, &first);
  first.AwaitArrivals(1);  // taken out of the ring
  std::vector<int32_t> ids = {mcvAddTask(pool, PassGate, &second)};
  for (int i = 1; i < 32; ++i) ids.push_back(mcvAddTask(pool, Increment, &counter));
  EXPECT_EQ(ids.back(), 32);
  EXPECT_EQ(mcvAddTask(pool, Increment, &counter), -4);
  EXPECT_EQ(mcvAddTask(pool, Increment, &counter), -4);

  // One at a time, so that never more than 32 have finished and wait to be asked for.
  first.Open();
  EXPECT_EQ(mcvWaitTask(pool, blocked), 0);
  second.Open();
  for (const int32_t id : ids) EXPECT_EQ(mcvWaitTask(pool, id), 0);
  EXPECT_EQ(counter, 31);
  EXPECT_EQ(mcvAddTask(pool, Increment, &counter), 33) << "a refused task uses no id";
  EXPECT_EQ(mcvWaitTask(pool, 33), 0);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, WaitingInReverseOrderOfCompletion) {
  TaskPool* pool = MakePool(1);
  std::atomic<int> counter = 0;
  for (int i = 0; i < 32; ++i) mcvAddTask(pool, Increment, &counter);
  AwaitFinished(pool, 32);
  for (int32_t id = 31; id >= 0; --id) EXPECT_EQ(mcvWaitTask(pool, id), 0);
  EXPECT_EQ(pool->doneCount, 0u);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, WaitingTurnsTheFinishedRing) {
  TaskPool* pool = MakePool(1);
  std::atomic<int> counter = 0;
  for (int i = 0; i < 5; ++i) mcvAddTask(pool, Increment, &counter);
  AwaitFinished(pool, 5);
  EXPECT_THAT(FinishedIds(pool), ElementsAre(0, 1, 2, 3, 4));
  EXPECT_EQ(mcvWaitTask(pool, 2), 0);
  EXPECT_THAT(FinishedIds(pool), ElementsAre(3, 4, 0, 1));
  EXPECT_EQ(mcvWaitTask(pool, 3), 0);
  EXPECT_THAT(FinishedIds(pool), ElementsAre(4, 0, 1));
  EXPECT_EQ(mcvWaitTask(pool, 1), 0);
  EXPECT_THAT(FinishedIds(pool), ElementsAre(4, 0));
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, WaitingForARunningTaskKeepsTheFinishedOnes) {
  TaskPool* pool = MakePool(2);
  Gate gate;
  std::atomic<int> counter = 0;
  const int32_t slow = mcvAddTask(pool, PassGate, &gate);
  for (int i = 0; i < 3; ++i) mcvAddTask(pool, Increment, &counter);
  AwaitFinished(pool, 3);
  std::thread waiter([pool, slow] { EXPECT_EQ(mcvWaitTask(pool, slow), 0); });
  gate.Open();
  waiter.join();
  EXPECT_THAT(FinishedIds(pool), ElementsAre(1, 2, 3));
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, EveryWaiterIsWokenByItsOwnTask) {
  // If a signal woke one waiter only, the one whose task still runs could take it and sleep on.
  TaskPool* pool = MakePool(2);
  for (int round = 0; round < 20; ++round) {
    Gate gates[2];
    int32_t ids[2];
    for (int i = 0; i < 2; ++i) ids[i] = mcvAddTask(pool, PassGate, &gates[i]);
    std::thread first([&] { EXPECT_EQ(mcvWaitTask(pool, ids[0]), 0); });
    std::thread second([&] { EXPECT_EQ(mcvWaitTask(pool, ids[1]), 0); });
    gates[round % 2].Open();
    (round % 2 == 0 ? first : second).join();
    gates[1 - round % 2].Open();
    (round % 2 == 0 ? second : first).join();
  }
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, ManyThreadsAddAndWait) {
  TaskPool* pool = MakePool(4);
  std::atomic<int> counter = 0;
  std::mutex mutex;
  std::set<int32_t> ids_seen;
  std::vector<std::thread> callers;
  for (int caller = 0; caller < 3; ++caller) {
    callers.emplace_back([&] {
      for (int round = 0; round < 50; ++round) {
        int32_t ids[8];
        for (int32_t& id : ids) id = mcvAddTask(pool, Increment, &counter);
        for (int i = 7; i >= 0; --i) EXPECT_EQ(mcvWaitTask(pool, ids[i]), 0);
        const std::lock_guard<std::mutex> lock(mutex);
        ids_seen.insert(std::begin(ids), std::end(ids));
      }
    });
  }
  for (std::thread& caller : callers) caller.join();
  EXPECT_EQ(counter, 3 * 50 * 8);
  EXPECT_EQ(ids_seen.size(), 3u * 50 * 8);
  EXPECT_EQ(*ids_seen.begin(), 0);
  EXPECT_EQ(*ids_seen.rbegin(), 3 * 50 * 8 - 1);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, IdsStartAgainBeforeTheLargestInteger) {
  TaskPool* pool = MakePool(1);
  std::atomic<int> counter = 0;
  pthread_mutex_lock(&pool->queueLock);
  pool->nextTaskId = INT32_MAX - 1;
  pthread_mutex_unlock(&pool->queueLock);
  for (const int32_t expected : {INT32_MAX - 1, 0, 1}) {
    const int32_t id = mcvAddTask(pool, Increment, &counter);
    EXPECT_EQ(id, expected);
    EXPECT_EQ(mcvWaitTask(pool, id), 0);
  }
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, IdBeyondAFullFinishedRingIsLost) {
  TaskPool* pool = MakePool(1);
  Gate gate;
  std::atomic<int> counter = 0;
  mcvAddTask(pool, PassGate, &gate);
  gate.AwaitArrivals(1);
  for (int i = 0; i < 32; ++i) mcvAddTask(pool, Increment, &counter);
  ::testing::internal::CaptureStdout();
  gate.Open();
  AwaitCount(counter, 32);
  const std::vector<int32_t> finished = [pool] {
    AwaitFinished(pool, 32);
    return FinishedIds(pool);
  }();
  EXPECT_EQ(mcvParallelUninit(pool), 0);  // joins the worker, so the line is out
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "Task lost\n");
  EXPECT_EQ(finished.front(), 0);
  EXPECT_EQ(finished.back(), 31);
}

TEST_F(TaskPools, ThirtyTwoFinishedIdsAreAllKept) {
  TaskPool* pool = MakePool(1);
  std::atomic<int> counter = 0;
  ::testing::internal::CaptureStdout();
  for (int i = 0; i < 32; ++i) mcvAddTask(pool, Increment, &counter);
  AwaitFinished(pool, 32);
  for (int32_t id = 0; id < 32; ++id) EXPECT_EQ(mcvWaitTask(pool, id), 0);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "");
}

TEST_F(TaskPools, SecondShutdownIsRefusedWhileTheFirstRuns) {
  TaskPool* pool = MakePool(1);
  Gate gate;
  mcvAddTask(pool, PassGate, &gate);
  gate.AwaitArrivals(1);
  std::thread first([pool] { EXPECT_EQ(mcvParallelUninit(pool), 0); });
  for (bool stopping = false; !stopping;) {
    pthread_mutex_lock(&pool->queueLock);
    stopping = pool->stop == 1;
    pthread_mutex_unlock(&pool->queueLock);
    std::this_thread::yield();
  }
  EXPECT_EQ(mcvParallelUninit(pool), -3);
  EXPECT_EQ(mcvParallelUninit(pool), -3);
  gate.Open();
  first.join();
  EXPECT_EQ(threads_joined, 1);
}

TEST_F(TaskPools, ShutdownDropsPendingTasks) {
  TaskPool* pool = MakePool(1);
  Gate gate;
  std::atomic<int> counter = 0;
  mcvAddTask(pool, PassGate, &gate);
  gate.AwaitArrivals(1);
  for (int i = 0; i < 5; ++i) mcvAddTask(pool, Increment, &counter);
  std::thread shutdown([pool] { EXPECT_EQ(mcvParallelUninit(pool), 0); });
  for (bool stopping = false; !stopping;) {
    pthread_mutex_lock(&pool->queueLock);
    stopping = pool->stop == 1;
    pthread_mutex_unlock(&pool->queueLock);
    std::this_thread::yield();
  }
  gate.Open();
  shutdown.join();
  EXPECT_EQ(counter, 0);
}

// The task's effect may shut the pool down before the call that added it is back.
TEST_F(TaskPools, TaskMaySetOffTheShutdown) {
  for (int round = 0; round < 100; ++round) {
    TaskPool* pool = MakePool(1);
    std::atomic<int> ran{0};
    std::thread adder([&] { EXPECT_EQ(mcvAddTask(pool, Increment, &ran), 0); });
    AwaitCount(ran, 1);
    EXPECT_EQ(mcvParallelUninit(pool), 0);
    adder.join();
  }
}

TEST_F(TaskPools, NullArguments) {
  std::atomic<int> counter = 0;
  EXPECT_EQ(mcvAddTask(nullptr, Increment, &counter), -1);
  EXPECT_EQ(mcvWaitTask(nullptr, 0), -1);
  EXPECT_EQ(mcvParallelUninit(nullptr), -1);
  EXPECT_EQ(mcvParallelEngineCores(nullptr), 0u);
  TaskPool* pool = MakePool(1);
  EXPECT_EQ(mcvAddTask(pool, nullptr, &counter), -1);
  EXPECT_EQ(mcvAddTask(pool, Increment, &counter), 0);
  EXPECT_EQ(mcvWaitTask(pool, 0), 0);
  EXPECT_EQ(mcvParallelUninit(pool), 0);
}

TEST_F(TaskPools, TakesItsMemoryFromTheHandleAndGivesAllBack) {
  std::vector<uint64_t> area(1024);
  MHandle memory = MMemMgrCreate(area.data(), area.size() * 8);
  const size_t before = GetMaxAllocMemSize(memory);
  void* pool = mcvParallelInit(memory, 3);
  ASSERT_NE(pool, nullptr);
  EXPECT_LT(GetMaxAllocMemSize(memory), before - sizeof(TaskPool));
  EXPECT_EQ(mcvParallelUninit(pool), 0);
  EXPECT_EQ(GetMaxAllocMemSize(memory), before);
}

TEST_F(TaskPools, ExhaustedMemoryGivesNullAndLeavesNothingBehind) {
  // Areas from too small for the context up to one that suffices meet every allocation on the way.
  std::set<int> workers_before_failure;
  std::vector<uint64_t> area(1024);
  bool succeeded = false;
  for (size_t bytes = 40; !succeeded; bytes += 8) {
    ASSERT_LT(bytes, area.size() * 8);
    MHandle memory = MMemMgrCreate(area.data(), bytes);
    const size_t before = GetMaxAllocMemSize(memory);
    threads_created = threads_joined = 0;
    void* pool = mcvParallelInit(memory, 3);
    succeeded = pool != nullptr;
    if (succeeded) {
      mcvParallelUninit(pool);
    } else {
      workers_before_failure.insert(threads_created);
    }
    ASSERT_EQ(threads_joined, threads_created);
    ASSERT_EQ(GetMaxAllocMemSize(memory), before);
  }
  EXPECT_THAT(workers_before_failure, ElementsAre(0, 1, 2));
}

TEST_F(TaskPools, RefusedThreadGivesNullAndLeavesNothingBehind) {
  std::vector<uint64_t> area(1024);
  MHandle memory = MMemMgrCreate(area.data(), area.size() * 8);
  const size_t before = GetMaxAllocMemSize(memory);
  for (int refused = 0; refused < 4; ++refused) {
    create_calls_until_refusal = refused;
    threads_created = threads_joined = 0;
    EXPECT_EQ(mcvParallelInit(memory, 4), nullptr);
    EXPECT_EQ(threads_created, refused);
    EXPECT_EQ(threads_joined, refused);
    EXPECT_EQ(GetMaxAllocMemSize(memory), before);
  }
}

TEST_F(TaskPools, PoolMemoryFunctionsAreThoseOfTheMemoryLayer) {
  alignas(8) unsigned char area[128];
  MHandle memory = MMemMgrCreate(area, sizeof(area));
  void* p = mcvMemAlloc(memory, 8);
  EXPECT_EQ(p, area + 16);
  mcvMemFree(memory, p);
  EXPECT_EQ(GetMaxAllocMemSize(memory), 96u);
  p = mcvMemAlloc(nullptr, 100);
  ASSERT_NE(p, nullptr);
  mcvMemFree(nullptr, p);
}

}  // namespace
}  // namespace n3ds::testing
