// SPDX-License-Identifier: MIT
#include "core/output_matrices.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <vector>

#include "support/bits.h"
#include "support/face_scene.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAreArray;

constexpr float kIdentity[9] = {1, 0, 0, 0, 1, 0, 0, 0, 1};
constexpr float kNan = std::numeric_limits<float>::quiet_NaN();

TEST(ModelViewMatrix, FlipsTheCamerasYAndZ) {
  const float r[9] = {1, 2, 3, 4, 5, 6, 7, 8, 9};
  const float t[3] = {10, 11, 12};
  float out[16];
  ASSERT_EQ(SolveForModelViewMatrix(r, t, out), N3DS_OK);
  EXPECT_THAT(out, ElementsAreArray({1, -4, -7, 0, 2, -5, -8, 0, 3, -6, -9, 0, 10, -11, -12, 1}));
}

TEST(ModelViewMatrix, OfTheIdentityAtEightHundredMillimetres) {
  const float t[3] = {0, 0, 800};
  float out[16];
  ASSERT_EQ(SolveForModelViewMatrix(kIdentity, t, out), N3DS_OK);
  EXPECT_EQ(out[14], -800.0f);
  EXPECT_EQ(out[15], 1.0f);
}

TEST(ModelViewMatrix, NullArgumentsAreRefused) {
  const float t[3] = {};
  float out[16];
  std::fill_n(out, 16, 3.0f);
  ExpectEachNullRefused(N3DS_NULL_ARGUMENT, SolveForModelViewMatrix, kIdentity, t, out);
  EXPECT_THAT(out, Each(3.0f));
}

TEST(ProjectionMatrix, OfAFocalLengthOf500In640By480) {
  const float k[9] = {500, 0, 320, 0, 500, 240, 0, 0, 1};
  float out[16];
  ASSERT_EQ(SolveForProjectionMatrix(k, 640, 480, 1.0f, 5000.0f, out), N3DS_OK);
  std::vector<float> expected(16, 0.0f);
  expected[0] = 1000.0f / 640.0f;
  expected[5] = 1000.0f / 480.0f;
  expected[10] = -5001.0f / 4999.0f;
  expected[11] = -1.0f;
  expected[14] = -10000.0f / 4999.0f;
  EXPECT_THAT(out, ElementsAreArray(expected));
}

TEST(ProjectionMatrix, AnOffCentreCameraShiftsTheImage) {
  const float k[9] = {500, 0, 330, 0, 400, 200, 0, 0, 1};
  float out[16];
  ASSERT_EQ(SolveForProjectionMatrix(k, 640, 480, 0.1f, 10.0f, out), N3DS_OK);
  EXPECT_EQ(out[0], 2.0f * 500.0f / 640.0f);
  EXPECT_EQ(out[5], 2.0f * 400.0f / 480.0f);
  EXPECT_EQ(out[8], static_cast<float>(1.0 - 2.0 * 330.0 / 640.0));
  EXPECT_EQ(out[9], static_cast<float>(2.0 * 200.0 / 480.0 - 1.0));
}

TEST(ProjectionMatrix, CentreIsComputedInDouble) {
  const float k[9] = {1, 0, 333.3333f, 0, 1, 222.2222f, 0, 0, 1};
  float out[16];
  ASSERT_EQ(SolveForProjectionMatrix(k, 666, 444, 1.0f, 5000.0f, out), N3DS_OK);
  EXPECT_EQ(out[8], static_cast<float>(1.0 - 2.0 * static_cast<double>(333.3333f) / 666.0));
  EXPECT_EQ(out[9], static_cast<float>(2.0 * static_cast<double>(222.2222f) / 444.0 - 1.0));
  EXPECT_NE(out[8], 1.0f - 2.0f * 333.3333f / 666.0f);
}

