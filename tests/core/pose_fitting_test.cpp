// SPDX-License-Identifier: MIT
#include "core/pose_fitting.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <numeric>
#include <string>
#include <vector>

#include "core/pose_rounds.h"
#include "support/bits.h"
#include "support/face_scene.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAreArray;

constexpr FitWeights kWeights = {0, 1.0f, 1.0f, 1.0f};

// A fit's arguments and results, ready for a frontal face in a 640 x 480 image.
struct Fit {
  std::vector<int32_t> landmarks = DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480);
  std::vector<float> vertices = MeanShapeFloats();
  Camera camera = Camera(640, 480);
  float rotation[9];
  float translation[3];
  float pose[7];
  int32_t contour[19];
  int32_t table[95];
  FitWeights weights = kWeights;

  Fit() {
    std::fill_n(rotation, 9, -77.0f);
    std::fill_n(translation, 3, -77.0f);
    std::copy_n(kStartPose, 7, pose);
    std::copy_n(kDefaultContourVertexIndices, 19, contour);
    std::fill_n(table, 19, 5);
    std::copy_n(kInnerLandmarkVertexIndices, 76, table + 19);
  }
  int64_t Run(const int32_t* override_contour, MHandle memory = nullptr) {
    return FitRigidPose(memory, landmarks.data(), vertices.data(), camera.k, rotation, translation,
                        pose, override_contour, table, weights);
  }
  int64_t RunWithContour(MHandle memory = nullptr) { return Run(contour, memory); }
  bool OutputsUntouched() const {
    return rotation[0] == -77.0f && rotation[8] == -77.0f && translation[0] == -77.0f &&
           translation[2] == -77.0f;
  }
  // The fit's own point pairs, for the solver.
  void Pairs(size_t first, std::vector<float>* points, std::vector<float>* model) const {
    for (size_t i = first; i < 95; i++) {
      points->push_back(static_cast<float>(landmarks[2 * i]));
      points->push_back(static_cast<float>(landmarks[2 * i + 1]));
      const size_t v = 3 * static_cast<size_t>(table[i]);
      model->insert(model->end(), &vertices[v], &vertices[v] + 3);
    }
  }
};

// The documented normalisation, on its own.
std::vector<float> Normalised(const std::vector<float>& p) {
  float n = 0;
  n = std::fma(p[0], p[0], n);
  n = std::fma(p[1], p[1], n);
  n = std::fma(p[2], p[2], n);
  n = std::fma(p[3], p[3], n);
  const float root = std::sqrt(n);
  return {p[0] / root, p[1] / root, p[2] / root, p[3] / root, p[4] / n, p[5] / n, p[6] / n};
}

TEST(FitRigidPose, FindsAKnownPose) {
  Random random = TestRandom();
  for (int trial = 0; trial < 50; trial++) {
    HeadPlace place;
    place.yaw = random.In(-0.3, 0.3);
    place.pitch = random.In(-0.2, 0.2);
    place.roll = random.In(-0.2, 0.2);
    place.x = random.In(-80, 80);
    place.y = random.In(-60, 60);
    place.z = random.In(350, 900);
    Fit fit;
    fit.landmarks = DetectLandmarks(ModelShape(), place, 1280, 960);
    fit.camera = Camera(1280, 960);
    // The contour of the default correspondence is where these landmarks were taken.
    ASSERT_EQ(fit.RunWithContour(), N3DS_OK);
    const RigidTransform truth = TransformOf(place);
    for (size_t i = 0; i < 9; i++) EXPECT_NEAR(fit.rotation[i], truth.r[i], 0.01) << trial;
    for (size_t i = 0; i < 3; i++) EXPECT_NEAR(fit.translation[i], truth.t[i], 0.01 * place.z);
  }
}

TEST(FitRigidPose, ReturnsAUnitQuaternionItsRotationAndItsTranslation) {
  Fit fit;
  ASSERT_EQ(fit.RunWithContour(), N3DS_OK);
  float length = 0;
  for (int i = 0; i < 4; i++) length += fit.pose[i] * fit.pose[i];
  EXPECT_NEAR(length, 1.0f, 1e-6f);
  float rotation[9];
  QuatToRotationMatrix(fit.pose, rotation);
  EXPECT_EQ(Bits(fit.rotation), Bits(rotation));
  EXPECT_EQ(Bits(fit.translation), Bits(fit.pose + 4, 3));
}

