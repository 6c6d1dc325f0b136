// SPDX-License-Identifier: MIT
// Metrics on made-up tracks whose pose errors are known exactly.
#include "eval/metrics.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>
#include <utility>

#include "eval/rotation.h"
#include "support/statistics.h"

namespace n3ds::tool {
namespace {

using ::testing::DoubleNear;
using ::testing::Each;

const Matrix3 kFrontal = {1, 0, 0, 0, -1, 0, 0, 0, -1};

// A head that turns left and right (about y, by up to `swing` degrees), nods and moves sideways.
struct HeadMotion {
  double swing = 30;
  double period = 60;  // frames
  Vector3 place = {50, -30, 900};
  double travel = 80;

  Matrix3 Rotation(double frame) const {
    const double phase = 2 * M_PI * frame / period;
    return Multiplied(kFrontal,
                      Multiplied(RotationAbout({0, 1, 0}, swing * std::sin(phase)),
                                 RotationAbout({1, 0, 0}, swing / 6 * std::cos(2 * phase))));
  }
  Vector3 Translation(double frame) const {
    const double phase = 2 * M_PI * frame / period;
    return {place[0] + travel * std::sin(phase), place[1],
            place[2] + 0.3 * travel * std::cos(phase)};
  }
};

TrackHeader Header() {
  TrackHeader header;
  header.width = 1280;
  header.height = 720;
  header.fps = 30;
  header.landmarks = 101;
  header.focal = 1000;
  return header;
}

void AddPerson(Track& track, std::int64_t id, const HeadMotion& motion, int frames) {
  track.frames.resize(std::max<std::size_t>(track.frames.size(), static_cast<std::size_t>(frames)));
  for (int f = 0; f < frames; ++f) {
    TrackFace face;
    face.id = id;
    face.truth = TrackTruth{motion.Rotation(f), motion.Translation(f), {}};
    track.frames[static_cast<std::size_t>(f)].number = f;
    track.frames[static_cast<std::size_t>(f)].faces.push_back(face);
  }
}

Track OnePerson(const HeadMotion& motion, int frames = 240) {
  Track track;
  track.header = Header();
  AddPerson(track, 3, motion, frames);
  return track;
}

TrackPoses TruePoses(const Track& track) {
  TrackPoses poses;
  for (const TrackFrame& frame : track.frames) {
    poses.emplace_back();
    for (const TrackFace& face : frame.faces) {
      poses.back().push_back({true, face.truth->rotation, face.truth->translation});
    }
  }
  return poses;
}

JudgedTrack Judged(const Track& track, const TrackPoses& poses) { return {&track, &poses, 1000}; }

Score ScoreWithoutOffset(const Track& track, const TrackPoses& poses) {
  return ScoreTrack(Judged(track, poses), {});
}

std::vector<double> Rotations(const Score& score) { return score.RotationErrors(180); }

TEST(Metrics, TruthHasNoError) {
  const Track track = OnePerson({});
  const Score score = ScoreWithoutOffset(track, TruePoses(track));
  EXPECT_EQ(score.faces, 240u);
  EXPECT_EQ(score.lost + score.swaps + score.jumps, 0u);
  EXPECT_THAT(Rotations(score), Each(DoubleNear(0, 1e-9)));
  for (const PoseError& error : score.errors) {
    EXPECT_NEAR(error.across, 0, 1e-9);
    EXPECT_NEAR(error.depth, 0, 1e-9);
  }
  EXPECT_NEAR(score.Lag(), 0, 1e-9);
}

TEST(Metrics, MeasuresAKnownRotationError) {
  const Track track = OnePerson({});
  TrackPoses poses = TruePoses(track);
  for (auto& frame : poses) {
    frame[0].rotation = Multiplied(frame[0].rotation, RotationAbout({1, 2, -1}, 3.5));
  }
  EXPECT_THAT(Rotations(ScoreWithoutOffset(track, poses)), Each(DoubleNear(3.5, 1e-9)));
}

TEST(Metrics, TakesOffAConstantHeadFrameOffset) {
  const Track track = OnePerson({});
  const Matrix3 turn = RotationAbout({0.3, 1, -0.2}, 7);
  const Vector3 shift = {2, 15, -40};
  TrackPoses poses = TruePoses(track);
  for (auto& frame : poses) {
    // The same head described in axes that are turned by `turn` and whose origin lies where the
    // track's head frame has `shift`.
    const Vector3 moved = Multiplied(frame[0].rotation, shift);
    for (std::size_t a = 0; a < 3; ++a) frame[0].translation[a] += moved[a];
    frame[0].rotation = Multiplied(frame[0].rotation, turn);
  }
  const HeadFrameOffset offset = EstimateOffset({Judged(track, poses)});
  EXPECT_NEAR(RotationAngle(Multiplied(Transposed(offset.rotation), turn)), 0, 1e-9);
  const Vector3 expected = Multiplied(Transposed(turn), shift);
  for (std::size_t a = 0; a < 3; ++a) EXPECT_NEAR(offset.origin[a], -expected[a], 1e-6);
  const Score score = ScoreTrack(Judged(track, poses), offset);
  EXPECT_THAT(Rotations(score), Each(DoubleNear(0, 1e-9)));
  for (const PoseError& error : score.errors) EXPECT_NEAR(error.across, 0, 1e-6);
}

TEST(Metrics, OffsetIsOneForAllTracks) {
  const Track a = OnePerson({});
  const Track b = OnePerson({});
  TrackPoses poses_a = TruePoses(a);
  TrackPoses poses_b = TruePoses(b);
  for (auto& frame : poses_a) {
    frame[0].rotation = Multiplied(frame[0].rotation, RotationAbout({0, 1, 0}, 4));
  }
  for (auto& frame : poses_b) {
    frame[0].rotation = Multiplied(frame[0].rotation, RotationAbout({0, 1, 0}, -2));
  }
  const HeadFrameOffset offset = EstimateOffset({Judged(a, poses_a), Judged(b, poses_b)});
  EXPECT_NEAR(RotationAngle(offset.rotation), 1, 1e-6);
  EXPECT_THAT(Rotations(ScoreTrack(Judged(a, poses_a), offset)), Each(DoubleNear(3, 1e-6)));
}

TEST(Metrics, OffsetDoesNotFollowAWrongDepth) {
  const Track track = OnePerson({});
  TrackPoses poses = TruePoses(track);
  for (auto& frame : poses) {
    for (double& value : frame[0].translation) value *= 1.1;
  }
  const HeadFrameOffset offset = EstimateOffset({Judged(track, poses)});
  EXPECT_NEAR(Length(offset.origin), 0, 1e-6);
  for (const PoseError& error : ScoreTrack(Judged(track, poses), offset).errors) {
    EXPECT_NEAR(error.depth, 10, 1e-6);
    EXPECT_NEAR(error.across, 0, 1e-6);
  }
}

TEST(Metrics, MeasuresAcrossAtTheTrueDepth) {
  const Track track = OnePerson({});
  TrackPoses poses = TruePoses(track);
  for (auto& frame : poses) {
    frame[0].translation[0] += 3;
    frame[0].translation[1] -= 4;
  }
  for (const PoseError& error : ScoreWithoutOffset(track, poses).errors) {
    EXPECT_NEAR(error.across, 5, 1e-9);
    EXPECT_NEAR(error.depth, 0, 1e-9);
  }
}

TEST(Metrics, ScalesDepthByTheFocalLengths) {
  Track track = OnePerson({});
  track.header.focal = 1250;
  TrackPoses poses = TruePoses(track);
  // With 1000 instead of 1250 the head seems nearer; x and y stay, because u = f x / z does.
  for (auto& frame : poses) frame[0].translation[2] *= 1000.0 / 1250;
  for (const PoseError& error : ScoreWithoutOffset(track, poses).errors) {
    EXPECT_NEAR(error.depth, 0, 1e-9);
    EXPECT_NEAR(error.across, 0, 1e-9);
  }
}

TEST(Metrics, SortsErrorsByTheTrueYaw) {
  HeadMotion motion;
  motion.swing = 50;
  const Track track = OnePerson(motion);
  TrackPoses poses = TruePoses(track);
  std::size_t within = 0;
  for (std::size_t f = 0; f < poses.size(); ++f) {
    const double yaw = 50 * std::sin(2 * M_PI * static_cast<double>(f) / 60);
    if (std::abs(yaw) <= 19.9) ++within;
    const double error = std::abs(yaw) <= 19.9 ? 1 : 6;
    poses[f][0].rotation = Multiplied(poses[f][0].rotation, RotationAbout({0, 0, 1}, error));
  }
  const Score score = ScoreWithoutOffset(track, poses);
  EXPECT_THAT(score.RotationErrors(19.9), Each(DoubleNear(1, 1e-9)));
  EXPECT_NEAR(static_cast<double>(score.RotationErrors(19.9).size()), static_cast<double>(within),
              4);
  EXPECT_EQ(score.RotationErrors(60).size(), 240u);
  EXPECT_NEAR(Percentile(score.RotationErrors(60), 0.95), 6, 1e-9);
}

TEST(Metrics, FindsTheLag) {
  HeadMotion motion;
  motion.swing = 12;
  motion.period = 90;
  const Track track = OnePerson(motion, 360);
  for (const double frames : {0.0, 0.5, 1.0, 2.0, -1.0}) {
    TrackPoses poses;
    for (int f = 0; f < 360; ++f) {
      poses.push_back({{true, motion.Rotation(f - frames), motion.Translation(f - frames)}});
    }
    EXPECT_NEAR(ScoreWithoutOffset(track, poses).Lag(), frames / 30, 0.002) << frames;
  }
}

TEST(Metrics, LagIgnoresAConstantError) {
  HeadMotion motion;
  motion.swing = 12;
  const Track track = OnePerson(motion);
  TrackPoses poses = TruePoses(track);
  for (auto& frame : poses) {
    frame[0].rotation = Multiplied(frame[0].rotation, RotationAbout({0, 1, 0}, 5));
  }
  EXPECT_NEAR(ScoreWithoutOffset(track, poses).Lag(), 0, 0.002);
}

TEST(Metrics, JitterIsTheChangeOfTheErrorAtRest) {
  HeadMotion motion;
  motion.swing = 0.5;  // at most 1.6 degrees and 8 mm a second
  motion.travel = 0.5;
  const Track still = OnePerson(motion);
  TrackPoses poses = TruePoses(still);
  for (std::size_t f = 0; f < poses.size(); ++f) {
    const double sign = f % 2 == 0 ? 1 : -1;
    poses[f][0].rotation = Multiplied(poses[f][0].rotation, RotationAbout({0, 1, 0}, sign * 0.2));
    poses[f][0].translation[0] += sign * 0.3;
  }
  const Score score = ScoreWithoutOffset(still, poses);
  EXPECT_EQ(score.rest_rotation.size(), 239u);
  EXPECT_THAT(score.rest_rotation, Each(DoubleNear(0.4, 1e-9)));
  EXPECT_THAT(score.rest_across, Each(DoubleNear(0.6, 1e-9)));

  HeadMotion fast;
  fast.swing = 40;
  fast.travel = 400;
  const Track moving = OnePerson(fast);
  EXPECT_LT(ScoreWithoutOffset(moving, TruePoses(moving)).rest_rotation.size(), 10u);
}

TEST(Metrics, CountsLostPosesAndLeavesInvalidOnesOut) {
  const Track track = OnePerson({});
  TrackPoses poses = TruePoses(track);
  for (std::size_t f = 10; f < 15; ++f) poses[f][0].valid = false;
  for (std::size_t f = 50; f < 53; ++f) {
    poses[f][0].rotation = Multiplied(poses[f][0].rotation, RotationAbout({0, 1, 0}, 90));
  }
  const Score score = ScoreWithoutOffset(track, poses);
  EXPECT_EQ(score.faces, 240u);
  EXPECT_EQ(score.lost, 8u);
  EXPECT_EQ(score.errors.size(), 235u);
}

TEST(Metrics, CountsJumpsOfRotationPlaceAndDepth) {
  const Track track = OnePerson({});
  const auto jumps = [&](const std::function<void(PoseEstimate&)>& spoil) {
    TrackPoses poses = TruePoses(track);
    spoil(poses[100][0]);  // jumps there and back
    return ScoreWithoutOffset(track, poses).jumps;
  };
  const auto turned = [](double degrees) {
    return [degrees](PoseEstimate& pose) {
      pose.rotation = Multiplied(pose.rotation, RotationAbout({1, 0, 0}, degrees));
    };
  };
  EXPECT_EQ(jumps(turned(9)), 2u);
  EXPECT_EQ(jumps(turned(7)), 0u);
  EXPECT_EQ(jumps([](PoseEstimate& pose) { pose.translation[1] += 30; }), 2u);
  EXPECT_EQ(jumps([](PoseEstimate& pose) { pose.translation[1] += 20; }), 0u);
  EXPECT_EQ(jumps([](PoseEstimate& pose) {
              for (double& value : pose.translation) value *= 1.2;
            }),
            2u);
}

TEST(Metrics, CountsSwapsWhenPeopleCross) {
  Track track;
  track.header = Header();
  HeadMotion left;
  left.place = {-150, 0, 900};
  HeadMotion right;
  right.place = {150, 0, 1100};
  AddPerson(track, 0, left, 120);
  AddPerson(track, 1, right, 120);
  TrackPoses poses = TruePoses(track);
  EXPECT_EQ(ScoreWithoutOffset(track, poses).swaps, 0u);
  for (std::size_t f = 40; f < 50; ++f) std::swap(poses[f][0], poses[f][1]);
  const Score score = ScoreWithoutOffset(track, poses);
  EXPECT_EQ(score.swaps, 20u);
  EXPECT_EQ(score.jumps, 4u);  // both, when it starts and when it ends
}

TEST(Metrics, FollowsAPersonThroughChangesOfOrderAndGaps) {
  Track track;
  track.header = Header();
  HeadMotion left;
  left.place = {-200, 0, 900};
  HeadMotion right;
  right.place = {200, 0, 1500};
  AddPerson(track, 0, left, 100);
  AddPerson(track, 1, right, 100);
  for (std::size_t f = 0; f < 100; f += 2) {
    std::swap(track.frames[f].faces[0], track.frames[f].faces[1]);
  }
  // Person 1 is away for a while and comes back elsewhere, which is no jump of the estimate.
  for (std::size_t f = 40; f < 60; ++f) {
    auto& faces = track.frames[f].faces;
    faces.erase(faces.begin() + (faces[0].id == 1 ? 0 : 1));
  }
  const Score score = ScoreWithoutOffset(track, TruePoses(track));
  EXPECT_EQ(score.faces, 180u);
  EXPECT_EQ(score.jumps + score.swaps + score.lost, 0u);
}

TEST(Metrics, AddingScoresKeepsAllSamples) {
  const Track track = OnePerson({});
  const Score one = ScoreWithoutOffset(track, TruePoses(track));
  Score all = one;
  all.Add(one);
  EXPECT_EQ(all.faces, 480u);
  EXPECT_EQ(all.errors.size(), 480u);
  EXPECT_EQ(all.Lag(), one.Lag());
}

TEST(Metrics, ReadsThePoseFromOpenGlMatrices) {
  FaceResult face;
  // Head frame to eye space: a frontal head 800 mm before the viewer, split as the engine does.
  face.view = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, -500, 1};
  face.model = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 20, -30, -300, 1};
  const PoseEstimate pose = CameraPose(face);
  ASSERT_TRUE(pose.valid);
  EXPECT_EQ(pose.rotation, kFrontal);
  EXPECT_EQ(pose.translation, (Vector3{20, 30, 800}));

