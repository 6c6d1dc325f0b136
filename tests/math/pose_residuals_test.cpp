// SPDX-License-Identifier: MIT
#include <algorithm>
#include <cmath>
#include <limits>
#include <map>
#include <sstream>

#include "math/pose_reference.h"
#include "support/bits.h"
#include "support/captured_output.h"
#include "support/memory_pool.h"
#include "support/pose_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

constexpr float kUnwritten = -123.25f;

// Buffers of exactly the promised sizes, so that sanitizers see one element too many.
struct Evaluation {
  MRESULT status = 0;
  std::vector<float> r, J, JtJ, g;
};

Evaluation Evaluate(const PoseCase& c, const Pose& pose, int32_t params = 7,
                    MHandle memory = nullptr) {
  Evaluation e;
  const size_t rows = 2 * static_cast<size_t>(c.count()), columns = static_cast<size_t>(params);
  e.r.assign(rows, kUnwritten);
  e.J.assign(rows * columns, kUnwritten);
  e.JtJ.assign(columns * columns, kUnwritten);
  e.g.assign(columns, kUnwritten);
  // A pointer even where nothing may be written.
  float nothing = kUnwritten;
  const auto data = [&](std::vector<float>& v) { return v.empty() ? &nothing : v.data(); };
  e.status =
      ComputeJacobianEtc(memory, data(e.J), data(e.JtJ), data(e.g), data(e.r), c.landmarks.data(),
                         c.model.data(), c.count(), c.camera.data(), pose.data(), c.contour_weight,
                         c.range_weight, c.mode, c.inner_weight, params);
  EXPECT_EQ(nothing, kUnwritten);
  return e;
}

std::vector<float> Residuals(const PoseCase& c, const Pose& pose) {
  std::vector<float> r(c.landmarks.size(), kUnwritten);
  EXPECT_EQ(ComputeJacobianEtc(nullptr, nullptr, nullptr, nullptr, r.data(), c.landmarks.data(),
                               c.model.data(), c.count(), c.camera.data(), pose.data(),
                               c.contour_weight, c.range_weight, c.mode, c.inner_weight, 7),
            N3DS_OK);
  return r;
}

enum class Line { kVertical, kHorizontal, kOblique };

// Landmarks of another pose, some pixels off, with the chin put where the midline is of the
// wanted kind.
PoseCase RandomCase(Random& random, const Pose& pose, Line line, float error) {
  PoseCase c;
  c.model = MakeHead();
  c.camera = MakeCamera(1280, 720);
  c.landmarks = Project(c.model, c.camera, pose);
  for (float& v : c.landmarks) v += random.Float(-error, error);
  const ReferenceLine now = ReferenceMiddleLine(c);
  if (line == Line::kVertical) c.landmarks[2 * 9] = static_cast<float>(now.bx) + 0.5f;
  if (line == Line::kHorizontal) c.landmarks[2 * 9 + 1] = static_cast<float>(now.by) + 0.5f;
  c.contour_weight = random.Float(0.2f, 2.0f);
  c.range_weight = random.Float(0.1f, 1.5f);
  c.mode = static_cast<int64_t>(random.Below(2));
  c.inner_weight = random.Float(0.1f, 2.5f);
  return c;
}

// What landmark i's residuals and derivatives are multiplied by, measured against a landmark of the
// same place and no weight at all. Observed 3 and 2 pixels off, so that there is a residual.
float FactorOf(int i, PoseCase c, const Pose& pose) {
  for (size_t k = 0; k < c.landmarks.size(); k += 2) {
    c.landmarks[k] += 3;
    c.landmarks[k + 1] -= 2;
  }
  PoseCase plain = c;
  plain.mode = 0;
  plain.range_weight = plain.inner_weight = 1;
  const Evaluation weighted = Evaluate(c, pose), bare = Evaluate(plain, pose);
  const float factor = weighted.r[2 * i] / bare.r[2 * i];
  EXPECT_NEAR(weighted.r[2 * i + 1], factor * bare.r[2 * i + 1], 1e-4);
  for (int row = 2 * i; row < 2 * i + 2; ++row) {
    for (int k = 0; k < 7; ++k) {
      const float expected = factor * bare.J[row * 7 + k];
      EXPECT_NEAR(weighted.J[row * 7 + k], expected, 1e-4f * (1 + std::fabs(expected)));
    }
  }
  return factor;
}

