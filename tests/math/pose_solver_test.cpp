// SPDX-License-Identifier: MIT
#include "math/pose_solver.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <map>

#include "math/pose_reference.h"
#include "support/bits.h"
#include "support/captured_output.h"
#include "support/golden.h"
#include "support/memory_pool.h"
#include "support/pose_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

MRESULT Solve(const PoseCase& c, Pose* pose, MHandle memory = nullptr) {
  return SolveByLM(memory, c.landmarks.data(), c.model.data(), c.count(), c.camera.data(),
                   pose->data(), c.contour_weight, c.range_weight, c.mode, c.inner_weight, 7);
}

PoseSolverSummary SolveWithSummary(const PoseCase& c, Pose* pose) {
  PoseSolverSummary summary;
  SolvePose(nullptr,
            {c.landmarks.data(), c.model.data(), c.count(), c.camera.data(), c.contour_weight,
             c.range_weight, c.mode, c.inner_weight, 7},
            pose->data(), &summary);
  return summary;
}

// A start as far away as a head moves between two frames.
Pose Near(Random& random, const Pose& truth, float angle, float shift) {
  const Pose turn = RandomPose(random, {angle, angle, angle, 0, 0, 0, 0});
  // turn = small turn times the half turn about x; undo the half turn: w <- x, x <- -w, ...
  const float w = turn[1], x = -turn[0], y = -turn[3], z = turn[2];
  const float* q = truth.data();
  return {w * q[0] - x * q[1] - y * q[2] - z * q[3], w * q[1] + x * q[0] + y * q[3] - z * q[2],
          w * q[2] - x * q[3] + y * q[0] + z * q[1], w * q[3] + x * q[2] - y * q[1] + z * q[0],
          truth[4] + random.Float(-shift, shift),    truth[5] + random.Float(-shift, shift),
          truth[6] + random.Float(-shift, shift)};
}

double ReprojectionError(const PoseCase& c, const Pose& pose) {
  const std::vector<float> at = Project(c.model, c.camera, pose);
  double sum = 0;
  for (size_t i = 0; i < at.size(); ++i) {
    sum += (at[i] - c.landmarks[i]) * (at[i] - c.landmarks[i]);
  }
  return std::sqrt(sum / c.count());
}

constexpr float kDegree = 3.14159265f / 180;

TEST(SolveByLM, RecoversEveryKnownPoseWithoutTheOutlineRule) {
  Random random = TestRandom();
  for (int run = 0; run < 400; ++run) {
    const Pose truth = RandomPose(random);
    PoseCase c = ExactCase(truth);
    // Up to landmark 50: too few for a midline.
    c.landmarks.resize(2 * 51);
    c.model.resize(3 * 51);
    Pose pose = Near(random, truth, 12 * kDegree, 25);
    ASSERT_EQ(Solve(c, &pose), N3DS_OK);
    pose = Normalised(pose);
    ASSERT_LT(AngleBetween(pose, truth), 0.15f * kDegree) << "run " << run;
    for (int i = 4; i < 7; ++i) ASSERT_NEAR(pose[i], truth[i], 0.003f * truth[6]) << "run " << run;
    ASSERT_LT(ReprojectionError(c, pose), 0.05) << "run " << run;
  }
}

// With the outline rule the sum of squares jumps where a landmark changes sides, and now and then a
// solve ends at a jump; the tracker fits several times a frame.
TEST(SolveByLM, RecoversNearlyEveryKnownPoseWithTheOutlineRule) {
  Random random = TestRandom();
  int near = 0, start = 0;
  for (int run = 0; run < 400; ++run) {
    const Pose truth = RandomPose(random, {0.3f, 0.4f, 0.2f, 60, 40, 600, 1000});
    const PoseCase c = ExactCase(truth);
    Pose pose = Near(random, truth, 8 * kDegree, 20);
    ASSERT_EQ(Solve(c, &pose), N3DS_OK);
    near += AngleBetween(Normalised(pose), truth) < 0.15f * kDegree ? 1 : 0;
    // From where the tracker starts with a new face.
    pose = {-0.265f, 0.958f, -0.001f, -0.049f, 0, 0, 800};
    ASSERT_EQ(Solve(c, &pose), N3DS_OK);
    start += AngleBetween(Normalised(pose), truth) < 0.15f * kDegree ? 1 : 0;
  }
  EXPECT_GE(near, 392);
  EXPECT_GE(start, 388);
}

