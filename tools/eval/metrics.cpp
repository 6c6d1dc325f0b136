// SPDX-License-Identifier: MIT
#include "eval/metrics.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <map>
#include <utility>

namespace n3ds::tool {
namespace {

constexpr double kDegreesPerRadian = 57.295779513082320876798;

// One face of one frame, ready to be compared.
struct Sample {
  std::size_t frame = 0;  // index, not the track's number
  double time = 0;        // s
  const TrackTruth* truth = nullptr;
  PoseEstimate pose;
};

// Every person's samples in order of time.
using Persons = std::map<std::int64_t, std::vector<Sample>>;

Persons ByPerson(const JudgedTrack& judged) {
  Persons persons;
  const std::vector<TrackFrame>& frames = judged.track->frames;
  for (std::size_t f = 0; f < frames.size(); ++f) {
    for (std::size_t i = 0; i < frames[f].faces.size(); ++i) {
      const TrackFace& face = frames[f].faces[i];
      const double time = static_cast<double>(frames[f].number) / judged.track->header.fps;
      persons[face.id].push_back({f, time, &*face.truth, (*judged.poses)[f][i]});
    }
  }
  return persons;
}

// The track's origin as the estimator places it, with the depth it would have under the true focal
// length.
Vector3 EstimatedOrigin(const PoseEstimate& pose, const HeadFrameOffset& offset,
                        double focal_ratio) {
  Vector3 origin = Multiplied(pose.rotation, offset.origin);
  for (std::size_t a = 0; a < 3; ++a) origin[a] += pose.translation[a];
  origin[2] *= focal_ratio;
  return origin;
}

// Rotation from the true to the estimated head, in the head's own axes.
Matrix3 RotationError(const Sample& sample, const HeadFrameOffset& offset) {
  return Multiplied(Transposed(Multiplied(sample.truth->rotation, offset.rotation)),
                    sample.pose.rotation);
}

// Where the estimate misses, as an offset parallel to the image at the true depth: the difference
// of the two viewing directions times that depth.
struct OriginError {
  double x = 0;
  double y = 0;
  double depth = 0;  // percent, signed
};

OriginError CompareOrigin(const Vector3& estimated, const Vector3& truth) {
  return {(estimated[0] / estimated[2] - truth[0] / truth[2]) * truth[2],
          (estimated[1] / estimated[2] - truth[1] / truth[2]) * truth[2],
          100 * (estimated[2] / truth[2] - 1)};
}

void CountSwaps(const JudgedTrack& judged, const HeadFrameOffset& offset, double focal_ratio,
                Score& score) {
  const std::vector<TrackFrame>& frames = judged.track->frames;
  for (std::size_t f = 0; f < frames.size(); ++f) {
    for (std::size_t i = 0; i < frames[f].faces.size(); ++i) {
      const PoseEstimate& pose = (*judged.poses)[f][i];
      if (!pose.valid) continue;
      const Vector3 origin = EstimatedOrigin(pose, offset, focal_ratio);
      const auto distance = [&](std::size_t other) {
        const Vector3& truth = frames[f].faces[other].truth->translation;
        return std::hypot(origin[0] / origin[2] - truth[0] / truth[2],
                          origin[1] / origin[2] - truth[1] / truth[2]);
      };
      const double own = distance(i);
      for (std::size_t other = 0; other < frames[f].faces.size(); ++other) {
        if (distance(other) < own) {
          ++score.swaps;
          break;
        }
      }
    }
  }
}

// Changes from one frame to the next: jumps, and jitter while the head is at rest. Comparing errors
// instead of poses takes the true motion off.
void CompareNeighbours(const Sample& before, const Sample& now, const HeadFrameOffset& offset,
                       double focal_ratio, Score& score) {
  const double change = RotationAngle(
      Multiplied(Transposed(RotationError(before, offset)), RotationError(now, offset)));
  const OriginError origin_before =
      CompareOrigin(EstimatedOrigin(before.pose, offset, focal_ratio), before.truth->translation);
  const OriginError origin_now =
      CompareOrigin(EstimatedOrigin(now.pose, offset, focal_ratio), now.truth->translation);
  const double across = std::hypot(origin_now.x - origin_before.x, origin_now.y - origin_before.y);
  if (change > kJumpDegrees || across > kJumpAcross ||
      std::abs(origin_now.depth - origin_before.depth) > kJumpDepth) {
    ++score.jumps;
  }
  const double seconds = now.time - before.time;
  const double turned =
      RotationAngle(Multiplied(Transposed(before.truth->rotation), now.truth->rotation));
  const double moved = Length(now.truth->translation - before.truth->translation);
  if (turned < kRestDegreesPerSecond * seconds && moved < kRestMillimetresPerSecond * seconds) {
    score.rest_rotation.push_back(change);
    score.rest_across.push_back(across);
  }
}

// An estimate that trails by t seconds is off by -t times the turning speed, plus what does not
// depend on the speed. The slope of the error over the speed is the lag.
void AddLagMoments(const std::vector<Sample>& samples, const HeadFrameOffset& offset,
                   Score& score) {
  std::vector<Vector3> errors;
  std::vector<Vector3> speeds;
  for (std::size_t k = 1; k + 1 < samples.size(); ++k) {
    const Sample& before = samples[k - 1];
    const Sample& after = samples[k + 1];
    if (after.frame - before.frame != 2 || !samples[k].pose.valid) continue;
    // In the axes of the estimator's head frame, like the error.
    Vector3 speed = Multiplied(
        Transposed(offset.rotation),
        RotationVector(Multiplied(Transposed(before.truth->rotation), after.truth->rotation)));
    for (double& value : speed) value /= after.time - before.time;
    errors.push_back(RotationVector(RotationError(samples[k], offset)));
    speeds.push_back(speed);
  }
  Vector3 mean_error{};
  Vector3 mean_speed{};
  for (std::size_t k = 0; k < errors.size(); ++k) {
    for (std::size_t a = 0; a < 3; ++a) {
      mean_error[a] += errors[k][a] / static_cast<double>(errors.size());
      mean_speed[a] += speeds[k][a] / static_cast<double>(errors.size());
    }
  }
  for (std::size_t k = 0; k < errors.size(); ++k) {
    const Vector3 speed = speeds[k] - mean_speed;
    score.lag_moment -= Dot(errors[k] - mean_error, speed);
    score.turning_moment += Dot(speed, speed);
  }
}

// Solves the symmetric 3x3 system m x = b; a singular one gives zero, for tracks too poor to tell.
Vector3 SolveSymmetric(const Matrix3& m, const Vector3& b) {
  const Matrix3 adjoint = {
      m[4] * m[8] - m[5] * m[7], m[2] * m[7] - m[1] * m[8], m[1] * m[5] - m[2] * m[4],
      m[5] * m[6] - m[3] * m[8], m[0] * m[8] - m[2] * m[6], m[2] * m[3] - m[0] * m[5],
      m[3] * m[7] - m[4] * m[6], m[1] * m[6] - m[0] * m[7], m[0] * m[4] - m[1] * m[3]};
  const double det = m[0] * adjoint[0] + m[1] * adjoint[3] + m[2] * adjoint[6];
  const double scale = std::pow(m[0] + m[4] + m[8], 3);
  constexpr double kSingular = 1e-9;
  if (!(det > kSingular * scale)) return {};
  Vector3 x = Multiplied(adjoint, b);
  for (double& value : x) value /= det;
  return x;
}

double FocalRatio(const JudgedTrack& judged) {
  return *judged.track->header.focal / judged.assumed_focal;
}

}  // namespace

void Score::Add(const Score& other) {
  faces += other.faces;
  lost += other.lost;
  swaps += other.swaps;
  jumps += other.jumps;
  errors.insert(errors.end(), other.errors.begin(), other.errors.end());
  rest_rotation.insert(rest_rotation.end(), other.rest_rotation.begin(), other.rest_rotation.end());
  rest_across.insert(rest_across.end(), other.rest_across.begin(), other.rest_across.end());
  lag_moment += other.lag_moment;
  turning_moment += other.turning_moment;
}

double Score::Lag() const { return turning_moment > 0 ? lag_moment / turning_moment : 0; }

std::vector<double> Score::RotationErrors(double yaw) const {
  std::vector<double> selected;
  for (const PoseError& error : errors) {
    if (error.yaw <= yaw) selected.push_back(error.rotation);
  }
  return selected;
}

PoseEstimate CameraPose(const FaceResult& face) {
  PoseEstimate pose;
  if (!IsFinite(face)) return pose;
  const auto model_view = HeadView(face);
  // OpenGL looks along -z with y up, the camera frame along +z with y down.
  constexpr double kSigns[3] = {1, -1, -1};
  for (std::size_t row = 0; row < 3; ++row) {
    for (std::size_t column = 0; column < 3; ++column) {
      pose.rotation[3 * row + column] = kSigns[row] * model_view[4 * column + row];
    }
    pose.translation[row] = kSigns[row] * model_view[12 + row];
  }
  pose.valid = pose.translation[2] > 0;
  return pose;
}

TrackPoses CameraPoses(const Track& track, const std::vector<FrameResult>& results) {
  TrackPoses poses(track.frames.size());
  for (std::size_t f = 0; f < poses.size(); ++f) {
    poses[f].resize(track.frames[f].faces.size());
    for (std::size_t i = 0; i < results[f].faces.size(); ++i) {
      poses[f][i] = CameraPose(results[f].faces[i]);
    }
  }
  return poses;
}

double AbsoluteYaw(const Matrix3& rotation) {
  // The third column is the direction in which the face looks; -z is towards the camera.
  return std::abs(std::atan2(rotation[2], -rotation[8])) * kDegreesPerRadian;
}

double EngineFocal(const TrackHeader& header) {
  return static_cast<double>(header.width + header.height) / 2;
}

namespace {

// Normal equations of an origin.
struct OriginEquations {
  Matrix3 normal{};
  Vector3 right{};

