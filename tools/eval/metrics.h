// SPDX-License-Identifier: MIT
// How far estimated head poses are from the true ones of a track.
//
// Poses take a head frame to the camera frame of the upright image (x right, y down, z forward,
// mm). The estimator's head frame and the track's differ by a constant, because each defines
// "facing forward" and the origin in its own way: one rotation and one origin are estimated over
// all tracks together and taken off before anything is compared.
//
// The distance to a head cannot be told from the image without the focal length. An estimator
// that assumes f where the truth has F finds distances too small by f / F; they are scaled before
// they are compared. What remains in depth is mostly the size of the person's head.
#pragma once

#include <cstddef>
#include <vector>

#include "engine/face_results.h"
#include "eval/rotation.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

struct PoseEstimate {
  bool valid = false;
  Matrix3 rotation{};
  Vector3 translation{};
};

// Estimates of a track: one per frame and face, in the order of the track.
using TrackPoses = std::vector<std::vector<PoseEstimate>>;

struct JudgedTrack {
  const Track* track = nullptr;  // with truth
  const TrackPoses* poses = nullptr;
  double assumed_focal = 0;  // of the estimator, pixels
};

// The estimator's head frame seen from the track's.
struct HeadFrameOffset {
  Matrix3 rotation = {1, 0, 0, 0, 1, 0, 0, 0, 1};  // estimated = true * rotation
  Vector3 origin{};  // the track's origin in the estimator's head frame, mm
};

// Limits of the counts below. A pose is lost when it is this far off; a jump is a change of the
// error from one frame to the next that no viewer would miss.
constexpr double kLostDegrees = 45;
constexpr double kJumpDegrees = 8;
constexpr double kJumpAcross = 25;  // mm
constexpr double kJumpDepth = 15;   // percent

// A head is at rest while it turns and moves more slowly than this.
constexpr double kRestDegreesPerSecond = 15;
constexpr double kRestMillimetresPerSecond = 60;

// Errors of one face in one frame.
struct PoseError {
  double yaw = 0;       // of the true head, degrees, without sign
  double rotation = 0;  // degrees
  double across = 0;    // of the origin, parallel to the image, mm at the true depth
  double depth = 0;     // percent of the true depth, without sign
};

struct Score {
  std::size_t faces = 0;
  std::size_t lost = 0;   // no finite pose, or one off by more than kLostDegrees
  std::size_t swaps = 0;  // the estimate lies nearer to another person's true place than to its own
  std::size_t jumps = 0;
  std::vector<PoseError> errors;      // of all valid poses, lost ones included
  std::vector<double> rest_rotation;  // change of the error between frames at rest, degrees
  std::vector<double> rest_across;    // mm
  // Regression of the rotation error on the true turning speed, summed over persons.
  double lag_moment = 0;      // degrees^2 / s
  double turning_moment = 0;  // degrees^2 / s^2

  void Add(const Score& other);
  // Seconds by which the estimates trail the truth.
  double Lag() const;
  // Errors of the faces turned by at most `yaw` degrees.
  std::vector<double> RotationErrors(double yaw) const;
};

// The pose in the engine's matrices.
PoseEstimate CameraPose(const FaceResult& face);
// All poses of a run; a failed frame gives invalid ones.
TrackPoses CameraPoses(const Track& track, const std::vector<FrameResult>& results);
// How far a head is turned to the side, in degrees without sign.
double AbsoluteYaw(const Matrix3& rotation);
// The focal length that the engine assumes for an image.
double EngineFocal(const TrackHeader& header);

HeadFrameOffset EstimateOffset(const std::vector<JudgedTrack>& tracks);
Score ScoreTrack(const JudgedTrack& judged, const HeadFrameOffset& offset);

}  // namespace n3ds::tool
