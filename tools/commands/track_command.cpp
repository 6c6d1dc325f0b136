// SPDX-License-Identifier: MIT
// n3ds track: a track in, matrices and 3-D landmarks out, with a summary of how it went.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "commands/commands.h"
#include "commands/frames.h"
#include "commands/options.h"
#include "commands/outputs.h"
#include "engine/engine_session.h"
#include "engine/results_file.h"
#include "eval/mean_fit.h"
#include "eval/mesh_metrics.h"
#include "eval/metrics.h"
#include "model/face_model_file.h"
#include "support/atomic_file.h"
#include "support/progress.h"
#include "support/statistics.h"
#include "tracks/track_file.h"

namespace n3ds::tool {
namespace {

struct TrackOptions {
  EngineOptions engine;
  std::string track;
  std::string out;
};

constexpr const char* kLabel = "%-23s";  // of a line of the summary

// What a run was like.
struct Summary {
  std::size_t frames = 0;
  std::size_t failed_frames = 0;
  std::size_t faces = 0;
  std::size_t most_faces = 0;
  std::size_t broken_faces = 0;
  std::vector<double> milliseconds;  // of the frames with faces
  std::vector<double> misfits;
  std::vector<double> turns;  // of a person's head from one frame to the next, degrees
  std::vector<double> moves;  // the same, mm
  MeshScore meshes;
};

class Summarizer {
 public:
  Summarizer(const TrackHeader& header, const FaceModelFile& model, TrackMode mode)
      : header_(header), mean_fit_(model) {
    if (mode == TrackMode::kMask) judge_.emplace(model);
  }

  void Add(const TrackFrame& frame, const FrameResult& result) {
    ++summary_.frames;
    summary_.faces += frame.faces.size();
    summary_.most_faces = std::max(summary_.most_faces, frame.faces.size());
    if (!result.ok) ++summary_.failed_frames;
    if (!frame.faces.empty()) summary_.milliseconds.push_back(result.milliseconds);
    std::map<std::int64_t, PoseEstimate> poses;
    for (std::size_t i = 0; i < result.faces.size(); ++i) {
      const FaceResult& face = result.faces[i];
      if (!IsFinite(face)) {
        ++summary_.broken_faces;
        continue;
      }
      mean_fit_.AddDistances(header_, frame.faces[i], face, summary_.misfits);
      AddChange(poses[face.id] = CameraPose(face), face.id);
    }
    poses_ = std::move(poses);
    if (judge_) judge_->AddFrame(header_, frame, result, summary_.meshes);
  }

  const Summary& summary() const { return summary_; }

 private:
  void AddChange(const PoseEstimate& pose, std::int64_t id) {
    const auto before = poses_.find(id);
    if (before == poses_.end()) return;
    summary_.turns.push_back(
        RotationAngle(Multiplied(Transposed(before->second.rotation), pose.rotation)));
    summary_.moves.push_back(Length(pose.translation - before->second.translation));
  }

