// SPDX-License-Identifier: MIT
// 'n3ds mask' and 'n3ds mesh' as their user meets them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdlib>
#include <map>

#include "render/image.h"
#include "tool_test.h"

namespace n3ds::tool {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

using Rgb = std::array<int, 3>;

Rgb At(const Image& image, int x, int y) {
  const std::uint8_t* p = image.Pixel(x, y);
  return {p[0], p[1], p[2]};
}

Image Plain(int width, int height, std::uint8_t grey) {
  Image image(width, height);
  for (std::size_t i = 0; i < image.rgba.size(); ++i) {
    if (i % 4 != 3) image.rgba[i] = grey;
  }
  return image;
}

// Red left, green right, the lower half darker.
Image FourColours() {
  Image image(128, 128);
  for (int y = 0; y < 128; ++y) {
    for (int x = 0; x < 128; ++x) {
      const auto level = static_cast<std::uint8_t>(y < 64 ? 240 : 120);
      std::uint8_t* p = image.Pixel(x, y);
      p[0] = x < 64 ? level : 0;
      p[1] = x < 64 ? 0 : level;
      p[2] = 0;
    }
  }
  return image;
}

class CliMask : public ToolTest {
 protected:
  std::string Save(const std::string& name, const Image& image) {
    WritePng(console_.Path(name), image);
    return console_.Path(name);
  }

  // A copy of an example track with another image size.
  std::string Resized(const std::string& track, int width, int height) {
    std::string text = ReadFile(ExampleTrack(track));
    const auto replace = [&](const std::string& key, int value) {
      const std::size_t from = text.find("\"" + key + "\":") + key.size() + 3;
      text.replace(from, text.find(',', from) - from, std::to_string(value));
    };
    replace("width", width);
    replace("height", height);
    return console_.Write("resized.track.jsonl", text);
  }

  // The image with the mask, which must come out.
  Image Masked(const std::string& photo, const std::string& track, const std::string& texture,
               const std::vector<std::string>& more = {}) {
    std::vector<std::string> arguments = {
        "mask", photo, track, "--texture", texture, "--out", folder_.Path("a.png")};
    arguments.insert(arguments.end(), more.begin(), more.end());
    const Outcome outcome = Run(arguments);
    EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
    EXPECT_THAT(outcome.err, IsEmpty());
    EXPECT_THAT(folder_.Names(), ElementsAre("a.png"));
    return outcome.exit_code == 0 ? ReadImage(folder_.Path("a.png")) : Image();
  }

