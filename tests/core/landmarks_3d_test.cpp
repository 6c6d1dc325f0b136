// SPDX-License-Identifier: MIT
#include "core/landmarks_3d.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "support/bits.h"
#include "support/face_scene.h"
#include "support/random.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAre;

constexpr float kUntouched = -12345.0f;

// A fitted face and its 3-D landmarks.
struct Face {
  std::vector<float> vertices = MeanShapeFloats();
  Camera camera = Camera(640, 480);
  float pose[7] = {-0.173648f, 0.984808f, 0.02f, -0.01f, 12, -8, 600};
  uint32_t count;
  std::vector<int32_t> landmarks;
  std::vector<float> out;

  explicit Face(uint32_t landmark_count) : count(landmark_count) {
    Random random(7);
    for (uint32_t i = 0; i < 2 * count; i++) landmarks.push_back(random.Int(150, 400));
    out.assign(3 * count, kUntouched);
  }
  int32_t Compute(const int32_t* extra = kRidgeVertexIndices) {
    const Landmark3DInput input = {pose, camera.k, vertices.data(), landmarks.data(), count};
    return ComputeLandmarks3D(input, extra, out.data());
  }
  std::vector<float> Point(size_t i) const { return {out[3 * i], out[3 * i + 1], out[3 * i + 2]}; }
  // Camera-space place of landmark i.
  std::vector<double> CameraPoint(size_t i) const {
    float r[9];
    QuatToRotationMatrix(pose, r);
    std::vector<double> q;
    for (int row = 0; row < 3; row++) {
      q.push_back(double{r[3 * row]} * out[3 * i] + double{r[3 * row + 1]} * out[3 * i + 1] +
                  double{r[3 * row + 2]} * out[3 * i + 2] + pose[4 + row]);
    }
    return q;
  }
  double DepthOfVertex(size_t v) const {
    float r[9];
    QuatToRotationMatrix(pose, r);
    return double{r[6]} * vertices[3 * v] + double{r[7]} * vertices[3 * v + 1] +
           double{r[8]} * vertices[3 * v + 2] + pose[6];
  }
  void ExpectPixelCentre(size_t i) const {
    const std::vector<double> q = CameraPoint(i);
    EXPECT_NEAR(560 * q[0] / q[2] + 320, landmarks[2 * i] + 0.5, 0.01) << i;
    EXPECT_NEAR(560 * q[1] / q[2] + 240, landmarks[2 * i + 1] + 0.5, 0.01) << i;
  }
  void ExpectDepth(size_t i, double depth) const {
    EXPECT_NEAR(CameraPoint(i)[2], depth, 0.01) << i;
  }
};

TEST(Landmarks3D, InnerLandmarksProjectToTheirPixelCentresAtTheirVertexDepth) {
  Face face(101);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  for (size_t i = 19; i < 95; i++) {
    face.ExpectPixelCentre(i);
    face.ExpectDepth(i,
                     face.DepthOfVertex(static_cast<size_t>(kInnerLandmarkVertexIndices[i - 19])));
  }
}

TEST(Landmarks3D, PupilsLieAtTheDepthOfTheMiddleOfTheirLids) {
  Face face(101);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  face.ExpectPixelCentre(95);
  face.ExpectDepth(95, (face.DepthOfVertex(1154) + face.DepthOfVertex(1054)) / 2);
  face.ExpectPixelCentre(96);
  face.ExpectDepth(96, (face.DepthOfVertex(893) + face.DepthOfVertex(979)) / 2);
}

TEST(Landmarks3D, RidgeLandmarksLieAtTheDepthOfTheExtraVertices) {
  EXPECT_THAT(std::vector<int32_t>(kRidgeVertexIndices, kRidgeVertexIndices + 4),
              ElementsAre(1335, 1366, 1443, 1513));
  Face face(101);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  for (size_t i = 97; i <= 100; i++) {
    face.ExpectPixelCentre(i);
    face.ExpectDepth(i, face.DepthOfVertex(static_cast<size_t>(kRidgeVertexIndices[i - 97])));
  }
  const int32_t other[4] = {10, 20, 30, 40};
  ASSERT_EQ(face.Compute(other), N3DS_OK);
  for (size_t i = 97; i <= 100; i++) face.ExpectDepth(i, face.DepthOfVertex(10 * (i - 96)));
}

TEST(Landmarks3D, OutlineIsBlendedWithTheDefaultVertices) {
  const double share[19] = {0,    0,   0,    0,    0, 0.15, 0.25, 0.4, 0.55, 0.7,
                            0.55, 0.4, 0.25, 0.15, 0, 0,    0,    0,   0};
  Face face(101);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  float r[9];
  QuatToRotationMatrix(face.pose, r);
  // |q|^2 times a rotation: the inverse is the transpose over the square of that.
  double n = 0;
  for (int i = 0; i < 4; i++) n += double{face.pose[i]} * face.pose[i];
  for (size_t i = 0; i < 19; i++) {
    const auto vertex = static_cast<size_t>(kDefaultContourVertexIndices[i]);
    const double z = face.DepthOfVertex(vertex);
    const double q[3] = {(face.landmarks[2 * i] + 0.5 - 320) * z / 560 - face.pose[4],
                         (face.landmarks[2 * i + 1] + 0.5 - 240) * z / 560 - face.pose[5],
                         z - face.pose[6]};
    for (size_t axis = 0; axis < 3; axis++) {
      const double back = (r[axis] * q[0] + r[axis + 3] * q[1] + r[axis + 6] * q[2]) / (n * n);
      const double expected = share[i] * back + (1 - share[i]) * face.vertices[3 * vertex + axis];
      EXPECT_NEAR(face.out[3 * i + axis], expected, 0.02) << i;
    }
    if (share[i] == 0) {
      EXPECT_EQ(face.out[3 * i], face.vertices[3 * vertex]) << i;
    }
  }
}