TEST(SolveByLM, NoiseMovesThePoseByLittle) {
  Random random = TestRandom();
  for (const int64_t mode : {0, 1}) {
    std::vector<double> angles;
    for (int run = 0; run < 200; ++run) {
      const Pose truth = RandomPose(random);
      PoseCase c = ExactCase(truth);
      c.mode = mode;
      for (float& v : c.landmarks) v = std::floor(v + 0.5f * random.Normal() + 0.5f);
      Pose pose = Near(random, truth, 6 * kDegree, 15);
      ASSERT_EQ(Solve(c, &pose), N3DS_OK);
      // A pixel is the more degrees, the farther away the face.
      angles.push_back(AngleBetween(Normalised(pose), truth) / kDegree * 400 / truth[6]);
    }
    std::sort(angles.begin(), angles.end());
    // Degrees at 400 mm; the last few may have ended at a jump of the outline rule.
    EXPECT_LT(angles[100], mode == 0 ? 0.2 : 0.5);
    EXPECT_LT(angles[194], mode == 0 ? 0.6 : 1.5);
    EXPECT_GT(angles[100], 0.01);
  }
}

TEST(SolveByLM, ExactFitLeavesThePoseAlone) {
  // Points whose projections are whole numbers: depth 512, focal length 1024.
  PoseCase c;
  c.camera = {1024, 0, 640, 0, 1024, 360, 0, 0, 1};
  for (int i = 0; i < 60; ++i) {
    const float x = static_cast<float>(i % 10) - 5, y = static_cast<float>(i / 10) - 3;
    c.model.insert(c.model.end(), {x, y, 0});
    c.landmarks.insert(c.landmarks.end(), {640 + 2 * x, 360 + 2 * y});
  }
  const Pose exact = {1, 0, 0, 0, 0, 0, 512};
  Pose pose = exact;
  ASSERT_EQ(Solve(c, &pose), N3DS_OK);
  EXPECT_EQ(pose, exact);
  const PoseSolverSummary summary = SolveWithSummary(c, &pose);
  EXPECT_EQ(summary.stop, PoseSolverStop::kGradient);
  EXPECT_EQ(summary.iterations, 0);
}

TEST(SolveByLM, EveryPassEqualsThePlainLoopBitForBit) {
  Random random = TestRandom();
  std::map<PoseSolverStop, int> stops;
  int rejected = 0, flips_that_matter = 0;
  for (int run = 0; run < 240; ++run) {
    const Pose truth = RandomPose(random);
    PoseCase c = ExactCase(truth);
    const float error = run % 4 == 0 ? 0.0f : random.Float(0, 20);
    for (float& v : c.landmarks) v += random.Float(-error, error);
    c.contour_weight = random.Float(0.2f, 2.0f);
    c.range_weight = random.Float(0.1f, 1.1f);
    c.mode = run / 2 % 2;
    c.inner_weight = random.Float(0.1f, 3.0f);
    if (run % 3 == 0) c.landmarks[2 * 9] = static_cast<float>(ReferenceMiddleLine(c).bx);
    // From starts so far away that steps fail, too.
    const float wild = run % 2 == 0 ? 8 * kDegree : 60 * kDegree;
    const Pose start = Near(random, truth, wild, run % 2 == 0 ? 20.0f : 200.0f);

    Pose pose = start;
    MRESULT status = N3DS_OK;
    ReferenceSolve expected;
    PrintedBy([&] {
      status = Solve(c, &pose);
      expected = ReferenceSolvePose(c, start);
    });
    ASSERT_EQ(status, expected.status) << "run " << run;
    ASSERT_EQ(pose, expected.pose) << "run " << run;

    Pose again = start;
    PoseSolverSummary summary;
    PrintedBy([&] { summary = SolveWithSummary(c, &again); });
    ASSERT_EQ(again, pose);
    ASSERT_EQ(summary.iterations, expected.iterations);
    ASSERT_EQ(summary.accepted_steps,
              std::count_if(expected.passes.begin(), expected.passes.end(),
                            [](const ReferencePass& p) { return p.accepted; }));
    ++stops[summary.stop];
    if (expected.converged) {
      ASSERT_TRUE(summary.stop == PoseSolverStop::kStep ||
                  summary.stop == PoseSolverStop::kGradient);
    } else if (expected.status == N3DS_OK) {
      ASSERT_EQ(summary.stop, PoseSolverStop::kIterationLimit);
    }

    rejected += static_cast<int>(expected.passes.size()) - summary.accepted_steps;
    if (expected.rejected_before_accepted > 0) {
      ReferenceSolve unflipped;
      PrintedBy([&] { unflipped = ReferenceSolvePose(c, start, false); });
      flips_that_matter += unflipped.pose != expected.pose ? 1 : 0;
    }
  }
  // The runs must have gone through what they are here to compare.
  EXPECT_GT(rejected, 200);
  EXPECT_GT(flips_that_matter, 20);
  EXPECT_GT(stops[PoseSolverStop::kStep], 50);
  EXPECT_GT(stops[PoseSolverStop::kIterationLimit], 20);
}

