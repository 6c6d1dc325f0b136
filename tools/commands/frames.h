// SPDX-License-Identifier: MIT
// Frames of a track as commands pick and check them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "engine/face_results.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

// Reads a track and tells on standard error when coordinates had to be rounded. Throws Error.
Track LoadTrack(const std::string& path);
void TellRounding(const std::string& path, std::size_t rounded_coordinates);

// Index of the frame asked for, or else of the first with a face (the first when none has). Throws
// Error when there is no frame of that number; `path` stands for the track in messages.
std::size_t ChosenFrame(const Track& track, const std::string& path,
                        const std::optional<std::int64_t>& number);

// Throws Error when the engine failed on the frame.
void CheckFrame(const std::string& path, const FrameResult& result);

}  // namespace n3ds::tool
