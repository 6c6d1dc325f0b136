// SPDX-License-Identifier: MIT
// A folder that gets a file a frame.
#pragma once

#include <cstdint>
#include <deque>
#include <string>
#include <vector>

#include "support/unfinished.h"

namespace n3ds::tool {

// Without Commit, and when a signal ends the program, the files and folders that this run has added
// are removed.
class FrameFolder {
 public:
  // Makes the folder, with the folders above it. No file may be one of the `inputs`. Throws Error.
  FrameFolder(const std::string& path, std::vector<std::string> inputs);
  ~FrameFolder();
  FrameFolder(const FrameFolder&) = delete;
  FrameFolder& operator=(const FrameFolder&) = delete;

  // Path of a frame's file, which the caller writes: "FOLDER/frame_000012.png" for ".png". Throws
  // Error.
  std::string File(std::int64_t number, const char* ending);
  void Commit();

 private:
  std::string path_;
  std::vector<std::string> inputs_;
  std::deque<Unfinished> made_;  // in the order in which they were made
};

}  // namespace n3ds::tool
