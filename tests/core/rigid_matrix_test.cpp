// SPDX-License-Identifier: MIT
// N3DS_GetRigidMatrix: what a rigid frame reports.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <vector>

#include "core/landmarks_3d.h"
#include "core/output_matrices.h"
#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAreArray;

constexpr float kUntouched = -12345.0f;

// Output records whose buffers hold exactly the landmarks.
class Records {
 public:
  Records(size_t faces, size_t landmarks)
      : buffers_(faces, std::vector<float>(3 * landmarks, kUntouched)), records_(faces) {
    for (size_t k = 0; k < faces; k++) {
      std::fill_n(records_[k].modelMatrix, 16, kUntouched);
      std::fill_n(records_[k].viewMatrix, 16, kUntouched);
      std::fill_n(records_[k].projectionMatrix, 16, kUntouched);
      records_[k].landmarks3D = buffers_[k].data();
    }
  }
  N3DS_RIGID_MATRIX* get() { return records_.data(); }
  const N3DS_RIGID_MATRIX& operator[](size_t k) const { return records_[k]; }
  const std::vector<float>& landmarks(size_t k) const { return buffers_[k]; }
  bool Untouched(size_t k) const {
    for (int i = 0; i < 16; i++) {
      if (records_[k].modelMatrix[i] != kUntouched || records_[k].viewMatrix[i] != kUntouched ||
          records_[k].projectionMatrix[i] != kUntouched) {
        return false;
      }
    }
    return LandmarksUntouched(k);
  }
  bool LandmarksUntouched(size_t k) const {
    for (const float c : buffers_[k]) {
      if (c != kUntouched) return false;
    }
    return true;
  }

 private:
  std::vector<std::vector<float>> buffers_;
  std::vector<N3DS_RIGID_MATRIX> records_;
};

std::vector<int32_t> FaceAt(const HeadPlace& place, int count = 101) {
  return DetectLandmarks(ModelShape(), place, 640, 480, count);
}

MRESULT Track(const Core& core, const std::vector<std::vector<int32_t>>& faces) {
  FaceRecords records(faces);
  const NSVL_OFFSCREEN image = ImageOf(640, 480);
  return N3DS_Build3DFaceForVideo_Rigid(core.handle(), &image, records.get(), records.count());
}

TEST(GetRigidMatrix, NullArgumentsAreRefused) {
  const auto core = Core::Ready();
  Records records(1, 101);
  EXPECT_EQ(N3DS_GetRigidMatrix(nullptr, records.get(), 0), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(N3DS_GetRigidMatrix(core->handle(), nullptr, 0), N3DS_NULL_ARGUMENT);
}

TEST(GetRigidMatrix, AFaceCountOtherThanTheLastFramesIsRefused) {
  const auto core = Core::Ready();
  Records records(5, 101);
  EXPECT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 1), N3DS_BAD_VALUE);
  ASSERT_EQ(Track(*core, {FaceAt({}), FaceAt({})}), N3DS_OK);
  for (const int32_t faces : {-2, -1, 0, 1, 3, 5, INT32_MAX}) {
    EXPECT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), faces), N3DS_BAD_VALUE) << faces;
  }
  for (size_t k = 0; k < 5; k++) EXPECT_TRUE(records.Untouched(k));
  EXPECT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 2), N3DS_OK);
  EXPECT_TRUE(records.Untouched(2));
}

TEST(GetRigidMatrix, OfAnEmptyFrameSucceedsAndWritesNothing) {
  const auto core = Core::Ready();
  Records records(1, 101);
  EXPECT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 0), N3DS_OK);
  ASSERT_EQ(Track(*core, {FaceAt({})}), N3DS_OK);
  ASSERT_EQ(Track(*core, {}), N3DS_OK);
  EXPECT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 0), N3DS_OK);
  EXPECT_TRUE(records.Untouched(0));
}

TEST(GetRigidMatrix, ReportsModelViewAndProjectionOfEachFace) {
  const auto core = Core::Ready();
  HeadPlace right;
  right.x = 120;
  right.z = 700;
  ASSERT_EQ(Track(*core, {FaceAt({}), FaceAt(right)}), N3DS_OK);
  Records records(2, 101);
  ASSERT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 2), N3DS_OK);
  for (size_t k = 0; k < 2; k++) {
    N3DS_RIGID_MATRIX expected = {};
    SplitModelView(core->context().rigidResult[k], &expected);
    EXPECT_EQ(Bits(records[k].modelMatrix), Bits(expected.modelMatrix));
    EXPECT_EQ(Bits(records[k].viewMatrix), Bits(expected.viewMatrix));
    EXPECT_EQ(Bits(records[k].projectionMatrix), Bits(expected.projectionMatrix));
  }
  EXPECT_NEAR(records[0].modelMatrix[14], -600 + 500, 15);
  EXPECT_NEAR(records[1].modelMatrix[14], -700 + 500, 15);
  EXPECT_NEAR(records[1].modelMatrix[12], 120, 5);
}

