// SPDX-License-Identifier: MIT
#include "support/unfinished.h"

#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <utility>

namespace n3ds::tool {

struct UnfinishedEntry {
  std::string path;
  Unfinished::Kind kind;
  UnfinishedEntry* next;
  std::atomic<bool> pending{true};
};

namespace {

constexpr int kSignals[] = {SIGINT, SIGTERM, SIGHUP};

// The handler may run at any moment and on any thread, so entries are never taken out of the list
// or freed; a run makes a few thousand at most.
std::atomic<UnfinishedEntry*> newest{nullptr};
std::atomic<pid_t> writing_child{0};

// Calls nothing but what POSIX allows in a signal handler.
void Remove(UnfinishedEntry& entry) {
  if (!entry.pending.exchange(false)) return;
  if (entry.kind == Unfinished::Kind::kFolder) {
    rmdir(entry.path.c_str());
  } else {
    unlink(entry.path.c_str());
  }
}

void OnSignal(int number) {
  const pid_t child = writing_child.exchange(0);
  if (child > 0) {
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
  }
  // The newest first: files before the folder they are in.
  for (UnfinishedEntry* entry = newest; entry != nullptr; entry = entry->next) Remove(*entry);
  // Ends the program as the signal does, so that a shell sees what happened.
  std::signal(number, SIG_DFL);
  std::raise(number);
}

sigset_t Signals() {
  sigset_t signals;
  sigemptyset(&signals);
  for (const int number : kSignals) sigaddset(&signals, number);
  return signals;
}

}  // namespace

Unfinished::Unfinished(std::string path, Kind kind)
    : entry_(new UnfinishedEntry{std::move(path), kind, newest}) {
  newest = entry_;
}

Unfinished::~Unfinished() { Remove(*entry_); }

void Unfinished::Keep() { entry_->pending = false; }

void RemoveUnfinishedOnSignals() {
  for (const int number : kSignals) {
    struct sigaction action = {};
    sigaction(number, nullptr, &action);
    if (action.sa_handler == SIG_IGN) continue;
    action = {};
    action.sa_handler = OnSignal;
    action.sa_mask = Signals();
    action.sa_flags = SA_RESTART;
    sigaction(number, &action, nullptr);
  }
}

SignalsBlocked::SignalsBlocked() {
  const sigset_t signals = Signals();
  pthread_sigmask(SIG_BLOCK, &signals, &before_);
}

SignalsBlocked::~SignalsBlocked() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }

void SetWritingChild(pid_t child) { writing_child = child; }

}  // namespace n3ds::tool
