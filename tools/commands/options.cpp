// SPDX-License-Identifier: MIT
#include "commands/options.h"

#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <map>

namespace n3ds::tool {
namespace {

const std::map<std::string, TrackMode>& ModesByName() {
  static const std::map<std::string, TrackMode> modes = {{"rigid", TrackMode::kRigid},
                                                         {"mask", TrackMode::kMask}};
  return modes;
}

}  // namespace

TrackMode EngineOptions::mode() const { return ModesByName().at(mode_name); }

void AddEngineOptions(CLI::App& command, EngineOptions& options) {
  command.add_option("--model", options.model, "Face-model file")
      ->type_name("FILE")
      ->capture_default_str();
  command
      .add_option("--mode", options.mode_name,
                  "What the engine fits: rigid (the pose of the head) or mask (its shape\n"
                  "as well, as a dense mesh)")
      ->check(CLI::IsMember(ModesByName()))
      ->type_name("MODE")
      ->capture_default_str();
}

}  // namespace n3ds::tool