// A start behind which the first step overshoots.
struct RejectedStep {
  PoseCase c;
  Pose start;
  ReferenceSolve expected;

  RejectedStep() {
    Random random = TestRandom();
    for (int run = 0; run < 10000; ++run) {
      const Pose truth = RandomPose(random);
      c = ExactCase(truth);
      start = Near(random, truth, 50 * kDegree, 150);
      expected = ReferenceSolvePose(c, start);
      if (expected.status != N3DS_OK || expected.rejected_before_accepted == 0) continue;
      const auto& passes = expected.passes;
      size_t k = 0;
      while (passes[k].accepted) ++k;
      if (k + 2 < passes.size() && ReferenceSolvePose(c, start, false).pose != expected.pose)
        return;
    }
    ADD_FAILURE() << "no rejected step found";
  }
};

TEST(SolveByLM, GradientChangesItsSignAlsoAfterARejectedStep) {
  const RejectedStep problem;
  const ReferenceSolve unflipped = ReferenceSolvePose(problem.c, problem.start, false);
  ASSERT_NE(unflipped.pose, problem.expected.pose) << "the case does not tell the two apart";
  Pose pose = problem.start;
  ASSERT_EQ(Solve(problem.c, &pose), N3DS_OK);
  EXPECT_EQ(pose, problem.expected.pose);

  // The pass after the rejection steps uphill: rejected as well, and the damping is up by 2,
  // then 4.
  const auto& passes = problem.expected.passes;
  size_t k = 0;
  while (passes[k].accepted) ++k;
  ASSERT_LT(k + 2, passes.size());
  EXPECT_EQ(passes[k + 1].damping, 2 * passes[k].damping);
  EXPECT_FALSE(passes[k + 1].accepted);
  EXPECT_EQ(passes[k + 2].damping, 8 * passes[k].damping);
}

TEST(SolveByLM, IterationLimitReturnsZeroAndTheLastAcceptedPose) {
  // Landmarks that no pose explains, so that neither tolerance is met.
  Random random = TestRandom();
  int limits = 0;
  for (int run = 0; run < 50; ++run) {
    const Pose truth = RandomPose(random);
    PoseCase c = ExactCase(truth);
    for (float& v : c.landmarks) v += random.Float(-150, 150);
    const Pose start = Near(random, truth, 30 * kDegree, 100);
    Pose pose = start;
    PoseSolverSummary summary;
    PrintedBy([&] { summary = SolveWithSummary(c, &pose); });
    if (summary.stop != PoseSolverStop::kIterationLimit) continue;
    ++limits;
    EXPECT_EQ(summary.iterations, 20);
    Pose same = start;
    EXPECT_EQ(Solve(c, &same), N3DS_OK);
    EXPECT_EQ(same, pose);
    EXPECT_NE(same, start);
  }
  EXPECT_GT(limits, 5);
}

TEST(SolveByLM, AcceptedStepsNeverRaiseTheError) {
  Random random = TestRandom();
  for (int run = 0; run < 100; ++run) {
    const Pose truth = RandomPose(random);
    PoseCase c = ExactCase(truth);
    // Without a midline nothing is weighted, so this error is what the solver minimises.
    c.landmarks.resize(2 * 51);
    c.model.resize(3 * 51);
    for (float& v : c.landmarks) v += random.Float(-5, 5);
    const Pose start = Near(random, truth, 20 * kDegree, 60);
    Pose pose = start;
    PrintedBy([&] { Solve(c, &pose); });
    EXPECT_LE(ReprojectionError(c, pose), ReprojectionError(c, start));
  }
}

