// SPDX-License-Identifier: MIT
#include "attachment.h"

#include <cmath>
#include <cstdint>
#include <map>

namespace n3ds::tool {
namespace {

constexpr std::size_t kLandmarks = 101;
constexpr std::size_t kBridgeUpper = 97;  // the bridge lies midway between the two
constexpr std::size_t kBridgeLower = 98;
constexpr std::size_t kPupil = 95;      // and the next
constexpr std::size_t kSizeFirst = 39;  // eyes and nose tell a person's size
constexpr std::size_t kSizeLast = 74;
constexpr Vector3 kForehead = {0, 105, 75};
constexpr Vector3 kEar = {76, 2, 14};
constexpr double kFaceWidth = 200;  // pixels

using Pixel = std::array<double, 2>;
using Attached = std::array<Vector3, 4>;
using AttachedPixels = std::array<Pixel, 4>;

Vector3 Midway(const Vector3& a, const Vector3& b) {
  return {(a[0] + b[0]) / 2, (a[1] + b[1]) / 2, (a[2] + b[2]) / 2};
}

Attached PointsOf(const Vector3& bridge, double size) {
  const auto scaled = [size](const Vector3& p) {
    return Vector3{size * p[0], size * p[1], size * p[2]};
  };
  return {bridge, scaled(kForehead), scaled(kEar), scaled({-kEar[0], kEar[1], kEar[2]})};
}

// Root mean square distance of the landmarks of eyes and nose from their middle.
double Spread(const std::vector<Vector3>& landmarks) {
  Vector3 middle{};
  constexpr double kCount = kSizeLast - kSizeFirst + 1;
  for (std::size_t k = kSizeFirst; k <= kSizeLast; ++k) {
    for (std::size_t a = 0; a < 3; ++a) middle[a] += landmarks[k][a] / kCount;
  }
  double squares = 0;
  for (std::size_t k = kSizeFirst; k <= kSizeLast; ++k) {
    const double distance = Length(landmarks[k] - middle);
    squares += distance * distance;
  }
  return std::sqrt(squares / kCount);
}

struct Person {
  Attached points;
  double pupils;      // mm between them
  double ear_to_ear;  // mm
};

// Everybody's landmarks in the head frame, averaged over the frames in which the truth has them.
std::map<std::int64_t, Person> MeasurePeople(const Track& track, const std::vector<Vector3>& mean) {
  struct Sum {
    std::vector<Vector3> landmarks = std::vector<Vector3>(kLandmarks);
    double count = 0;
  };
  std::map<std::int64_t, Sum> sums;
  for (const TrackFrame& frame : track.frames) {
    for (const TrackFace& face : frame.faces) {
      if (face.truth->points3d.empty()) continue;
      Sum& sum = sums[face.id];
      ++sum.count;
      for (std::size_t k = 0; k < kLandmarks; ++k) {
        Vector3 p;
        for (std::size_t a = 0; a < 3; ++a) {
          p[a] = face.truth->points3d[3 * k + a] - face.truth->translation[a];
        }
        p = Multiplied(Transposed(face.truth->rotation), p);
        for (std::size_t a = 0; a < 3; ++a) sum.landmarks[k][a] += p[a];
      }
    }
  }
  std::map<std::int64_t, Person> people;
  for (auto& [id, sum] : sums) {
    for (Vector3& p : sum.landmarks) {
      for (double& value : p) value /= sum.count;
    }
    const Vector3 bridge = Midway(sum.landmarks[kBridgeUpper], sum.landmarks[kBridgeLower]);
    const double size = Spread(sum.landmarks) / Spread(mean);
    people[id] = {PointsOf(bridge, size), Length(sum.landmarks[kPupil] - sum.landmarks[kPupil + 1]),
                  2 * size * kEar[0]};
  }
  return people;
}

AttachedPixels Project(const Attached& points, const Matrix3& rotation, const Vector3& translation,
                       double focal) {
  AttachedPixels pixels;
  for (std::size_t k = 0; k < points.size(); ++k) {
    Vector3 p = Multiplied(rotation, points[k]);
    for (std::size_t a = 0; a < 3; ++a) p[a] += translation[a];
    pixels[k] = {focal * p[0] / p[2], focal * p[1] / p[2]};
  }
  return pixels;
}

struct Sample {
  std::size_t frame;
  AttachedPixels error;
};

// Mean length of the second differences of three successive errors.
double SecondDifference(const Sample& a, const Sample& b, const Sample& c) {
  double sum = 0;
  for (std::size_t k = 0; k < a.error.size(); ++k) {
    const auto along = [&](std::size_t axis) {
      return a.error[k][axis] - 2 * b.error[k][axis] + c.error[k][axis];
    };
    sum += std::hypot(along(0), along(1));
  }
  return sum / static_cast<double>(a.error.size());
}

}  // namespace

void AddAttachment(const JudgedTrack& judged, const std::vector<Vector3>& mean,
                   AttachmentScore& score) {
  const Track& track = *judged.track;
  const auto people = MeasurePeople(track, mean);
  const Attached on_mean = PointsOf(Midway(mean[kBridgeUpper], mean[kBridgeLower]), 1);
  std::map<std::int64_t, std::vector<Sample>> history;
  for (std::size_t f = 0; f < track.frames.size(); ++f) {
    for (std::size_t i = 0; i < track.frames[f].faces.size(); ++i) {
      const TrackFace& face = track.frames[f].faces[i];
      const PoseEstimate& pose = (*judged.poses)[f][i];
      const auto person = people.find(face.id);
      if (!pose.valid || person == people.end()) continue;
      const double focal = *track.header.focal;
      const AttachedPixels truth =
          Project(person->second.points, face.truth->rotation, face.truth->translation, focal);
      AttachedPixels error =
          Project(on_mean, pose.rotation, pose.translation, judged.assumed_focal);
      double sum = 0;
      for (std::size_t k = 0; k < error.size(); ++k) {
        for (std::size_t a = 0; a < 2; ++a) error[k][a] -= truth[k][a];
        sum += std::hypot(error[k][0], error[k][1]) / static_cast<double>(error.size());
      }
      const double pixels_a_mm = focal / face.truth->translation[2];
      score.errors.push_back(100 * sum / (person->second.pupils * pixels_a_mm));
      std::vector<Sample>& past = history[face.id];
      past.push_back({f, error});
      const std::size_t n = past.size();
      if (n < 3 || past[n - 3].frame + 2 != f) continue;
      score.jitter.push_back(SecondDifference(past[n - 3], past[n - 2], past[n - 1]) * kFaceWidth /
                             (person->second.ear_to_ear * pixels_a_mm));
    }
  }
}

}  // namespace n3ds::tool
