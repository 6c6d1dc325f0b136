// SPDX-License-Identifier: MIT
// Problems for the pose solver: a face of 95 points in an image of 1280 x 720, its landmarks
// rounded to pixels with noise, and as start the pose of the frame before.
#pragma once

#include <array>
#include <cmath>
#include <vector>

#include "math/pose_residuals.h"
#include "support/pose_scene.h"

namespace n3ds::bench {

using testing::Pose;

constexpr float kDegree = 3.14159265f / 180;

struct Problem {
  Pose truth, start;
  std::vector<float> landmarks;
};

struct ProblemSet {
  std::vector<float> model = testing::MakeHead();
  std::array<float, 9> camera = testing::MakeCamera(1280, 720);
  std::vector<Problem> problems;

  ProblemSet() {
    testing::Random random(11);
    for (int i = 0; i < 256; ++i) {
      Problem p;
      float angles[3], place[3];
      for (float& a : angles) a = random.Float(-0.4f, 0.4f);
      for (float& v : place) v = random.Float(-80, 80);
      const auto pose = [&] {
        return testing::MakePose(angles[0], angles[1], angles[2], place[0], place[1],
                                 600 + place[2]);
      };
      p.truth = pose();
      p.landmarks = testing::Project(model, camera, p.truth);
      for (float& v : p.landmarks) v = std::floor(v + 0.5f * random.Normal() + 0.5f);
      // What a head does from one frame to the next.
      for (float& a : angles) a += random.Float(-2, 2) * kDegree;
      for (float& v : place) v += random.Float(-5, 5);
      p.start = pose();
      problems.push_back(p);
    }
  }
  static const ProblemSet& Get() {
    static const ProblemSet set;
    return set;
  }
  PoseProblem For(const Problem& p) const {
    return {p.landmarks.data(), model.data(), testing::kHeadPoints, camera.data(), 1, 1, 0, 1,
            kPoseSize};
  }
};

}  // namespace n3ds::bench
