// SPDX-License-Identifier: MIT
// Whole tracks of generated people: where their heads are, who they are, and what happens when
// landmarks are wrong.
#include "steady/tracker.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <set>

#include "steady/steady_testing.h"
#include "steady/tracker_output.h"

namespace n3ds::testing {
namespace {

using namespace steady;
using Faces = std::vector<std::vector<int32_t>>;

class Host {
 public:
  explicit Host(bool threads = false)
      : threads_(threads), tracker_(std::make_unique<Tracker>(SharedCore().context(), &ids_)) {}

  void Frame(const Faces& faces, double seconds = 1 / 30.0) {
    FaceRecords records(faces);
    FrameInput input;
    input.width = kWidth;
    input.height = kHeight;
    input.focal = 1000;
    input.seconds = seconds;
    input.smoothing = 0.5f;
    input.threads = threads_;
    input.face_count = static_cast<uint32_t>(faces.size());
    input.faces = records.get();
    tracker_->Track(input);
    for (uint32_t k = 0; k < tracker_->face_count(); k++) ExpectFinite(face(k));
  }
  const Face& face(uint32_t k = 0) const { return tracker_->face(k); }
  uint64_t id(uint32_t k = 0) const { return tracker_->face(k).id; }
  OutputFrame Output(uint32_t k = 0) const { return OutputFrameOf(tracker_->model(), face(k)); }

 private:
  static void ExpectFinite(const Face& face) {
    const OutputFrame frame = OutputFrameOf(SharedModel(), face);
    for (const float value : frame.rotation.m) ASSERT_TRUE(std::isfinite(value));
    for (const float value : frame.translation) ASSERT_TRUE(std::isfinite(value));
    for (const auto& axis : face.point) {
      for (const float value : axis) ASSERT_TRUE(std::isfinite(value));
    }
    ASSERT_GE(face.confidence, 0);
    ASSERT_LE(face.confidence, 1);
  }