  const TrackHeader& header_;
  MeanFit mean_fit_;
  std::optional<MeshJudge> judge_;
  std::map<std::int64_t, PoseEstimate> poses_;  // of the frame before
  Summary summary_;
};

void PrintMeshScore(std::FILE* out, const MeshScore& score) {
  std::fprintf(out, kLabel, "folded meshes");
  std::fprintf(out, "%zu\n", score.folded);
  std::fprintf(out, kLabel, "misfit of the mesh");
  std::fprintf(out, "median %.2f %%, p95 %.2f %% of the interpupillary distance\n",
               Percentile(score.distances, 0.50), Percentile(score.distances, 0.95));
  const auto& seen = score.mouth_seen;
  if (seen.empty()) return;
  const auto widest = std::max_element(seen.begin(), seen.end()) - seen.begin();
  std::fprintf(out, kLabel, "mouth");
  std::fprintf(out, "opened to %.1f %% in the landmarks, there %.1f %% in the mesh\n",
               seen[static_cast<std::size_t>(widest)],
               score.mouth_of_mesh[static_cast<std::size_t>(widest)]);
}

void PrintSummary(std::FILE* out, const std::string& name, const Summary& summary, TrackMode mode) {
  std::fprintf(out, kLabel, "track");
  std::fprintf(out, "%s\n", name.c_str());
  std::fprintf(out, kLabel, "frames");
  std::fprintf(out, "%zu, %zu failed\n", summary.frames, summary.failed_frames);
  std::fprintf(out, kLabel, "faces");
  std::fprintf(out, "%zu, at most %zu in a frame, %zu without a finite result\n", summary.faces,
               summary.most_faces, summary.broken_faces);
  std::fprintf(out, kLabel, "elapsed ms per frame");
  std::fprintf(out, "p50 %.3f, p99 %.3f\n", Percentile(summary.milliseconds, 0.50),
               Percentile(summary.milliseconds, 0.99));
  if (!summary.misfits.empty()) {
    std::fprintf(out, kLabel, "misfit of the mean");
    std::fprintf(out, "median %.1f %%, p95 %.1f %% of the interpupillary distance\n",
                 Percentile(summary.misfits, 0.50), Percentile(summary.misfits, 0.95));
  }
  if (!summary.turns.empty()) {
    std::fprintf(out, kLabel, "change between frames");
    std::fprintf(out, "median %.2f degrees and %.1f mm, largest %.2f degrees and %.1f mm\n",
                 Percentile(summary.turns, 0.50), Percentile(summary.moves, 0.50),
                 Percentile(summary.turns, 1.0), Percentile(summary.moves, 1.0));
  }
  if (mode == TrackMode::kMask) PrintMeshScore(out, summary.meshes);
}

// Frames are processed as their lines arrive, so that a track can come through a pipe from a
// detector that is running.
void RunTrackCommand(const TrackOptions& options) {
  const std::string model = options.engine.model_path();
  CheckIsNoInput(options.out, {options.track, model});
  TrackInput input(options.track);
  TrackReader track(input.stream(), input.name());
  EngineSession session(model, track.header(), options.engine.mode(), options.engine.tracker());
  std::optional<AtomicFile> out;
  if (!options.out.empty()) {
    out.emplace(options.out);
    WriteResultsHeader(out->stream(), track.header(), options.engine.mode_name);
  }
  Summarizer summarizer(track.header(), ReadFaceModelFile(model), options.engine.mode());
  {
    Progress progress("tracking " + TrackName(input.name()));
    while (const std::optional<TrackFrame> frame = track.Next()) {
      const FrameResult result = session.Process(*frame);
      summarizer.Add(*frame, result);
      if (out) WriteResultsFrame(out->stream(), result);
      if (out && out->is_direct()) out->stream().flush();
      progress.Step();
    }
  }
  if (out) out->Commit();
  TellRounding(input.name(), track.rounded_coordinates());

  std::FILE* const console = ConsoleBeside(options.out);
  const Summary& summary = summarizer.summary();
  PrintSummary(console, TrackName(input.name()), summary, options.engine.mode());
  if (out) {
    std::fprintf(console, kLabel, "results");
    std::fprintf(console, "%s\n", options.out.c_str());
  }
  const std::size_t failures = summary.failed_frames + summary.broken_faces;
  if (failures > 0) {
    throw Error(input.name() + ": the engine failed on " + std::to_string(failures) +
                " frames or faces");
  }
}

}  // namespace

void AddTrackCommand(CLI::App& app) {
  CLI::App* command = app.add_subcommand(
      "track",
      "Runs a landmark track through the engine; prints a summary and, with --out, writes the\n"
      "matrices and 3-D landmarks of every frame and face.");
  const auto options = std::make_shared<TrackOptions>();
  AddTrackArgument(*command, options->track);
  AddFileOption(*command, "--out", options->out, "Results, a JSON line a frame");
  AddEngineOptions(*command, options->engine);
  command->footer(
      "Frames are processed as their lines arrive, and written at once where --out is a pipe.\n"
      "The summary gives, besides counts:\n"
      "  elapsed ms per frame   time on the clock that the engine's call takes, frames with faces\n"
      "  misfit of the mean     distance in the image between the inner landmarks and the mean\n"
      "                         face under the engine's pose: a person's own shape and expression\n"
      "                         count as misfit too\n"
      "  change between frames  of a head's rotation and place, the person's own motion included\n"
      "  misfit of the mesh     mask mode: as above, to the vertices of the dense mesh\n"
      "  mouth                  mask mode: widest opening of the inner lips\n"
      "Percents are of the interpupillary distance, over heads turned by at most 40 degrees.\n"
      "The exit code is 1 when a frame failed or a result is not finite.\n"
      "Examples:\n"
      "  n3ds track examples/tracks/synthetic_talk_165.track.jsonl\n"
      "  n3ds track examples/tracks/synthetic_talk_165.track.jsonl --mode mask\n"
      "  n3ds track talk.track.jsonl --out talk.results.jsonl --model my_model.bin\n"
      "  my_detector | n3ds track - --out /dev/stdout | my_viewer");
  command->callback([options] { RunTrackCommand(*options); });
}

}  // namespace n3ds::tool
