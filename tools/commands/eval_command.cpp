// SPDX-License-Identifier: MIT
// n3ds eval: how far the engine's poses are from the truth of synthetic tracks.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <cstdio>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "commands/commands.h"
#include "commands/frames.h"
#include "commands/options.h"
#include "commands/outputs.h"
#include "engine/engine_session.h"
#include "eval/mesh_metrics.h"
#include "eval/metrics.h"
#include "eval/score_table.h"
#include "model/face_model_file.h"
#include "support/atomic_file.h"
#include "support/progress.h"
#include "tracks/track_file.h"

namespace n3ds::tool {
namespace {

struct EvalOptions {
  EngineOptions engine;
  std::vector<std::string> tracks;
  std::string csv;
  bool wide = false;
};

void RunEvalCommand(const EvalOptions& options) {
  const std::string model = options.engine.model_path();
  std::vector<std::string> inputs = options.tracks;
  inputs.push_back(model);
  CheckIsNoInput(options.csv, inputs);
  std::vector<Track> tracks;
  std::size_t frames = 0;
  for (const std::string& path : options.tracks) {
    tracks.push_back(LoadTrack(path));
    if (!tracks.back().HasTruth()) {
      throw Error(path + ": the track has no truth to compare with");
    }
    frames += tracks.back().frames.size();
  }

  std::vector<TrackPoses> poses;
  std::vector<MeshScore> meshes;
  std::optional<MeshJudge> judge;
  if (options.engine.mode() == TrackMode::kMask) {
    judge.emplace(ReadFaceModelFile(model));
    meshes.resize(tracks.size());
  }
  {
    Progress progress("tracking", frames);
    for (std::size_t k = 0; k < tracks.size(); ++k) {
      const Track& track = tracks[k];
      const auto use = [&](std::size_t f, const FrameResult& result) {
        if (judge) judge->AddFrame(track.header, track.frames[f], result, meshes[k]);
        progress.Step();
      };
      poses.push_back(CameraPoses(
          track, RunTrack(track, model, options.engine.mode(), use, options.engine.tracker())));
    }
  }
  std::vector<JudgedTrack> judged;
  for (std::size_t k = 0; k < tracks.size(); ++k) {
    judged.push_back({&tracks[k], &poses[k], EngineFocal(tracks[k].header)});
  }
  const HeadFrameOffset offset = EstimateOffset(judged);
  NamedScores scores;
  for (const JudgedTrack& one : judged) {
    scores.emplace_back(one.track->name, ScoreTrack(one, offset));
  }

  const TextTable table = ScoreTable(scores, meshes);
  if (!options.csv.empty()) {
    AtomicFile out(options.csv);
    table.PrintCsv(out.stream());
    out.Commit();
  }
  std::FILE* const console = ConsoleBeside(options.csv);
  std::ostringstream text;
  if (options.wide) {
    table.Print(text);
  } else {
    table.Print(text, MainColumns(!meshes.empty()));
  }
  std::fputs(text.str().c_str(), console);
  const Vector3 turn = RotationVector(offset.rotation);
  std::fprintf(console,
               "head frame: turned by %.2f %.2f %.2f degrees, origin at %.1f %.1f %.1f mm\n",
               turn[0], turn[1], turn[2], offset.origin[0], offset.origin[1], offset.origin[2]);
  std::fprintf(console, "\n%s%s", kScoreTableLegend, meshes.empty() ? "" : kMeshColumnsLegend);
}

}  // namespace

void AddEvalCommand(CLI::App& app) {
  CLI::App* command = app.add_subcommand(
      "eval",
      "Runs tracks that have truth through the engine and prints how far its poses are off.");
  const auto options = std::make_shared<EvalOptions>();
  command->add_option("TRACKS", options->tracks, "Landmark tracks with truth (FILE.track.jsonl)")
      ->required()
      ->type_name("");
  AddFileOption(*command, "--csv", options->csv, "The table as CSV, with all columns");
  command->add_flag("--wide", options->wide, "Print all columns instead of the main ones");
  AddEngineOptions(*command, options->engine);
  command->footer(std::string("Columns (rot20, rot60 and more percentiles with --wide):\n") +
                  kScoreTableLegend + "With --mode mask also:\n" + kMeshColumnsLegend +
                  "\nThe line below the table gives the constant offset between the truth's head "
                  "frame and the\n"
                  "engine's that was taken off, estimated over all tracks together.\n"
                  "Examples:\n"
                  "  n3ds eval examples/tracks/synthetic_yaw_sweep.track.jsonl\n"
                  "  n3ds eval *.track.jsonl --csv scores.csv\n"
                  "  n3ds eval examples/tracks/synthetic_talk_165.track.jsonl --mode mask");
  command->callback([options] { RunEvalCommand(*options); });
}

}  // namespace n3ds::tool
