// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <fstream>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "core/model_tables.h"
#include "core/tracking_context.h"
#include "mask/test_image.h"
#include "mask/warp_scene.h"
#include "norvale_3d_sticker_core.h"
#include "support/null_arguments.h"
#include "support/test_random.h"
namespace n3ds::testing {

namespace {

// A context after a mask frame with two faces, both with the scene's camera and pose.
class MaskWarp : public ::testing::Test {
 protected:
  MaskWarp() : context_(std::make_unique<TrackingContext>()), texture_(GradientTexture(32, 32)) {
    std::memset(static_cast<void*>(context_.get()), 0, sizeof(TrackingContext));
    context_->faceNum = 2;
    context_->trackFlag[0] = context_->trackFlag[1] = 1;
    scene_.AddRectangle(2, 2, 14, 10);
    SetPose();
  }

  void SetPose() {
    std::memcpy(context_->camera, scene_.camera.K, sizeof(context_->camera));
    for (int face = 0; face < 2; ++face) {
      for (int row = 0; row < 3; ++row) {
        float* p = context_->maskPose[face] + 4 * row;
        std::memcpy(p, scene_.camera.R + 3 * row, 3 * sizeof(float));
        p[3] = scene_.camera.t[row];
      }
    }
  }

  MRESULT Warp(NSVL_OFFSCREEN* output, int width = 16, int height = 12, int face = 0) {
    const N3DS_2D_TEXTURE_MASK mask = scene_.Mask(texture_);
    const N3DS_3D_MODEL model = scene_.Model();
    return N3DS_WarpFaceMask(context_.get(), &mask, output, &model, width, height, face);
  }

  TestImage Expected(int width, int height, int padding = 0) {
    TestImage expected(N3DS_FORMAT_BGRA32, width, height, padding);
    scene_.DrawReference(texture_, expected);
    return expected;
  }

