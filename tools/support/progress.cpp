// SPDX-License-Identifier: MIT
#include "support/progress.h"

#include <unistd.h>

#include <cstdio>
#include <utility>

namespace n3ds::tool {

Progress::Progress(std::string what, std::size_t total)
    : what_(std::move(what)), total_(total), shown_(isatty(STDERR_FILENO) == 1) {}

Progress::~Progress() {
  if (shown_) std::fputs("\r\033[K", stderr);
}

void Progress::Step() {
  ++done_;
  if (!shown_) return;
  // Ten updates a second are enough for the eye and cost nothing.
  const auto now = std::chrono::steady_clock::now();
  if (done_ != total_ && now - last_ < std::chrono::milliseconds(100)) return;
  last_ = now;
  std::fprintf(stderr, "\r\033[K%s: %zu", what_.c_str(), done_);
  if (total_ > 0) std::fprintf(stderr, " of %zu", total_);
  std::fflush(stderr);
}

}  // namespace n3ds::tool