const Pose kFrontal = MakePose(0.1f, 0.2f, -0.05f, 10, -20, 700);

// --- The definition --------------------------------------------------------------------------

TEST(ComputeJacobianEtc, EqualsTheElementwiseDefinitionBitForBit) {
  Random random = TestRandom();
  std::map<OutlineRule, int> seen;
  for (int run = 0; run < 600; ++run) {
    const Pose seen_pose = RandomPose(random);
    const auto line = static_cast<Line>(run % 3);
    const PoseCase c = RandomCase(random, seen_pose, line, 12);
    Pose pose = seen_pose;
    for (float& v : pose) v *= random.Float(0.97f, 1.03f);

    const ReferenceEvaluation expected = ReferenceEvaluate(c, pose.data());
    const Evaluation e = Evaluate(c, pose);
    ASSERT_EQ(e.status, N3DS_OK);
    ASSERT_TRUE(SameBits(e.r, expected.r));
    ASSERT_TRUE(SameBits(e.J, expected.J));
    ASSERT_TRUE(SameBits(e.JtJ, expected.JtJ));
    ASSERT_TRUE(SameBits(e.g, expected.g));
    ASSERT_TRUE(SameBits(Residuals(c, pose), expected.r));
    for (int i = 0; i < kHeadPoints; ++i) {
      ++seen[ReferencePoint<float>(c, pose.data(), i).rule];
    }
  }
  for (const OutlineRule rule : {OutlineRule::kKept, OutlineRule::kVertical,
                                 OutlineRule::kHorizontal, OutlineRule::kOblique}) {
    EXPECT_GT(seen[rule], 300);
  }
}

TEST(ComputeJacobianEtc, JacobianMatchesCentralDifferencesUnderEveryWeighting) {
  Random random = TestRandom();
  std::map<std::pair<OutlineRule, bool>, int> seen;
  for (int run = 0; run < 120; ++run) {
    const Pose truth = RandomPose(random);
    const PoseCase c = RandomCase(random, truth, static_cast<Line>(run % 3), 12);
    Pose pose = truth;
    for (float& v : pose) v *= random.Float(0.98f, 1.02f);
    const Evaluation e = Evaluate(c, pose);
    ASSERT_EQ(e.status, N3DS_OK);

    for (int i = 0; i < kHeadPoints; ++i) {
      double p[7];
      std::copy(pose.begin(), pose.end(), p);
      const PointTerms<double> at = ReferencePoint<double>(c, p, i);
      ASSERT_NEAR(e.r[2 * i], at.r[0], 2e-3);
      ASSERT_NEAR(e.r[2 * i + 1], at.r[1], 2e-3);
      for (int k = 0; k < 7; ++k) {
        const double step = k < 4 ? 1e-6 : 1e-3, here = p[k];
        p[k] = here + step;
        const PointTerms<double> more = ReferencePoint<double>(c, p, i);
        p[k] = here - step;
        const PointTerms<double> less = ReferencePoint<double>(c, p, i);
        p[k] = here;
        // On the border of the outline rule there is no derivative.
        if (more.rule != at.rule || less.rule != at.rule) continue;
        ++seen[{at.rule, c.mode != 0}];
        for (int row = 0; row < 2; ++row) {
          const double numeric = (more.r[row] - less.r[row]) / (2 * step);
          const double analytic = e.J[(2 * i + row) * 7 + k];
          ASSERT_NEAR(analytic, numeric, 1e-4 * (1 + std::fabs(numeric)) + (k < 4 ? 5e-3 : 2e-6))
              << "point " << i << ", row " << row << ", parameter " << k << ", rule "
              << static_cast<int>(at.rule) << ", mode " << c.mode;
        }
      }
    }
  }
  for (const bool mode : {false, true}) {
    for (const OutlineRule rule :
         {OutlineRule::kNotOutline, OutlineRule::kKept, OutlineRule::kVertical,
          OutlineRule::kHorizontal, OutlineRule::kOblique}) {
      EXPECT_GT((seen[{rule, mode}]), 50) << static_cast<int>(rule);
    }
  }
}

