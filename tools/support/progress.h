// SPDX-License-Identifier: MIT
// One line of progress on the terminal, rewritten in place. Silent when stderr is no terminal.
#pragma once

#include <chrono>
#include <cstddef>
#include <string>

namespace n3ds::tool {

class Progress {
 public:
  // Without a total the steps are counted.
  explicit Progress(std::string what, std::size_t total = 0);
  ~Progress();  // wipes the line
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  void Step();

 private:
  std::string what_;
  std::size_t total_;
  std::size_t done_ = 0;
  bool shown_;
  std::chrono::steady_clock::time_point last_{};
};

}  // namespace n3ds::tool
