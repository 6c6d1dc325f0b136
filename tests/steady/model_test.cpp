// SPDX-License-Identifier: MIT
#include "steady/model.h"

#include <gtest/gtest.h>

#include <cmath>

#include "steady/outline_rows.h"
#include "steady/steady_testing.h"

namespace n3ds::testing {
namespace {

using namespace steady;

TEST(SteadyModel, LandmarksLieWhereTheModelHasThem) {
  const std::vector<double> identity = {0.1, -0.2, 0.05};
  const std::vector<Vec3> points = LandmarkPoints(ModelShape(identity), 101);
  const Model& model = SharedModel();
  for (size_t i = 0; i < points.size(); i++) {
    const double expected[3] = {points[i].x, points[i].y, points[i].z};
    for (int axis = 0; axis < 3; axis++) {
      double value = model.mean[axis][i];
      // A standard deviation is an eighth of the file's unit.
      for (size_t k = 0; k < identity.size(); k++) {
        value += 8 * identity[k] * model.identity[k][axis][i];
      }
      EXPECT_NEAR(value, expected[axis], 1e-4) << i;
    }
  }
}

TEST(SteadyModel, SharesOfEveryOutlinePlaceAddUpToOne) {
  for (const auto& row : kOutlineRows) {
    for (const SurfacePlace& place : row) {
      EXPECT_NEAR(place.shares[0] + place.shares[1] + place.shares[2], 1, 1e-4);
      for (int i = 0; i < 3; i++) {
        EXPECT_GE(place.shares[i], 0);
        EXPECT_GE(place.vertices[i], 0);
        EXPECT_LT(place.vertices[i], kVertexCount);
      }
    }
  }
}

TEST(SteadyModel, OutlineRowsOfBothSidesMirrorEachOther) {
  const Model& model = SharedModel();
  for (int landmark = 0; landmark < 9; landmark++) {
    EXPECT_EQ(kOutlineNormals[landmark][0], -kOutlineNormals[18 - landmark][0]);
    for (int s = 0; s < kRowPlaces; s++) {
      const int left = landmark * kRowPlaces + s;
      const int right = (18 - landmark) * kRowPlaces + s;
      EXPECT_NEAR(model.place_mean[0][left], -model.place_mean[0][right], 0.02);
      EXPECT_NEAR(model.place_mean[1][left], model.place_mean[1][right], 0.02);
      EXPECT_NEAR(model.place_mean[2][left], model.place_mean[2][right], 0.02);
    }
  }
}

// The output frame is linear in the identity: what fits one person best fits the sum of two.
TEST(SteadyModel, OutputFrameGrowsWithThePerson) {
  const Model& model = SharedModel();
  // The first identity is mostly size: the frame takes it over.
  double largest = 0;
  for (int k = 0; k < kIdentityCount; k++) {
    largest = std::max(largest, std::fabs(static_cast<double>(model.output_frame[6][k])));
    // The model is symmetric: identities neither turn about y and z nor shift sideways on the whole.
    for (const int row : {1, 2}) EXPECT_LT(std::fabs(model.output_frame[row][k]), 0.02) << k;
  }
  EXPECT_GT(largest, 0.01);
}

TEST(SteadyModel, OffsetSharesFadeWithTheDistance) {
  const Model& model = SharedModel();
  for (int i = 0; i < kInnerLandmarkCount; i++) {
    const int vertex = kInnerLandmarkVertexIndices[i];
    float sum = 0;
    for (int k = 0; k < Model::kOffsetNeighbours; k++) {
      EXPECT_GE(model.neighbour_share[vertex][k], 0);
      sum += model.neighbour_share[vertex][k];
    }
    EXPECT_GT(sum, 0.85f) << i;
    EXPECT_LE(sum, 1.0f) << i;
    // Several landmarks may share a place; one of them is the nearest.
    EXPECT_EQ(model.mean[0][model.neighbour[vertex][0]], model.mean[0][19 + i]) << i;
  }
}

}  // namespace
}  // namespace n3ds::testing
