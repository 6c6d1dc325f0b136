// SPDX-License-Identifier: MIT
// 'n3ds render' as its user meets it.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>

#include "render/image.h"
#include "tool_test.h"

namespace n3ds::tool {
namespace {

using ::testing::ElementsAre;

using CliRender = ToolTest;

TEST_F(CliRender, MakesAImage) {
  const Outcome outcome = Run({"render", ExampleTrack("real_head_move_90"), "--frame", "3",
                               "--size", "320x320", "--out", folder_.Path("a.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(folder_.Names(), ElementsAre("a.png"));
  const Image image = ReadImage(folder_.Path("a.png"));
  EXPECT_EQ(image.width, 320);  // upright: 640 x 480
  EXPECT_EQ(image.height, 240);
}

TEST_F(CliRender, MakesAContactSheet) {
  const Outcome outcome = Run({"render", ExampleTrack("synthetic_three"), "--contact-sheet", "6",
                               "--size", "160x160", "--out", folder_.Path("sheet.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  const Image image = ReadImage(folder_.Path("sheet.png"));
  EXPECT_EQ((image.width + 4) / 164 * ((image.height + 4) / 94), 6);
}

TEST_F(CliRender, ShowsTheHeadsAlone) {
  const Outcome outcome = Run({"render", ExampleTrack("synthetic_talk_165"), "--closeup", "--size",
                               "200x240", "--out", folder_.Path("a.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  const Image image = ReadImage(folder_.Path("a.png"));
  EXPECT_TRUE(image.width == 200 || image.height == 240);
  EXPECT_LT(image.width, image.height);  // the track's images are broad, a head is not
  const Outcome film = Run({"render", ExampleTrack("synthetic_talk_165"), "--closeup", "--size",
                            "99x101", "--every", "10", "--out", folder_.Path("a.mp4")});
  EXPECT_EQ(film.exit_code, 0) << film.err;
}

TEST_F(CliRender, MakesAFolderOfFrames) {
  const Outcome outcome = Run({"render", ExampleTrack("real_man_270_mirror"), "--every", "15",
                               "--size", "64x64", "--out", folder_.Path("frames")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder_.Path("frames"))) {
    names.push_back(entry.path().filename());
  }
  std::sort(names.begin(), names.end());
  EXPECT_THAT(names, ElementsAre("frame_000000.png", "frame_000015.png", "frame_000030.png"));
}

TEST_F(CliRender, MakesAFilm) {
  const Outcome outcome = Run({"render", ExampleTrack("real_man_270_mirror"), "--every", "3",
                               "--size", "99x99", "--out", folder_.Path("a.mp4")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(folder_.Names(), ElementsAre("a.mp4"));
  EXPECT_THAT(folder_.Read("a.mp4").substr(4, 4), "ftyp");
}

TEST_F(CliRender, DrawsOverAPhoto) {
  Image photo(320, 320);
  for (std::size_t i = 0; i < photo.rgba.size(); ++i) photo.rgba[i] = i % 4 == 3 ? 255 : 90;
  WritePng(console_.Path("photo.png"), photo);
  const Outcome outcome =
      Run({"render", ExampleTrack("photo_astronaut"), "--image", console_.Path("photo.png"),
           "--size", "320x320", "--out", folder_.Path("a.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  const Image drawn = ReadImage(folder_.Path("a.png"));
  EXPECT_EQ(drawn.Pixel(5, 300)[0], 90);  // the ground is the photo
  std::size_t changed = 0;
  for (std::size_t i = 0; i < drawn.rgba.size(); i += 4) changed += drawn.rgba[i] != 90 ? 1U : 0U;
  EXPECT_GT(changed, 1000u);
}

TEST_F(CliRender, RefusesWhatItCannotDraw) {
  const std::string track = ExampleTrack("real_man_270_mirror");
  const std::string png = folder_.Path("a.png");
  ExpectFailure({"render", track, "--out", png, "--frame", "999"}, kFailed, "no frame 999");
  ExpectFailure({"render", track, "--out", png, "--frame", "1", "--contact-sheet", "4"}, kUsage,
                "exclude each other");
  ExpectFailure({"render", track, "--out", folder_.Path("a.mp4"), "--frame", "1"}, kUsage,
                "must end in .png or .jpg");
  for (const char* size : {"0x0", "100", "axb", "100x100x", "99999x10"}) {
    ExpectFailure({"render", track, "--out", png, "--size", size}, kUsage, "--size ");
  }
  ExpectFailure({"render", track, "--out", png, "--image", track}, kFailed,
                "neither a PNG nor a JPEG");
  ExpectFailure({"render", track, "--out", png, "--image", folder_.Path("none.jpg")}, kFailed,
                "none.jpg: the image cannot be opened");
  WritePng(console_.Path("square.png"), Image(50, 50));
  ExpectFailure({"render", track, "--out", png, "--image", console_.Path("square.png")}, kFailed,
                "the image has 50 x 50 pixels, the track 270 x 480");
  ExpectFailure({"render", Damaged(2, "?"), "--out", png}, kFailed, ":2: not valid JSON");
  ExpectFailure({"render", track, "--out", folder_.Path("missing/a.png")}, kFailed,
                "missing/a.png: cannot be written");
}

TEST_F(CliRender, WritesJpegWhereJpegIsAskedFor) {
  const std::string track = ExampleTrack("real_man_270_mirror");
  const auto draw = [&](const std::string& name) {
    const Outcome outcome =
        Run({"render", track, "--size", "200x200", "--out", folder_.Path(name)});
    EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
    return ReadImage(folder_.Path(name));
  };
  const Image png = draw("a.png");
  for (const char* name : {"a.jpg", "b.JPEG"}) {
    const Image jpeg = draw(name);
    EXPECT_EQ(folder_.Read(name).substr(0, 2), "\xff\xd8");
    ASSERT_EQ(jpeg.rgba.size(), png.rgba.size());
    double difference = 0;
    for (std::size_t i = 0; i < png.rgba.size(); ++i) {
      difference += std::abs(int{png.rgba[i]} - int{jpeg.rgba[i]});
    }
    EXPECT_LT(difference / static_cast<double>(png.rgba.size()), 3);
  }
}

TEST_F(CliRender, RefusesEndingsItCannotWrite) {
  const std::string track = ExampleTrack("real_man_270_mirror");
  for (const std::string ending : {".gif", ".webm", ".mov", ".pgn"}) {
    ExpectFailure(
        {"render", track, "--out", folder_.Path("x" + ending)}, kUsage,
        "unknown ending " + ending + " (known: .png, .jpg, .jpeg, .mp4; a folder has none)");
  }
  // A folder that is there, or a slash, says what is meant.
  std::filesystem::create_directory(console_.Path("frames.v1"));
  for (const std::string& out : {console_.Path("frames.v1"), console_.Path("frames.v2/")}) {
    EXPECT_EQ(Run({"render", track, "--every", "30", "--size", "32x32", "--out", out}).exit_code,
              0);
    EXPECT_TRUE(std::filesystem::exists(out + "/frame_000030.png"));
  }
}

TEST_F(CliRender, RefusesToReplaceItsInput) {
  const std::string track = ExampleTrack("photo_astronaut");
  WritePng(console_.Path("photo.png"), Image(512, 512));
  std::filesystem::create_symlink("photo.png", console_.Path("link.png"));
  ExpectFailure(
      {"render", track, "--image", console_.Path("photo.png"), "--out", console_.Path("link.png")},
      kUsage, "is also an input");
  ExpectFailure({"render", track, "--mode", "mask", "--texture", console_.Path("photo.png"),
                 "--out", console_.Path("photo.png")},
                kUsage, "is also an input");
}

// What a user of stickers wants to see; landmarks and axes are for those who debug.
TEST_F(CliRender, DrawsStickersAlone) {
  const auto draw = [&](const std::vector<std::string>& more) {
    std::vector<std::string> arguments = {"render", ExampleTrack("photo_astronaut"),
                                          "--size", "300x300",
                                          "--out",  folder_.Path("a.png")};
    arguments.insert(arguments.end(), more.begin(), more.end());
    EXPECT_EQ(Run(arguments).exit_code, 0);
    return ReadImage(folder_.Path("a.png")).rgba;
  };
  const auto plain = draw({});
  EXPECT_EQ(plain, draw({"--draw", "hat,glasses,head"}));
  EXPECT_NE(plain, draw({"--draw", "hat,glasses,head,landmarks"}));
  EXPECT_NE(plain, draw({"--draw", "hat,glasses,head,axes"}));
}

TEST_F(CliRender, DrawsTheDenseMesh) {
  const std::string track = ExampleTrack("synthetic_talk_165");
  const auto changed = [&](const std::vector<std::string>& more) {
    std::vector<std::string> arguments = {"render", track,     "--mode", "mask",
                                          "--size", "320x320", "--out",  folder_.Path("a.png")};
    arguments.insert(arguments.end(), more.begin(), more.end());
    const Outcome outcome = Run(arguments);
    EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
    const Image drawn = ReadImage(folder_.Path("a.png"));
    // The ground is grey with a touch of blue.
    std::size_t count = 0;
    for (std::size_t i = 0; i < drawn.rgba.size(); i += 4) {
      count += drawn.rgba[i] > drawn.rgba[i + 2] + 3 ? 1U : 0U;
    }
    return count;
  };
  Image red(16, 16);
  for (std::size_t i = 0; i < red.rgba.size(); ++i)
    red.rgba[i] = i % 4 == 0 || i % 4 == 3 ? 255 : 0;
  WritePng(console_.Path("red.png"), red);
  const std::size_t mesh = changed({"--draw", "mesh"});
  const std::size_t head = changed({});
  const std::size_t mask = changed({"--draw", "landmarks", "--texture", console_.Path("red.png")});
  EXPECT_GT(mesh, 3000u);
  EXPECT_GT(head, mesh + 500);
  EXPECT_NEAR(static_cast<double>(mask), static_cast<double>(mesh),
              0.1 * static_cast<double>(mesh));
}

TEST_F(CliRender, DenseMeshesNeedMaskMode) {
  const std::string track = ExampleTrack("real_man_270_mirror");
  const std::string png = folder_.Path("a.png");
  const std::string mask = N3DS_SOURCE_DIR "/examples/assets/mask_tiger.png";
  for (const char* part : {"mesh", "wireframe", "hat,wireframe"}) {
    ExpectFailure({"render", track, "--out", png, "--draw", part}, kUsage, "need the dense mesh");
  }
  ExpectFailure({"render", track, "--out", png, "--texture", mask}, kUsage, "need the dense mesh");
  ExpectFailure({"render", track, "--out", png, "--mode", "mask", "--texture", track}, kFailed,
                "neither a PNG nor a JPEG");
  ExpectFailure(
      {"render", track, "--out", png, "--mode", "mask", "--texture", folder_.Path("none.png")},
      kFailed, "none.png: the image cannot be opened");
}

TEST_F(CliRender, AFilmThatCannotBeMadeLeavesNothing) {
  ExpectFailure({"render", ExampleTrack("photo_astronaut"), "--size", "64x64", "--out",
                 folder_.Path("missing/a.mp4")},
                kFailed, "missing/a.mp4: cannot be written");
  const std::string path = std::getenv("PATH");
  setenv("PATH", folder_.Path("").c_str(), 1);
  ExpectFailure({"render", ExampleTrack("photo_astronaut"), "--size", "64x64", "--out",
                 folder_.Path("a.mp4")},
                kFailed, "a.mp4: films need the program ffmpeg, which cannot be started");
  setenv("PATH", path.c_str(), 1);
}

// The encoder goes too, or it would write the file again.
TEST_F(CliRender, ASignalRemovesAHalfFilm) {
  const std::string track = LongTrack("photo_astronaut", 3000);
  for (const int signal : {SIGINT, SIGTERM}) {
    const pid_t child = Start({"render", track, "--out", folder_.Path("a.mp4"), "--size", "64x64"});
    EXPECT_EQ(EndBySignal(child, signal, folder_.Path("")).signal, signal);
    usleep(200000);
    EXPECT_THAT(folder_.Names(), ::testing::IsEmpty());
  }
}

TEST_F(CliRender, RefusesADamagedModel) {
  ExpectFailure({"render", ExampleTrack("photo_astronaut"), "--model",
                 console_.Write("m.bin", "no model"), "--out", folder_.Path("a.png")},
                kFailed, "m.bin: a face model has 2141796 bytes, this file has 8");
}

}  // namespace
}  // namespace n3ds::tool