  bool threads_;
  uint64_t ids_ = 0;
  std::unique_ptr<Tracker> tracker_;
};

// A person whose identity is as large as people's are: Person's are far outside the population.
std::vector<double> Identity(uint64_t seed) {
  Random random(seed);
  std::vector<double> identity(kIdentityCount);
  for (double& a : identity) a = random.In(-0.2, 0.2);
  return identity;
}

HeadPlace PlaceAt(int frame) {
  const double t = frame / 90.0;
  return {0.25 * Wave(t),     0.1 * Wave(1.3 * t + 0.2), 0.08 * Wave(0.7 * t),
          25 * Wave(0.9 * t), 15 * Wave(1.1 * t),        550 + 40 * Wave(0.5 * t)};
}

std::vector<int32_t> Moving(uint64_t seed, int frame, int landmarks = 101) {
  return Landmarks(PlaceAt(frame), landmarks, Identity(seed));
}

TEST(SteadyTracker, FollowsATurningHead) {
  for (const int landmarks : {101, 165}) {
    Host run;
    for (int frame = 0; frame < 150; frame++) {
      run.Frame({Moving(1, frame, landmarks)});
      EXPECT_EQ(run.id(), 1u);
      EXPECT_GT(run.face().confidence, 0.8f) << frame;
      if (frame < 30) continue;
      EXPECT_LT(DegreesBetween(run.face().mean.rotation.m, TransformOf(PlaceAt(frame)).r), 1.5)
          << frame;
    }
  }
}

TEST(SteadyTracker, LearnsThePersonWithinTwoSecondsAndKeepsThem) {
  Host run;
  for (int frame = 0; frame < 60; frame++) run.Frame({Moving(2, frame)});
  const StateMean learnt = run.face().mean;
  for (int frame = 60; frame < 160; frame++) run.Frame({Moving(2, frame)});
  double moved = 0;
  double size = 0;
  for (int k = 0; k < kIdentityCount; k++) {
    const double d = static_cast<double>(run.face().mean.identity[k] - learnt.identity[k]);
    moved += d * d;
    size += static_cast<double>(learnt.identity[k]) * static_cast<double>(learnt.identity[k]);
  }
  EXPECT_LT(moved, 0.1 * size);
}

TEST(SteadyTracker, AFaceLostForASecondIsKnownAgain) {
  Host run;
  for (int frame = 0; frame < 90; frame++) run.Frame({Moving(3, frame)});
  const uint64_t id = run.id();
  const StateMean before = run.face().mean;
  for (int frame = 90; frame < 120; frame++) run.Frame({});
  run.Frame({Moving(3, 120)});
  EXPECT_EQ(run.id(), id);
  double off = 0;
  for (int k = 0; k < kIdentityCount; k++) {
    off += std::fabs(static_cast<double>(run.face().mean.identity[k] - before.identity[k]));
  }
  EXPECT_LT(off / kIdentityCount, 0.1);
}

TEST(SteadyTracker, AFaceLostForThreeSecondsIsNew) {
  Host run;
  for (int frame = 0; frame < 60; frame++) run.Frame({Moving(3, frame)});
  for (int frame = 60; frame < 150; frame++) run.Frame({});
  run.Frame({Moving(3, 150)});
  EXPECT_EQ(run.id(), 2u);
}

TEST(SteadyTracker, AnotherPersonIsNotTakenForTheOneWhoLeft) {
  for (uint64_t other = 10; other < 20; other++) {
    Host run;
    for (int frame = 0; frame < 60; frame++) run.Frame({Moving(3, frame)});
    for (int frame = 60; frame < 75; frame++) run.Frame({});
    run.Frame({Moving(other, 75)});
    EXPECT_EQ(run.id(), 2u) << other;
  }
}

TEST(SteadyTracker, AChangeOfPersonWithoutAGapIsNoticed) {
  int noticed = 0;
  for (uint64_t other = 10; other < 20; other++) {
    Host run;
    for (int frame = 0; frame < 60; frame++) run.Frame({Moving(3, frame)});
    for (int frame = 60; frame < 90; frame++) run.Frame({Moving(other, frame)});
    if (run.id() != 1) noticed++;
  }
  EXPECT_GE(noticed, 7);
}

TEST(SteadyTracker, IdentifiersAreNeverUsedTwice) {
  Host run;
  std::set<uint64_t> seen;
  for (int round = 0; round < 5; round++) {
    for (int frame = 0; frame < 5; frame++)
      run.Frame({Moving(4, frame), Landmarks({0, 0, 0, 250})});
    EXPECT_TRUE(seen.insert(run.id(0)).second);
    EXPECT_TRUE(seen.insert(run.id(1)).second);
    for (int frame = 0; frame < 70; frame++) run.Frame({});
  }
}

TEST(SteadyTracker, FacesKeepTheirTracksWhenTheirOrderChanges) {
  Host run;
  const HeadPlace left = {0.1, 0, 0, -150, 0, 600};
  const HeadPlace right = {-0.1, 0, 0, 150, 20, 500};
  for (int frame = 0; frame < 20; frame++) run.Frame({Landmarks(left), Landmarks(right)});
  const uint64_t first = run.id(0);
  const uint64_t second = run.id(1);
  run.Frame({Landmarks(right), Landmarks(left)});
  EXPECT_EQ(run.id(0), second);
  EXPECT_EQ(run.id(1), first);
  run.Frame({Landmarks(left)});
  EXPECT_EQ(run.id(0), first);
}

// A fifth of the landmarks lie somewhere else for a second.
TEST(SteadyTracker, AHandOverTheMouthDoesNotMoveTheHead) {
  Host clean;
  Host hidden;
  for (int frame = 0; frame < 150; frame++) {
    std::vector<int32_t> landmarks = Moving(5, frame);
    clean.Frame({landmarks});
    if (frame >= 60 && frame < 90) {
      for (size_t i = 75; i < 95; i++) {
        landmarks[2 * i] += 50;
        landmarks[2 * i + 1] += 30;
      }
    }
    hidden.Frame({landmarks});
    const double off = DegreesBetween(clean.face().mean.rotation.m, hidden.face().mean.rotation.m);
    EXPECT_LT(off, frame < 100 ? 0.6 : 0.2) << frame;
    EXPECT_EQ(hidden.id(), 1u);
    if (frame >= 60 && frame < 90) {
      EXPECT_LT(hidden.face().confidence, 0.85f);
    }
  }
}

// Half of the landmarks stay where they were seen last while the head turns on.
TEST(SteadyTracker, LandmarksThatStayBehindDoNotHoldTheHead) {
  Host clean;
  Host hidden;
  std::vector<int32_t> held;
  for (int frame = 0; frame < 120; frame++) {
    std::vector<int32_t> landmarks = Moving(7, frame);
    clean.Frame({landmarks});
    if (frame == 44) held = landmarks;
    if (frame >= 45 && frame < 75) {
      for (size_t i = 0; i < 101; i++) {
        const bool left = held[2 * i] < held[2 * 98];  // of the nose's ridge
        if (!left) continue;
        landmarks[2 * i] = held[2 * i];
        landmarks[2 * i + 1] = held[2 * i + 1];
      }
    }
    hidden.Frame({landmarks});
    const double off = DegreesBetween(clean.face().mean.rotation.m, hidden.face().mean.rotation.m);
    EXPECT_LT(off, frame < 90 ? 2 : 0.4) << frame;
    EXPECT_EQ(hidden.id(), 1u);
  }
}

TEST(SteadyTracker, KeepsTheLastGoodPoseWhileNothingFits) {
  Host run;
  Random random = TestRandom();
  for (int frame = 0; frame < 40; frame++) run.Frame({Moving(6, 0)});
  const Rotation good = run.Output().rotation;
  const StateMean before = run.face().mean;
  for (int frame = 0; frame < 20; frame++) {
    std::vector<int32_t> noise = Moving(6, 0);
    for (int32_t& c : noise) c += random.Int(-60, 60);
    run.Frame({noise});
    EXPECT_EQ(run.face().confidence, 0);
    EXPECT_LT(DegreesBetween(run.Output().rotation.m, good.m), 0.1);
    EXPECT_EQ(run.id(), 1u);
  }
  run.Frame({Moving(6, 0)});
  EXPECT_GT(run.face().confidence, 0.8f);
  EXPECT_LT(DegreesBetween(run.Output().rotation.m, good.m), 0.3);
  for (int k = 0; k < kIdentityCount; k++) {
    EXPECT_NEAR(run.face().mean.identity[k], before.identity[k], 0.1);
  }
}

TEST(SteadyTracker, HostileLandmarksNeverGiveAnythingButNumbers) {
  Random random = TestRandom();
  constexpr int32_t kLowest = std::numeric_limits<int32_t>::min();
  constexpr int32_t kHighest = std::numeric_limits<int32_t>::max();
  Host run;
  for (int frame = 0; frame < 300; frame++) {
    const int count = frame / 50 % 2 == 0 ? 101 : 165;
    std::vector<int32_t> landmarks = Landmarks(PlaceAt(frame), count, Identity(8));
    switch (random.Int(0, 7)) {
      case 0:
        for (int32_t& c : landmarks) c = random.Int(kLowest, kHighest);
        break;
      case 1:
        for (int32_t& c : landmarks) c = 0;
        break;
      case 2:
        for (int32_t& c : landmarks) c = random.Int(0, 1) == 0 ? kLowest : kHighest;
        break;
      case 3:
        landmarks[static_cast<size_t>(random.Int(0, count * 2 - 1))] = kHighest;
        break;
      case 4:
        for (size_t i = 0; i < landmarks.size(); i += 2) landmarks[i] = 640;  // a line
        break;
      case 5:
        for (int32_t& c : landmarks) c = c / 100;  // a face of a few pixels
        break;
      default:
        break;
    }
    run.Frame({landmarks}, random.Int(0, 3) == 0 ? 1e6 : 1 / 30.0);
  }
  for (int frame = 0; frame < 10; frame++) run.Frame({Moving(8, frame)});
  EXPECT_GT(run.face().confidence, 0.8f);
  EXPECT_LT(DegreesBetween(run.face().mean.rotation.m, TransformOf(PlaceAt(9)).r), 3);
}

TEST(SteadyTracker, ThreadsChangeNothing) {
  Host alone;
  Host together(true);
  std::vector<Person> people;
  for (uint64_t k = 0; k < 5; k++) {
    people.push_back(Person(k).At(150.0 * (static_cast<double>(k) - 2), 0, 700));
  }
  for (int frame = 0; frame < 30; frame++) {
    Faces faces;
    for (Person& person : people) faces.push_back(person.Detect(frame, kWidth, kHeight, 101, 1));
    alone.Frame(faces);
    together.Frame(faces);
    for (uint32_t k = 0; k < 5; k++) {
      ASSERT_EQ(std::memcmp(&alone.face(k).mean, &together.face(k).mean, sizeof(StateMean)), 0);
    }
  }
}

// The same movement at other frame rates, with times, is tracked as well.
TEST(SteadyTracker, FollowsAtEveryFrameRate) {
  for (const int step : {1, 2, 3, 6}) {
    Host run;
    for (int frame = 0; frame < 180; frame += step) {
      run.Frame({Moving(9, frame)}, step / 30.0);
      if (frame < 60) continue;
      EXPECT_LT(DegreesBetween(run.face().mean.rotation.m, TransformOf(PlaceAt(frame)).r), 1.5)
          << step << " " << frame;
    }
  }
}

}  // namespace
}  // namespace n3ds::testing
