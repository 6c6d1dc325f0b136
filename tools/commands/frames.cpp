// SPDX-License-Identifier: MIT
#include "commands/frames.h"

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

}  // namespace n3ds::tool
