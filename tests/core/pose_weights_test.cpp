// SPDX-License-Identifier: MIT
#include "core/pose_weights.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <tuple>
#include <utility>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/face_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

// Values that no computation yields, to see what was left alone.
constexpr int64_t kOldFlag = 7;
constexpr float kOldWeight = -3.25f;
PoseWeights Untouched() {
  return {kOldFlag, kOldFlag, kOldFlag, kOldWeight, kOldWeight, kOldWeight};
}

// An upright frontal face with a closed mouth: every test is passed. Moves and sizes are multiples
// of 100 pixels where thresholds are tried.
class Face {
 public:
  Face() : landmarks_(190, 0) {
    for (int k = 0; k < 95; k++) Put(k, 0, 0);
    Put(2, -7000, 0);
    Put(16, 7000, 0);
    Put(9, 0, 10000);
    Put(66, -1500, 0);
    Put(71, 1500, 0);
    Put(68, -600, 800);
    Put(69, 600, 800);
    Put(39, -5000, -4500);
    Put(45, -1800, -4500);
    Put(51, 1800, -4500);
    Put(57, 5000, -4500);
    Put(42, -3400, -5000);
    Put(48, -3400, -4000);
    Put(54, 3400, -5000);
    Put(60, 3400, -4000);
    Put(75, -3000, 5000);
    Put(81, 3000, 5000);
    Put(89, 0, 4900);
    Put(93, 0, 5100);
  }
  Face& Put(int k, int32_t x, int32_t y) {
    landmarks_[static_cast<size_t>(2 * k)] = x + 20000;
    landmarks_[static_cast<size_t>(2 * k + 1)] = y + 20000;
    return *this;
  }
  PoseWeights Weigh(PoseWeights start = {}) const {
    EXPECT_EQ(ComputePoseWeights(landmarks_.data(), &start), N3DS_OK);
    return start;
  }
  bool SwitchedOff() const { return Weigh().weighting_switch == 0; }

 private:
  std::vector<int32_t> landmarks_;
};

TEST(PoseWeights, StartingValuesAreThoseOfAnEarlyReturn) {
  const PoseWeights start;
  EXPECT_EQ(start.mouth_open, 0);
  EXPECT_EQ(start.frontal, 0);
  EXPECT_EQ(start.weighting_switch, 1);
  EXPECT_EQ(start.contour, 0.0f);
  EXPECT_EQ(start.range, 0.0f);
  EXPECT_EQ(start.inner, 1.0f);
}