TEST(SolveByLM, PointAtZeroDepthFailsPrintsAndLeavesThePose) {
  PoseCase c = ExactCase(MakePose(0, 0, 0, 0, 0, 600));
  const Pose start = {1, 0, 0, 0, 0, 0, -c.model[3 * 20 + 2]};  // landmark 20 on the camera plane
  Pose pose = start;
  MRESULT status = N3DS_OK;
  EXPECT_EQ(PrintedBy([&] { status = Solve(c, &pose); }), "zero in zc\n");
  EXPECT_EQ(status, N3DS_NUMERICAL);
  EXPECT_EQ(pose, start);
}

TEST(SolveByLM, ZeroDepthOnTheWayKeepsTheLastAcceptedPose) {
  // The landmarks of mouth and chin lie about the camera plane under the true pose, with weight 0,
  // so that they do not keep the solve from coming there.
  Random random = TestRandom();
  const Pose truth = {1, 0, 0, 0, 0, 0, 512};
  PoseCase c = ExactCase(truth);
  c.range_weight = 0;
  for (int i = 5; i < kHeadPoints; ++i) {
    if (i > 13 && i < 80 && i != 75 && i != 76) continue;
    if (i == 89) continue;
    c.model[3 * i] = c.model[3 * i + 1] = 0;
    c.model[3 * i + 2] = -512 + random.Float(-0.02f, 0.02f);
  }
  int met = 0;
  for (int run = 0; run < 2000 && met < 3; ++run) {
    Pose start = truth;
    for (int i = 0; i < 7; ++i) start[i] += random.Float(-1, 1) * (i < 4 ? 0.1f : 20.0f);
    Pose pose = start, again = start;
    MRESULT status = N3DS_OK;
    const std::string printed = PrintedBy([&] { status = Solve(c, &pose); });
    if (status == N3DS_OK) continue;
    ASSERT_EQ(status, N3DS_NUMERICAL);
    ASSERT_EQ(printed, "zero in zc\n");
    ReferenceSolve expected;
    PoseSolverSummary summary;
    PrintedBy([&] {
      expected = ReferenceSolvePose(c, start);
      summary = SolveWithSummary(c, &again);
    });
    ASSERT_EQ(summary.stop, PoseSolverStop::kFailed);
    ASSERT_EQ(expected.status, N3DS_NUMERICAL);
    ASSERT_EQ(pose, expected.pose);
    if (summary.accepted_steps == 0) continue;
    EXPECT_NE(pose, start);
    ++met;
  }
  EXPECT_EQ(met, 3);
}

TEST(SolveByLM, SingularSystemFailsPrintsAndLeavesThePose) {
  // Points so far away that no parameter moves them: J^T J, and the damping with it, is below the
  // pivot limit, but the gradient is not below its tolerance.
  PoseCase c;
  c.camera = {1, 0, 0, 0, 1, 0, 0, 0, 1};
  for (int i = 0; i < 95; ++i) {
    c.model.insert(c.model.end(), {static_cast<float>(i % 5), static_cast<float>(i % 7), 0});
    c.landmarks.insert(c.landmarks.end(), {50, 50});
  }
  const Pose start = {1, 0, 0, 0, 0, 0, 1e5f};
  Pose pose = start;
  MRESULT status = N3DS_OK;
  EXPECT_EQ(PrintedBy([&] { status = Solve(c, &pose); }), "zero in LU\n");
  EXPECT_EQ(status, N3DS_NUMERICAL);
  EXPECT_EQ(pose, start);
}

TEST(SolveByLM, PoseThatIsNotANumberEndsWithoutHarm) {
  const PoseCase c = ExactCase(MakePose(0, 0, 0, 0, 0, 600));
  Pose pose = {std::nanf(""), 0, 0, 0, 0, 0, 600};
  EXPECT_EQ(Solve(c, &pose), N3DS_OK);
  EXPECT_TRUE(std::isnan(pose[0]));
  EXPECT_EQ(pose[6], 600);
}