TEST(Landmarks3D, TheTrackedCorrespondenceOfTheOutlineIsNotUsed) {
  // The vertices of the default contour carry the outline; others may move.
  Face face(101), other(101);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  for (const int32_t v : kContourCandidateVertexIndices) {
    const auto* end = kDefaultContourVertexIndices + 19;
    const bool used = std::find(kDefaultContourVertexIndices, end, v) != end;
    const auto* inner_end = kInnerLandmarkVertexIndices + 76;
    const bool inner = std::find(kInnerLandmarkVertexIndices, inner_end, v) != inner_end;
    if (!used && !inner) other.vertices[3 * static_cast<size_t>(v) + 2] += 50;
  }
  ASSERT_EQ(other.Compute(), N3DS_OK);
  EXPECT_EQ(Bits(other.out), Bits(face.out));
}

TEST(Landmarks3D, WritesNoMoreThanTheLandmarks) {
  // The buffers are of exact size; a sanitizer sees one float too many.
  Face face(101);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  EXPECT_THAT(face.out, Each(::testing::Ne(kUntouched)));
  Face more(165);
  ASSERT_EQ(more.Compute(), N3DS_OK);
  EXPECT_THAT(more.out, Each(::testing::Ne(kUntouched)));
}

TEST(Landmarks3D, TheFirstHundredAndOneAreTheSameInBothLayouts) {
  Face face(101), more(165);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  ASSERT_EQ(more.Compute(), N3DS_OK);
  EXPECT_EQ(Bits(more.out, 303), Bits(face.out));
}

TEST(Landmarks3D, Landmarks101And102RepeatThePupils) {
  Face face(165);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  EXPECT_EQ(face.Point(101), face.Point(95));
  EXPECT_EQ(face.Point(102), face.Point(96));
}

TEST(Landmarks3D, Landmarks103To120LieMidwayBetweenOutlinePoints) {
  Face face(165);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  for (size_t i = 103; i <= 120; i++) {
    for (size_t axis = 0; axis < 3; axis++) {
      EXPECT_EQ(face.out[3 * i + axis],
                (face.out[3 * (i - 103) + axis] + face.out[3 * (i - 102) + axis]) / 2)
          << i;
    }
  }
}

TEST(Landmarks3D, Landmarks121To164LieAtTheMeanDepthOfTheirRingNeighbours) {
  const int ring[44][2] = {
      {39, 40}, {40, 41}, {41, 42}, {42, 43}, {43, 44}, {44, 45}, {45, 46}, {46, 47}, {47, 48},
      {48, 49}, {49, 50}, {50, 39}, {51, 52}, {52, 53}, {53, 54}, {54, 55}, {55, 56}, {56, 57},
      {57, 58}, {58, 59}, {59, 60}, {60, 61}, {61, 62}, {62, 51}, {75, 76}, {76, 77}, {77, 78},
      {78, 79}, {79, 80}, {80, 81}, {81, 82}, {82, 83}, {83, 84}, {84, 85}, {85, 86}, {86, 75},
      {87, 88}, {88, 89}, {89, 90}, {90, 91}, {91, 92}, {92, 93}, {93, 94}, {94, 87}};
  Face face(165);
  ASSERT_EQ(face.Compute(), N3DS_OK);
  for (size_t i = 121; i <= 164; i++) {
    face.ExpectPixelCentre(i);
    const auto depth = [&](int landmark) {
      return face.DepthOfVertex(static_cast<size_t>(kInnerLandmarkVertexIndices[landmark - 19]));
    };
    face.ExpectDepth(i, (depth(ring[i - 121][0]) + depth(ring[i - 121][1])) / 2);
  }
}

TEST(Landmarks3D, ARotationWithoutInverseWritesNothing) {
  Face face(165);
  for (int i = 0; i < 4; i++) face.pose[i] = 0;
  EXPECT_EQ(face.Compute(), N3DS_NUMERICAL);
  EXPECT_THAT(face.out, Each(kUntouched));
}

TEST(Landmarks3D, AQuaternionThatIsNotOfUnitLengthIsInvertedAsItIs) {
  Face face(101);
  for (int i = 0; i < 4; i++) face.pose[i] *= 0.9f;
  ASSERT_EQ(face.Compute(), N3DS_OK);
  for (size_t i = 19; i < 95; i++) face.ExpectPixelCentre(i);
}

}  // namespace
}  // namespace n3ds::testing
