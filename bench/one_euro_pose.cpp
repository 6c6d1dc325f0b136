// SPDX-License-Identifier: MIT
#include "one_euro_pose.h"

#include <cmath>
#include <cstdint>
#include <map>

namespace n3ds::tool {
namespace {

constexpr double kPi = 3.14159265358979323846;

// Set so that the filtered pose trails by about a quarter of a frame at 30 frames a second.
constexpr OneEuroSettings kTranslation = {4, 0.1};
constexpr OneEuroSettings kRotation = {4, 60};

double Share(double cutoff, double seconds) { return 1 / (1 + 1 / (2 * kPi * cutoff * seconds)); }

// Unit quaternion (scalar first) of a rotation, by its largest element (Shepperd 1978).
std::array<double, 4> Quaternion(const Matrix3& r) {
  const double squares[4] = {1 + r[0] + r[4] + r[8], 1 + r[0] - r[4] - r[8], 1 - r[0] + r[4] - r[8],
                             1 - r[0] - r[4] + r[8]};
  std::size_t k = 0;
  for (std::size_t i = 1; i < 4; ++i) {
    if (squares[i] > squares[k]) k = i;
  }
  const double s = 0.5 / std::sqrt(squares[k]);
  const double a = (r[7] - r[5]) * s;
  const double b = (r[2] - r[6]) * s;
  const double c = (r[3] - r[1]) * s;
  const double xy = (r[1] + r[3]) * s;
  const double xz = (r[2] + r[6]) * s;
  const double yz = (r[5] + r[7]) * s;
  const double own = squares[k] * s;
  switch (k) {
    case 0:
      return {own, a, b, c};
    case 1:
      return {a, own, xy, xz};
    case 2:
      return {b, xy, own, yz};
    default:
      return {c, xz, yz, own};
  }
}

Matrix3 Rotation(const std::array<double, 4>& q) {
  const auto [w, x, y, z] = q;
  return {1 - 2 * (y * y + z * z), 2 * (x * y - w * z),     2 * (x * z + w * y),
          2 * (x * y + w * z),     1 - 2 * (x * x + z * z), 2 * (y * z - w * x),
          2 * (x * z - w * y),     2 * (y * z + w * x),     1 - 2 * (x * x + y * y)};
}

}  // namespace

double OneEuroFilter::Filter(double value, double seconds) {
  if (!started_) {
    started_ = true;
    value_ = value;
    return value;
  }
  const double speed = (value - value_) / seconds;
  speed_ += Share(settings_.speed_cutoff, seconds) * (speed - speed_);
  const double cutoff = settings_.min_cutoff + settings_.slope * std::abs(speed_);
  value_ += Share(cutoff, seconds) * (value - value_);
  return value_;
}

OneEuroPose::OneEuroPose()
    : translation_{OneEuroFilter(kTranslation), OneEuroFilter(kTranslation),
                   OneEuroFilter(kTranslation)},
      rotation_{OneEuroFilter(kRotation), OneEuroFilter(kRotation), OneEuroFilter(kRotation),
                OneEuroFilter(kRotation)} {}

PoseEstimate OneEuroPose::Filter(const PoseEstimate& pose, double seconds) {
  PoseEstimate filtered = pose;
  for (std::size_t k = 0; k < 3; ++k) {
    filtered.translation[k] = translation_[k].Filter(pose.translation[k], seconds);
  }
  std::array<double, 4> q = Quaternion(pose.rotation);
  // Of the two quaternions of a rotation the one nearer to the last.
  double along = 0;
  for (std::size_t k = 0; k < 4; ++k) along += q[k] * last_[k];
  double length = 0;
  for (std::size_t k = 0; k < 4; ++k) {
    q[k] = rotation_[k].Filter(along < 0 ? -q[k] : q[k], seconds);
    length += q[k] * q[k];
  }
  for (double& value : q) value /= std::sqrt(length);
  last_ = q;
  filtered.rotation = Rotation(q);
  return filtered;
}

TrackPoses Filtered(const Track& track, const TrackPoses& poses) {
  struct Person {
    OneEuroPose filter;
    std::size_t frame;
  };
  std::map<std::int64_t, Person> people;
  TrackPoses filtered = poses;
  for (std::size_t f = 0; f < poses.size(); ++f) {
    for (std::size_t i = 0; i < poses[f].size(); ++i) {
      const std::int64_t id = track.frames[f].faces[i].id;
      if (!poses[f][i].valid) {
        people.erase(id);
        continue;
      }
      const auto found = people.find(id);
      if (found != people.end() && found->second.frame + 1 != f) people.erase(found);
      Person& person = people.try_emplace(id).first->second;
      filtered[f][i] = person.filter.Filter(poses[f][i], 1 / track.header.fps);
      person.frame = f;
    }
  }
  return filtered;
}

}  // namespace n3ds::tool