  const std::string astronaut_ = ExampleTrack("photo_astronaut");
};

// The face of the photo: brows near (197, 95) and (249, 95), pupils (204, 101) and (247, 103),
// chin (222, 178).
TEST_F(CliMask, PutsTheMaskOnTheFaceInBothFormats) {
  const std::string photo = Save("photo.png", Plain(512, 512, 128));
  const std::string texture = Save("texture.png", FourColours());
  for (const char* format : {"bgr24", "nv21"}) {
    const Image masked = Masked(photo, astronaut_, texture, {"--format", format});
    ASSERT_EQ(masked.width, 512);
    ASSERT_EQ(masked.height, 512);
    // Level 128 leaves three quarters of the mask's colour; even an opaque one lets 1/256 through.
    const Rgb upper_left = At(masked, 205, 80);
    const Rgb upper_right = At(masked, 245, 80);
    const Rgb lower_left = At(masked, 205, 155);
    EXPECT_NEAR(upper_left[0], 180, 4) << format;
    EXPECT_LT(upper_left[1], 5) << format;
    EXPECT_NEAR(upper_right[1], 180, 4) << format;
    EXPECT_LT(upper_right[0], 5) << format;
    EXPECT_NEAR(lower_left[0], 90, 4) << format;
    // The eyes are open, and the ground stays.
    for (const auto& [x, y] : {std::pair{204, 101}, {247, 103}, {5, 5}, {500, 300}}) {
      const Rgb seen = At(masked, x, y);
      for (const int level : seen) EXPECT_NEAR(level, 128, 1) << format << x;
    }
  }
}

TEST_F(CliMask, TransparentMasksChangeNothing) {
  Image clear = FourColours();
  for (std::size_t i = 3; i < clear.rgba.size(); i += 4) clear.rgba[i] = 0;
  const std::string texture = Save("clear.png", clear);
  const Image photo = Plain(512, 512, 77);
  EXPECT_EQ(Masked(Save("photo.png", photo), astronaut_, texture).rgba, photo.rgba);
}

// The photo is delivered lying and mirrored; the image that comes out is upright.
TEST_F(CliMask, TurnsThePhotoUpright) {
  const std::string photo = Save("photo.png", Plain(270, 480, 128));
  const Image masked = Masked(photo, ExampleTrack("real_man_270_mirror"),
                              Save("texture.png", FourColours()), {"--frame", "5"});
  ASSERT_EQ(masked.width, 480);
  ASSERT_EQ(masked.height, 270);
  double red_x = 0;
  double green_x = 0;
  double light_y = 0;
  double dark_y = 0;
  std::array<double, 4> counts{};
  for (int y = 0; y < 270; ++y) {
    for (int x = 0; x < 480; ++x) {
      const auto [r, g, b] = At(masked, x, y);
      if (std::max(r, g) - b < 40) continue;
      (r > g ? red_x : green_x) += x;
      (std::max(r, g) > 130 ? light_y : dark_y) += y;
      ++counts[r > g ? 0 : 1];
      ++counts[std::max(r, g) > 130 ? 2 : 3];
    }
  }
  for (const double count : counts) ASSERT_GT(count, 200);
  EXPECT_LT(red_x / counts[0], green_x / counts[1] - 10);
  EXPECT_LT(light_y / counts[2], dark_y / counts[3] - 10);
}

// The mean face becomes the person's while the landmarks are held.
TEST_F(CliMask, TheShapeSettles) {
  const std::string photo = Save("photo.png", Plain(512, 512, 128));
  const std::string texture = Save("texture.png", FourColours());
  const auto settled = [&](const char* frames) {
    return Masked(photo, astronaut_, texture, {"--settle", frames}).rgba;
  };
  const auto changed = [](const std::vector<std::uint8_t>& a, const std::vector<std::uint8_t>& b) {
    std::size_t count = 0;
    for (std::size_t i = 0; i < a.size(); ++i) count += a[i] != b[i] ? 1U : 0U;
    return count;
  };
  const auto at_once = settled("0");
  const auto after_20 = settled("20");
  const auto after_40 = settled("40");
  EXPECT_GT(changed(at_once, after_20), 1000u);
  EXPECT_LT(changed(after_20, after_40), changed(at_once, after_20) / 4);
}

TEST_F(CliMask, EveryFaceGetsItsMask) {
  const std::string photo = Save("photo.png", Plain(1920, 1398, 100));
  const Outcome outcome = Run({"mask", photo, ExampleTrack("photo_group_5"), "--texture",
                               Save("texture.png", FourColours()), "--out", folder_.Path("a.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(outcome.out, HasSubstr("a.png: 5 faces"));
}

// Blocks of 2 x 2 pixels leave no row or column of an odd image out.
TEST_F(CliMask, OddImagesStayOdd) {
  const std::string track = Resized("photo_astronaut", 241, 161);
  Image photo = Plain(241, 161, 50);
  const std::string texture = Save("texture.png", FourColours());
  for (const char* format : {"bgr24", "nv21"}) {
    const Image masked = Masked(Save("photo.png", photo), track, texture, {"--format", format});
    ASSERT_EQ(masked.width, 241);
    ASSERT_EQ(masked.height, 161);
    // The face reaches beyond the right and the lower border.
    EXPECT_GT(At(masked, 239, 80)[1], 90) << format;
    EXPECT_GT(At(masked, 205, 159)[0], 60) << format;
    EXPECT_EQ(At(masked, 0, 0), (Rgb{50, 50, 50})) << format;
  }
}

TEST_F(CliMask, ImagesOfOnePixel) {
  const std::string track = Resized("photo_astronaut", 1, 1);
  const std::string texture = Save("texture.png", FourColours());
  for (const char* format : {"bgr24", "nv21"}) {
    const Image masked =
        Masked(Save("photo.png", Plain(1, 1, 9)), track, texture, {"--format", format});
    EXPECT_EQ(masked.rgba.size(), 4u) << format;
  }
  // A texture of one pixel has no neighbours to blend and draws nothing.
  const Image photo = Plain(512, 512, 30);
  EXPECT_EQ(Masked(Save("photo.png", photo), astronaut_, Save("one.png", Plain(1, 1, 200))).rgba,
            photo.rgba);
}

TEST_F(CliMask, RefusesWhatItCannotUse) {
  const std::string photo = Save("photo.png", Plain(512, 512, 128));
  const std::string texture = Save("texture.png", FourColours());
  const std::string png = folder_.Path("a.png");
  const auto refused = [&](const std::string& image, const std::string& track,
                           const std::string& mask, const std::string& text,
                           const std::vector<std::string>& more = {}) {
    std::vector<std::string> arguments = {"mask", image, track, "--texture", mask, "--out", png};
    arguments.insert(arguments.end(), more.begin(), more.end());
    ExpectFailure(arguments, kFailed, text);
  };
  refused(folder_.Path("none.png"), astronaut_, texture, "none.png: the image cannot be opened");
  refused(astronaut_, astronaut_, texture, "neither a PNG nor a JPEG");
  refused(Save("small.png", Plain(511, 512, 1)), astronaut_, texture,
          "small.png: the image has 511 x 512 pixels, the track 512 x 512");
  refused(photo, folder_.Path("none"), texture, "none: the file cannot be opened");
  refused(photo, Damaged(2, "?"), texture, ":2: not valid JSON");
  refused(photo, astronaut_, folder_.Path("none.png"), "none.png: the image cannot be opened");
  refused(photo, astronaut_, astronaut_, "neither a PNG nor a JPEG");
  refused(photo, astronaut_, texture, "no frame 7", {"--frame", "7"});
  refused(photo, astronaut_, texture, "m.bin: a face model has 2141796 bytes, this file has 8",
          {"--model", console_.Write("m.bin", "no model")});

  const std::string header = ReadFile(astronaut_).substr(0, ReadFile(astronaut_).find('\n') + 1);
  refused(photo, console_.Write("empty.track.jsonl", header + "{\"frame\":4,\"faces\":[]}\n"),
          texture, "empty.track.jsonl: frame 4 has no face to put a mask on");

  ExpectFailure(
      {"mask", photo, astronaut_, "--texture", texture, "--out", folder_.Path("missing/a.png")},
      kFailed, "missing/a.png: cannot be written");
  ExpectFailure({"mask", photo, astronaut_, "--texture", texture, "--out", png, "--format", "rgb"},
                kUsage, "--format");
  ExpectFailure({"mask", photo, astronaut_, "--out", png}, kUsage, "--texture is required");
  ExpectFailure({"mask", photo, astronaut_, "--texture", texture, "--out", png, "--settle", "-1"},
                kUsage, "--settle");
}

TEST_F(CliMask, WritesWhatTheEndingAsksFor) {
  const std::string photo = Save("photo.png", Plain(512, 512, 128));
  const std::string texture = Save("texture.png", FourColours());
  const auto mask = [&](const std::string& out) {
    return std::vector<std::string>{"mask", photo, astronaut_, "--texture", texture, "--out", out};
  };
  const Outcome outcome = Run(mask(folder_.Path("a.jpg")));
  EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_EQ(folder_.Read("a.jpg").substr(0, 2), "\xff\xd8");
  EXPECT_EQ(ReadImage(folder_.Path("a.jpg")).width, 512);
  const Outcome piped = Run(mask("/dev/stdout"));
  EXPECT_EQ(piped.exit_code, 0) << piped.err;
  EXPECT_EQ(piped.out.substr(1, 3), "PNG");
  EXPECT_THAT(piped.out.substr(piped.out.size() - 8), HasSubstr("IEND"));
  ExpectFailure(mask(folder_.Path("a.gif")), kUsage,
                "a.gif: unknown ending .gif (known: .png, .jpg, .jpeg)", {"a.jpg"});
  ExpectFailure(mask(photo), kUsage, "is also an input", {"a.jpg"});
  ExpectFailure(mask(texture), kUsage, "is also an input", {"a.jpg"});
}

struct Obj {
  std::vector<std::string> names;
  std::vector<std::array<double, 3>> vertices;
  std::size_t coordinates = 0;
  std::vector<std::array<std::size_t, 3>> triangles;
};

Obj ParseObj(const std::string& text) {
  Obj obj;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    std::istringstream words(line);
    std::string kind;
    words >> kind;
    if (kind == "o") obj.names.push_back(line.substr(2));
    if (kind == "v") {
      obj.vertices.emplace_back();
      for (double& value : obj.vertices.back()) words >> value;
    }
    if (kind == "vt") {
      double u = -1;
      double v = -1;
      words >> u >> v;
      EXPECT_TRUE(u >= 0 && u <= 1 && v >= 0 && v <= 1) << line;
      ++obj.coordinates;
    }
    if (kind == "f") {
      obj.triangles.emplace_back();
      for (std::size_t& corner : obj.triangles.back()) {
        std::size_t coordinate = 0;
        char slash = 0;
        words >> corner >> slash >> coordinate;
        EXPECT_EQ(corner, coordinate) << line;
      }
    }
    EXPECT_FALSE(words.fail()) << line;
  }
  return obj;
}

using CliMesh = ToolTest;

TEST_F(CliMesh, WritesAFileAFrameWithAnObjectAFace) {
  const Outcome outcome = Run(
      {"mesh", ExampleTrack("synthetic_three"), "--out", folder_.Path("meshes"), "--every", "15"});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(outcome.out, HasSubstr("meshes: 3 files"));
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder_.Path("meshes"))) {
    names.push_back(entry.path().filename());
  }
  std::sort(names.begin(), names.end());
  ASSERT_THAT(names, ElementsAre("frame_000000.obj", "frame_000015.obj", "frame_000030.obj"));
  const Obj obj = ParseObj(folder_.Read("meshes/frame_000030.obj"));
  const std::size_t faces = obj.names.size();
  EXPECT_GE(faces, 2u);
  EXPECT_EQ(obj.vertices.size(), faces * 1812);
  EXPECT_EQ(obj.coordinates, faces * 1812);
  EXPECT_EQ(obj.triangles.size(), faces * 3456);
  for (std::size_t t = 0; t < obj.triangles.size(); ++t) {
    for (const std::size_t corner : obj.triangles[t]) {
      EXPECT_EQ((corner - 1) / 1812, t / 3456);  // each object keeps to its own vertices
    }
  }
  for (const auto& vertex : obj.vertices) EXPECT_LT(vertex[2], -200);  // before the viewer
}

// The truth of this track is a frontal head at about 700 mm, whose landmarks say where its nose is.
TEST_F(CliMesh, HeadSpaceIsTheUprightHead) {
  ASSERT_EQ(Run({"mesh", ExampleTrack("synthetic_yaw_sweep"), "--out", folder_.Path("m"), "--every",
                 "50", "--space", "head"})
                .exit_code,
            0);
  for (const char* name : {"m/frame_000000.obj", "m/frame_000050.obj"}) {
    const Obj obj = ParseObj(folder_.Read(name));
    std::array<double, 3> nose{};
    double left = 0;
    double right = 0;
    for (const auto& vertex : obj.vertices) {
      if (vertex[2] > nose[2]) nose = vertex;
      left = std::min(left, vertex[0]);
      right = std::max(right, vertex[0]);
    }
    EXPECT_NEAR(nose[0], 0, 6) << name;
    EXPECT_NEAR(nose[1], -7, 12) << name;
    EXPECT_NEAR(nose[2], 119, 15) << name;
    EXPECT_NEAR(left, -76, 12) << name;
    EXPECT_NEAR(right, 76, 12) << name;
  }
}

TEST_F(CliMesh, RefusesWhatItCannotDo) {
  const std::string track = ExampleTrack("real_man_270_mirror");
  ExpectFailure({"mesh", track}, kUsage, "--out is required");
  ExpectFailure({"mesh", track, "--out", "m", "--every", "0"}, kUsage, "--every");
  ExpectFailure({"mesh", track, "--out", "m", "--space", "moon"}, kUsage, "--space");
  const std::string out = folder_.Path("m");
  ExpectFailure({"mesh", Damaged(2, "?"), "--out", out}, kFailed, ":2: not valid JSON");
  ExpectFailure({"mesh", track, "--out", out, "--model", folder_.Path("none")}, kFailed,
                "none: the face model cannot be opened");
  folder_.Write("file", "x");
  ExpectFailure({"mesh", track, "--out", folder_.Path("file")}, kFailed, "file", {"file"});
  ExpectFailure({"mesh", track, "--out", folder_.Path("file/m")}, kFailed,
                "file/m: cannot create directory", {"file"});
  EXPECT_EQ(folder_.Read("file"), "x");
}

}  // namespace
}  // namespace n3ds::tool
