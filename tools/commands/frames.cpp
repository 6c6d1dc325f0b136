// SPDX-License-Identifier: MIT
#include "commands/frames.h"

#include <cstdio>
#include <filesystem>

#include "support/error.h"

namespace n3ds::tool {

std::size_t ChosenFrame(const Track& track, const std::string& path,
                        const std::optional<std::int64_t>& number) {
  for (std::size_t f = 0; f < track.frames.size(); ++f) {
    const TrackFrame& frame = track.frames[f];
    if (number ? frame.number == *number : !frame.faces.empty()) return f;
  }
  if (number) throw Error(path + ": there is no frame " + std::to_string(*number));
  return 0;
}

void CheckFrame(const std::string& path, const FrameResult& result) {
  if (!result.ok) {
    throw Error(path + ": the engine failed on frame " + std::to_string(result.number));
  }
}

void MakeFolder(const std::string& path) {
  std::error_code error;
  std::filesystem::create_directories(path, error);
  if (error) throw Error(path + ": the folder cannot be made (" + error.message() + ")");
}

std::string FrameName(std::int64_t number, const char* ending) {
  char name[32];
  std::snprintf(name, sizeof name, "/frame_%06lld%s", static_cast<long long>(number), ending);
  return name;
}

}  // namespace n3ds::tool
