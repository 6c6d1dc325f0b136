// SPDX-License-Identifier: MIT
// Images in camera formats, and the mask's way onto them against the graphics system's drawing.
#include "render/camera_image.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "engine/core_session.h"
#include "engine/engine_session.h"
#include "norvale_3d_sticker_engine.h"
#include "render/scene.h"
#include "support/data_files.h"

namespace n3ds::tool {
namespace {

using ::testing::Each;

Image Colours(int width, int height) {
  Image image(width, height);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      std::uint8_t* p = image.Pixel(x, y);
      // The same in blocks of 2 x 2 pixels, so that halved chroma loses nothing.
      p[0] = static_cast<std::uint8_t>(40 + 37 * (x / 2) % 170);
      p[1] = static_cast<std::uint8_t>(40 + 53 * (y / 2) % 170);
      p[2] = static_cast<std::uint8_t>(40 + 29 * (x / 2 + y / 2) % 170);
    }
  }
  return image;
}

TEST(CameraImage, PackedFormatsReadBack) {
  const Image image = Colours(7, 5);
  EXPECT_EQ(CameraImage::Bgr24(image).ToImage(7, 5).rgba, image.rgba);
  Image with_alpha = image;
  with_alpha.Pixel(3, 2)[3] = 99;
  EXPECT_EQ(CameraImage::Bgra32(with_alpha).ToImage(7, 5).rgba, with_alpha.rgba);
}

TEST(CameraImage, DescribesItsPlanes) {
  const Image image = Colours(7, 5);
  CameraImage packed = CameraImage::Bgr24(image);
  const NSVL_OFFSCREEN bgr = packed.Descriptor();
  EXPECT_EQ(bgr.pixelFormat, static_cast<std::uint32_t>(N3DS_FORMAT_BGR24));
  EXPECT_EQ(bgr.width, 7);
  EXPECT_EQ(bgr.pitch[0], 21);
  EXPECT_EQ(bgr.plane[0][0], image.Pixel(0, 0)[2]);  // blue first
  EXPECT_EQ(bgr.plane[1], nullptr);

  CameraImage planes = CameraImage::Nv21(image);
  const NSVL_OFFSCREEN nv21 = planes.Descriptor();
  EXPECT_EQ(nv21.width, 8);
  EXPECT_EQ(nv21.height, 6);
  EXPECT_EQ(nv21.pitch[0], 8);
  EXPECT_EQ(nv21.pitch[1], 8);
}

TEST(CameraImage, ChromaHasVBeforeU) {
  Image red(2, 2);
  for (int k = 0; k < 4; ++k) std::copy_n(std::begin({200, 0, 0}), 3, &red.rgba[4 * k]);
  CameraImage planes = CameraImage::Nv21(red);
  const NSVL_OFFSCREEN nv21 = planes.Descriptor();
  EXPECT_GT(nv21.plane[1][0], 200);  // V follows red
  EXPECT_LT(nv21.plane[1][1], 110);  // U follows blue
}

TEST(CameraImage, TwoPlanesKeepColoursThatShareABlock) {
  for (const auto& [width, height] : {std::pair{8, 6}, {7, 5}, {1, 1}}) {
    const Image image = Colours(width, height);
    const Image again = CameraImage::Nv21(image).ToImage(width, height);
    for (std::size_t i = 0; i < image.rgba.size(); ++i) {
      EXPECT_NEAR(again.rgba[i], image.rgba[i], 3) << width << " " << i;
    }
  }
}

TEST(CameraImage, StartsClear) {
  const Image clear = CameraImage::ClearBgra32(3, 2).ToImage(3, 2);
  EXPECT_THAT(clear.rgba, Each(0));
}

// Red on the left half of the face, green on the right.
Image HalfAndHalf() {
  Image texture(256, 256);
  for (int y = 0; y < 256; ++y) {
    for (int x = 0; x < 256; ++x) {
      std::uint8_t* p = texture.Pixel(x, y);
      p[0] = x < 128 ? 255 : 0;
      p[1] = x < 128 ? 0 : 255;
      p[2] = 0;
    }
  }
  return texture;
}

// On turned heads the far half is hidden by the near one. The warp knows no depth; the order in
// which it gets its triangles has to tell it.
TEST(CoreSession, MasksHideTheirFarSideAsTheRendererDoes) {
  const Track track =
      ReadTrackFile(N3DS_SOURCE_DIR "/examples/tracks/synthetic_yaw_sweep.track.jsonl");
  const TrackHeader& header = track.header;
  EngineSession engine(DefaultModelPath(), header, TrackMode::kMask);
  CoreSession core(DefaultModelPath(), header);
  constexpr SceneParts kNothing = {false, false, false, false, false};
  Image ground(header.width, header.height);
  std::fill(ground.rgba.begin(), ground.rgba.end(), std::uint8_t{0});
  Scene scene(header, DefaultModelPath(), kNothing, ground, header.width, header.height,
              HalfAndHalf());
  CameraImage texture = CameraImage::Bgra32(HalfAndHalf());
  for (std::size_t f = 0; f < track.frames.size(); ++f) {
    const FrameResult result = engine.Process(track.frames[f]);
    core.Process(track.frames[f]);
    if (f % 11 != 0) continue;
    const Image drawn = scene.Draw(result, engine.texture_coordinates());
    CameraImage mask = CameraImage::ClearBgra32(header.width, header.height);
    core.Warp(texture.Descriptor(), 0, mask.Descriptor());
    const Image warped = mask.ToImage(header.width, header.height);
    std::size_t covered = 0;
    std::size_t different = 0;
    for (std::size_t i = 0; i < drawn.rgba.size(); i += 4) {
      const bool red = drawn.rgba[i] > 60;
      const bool green = drawn.rgba[i + 1] > 60;
      if (red == green) continue;  // the ground, or the seam
      ++covered;
      if (red != (warped.rgba[i] > 100) || green != (warped.rgba[i + 1] > 100)) ++different;
    }
    EXPECT_GT(covered, 5000u) << f;
    // What remains are pixels along edges, which each of the two cuts in its own way.
    EXPECT_LT(different, covered / 100) << f;
  }
}

TEST(CoreSession, SortsFacesByTheirDistance) {
  const Track track =
      ReadTrackFile(N3DS_SOURCE_DIR "/examples/tracks/synthetic_five_cross.track.jsonl");
  CoreSession core(DefaultModelPath(), track.header);
  core.Process(track.frames[0]);
  const auto& faces = track.frames[0].faces;
  const std::vector<std::size_t> order = core.FarToNear();
  ASSERT_EQ(order.size(), faces.size());
  ASSERT_GT(faces.size(), 2u);
  // The truth's farthest and nearest heads.
  const auto nearer = [](const TrackFace& a, const TrackFace& b) {
    return a.truth->translation[2] < b.truth->translation[2];
  };
  EXPECT_EQ(faces[order.front()].id, std::max_element(faces.begin(), faces.end(), nearer)->id);
  EXPECT_EQ(faces[order.back()].id, std::min_element(faces.begin(), faces.end(), nearer)->id);
}

}  // namespace
}  // namespace n3ds::tool
