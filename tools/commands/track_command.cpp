// SPDX-License-Identifier: MIT
// n3ds track: a track in, matrices and 3-D landmarks out, with a summary of how it went.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "commands/commands.h"
#include "commands/options.h"
#include "engine/engine_session.h"
#include "engine/face_model_file.h"
#include "engine/results_file.h"
#include "eval/mesh_metrics.h"
#include "support/atomic_file.h"
#include "support/progress.h"
#include "support/statistics.h"
#include "tracks/track_file.h"
#include "tracks/upright.h"

namespace n3ds::tool {
namespace {

struct TrackOptions {
  EngineOptions engine;
  std::string track;
  std::string out;
};

// Distances in pixels between the landmarks handed in and the 3-D landmarks as the matrices draw
// them. The engine leaves the inner landmarks on their rays and moves the outline towards the
// model.
void AddReprojection(const TrackHeader& header, const TrackFace& face, const FaceResult& result,
                     std::vector<double>& distances) {
  const std::vector<PixelPoint> seen = UprightLandmarks(header, face);
  for (std::size_t k = 0; k < seen.size(); ++k) {
    const PixelPoint drawn =
        ProjectToPixel(result, header, static_cast<double>(result.landmarks3d[3 * k]),
                       static_cast<double>(result.landmarks3d[3 * k + 1]),
                       static_cast<double>(result.landmarks3d[3 * k + 2]));
    distances.push_back(std::hypot(drawn.x - seen[k].x, drawn.y - seen[k].y));
  }
}

void PrintMeshScore(const MeshScore& score) {
  std::printf("mesh          %zu folded; landmarks' vertices off by median %.2f %%, p95 %.2f %%\n",
              score.folded, Percentile(score.distances, 0.50), Percentile(score.distances, 0.95));
  const auto& seen = score.mouth_seen;
  if (seen.empty()) return;
  const auto widest = std::max_element(seen.begin(), seen.end()) - seen.begin();
  std::printf("mouth         opened to %.1f %% in the landmarks, there %.1f %% in the mesh\n",
              seen[static_cast<std::size_t>(widest)],
              score.mouth_of_mesh[static_cast<std::size_t>(widest)]);
}

void RunTrackCommand(const TrackOptions& options) {
  const Track track = ReadTrackFile(options.track);
  EngineSession session(options.engine.model, track.header, options.engine.mode());
  std::optional<AtomicFile> out;
  if (!options.out.empty()) {
    out.emplace(options.out);
    WriteResultsHeader(out->stream(), track.header, options.engine.mode_name);
  }

  std::optional<MeshJudge> judge;
  if (options.engine.mode() == TrackMode::kMask) {
    judge.emplace(ReadFaceModelFile(options.engine.model));
  }
  MeshScore meshes;
  std::size_t failed_frames = 0;
  std::size_t broken_faces = 0;
  std::vector<double> milliseconds;
  std::vector<double> distances;
  {
    Progress progress("tracking " + track.name, track.frames.size());
    for (const TrackFrame& frame : track.frames) {
      const FrameResult result = session.Process(frame);
      if (!result.ok) ++failed_frames;
      if (!frame.faces.empty()) milliseconds.push_back(result.milliseconds);
      for (std::size_t i = 0; i < result.faces.size(); ++i) {
        if (IsFinite(result.faces[i])) {
          AddReprojection(track.header, frame.faces[i], result.faces[i], distances);
        } else {
          ++broken_faces;
        }
      }
      if (judge) judge->AddFrame(track.header, frame, result, meshes);
      if (out) WriteResultsFrame(out->stream(), result);
      progress.Step();
    }
  }
  if (out) out->Commit();

  std::printf("track         %s\n", track.name.c_str());
  std::printf("frames        %zu, %zu failed\n", track.frames.size(), failed_frames);
  std::printf("faces         %zu, at most %zu in a frame, %zu without a finite result\n",
              track.FaceCount(), track.MostFaces(), broken_faces);
  std::printf("ms per frame  p50 %.3f, p99 %.3f\n", Percentile(milliseconds, 0.50),
              Percentile(milliseconds, 0.99));
  std::printf("reprojection  rms %.3f px, median %.3f px, largest %.3f px\n",
              RootMeanSquare(distances), Percentile(distances, 0.50), Percentile(distances, 1.0));
  if (judge) PrintMeshScore(meshes);
  if (out) std::printf("results       %s\n", options.out.c_str());
  if (failed_frames + broken_faces > 0) {
    throw Error(options.track + ": the engine failed on " +
                std::to_string(failed_frames + broken_faces) + " frames or faces");
  }
}

}  // namespace

void AddTrackCommand(CLI::App& app) {
  CLI::App* command = app.add_subcommand(
      "track",
      "Runs a landmark track through the engine; prints a summary and, with --out, writes the\n"
      "matrices and 3-D landmarks of every frame and face.");
  const auto options = std::make_shared<TrackOptions>();
  command->add_option("track", options->track, "Landmark track")
      ->required()
      ->type_name("FILE.track.jsonl");
  command->add_option("--out", options->out, "Results, a JSON line a frame")->type_name("FILE");
  AddEngineOptions(*command, options->engine);
  command->footer(
      "The summary counts frames and faces, gives the time of the engine's call over the frames\n"
      "with faces and the distance between the landmarks handed in and the 3-D landmarks as the\n"
      "matrices draw them. In mask mode it counts folded meshes and gives the distance between\n"
      "the inner landmarks and their vertices of the mesh, and the opening of the inner lips, in\n"
      "percent of the distance between the pupils over the heads turned by at most 40 degrees.\n"
      "The exit code is 1 when a frame failed or a result is not finite.\n"
      "Examples:\n"
      "  n3ds track examples/tracks/synthetic_talk_165.track.jsonl\n"
      "  n3ds track examples/tracks/synthetic_talk_165.track.jsonl --mode mask\n"
      "  n3ds track talk.track.jsonl --out talk.results.jsonl --model my_model.bin");
  command->callback([options] { RunTrackCommand(*options); });
}

}  // namespace n3ds::tool
