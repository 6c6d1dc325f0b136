// SPDX-License-Identifier: MIT
#include "steady/start.h"

#include <gtest/gtest.h>

#include <cmath>

#include "steady/steady_testing.h"

namespace n3ds::testing {
namespace {

using namespace steady;

struct Started {
  std::unique_ptr<Face> face = std::make_unique<Face>();
  float cost = 0;
};

Started Start(const std::vector<int32_t>& landmarks) {
  const auto work = MakeWorkspace();
  const auto scratch = std::make_unique<StartScratch>();
  const Seen seen(landmarks);
  Started result;
  result.cost = StartFace({SharedModel(), BestKernels(), work.get()}, seen.get(), nullptr,
                          scratch.get(), result.face.get());
  return result;
}

TEST(SteadyStart, FindsAPersonInAnyPose) {
  const std::vector<double> identity = {0.1, -0.08, 0.05, 0.1, -0.03};
  for (const double yaw : {-0.4, -0.15, 0.0, 0.2, 0.4}) {
    for (const double roll : {-1.0, 0.0, 0.3, 1.0}) {
      for (const double z : {400.0, 900.0}) {
        const HeadPlace place = {yaw, 0.05, roll, 40, -30, z};
        const Started started = Start(Landmarks(place, 101, identity));
        ASSERT_TRUE(started.face->valid) << yaw << " " << roll << " " << z;
        EXPECT_LT(DegreesBetween(started.face->mean.rotation.m, TransformOf(place).r), 3)
            << yaw << " " << roll << " " << z;
      }
    }
  }
}

TEST(SteadyStart, KnowsThatALandmarkCloudIsNoFace) {
  Random random = TestRandom();
  for (int i = 0; i < 20; i++) {
    std::vector<int32_t> landmarks(202);
    for (int32_t& c : landmarks) c = random.Int(0, 700);
    const Started started = Start(landmarks);
    EXPECT_EQ(started.cost, kNoFit);
    EXPECT_FALSE(started.face->valid);
    for (const float value : started.face->mean.rotation.m) EXPECT_TRUE(std::isfinite(value));
    for (const float value : started.face->mean.place) EXPECT_TRUE(std::isfinite(value));
  }
}

TEST(SteadyStart, CovarianceIsSymmetricAndKnowsLittleOfTheMotion) {
  const Started started = Start(Landmarks({}));
  const auto& c = started.face->covariance;
  for (int i = 0; i < kStateSize; i++) {
    EXPECT_GT(c[i][i], 0) << i;
    for (int j = 0; j < kStateSize; j++) EXPECT_EQ(c[i][j], c[j][i]);
  }
  EXPECT_GT(c[kSpeedAt][kSpeedAt], c[0][0]);
}

}  // namespace
}  // namespace n3ds::testing