  std::unique_ptr<TrackingContext> context_;
  WarpScene scene_;
  TestImage texture_;
};

bool AllZero(const std::vector<uint8_t>& bytes) {
  for (const uint8_t byte : bytes) {
    if (byte != 0) return false;
  }
  return true;
}

TEST_F(MaskWarp, MakesAnOutputOfTheGivenSize) {
  NSVL_OFFSCREEN output = {};
  ASSERT_EQ(Warp(&output, 16, 12), N3DS_OK);
  EXPECT_EQ(output.pixelFormat, static_cast<uint32_t>(N3DS_FORMAT_BGRA32));
  EXPECT_EQ(output.width, 16);
  EXPECT_EQ(output.height, 12);
  EXPECT_EQ(output.pitch[0], 64);
  ASSERT_NE(output.plane[0], nullptr);
  const std::vector<uint8_t> bytes(output.plane[0], output.plane[0] + 64 * 12);
  EXPECT_EQ(bytes, Expected(16, 12).Bytes());
  EXPECT_FALSE(AllZero(bytes));
  MMemFree(nullptr, output.plane[0]);
}

TEST_F(MaskWarp, DrawsIntoTheCallersOutputByItsOwnSize) {
  Random random = TestRandom();
  TestImage output(N3DS_FORMAT_BGRA32, 9, 7, 6);
  output.Randomise(random);
  output.get()->pixelFormat = 4711;
  output.get()->pitch[1] = -5;
  const NSVL_OFFSCREEN before = output.descriptor();
  ASSERT_EQ(Warp(output.get(), 1000, 3), N3DS_OK);
  EXPECT_EQ(std::memcmp(&before, output.get(), sizeof before), 0) << "the descriptor stays";
  EXPECT_EQ(output.Bytes(), Expected(9, 7, 6).Bytes()) << "cleared, padding included, and drawn";
}

TEST_F(MaskWarp, OutputBufferComesFromTheCoresMemory) {
  std::vector<uint64_t> area(200);
  context_->memory = MMemMgrCreate(area.data(), area.size() * 8);
  ASSERT_NE(context_->memory, nullptr);
  NSVL_OFFSCREEN output = {};
  ASSERT_EQ(Warp(&output, 16, 12), N3DS_OK);
  const uint8_t* begin = reinterpret_cast<const uint8_t*>(area.data());
  EXPECT_GE(output.plane[0], begin);
  EXPECT_LE(output.plane[0] + 64 * 12, begin + area.size() * 8);
  MMemFree(context_->memory, output.plane[0]);
}

TEST_F(MaskWarp, ExhaustedMemoryIsReportedWithTheDescriptorSetUp) {
  std::vector<uint64_t> area(80);
  context_->memory = MMemMgrCreate(area.data(), area.size() * 8);
  NSVL_OFFSCREEN output = {};
  EXPECT_EQ(Warp(&output, 16, 12), N3DS_NO_MEMORY);
  EXPECT_EQ(output.plane[0], nullptr);
  EXPECT_EQ(output.pixelFormat, static_cast<uint32_t>(N3DS_FORMAT_BGRA32));
  EXPECT_EQ(output.width, 16);
  EXPECT_EQ(output.height, 12);
  EXPECT_EQ(output.pitch[0], 64);
}

// 2^15 x 2^15 pixels are 2^32 bytes, which a pool would read as none.
TEST_F(MaskWarp, SizesBeyondThePoolsOrThePitchsRangeAreOutOfMemory) {
  std::vector<uint64_t> area(80);
  context_->memory = MMemMgrCreate(area.data(), area.size() * 8);
  for (const auto& [width, height] :
       {std::pair(1 << 15, 1 << 15), {(1 << 15) + 1, 1 << 15}, {1 << 29, 8}}) {
    NSVL_OFFSCREEN output = {};
    EXPECT_EQ(Warp(&output, width, height), N3DS_NO_MEMORY) << width;
    EXPECT_EQ(output.plane[0], nullptr);
  }
  context_->memory = nullptr;
  NSVL_OFFSCREEN output = {};
  EXPECT_EQ(Warp(&output, 1 << 29, 1), N3DS_NO_MEMORY) << "the pitch does not fit";
  EXPECT_EQ(Warp(&output, INT32_MAX, INT32_MAX), N3DS_NO_MEMORY);
  EXPECT_EQ(output.plane[0], nullptr);
}

TEST_F(MaskWarp, RejectsNullArgumentsAndLeavesTheOutputAlone) {
  TestImage output(N3DS_FORMAT_BGRA32, 16, 12);
  output.Fill(7);
  const auto before = output.Bytes();
  const N3DS_2D_TEXTURE_MASK mask = scene_.Mask(texture_);
  const N3DS_3D_MODEL model = scene_.Model();
  void* core = context_.get();
  NSVL_OFFSCREEN* out = output.get();
  ExpectEachNullRefused(N3DS_NULL_ARGUMENT, N3DS_WarpFaceMask, core, &mask, out, &model, 16, 12, 0);
  const N3DS_3D_MODEL empty = {};
  EXPECT_EQ(N3DS_WarpFaceMask(core, &mask, out, &empty, 16, 12, 0), N3DS_NULL_ARGUMENT);
  // Null comes before bad values.
  EXPECT_EQ(N3DS_WarpFaceMask(core, &mask, out, nullptr, 0, 0, -1), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(output.Bytes(), before);
}

TEST_F(MaskWarp, RejectsBadValuesAndLeavesTheOutputAlone) {
  TestImage output(N3DS_FORMAT_BGRA32, 16, 12);
  output.Fill(7);
  const auto before = output.Bytes();
  EXPECT_EQ(Warp(output.get(), 0, 12), N3DS_BAD_VALUE);
  EXPECT_EQ(Warp(output.get(), 16, 0), N3DS_BAD_VALUE);
  EXPECT_EQ(Warp(output.get(), -16, 12), N3DS_BAD_VALUE);
  EXPECT_EQ(Warp(output.get(), 16, INT32_MIN), N3DS_BAD_VALUE);
  EXPECT_EQ(Warp(output.get(), 16, 12, -1), N3DS_BAD_VALUE);
  EXPECT_EQ(Warp(output.get(), 16, 12, 2), N3DS_BAD_VALUE);
  EXPECT_EQ(Warp(output.get(), 16, 12, INT32_MAX), N3DS_BAD_VALUE);
  context_->faceNum = 0;
  EXPECT_EQ(Warp(output.get(), 16, 12, 0), N3DS_BAD_VALUE);
  context_->faceNum = 2;

  NSVL_OFFSCREEN& image = *texture_.get();
  const NSVL_OFFSCREEN good = image;
  for (int field = 0; field < 7; ++field) {
    image = good;
    if (field == 0) image.plane[0] = nullptr;
    if (field == 1) image.width = 0;
    if (field == 2) image.height = 0;
    if (field == 3) image.width = -32;
    if (field == 4) image.pixelFormat = N3DS_FORMAT_BGR24;
    if (field == 5) image.pixelFormat = N3DS_FORMAT_NV21;
    if (field == 6) image.pitch[0] *= -1;
    EXPECT_EQ(Warp(output.get()), N3DS_BAD_VALUE) << field;
    NSVL_OFFSCREEN none = {};
    EXPECT_EQ(Warp(&none), N3DS_BAD_VALUE) << field;
    EXPECT_EQ(none.plane[0], nullptr);
    EXPECT_EQ(none.width, 0);
  }
  EXPECT_EQ(output.Bytes(), before);
}

TEST_F(MaskWarp, RejectsMeshIndicesWithoutAVertex) {
  TestImage output(N3DS_FORMAT_BGRA32, 16, 12);
  output.Fill(7);
  const auto before = output.Bytes();
  const N3DS_2D_TEXTURE_MASK mask = scene_.Mask(texture_);
  const N3DS_3D_MODEL model = scene_.Model();
  std::vector<uint16_t> triangles(model.triangles, model.triangles + 3 * N3DS_TRIANGLE_COUNT);
  const N3DS_3D_MODEL other = {model.vertices, model.vertexCount, triangles.data(),
                               model.triangleCount};
  for (const size_t index : {size_t{0}, triangles.size() - 1}) {
    triangles[index] = N3DS_VERTEX_COUNT;
    EXPECT_EQ(N3DS_WarpFaceMask(context_.get(), &mask, output.get(), &other, 16, 12, 0),
              N3DS_BAD_VALUE);
    EXPECT_EQ(output.Bytes(), before);
    triangles[index] = N3DS_VERTEX_COUNT - 1;
    EXPECT_EQ(N3DS_WarpFaceMask(context_.get(), &mask, output.get(), &other, 16, 12, 0), N3DS_OK);
    output.Fill(7);
  }
}

TEST_F(MaskWarp, WrongTextureCountsGiveAClearOutput) {
  TestImage output(N3DS_FORMAT_BGRA32, 16, 12, 4);
  output.Fill(7);
  N3DS_2D_TEXTURE_MASK mask = scene_.Mask(texture_);
  mask.texCoordCount = 1811;
  const N3DS_3D_MODEL model = scene_.Model();
  EXPECT_EQ(N3DS_WarpFaceMask(context_.get(), &mask, output.get(), &model, 16, 12, 0), N3DS_OK);
  EXPECT_TRUE(AllZero(output.Bytes()));
}

TEST_F(MaskWarp, FaceThatWasNeverTrackedGivesAClearOutput) {
  context_->trackFlag[1] = 0;
  TestImage output(N3DS_FORMAT_BGRA32, 16, 12, 4);
  output.Fill(7);
  EXPECT_EQ(Warp(output.get(), 16, 12, 1), N3DS_OK);
  EXPECT_TRUE(AllZero(output.Bytes()));
  EXPECT_EQ(Warp(output.get(), 16, 12, 0), N3DS_OK);
  EXPECT_FALSE(AllZero(output.Bytes()));
}

// Its model record may not have been filled.
TEST_F(MaskWarp, FaceThatWasNeverTrackedNeedsNoMesh) {
  context_->trackFlag[0] = 0;
  TestImage output(N3DS_FORMAT_BGRA32, 16, 12);
  output.Fill(7);
  const N3DS_2D_TEXTURE_MASK mask = scene_.Mask(texture_);
  const N3DS_3D_MODEL empty = {};
  EXPECT_EQ(N3DS_WarpFaceMask(context_.get(), &mask, output.get(), &empty, 16, 12, 0), N3DS_OK);
  EXPECT_TRUE(AllZero(output.Bytes()));
}

TEST_F(MaskWarp, EachFaceIsDrawnWithItsOwnPose) {
  context_->maskPose[1][3] += 3.0f;
  TestImage first(N3DS_FORMAT_BGRA32, 20, 12), second(N3DS_FORMAT_BGRA32, 20, 12);
  ASSERT_EQ(Warp(first.get(), 20, 12, 0), N3DS_OK);
  ASSERT_EQ(Warp(second.get(), 20, 12, 1), N3DS_OK);
  for (int y = 0; y < 12; ++y) {
    for (int x = 0; x < 17; ++x) {
      ASSERT_EQ(std::memcmp(first.Pixel(x, y), second.Pixel(x + 3, y), 4), 0) << x << ", " << y;
    }
  }
}

TEST_F(MaskWarp, TheContextAndTheInputsAreOnlyRead) {
  const std::vector<uint8_t> before(reinterpret_cast<uint8_t*>(context_.get()),
                                    reinterpret_cast<uint8_t*>(context_.get() + 1));
  const auto texture_before = texture_.Bytes();
  TestImage output(N3DS_FORMAT_BGRA32, 16, 12);
  ASSERT_EQ(Warp(output.get()), N3DS_OK);
  EXPECT_EQ(std::memcmp(before.data(), context_.get(), before.size()), 0);
  EXPECT_EQ(texture_.Bytes(), texture_before);
}

TEST_F(MaskWarp, OutputsWithoutPixelsAreNoError) {
  uint8_t byte = 7;
  for (const auto& [width, height, pitch] :
       {std::tuple(0, 1, 1), {1, 0, 4}, {-3, 1, 1}, {1, -3, 4}, {1, 1, 0}, {16, 12, -64}}) {
    NSVL_OFFSCREEN output = {N3DS_FORMAT_BGRA32, width, height, {&byte}, {pitch}};
    EXPECT_EQ(Warp(&output), N3DS_OK);
  }
  EXPECT_EQ(byte, 0) << "of the first and the third, one byte is cleared";
}

TEST_F(MaskWarp, PosesThatAreNoNumbersGiveAClearOutput) {
  for (int i = 0; i < 12; ++i) {
    SetPose();
    context_->maskPose[0][i] = std::numeric_limits<float>::quiet_NaN();
    TestImage output(N3DS_FORMAT_BGRA32, 16, 12);
    output.Fill(7);
    EXPECT_EQ(Warp(output.get()), N3DS_OK);
    EXPECT_TRUE(AllZero(output.Bytes())) << i;
  }
}

// The shipped face, seen from the front, with its own layout: an oval in the middle of the image,
// its left cheek left of its right one.
TEST_F(MaskWarp, ShippedFaceShowsTheWholeTexture) {
  std::ifstream file(std::string(N3DS_SOURCE_DIR) + "/data/face_model.bin", std::ios::binary);
  std::vector<int16_t> mean(3 * N3DS_VERTEX_COUNT);
  file.seekg(12);
  file.read(reinterpret_cast<char*>(mean.data()),
            static_cast<std::streamsize>(mean.size() * sizeof(int16_t)));
  ASSERT_TRUE(file);
  std::vector<float> vertices;
  for (const int16_t value : mean) vertices.push_back(static_cast<float>(value) / 256.0f);
  const N3DS_3D_MODEL model = {vertices.data(), N3DS_VERTEX_COUNT, &kTriangles[0][0],
                               N3DS_TRIANGLE_COUNT};

  // The camera looks along -z of the model and has its y downwards.
  scene_.camera = {{560, 0, 320, 0, 560, 240, 0, 0, 1}, {1, 0, 0, 0, -1, 0, 0, 0, -1}, {0, 0, 500}};
  SetPose();
  TestImage texture(N3DS_FORMAT_BGRA32, 512, 512);
  for (int y = 0; y < 512; ++y) {
    for (int x = 0; x < 512; ++x) {
      uint8_t* pixel = texture.Pixel(x, y);
      pixel[0] = static_cast<uint8_t>(x / 2);
      pixel[1] = static_cast<uint8_t>(y / 2);
      pixel[3] = 255;
    }
  }
  const N3DS_2D_TEXTURE_MASK mask = {nullptr, 0, nullptr, 0, texture.descriptor()};
  TestImage output(N3DS_FORMAT_BGRA32, 640, 480);
  ASSERT_EQ(N3DS_WarpFaceMask(context_.get(), &mask, output.get(), &model, 640, 480, 0), N3DS_OK);

  int covered = 0;
  double mean_x[2] = {}, mean_y[2] = {};
  int count_x[2] = {}, count_y[2] = {};
  for (int y = 0; y < 480; ++y) {
    for (int x = 0; x < 640; ++x) {
      const uint8_t* pixel = output.Pixel(x, y);
      if (pixel[3] == 0) continue;
      ++covered;
      mean_x[pixel[0] >= 128] += x;
      ++count_x[pixel[0] >= 128];
      mean_y[pixel[1] >= 128] += y;
      ++count_y[pixel[1] >= 128];
    }
  }
  // A head is some 150 by 200 mm; 560 / 500 pixels a millimetre.
  EXPECT_GT(covered, 15000);
  EXPECT_LT(covered, 50000);
  EXPECT_GT(mean_x[1] / count_x[1], mean_x[0] / count_x[0] + 20) << "u grows to the right";
  EXPECT_GT(mean_y[1] / count_y[1], mean_y[0] / count_y[0] + 20) << "v of the image grows down";
}

}  // namespace
}  // namespace n3ds::testing
