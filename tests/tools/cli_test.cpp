// The tool as its user meets it: exit codes, one sentence on stderr, nothing half-written.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "render/picture.h"
#include "scratch_folder.h"

namespace n3ds::tool {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr int kFailed = 1;
constexpr int kUsage = 2;

std::string ExampleTrack(const std::string& name) {
  return N3DS_SOURCE_DIR "/examples/tracks/" + name + ".track.jsonl";
}

const std::string kModel = N3DS_SOURCE_DIR "/data/face_model.bin";

struct Outcome {
  int exit_code = -1;  // -1: killed by a signal
  std::string out;
  std::string err;
};

class Cli : public ::testing::Test {
 protected:
  // Runs n3ds with its output in files outside of the folder under test.
  Outcome Run(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "n3ds");
    std::vector<char*> argv;
    for (std::string& argument : arguments) argv.push_back(argument.data());
    argv.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    constexpr int kFlags = O_WRONLY | O_CREAT | O_TRUNC;
    const std::string out = console_.Path("out");
    const std::string err = console_.Path("err");
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, out.c_str(), kFlags, 0600);
    posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, err.c_str(), kFlags, 0600);
    pid_t child = -1;
    const int failure = posix_spawn(&child, N3DS_TOOL, &actions, nullptr, argv.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    Outcome outcome;
    if (failure != 0) return outcome;
    int status = 0;
    waitpid(child, &status, 0);
    if (WIFEXITED(status)) outcome.exit_code = WEXITSTATUS(status);
    outcome.out = console_.Read("out");
    outcome.err = console_.Read("err");
    return outcome;
  }

  // The command fails with one sentence that holds `text`, and leaves only `names` in the folder.
  void ExpectFailure(const std::vector<std::string>& arguments, int exit_code,
                     const std::string& text, const std::vector<std::string>& names = {}) {
    const Outcome outcome = Run(arguments);
    EXPECT_EQ(outcome.exit_code, exit_code) << outcome.err;
    EXPECT_THAT(outcome.err, AllOf(StartsWith("n3ds: "), HasSubstr(text), EndsWith("\n")));
    EXPECT_EQ(std::count(outcome.err.begin(), outcome.err.end(), '\n'), 1) << outcome.err;
    EXPECT_EQ(folder_.Names(), names);
  }

  // An example track with one line replaced (counted from 1).
  std::string Damaged(std::size_t line, const std::string& by) {
    std::istringstream in(ReadFile(ExampleTrack("photo_group_3")));
    std::ostringstream out;
    std::string text;
    for (std::size_t number = 1; std::getline(in, text); ++number) {
      out << (number == line ? by : text) << '\n';
    }
    return console_.Write("damaged.track.jsonl", out.str());
  }

  static std::string ReadFile(const std::string& path) {
    std::ostringstream content;
    content << std::ifstream(path, std::ios::binary).rdbuf();
    return content.str();
  }

  ScratchFolder folder_;
  ScratchFolder console_;
};

TEST_F(Cli, EveryCommandHelpsWithExamples) {
  for (const std::vector<std::string>& command : {std::vector<std::string>{},
                                                  {"track"},
                                                  {"eval"},
                                                  {"render"},
                                                  {"model"},
                                                  {"model", "info"}}) {
    std::vector<std::string> arguments = command;
    arguments.emplace_back("--help");
    const Outcome outcome = Run(arguments);
    EXPECT_EQ(outcome.exit_code, 0);
    EXPECT_THAT(outcome.out, HasSubstr("Example"));
    EXPECT_THAT(outcome.err, IsEmpty());
  }
}

TEST_F(Cli, PrintsTheEnginesVersion) {
  const Outcome outcome = Run({"--version"});
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_THAT(outcome.out, HasSubstr("1.1.12021.63"));
}

TEST_F(Cli, RefusesWrongUsage) {
  ExpectFailure({}, kUsage, "subcommand");
  ExpectFailure({"fly"}, kUsage, "");
  ExpectFailure({"track"}, kUsage, "track is required");
  ExpectFailure({"track", "a", "--mode", "mask"}, kUsage, "--mode");
  ExpectFailure({"track", "a", "--wings"}, kUsage, "--wings");
  ExpectFailure({"render", "a"}, kUsage, "--out is required");
  ExpectFailure({"render", "a", "--out", "b", "--every", "0"}, kUsage, "--every");
  ExpectFailure({"render", "a", "--out", "b", "--draw", "wings"}, kUsage, "--draw");
  ExpectFailure({"model"}, kUsage, "subcommand");
}

TEST_F(Cli, TrackSummarisesEveryExample) {
  for (const auto& entry :
       std::filesystem::directory_iterator(N3DS_SOURCE_DIR "/examples/tracks")) {
    if (entry.path().extension() != ".jsonl") continue;
    const Outcome outcome = Run({"track", entry.path().string()});
    EXPECT_EQ(outcome.exit_code, 0) << entry.path() << outcome.err;
    EXPECT_THAT(outcome.out, AllOf(HasSubstr(" 0 failed"), HasSubstr("ms per frame"),
                                   HasSubstr("reprojection")));
    EXPECT_THAT(outcome.err, IsEmpty());
  }
}