TEST(ComputeJacobianEtc, ExactFitHasNoResidualAndNoGradient) {
  // Points whose projections are whole numbers: depth 512, focal length 1024.
  PoseCase c;
  c.camera = {1024, 0, 640, 0, 1024, 360, 0, 0, 1};
  for (int i = 0; i < 60; ++i) {
    const float x = static_cast<float>(i % 10) - 5, y = static_cast<float>(i / 10) - 3;
    c.model.insert(c.model.end(), {x, y, 0});
    c.landmarks.insert(c.landmarks.end(), {640 + 2 * x, 360 + 2 * y});
  }
  const Evaluation e = Evaluate(c, {1, 0, 0, 0, 0, 0, 512});
  ASSERT_EQ(e.status, N3DS_OK);
  EXPECT_EQ(e.r, std::vector<float>(120, 0.0f));
  EXPECT_EQ(e.g, std::vector<float>(7, 0.0f));
}

TEST(ComputeJacobianEtc, QuaternionLengthScalesTheModel) {
  PoseCase c = ExactCase(kFrontal);
  Pose doubled = kFrontal;
  for (int i = 0; i < 4; ++i) doubled[i] *= 2;
  for (int i = 4; i < 7; ++i) doubled[i] *= 4;
  EXPECT_TRUE(SameBits(Residuals(c, doubled), Residuals(c, kFrontal)));
}

// --- Weights by landmark ---------------------------------------------------------------------

TEST(ResidualWeights, WithTheModeOffOnlyTheRangeRuleApplies) {
  PoseCase c = ExactCase(kFrontal);
  c.inner_weight = 0.25f;
  c.range_weight = 0.5f;
  for (int i = 0; i < kHeadPoints; ++i) {
    const bool range =
        (i >= 5 && i <= 13) || (i >= 75 && i <= 76) || (i >= 80 && i <= 88) || (i >= 90 && i <= 94);
    EXPECT_FLOAT_EQ(FactorOf(i, c, kFrontal), range ? 0.5f : 1.0f) << "landmark " << i;
  }
}

TEST(ResidualWeights, WithTheModeOnEachLandmarkHasItsFactor) {
  PoseCase c = ExactCase(kFrontal);
  for (const int64_t mode : {int64_t{1}, int64_t{-1}, int64_t{1} << 40}) {
    for (const float inner : {0.25f, 4.0f}) {
      c.mode = mode;
      c.inner_weight = inner;
      for (int i = 0; i < kHeadPoints; ++i) {
        float expected = 0.1f;
        if (i == 39 || i == 45 || i == 51 || i == 57) expected = 1;
        if (i == 63 || i == 64 || i == 65 || i == 68) expected = inner < 1 ? inner : 1;
        if (i == 69 || i == 72 || i == 73 || i == 74) expected = inner >= 1 ? 1 / inner : 1;
        ASSERT_NEAR(FactorOf(i, c, kFrontal), expected, 1e-5) << "landmark " << i;
      }
    }
  }
}

TEST(ResidualWeights, LandmarkTwentyCountsATenthOnlyWithTheMode) {
  PoseCase c = ExactCase(kFrontal);
  EXPECT_EQ(FactorOf(20, c, kFrontal), 1.0f);
  c.mode = 1;
  EXPECT_NEAR(FactorOf(20, c, kFrontal), 0.1f, 1e-6);
}

TEST(ResidualWeights, InnerWeightOfOneLeavesTheNoseUnscaled) {
  PoseCase c = ExactCase(kFrontal);
  c.mode = 1;
  c.inner_weight = 1;
  for (const int i : {63, 64, 65, 68, 69, 72, 73, 74}) EXPECT_EQ(FactorOf(i, c, kFrontal), 1.0f);
}

TEST(ResidualWeights, ModeAndRangeMultiply) {
  PoseCase c = ExactCase(kFrontal);
  c.mode = 1;
  c.range_weight = 0.5f;
  EXPECT_NEAR(FactorOf(90, c, kFrontal), 0.05f, 1e-6);
}

TEST(ResidualWeights, NumbersCountFromTheFirstPointPassed) {
  // A fit without the 19 outline points: what is passed at 39 has the factor of an eye corner.
  PoseCase c = ExactCase(kFrontal);
  c.landmarks.erase(c.landmarks.begin(), c.landmarks.begin() + 2 * 19);
  c.model.erase(c.model.begin(), c.model.begin() + 3 * 19);
  c.mode = 1;
  EXPECT_EQ(FactorOf(39, c, kFrontal), 1.0f);
  EXPECT_NEAR(FactorOf(39 - 19, c, kFrontal), 0.1f, 1e-6);
}

