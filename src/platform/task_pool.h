// SPDX-License-Identifier: MIT
// The task pool's own record.
#pragma once

#include <pthread.h>

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

constexpr uint32_t kTaskRingSize = 32;
constexpr uint32_t kMaxWorkers = 16;

struct Task {
  mcvTaskFunction function;
  void* argument;
  int32_t id;
};

struct TaskPool;

struct WorkerStart {
  uint32_t index;  // of the worker, for who looks at the pool in a debugger
  TaskPool* pool;
};

// The order of the members is part of the record. The rings are fixed arrays, so queueing and
// finishing tasks allocate nothing. The two locks are never held together, and none while a task
// runs.
struct TaskPool {
  pthread_mutex_t queueLock;  // guards tasks, taskHead, taskCount, stop and nextTaskId
  pthread_mutex_t doneLock;   // guards doneIds, doneHead and doneCount
  pthread_cond_t taskReady;   // a task was queued, or the pool stops
  pthread_cond_t taskDone;    // a task has finished
  Task tasks[kTaskRingSize];  // pending, from taskHead on
  uint32_t taskHead;
  uint32_t taskCount;
  int32_t doneIds[kTaskRingSize];  // finished and not yet waited for, from doneHead on
  uint32_t doneHead;
  uint32_t doneCount;
  uint32_t stop;  // 1 once shutdown has begun
  pthread_t* threads;
  uint32_t threadCount;  // workers started
  WorkerStart* threadArgs[kMaxWorkers];
  MHandle memory;
  uint32_t onlineCpus;      // processors online when the pool was made
  uint32_t configuredCpus;  // processors configured then, at most 16
  uint32_t cpusFired;       // 1 while cores switched on await restoring
  uint32_t savedCpuOnline[kMaxWorkers];
  int32_t nextTaskId;
};
static_assert(alignof(TaskPool) <= 8, "memory pools align to 8");

}  // namespace n3ds
