// OpenCV's solvePnP on the frames of tracks with truth, judged by the same code as 'n3ds eval' and
// printed beside the engine: mean landmark positions of the population, iterative solver, each
// person's last pose as the start of the next frame, the engine's assumption of the focal length.
//
//   solve_pnp_peer FILE.track.jsonl...
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

#include "engine/engine_session.h"
#include "eval/metrics.h"
#include "eval/score_table.h"
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

Run RunEngine(const Track& track) {
  const auto results = RunTrack(track, DefaultModelPath(), TrackMode::kRigid);
  Run run;
  run.poses = CameraPoses(track, results);
  for (std::size_t f = 0; f < results.size(); ++f) {
    if (!track.frames[f].faces.empty()) run.milliseconds.push_back(results[f].milliseconds);
  }
  return run;
}

void Print(const char* name, const std::vector<Track>& tracks, const std::vector<Run>& runs) {
  std::vector<JudgedTrack> judged;
  std::vector<double> milliseconds;
  for (std::size_t k = 0; k < tracks.size(); ++k) {
    judged.push_back({&tracks[k], &runs[k].poses, EngineFocal(tracks[k].header)});
    milliseconds.insert(milliseconds.end(), runs[k].milliseconds.begin(),
                        runs[k].milliseconds.end());
  }
  const HeadFrameOffset offset = EstimateOffset(judged);
  NamedScores scores;
  for (const JudgedTrack& one : judged) {
    scores.emplace_back(one.track->name, ScoreTrack(one, offset));
  }
  std::cout << name << ", " << Decimal(Percentile(milliseconds, 0.5), 3)
            << " ms a frame (median)\n";
  ScoreTable(scores).Print(std::cout);
  std::cout << "\n";
}

void RunPeer(const std::vector<std::string>& paths) {
  const auto mean = ReadMeanLandmarks(N3DS_DATA_DIR "/face_statistics/points.csv");
  std::vector<Track> tracks;
  for (const std::string& path : paths) {
    tracks.push_back(ReadTrackFile(path));
    if (!tracks.back().HasTruth()) throw Error(path + ": the track has no truth");
  }
  std::vector<Run> runs;
  for (const Track& track : tracks) runs.push_back(RunEngine(track));
  Print("engine, rigid", tracks, runs);
  for (const Selection& selection : kSelections) {
    runs.clear();
    for (const Track& track : tracks) runs.push_back(RunPnp(track, mean, selection));
    Print(selection.name, tracks, runs);
  }
  std::cout << kScoreTableLegend;
}

}  // namespace
}  // namespace n3ds::tool

int main(int argc, char** argv) {
  if (argc < 2) {
    std::fputs("usage: solve_pnp_peer FILE.track.jsonl...\n", stderr);
    return 2;
  }
  try {
    n3ds::tool::RunPeer(std::vector<std::string>(argv + 1, argv + argc));
  } catch (const std::exception& error) {
    std::fprintf(stderr, "solve_pnp_peer: %s\n", error.what());
    return 1;
  }
  return 0;
}
