// SPDX-License-Identifier: MIT
// A small pool of threads for the tasks of one frame: a ring of pending tasks, a ring of finished
// ids, and a lock and a condition for each.
#include "platform/task_pool.h"

#include <algorithm>
#include <cstdio>
#include <new>

#include "platform/cpu_system.h"

namespace {

using n3ds::kMaxWorkers;
using n3ds::kTaskRingSize;
using n3ds::Task;
using n3ds::TaskPool;
using n3ds::WorkerStart;

constexpr int32_t kPoolFull = -4;
constexpr int32_t kAlreadyStopping = -3;

void* WorkerLoop(void* argument) {
  TaskPool* pool = static_cast<WorkerStart*>(argument)->pool;
  for (;;) {
    pthread_mutex_lock(&pool->queueLock);
    while (pool->taskCount == 0 && pool->stop == 0) {
      pthread_cond_wait(&pool->taskReady, &pool->queueLock);
    }
    if (pool->stop != 0) {  // also with tasks pending: shutdown drops them
      pthread_mutex_unlock(&pool->queueLock);
      return nullptr;
    }
    const Task task = pool->tasks[pool->taskHead];
    pool->taskHead = (pool->taskHead + 1) % kTaskRingSize;
    --pool->taskCount;
    pthread_mutex_unlock(&pool->queueLock);

    task.function(task.argument);

    pthread_mutex_lock(&pool->doneLock);
    if (pool->doneCount < kTaskRingSize) {
      pool->doneIds[(pool->doneHead + pool->doneCount) % kTaskRingSize] = task.id;
      ++pool->doneCount;
    } else {
      std::puts("Task lost");
    }
    pthread_mutex_unlock(&pool->doneLock);
    // All waiters, not one: the one woken might wait for another id and swallow the signal.
    pthread_cond_broadcast(&pool->taskDone);
  }
}

// Removes `id` from the finished ring if it is there. Ids in front of it move behind the others, in
// order: the ring rotates, so the id a caller asks for next is usually the oldest.
bool TakeFinished(TaskPool* pool, int32_t id) {
  const uint32_t count = pool->doneCount;
  for (uint32_t i = 0; i < count; ++i) {
    const int32_t oldest = pool->doneIds[pool->doneHead];
    const uint32_t behind_last = (pool->doneHead + count) % kTaskRingSize;
    pool->doneHead = (pool->doneHead + 1) % kTaskRingSize;
    if (oldest == id) {
      --pool->doneCount;
      return true;
    }
    pool->doneIds[behind_last] = oldest;
  }
  return false;
}

// Stops and joins the workers that run, and gives all memory of the pool back.
void JoinAndFree(TaskPool* pool) {
  pthread_cond_broadcast(&pool->taskReady);
  for (uint32_t i = 0; i < pool->threadCount; ++i) pthread_join(pool->threads[i], nullptr);

  MHandle memory = pool->memory;
  mcvMemFree(memory, pool->threads);
  pthread_mutex_destroy(&pool->queueLock);
  pthread_mutex_destroy(&pool->doneLock);
  pthread_cond_destroy(&pool->taskReady);
  pthread_cond_destroy(&pool->taskDone);
  for (WorkerStart* start : pool->threadArgs) {
    if (start != nullptr) mcvMemFree(memory, start);
  }
  mcvMemFree(memory, pool);
}

// Sets the stop flag; false when it was set before.
bool BeginStop(TaskPool* pool) {
  pthread_mutex_lock(&pool->queueLock);
  const bool first = pool->stop == 0;
  pool->stop = 1;
  pthread_mutex_unlock(&pool->queueLock);
  return first;
}

bool StartWorker(TaskPool* pool, uint32_t index) {
  void* memory = mcvMemAlloc(pool->memory, sizeof(WorkerStart));
  if (memory == nullptr) return false;
  pool->threadArgs[index] = new (memory) WorkerStart{index, pool};
  if (pthread_create(&pool->threads[index], nullptr, WorkerLoop, pool->threadArgs[index]) != 0) {
    return false;
  }
  ++pool->threadCount;
  return true;
}

}  // namespace

void* mcvMemAlloc(MHandle memory, size_t size) { return MMemAlloc(memory, size); }

void mcvMemFree(MHandle memory, void* pointer) { MMemFree(memory, pointer); }

void* mcvParallelInit(MHandle memory, uint32_t threads) {
  void* context = mcvMemAlloc(memory, sizeof(TaskPool));
  if (context == nullptr) return nullptr;
  TaskPool* pool = new (context) TaskPool{};
  pool->memory = memory;

  pool->onlineCpus = n3ds::OnlineCpus();
  pool->configuredCpus = std::min(n3ds::ConfiguredCpus(), kMaxWorkers);
  const uint32_t wanted = threads != 0 ? std::min(pool->configuredCpus, threads)
                                       : std::min(pool->onlineCpus, kMaxWorkers);

  // With default attributes none of these can fail.
  pthread_mutex_init(&pool->queueLock, nullptr);
  pthread_mutex_init(&pool->doneLock, nullptr);
  pthread_cond_init(&pool->taskReady, nullptr);
  pthread_cond_init(&pool->taskDone, nullptr);

  pool->threads = static_cast<pthread_t*>(mcvMemAlloc(memory, wanted * sizeof(pthread_t)));
  bool started = pool->threads != nullptr;
  for (uint32_t i = 0; started && i < wanted; ++i) started = StartWorker(pool, i);
  if (!started) {
    BeginStop(pool);
    JoinAndFree(pool);
    return nullptr;
  }
  return pool;
}

int32_t mcvParallelUninit(void* pool) {
  if (pool == nullptr) return N3DS_NULL_ARGUMENT;
  TaskPool* context = static_cast<TaskPool*>(pool);
  if (!BeginStop(context)) return kAlreadyStopping;
  JoinAndFree(context);
  return N3DS_OK;
}

int32_t mcvAddTask(void* pool, mcvTaskFunction function, void* argument) {
  if (pool == nullptr || function == nullptr) return N3DS_NULL_ARGUMENT;
  TaskPool* context = static_cast<TaskPool*>(pool);
  pthread_mutex_lock(&context->queueLock);
  if (context->taskCount >= kTaskRingSize) {
    pthread_mutex_unlock(&context->queueLock);
    return kPoolFull;
  }
  // Ids stay non-negative, and INT32_MAX itself is never handed out.
  const int32_t id = context->nextTaskId == INT32_MAX ? 0 : context->nextTaskId;
  context->nextTaskId = id + 1;
  context->tasks[(context->taskHead + context->taskCount) % kTaskRingSize] = {function, argument,
                                                                              id};
  ++context->taskCount;
  // Under the lock: once it is released the task may run, and what that sets off may shut the pool
  // down.
  pthread_cond_broadcast(&context->taskReady);
  pthread_mutex_unlock(&context->queueLock);
  return id;
}

int32_t mcvWaitTask(void* pool, int32_t id) {
  if (pool == nullptr) return N3DS_NULL_ARGUMENT;
  TaskPool* context = static_cast<TaskPool*>(pool);
  pthread_mutex_lock(&context->doneLock);
  while (!TakeFinished(context, id)) pthread_cond_wait(&context->taskDone, &context->doneLock);
  pthread_mutex_unlock(&context->doneLock);
  return N3DS_OK;
}

uint32_t mcvParallelEngineCores(void* pool) {
  return pool == nullptr ? 0 : static_cast<TaskPool*>(pool)->threadCount;
}
