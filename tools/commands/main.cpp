// SPDX-License-Identifier: MIT
// n3ds: runs landmark tracks through the engine, judges and draws the results.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <cstdio>
#include <exception>

#include "commands/commands.h"
#include "norvale_3d_sticker_engine.h"
#include "support/unfinished.h"

namespace {

constexpr int kExitFailed = 1;
constexpr int kExitUsage = 2;

// Exit code of the program; throws what is wrong with the files.
int Run(int argc, char** argv) {
  CLI::App app("Runs landmark tracks through the Norvale 3-D sticker engine.", "n3ds");
  app.set_version_flag("--version", Norvale_3DSticker_GetVersion()->versionText);
  app.require_subcommand(1);
  app.footer(
      "Examples:\n"
      "  n3ds track examples/tracks/real_expressions.track.jsonl --out results.jsonl\n"
      "  n3ds eval examples/tracks/synthetic_*.track.jsonl\n"
      "  n3ds render examples/tracks/real_two_people.track.jsonl --out two.mp4\n"
      "  n3ds mask group.jpg group.track.jsonl --texture examples/assets/mask_tiger.png \\\n"
      "      --out tigers.png\n"
      "  n3ds mesh examples/tracks/synthetic_talk_165.track.jsonl --out meshes\n"
      "  n3ds model info data/face_model.bin\n"
      "'n3ds COMMAND --help' says more. The track format is described in\n"
      "examples/tracks/README.md.");
  n3ds::tool::AddTrackCommand(app);
  n3ds::tool::AddEvalCommand(app);
  n3ds::tool::AddRenderCommand(app);
  n3ds::tool::AddMaskCommand(app);
  n3ds::tool::AddMeshCommand(app);
  n3ds::tool::AddModelCommand(app);
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    // Asking for help arrives here too; CLI11 prints it.
    if (error.get_exit_code() == 0) return app.exit(error);
    std::fprintf(stderr, "n3ds: %s (--help shows how)\n", error.what());
    return kExitUsage;
  }
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  n3ds::tool::RemoveUnfinishedOnSignals();
  try {
    return Run(argc, argv);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "n3ds: %s\n", error.what());
    return kExitFailed;
  }
}