TEST(ResidualWeights, LandmarksBeyondTheLastAreOrdinary) {
  PoseCase c = ExactCase(kFrontal);
  for (int i = 0; i < 10; ++i) {
    for (int k = 0; k < 3; ++k) c.model.push_back(c.model[3 * 50 + k]);
    for (int k = 0; k < 2; ++k) c.landmarks.push_back(c.landmarks[2 * 50 + k]);
  }
  c.range_weight = 0.5f;
  EXPECT_EQ(FactorOf(95, c, kFrontal), 1.0f);
  c.mode = 1;
  EXPECT_NEAR(FactorOf(104, c, kFrontal), 0.1f, 1e-6);
}

// --- Outline rule ----------------------------------------------------------------------------

// One outline landmark (0, at the image left) observed `outward` pixels farther from the face's
// middle than it projects, and `down` pixels lower, with a vertical midline.
struct OutlineProbe {
  PoseCase c;
  float r[2], j[2][7], plain_r[2], plain_j[2][7];

  OutlineProbe(float outward, float down, Line line) {
    c = ExactCase(kFrontal);
    const ReferenceLine now = ReferenceMiddleLine(c);
    if (line == Line::kVertical) c.landmarks[2 * 9] = static_cast<float>(now.bx) + 0.5f;
    if (line == Line::kHorizontal) c.landmarks[2 * 9 + 1] = static_cast<float>(now.by) + 0.5f;
    c.landmarks[0] -= outward;
    c.landmarks[1] += down;
    c.contour_weight = 0.5f;
    Read(c, r, j);
    PoseCase plain = c;
    // Without the landmarks that define the line there is none.
    plain.landmarks.resize(2 * 51);
    plain.model.resize(3 * 51);
    Read(plain, plain_r, plain_j);
  }

  static void Read(const PoseCase& c, float (&r)[2], float (&j)[2][7]) {
    const Evaluation e = Evaluate(c, kFrontal);
    std::copy_n(e.r.begin(), 2, r);
    std::copy_n(e.J.begin(), 7, j[0]);
    std::copy_n(e.J.begin() + 7, 7, j[1]);
  }
};

TEST(OutlineRule, ProjectionNearerTheMiddleThanTheObservationKeepsItsResidual) {
  // The horizontal line lies below the temple, so observing it higher is farther from the line.
  for (const Line line : {Line::kVertical, Line::kOblique, Line::kHorizontal}) {
    const OutlineProbe probe(6, line == Line::kHorizontal ? -2.0f : 2.0f, line);
    for (int row = 0; row < 2; ++row) {
      EXPECT_EQ(probe.r[row], probe.plain_r[row]);
      for (int k = 0; k < 7; ++k) EXPECT_EQ(probe.j[row][k], probe.plain_j[row][k]);
    }
  }
}

TEST(OutlineRule, VerticalLineCountsTheHorizontalDistanceTwice) {
  const OutlineProbe probe(-6, 2, Line::kVertical);
  for (int row = 0; row < 2; ++row) {
    EXPECT_EQ(probe.r[row], 0.5f * probe.plain_r[0]);
    for (int k = 0; k < 7; ++k) EXPECT_EQ(probe.j[row][k], 0.5f * probe.plain_j[0][k]);
  }
  EXPECT_NE(probe.r[0], 0.0f);
}

TEST(OutlineRule, HorizontalLineCountsTheVerticalDistanceTwice) {
  const OutlineProbe probe(-6, 4, Line::kHorizontal);
  for (int row = 0; row < 2; ++row) {
    EXPECT_EQ(probe.r[row], 0.5f * probe.plain_r[1]);
    for (int k = 0; k < 7; ++k) EXPECT_EQ(probe.j[row][k], 0.5f * probe.plain_j[1][k]);
  }
  EXPECT_NE(probe.r[0], 0.0f);
}