TEST(ProjectionMatrix, BadArgumentsAreRefusedAndLeaveTheOutput) {
  const Camera camera(640, 480);
  float out[16];
  std::fill_n(out, 16, 3.0f);
  const auto solve = SolveForProjectionMatrix;
  EXPECT_EQ(solve(nullptr, 640, 480, 1, 5000, out), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(solve(camera.k, 640, 480, 1, 5000, nullptr), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(solve(nullptr, 0, 0, 0, 0, nullptr), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(solve(camera.k, 0, 480, 1, 5000, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, -1, 480, 1, 5000, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, 0, 1, 5000, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, INT32_MIN, 1, 5000, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, 480, 0, 5000, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, 480, -1, 5000, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, 480, 7, 7, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, 480, 8, 7, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, 480, kNan, 7, out), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(camera.k, 640, 480, 1, kNan, out), N3DS_BAD_VALUE);
  EXPECT_THAT(out, Each(3.0f));
  EXPECT_EQ(solve(camera.k, 1, 1, 1, 5000, out), N3DS_OK);
}

// Column-major product with a point (x, y, z, 1).
std::vector<double> Apply(const float* m, double x, double y, double z, double w = 1) {
  std::vector<double> out;
  for (int row = 0; row < 4; row++) {
    out.push_back(m[row] * x + m[row + 4] * y + m[row + 8] * z + m[row + 12] * w);
  }
  return out;
}

TEST(OutputMatrices, ProjectEveryPointToItsPixel) {
  // Model point -> camera pixel by pinhole = model point -> normalised device coordinates -> pixel.
  Random random = TestRandom();
  for (int trial = 0; trial < 200; trial++) {
    const int width = 2 * random.Int(1, 1000), height = 2 * random.Int(1, 1000);
    const Camera camera(width, height);
    HeadPlace place;
    place.yaw = random.In(-1, 1);
    place.pitch = random.In(-1, 1);
    const RigidTransform pose = TransformOf(place);
    float r[9], t[3];
    for (int i = 0; i < 9; i++) r[i] = static_cast<float>(pose.r[i]);
    for (int i = 0; i < 3; i++) t[i] = static_cast<float>(pose.t[i]);
    N3DS_RIGID_MATRIX result = {};
    WriteModelViewAndProjection(r, t, camera.k, result.modelMatrix, result.projectionMatrix);
    const Vec3 p = {random.In(-90, 90), random.In(-90, 90), random.In(-90, 90)};
    double u, v;
    Project(pose, p, width, height, &u, &v);
    const std::vector<double> eye = Apply(result.modelMatrix, p.x, p.y, p.z);
    const std::vector<double> clip = Apply(result.projectionMatrix, eye[0], eye[1], eye[2], eye[3]);
    EXPECT_NEAR((clip[0] / clip[3] + 1) / 2 * width, u, 0.01 + 1e-5 * std::fabs(u));
    EXPECT_NEAR((1 - clip[1] / clip[3]) / 2 * height, v, 0.01 + 1e-5 * std::fabs(v));
    EXPECT_GT(clip[3], 0);
    EXPECT_LT(std::fabs(clip[2] / clip[3]), 1);
  }
}

TEST(OutputMatrices, AnOddImageLosesItsLastColumnAndRow) {
  const Camera camera(641, 481);
  ASSERT_EQ(camera.k[2], 320.5f);
  const float t[3] = {0, 0, 1};
  N3DS_RIGID_MATRIX result = {};
  WriteModelViewAndProjection(kIdentity, t, camera.k, result.modelMatrix, result.projectionMatrix);
  float expected[16];
  ASSERT_EQ(SolveForProjectionMatrix(camera.k, 640, 480, 1.0f, 5000.0f, expected), N3DS_OK);
  EXPECT_EQ(Bits(result.projectionMatrix), Bits(expected));
}

TEST(OutputMatrices, AImageOfOnePixelKeepsTheProjectionBefore) {
  const Camera camera(1, 1);
  const float t[3] = {0, 0, 1};
  N3DS_RIGID_MATRIX result = {};
  std::fill_n(result.projectionMatrix, 16, 5.0f);
  WriteModelViewAndProjection(kIdentity, t, camera.k, result.modelMatrix, result.projectionMatrix);
  EXPECT_THAT(result.projectionMatrix, Each(5.0f));
  EXPECT_EQ(result.modelMatrix[14], -1.0f);
}

TEST(SplitModelView, MovesTheModelForwardAndTheViewBack) {
  N3DS_RIGID_MATRIX result = {};
  const float t[3] = {0, 0, 800};
  const Camera camera(640, 480);
  WriteModelViewAndProjection(kIdentity, t, camera.k, result.modelMatrix, result.projectionMatrix);
  float landmarks[3] = {1, 2, 3};
  N3DS_RIGID_MATRIX out = {};
  out.landmarks3D = landmarks;
  SplitModelView(result, &out);
  EXPECT_EQ(out.modelMatrix[14], -300.0f);
  EXPECT_THAT(out.viewMatrix,
              ElementsAreArray({1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, -500, 1}));
  EXPECT_EQ(Bits(out.projectionMatrix), Bits(result.projectionMatrix));
  EXPECT_EQ(out.landmarks3D, landmarks);
  EXPECT_EQ(landmarks[0], 1.0f);
}

TEST(SplitModelView, ViewTimesModelIsTheModelView) {
  N3DS_RIGID_MATRIX result = {};
  for (int i = 0; i < 16; i++) result.modelMatrix[i] = static_cast<float>(i * i - 20);
  N3DS_RIGID_MATRIX out = {};
  SplitModelView(result, &out);
  for (int column = 0; column < 4; column++) {
    const float* c = out.modelMatrix + 4 * column;
    const std::vector<double> product = Apply(out.viewMatrix, c[0], c[1], c[2], c[3]);
    for (int row = 0; row < 4; row++) {
      EXPECT_EQ(product[static_cast<size_t>(row)], result.modelMatrix[4 * column + row]);
    }
  }
  // Every element of the third row gains 500 times the one below.
  EXPECT_EQ(out.modelMatrix[2], result.modelMatrix[2] + 500 * result.modelMatrix[3]);
  EXPECT_EQ(out.modelMatrix[10], result.modelMatrix[10] + 500 * result.modelMatrix[11]);
}

TEST(Tilt, RotationIsMultipliedByTheTiltFromTheRight) {
  const float r[9] = {1, 2, 3, 4, 5, 6, 7, 8, 9};
  float tilted[9];
  TiltRotation(r, tilted);
  for (int row = 0; row < 3; row++) {
    const float e1 = r[3 * row], e2 = r[3 * row + 1], e3 = r[3 * row + 2];
    EXPECT_EQ(tilted[3 * row], e1);
    EXPECT_EQ(tilted[3 * row + 1], 0.9397f * e2 - 0.342f * e3);
    EXPECT_EQ(tilted[3 * row + 2], 0.342f * e2 + 0.9397f * e3);
  }
}

TEST(Tilt, OfAPointUndoesTheTiltOfTheRotation) {
  const float r[9] = {1, 2, 3, 4, 5, 6, 7, 8, 9};
  float tilted[9];
  TiltRotation(r, tilted);
  float p[3] = {3, -4, 5};
  TiltPoint(p);
  EXPECT_EQ(p[0], 3.0f);
  EXPECT_EQ(p[1], 0.9397f * -4.0f - 0.342f * 5.0f);
  EXPECT_EQ(p[2], 0.342f * -4.0f + 0.9397f * 5.0f);
  for (int row = 0; row < 3; row++) {
    const float direct = r[3 * row] * 3 + r[3 * row + 1] * -4 + r[3 * row + 2] * 5;
    const float around =
        tilted[3 * row] * p[0] + tilted[3 * row + 1] * p[1] + tilted[3 * row + 2] * p[2];
    EXPECT_NEAR(direct, around, 1e-3f * std::fabs(direct) + 1e-3f);
  }
}

}  // namespace
}  // namespace n3ds::testing