  face.model[14] = 501;  // behind the viewer
  EXPECT_FALSE(CameraPose(face).valid);
  face.model[14] = std::numeric_limits<float>::quiet_NaN();
  EXPECT_FALSE(CameraPose(face).valid);
}

TEST(Metrics, AFailedFrameGivesInvalidPoses) {
  const Track track = OnePerson({}, 3);
  std::vector<FrameResult> results(3);
  const TrackPoses poses = CameraPoses(track, results);
  ASSERT_EQ(poses.size(), 3u);
  ASSERT_EQ(poses[1].size(), 1u);
  EXPECT_FALSE(poses[1][0].valid);
  EXPECT_EQ(ScoreTrack(Judged(track, poses), EstimateOffset({Judged(track, poses)})).lost, 3u);
}

TEST(Rotation, VectorIsExactForSmallAndLargeAngles) {
  for (const double degrees : {0.0, 1e-9, 1e-3, 30.0, 90.0, 179.0, 179.999}) {
    const Vector3 v = RotationVector(RotationAbout({0, 3, 4}, degrees));
    EXPECT_NEAR(v[0], 0, 1e-9);
    EXPECT_NEAR(v[1], 0.6 * degrees, 1e-9 + 1e-6 * degrees);
    EXPECT_NEAR(v[2], 0.8 * degrees, 1e-9 + 1e-6 * degrees);
  }
  EXPECT_NEAR(RotationAngle(RotationAbout({1, 1, 1}, 180)), 180, 1e-6);
}

