// SPDX-License-Identifier: MIT
#include "core/pose_rounds.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <vector>

#include "support/bits.h"
#include "support/face_scene.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAreArray;

constexpr FitWeights kWeights = {0, 1.0f, 1.0f, 1.0f};

struct Face {
  std::vector<float> vertices = MeanShapeFloats();
  Camera camera = Camera(640, 480);
  float pose[7] = {0.5f, 0.5f, -0.5f, 0.5f, 1, 2, 3};
  int32_t contour[19] = {};
  std::vector<int32_t> landmarks = DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480);

  PoseRounds Rounds(MHandle memory = nullptr) {
    return PoseRounds(memory, vertices.data(), camera.k, pose, contour);
  }
};

TEST(PoseRounds, StartFromTheFacesPoseAndTheInnerVertices) {
  Face face;
  PoseRounds rounds = face.Rounds();
  float rotation[9];
  QuatToRotationMatrix(face.pose, rotation);
  EXPECT_EQ(Bits(rounds.rotation(), 9), Bits(rotation));
  EXPECT_EQ(Bits(rounds.translation(), 3), Bits(face.pose + 4, 3));
  const int32_t* table = rounds.landmark_vertices();
  EXPECT_THAT(std::vector<int32_t>(table, table + 19), Each(0));
  EXPECT_THAT(std::vector<int32_t>(table + 19, table + 95),
              ElementsAreArray(kInnerLandmarkVertexIndices));
}

TEST(PoseRounds, ANewFaceStartsFrontalAtEightHundredMillimetres) {
  Face face;
  PoseRounds rounds = face.Rounds();
  rounds.StartNewFace();
  EXPECT_THAT(face.pose, ElementsAreArray({-0.265f, 0.958f, -0.001f, -0.049f, 0.0f, 0.0f, 800.0f}));
  EXPECT_THAT(face.contour, ElementsAreArray(kDefaultContourVertexIndices));
  EXPECT_EQ(rounds.translation()[2], 800.0f);
}

TEST(PoseRounds, AFitRefinesThePoseInPlace) {
  Face face;
  PoseRounds rounds = face.Rounds();
  rounds.StartNewFace();
  ASSERT_TRUE(rounds.Fit(face.landmarks.data(), kDefaultContourVertexIndices, kWeights));
  EXPECT_NE(Bits(face.pose), Bits(kStartPose));
  EXPECT_NEAR(face.pose[6], 600, 12);
  EXPECT_EQ(Bits(rounds.translation(), 3), Bits(face.pose + 4, 3));
  EXPECT_EQ(rounds.landmark_vertices()[0], kDefaultContourVertexIndices[0]);
}

TEST(PoseRounds, AFailedFitLeavesPoseRotationAndTranslation) {
  Face face;
  PoseRounds rounds = face.Rounds();
  const float z = face.vertices[3 * static_cast<size_t>(kInnerLandmarkVertexIndices[0]) + 2];
  const float at_depth_zero[7] = {1, 0, 0, 0, 0, 0, -z};
  std::copy_n(at_depth_zero, 7, face.pose);
  const std::vector<uint32_t> rotation = Bits(rounds.rotation(), 9);
  EXPECT_FALSE(rounds.Fit(face.landmarks.data(), kDefaultContourVertexIndices, kWeights));
  EXPECT_THAT(face.pose, ElementsAreArray(at_depth_zero));
  EXPECT_EQ(Bits(rounds.rotation(), 9), rotation);
}

TEST(PoseRounds, AContourUpdateTakesTheSilhouetteUnderThePresentPose) {
  Face face;
  PoseRounds rounds = face.Rounds();
  rounds.StartNewFace();
  ASSERT_TRUE(rounds.Fit(face.landmarks.data(), kDefaultContourVertexIndices, kWeights));
  rounds.UpdateContour(face.landmarks.data());
  EXPECT_THAT(face.contour, ::testing::Not(ElementsAreArray(kDefaultContourVertexIndices)));
  EXPECT_EQ(rounds.contour(), face.contour);
  // The table follows with the next fit, or when told.
  EXPECT_EQ(rounds.landmark_vertices()[9], kDefaultContourVertexIndices[9]);
  rounds.CopyContourToLandmarks();
  EXPECT_THAT(std::vector<int32_t>(rounds.landmark_vertices(), rounds.landmark_vertices() + 19),
              ElementsAreArray(face.contour));
}

TEST(PoseRounds, AFailedContourUpdateLeavesTheContour) {
  std::vector<unsigned char> area(100);
  Face face;
  PoseRounds rounds = face.Rounds(MMemMgrCreate(area.data(), area.size()));
  rounds.StartNewFace();
  rounds.UpdateContour(face.landmarks.data());
  EXPECT_THAT(face.contour, ElementsAreArray(kDefaultContourVertexIndices));
}

TEST(PoseRounds, PoseIsTakenAsItIsAlsoWhenItsQuaternionIsNotOfUnitLength) {
  Face face;
  PoseRounds rounds = face.Rounds();
  const float longer[7] = {2, 0, 0, 0, 7, 8, 9};
  std::copy_n(longer, 7, face.pose);
  rounds.UpdateTransformFromPose();
  EXPECT_THAT(std::vector<float>(rounds.rotation(), rounds.rotation() + 9),
              ElementsAreArray({4.0f, 0.0f, 0.0f, 0.0f, 4.0f, 0.0f, 0.0f, 0.0f, 4.0f}));
  EXPECT_EQ(rounds.translation()[1], 8.0f);
}

}  // namespace
}  // namespace n3ds::testing