TEST(OutlineRule, ObliqueLineProjectsOntoItsNormal) {
  const OutlineProbe probe(-6, 2, Line::kOblique);
  const ReferenceLine line = ReferenceMiddleLine(probe.c);
  const double dx = line.bx - line.ax, dy = line.by - line.ay;
  ASSERT_NE(dx, 0);
  ASSERT_NE(dy, 0);
  // The part of the residual along the unit normal, with the contour weight.
  const double length = std::hypot(dx, dy), nx = dy / length, ny = -dx / length;
  const double across = (probe.plain_r[0] * nx + probe.plain_r[1] * ny) * 0.5;
  EXPECT_NEAR(probe.r[0], across * nx, 1e-4);
  EXPECT_NEAR(probe.r[1], across * ny, 1e-4);
  for (int k = 0; k < 7; ++k) {
    const double j = (probe.plain_j[0][k] * nx + probe.plain_j[1][k] * ny) * 0.5;
    EXPECT_NEAR(probe.j[0][k], j * nx, 1e-3 + 1e-5 * std::fabs(j));
    EXPECT_NEAR(probe.j[1][k], j * ny, 1e-3 + 1e-5 * std::fabs(j));
  }
}

TEST(OutlineRule, OnlyTheEightOutermostOutlineLandmarksAreConcerned) {
  PoseCase c = ExactCase(kFrontal);
  c.landmarks[2 * 9] = static_cast<float>(ReferenceMiddleLine(c).bx);
  // Every landmark observed nearer the midline, a vertical one, than it projects.
  const float middle = c.landmarks[2 * 9];
  for (int i = 0; i < kHeadPoints; ++i) {
    if (i == 9 || i == 45 || i == 51) continue;
    c.landmarks[2 * i] += c.landmarks[2 * i] < middle ? 8.0f : -8.0f;
  }
  PoseCase other = c;
  other.contour_weight = 0.25f;
  const std::vector<float> r = Residuals(c, kFrontal), r_other = Residuals(other, kFrontal);
  for (int i = 0; i < kHeadPoints; ++i) {
    const bool concerned = i <= 3 || (i >= 15 && i <= 18);
    EXPECT_EQ(r[2 * i] != r_other[2 * i], concerned) << "landmark " << i;
  }
}

TEST(OutlineRule, LineHangsOnTruncatedObservationsAndMixedEyeCornerCoordinates) {
  // B is (trunc(x51 + x45) / 2, trunc(x51 + y45 + 1) / 2): the line is vertical when the chin's
  // truncated x equals the first, whatever the fraction.
  PoseCase c = ExactCase(kFrontal);
  c.landmarks[2 * 45] = 600.75f;
  c.landmarks[2 * 45 + 1] = 300.0f;
  c.landmarks[2 * 51] = 680.5f;  // sum 1281.25: B.x = 640; B.y = trunc(981.5) / 2 = 490
  c.contour_weight = 0.5f;
  c.landmarks[0] += 6;  // observed nearer the middle

  c.landmarks[2 * 9] = 640.9f;
  c.landmarks[2 * 9 + 1] = 600;
  const std::vector<float> vertical = Residuals(c, kFrontal);
  EXPECT_EQ(vertical[0], vertical[1]);

  c.landmarks[2 * 9] = 641.0f;
  const std::vector<float> oblique = Residuals(c, kFrontal);
  EXPECT_NE(oblique[0], oblique[1]);

  // Horizontal when the chin's truncated y is 490; the temple lies above that line.
  c.landmarks[2 * 9 + 1] = 490.99f;
  c.landmarks[1] += 6;
  const std::vector<float> horizontal = Residuals(c, kFrontal);
  EXPECT_EQ(horizontal[0], horizontal[1]);
  // The y of landmark 51 is not looked at.
  c.landmarks[2 * 51 + 1] += 1000;
  EXPECT_EQ(Residuals(c, kFrontal)[0], horizontal[0]);
}

TEST(OutlineRule, WithoutTheEyeCornersThereIsNoLine) {
  // 51 points do not reach landmark 51; nothing beyond the array may be read.
  PoseCase c = ExactCase(kFrontal);
  c.landmarks.resize(2 * 51);
  c.model.resize(3 * 51);
  c.landmarks[0] += 6;
  const std::vector<float> r = Residuals(c, kFrontal);
  c.contour_weight = 0.25f;
  EXPECT_TRUE(SameBits(Residuals(c, kFrontal), r));
}

