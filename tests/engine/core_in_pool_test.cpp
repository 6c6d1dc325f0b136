// SPDX-License-Identifier: MIT
// A tracking context of one face in a memory pool: the size that the core header asks for is enough.
#include <gtest/gtest.h>

#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"

namespace n3ds::testing {
namespace {

// The size that the header asks for.
constexpr size_t kPoolBytes = 4500000;
constexpr int kFrames = 40;

// All matrices and 3-D landmarks of a talking face with 165 landmarks, frame after frame.
std::vector<uint32_t> Track(MHandle memory, bool mask) {
  const auto core = Core::Ready(memory);
  const NSVL_OFFSCREEN image = ImageOf(1280, 720);
  Person person(7);
  std::vector<uint32_t> all;
  for (int frame = 0; frame < kFrames; frame++) {
    FaceRecords faces({person.Detect(frame, image.width, image.height, N3DS_LANDMARKS_165, 1)});
    N3DS_RIGID_MATRIX record = {};
    std::vector<float> landmarks(3 * N3DS_LANDMARKS_165);
    record.landmarks3D = landmarks.data();
    N3DS_3D_MODEL mesh = {};
    MRESULT result = mask ? N3DS_Build3DFaceForVideo_Mask(core->handle(), &image, faces.get(), 1)
                          : N3DS_Build3DFaceForVideo_Rigid(core->handle(), &image, faces.get(), 1);
    EXPECT_EQ(result, N3DS_OK);
    result = mask ? N3DS_GetFace3DModel(core->handle(), &mesh, &record, 1)
                  : N3DS_GetRigidMatrix(core->handle(), &record, 1);
    EXPECT_EQ(result, N3DS_OK);
    for (const std::vector<uint32_t>& bits :
         {Bits(record.modelMatrix), Bits(record.projectionMatrix), Bits(landmarks)}) {
      all.insert(all.end(), bits.begin(), bits.end());
    }
  }
  return all;
}

class CoreInPool : public ::testing::TestWithParam<bool> {};

TEST_P(CoreInPool, OneFaceGivesTheBitsOfTheSystemHeap) {
  std::vector<unsigned char> area(kPoolBytes);
  EXPECT_EQ(Track(MMemMgrCreate(area.data(), area.size()), GetParam()), Track(nullptr, GetParam()));
}

INSTANTIATE_TEST_SUITE_P(Modes, CoreInPool, ::testing::Bool(),
                         [](const auto& mode) { return mode.param ? "Mask" : "Rigid"; });

}  // namespace
}  // namespace n3ds::testing
