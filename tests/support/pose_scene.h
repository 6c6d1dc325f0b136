// SPDX-License-Identifier: MIT
// A head of 95 points and images of it under known poses, for tests and benchmarks of the solver.
#pragma once

#include <array>
#include <cmath>
#include <vector>

#include "support/random.h"

namespace n3ds::testing {

using Pose = std::array<float, 7>;

constexpr int kHeadPoints = 95;

// Points of a made-up face in the order of the landmarks; x to the image right, y up, z out of the
// face, mm.
inline std::vector<float> MakeHead() {
  std::vector<float> points;
  const auto add = [&](double x, double y, double z) {
    for (const double v : {x, y, z}) points.push_back(static_cast<float>(v));
  };
  const auto add_ring = [&](double x, double y, double z, double rx, double ry, int count) {
    for (int i = 0; i < count; ++i) {
      const double a = 6.28318530717958648 * i / count;
      add(x - rx * std::cos(a), y + ry * std::sin(a), z - 4 * std::fabs(std::cos(a)));
    }
  };
  for (int i = 0; i < 19; ++i) {  // outline, from the temple at the image left over the chin
    const double a = 3.14159265358979324 * i / 18;
    add(-72 * std::cos(a), 25 - 120 * std::sin(a), 45 * std::sin(a) - 15);
  }
  add_ring(-32, 38, 48, 22, 4, 10);  // brows
  add_ring(32, 38, 48, -22, 4, 10);
  add_ring(-32, 20, 42, 15, 6, 12);  // eye at the image left, from its outer corner
  add_ring(32, 20, 42, 15, 6, 12);   // eye at the image right, from its inner corner
  for (int i = 0; i < 12; ++i) {     // nose, down one side and up the other
    const double side = i < 6 ? -1 : 1, down = i < 6 ? i : 11 - i;
    add(side * (5 + 2.5 * down), 18 - 8 * down, 52 + 4 * down);
  }
  add_ring(0, -50, 55, 26, 10, 12);  // lips
  add_ring(0, -50, 56, 18, 4, 8);
  return points;
}

// The camera the tracker gives an image of this size.
inline std::array<float, 9> MakeCamera(int width, int height) {
  const float focal = static_cast<float>(width + height) / 2;
  return {focal, 0, static_cast<float>(width) / 2, 0, focal, static_cast<float>(height) / 2, 0,
          0,     1};
}

// A face that looks at the camera, turned by angles in radians (about the image's x, y and z axes)
// and moved by a translation in mm.
inline Pose MakePose(float about_x, float about_y, float about_z, float tx, float ty, float tz) {
  const float euler[3] = {about_x, about_y, about_z};
  float q[4];
  EulerToQuat(euler, q);
  // The model's y goes up and its z to the viewer: a half turn about x comes first, q (0,1,0,0).
  return {-q[1], q[0], q[3], -q[2], tx, ty, tz};
}

// Bounds of a random pose: angles in radians about the image's axes, shift in mm.
struct PoseRange {
  float about_x, about_y, about_z, x, y, nearest, farthest;
};

inline Pose RandomPose(Random& random,
                       const PoseRange& range = {0.3f, 0.7f, 0.3f, 100, 80, 400, 1200}) {
  // One after the other: compilers differ in the order in which they evaluate arguments.
  const auto within = [&](float bound) { return random.Float(-bound, bound); };
  const float about_x = within(range.about_x), about_y = within(range.about_y);
  const float about_z = within(range.about_z), x = within(range.x), y = within(range.y);
  return MakePose(about_x, about_y, about_z, x, y, random.Float(range.nearest, range.farthest));
}

// The landmarks of a pose in double, rounded to float.
inline std::vector<float> Project(const std::vector<float>& model,
                                  const std::array<float, 9>& camera, const Pose& pose) {
  const double w = pose[0], x = pose[1], y = pose[2], z = pose[3];
  std::vector<float> landmarks;
  for (size_t i = 0; i < model.size(); i += 3) {
    const double X = model[i], Y = model[i + 1], Z = model[i + 2];
    const double xc = (w * w + x * x - y * y - z * z) * X + 2 * (x * y - w * z) * Y +
                      2 * (x * z + w * y) * Z + pose[4];
    const double yc = 2 * (x * y + w * z) * X + (w * w - x * x + y * y - z * z) * Y +
                      2 * (y * z - w * x) * Z + pose[5];
    const double zc = 2 * (x * z - w * y) * X + 2 * (y * z + w * x) * Y +
                      (w * w - x * x - y * y + z * z) * Z + pose[6];
    landmarks.push_back(static_cast<float>(camera[0] * xc / zc + camera[2]));
    landmarks.push_back(static_cast<float>(camera[4] * yc / zc + camera[5]));
  }
  return landmarks;
}

// The same pose with a quaternion of unit length: the translation takes the scale.
inline Pose Normalised(Pose pose) {
  const float n = pose[0] * pose[0] + pose[1] * pose[1] + pose[2] * pose[2] + pose[3] * pose[3];
  for (int i = 0; i < 4; ++i) pose[i] /= std::sqrt(n);
  for (int i = 4; i < 7; ++i) pose[i] /= n;
  return pose;
}

// The angle between the rotations of two poses of unit length, radians.
inline float AngleBetween(const Pose& a, const Pose& b) {
  float dot = 0;
  for (int i = 0; i < 4; ++i) dot += a[i] * b[i];
  return 2 * std::acos(std::min(1.0f, std::fabs(dot)));
}

}  // namespace n3ds::testing
