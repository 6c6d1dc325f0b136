// SPDX-License-Identifier: MIT
// OpenCV's solvePnP on the frames of tracks with truth, judged by the same code as 'n3ds eval' and
// printed beside the engine: mean landmark positions of the population, iterative solver, each
// person's last pose as the start of the next frame, the engine's assumption of the focal length;
// each with and without a one-euro filter on the pose.
//
//   solve_pnp_peer [--model FILE] FILE.track.jsonl...
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <exception>
#include <fstream>
#include <iostream>
#include <map>
#include <opencv2/calib3d.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "attachment.h"
#include "engine/engine_session.h"
#include "eval/metrics.h"
#include "eval/score_table.h"
#include "one_euro_pose.h"
#include "support/data_files.h"
#include "support/error.h"
#include "support/statistics.h"
#include "tracks/track_file.h"
#include "tracks/upright.h"

namespace n3ds::tool {
namespace {

// The landmarks that a pose is fitted to: first to last, of the 101-point layout.
struct Selection {
  const char* name;
  std::size_t first;
  std::size_t last;
};

// Of the outline only the model's mean position is known, although on a turned head it slides.
constexpr Selection kSelections[] = {{"solvePnP, 95 points", 0, 94},
                                     {"solvePnP, 76 inner points", 19, 94}};

// The landmarks' mean positions in mm: rows id, landmark, region, x, y, z, ... in order of id.
std::vector<cv::Point3d> ReadMeanLandmarks(const std::string& path) {
  std::ifstream in(path);
  std::string line;
  std::getline(in, line);
  std::vector<cv::Point3d> points;
  while (points.size() < 101 && std::getline(in, line)) {
    std::istringstream cells(line);
    std::string cell;
    std::vector<std::string> row;
    while (std::getline(cells, cell, ',')) row.push_back(cell);
    if (row.size() < 6) break;
    points.emplace_back(std::stod(row[3]), std::stod(row[4]), std::stod(row[5]));
  }
  if (points.size() != 101) throw Error(path + ": not the table of face points");
  return points;
}

struct Run {
  TrackPoses poses;
  std::vector<double> milliseconds;  // of frames with faces
};

class PnpTracker {
 public:
  PnpTracker(const TrackHeader& header, const std::vector<cv::Point3d>& mean,
             const Selection& selection)
      : header_(header),
        selection_(selection),
        model_(mean.begin() + static_cast<std::ptrdiff_t>(selection.first),
               mean.begin() + static_cast<std::ptrdiff_t>(selection.last) + 1) {
    const double focal = EngineFocal(header);
    camera_ = cv::Matx33d(focal, 0, header.upright_width() / 2.0, 0, focal,
                          header.upright_height() / 2.0, 0, 0, 1);
  }

  PoseEstimate Fit(const TrackFace& face) {
    const std::vector<PixelPoint> upright = UprightLandmarks(header_, face);
    std::vector<cv::Point2d> seen;
    for (std::size_t k = selection_.first; k <= selection_.last; ++k) {
      seen.emplace_back(upright[k].x, upright[k].y);
    }
    const bool known = starts_.count(face.id) > 0;
    Start& start = starts_[face.id];
    PoseEstimate pose;
    pose.valid = cv::solvePnP(model_, seen, camera_, cv::noArray(), start.rotation,
                              start.translation, known, cv::SOLVEPNP_ITERATIVE) &&
                 start.translation[2] > 0;
    cv::Matx33d rotation;
    cv::Rodrigues(start.rotation, rotation);
    for (std::size_t i = 0; i < 9; ++i) pose.rotation[i] = rotation.val[i];
    for (std::size_t i = 0; i < 3; ++i) pose.translation[i] = start.translation.val[i];
    if (!pose.valid) starts_.erase(face.id);
    return pose;
  }