TEST(FitRigidPose, NullArgumentsAreRefusedAndNothingChanges) {
  Fit fit;
  const Fit before = fit;
  const int32_t* l = fit.landmarks.data();
  const float* v = fit.vertices.data();
  const float* k = fit.camera.k;
  float* r = fit.rotation;
  float* t = fit.translation;
  const auto call = FitRigidPose;
  const FitWeights& w = fit.weights;
  ExpectEachNullRefused(N3DS_NULL_ARGUMENT, call, nullptr, l, v, k, r, t, fit.pose, nullptr,
                        fit.table, w);
  EXPECT_TRUE(fit.OutputsUntouched());
  EXPECT_THAT(fit.table, ElementsAreArray(before.table));
  EXPECT_THAT(fit.pose, ElementsAreArray(before.pose));
}

TEST(FitRigidPose, WithoutAContourTheOutlineTakesNoPart) {
  Fit fit;
  ASSERT_EQ(fit.Run(nullptr), N3DS_OK);
  Fit moved;
  for (size_t i = 0; i < 38; i++) moved.landmarks[i] += 500;
  for (int i = 0; i < 19; i++) moved.table[i] = i;
  ASSERT_EQ(moved.Run(nullptr), N3DS_OK);
  EXPECT_EQ(Bits(moved.pose), Bits(fit.pose));
  for (int i = 0; i < 19; i++) EXPECT_EQ(moved.table[i], i);

  Fit with_contour;
  ASSERT_EQ(with_contour.RunWithContour(), N3DS_OK);
  EXPECT_NE(Bits(with_contour.pose), Bits(fit.pose));
}

TEST(FitRigidPose, HandsSeventySixPairsToTheSolverWithoutAContour) {
  Fit fit;
  std::vector<float> points, model;
  fit.Pairs(19, &points, &model);
  std::vector<float> solved(kStartPose, kStartPose + 7);
  ASSERT_EQ(SolveByLM(nullptr, points.data(), model.data(), 76, fit.camera.k, solved.data(), 1.0f,
                      1.0f, 0, 1.0f, 7),
            N3DS_OK);
  ASSERT_EQ(fit.Run(nullptr), N3DS_OK);
  EXPECT_EQ(Bits(fit.pose), Bits(Normalised(solved)));
}

TEST(FitRigidPose, PassesWeightsAndSwitchToTheSolverUnchanged) {
  const FitWeights choices[] = {{0, 1.0f, 1.0f, 1.0f},
                                {1, 1.0f, 1.0f, 1.0f},
                                {1, 0.5f, 0.3f, 2.5f},
                                {0, 0.25f, 0.7f, 0.4f},
                                {1, 1.0f, 0.1f, 0.4f}};
  std::vector<std::vector<uint32_t>> results;
  for (const FitWeights& weights : choices) {
    Fit fit;
    Random random = TestRandom();
    for (int32_t& c : fit.landmarks) c += random.Int(-9, 9);
    fit.weights = weights;
    std::copy_n(fit.contour, 19, fit.table);
    std::vector<float> points, model;
    fit.Pairs(0, &points, &model);
    std::vector<float> solved(kStartPose, kStartPose + 7);
    ASSERT_EQ(SolveByLM(nullptr, points.data(), model.data(), 95, fit.camera.k, solved.data(),
                        weights.contour, weights.range, weights.weighting_switch, weights.inner, 7),
              N3DS_OK);
    ASSERT_EQ(fit.RunWithContour(), N3DS_OK);
    EXPECT_EQ(Bits(fit.pose), Bits(Normalised(solved)));
    for (const auto& other : results) EXPECT_NE(Bits(fit.pose), other);
    results.push_back(Bits(fit.pose));
  }
}

TEST(FitRigidPose, ContourStaysInTheTable) {
  Fit fit;
  ASSERT_EQ(fit.RunWithContour(), N3DS_OK);
  EXPECT_THAT(std::vector<int32_t>(fit.table, fit.table + 19), ElementsAreArray(fit.contour));
  EXPECT_THAT(std::vector<int32_t>(fit.table + 19, fit.table + 95),
              ElementsAreArray(kInnerLandmarkVertexIndices));
}

TEST(FitRigidPose, APointAtDepthZeroFailsAndLeavesThePoseButKeepsTheContour) {
  Fit fit;
  // An unturned camera in the plane of landmark 30's vertex.
  const float z = fit.vertices[3 * static_cast<size_t>(fit.table[30]) + 2];
  const float start[7] = {1, 0, 0, 0, 3, 4, -z};
  std::copy_n(start, 7, fit.pose);
  ::testing::internal::CaptureStdout();
  EXPECT_EQ(fit.RunWithContour(), N3DS_NUMERICAL);
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "zero in zc\n");
  EXPECT_THAT(fit.pose, ElementsAreArray(start));
  EXPECT_TRUE(fit.OutputsUntouched());
  EXPECT_THAT(std::vector<int32_t>(fit.table, fit.table + 19), ElementsAreArray(fit.contour));
}