  // What the camera sees at R c + t should lie on the true origin's viewing direction (u, v). Only
  // directions count, so that heads taken for too near or too far do not pull the origin c along.
  void Add(const Sample& sample, double focal_ratio) {
    const Matrix3& r = sample.pose.rotation;
    const Vector3& t = sample.pose.translation;
    const Vector3& truth = sample.truth->translation;
    for (std::size_t axis = 0; axis < 2; ++axis) {
      const double direction = truth[axis] / truth[2] * focal_ratio;
      Vector3 row;
      for (std::size_t k = 0; k < 3; ++k) row[k] = r[3 * axis + k] - direction * r[6 + k];
      const double rest = direction * t[2] - t[axis];
      for (std::size_t a = 0; a < 3; ++a) {
        for (std::size_t b = 0; b < 3; ++b) normal[3 * a + b] += row[a] * row[b];
        right[a] += row[a] * rest;
      }
    }
  }
};

}  // namespace

HeadFrameOffset EstimateOffset(const std::vector<JudgedTrack>& tracks) {
  HeadFrameOffset offset;
  std::vector<Matrix3> rotations;
  OriginEquations origin;
  for (const JudgedTrack& judged : tracks) {
    for (const auto& [id, samples] : ByPerson(judged)) {
      for (const Sample& sample : samples) {
        if (!sample.pose.valid) continue;
        rotations.push_back(Multiplied(Transposed(sample.truth->rotation), sample.pose.rotation));
        origin.Add(sample, FocalRatio(judged));
      }
    }
  }
  if (rotations.empty()) return offset;
  offset.rotation = MeanRotation(rotations);
  offset.origin = SolveSymmetric(origin.normal, origin.right);
  return offset;
}

Score ScoreTrack(const JudgedTrack& judged, const HeadFrameOffset& offset) {
  const double focal_ratio = FocalRatio(judged);
  Score score;
  CountSwaps(judged, offset, focal_ratio, score);
  for (const auto& [id, samples] : ByPerson(judged)) {
    for (std::size_t k = 0; k < samples.size(); ++k) {
      const Sample& sample = samples[k];
      ++score.faces;
      if (!sample.pose.valid) {
        ++score.lost;
        continue;
      }
      const OriginError origin = CompareOrigin(EstimatedOrigin(sample.pose, offset, focal_ratio),
                                               sample.truth->translation);
      const double rotation = RotationAngle(RotationError(sample, offset));
      if (rotation > kLostDegrees) ++score.lost;
      score.errors.push_back({AbsoluteYaw(sample.truth->rotation), rotation,
                              std::hypot(origin.x, origin.y), std::abs(origin.depth)});
      const bool follows =
          k > 0 && samples[k - 1].pose.valid && samples[k - 1].frame + 1 == sample.frame;
      if (follows) CompareNeighbours(samples[k - 1], sample, offset, focal_ratio, score);
    }
    AddLagMoments(samples, offset, score);
  }
  return score;
}

}  // namespace n3ds::tool