 private:
  struct Start {
    cv::Vec3d rotation;
    cv::Vec3d translation;
  };
  TrackHeader header_;
  Selection selection_;
  std::vector<cv::Point3d> model_;
  cv::Matx33d camera_;
  std::map<std::int64_t, Start> starts_;
};

Run RunPnp(const Track& track, const std::vector<cv::Point3d>& mean, const Selection& selection) {
  PnpTracker tracker(track.header, mean, selection);
  Run run;
  for (const TrackFrame& frame : track.frames) {
    const auto start = std::chrono::steady_clock::now();
    run.poses.emplace_back();
    for (const TrackFace& face : frame.faces) run.poses.back().push_back(tracker.Fit(face));
    const std::chrono::duration<double, std::milli> taken =
        std::chrono::steady_clock::now() - start;
    if (!frame.faces.empty()) run.milliseconds.push_back(taken.count());
  }
  return run;
}

Run RunEngine(const Track& track, const std::string& model, TrackerKind tracker) {
  const auto results = RunTrack(track, model, TrackMode::kRigid, {}, tracker);
  Run run;
  run.poses = CameraPoses(track, results);
  for (std::size_t f = 0; f < results.size(); ++f) {
    if (!track.frames[f].faces.empty()) run.milliseconds.push_back(results[f].milliseconds);
  }
  return run;
}

std::vector<JudgedTrack> Judged(const std::vector<Track>& tracks, const std::vector<Run>& runs) {
  std::vector<JudgedTrack> judged;
  for (std::size_t k = 0; k < tracks.size(); ++k) {
    judged.push_back({&tracks[k], &runs[k].poses, EngineFocal(tracks[k].header)});
  }
  return judged;
}

// Rotation errors that are left when every person's own mean error is taken off: what the
// person's unknown shape does not explain.
std::vector<double> OwnRotationErrors(const std::vector<JudgedTrack>& tracks) {
  std::vector<double> errors;
  for (const JudgedTrack& judged : tracks) {
    std::map<std::int64_t, std::vector<Matrix3>> people;
    const std::vector<TrackFrame>& frames = judged.track->frames;
    for (std::size_t f = 0; f < frames.size(); ++f) {
      for (std::size_t i = 0; i < frames[f].faces.size(); ++i) {
        const PoseEstimate& pose = (*judged.poses)[f][i];
        if (!pose.valid) continue;
        const TrackFace& face = frames[f].faces[i];
        people[face.id].push_back(Multiplied(Transposed(face.truth->rotation), pose.rotation));
      }
    }
    for (const auto& [id, rotations] : people) {
      const Matrix3 mean = Transposed(MeanRotation(rotations));
      for (const Matrix3& r : rotations) errors.push_back(RotationAngle(Multiplied(mean, r)));
    }
  }
  return errors;
}

class Comparison {
 public:
  Comparison(const std::vector<Track>& tracks, const std::vector<cv::Point3d>& mean)
      : tracks_(tracks),
        summary_({"", "rot20", "p95", "rot40", "p95", "rot60", "p95", "own", "attach", "p95",
                  "depth", "p95", "jitter", "p95", "lag"}) {
    for (const cv::Point3d& p : mean) mean_.push_back({p.x, p.y, p.z});
  }

  // Prints the tracks one by one and keeps the sum for the summary.
  void Add(const std::string& name, const std::vector<Run>& runs) {
    const std::vector<JudgedTrack> judged = Judged(tracks_, runs);
    const HeadFrameOffset offset = EstimateOffset(judged);
    NamedScores scores;
    Score all;
    AttachmentScore attachment;
    std::vector<double> milliseconds;
    for (std::size_t k = 0; k < judged.size(); ++k) {
      scores.emplace_back(tracks_[k].name, ScoreTrack(judged[k], offset));
      all.Add(scores.back().second);
      AddAttachment(judged[k], mean_, attachment);
      milliseconds.insert(milliseconds.end(), runs[k].milliseconds.begin(),
                          runs[k].milliseconds.end());
    }
    std::cout << name << ", " << Decimal(Percentile(milliseconds, 0.5), 3)
              << " ms a frame (median)\n";
    ScoreTable(scores).Print(std::cout);
    std::cout << "\n";
    Summarize(name, all, OwnRotationErrors(judged), attachment);
  }