// The square of one residual is infinite before and after every step, so every gain is NaN, which
// is no gain.
TEST(SolveByLM, GainThatIsNotANumberIsNoGain) {
  PoseCase c = ExactCase(MakePose(0, 0, 0, 0, 0, 600));
  c.landmarks[2 * 30] = 1e20f;
  const Pose start = MakePose(0.1f, 0.1f, 0, 5, 0, 620);
  Pose pose = start;
  const PoseSolverSummary summary = SolveWithSummary(c, &pose);
  EXPECT_EQ(pose, start);
  EXPECT_EQ(summary.accepted_steps, 0);
  EXPECT_GT(summary.iterations, 0);
}

TEST(SolveByLM, CountsWithoutAnIntegerForTheirRowsAreRefused) {
  const PoseCase c = ExactCase(MakePose(0, 0, 0, 0, 0, 600));
  Pose pose = MakePose(0, 0, 0, 0, 0, 600);
  for (const int32_t count : {1 << 30, INT32_MAX}) {
    EXPECT_EQ(SolveByLM(nullptr, c.landmarks.data(), c.model.data(), count, c.camera.data(),
                        pose.data(), 1, 1, 0, 1, 7),
              N3DS_BAD_VALUE);
  }
}

TEST(SolveByLM, NullPointersComeBeforeSizes) {
  const PoseCase c = ExactCase(MakePose(0, 0, 0, 0, 0, 600));
  Pose pose = MakePose(0, 0, 0, 0, 0, 600);
  const Pose before = pose;
  for (const int32_t count : {95, -1}) {
    for (const int32_t params : {7, -1}) {
      for (unsigned null = 0; null < 16; ++null) {
        const MRESULT status =
            SolveByLM(nullptr, (null & 1) != 0 ? nullptr : c.landmarks.data(),
                      (null & 2) != 0 ? nullptr : c.model.data(), count,
                      (null & 4) != 0 ? nullptr : c.camera.data(),
                      (null & 8) != 0 ? nullptr : pose.data(), 1, 1, 0, 1, params);
        if (null != 0) {
          EXPECT_EQ(status, N3DS_NULL_ARGUMENT);
        } else if (count < 0 || params < 0) {
          EXPECT_EQ(status, N3DS_BAD_VALUE);
        }
        if (status != N3DS_OK) {
          EXPECT_EQ(pose, before);
        }
      }
    }
  }
}

TEST(SolveByLM, NoPointsOrNoParametersAreFoundAtOnce) {
  const PoseCase c = ExactCase(MakePose(0, 0, 0, 0, 0, 600));
  const Pose start = MakePose(0.1f, 0, 0, 0, 0, 700);
  Pose pose = start;
  EXPECT_EQ(SolveByLM(nullptr, c.landmarks.data(), c.model.data(), 0, c.camera.data(), pose.data(),
                      1, 1, 0, 1, 7),
            N3DS_OK);
  EXPECT_EQ(pose, start);
  EXPECT_EQ(SolveByLM(nullptr, c.landmarks.data(), c.model.data(), 95, c.camera.data(), pose.data(),
                      1, 1, 0, 1, 0),
            N3DS_OK);
  EXPECT_EQ(pose, start);
}

TEST(SolveByLM, FewerParametersHoldTheOthersFixed) {
  Random random = TestRandom();
  const Pose truth = RandomPose(random);
  const PoseCase c = ExactCase(truth);
  Pose pose = Near(random, truth, 8 * kDegree, 0);
  // The rotation alone, about the true translation.
  ASSERT_EQ(SolveByLM(nullptr, c.landmarks.data(), c.model.data(), 95, c.camera.data(), pose.data(),
                      1, 1, 0, 1, 4),
            N3DS_OK);
  for (int i = 4; i < 7; ++i) EXPECT_EQ(pose[i], truth[i]);
  EXPECT_LT(AngleBetween(Normalised(pose), truth), 0.1f * kDegree);
}