TEST(OutlineRule, FiftyTwoPointsReachTheEyeCorners) {
  PoseCase c = ExactCase(kFrontal);
  c.landmarks.resize(2 * 52);
  c.model.resize(3 * 52);
  c.landmarks[0] += 6;
  const std::vector<float> r = Residuals(c, kFrontal);
  c.contour_weight = 0.25f;
  const std::vector<float> weighted = Residuals(c, kFrontal);
  EXPECT_NE(weighted[0], r[0]);
  EXPECT_TRUE(SameBits({weighted.begin() + 2, weighted.end()}, {r.begin() + 2, r.end()}));
}

// The temple is projected to (520, 360) and observed as far on the other side of the line.
TEST(OutlineRule, ObservationAsFarFromTheLineAsTheProjectionKeepsItsResidual) {
  struct Place {
    float chin_x, chin_y, left_x, left_y, right_x, observed_x, observed_y;
  };
  const Place places[] = {
      {640, 460, 600, 300, 680, 760, 350},  // vertical at x = 640
      {640, 493, 600, 301, 684, 530, 626},  // horizontal at y = 493
      {600, 400, 600, 279, 680, 640, 360},  // y = 2 x - 800
  };
  for (const Place& place : places) {
    PoseCase c;
    c.camera = {1024, 0, 640, 0, 1024, 360, 0, 0, 1};
    c.model.assign(3 * 52, 0);
    c.model[0] = -60;
    c.landmarks.assign(2 * 52, 0);
    c.landmarks[0] = place.observed_x;
    c.landmarks[1] = place.observed_y;
    c.landmarks[2 * 9] = place.chin_x;
    c.landmarks[2 * 9 + 1] = place.chin_y;
    c.landmarks[2 * 45] = place.left_x;
    c.landmarks[2 * 45 + 1] = place.left_y;
    c.landmarks[2 * 51] = place.right_x;
    c.contour_weight = 0.25f;
    const std::vector<float> r = Residuals(c, {1, 0, 0, 0, 0, 0, 512});
    EXPECT_EQ(r[0], 520 - place.observed_x);
    EXPECT_EQ(r[1], 360 - place.observed_y);
  }
}

TEST(OutlineRule, LandmarksBeyondTheRangeOfIntegersAreHarmless) {
  constexpr float kHuge = 3e38f;
  const float values[] = {kHuge,         -kHuge,        std::numeric_limits<float>::infinity(),
                          std::nanf(""), 2147483648.0f, -2147483648.0f};
  PoseCase c = ExactCase(kFrontal);
  for (const float a : values) {
    for (const float b : values) {
      c.landmarks[2 * 9] = a;
      c.landmarks[2 * 9 + 1] = b;
      c.landmarks[2 * 45] = b;
      c.landmarks[2 * 45 + 1] = a;
      c.landmarks[2 * 51] = a;
      EXPECT_EQ(Evaluate(c, kFrontal).status, N3DS_OK);
    }
  }
}

// --- Zero depth ------------------------------------------------------------------------------

PoseCase PointAtDepth(float depth) {
  PoseCase c;
  c.camera = MakeCamera(640, 480);
  c.model = {1, 2, 3, 4, 5, depth};
  c.landmarks = {0, 0, 0, 0};
  return c;
}
constexpr Pose kIdentityPose = {1, 0, 0, 0, 0, 0, 0};

TEST(ZeroDepth, PointOnTheCameraPlaneFailsAndPrintsOneLine) {
  const PoseCase c = PointAtDepth(0);
  Evaluation e;
  EXPECT_EQ(PrintedBy([&] { e = Evaluate(c, kIdentityPose); }), "zero in zc\n");
  EXPECT_EQ(e.status, N3DS_NUMERICAL);
  EXPECT_EQ(e.r[2], kUnwritten);  // ended at that point
  EXPECT_EQ(e.JtJ[0], kUnwritten);
  EXPECT_EQ(e.g[0], kUnwritten);

  std::vector<float> r(4);
  EXPECT_EQ(PrintedBy([&] {
              EXPECT_EQ(ComputeJacobianEtc(nullptr, nullptr, nullptr, nullptr, r.data(),
                                           c.landmarks.data(), c.model.data(), 2, c.camera.data(),
                                           kIdentityPose.data(), 1, 1, 0, 1, 7),
                        N3DS_NUMERICAL);
            }),
            "zero in zc\n");
}