TEST(FitRigidPose, ScaleOfTheQuaternionIsFoldedIntoTheTranslation) {
  // The same problem from a start of twice the quaternion and four times the translation, which
  // projects every point alike.
  Fit fit;
  for (int i = 0; i < 4; i++) fit.pose[i] *= 2;
  for (int i = 4; i < 7; i++) fit.pose[i] *= 4;
  std::copy_n(fit.contour, 19, fit.table);
  std::vector<float> points, model;
  fit.Pairs(0, &points, &model);
  std::vector<float> solved(fit.pose, fit.pose + 7);
  ASSERT_EQ(SolveByLM(nullptr, points.data(), model.data(), 95, fit.camera.k, solved.data(), 1.0f,
                      1.0f, 0, 1.0f, 7),
            N3DS_OK);
  float squared = 0;
  for (size_t i = 0; i < 4; i++) squared += solved[i] * solved[i];
  ASSERT_GT(squared, 3.0f);  // far from a unit quaternion
  ASSERT_EQ(fit.RunWithContour(), N3DS_OK);
  EXPECT_EQ(Bits(fit.pose), Bits(Normalised(solved)));

  // Every point projects as under the solver's pose.
  float r[9];
  QuatToRotationMatrix(solved.data(), r);
  for (size_t i = 0; i < 95; i++) {
    const float* p = &model[3 * i];
    double u[2], v[2];
    int n = 0;
    for (const auto& [m, t] : {std::make_pair(static_cast<const float*>(r), &solved[4]),
                               std::make_pair(static_cast<const float*>(fit.rotation),
                                              static_cast<float*>(fit.translation))}) {
      const double z = double{m[6]} * p[0] + double{m[7]} * p[1] + double{m[8]} * p[2] + t[2];
      u[n] = 560 * (double{m[0]} * p[0] + double{m[1]} * p[1] + double{m[2]} * p[2] + t[0]) / z;
      v[n++] = 560 * (double{m[3]} * p[0] + double{m[4]} * p[1] + double{m[5]} * p[2] + t[1]) / z;
    }
    EXPECT_NEAR(u[0], u[1], 0.001);
    EXPECT_NEAR(v[0], v[1], 0.001);
  }
}

TEST(FitRigidPose, AZeroQuaternionIsLeftAsItIs) {
  // All points collapse to the image centre, where all landmarks lie: solved before the first step.
  Fit fit;
  for (size_t i = 0; i < 95; i++) {
    fit.landmarks[2 * i] = 320;
    fit.landmarks[2 * i + 1] = 240;
  }
  const float start[7] = {0, 0, 0, 0, 0, 0, 500};
  std::copy_n(start, 7, fit.pose);
  EXPECT_EQ(fit.RunWithContour(), N3DS_OK);
  EXPECT_THAT(fit.pose, ElementsAreArray(start));
  EXPECT_THAT(fit.rotation, Each(0.0f));
  EXPECT_EQ(fit.translation[2], 500.0f);
}

TEST(FitRigidPose, ReadsFocalLengthsAndCentreOfTheCameraOnly) {
  Fit fit, other;
  for (const int i : {1, 3, 6, 7, 8}) other.camera.k[i] = std::numeric_limits<float>::quiet_NaN();
  ASSERT_EQ(fit.RunWithContour(), N3DS_OK);
  ASSERT_EQ(other.RunWithContour(), N3DS_OK);
  EXPECT_EQ(Bits(fit.pose), Bits(other.pose));
}

TEST(FitRigidPose, ExhaustedMemoryLeavesThePoseAndLosesNothing) {
  // The solver's own codes: -1 for its first arrays, -201 for the others.
  int first = 0, later = 0;
  int64_t result = -1;
  for (size_t size = 40; result != N3DS_OK; size += 32) {
    ASSERT_LT(size, 40000u);
    std::vector<unsigned char> area(size);
    const MHandle pool = MMemMgrCreate(area.data(), size);
    const size_t before = GetMaxAllocMemSize(pool);
    Fit fit;
    result = fit.RunWithContour(pool);
    EXPECT_EQ(GetMaxAllocMemSize(pool), before);
    if (result == N3DS_OK) continue;
    EXPECT_TRUE(result == N3DS_NULL_ARGUMENT || result == N3DS_NO_MEMORY) << result;
    (result == N3DS_NULL_ARGUMENT ? first : later)++;
    EXPECT_EQ(Bits(fit.pose), Bits(kStartPose));
    EXPECT_TRUE(fit.OutputsUntouched());
    EXPECT_EQ(fit.table[0], kDefaultContourVertexIndices[0]);
  }
  EXPECT_GT(first, 10);
  EXPECT_GT(later, 2);
}

}  // namespace
}  // namespace n3ds::testing
