// SPDX-License-Identifier: MIT
// What must hold between the results of related frames.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <memory>
#include <vector>

#include "engine/engine_testing.h"
#include "support/bits.h"
#include "support/face_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

constexpr int kWidth = 1280;
constexpr int kHeight = 720;
constexpr size_t kFaces = 3;

// All bits of what a frame gives for each of its faces: matrices, landmarks and, in mask mode, mesh.
std::vector<std::vector<uint32_t>> Results(const Engine& engine, Points points, bool mask) {
  RigidOutput out(101);
  NSVL_OFFSCREEN image = ImageOf(kWidth, kHeight);
  Norvale_3DSticker_ModelInfo_Array models = {};
  if (mask) {
    EXPECT_EQ(
        Norvale_3DSticker_Process_FaceMask(engine.handle(), &image, kFaces, 101, points.data(),
                                           nullptr, nullptr, out.get(), &models),
        N3DS_OK);
  } else {
    EXPECT_EQ(Process(engine, image, points, 101, &out), N3DS_OK);
  }
  std::vector<std::vector<uint32_t>> faces;
  for (size_t k = 0; k < kFaces; k++) {
    std::vector<uint32_t> bits = Bits(out.landmarks(k));
    const Norvale_3DSticker_Face_Matrix& face = out.face(k);
    for (const float* matrix : {face.projectionMatrix, face.viewMatrix, face.modelMatrix}) {
      for (const uint32_t word : Bits(matrix, 16)) bits.push_back(word);
    }
    if (mask) {
      for (const uint32_t word : Bits(models.models[k].vertices, 31104)) bits.push_back(word);
    }
    faces.push_back(bits);
  }
  return faces;
}

class FrameInvariants : public ::testing::TestWithParam<bool> {};
INSTANTIATE_TEST_SUITE_P(, FrameInvariants, ::testing::Bool(),
                         [](const auto& mask) { return mask.param ? "Mask" : "Rigid"; });

// Faces may come in another order in every frame: each gets what it gets in any other order.
TEST_P(FrameInvariants, PermutedFacesGivePermutedResults) {
  Random random = TestRandom();
  std::vector<Person> persons;
  for (size_t k = 0; k < kFaces; k++) {
    persons.push_back(Person(70 + k).At(150.0 * (static_cast<double>(k) - 1), 0, 600));
  }
  const auto ordered = Engine::Ready(), permuted = Engine::Ready();
  std::array<size_t, kFaces> order = {0, 1, 2};
  for (int frame = 0; frame < 12; frame++) {
    for (size_t k = kFaces; k-- > 1;) {
      std::swap(order[k], order[random.Below(static_cast<uint32_t>(k) + 1)]);
    }
    std::vector<Points> faces;
    for (Person& person : persons) {
      faces.push_back(ToPoints(person.Detect(frame, kWidth, kHeight, 101, 1)));
    }
    Points straight, shuffled;
    for (size_t k = 0; k < kFaces; k++) {
      straight.insert(straight.end(), faces[k].begin(), faces[k].end());
      shuffled.insert(shuffled.end(), faces[order[k]].begin(), faces[order[k]].end());
    }
    const auto expected = Results(*ordered, straight, GetParam());
    const auto found = Results(*permuted, shuffled, GetParam());
    for (size_t k = 0; k < kFaces; k++) {
      ASSERT_EQ(found[k] == expected[order[k]], true) << "frame " << frame << ", face " << k;
    }
  }
}

// An image that is wider by twice as much as it is lower has the same focal length, and its centre
// moves: landmarks moved along are those of the same head. The pose is the same but for rounding.
TEST(RigidInvariants, LandmarksThatMoveWithTheImageCentreKeepTheirPose) {
  HeadPlace place;
  place.yaw = 0.1;
  place.x = 40;
  const Points face = ToPoints(DetectLandmarks(ModelShape(), place, kWidth, kHeight));
  RigidOutput here(101);
  ASSERT_EQ(Process(*Engine::Ready(), ImageOf(kWidth, kHeight), face, 101, &here), N3DS_OK);
  for (const int32_t shift : {-200, -1, 1, 50, 160}) {
    Points moved = face;
    for (__tag_point& p : moved) p = {p.x + shift, p.y - shift};
    RigidOutput there(101);
    ASSERT_EQ(Process(*Engine::Ready(), ImageOf(kWidth + 2 * shift, kHeight - 2 * shift), moved,
                      101, &there),
              N3DS_OK);
    for (size_t i = 0; i < 16; i++) {
      EXPECT_NEAR(there.face(0).modelMatrix[i], here.face(0).modelMatrix[i], i < 12 ? 1e-4 : 0.05)
          << "shift " << shift << ", entry " << i;
    }
  }
}

}  // namespace
}  // namespace n3ds::testing