TEST(ZeroDepth, PointsBeforeTheOneWithoutDepthAreWritten) {
  constexpr Pose kSquare = {1, 0, 0, 0, 0, 0, 512};
  const PoseCase good = ExactCase(kSquare);
  for (const int32_t params : {3, 7, 9}) {
    const size_t columns = static_cast<size_t>(params);
    const Evaluation whole = Evaluate(good, kSquare, params);
    for (size_t failing = 0; failing < static_cast<size_t>(kHeadPoints); ++failing) {
      PoseCase c = good;
      c.model[3 * failing] = c.model[3 * failing + 1] = 0;
      c.model[3 * failing + 2] = -512;
      Evaluation e;
      PrintedBy([&] { e = Evaluate(c, kSquare, params); });
      ASSERT_EQ(e.status, N3DS_NUMERICAL);
      for (size_t i = 0; i < e.r.size(); ++i) {
        const bool written = i < 2 * failing;
        ASSERT_EQ(e.r[i], written ? whole.r[i] : kUnwritten) << failing;
        for (size_t k = 0; k < columns; ++k) {
          const float j = e.J[i * columns + k];
          ASSERT_EQ(j, written ? whole.J[i * columns + k] : kUnwritten) << failing << ", " << k;
        }
      }
    }
  }
}

TEST(ZeroDepth, LimitIsComparedInDouble) {
  const auto status_at = [](float depth) {
    Evaluation e;
    PrintedBy([&] { e = Evaluate(PointAtDepth(depth), kIdentityPose); });
    return e.status;
  };
  EXPECT_EQ(status_at(1e-6f), N3DS_NUMERICAL);  // the float lies just below the double
  EXPECT_EQ(status_at(-1e-6f), N3DS_NUMERICAL);
  EXPECT_EQ(status_at(std::nextafter(1e-6f, 1.0f)), N3DS_OK);
  EXPECT_EQ(status_at(-2e-6f), N3DS_OK);
}

TEST(ZeroDepth, PointBehindTheCameraIsProjectedAllTheSame) {
  const Evaluation e = Evaluate(PointAtDepth(-5), kIdentityPose);
  EXPECT_EQ(e.status, N3DS_OK);
  EXPECT_EQ(e.r[2], 560.0f * 4 / -5 + 320);
}

// --- Arguments -------------------------------------------------------------------------------

struct Arguments {
  float J[14], JtJ[49], g[7], r[2];
  const float landmarks[2] = {1, 2}, model[3] = {1, 2, 3};
  const std::array<float, 9> camera = MakeCamera(640, 480);
  const Pose pose = {1, 0, 0, 0, 0, 0, 10};

  // Bits of `null`: J, JtJ, g, r, landmarks, model, camera, pose.
  MRESULT Call(unsigned null, int32_t count = 1, int32_t params = 7) {
    const auto in = [&](int bit, const float* p) { return (null >> bit & 1) != 0 ? nullptr : p; };
    const auto out = [&](int bit, float* p) { return (null >> bit & 1) != 0 ? nullptr : p; };
    return ComputeJacobianEtc(nullptr, out(0, J), out(1, JtJ), out(2, g), out(3, r),
                              in(4, landmarks), in(5, model), count, in(6, camera.data()),
                              in(7, pose.data()), 1, 1, 0, 1, params);
  }
};

TEST(ComputeJacobianEtc, MixOfNullAndSetOutputsComesFirstThenNullsThenSizes) {
  Arguments a;
  for (unsigned null = 0; null < 256; ++null) {
    const unsigned outputs = null & 7, inputs = null >> 3;
    const MRESULT expected = outputs != 0 && outputs != 7 ? N3DS_BAD_VALUE
                             : inputs != 0                ? N3DS_NULL_ARGUMENT
                                                          : N3DS_OK;
    EXPECT_EQ(a.Call(null), expected) << null;
    EXPECT_EQ(a.Call(null, -1, 7), expected == N3DS_OK ? N3DS_BAD_VALUE : expected) << null;
    EXPECT_EQ(a.Call(null, 1, -1), expected == N3DS_OK ? N3DS_BAD_VALUE : expected) << null;
  }
}

