// SPDX-License-Identifier: MIT
#include "steady/tracker.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <thread>

#include "steady/frozen.h"
#include "steady/tuning.h"

namespace n3ds::steady {

namespace {

constexpr int kRememberedAge = 15;  // frames after which a face is worth remembering

}  // namespace

Tracker::Tracker(const TrackingContext& context, uint64_t* ids) : context_(context), ids_(ids) {
  BuildModel(context, &model_);
  for (Bench& bench : bench_) {
    std::memcpy(bench.work.identity, model_.identity, sizeof(bench.work.identity));
  }
}

Tools Tracker::ToolsOf(int slot) { return {model_, BestKernels(), &bench_[slot].work}; }

Face* Tracker::TakeStorage() {
  // There are as many as can be followed and resting together.
  int i = 0;
  while (used_[i]) i++;
  used_[i] = true;
  std::memset(static_cast<void*>(&storage_[i]), 0, sizeof(Face));
  return &storage_[i];
}

void Tracker::Forget() {
  std::fill(std::begin(used_), std::end(used_), false);
  std::fill(std::begin(live_), std::end(live_), nullptr);
  std::fill(std::begin(resting_), std::end(resting_), nullptr);
  face_count_ = 0;
}

void Tracker::Adopt(const int32_t* landmarks, uint64_t id) {
  Face* const face = TakeStorage();
  for (int i = 0; i < kLandmarkCount; i++) {
    face->last_u[i] = static_cast<float>(landmarks[2 * i]);
    face->last_v[i] = static_cast<float>(landmarks[2 * i + 1]);
  }
  face->last_seen = now_;
  face->id = id;
  live_[face_count_++] = face;
}

void Tracker::ReadLandmarks(const FrameInput& input) {
  for (uint32_t k = 0; k < input.face_count; k++) {
    const auto count = static_cast<int>(input.faces[k].count);
    Landmarks& landmarks = landmarks_[k];
    FillMeasurements(input.faces[k].points, count, landmarks.u, landmarks.v);
    const bool has_middles = count > kLandmarkCount;
    seen_[k] = {landmarks.u,
                landmarks.v,
                ActiveMeasurements(has_middles),
                ActiveCount(has_middles),
                has_middles,
                input.focal,
                static_cast<float>(input.width) / 2.0f,
                static_cast<float>(input.height) / 2.0f};
  }
}

// Nearest pairs first.
void Tracker::MatchFaces(Face** next) {
  for (;;) {
    float nearest = 0;
    int from = -1;
    int to = -1;
    for (int i = 0; i < kSlotCount; i++) {
      for (int j = 0; j < kSlotCount; j++) {
        if (live_[i] == nullptr || next[j] != nullptr || seen_[j].u == nullptr) continue;
        float distance;
        if (!MayContinue(*live_[i], seen_[j], &distance)) continue;
        if (from >= 0 && !(distance < nearest)) continue;
        nearest = distance;
        from = i;
        to = j;
      }
    }
    if (from < 0) return;
    next[to] = live_[from];
    live_[from] = nullptr;
  }
}

void Tracker::RestUnmatched() {
  for (Face*& face : live_) {
    if (face == nullptr) continue;
    Face* gone = face;
    face = nullptr;
    if (gone->valid && gone->age >= kRememberedAge) {
      // The place of the one that has been away for longest, if none is free.
      Face** place = std::begin(resting_);
      for (Face*& other : resting_) {
        if (*place == nullptr) break;
        if (other == nullptr || other->last_seen < (*place)->last_seen) place = &other;
      }
      std::swap(*place, gone);
    }
    if (gone != nullptr) used_[gone - storage_] = false;
  }
}

void Tracker::ExpireResting() {
  for (Face*& face : resting_) {
    if (face == nullptr || now_ - face->last_seen <= kMemory) continue;
    used_[face - storage_] = false;
    face = nullptr;
  }
}

void Tracker::StartMissing(Face** next) {
  for (uint32_t k = 0; k < face_count_; k++) {
    if (next[k] != nullptr && next[k]->valid) continue;
    const bool is_new = next[k] == nullptr;
    if (is_new) next[k] = TakeStorage();
    Bench& bench = bench_[k];
    const int found = StartPerson(ToolsOf(static_cast<int>(k)), seen_[k], resting_, kSlotCount,
                                  &bench.start, &bench.candidate, next[k]);
    if (found >= 0) {
      used_[resting_[found] - storage_] = false;
      resting_[found] = nullptr;
    } else if (is_new) {
      next[k]->id = ++*ids_;
    }
  }
}

bool Tracker::UpdateOne(int slot) {
  Face* const face = live_[slot];
  const Tools tools = ToolsOf(slot);
  Bench& bench = bench_[slot];
  Observation& seen = seen_[slot];
  seen.count = LeaveOutFrozen(seen, face, landmarks_[slot].active);
  seen.active = landmarks_[slot].active;
  if (!face->valid) {
    ShowUnexplained(tools, face);
    return false;
  }
  const StateMean before = face->mean;
  const Outcome outcome = UpdateFace(tools, seen, time_, face);
  if (outcome == Outcome::kUpdated) {
    return NoticeChange(tools, seen, time_, &bench.start, &bench.candidate, face);
  }
  // The face may be somewhere else, or somebody else may be here.
  Face* const own[] = {face};
  Face* const fresh = &bench.candidate;
  const bool keep = outcome == Outcome::kUnexplained;
  const int found = StartPerson(tools, seen, own, keep ? 1 : 0, &bench.start, &bench.spare, fresh);
  const bool convincing = fresh->valid && fresh->misfit_ratio < kUsualMisfit;
  if (convincing && UpdateFace(tools, seen, time_, fresh) == Outcome::kUpdated) {
    const uint64_t id = face->id;
    *face = *fresh;
    face->id = id;
    return keep && found < 0;
  }
  if (!keep) {
    face->mean = before;
    face->valid = false;
  }
  ShowUnexplained(tools, face);
  return false;
}

void* Tracker::RunTask(void* argument) {
  Task* const task = static_cast<Task*>(argument);
  task->changed = task->tracker->UpdateOne(task->slot);
  return nullptr;
}

// The calling thread takes its share; there are no more threads than processors.
void Tracker::UpdateAll(bool threads) {
  Task tasks[kSlotCount];
  int32_t ids[kSlotCount] = {};
  for (uint32_t k = 0; k < face_count_; k++) tasks[k] = {this, static_cast<int>(k), false};
  uint32_t helpers = 0;
  void* pool = nullptr;
  if (threads && face_count_ > 1) {
    const uint32_t processors = std::max(std::thread::hardware_concurrency(), 1u);
    helpers = std::min(face_count_, processors) - 1;
    if (helpers > 0) pool = mcvParallelInit(context_.memory, helpers);
  }
  if (pool == nullptr) helpers = 0;
  for (uint32_t k = 0; k < face_count_; k++) {
    const bool own = k % (helpers + 1) == 0;
    ids[k] = own ? -1 : mcvAddTask(pool, RunTask, &tasks[k]);
  }
  for (uint32_t k = 0; k < face_count_; k++) {
    if (ids[k] < 0) RunTask(&tasks[k]);
  }
  for (uint32_t k = 0; k < face_count_; k++) {
    if (ids[k] >= 0) mcvWaitTask(pool, ids[k]);
    if (tasks[k].changed) live_[k]->id = ++*ids_;
  }
  if (pool != nullptr) mcvParallelUninit(pool);
}

void Tracker::Track(const FrameInput& input) {
  if (input.seconds != time_seconds_ || input.smoothing != time_smoothing_) {
    time_ = MakeTimeStep(input.seconds, input.smoothing);
    time_seconds_ = input.seconds;
    time_smoothing_ = input.smoothing;
  }
  now_ += input.seconds;
  std::fill(std::begin(seen_), std::end(seen_), Observation{});
  ReadLandmarks(input);
  Face* next[kSlotCount] = {};
  ExpireResting();
  MatchFaces(next);
  RestUnmatched();
  face_count_ = input.face_count;
  StartMissing(next);
  std::copy(std::begin(next), std::end(next), std::begin(live_));
  UpdateAll(input.threads);
  for (uint32_t k = 0; k < face_count_; k++) {
    // Wrong landmarks must not decide which face is this one in the next frame.
    const bool keep = live_[k]->valid && !(live_[k]->confidence > 0);
    if (!keep) RememberLandmarks(seen_[k], live_[k]);
    live_[k]->last_seen = now_;
  }
}

}  // namespace n3ds::steady