TEST(SolveByLM, ParametersBeyondTheSeventhStayAsTheyAre) {
  Random random = TestRandom();
  const Pose truth = RandomPose(random);
  const PoseCase c = ExactCase(truth);
  const Pose start = Near(random, truth, 8 * kDegree, 10);
  std::vector<float> longer(start.begin(), start.end());
  longer.insert(longer.end(), {1.5f, -2.5f});
  ASSERT_EQ(SolveByLM(nullptr, c.landmarks.data(), c.model.data(), 95, c.camera.data(),
                      longer.data(), 1, 1, 0, 1, 9),
            N3DS_OK);
  EXPECT_EQ(longer[7], 1.5f);
  EXPECT_EQ(longer[8], -2.5f);
  Pose pose;
  std::copy_n(longer.begin(), 7, pose.begin());
  EXPECT_LT(AngleBetween(Normalised(pose), truth), 0.1f * kDegree);
}

TEST(SolveByLM, EveryFailedAllocationIsReportedAndReleasesTheRest) {
  Random random = TestRandom();
  const Pose truth = RandomPose(random);
  PoseCase c = ExactCase(truth);
  c.landmarks.resize(2 * 12);
  c.model.resize(3 * 12);
  const Pose start = Near(random, truth, 3 * kDegree, 10);
  Pose expected = start;
  ASSERT_EQ(Solve(c, &expected), N3DS_OK);
  ASSERT_NE(expected, start);

  // Pools from too small for anything to big enough, in steps finer than any allocation: each
  // allocation is the one that fails for some of them.
  std::vector<std::pair<MRESULT, size_t>> phases;  // statuses in order, with the first pool length
  for (size_t length = 40;; length += 8) {
    ASSERT_LT(length, 100000u);
    const MemoryPool pool(length);
    Pose pose = start;
    const MRESULT status = Solve(c, &pose, pool.handle());
    ASSERT_TRUE(pool.Untouched()) << "scratch not released with a pool of " << length;
    if (phases.empty() || phases.back().first != status) phases.push_back({status, length});
    if (status == N3DS_OK) {
      EXPECT_EQ(pose, expected);
      break;
    }
    ASSERT_EQ(pose, start);
  }
  ASSERT_EQ(phases.size(), 3u);
  EXPECT_EQ(phases[0].first, N3DS_NULL_ARGUMENT);
  EXPECT_EQ(phases[1].first, N3DS_NO_MEMORY);
  EXPECT_EQ(phases[2].first, N3DS_OK);
  // -1 as long as the first five do not fit: J, J^T J, r, r_new and g with their block headers.
  const auto block = [](size_t floats) { return (4 * floats + 7) / 8 * 8 + 16; };
  EXPECT_EQ(phases[1].second, block(24 * 7) + block(49) + block(24) + block(24) + block(7) + 16);
}

TEST(SolveByLM, PoolAndSystemHeapGiveTheSameBits) {
  Random random = TestRandom();
  for (int run = 0; run < 20; ++run) {
    const Pose truth = RandomPose(random);
    const PoseCase c = ExactCase(truth);
    const Pose start = Near(random, truth, 10 * kDegree, 20);
    Pose heap = start, pooled = start;
    const MemoryPool pool(1 << 15);
    ASSERT_EQ(Solve(c, &heap), N3DS_OK);
    ASSERT_EQ(Solve(c, &pooled, pool.handle()), N3DS_OK);
    EXPECT_EQ(heap, pooled);
    EXPECT_TRUE(pool.Untouched());
  }
}

TEST(SolveByLM, GoldenPosesOnEveryMachine) {
  Random random(7);
  uint32_t hash = 2166136261u;
  for (int run = 0; run < 200; ++run) {
    const Pose truth = RandomPose(random);
    PoseCase c = ExactCase(truth);
    for (float& v : c.landmarks) v = std::floor(v + random.Normal() + 0.5f);
    c.mode = run % 2;
    c.range_weight = random.Float(0.1f, 1.0f);
    c.inner_weight = random.Float(0.1f, 10.0f);
    Pose pose = Near(random, truth, 15 * kDegree, 40);
    PrintedBy([&] { Solve(c, &pose); });
    for (const float v : pose) hash = (hash ^ Bits(v)) * 16777619u;
  }
  const Golden found = {"step_pose_solver", hash, 0};
  Report(found);
  EXPECT_EQ(found, GoldenOf(found.name));
}

}  // namespace
}  // namespace n3ds::testing
