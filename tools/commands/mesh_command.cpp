// SPDX-License-Identifier: MIT
// n3ds mesh: the dense meshes of a track as OBJ files, one a frame.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <cstdio>
#include <map>
#include <memory>
#include <string>

#include "commands/commands.h"
#include "commands/frame_folder.h"
#include "commands/frames.h"
#include "commands/options.h"
#include "engine/engine_session.h"
#include "engine/mesh_file.h"
#include "support/atomic_file.h"
#include "support/data_files.h"
#include "support/error.h"
#include "support/progress.h"
#include "tracks/track_file.h"

namespace n3ds::tool {
namespace {

const std::map<std::string, MeshSpace>& SpacesByName() {
  static const std::map<std::string, MeshSpace> spaces = {{"viewer", MeshSpace::kViewer},
                                                          {"head", MeshSpace::kHead}};
  return spaces;
}

struct MeshOptions {
  std::string model;
  std::string track;
  std::string out;
  std::string space = "viewer";
  std::size_t every = 1;
};

void RunMeshCommand(const MeshOptions& options) {
  const std::string model = options.model.empty() ? DefaultModelPath() : options.model;
  const Track track = LoadTrack(options.track);
  EngineSession session(model, track.header, TrackMode::kMask);
  FrameFolder folder(options.out, {options.track, model});
  Progress progress("meshes of " + track.name, track.frames.size());
  std::size_t written = 0;
  for (std::size_t f = 0; f < track.frames.size(); ++f) {
    const FrameResult result = session.Process(track.frames[f]);
    progress.Step();
    if (f % options.every != 0) continue;
    CheckFrame(options.track, result);
    for (const FaceResult& face : result.faces) {
      if (IsFinite(face)) continue;
      throw Error(options.track + ": frame " + std::to_string(result.number) +
                  " has a mesh that is not finite");
    }
    AtomicFile file(folder.File(result.number, ".obj"));
    WriteMeshObj(file.stream(), result, session.texture_coordinates(),
                 SpacesByName().at(options.space));
    file.Commit();
    ++written;
  }
  folder.Commit();
  std::printf("%s: %zu files\n", options.out.c_str(), written);
}

}  // namespace

void AddMeshCommand(CLI::App& app) {
  CLI::App* command = app.add_subcommand(
      "mesh", "Writes the dense meshes of mask mode as OBJ files, one a frame, for other tools.");
  const auto options = std::make_shared<MeshOptions>();
  AddTrackArgument(*command, options->track);
  AddFileOption(*command, "--out", options->out, "Folder that gets the files", "FOLDER")
      ->required();
  AddChoice(*command, "--space", options->space,
            "Where the vertices are: before the viewer with the head's pose, or in the\n"
            "upright head with the expression alone",
            SpacesByName(), "viewer|head")
      ->capture_default_str();
  AddEveryOption(*command, options->every, "Write every Nth frame");
  AddModelOption(*command, options->model);
  command->footer(
      "All files have the same vertex order and texture coordinates, an object a face. Lengths\n"
      "are in mm, x to the right, y up, z towards the viewer.\n"
      "Examples:\n"
      "  n3ds mesh talk.track.jsonl --out talk_meshes\n"
      "  n3ds mesh talk.track.jsonl --out talk_meshes --space head --every 10");
  command->callback([options] { RunMeshCommand(*options); });
}

}  // namespace n3ds::tool
