// SPDX-License-Identifier: MIT
// Options that several commands share.
#pragma once

#include <CLI/App.hpp>
#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "engine/engine_session.h"

namespace n3ds::tool {

struct EngineOptions {
  std::string model;
  std::string mode_name = "rigid";
  std::string tracker_name = "classic";

  TrackMode mode() const;
  TrackerKind tracker() const;
  // The face-model file. Throws Error when none was named and none is found.
  std::string model_path() const;
};

// A positional argument that names one file.
void AddFileArgument(CLI::App& command, const std::string& name, std::string& path,
                     const std::string& text);
// The track, or "-" for standard input.
void AddTrackArgument(CLI::App& command, std::string& path);

// An option that names a file or folder and must not be empty.
CLI::Option* AddFileOption(CLI::App& command, const std::string& name, std::string& path,
                           const std::string& text, const std::string& type = "FILE");

// An option that takes one of some words, or a list of them.
template <typename Words, typename Value>
CLI::Option* AddChoice(CLI::App& command, const std::string& name, Value& value,
                       const std::string& text, const Words& words, const std::string& type) {
  // The words are named in `type`; the check would show them again.
  return command.add_option(name, value, text)
      ->check(CLI::IsMember(words).description(""))
      ->type_name(type);
}

void AddModelOption(CLI::App& command, std::string& model);
void AddEngineOptions(CLI::App& command, EngineOptions& options);
void AddFrameOption(CLI::App& command, std::optional<std::int64_t>& frame, const std::string& text);
void AddEveryOption(CLI::App& command, std::size_t& every, const std::string& text);

}  // namespace n3ds::tool