TEST_F(Cli, TrackWritesALineAFrame) {
  const Outcome outcome =
      Run({"track", ExampleTrack("real_man_270_mirror"), "--out", folder_.Path("r.jsonl")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(folder_.Names(), ElementsAre("r.jsonl"));
  std::istringstream lines(folder_.Read("r.jsonl"));
  std::string line;
  std::getline(lines, line);
  const auto header = nlohmann::json::parse(line);
  EXPECT_EQ(header["format"], "face-track-results");
  EXPECT_EQ(header["width"], 480);  // upright
  EXPECT_EQ(header["height"], 270);
  int frames = 0;
  while (std::getline(lines, line)) {
    const auto frame = nlohmann::json::parse(line);
    EXPECT_EQ(frame["frame"], frames++);
    EXPECT_EQ(frame["ok"], true);
    const auto& face = frame["faces"].at(0);
    for (const char* matrix : {"projection", "view", "model"}) {
      EXPECT_THAT(face[matrix], SizeIs(16));
      for (const auto& value : face[matrix]) EXPECT_TRUE(value.is_number());
    }
    EXPECT_THAT(face["landmarks3d"], SizeIs(303));
  }
  EXPECT_EQ(frames, 31);
}

TEST_F(Cli, TrackNamesTheDamagedLine) {
  const std::string out = folder_.Path("r.jsonl");
  const auto refused = [&](std::size_t line, const std::string& by, const std::string& text) {
    ExpectFailure({"track", Damaged(line, by), "--out", out}, kFailed, text);
  };
  refused(2, "{\"frame\":0,", "damaged.track.jsonl:2: not valid JSON");
  refused(1, "{}", "damaged.track.jsonl:1: not the header");
  refused(2, R"({"frame":0,"faces":[{"id":0,"points":[1,2]}]})", ":2: \"points\" of face 0 has 2");
  refused(2, R"({"frame":0,"faces":[{},{},{},{},{},{}]})", ":2: a frame has 6 faces");
  refused(2, "", ":2: the line is empty");
}

TEST_F(Cli, AFailedTrackLeavesTheOldResults) {
  folder_.Write("r.jsonl", "old");
  ExpectFailure({"track", Damaged(2, "?"), "--out", folder_.Path("r.jsonl")}, kFailed,
                ":2:", {"r.jsonl"});
  EXPECT_EQ(folder_.Read("r.jsonl"), "old");
}

TEST_F(Cli, RefusesFilesThatAreNotThere) {
  ExpectFailure({"track", folder_.Path("none")}, kFailed, "none: the file cannot be opened");
  ExpectFailure({"track", folder_.Path("")}, kFailed, "the file cannot be opened");
  ExpectFailure({"track", ExampleTrack("photo_group_3"), "--model", folder_.Path("none")}, kFailed,
                "none: the face model cannot be opened");
  ExpectFailure({"track", ExampleTrack("photo_group_3"), "--out", folder_.Path("missing/r.jsonl")},
                kFailed, "missing/r.jsonl: cannot be written");
}

TEST_F(Cli, RefusesDamagedModels) {
  const std::string bytes = ReadFile(kModel);
  const std::string track = ExampleTrack("photo_group_3");
  std::string header = bytes;
  header[8] = 21;
  const std::vector<std::pair<std::string, std::string>> damages = {
      {"", "this file has 0"},
      {bytes.substr(0, 1000), "this file has 1000"},
      {bytes + "x", "this file has more"},
      {header, "21 expression components instead of 20"}};
  for (const auto& [content, text] : damages) {
    const std::string model = console_.Write("m.bin", content);
    ExpectFailure({"track", track, "--model", model}, kFailed, "m.bin: ");
    ExpectFailure({"model", "info", model}, kFailed, text);
    ExpectFailure({"render", track, "--model", model, "--out", folder_.Path("a.png")}, kFailed,
                  "m.bin: ");
  }
}

TEST_F(Cli, ModelInfoDescribesTheShippedModel) {
  const Outcome outcome = Run({"model", "info", kModel});
  EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(outcome.out,
              AllOf(HasSubstr("1812"), HasSubstr("16 components"), HasSubstr("20 components"),
                    HasSubstr("model frame"), HasSubstr("verdict       usable\n")));
}

TEST_F(Cli, ModelInfoJudgesAFaceWithoutSize) {
  std::string flat = ReadFile(kModel);
  std::fill(flat.begin() + 12, flat.begin() + 12 + 10872, '\0');
  const Outcome outcome = Run({"model", "info", console_.Write("flat.bin", flat)});
  EXPECT_EQ(outcome.exit_code, kFailed);
  EXPECT_THAT(outcome.out, HasSubstr("verdict       not usable"));
  EXPECT_THAT(outcome.err, HasSubstr("width of 0.0 mm is not that of a face"));
}

TEST_F(Cli, EvalPrintsARowATrackAndOneOverAll) {
  const std::string csv = folder_.Path("scores.csv");
  const Outcome outcome = Run({"eval", ExampleTrack("synthetic_natural"),
                               ExampleTrack("synthetic_mirror_portrait"), "--csv", csv});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(outcome.out, AllOf(HasSubstr("\nsynthetic_natural "),
                                 HasSubstr("\nsynthetic_mirror_portrait "), HasSubstr("\nall ")));
  std::istringstream lines(folder_.Read("scores.csv"));
  std::string line;
  int rows = 0;
  while (std::getline(lines, line)) {
    ++rows;
    EXPECT_EQ(std::count(line.begin(), line.end(), ','), 17) << line;
  }
  EXPECT_EQ(rows, 4);
  EXPECT_THAT(folder_.Names(), ElementsAre("scores.csv"));
}

TEST_F(Cli, EvalNeedsTruth) {
  ExpectFailure({"eval", ExampleTrack("synthetic_natural"), ExampleTrack("real_expressions"),
                 "--csv", folder_.Path("scores.csv")},
                kFailed, "real_expressions.track.jsonl: the track has no truth to compare with");
}

TEST_F(Cli, RenderMakesAPicture) {
  const Outcome outcome = Run({"render", ExampleTrack("real_head_move_90"), "--frame", "3",
                               "--size", "320x320", "--out", folder_.Path("a.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(folder_.Names(), ElementsAre("a.png"));
  const Picture picture = ReadPicture(folder_.Path("a.png"));
  EXPECT_EQ(picture.width, 320);  // upright: 640 x 480
  EXPECT_EQ(picture.height, 240);
}

TEST_F(Cli, RenderMakesAContactSheet) {
  const Outcome outcome = Run({"render", ExampleTrack("synthetic_three"), "--contact-sheet", "6",
                               "--size", "160x160", "--out", folder_.Path("sheet.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  const Picture picture = ReadPicture(folder_.Path("sheet.png"));
  EXPECT_EQ((picture.width + 4) / 164 * ((picture.height + 4) / 94), 6);
}

TEST_F(Cli, RenderMakesAFolderOfFrames) {
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

TEST_F(Cli, RenderMakesAFilm) {
  const Outcome outcome = Run({"render", ExampleTrack("real_man_270_mirror"), "--every", "3",
                               "--size", "99x99", "--out", folder_.Path("a.mp4")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(folder_.Names(), ElementsAre("a.mp4"));
  EXPECT_THAT(folder_.Read("a.mp4").substr(4, 4), "ftyp");
}

TEST_F(Cli, RenderDrawsOverAPhoto) {
  Picture photo(320, 320);
  for (std::size_t i = 0; i < photo.rgba.size(); ++i) photo.rgba[i] = i % 4 == 3 ? 255 : 90;
  WritePng(console_.Path("photo.png"), photo);
  const Outcome outcome =
      Run({"render", ExampleTrack("photo_astronaut"), "--image", console_.Path("photo.png"),
           "--size", "320x320", "--out", folder_.Path("a.png")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  const Picture drawn = ReadPicture(folder_.Path("a.png"));
  EXPECT_EQ(drawn.Pixel(5, 300)[0], 90);  // the ground is the photo
  std::size_t changed = 0;
  for (std::size_t i = 0; i < drawn.rgba.size(); i += 4) changed += drawn.rgba[i] != 90 ? 1U : 0U;
  EXPECT_GT(changed, 1000u);
}

TEST_F(Cli, RenderRefusesWhatItCannotDraw) {
  const std::string track = ExampleTrack("real_man_270_mirror");
  const std::string png = folder_.Path("a.png");
  ExpectFailure({"render", track, "--out", png, "--frame", "999"}, kFailed,
                "there is no frame 999");
  ExpectFailure({"render", track, "--out", png, "--frame", "1", "--contact-sheet", "4"}, kFailed,
                "exclude each other");
  ExpectFailure({"render", track, "--out", folder_.Path("a.mp4"), "--frame", "1"}, kFailed,
                "must end in .png");
  for (const char* size : {"0x0", "100", "axb", "100x100x", "99999x10"}) {
    ExpectFailure({"render", track, "--out", png, "--size", size}, kFailed, "--size ");
  }
  ExpectFailure({"render", track, "--out", png, "--image", track}, kFailed,
                "neither a PNG nor a JPEG");
  ExpectFailure({"render", track, "--out", png, "--image", folder_.Path("none.jpg")}, kFailed,
                "none.jpg: the picture cannot be opened");
  WritePng(console_.Path("square.png"), Picture(50, 50));
  ExpectFailure({"render", track, "--out", png, "--image", console_.Path("square.png")}, kFailed,
                "the picture has 50 x 50 pixels, the track 270 x 480");
  ExpectFailure({"render", Damaged(2, "?"), "--out", png}, kFailed, ":2: not valid JSON");
  ExpectFailure({"render", track, "--out", folder_.Path("missing/a.png")}, kFailed,
                "missing/a.png: cannot be written");
}

TEST_F(Cli, AFilmThatCannotBeMadeLeavesNothing) {
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

}  // namespace
}  // namespace n3ds::tool