TEST(GetRigidMatrix, LandmarksAreThoseOfThePoseTiltedIntoTheFrameOfTheModelMatrix) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, {FaceAt({}, 165)}), N3DS_OK);
  Records records(1, 165);
  ASSERT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 1), N3DS_OK);
  const TrackingContext& context = core->context();
  std::vector<float> expected(3 * 165);
  ASSERT_EQ(ComputeLandmarks3D(
                {context.pose[0], context.camera, context.shape[0], context.landmarkHistory, 165},
                kRidgeVertexIndices, expected.data()),
            N3DS_OK);
  for (size_t i = 0; i < expected.size(); i += 3) {
    const float y = expected[i + 1], z = expected[i + 2];
    expected[i + 1] = 0.9397f * y - 0.342f * z;
    expected[i + 2] = 0.342f * y + 0.9397f * z;
  }
  EXPECT_EQ(Bits(records.landmarks(0)), Bits(expected));
}

// Where a point of the model matrix's frame lands in the image.
void ToPixel(const N3DS_RIGID_MATRIX& record, const float* p, double width, double height,
             double* u, double* v) {
  double world[4], eye[4], clip[4];
  const double point[4] = {p[0], p[1], p[2], 1};
  const auto multiply = [](const float* m, const double* in, double* out) {
    for (int row = 0; row < 4; row++) {
      out[row] = m[row] * in[0] + m[row + 4] * in[1] + m[row + 8] * in[2] + m[row + 12] * in[3];
    }
  };
  multiply(record.modelMatrix, point, world);
  multiply(record.viewMatrix, world, eye);
  multiply(record.projectionMatrix, eye, clip);
  *u = (clip[0] / clip[3] + 1) / 2 * width;
  *v = (1 - clip[1] / clip[3]) / 2 * height;
}

TEST(GetRigidMatrix, LandmarksProjectThroughTheThreeMatricesToTheirPixelCentres) {
  for (const double yaw : {-0.25, 0.0, 0.25}) {
    HeadPlace place;
    place.yaw = yaw;
    place.x = 40;
    const auto core = Core::Ready();
    std::vector<int32_t> landmarks;
    for (int frame = 0; frame < 4; frame++) {
      place.y += 6;
      landmarks = FaceAt(place, 165);
      ASSERT_EQ(Track(*core, {landmarks}), N3DS_OK);
    }
    Records records(1, 165);
    ASSERT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 1), N3DS_OK);
    for (size_t i = 19; i < 165; i++) {
      if (i >= 103 && i <= 120) continue;  // between outline points that are drawn to the model
      double u, v;
      ToPixel(records[0], &records.landmarks(0)[3 * i], 640, 480, &u, &v);
      EXPECT_NEAR(u, landmarks[2 * i] + 0.5, 0.05) << i;
      EXPECT_NEAR(v, landmarks[2 * i + 1] + 0.5, 0.05) << i;
    }
  }
}

TEST(GetRigidMatrix, LandmarksFormAnUprightFace) {
  // x to the image right, y up, z out of the face, whatever the head's pose.
  for (const double yaw : {-0.2, 0.0, 0.2}) {
    HeadPlace place;
    place.yaw = yaw;
    place.roll = 0.1;
    const auto core = Core::Ready();
    ASSERT_EQ(Track(*core, {FaceAt(place)}), N3DS_OK);
    Records records(1, 101);
    ASSERT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 1), N3DS_OK);
    const float* p = records.landmarks(0).data();
    EXPECT_GT(p[3 * 57], p[3 * 39] + 60);          // outer eye corners
    EXPECT_GT(p[3 * 39 + 1], p[3 * 9 + 1] + 60);   // eye over chin
    EXPECT_GT(p[3 * 100 + 2], p[3 * 39 + 2] + 5);  // tip of the nose before the eyes
  }
}

TEST(GetRigidMatrix, ARotationWithoutInverseStopsWithTheFacesBeforeFilled) {
  const auto core = Core::Ready();
  HeadPlace left, right;
  left.x = -150;
  right.x = 150;
  ASSERT_EQ(Track(*core, {FaceAt(left), FaceAt({}), FaceAt(right)}), N3DS_OK);
  std::fill_n(core->context().pose[1], 4, 0.0f);
  Records records(3, 101);
  EXPECT_EQ(N3DS_GetRigidMatrix(core->handle(), records.get(), 3), N3DS_NUMERICAL);
  EXPECT_THAT(records.landmarks(0), Each(::testing::Ne(kUntouched)));
  EXPECT_TRUE(records.LandmarksUntouched(1));
  EXPECT_TRUE(records.Untouched(2));
}

TEST(GetRigidMatrix, CallsAgainGiveTheSame) {
  const auto core = Core::Ready();
  ASSERT_EQ(Track(*core, {FaceAt({})}), N3DS_OK);
  Records first(1, 101), second(1, 101);
  ASSERT_EQ(N3DS_GetRigidMatrix(core->handle(), first.get(), 1), N3DS_OK);
  ASSERT_EQ(N3DS_GetRigidMatrix(core->handle(), second.get(), 1), N3DS_OK);
  EXPECT_EQ(Bits(first[0].modelMatrix), Bits(second[0].modelMatrix));
  EXPECT_EQ(Bits(first.landmarks(0)), Bits(second.landmarks(0)));
}

}  // namespace
}  // namespace n3ds::testing
