// SPDX-License-Identifier: MIT
#include "commands/frames.h"

#include <cstdio>

#include "support/error.h"

namespace n3ds::tool {

Track LoadTrack(const std::string& path) {
  Track track = ReadTrackFile(path);
  TellRounding(path, track.rounded_coordinates);
  return track;
}

void TellRounding(const std::string& path, std::size_t rounded_coordinates) {
  if (rounded_coordinates == 0) return;
  std::fprintf(stderr, "n3ds: %s: %zu coordinates with fractions rounded to floor(x + 0.5)\n",
               path.c_str(), rounded_coordinates);
}

std::size_t ChosenFrame(const Track& track, const std::string& path,
                        const std::optional<std::int64_t>& number) {
  for (std::size_t f = 0; f < track.frames.size(); ++f) {
    const TrackFrame& frame = track.frames[f];
    if (number ? frame.number == *number : !frame.faces.empty()) return f;
  }
  if (number) throw Error(path + ": no frame " + std::to_string(*number));
  return 0;
}

void CheckFrame(const std::string& path, const FrameResult& result) {
  if (!result.ok) {
    throw Error(path + ": the engine failed on frame " + std::to_string(result.number));
  }
}

}  // namespace n3ds::tool
