// SPDX-License-Identifier: MIT
// Frames of a track as commands pick, name and write them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "engine/face_results.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

// Index of the frame asked for, or else of the first with a face (the first when none has). Throws
// Error when there is no frame of that number; `path` stands for the track in messages.
std::size_t ChosenFrame(const Track& track, const std::string& path,
                        const std::optional<std::int64_t>& number);

// Throws Error when the engine failed on the frame.
void CheckFrame(const std::string& path, const FrameResult& result);

// Makes a folder for a file a frame. Throws Error.
void MakeFolder(const std::string& path);
// Name of a frame's file in it, "/frame_000012.png" for the ending ".png".
std::string FrameName(std::int64_t number, const char* ending);

}  // namespace n3ds::tool