TEST(PoseWeights, NullLandmarksAreRefused) {
  PoseWeights weights = Untouched();
  EXPECT_EQ(ComputePoseWeights(nullptr, &weights), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(weights.mouth_open, kOldFlag);
  EXPECT_EQ(weights.contour, kOldWeight);
}

TEST(PoseWeights, FrontalClosedMouthPassesEveryTest) {
  const PoseWeights weights = Face().Weigh();
  EXPECT_EQ(weights.mouth_open, 0);
  EXPECT_EQ(weights.frontal, 1);
  EXPECT_EQ(weights.weighting_switch, 1);
  EXPECT_EQ(weights.contour, 1.0f);
  EXPECT_EQ(weights.range, 1.0f);
  EXPECT_EQ(weights.inner, 1.0f);
}

TEST(PoseWeights, MouthIsOpenAboveATenthOfItsWidth) {
  // The mouth is 6000 wide.
  const PoseWeights closed = Face().Put(89, 0, 4700).Put(93, 0, 5299).Weigh();
  EXPECT_EQ(closed.mouth_open, 0);
  EXPECT_EQ(closed.range, 1.0f);
  const PoseWeights edge = Face().Put(89, 0, 4700).Put(93, 0, 5300).Weigh();
  EXPECT_EQ(edge.mouth_open, 0);  // 0.1 is not above 0.1
  EXPECT_EQ(edge.range, 1.0f);
  const PoseWeights open = Face().Put(89, 0, 4700).Put(93, 0, 5301).Weigh();
  EXPECT_EQ(open.mouth_open, 1);
  EXPECT_EQ(open.range, static_cast<float>(1.1 - 601.0 / 6000.0));
}

TEST(PoseWeights, RangeWeightFallsWithTheMouthOpening) {
  EXPECT_EQ(Face().Put(89, 0, 3500).Put(93, 0, 6500).Weigh().range, 0.6f);
  EXPECT_EQ(Face().Put(89, 0, 2000).Put(93, 0, 8000).Weigh().range, static_cast<float>(1.1 - 1.0));
  EXPECT_EQ(Face().Put(89, 0, 2000).Put(93, 0, 8001).Weigh().range, 0.1f);
}

TEST(PoseWeights, MouthWidthIsRoundedToSinglePrecision) {
  // A width whose single-precision value is smaller makes the ratio exceed the limit.
  const int32_t width = 16777217;  // single precision has 16777216
  Face face;
  face.Put(75, 0, 0).Put(81, width, 0).Put(89, 0, 0).Put(93, 1677721, 0);
  EXPECT_EQ(face.Weigh().range, 1.0f);  // 1677721 / 16777216 < 0.1
  face.Put(93, 1677722, 0);
  EXPECT_EQ(face.Weigh().range,
            static_cast<float>(1.1 - 1677722.0 / 16777216.0));  // not 1677722.0 / 16777217
}

TEST(PoseWeights, InnerWeightIsTheRatioOfTheHalfWidths) {
  EXPECT_EQ(Face().Put(2, -3500, 0).Weigh().inner, 0.5f);
  EXPECT_EQ(Face().Put(16, 1750, 0).Weigh().inner, 4.0f);
}

TEST(PoseWeights, MidpointsAreTruncatedTowardZero) {
  // Nose wings at x = -1 and 0: their middle is 0, not -1 or -0.5.
  std::vector<int32_t> landmarks(190, 0);
  const auto put = [&](size_t k, int32_t x, int32_t y) {
    landmarks[2 * k] = x;
    landmarks[2 * k + 1] = y;
  };
  put(81, 10, 0);
  put(66, -1, 0);
  put(2, -8, 0);
  put(16, 8, 0);
  PoseWeights weights;
  ComputePoseWeights(landmarks.data(), &weights);
  EXPECT_EQ(weights.inner, 1.0f);
}

TEST(PoseWeights, FrontalNeedsEvenHalfWidths) {
  EXPECT_EQ(Face().Put(2, -5251, 0).Weigh().frontal, 1);
  EXPECT_EQ(Face().Put(2, -5250, 0).Weigh().frontal, 0);  // 0.75 is not above 0.75
  EXPECT_EQ(Face().Put(16, 5251, 0).Weigh().frontal, 1);
  EXPECT_EQ(Face().Put(16, 5250, 0).Weigh().frontal, 0);
}

TEST(PoseWeights, FrontalNeedsEyesBetweenAHalfAndNineTenthsOfTheChinsDistance) {
  // The chin is 9200 below the nose.
  const auto frontal = [](int32_t eye_distance) {
    return Face()
        .Put(45, -1800, 800 - eye_distance)
        .Put(51, 1800, 800 - eye_distance)
        .Weigh()
        .frontal;
  };
  EXPECT_EQ(frontal(4600), 0);
  EXPECT_EQ(frontal(4601), 1);
  EXPECT_EQ(frontal(8279), 1);
  EXPECT_EQ(frontal(8280), 0);
}

TEST(PoseWeights, SwitchIsClearedByAChinOffTheMiddleOfTheMouth) {
  // Distances along one line, 3000 : 3450 is 1.15.
  const auto cleared = [](int32_t left, int32_t right) {
    Face face;
    face.Put(75, -left, 10000).Put(81, right, 10000).Put(89, 0, 10000).Put(93, 0, 10000);
    return face.SwitchedOff();
  };
  EXPECT_FALSE(cleared(3000, 3450));
  EXPECT_TRUE(cleared(3000, 3451));
  EXPECT_FALSE(cleared(3450, 3000));
  EXPECT_TRUE(cleared(3451, 3000));
}

TEST(PoseWeights, SwitchIsClearedByAMouthTooNearTheNose) {
  // The mouth's middle lies 5000 above the chin; 5000 / 2.3 = 2173.9 from the nose.
  EXPECT_FALSE(Face().Put(68, -600, 2826).Put(69, 600, 2826).SwitchedOff());  // 2174
  EXPECT_TRUE(Face().Put(68, -600, 2827).Put(69, 600, 2827).SwitchedOff());   // 2173
}

TEST(PoseWeights, SwitchIsClearedByUnevenOuterEyeCorners) {
  const auto cleared = [](int32_t left, int32_t right) {
    return Face().Put(39, -left, 800).Put(57, right, 800).SwitchedOff();
  };
  EXPECT_FALSE(cleared(4000, 4600));
  EXPECT_TRUE(cleared(4000, 4601));
  EXPECT_FALSE(cleared(4600, 4000));
  EXPECT_TRUE(cleared(4601, 4000));
}

TEST(PoseWeights, SwitchIsClearedByAnEyeLineLessThan75DegreesFromTheNoseLine) {
  // The nose line is upright, so the eye line may rise by 15 degrees: 6800 across, 1822 up.
  const auto cleared = [](int32_t rise) {
    return Face().Put(54, 3400, -5000 - rise).Put(60, 3400, -4000 - rise).SwitchedOff();
  };
  EXPECT_FALSE(cleared(1800));
  EXPECT_TRUE(cleared(1850));
  EXPECT_FALSE(cleared(-1800));
  EXPECT_TRUE(cleared(-1850));
}

TEST(PoseWeights, UprightAndLevelLinesHaveNormalsOfTheirOwn) {
  // Eye line upright: parallel to the nose line.
  EXPECT_TRUE(Face().Put(54, -3400, 5000).Put(60, -3400, 6000).SwitchedOff());
  // Eyes at one point: taken as an upright line.
  EXPECT_TRUE(Face().Put(54, -3400, -5000).Put(60, -3400, -4000).SwitchedOff());
  // Nose line slanted by 45 degrees, eye line level: 45 degrees between them. The eye corners are
  // placed evenly round the slanted nose.
  EXPECT_TRUE(Face()
                  .Put(68, -4200, 800)
                  .Put(69, -4200, 800)
                  .Put(39, -9200, 800)
                  .Put(57, 800, 800)
                  .SwitchedOff());
}

TEST(PoseWeights, TheAngleOfParallelLinesIsFormedFromSinglePrecisionNormals) {
  // A nose line from (0, 0) to (48, 35), a mouth at right angles to it, and an eye line to try.
  const auto cleared = [](int32_t eye_dx, int32_t eye_dy) {
    return Face()
        .Put(68, 0, 0)
        .Put(69, 0, 0)
        .Put(75, 13, 83)
        .Put(81, 83, -13)
        .Put(9, 96, 70)
        .Put(39, -100, 0)
        .Put(57, 100, 0)
        .Put(42, 0, -100)
        .Put(48, 0, -100)
        .Put(54, eye_dx, -100 + eye_dy)
        .Put(60, eye_dx, -100 + eye_dy)
        .SwitchedOff();
  };
  EXPECT_FALSE(cleared(-35, 48));  // at right angles
  EXPECT_TRUE(cleared(48, 35));    // parallel: the angle is 0
  EXPECT_TRUE(cleared(60, 43));
  EXPECT_FALSE(cleared(59, 43));  // parallel but for rounding: the cosine exceeds 1
}

TEST(PoseWeights, AZeroMouthWidthLeavesEverything) {
  const PoseWeights weights = Face().Put(81, -3000, 5000).Weigh(Untouched());
  EXPECT_EQ(weights.mouth_open, kOldFlag);
  EXPECT_EQ(weights.frontal, kOldFlag);
  EXPECT_EQ(weights.weighting_switch, kOldFlag);
  EXPECT_EQ(weights.contour, kOldWeight);
  EXPECT_EQ(weights.range, kOldWeight);
  EXPECT_EQ(weights.inner, kOldWeight);
}

TEST(PoseWeights, AZeroFaceWidthStopsAfterTheMouthFlag) {
  const PoseWeights weights = Face().Put(2, 0, 0).Put(16, 0, 0).Put(93, 0, 9000).Weigh(Untouched());
  EXPECT_EQ(weights.mouth_open, 1);
  EXPECT_EQ(weights.contour, kOldWeight);
  EXPECT_EQ(weights.range, kOldWeight);
  EXPECT_EQ(weights.inner, kOldWeight);
  EXPECT_EQ(weights.frontal, kOldFlag);
}

TEST(PoseWeights, AZeroRightHalfStopsBeforeTheInnerWeight) {
  const PoseWeights weights = Face().Put(16, 0, 0).Weigh(Untouched());
  EXPECT_EQ(weights.contour, 1.0f);
  EXPECT_EQ(weights.range, 1.0f);
  EXPECT_EQ(weights.inner, kOldWeight);
  EXPECT_EQ(weights.frontal, kOldFlag);
  EXPECT_EQ(weights.weighting_switch, kOldFlag);
}

TEST(PoseWeights, AZeroLeftHalfIsNoReasonToStop) {
  const PoseWeights weights = Face().Put(2, 0, 0).Weigh(Untouched());
  EXPECT_EQ(weights.inner, 0.0f);
  EXPECT_EQ(weights.frontal, kOldFlag);  // asymmetric
}

TEST(PoseWeights, AChinAtTheNoseStopsBeforeTheFrontalFlag) {
  const PoseWeights weights = Face().Put(9, 0, 800).Weigh(Untouched());
  EXPECT_EQ(weights.inner, 1.0f);
  EXPECT_EQ(weights.frontal, kOldFlag);
  EXPECT_EQ(weights.weighting_switch, kOldFlag);
}

TEST(PoseWeights, AChinAtAMouthCornerStopsBeforeTheSwitch) {
  for (const int corner : {75, 81}) {
    const PoseWeights weights = Face().Put(corner, 0, 10000).Weigh(Untouched());
    EXPECT_EQ(weights.frontal, 1);
    EXPECT_EQ(weights.weighting_switch, kOldFlag);
  }
}

TEST(PoseWeights, AMouthAtTheNoseStopsAfterTheFirstSwitchTest) {
  Face face;
  face.Put(68, 0, 5000).Put(69, 0, 5000).Put(39, -100, 5000);  // uneven eye corners
  EXPECT_EQ(face.Weigh(Untouched()).weighting_switch, kOldFlag);
  face.Put(75, -3000, 6000).Put(81, 3000, 4000);  // chin off the middle
  EXPECT_EQ(face.Weigh(Untouched()).weighting_switch, 0);
}

TEST(PoseWeights, AnEyeCornerAtTheNoseStopsBeforeTheLastSwitchTest) {
  for (const int corner : {39, 57}) {
    Face face;
    face.Put(corner, 0, 800).Put(54, -3400, 5000).Put(60, -3400, 6000);  // upright eye line
    EXPECT_EQ(face.Weigh(Untouched()).weighting_switch, kOldFlag);
  }
}

TEST(PoseWeights, InnerWeightIsClampedForTheFits) {
  EXPECT_EQ(ClampInnerWeight(1.5f), 1.5f);
  EXPECT_EQ(ClampInnerWeight(0.0f), 0.1f);
  EXPECT_EQ(ClampInnerWeight(std::nextafter(0.1f, 0.0f)), 0.1f);
  EXPECT_EQ(ClampInnerWeight(0.1f), 0.1f);
  EXPECT_EQ(ClampInnerWeight(10.0f), 10.0f);
  EXPECT_EQ(ClampInnerWeight(std::nextafter(10.0f, 11.0f)), 10.0f);
  EXPECT_EQ(ClampInnerWeight(std::numeric_limits<float>::infinity()), 10.0f);
}

// The same once more, as one plain list of steps.
void ReferenceWeights(const int32_t* p, PoseWeights* out) {
  using Pair = std::pair<int64_t, int64_t>;
  const auto at = [p](int k) { return Pair{p[2 * k], p[2 * k + 1]}; };
  const auto middle = [](Pair a, Pair b) {
    return Pair{(a.first + b.first) / 2, (a.second + b.second) / 2};
  };
  const auto distance = [](Pair a, Pair b) {
    const auto dx = static_cast<double>(a.first - b.first);
    const auto dy = static_cast<double>(a.second - b.second);
    return std::sqrt(dx * dx + dy * dy);
  };
  const auto normal = [](Pair a, Pair b) {
    if (a.first == b.first) return std::pair<float, float>{1.0f, 0.0f};
    if (a.second == b.second) return std::pair<float, float>{0.0f, 1.0f};
    return std::pair<float, float>{
        static_cast<float>(a.second - b.second) / static_cast<float>(a.first - b.first), -1.0f};
  };
  const double tiny = 1e-6;

  const float mouth_width = static_cast<float>(distance(at(75), at(81)));
  if (mouth_width < tiny) return;
  const double r = distance(at(89), at(93)) / mouth_width;
  if (r > 0.1) out->mouth_open = 1;

  const Pair m = middle(at(66), at(71));
  const double a = distance(at(2), m);
  const double b = distance(at(16), m);
  if (std::max(a, b) < tiny) return;
  const double s = std::min(a, b) / std::max(a, b);

  out->contour = 1.0f;
  out->range = 0.1f;
  if (r <= 1) out->range = static_cast<float>(1.1 - r);
  if (r < 0.1) out->range = 1.0f;
  if (b < tiny) return;
  out->inner = static_cast<float>(a / b);

  const Pair eyes = middle(at(45), at(51));
  const Pair base = middle(at(68), at(69));
  if (distance(at(9), base) < tiny) return;
  const double v = distance(eyes, base) / distance(at(9), base);
  if (v > 0.5 && s > 0.75 && v < 0.9) out->frontal = 1;

  const double c75 = distance(at(9), at(75)), c81 = distance(at(9), at(81));
  if (std::min(c75, c81) < tiny) return;
  if (std::max(c75, c81) / std::min(c75, c81) > 1.15) out->weighting_switch = 0;

  const Pair mouth = middle(at(75), at(81));
  if (distance(mouth, base) < tiny) return;
  if (distance(mouth, at(9)) / distance(mouth, base) > 2.3) out->weighting_switch = 0;

  const double e39 = distance(base, at(39)), e57 = distance(base, at(57));
  if (std::min(e39, e57) < tiny) return;
  if (std::max(e39, e57) / std::min(e39, e57) > 1.15) out->weighting_switch = 0;

  const auto na = normal(middle(at(42), at(48)), middle(at(54), at(60)));
  const auto nb = normal(mouth, base);
  const float dot = std::fabs(na.first * nb.first + na.second * nb.second);
  const float squared =
      (na.first * na.first + na.second * na.second) * (nb.first * nb.first + nb.second * nb.second);
  const auto cosine =
      static_cast<float>(static_cast<double>(dot) / std::sqrt(static_cast<double>(squared)));
  if (std::acos(static_cast<double>(cosine)) * 180.0 / 3.14159 < 75) out->weighting_switch = 0;
}

TEST(PoseWeights, MatchTheStraightforwardVersionOnRandomLandmarks) {
  Random random = TestRandom();
  // Few values make coincident points, and with them early returns, common.
  std::vector<std::tuple<int64_t, int64_t, int64_t>> seen;
  for (int trial = 0; trial < 30000; trial++) {
    const int32_t size = trial % 3 == 0 ? 1 : trial % 3 == 1 ? 4 : 1000;
    std::vector<int32_t> landmarks(190);
    for (int32_t& c : landmarks) c = random.Int(-size, size);
    PoseWeights expected = Untouched();
    ReferenceWeights(landmarks.data(), &expected);
    PoseWeights actual = Untouched();
    ASSERT_EQ(ComputePoseWeights(landmarks.data(), &actual), N3DS_OK);
    ASSERT_EQ(actual.mouth_open, expected.mouth_open) << trial;
    ASSERT_EQ(actual.frontal, expected.frontal) << trial;
    ASSERT_EQ(actual.weighting_switch, expected.weighting_switch) << trial;
    ASSERT_EQ(actual.contour, expected.contour) << trial;
    ASSERT_EQ(actual.range, expected.range) << trial;
    ASSERT_EQ(actual.inner, expected.inner) << trial;
    seen.emplace_back(actual.mouth_open, actual.frontal, actual.weighting_switch);
  }
  std::sort(seen.begin(), seen.end());
  seen.erase(std::unique(seen.begin(), seen.end()), seen.end());
  EXPECT_GE(seen.size(), 6u);  // combinations of set, cleared and left alone
}

TEST(PoseWeights, MatchTheStraightforwardVersionOnFaces) {
  Random random = TestRandom();
  int frontal = 0, switched = 0;
  for (int trial = 0; trial < 500; trial++) {
    HeadPlace place;
    place.yaw = random.In(-0.3, 0.3);
    place.pitch = random.In(-0.2, 0.2);
    place.roll = random.In(-0.2, 0.2);
    const std::vector<int32_t> landmarks =
        DetectLandmarks(ModelShape(), place, 640, 480, 101, 1, &random);
    PoseWeights expected, actual;
    ReferenceWeights(landmarks.data(), &expected);
    ASSERT_EQ(ComputePoseWeights(landmarks.data(), &actual), N3DS_OK);
    ASSERT_EQ(actual.mouth_open, expected.mouth_open);
    ASSERT_EQ(actual.frontal, expected.frontal);
    ASSERT_EQ(actual.weighting_switch, expected.weighting_switch);
    ASSERT_EQ(actual.range, expected.range);
    ASSERT_EQ(actual.inner, expected.inner);
    frontal += actual.frontal == 1 ? 1 : 0;
    switched += actual.weighting_switch == 1 ? 1 : 0;
  }
  EXPECT_GT(frontal, 10);
  EXPECT_GT(switched, 10);
  EXPECT_LT(frontal, 490);
  EXPECT_LT(switched, 490);
}

TEST(PoseWeights, CoordinatesAtTheEndsOfTheRangeAreHarmless) {
  Random random = TestRandom();
  for (int trial = 0; trial < 2000; trial++) {
    std::vector<int32_t> landmarks(190);
    for (int32_t& c : landmarks) c = random.Int(INT32_MIN, INT32_MAX);
    PoseWeights weights;
    ASSERT_EQ(ComputePoseWeights(landmarks.data(), &weights), N3DS_OK);
  }
}

}  // namespace
}  // namespace n3ds::testing
