// SPDX-License-Identifier: MIT
#include "commands/options.h"

#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <limits>

#include "support/data_files.h"

namespace n3ds::tool {
namespace {

const std::map<std::string, TrackMode>& ModesByName() {
  static const std::map<std::string, TrackMode> modes = {{"rigid", TrackMode::kRigid},
                                                         {"mask", TrackMode::kMask}};
  return modes;
}

const std::map<std::string, TrackerKind>& TrackersByName() {
  static const std::map<std::string, TrackerKind> trackers = {{"classic", TrackerKind::kClassic},
                                                              {"steady", TrackerKind::kSteady}};
  return trackers;
}

CLI::Validator NotEmpty() {
  return {[](std::string& text) {
            return text.empty() ? std::string("the name is empty") : std::string();
          },
          ""};
}

}  // namespace

TrackMode EngineOptions::mode() const { return ModesByName().at(mode_name); }

TrackerKind EngineOptions::tracker() const { return TrackersByName().at(tracker_name); }

std::string EngineOptions::model_path() const { return model.empty() ? DefaultModelPath() : model; }

void AddFileArgument(CLI::App& command, const std::string& name, std::string& path,
                     const std::string& text) {
  command.add_option(name, path, text)->required()->check(NotEmpty())->type_name("");
}

void AddTrackArgument(CLI::App& command, std::string& path) {
  AddFileArgument(command, "TRACK", path,
                  "Landmark track (FILE.track.jsonl), - for standard input");
}

CLI::Option* AddFileOption(CLI::App& command, const std::string& name, std::string& path,
                           const std::string& text, const std::string& type) {
  return command.add_option(name, path, text)->check(NotEmpty())->type_name(type);
}

void AddModelOption(CLI::App& command, std::string& model) {
  AddFileOption(command, "--model", model,
                "Face-model file; by default face_model.bin in the folder that the\n"
                "environment variable N3DS_DATA_DIR names, else the installed one");
}

void AddEngineOptions(CLI::App& command, EngineOptions& options) {
  AddModelOption(command, options.model);
  AddChoice(command, "--mode", options.mode_name,
            "What the engine fits: rigid (the pose of the head) or mask (its shape\n"
            "as well, as a dense mesh)",
            ModesByName(), "rigid|mask")
      ->capture_default_str();
  AddChoice(command, "--tracker", options.tracker_name,
            "How the engine tracks: classic (each frame is fitted, results are smoothed)\n"
            "or steady (one filter over pose, person and expression)",
            TrackersByName(), "classic|steady")
      ->capture_default_str();
}

void AddFrameOption(CLI::App& command, std::optional<std::int64_t>& frame,
                    const std::string& text) {
  command.add_option("--frame", frame, text)
      ->type_name("N")
      ->check(CLI::Range(std::int64_t{0}, std::int64_t{std::numeric_limits<std::int32_t>::max()})
                  .description(""));
}

void AddEveryOption(CLI::App& command, std::size_t& every, const std::string& text) {
  command.add_option("--every", every, text)
      ->type_name("N")
      ->check(CLI::Range(1, 1000000).description(""))
      ->capture_default_str();
}

}  // namespace n3ds::tool