TEST(ComputeJacobianEtc, CountsWithoutAnIntegerForTheirRowsAreRefused) {
  Arguments a;
  EXPECT_EQ(a.Call(0, 1 << 30), N3DS_BAD_VALUE);
  EXPECT_EQ(a.Call(0, INT32_MAX), N3DS_BAD_VALUE);
}

TEST(ComputeJacobianEtc, NoPointsGiveZeroNormalEquations) {
  Arguments a;
  EXPECT_EQ(a.Call(0, 0), N3DS_OK);
  for (const float v : a.JtJ) EXPECT_EQ(v, 0.0f);
  for (const float v : a.g) EXPECT_EQ(v, 0.0f);
}

TEST(ComputeJacobianEtc, FewerParametersGetOnlyTheirColumns) {
  Random random = TestRandom();
  const PoseCase c = RandomCase(random, kFrontal, Line::kOblique, 8);
  const Evaluation full = Evaluate(c, kFrontal);
  for (int params = 0; params < 7; ++params) {
    const Evaluation e = Evaluate(c, kFrontal, params);
    ASSERT_EQ(e.status, N3DS_OK);
    EXPECT_TRUE(SameBits(e.r, full.r));
    for (size_t row = 0; row < e.r.size(); ++row) {
      for (int k = 0; k < params; ++k) ASSERT_EQ(e.J[row * params + k], full.J[row * 7 + k]);
    }
    for (int a = 0; a < params; ++a) {
      EXPECT_EQ(e.g[a], full.g[a]);
      for (int b = 0; b < params; ++b) EXPECT_EQ(e.JtJ[a * params + b], full.JtJ[a * 7 + b]);
    }
  }
}

TEST(ComputeJacobianEtc, ColumnsBeyondTheSeventhAreOnlyWeighted) {
  Random random = TestRandom();
  const PoseCase c = RandomCase(random, kFrontal, Line::kOblique, 8);
  const Evaluation full = Evaluate(c, kFrontal);
  const Evaluation e = Evaluate(c, kFrontal, 18);  // every column starts as kUnwritten
  ASSERT_EQ(e.status, N3DS_OK);
  PoseCase bare = c;
  bare.mode = 0;
  bare.range_weight = 1;
  for (int i = 0; i < kHeadPoints; ++i) {
    const bool outline = ReferencePoint<float>(c, kFrontal.data(), i).rule == OutlineRule::kOblique;
    for (int row = 2 * i; row < 2 * i + 2; ++row) {
      for (int k = 0; k < 7; ++k) ASSERT_EQ(e.J[row * 18 + k], full.J[row * 7 + k]);
      for (int k = 7; k < 18; ++k) {
        ASSERT_EQ(e.J[row * 18 + k], e.J[row * 18 + 7]);
        if (outline) continue;
        // The factor of the residual, measured on the residual itself.
        const float factor = full.r[row] / Residuals(bare, kFrontal)[row];
        ASSERT_NEAR(e.J[row * 18 + k], factor * kUnwritten, 1e-3);
      }
    }
  }
  float g = 0;
  for (size_t row = 0; row < e.r.size(); ++row) g += e.J[row * 18 + 17] * e.r[row];
  EXPECT_EQ(e.g[17], g);
}

TEST(ComputeJacobianEtc, TransposeThatCannotBeHadIsReported) {
  const PoseCase c = ExactCase(kFrontal);
  const size_t needed = 7 * 190 * sizeof(float) + 32;
  const MemoryPool small(needed - 8), enough(needed);
  const Evaluation e = Evaluate(c, kFrontal, 7, small.handle());
  EXPECT_EQ(e.status, N3DS_NO_MEMORY);
  EXPECT_EQ(e.JtJ, std::vector<float>(49, kUnwritten));
  EXPECT_EQ(e.g, std::vector<float>(7, kUnwritten));
  EXPECT_EQ(Evaluate(c, kFrontal, 7, enough.handle()).status, N3DS_OK);
  EXPECT_TRUE(enough.Untouched());

  // Residuals alone need no memory.
  std::vector<float> r(190);
  EXPECT_EQ(
      ComputeJacobianEtc(small.handle(), nullptr, nullptr, nullptr, r.data(), c.landmarks.data(),
                         c.model.data(), 95, c.camera.data(), kFrontal.data(), 1, 1, 0, 1, 7),
      N3DS_OK);
}

}  // namespace
}  // namespace n3ds::testing