TEST(Rotation, MeanOfSymmetricDeviationsIsTheMiddle) {
  const Matrix3 middle = RotationAbout({1, -2, 0.5}, 100);
  std::vector<Matrix3> rotations;
  for (const double degrees : {-20.0, -5.0, 5.0, 20.0}) {
    rotations.push_back(Multiplied(middle, RotationAbout({0, 1, 0}, degrees)));
    rotations.push_back(Multiplied(middle, RotationAbout({1, 0, 0}, degrees)));
  }
  const Matrix3 mean = MeanRotation(rotations);
  EXPECT_NEAR(RotationAngle(Multiplied(Transposed(middle), mean)), 0, 1e-9);
}

TEST(Statistics, PercentileIsTheNearestRank) {
  EXPECT_EQ(Percentile({}, 0.5), 0);
  EXPECT_EQ(Percentile({7}, 0.99), 7);
  EXPECT_EQ(Percentile({4, 1, 3, 2}, 0.5), 2);
  EXPECT_EQ(Percentile({4, 1, 3, 2}, 0.51), 3);
  EXPECT_EQ(Percentile({4, 1, 3, 2}, 1.0), 4);
  EXPECT_EQ(Percentile({4, 1, 3, 2}, 0.0), 1);
  EXPECT_DOUBLE_EQ(RootMeanSquare({3, -4, 0, 0}), 2.5);
}

}  // namespace
}  // namespace n3ds::tool