  void PrintSummary() const { summary_.Print(std::cout); }

 private:
  void Summarize(const std::string& name, const Score& score, const std::vector<double>& own,
                 const AttachmentScore& attachment) {
    std::vector<std::string> row = {name};
    const auto add = [&](const std::vector<double>& sample, int decimals) {
      row.push_back(Decimal(Percentile(sample, 0.5), decimals));
      row.push_back(Decimal(Percentile(sample, 0.95), decimals));
    };
    for (const double yaw : {20, 40, 60}) add(score.RotationErrors(yaw), 2);
    row.push_back(Decimal(Percentile(own, 0.5), 2));
    add(attachment.errors, 2);
    std::vector<double> depth;
    for (const PoseError& error : score.errors) depth.push_back(error.depth);
    add(depth, 1);
    add(attachment.jitter, 2);
    row.push_back(Decimal(1000 * score.Lag(), 1));
    summary_.AddRow(row);
  }

  const std::vector<Track>& tracks_;
  std::vector<Vector3> mean_;
  TextTable summary_;
};

constexpr char kSummaryLegend[] =
    "All tracks together.\n"
    "rot20..    as above\n"
    "own        rotation error, median, when every person's own mean error is taken off as well\n"
    "attach     offset of points on the nose bridge, above the forehead and in front of the ears,\n"
    "           percent of the interpupillary distance; nothing is taken off\n"
    "depth      as above\n"
    "jitter     second difference of these points less the true ones', pixels at a face width of\n"
    "           200\n"
    "lag        by which the rotation trails the true one, ms\n";

void RunPeer(const std::string& model, const std::vector<std::string>& paths) {
  const auto mean = ReadMeanLandmarks(N3DS_DATA_DIR "/face_statistics/points.csv");
  std::vector<Track> tracks;
  for (const std::string& path : paths) {
    tracks.push_back(ReadTrackFile(path));
    if (!tracks.back().HasTruth()) throw Error(path + ": the track has no truth");
  }
  Comparison comparison(tracks, mean);
  std::vector<Run> runs;
  for (const TrackerKind tracker : {TrackerKind::kClassic, TrackerKind::kSteady}) {
    runs.clear();
    for (const Track& track : tracks) runs.push_back(RunEngine(track, model, tracker));
    comparison.Add(tracker == TrackerKind::kSteady ? "engine, steady" : "engine, rigid", runs);
  }
  for (const Selection& selection : kSelections) {
    runs.clear();
    for (const Track& track : tracks) runs.push_back(RunPnp(track, mean, selection));
    comparison.Add(selection.name, runs);
    for (std::size_t k = 0; k < runs.size(); ++k) {
      runs[k].poses = Filtered(tracks[k], runs[k].poses);
    }
    comparison.Add(std::string(selection.name) + ", one-euro", runs);
  }
  std::cout << kScoreTableLegend << "\n";
  comparison.PrintSummary();
  std::cout << "\n" << kSummaryLegend;
}

}  // namespace
}  // namespace n3ds::tool

int main(int argc, char** argv) {
  std::vector<std::string> arguments(argv + 1, argv + argc);
  std::string model = n3ds::tool::DefaultModelPath();
  if (arguments.size() > 1 && arguments[0] == "--model") {
    model = arguments[1];
    arguments.erase(arguments.begin(), arguments.begin() + 2);
  }
  if (arguments.empty()) {
    std::fputs("usage: solve_pnp_peer [--model FILE] FILE.track.jsonl...\n", stderr);
    return 2;
  }
  try {
    n3ds::tool::RunPeer(model, arguments);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "solve_pnp_peer: %s\n", error.what());
    return 1;
  }
  return 0;
}
