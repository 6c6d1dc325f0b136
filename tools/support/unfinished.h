// SPDX-License-Identifier: MIT
// What this run has made but not finished. It is removed when its owner goes without Keep, and when
// a signal ends the program.
#pragma once

#include <sys/types.h>

#include <csignal>
#include <string>

namespace n3ds::tool {

struct UnfinishedEntry;

class Unfinished {
 public:
  enum class Kind { kFile, kFolder };

  // To be called before the file or folder is made: a signal may come at any moment.
  Unfinished(std::string path, Kind kind);
  ~Unfinished();
  Unfinished(const Unfinished&) = delete;
  Unfinished& operator=(const Unfinished&) = delete;

  void Keep();

 private:
  UnfinishedEntry* entry_;
};

// From now on SIGINT, SIGTERM and SIGHUP remove what is unfinished before they end the program.
// Signals that were ignored stay so.
void RemoveUnfinishedOnSignals();

// Those signals, blocked on this thread while a child process is started and made known.
class SignalsBlocked {
 public:
  SignalsBlocked();
  ~SignalsBlocked();
  SignalsBlocked(const SignalsBlocked&) = delete;
  SignalsBlocked& operator=(const SignalsBlocked&) = delete;

  const sigset_t& before() const { return before_; }

 private:
  sigset_t before_;
};

// The child that writes to an unfinished file, or 0: a signal ends it too, or it would go on
// writing.
void SetWritingChild(pid_t child);

}  // namespace n3ds::tool
