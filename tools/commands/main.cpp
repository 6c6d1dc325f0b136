// SPDX-License-Identifier: MIT
// n3ds: runs landmark tracks through the engine, judges and draws the results.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <iostream>
#include <string>

#include "commands/commands.h"
#include "norvale_3d_sticker_engine.h"
#include "support/error.h"
#include "support/unfinished.h"

namespace n3ds::tool {
namespace {

constexpr int kExitFailed = 1;
constexpr int kExitUsage = 2;

// Whether the words before the first option stop short of a command: then what there is to choose
// from is shown.
bool LacksCommand(const CLI::App& app, int argc, char** argv) {
  const CLI::App* group = &app;
  std::string path;
  for (int k = 1; k < argc; ++k) {
    if (argv[k][0] == '-') return false;
    path += (path.empty() ? "" : " ") + std::string(argv[k]);
    const auto all = group->get_subcommands(nullptr);
    const auto chosen = std::find_if(
        all.begin(), all.end(), [&](const CLI::App* one) { return one->get_name() == argv[k]; });
    if (chosen == all.end()) {
      std::string names;
      for (const CLI::App* one : all) names += (names.empty() ? "" : ", ") + one->get_name();
      std::fprintf(stderr, "n3ds: unknown command '%s' (commands: %s)\n", path.c_str(),
                   names.c_str());
      return true;
    }
    group = *chosen;
    if (group->get_subcommands(nullptr).empty()) return false;
  }
  std::fputs(group->help(group == &app ? "" : app.get_name()).c_str(), stderr);
  return true;
}

// A full disk behind standard output must not pass for success.
void CheckStandardOutput() {
  errno = 0;
  std::cout.flush();
  if (std::fflush(stdout) == 0 && std::ferror(stdout) == 0 && std::cout) return;
  const std::string reason = errno != 0 ? std::string(" (") + std::strerror(errno) + ")" : "";
  throw Error("standard output cannot be written" + reason);
}

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
      "examples/tracks/README.md. Exit codes: 0 success, 1 failure, 2 wrong usage.");
  AddTrackCommand(app);
  AddEvalCommand(app);
  AddRenderCommand(app);
  AddMaskCommand(app);
  AddMeshCommand(app);
  AddModelCommand(app);
  if (LacksCommand(app, argc, argv)) return kExitUsage;
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() != 0) {
      std::fprintf(stderr, "n3ds: %s (--help shows how)\n", error.what());
      return kExitUsage;
    }
    app.exit(error);  // help or version was asked for and is printed
  }
  CheckStandardOutput();
  return 0;
}

}  // namespace
}  // namespace n3ds::tool

int main(int argc, char** argv) {
  using namespace n3ds::tool;
  RemoveUnfinishedOnSignals();
  try {
    return Run(argc, argv);
  } catch (const UsageError& error) {
    std::fprintf(stderr, "n3ds: %s\n", error.what());
    return kExitUsage;
  } catch (const std::exception& error) {
    std::fprintf(stderr, "n3ds: %s\n", error.what());
    return kExitFailed;
  }
}
