// SPDX-License-Identifier: MIT
// 'n3ds model check', 'render' and 'export' as their user meets them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <sstream>

#include "render/image.h"
#include "tool_test.h"

namespace n3ds::tool {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::Not;

const std::string kModel = N3DS_SOURCE_DIR "/data/face_model.bin";

class CliModel : public ToolTest {
 protected:
  // The model file with its mean's first number changed.
  std::string DamagedModel() {
    std::string content = ReadFile(kModel);
    content[12] = static_cast<char>(content[12] ^ 1);
    return console_.Write("damaged.bin", content);
  }
};

// Pixels that differ by more than rounding.
std::size_t CountDifferences(const Image& a, const Image& b) {
  std::size_t count = 0;
  for (std::size_t i = 0; i < a.rgba.size(); i += 4) {
    if (std::abs(int{a.rgba[i]} - int{b.rgba[i]}) > 3) ++count;
  }
  return count;
}

TEST_F(CliModel, CheckPassesTheShippedModel) {
  const Outcome outcome = Run({"model", "check", kModel});
  EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(outcome.out,
              AllOf(HasSubstr("Form\n"), HasSubstr("Symmetry\n"), HasSubstr("\nTexture\n"),
                    HasSubstr("sharpest edge with jaw open + brows up"), Not(HasSubstr("FAIL"))));
}

TEST_F(CliModel, CheckSaysWhatIsWrong) {
  const Outcome outcome = Run({"model", "check", DamagedModel()});
  EXPECT_EQ(outcome.exit_code, kFailed);
  EXPECT_THAT(outcome.out, HasSubstr("  FAIL  mean against its mirror image, 1/256 mm"));
  EXPECT_THAT(outcome.err,
              AllOf(HasSubstr("damaged.bin: 1 of "),
                    EndsWith("checks failed, the first is 'mean against its mirror image, 1/256 "
                             "mm'\n")));
  ExpectFailure({"model", "check", kModel, "--unit", "2"}, kFailed,
                " checks failed, the first is ");
}

TEST_F(CliModel, RenderDrawsAFaceFromSeveralSides) {
  const std::string png = folder_.Path("a.png");
  const Outcome outcome =
      Run({"model", "render", kModel, "--out", png, "--views", "3", "--size", "120"});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(folder_.Names(), ElementsAre("a.png"));
  const Image image = ReadImage(png);
  ASSERT_EQ(image.width, 360);
  ASSERT_EQ(image.height, 120);
  // Skin in the middle of the front view, ground in its corner; the nose of a profile points away
  // from the middle view, so the outer views are bright on their outer half.
  EXPECT_GT(image.Pixel(180, 60)[0], image.Pixel(180, 60)[2]);
  EXPECT_GT(image.Pixel(180, 60)[0], 100);
  EXPECT_LT(image.Pixel(122, 2)[0], 60);
  const auto skin = [&](int left, int right) {
    int count = 0;
    for (int y = 0; y < image.height; ++y) {
      for (int x = left; x < right; ++x) {
        if (image.Pixel(x, y)[0] > image.Pixel(x, y)[2] + 8) ++count;
      }
    }
    return count;
  };
  EXPECT_GT(skin(0, 60), skin(60, 120));
  EXPECT_GT(skin(300, 360), skin(240, 300));
}

TEST_F(CliModel, RenderShowsIdentityAndExpression) {
  const auto draw = [&](const std::vector<std::string>& options) {
    std::vector<std::string> arguments = {
        "model", "render", kModel, "--views", "1", "--out", folder_.Path("a.png"), "--size", "160"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    const Outcome outcome = Run(arguments);
    EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
    return ReadImage(folder_.Path("a.png"));
  };
  const Image mean = draw({});
  EXPECT_EQ(CountDifferences(mean, draw({"--identity", "1=0"})), 0u);
  EXPECT_GT(CountDifferences(mean, draw({"--identity", "1=2.5"})), 400u);
  const Image open = draw({"--expression", "jaw_open=1"});
  EXPECT_GT(CountDifferences(mean, open), 400u);
  EXPECT_LT(open.Pixel(80, 120)[0], mean.Pixel(80, 120)[0]);  // into the mouth
}

TEST_F(CliModel, ExportWritesTheComposedFace) {
  const auto lowest = [&](const std::vector<std::string>& options) {
    std::vector<std::string> arguments = {"model", "export", kModel, "--obj",
                                          folder_.Path("a.obj")};
    arguments.insert(arguments.end(), options.begin(), options.end());
    const Outcome outcome = Run(arguments);
    EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
    std::istringstream lines(folder_.Read("a.obj"));
    double low = 1000;
    std::size_t vertices = 0;
    for (std::string line; std::getline(lines, line);) {
      double height = 0;
      if (std::sscanf(line.c_str(), "v %*f %lf", &height) != 1) continue;
      low = std::min(low, height);
      ++vertices;
    }
    EXPECT_EQ(vertices, 1812u);
    return low;
  };
  const double mean = lowest({});
  EXPECT_LT(lowest({"--expression", "jaw_open=1"}), mean - 15);
  EXPECT_NEAR(lowest({"--identity", "1=2", "--identity", "1=0"}), mean, 0.002);
}

TEST_F(CliModel, RefusesWhatItCannotMake) {
  const std::string out = folder_.Path("a.png");
  const auto render = [&](const std::vector<std::string>& options, int exit_code,
                          const std::string& text) {
    std::vector<std::string> arguments = {"model", "render", kModel, "--out", out};
    arguments.insert(arguments.end(), options.begin(), options.end());
    ExpectFailure(arguments, exit_code, text);
  };
  for (const char* text : {"1", "1=", "1=x", "1=9", "1=nan", "1=2z", "=1"}) {
    render({"--identity", text}, kUsage, std::string("--identity ") + text + ": ");
  }
  render({"--identity", "17=1"}, kUsage, "--identity 17=1: there are modes 1 to 16");
  render({"--identity", "0=1"}, kUsage, "there are modes 1 to 16");
  render({"--expression", "smirk=1"}, kUsage, "there is no expression 'smirk'");
  render({"--expression", "jaw_open=3"}, kUsage, "expected NAME=VALUE with a value from -2 to 2");
  render({"--views", "0"}, kUsage, "--views");
  render({"--size", "9"}, kUsage, "--size");
  ExpectFailure({"model", "render", kModel}, kUsage, "--out");
  ExpectFailure({"model", "export", kModel}, kUsage, "--obj");
  ExpectFailure({"model", "render", kModel, "--out", folder_.Path("missing/a.png")}, kFailed,
                "missing/a.png: cannot be written");
  ExpectFailure({"model", "export", kModel, "--obj", folder_.Path("missing/a.obj")}, kFailed,
                "missing/a.obj: cannot be written");
  const std::string broken = console_.Write("m.bin", "no model");
  for (const char* command : {"check", "render", "export"}) {
    std::vector<std::string> arguments = {"model", command, broken};
    if (command == std::string("render")) arguments.insert(arguments.end(), {"--out", out});
    if (command == std::string("export")) {
      arguments.insert(arguments.end(), {"--obj", folder_.Path("a.obj")});
    }
    ExpectFailure(arguments, kFailed, "m.bin: a face model has 2141796 bytes, this file has 8");
  }
}

TEST_F(CliModel, RefusesEndingsItCannotWrite) {
  ExpectFailure({"model", "render", kModel, "--out", folder_.Path("a.tiff")}, kUsage,
                "a.tiff: unknown ending .tiff (known: .png, .jpg, .jpeg)");
  ExpectFailure({"model", "render", kModel, "--out", folder_.Path("a")}, kUsage, "a: no ending");
  ExpectFailure({"model", "export", kModel, "--obj", folder_.Path("a.stl")}, kUsage,
                "a.stl: unknown ending .stl (known: .obj)");
}

TEST_F(CliModel, RefusesToReplaceTheModel) {
  std::filesystem::copy_file(kModel, console_.Path("m.obj"));
  std::filesystem::create_symlink("m.obj", console_.Path("m.png"));
  ExpectFailure({"model", "export", console_.Path("m.obj"), "--obj", console_.Path("m.obj")},
                kUsage, "is also an input");
  ExpectFailure({"model", "render", console_.Path("m.obj"), "--out", console_.Path("m.png")},
                kUsage, "is also an input");
}

TEST_F(CliModel, HelpShowsExamples) {
  for (const char* command : {"check", "render", "export"}) {
    const Outcome outcome = Run({"model", command, "--help"});
    EXPECT_EQ(outcome.exit_code, 0);
    EXPECT_THAT(outcome.out, HasSubstr(std::string("  n3ds model ") + command + " data/"));
  }
}

}  // namespace
}  // namespace n3ds::tool
