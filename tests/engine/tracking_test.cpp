// SPDX-License-Identifier: MIT
// Tracking against the truth of the synthetic example tracks: poses within bounds, nobody lost,
// nobody taken for somebody else.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <map>
#include <ostream>
#include <string>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "norvale_3d_sticker_engine.h"
#include "tracks/track_file.h"
#include "tracks/upright.h"
namespace n3ds::testing {

namespace {

using n3ds::tool::Track;
using n3ds::tool::TrackFace;
using n3ds::tool::TrackFrame;

struct Bounds {
  const char* track;
  double median_degrees;
  double largest_degrees;
  double largest_jump_degrees;  // from one frame to the next, beyond what the head turned
};
void PrintTo(const Bounds& bounds, std::ostream* out) { *out << bounds.track; }

// One face's estimate in the camera frame (x right, y down, z forward).
struct Pose {
  float rotation[9];
  double translation[3];
};

Pose CameraPose(const Norvale_3DSticker_Face_Matrix& face) {
  constexpr float kFlip[3] = {1.0f, -1.0f, -1.0f};
  Pose pose;
  for (int row = 0; row < 3; row++) {
    for (int column = 0; column < 3; column++) {
      pose.rotation[3 * row + column] = kFlip[row] * face.modelMatrix[4 * column + row];
    }
    pose.translation[row] =
        static_cast<double>(kFlip[row] * (face.modelMatrix[12 + row] + face.viewMatrix[12 + row]));
  }
  return pose;
}

double DegreesBetween(const std::array<double, 9>& truth, const float* estimate) {
  double trace = 0;
  double scale = 0;  // the smoothed rotation is a rotation up to its length
  for (size_t i = 0; i < 9; i++) {
    trace += truth[i] * static_cast<double>(estimate[i]);
    scale += static_cast<double>(estimate[i]) * static_cast<double>(estimate[i]);
  }
  const double cosine = (trace / std::sqrt(scale / 3.0) - 1.0) / 2.0;
  return std::acos(std::min(1.0, std::max(-1.0, cosine))) * 180.0 / 3.14159265358979;
}

class Tracking : public ::testing::TestWithParam<Bounds> {};

TEST_P(Tracking, FollowsTheTruth) {
  const Track track = n3ds::tool::ReadTrackFile(std::string(N3DS_SOURCE_DIR) + "/examples/tracks/" +
                                                GetParam().track + ".track.jsonl");
  ASSERT_TRUE(track.HasTruth());
  const double assumed_focal = (track.header.width + track.header.height) / 2.0;
  void* engine = Norvale_3DSticker_CreateEngine();
  ASSERT_EQ(Norvale_3DSticker_Initialize(engine, N3DS_SOURCE_DIR "/data/face_model.bin",
                                         static_cast<uint32_t>(track.header.degree),
                                         static_cast<uint32_t>(track.header.mirror)),
            N3DS_OK);
  NSVL_OFFSCREEN image = {};
  image.width = track.header.width;
  image.height = track.header.height;
  const auto landmarks = static_cast<uint32_t>(track.header.landmarks);
  std::vector<float> points_3d(3 * N3DS_MAX_FACES * static_cast<size_t>(landmarks));
  Norvale_3DSticker_Matrix_Array out = {};
  for (size_t k = 0; k < N3DS_MAX_FACES; k++) {
    out.faces[k].landmarks3D = points_3d.data() + 3 * k * landmarks;
  }

  std::vector<double> errors;
  std::map<int64_t, double> last_error;
  for (const TrackFrame& frame : track.frames) {
    std::vector<__tag_point> points;
    for (const TrackFace& face : frame.faces) {
      for (size_t i = 0; i < face.points.size(); i += 2) {
        points.push_back({face.points[i], face.points[i + 1]});
      }
    }
    ASSERT_EQ(Norvale_3DSticker_Process(engine, &image, static_cast<uint32_t>(frame.faces.size()),
                                        landmarks, points.data(), nullptr, nullptr, &out),
              N3DS_OK);
    std::map<int64_t, double> error;
    for (size_t k = 0; k < frame.faces.size(); k++) {
      const Pose pose = CameraPose(out.faces[k]);
      const TrackFace& face = frame.faces[k];
      errors.push_back(DegreesBetween(face.truth->rotation, pose.rotation));
      error[face.id] = errors.back();
      EXPECT_LT(errors.back(), GetParam().largest_degrees)
          << "person " << face.id << " in frame " << frame.number;
      if (last_error.count(face.id) != 0) {
        EXPECT_LT(std::fabs(errors.back() - last_error[face.id]), GetParam().largest_jump_degrees)
            << "person " << face.id << " in frame " << frame.number;
      }

      // Nearer to this person's place in the image than to any other's.
      const auto distance = [&](const TrackFace& other) {
        const double focal_ratio = *track.header.focal / assumed_focal;
        const double x = pose.translation[0] / pose.translation[2] / focal_ratio;
        const double y = pose.translation[1] / pose.translation[2] / focal_ratio;
        return std::hypot(x - other.truth->translation[0] / other.truth->translation[2],
                          y - other.truth->translation[1] / other.truth->translation[2]);
      };
      for (const TrackFace& other : frame.faces) {
        if (other.id == face.id) continue;
        EXPECT_LT(distance(face), distance(other))
            << "person " << face.id << " in frame " << frame.number;
      }
    }
    last_error = error;
  }
  Norvale_3DSticker_DestroyEngine(engine);
  std::sort(errors.begin(), errors.end());
  EXPECT_LT(errors[errors.size() / 2], GetParam().median_degrees);
}

constexpr Bounds kBounds[] = {
    {"synthetic_natural", 3.5, 8.0, 4.0},     {"synthetic_talk_165", 5.0, 10.0, 4.0},
    {"synthetic_yaw_sweep", 4.5, 8.0, 4.0},   {"synthetic_three", 3.5, 10.0, 6.0},
    {"synthetic_five_cross", 4.0, 12.0, 7.0}, {"synthetic_mirror_portrait", 4.0, 8.0, 4.0},
};

INSTANTIATE_TEST_SUITE_P(, Tracking, ::testing::ValuesIn(kBounds),
                         [](const auto& bounds) { return std::string(bounds.param.track); });

}  // namespace
}  // namespace n3ds::testing
