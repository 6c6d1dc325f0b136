// SPDX-License-Identifier: MIT
// The tool as its user meets it: exit codes, one sentence on stderr, nothing half-written.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <nlohmann/json.hpp>

#include "tool_test.h"

namespace n3ds::tool {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

const std::string kModel = N3DS_SOURCE_DIR "/data/face_model.bin";

using Cli = ToolTest;

TEST_F(Cli, EveryCommandHelpsWithExamples) {
  for (const std::vector<std::string>& command : {std::vector<std::string>{},
                                                  {"track"},
                                                  {"eval"},
                                                  {"render"},
                                                  {"mask"},
                                                  {"mesh"},
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
  ExpectFailure({"fly"}, kUsage,
                "unknown command 'fly' (commands: track, eval, render, mask, mesh, model)");
  ExpectFailure({"fly", "--out", "x"}, kUsage, "unknown command 'fly'");
  ExpectFailure({"model", "fly"}, kUsage,
                "unknown command 'model fly' (commands: info, check, render, export)");
  ExpectFailure({"track"}, kUsage, "TRACK is required");
  ExpectFailure({"track", "a", "--mode", "wings"}, kUsage, "--mode");
  ExpectFailure({"track", "a", "--wings"}, kUsage, "--wings");
  ExpectFailure({"render", "a"}, kUsage, "--out is required");
  ExpectFailure({"render", "a", "--out", "b", "--every", "0"}, kUsage, "--every");
  ExpectFailure({"render", "a", "--out", "b", "--draw", "wings"}, kUsage, "--draw");
  ExpectFailure({"render", "a", "--out", "b", "--frame", "-1"}, kUsage, "--frame");
  ExpectFailure({"--wings"}, kUsage, "");
}

TEST_F(Cli, RefusesEmptyNames) {
  const std::string track = ExampleTrack("photo_group_3");
  ExpectFailure({"track", track, "--out", ""}, kUsage, "--out: the name is empty");
  ExpectFailure({"track", track, "--model", ""}, kUsage, "--model: the name is empty");
  ExpectFailure({"track", ""}, kUsage, "TRACK: the name is empty");
  ExpectFailure({"eval", track, "--csv", ""}, kUsage, "--csv: the name is empty");
  ExpectFailure({"mesh", track, "--out", ""}, kUsage, "--out: the name is empty");
}

TEST_F(Cli, ShowsHelpWhereACommandIsMissing) {
  for (const std::vector<std::string>& command : {std::vector<std::string>{}, {"model"}}) {
    const Outcome outcome = Run(command);
    EXPECT_EQ(outcome.exit_code, kUsage);
    EXPECT_THAT(outcome.out, IsEmpty());
    EXPECT_THAT(outcome.err, AllOf(HasSubstr("Usage: n3ds"), HasSubstr("render")));
  }
}

// Nothing of the machine it was built on, and no name twice.
TEST_F(Cli, HelpIsTidy) {
  for (const std::vector<std::string>& command : {std::vector<std::string>{"track"},
                                                  {"eval"},
                                                  {"render"},
                                                  {"mask"},
                                                  {"mesh"},
                                                  {"model", "check"},
                                                  {"model", "render"},
                                                  {"model", "export"}}) {
    std::vector<std::string> arguments = command;
    arguments.emplace_back("--help");
    const std::string help = Run(arguments).out;
    EXPECT_THAT(help, AllOf(Not(HasSubstr(N3DS_SOURCE_DIR)), Not(HasSubstr("=/")),
                            Not(HasSubstr(":{")), Not(HasSubstr("INT in"))));
  }
}

TEST_F(Cli, AFullStandardOutputIsAFailure) {
  stdout_ = "/dev/full";
  const std::string track = ExampleTrack("photo_group_3");
  for (const std::vector<std::string>& command : {std::vector<std::string>{"--help"},
                                                  {"--version"},
                                                  {"track", "--help"},
                                                  {"track", track},
                                                  {"eval", ExampleTrack("synthetic_three")},
                                                  {"model", "info", kModel},
                                                  {"model", "check", kModel},
                                                  {"mesh", track, "--out", console_.Path("m")}}) {
    ExpectFailure(command, kFailed, "standard output cannot be written");
  }
}

TEST_F(Cli, ReadsATrackFromStandardInput) {
  const std::string track = ExampleTrack("synthetic_three");
  const Outcome piped = Run({"track", "-", "--out", folder_.Path("a")}, track);
  EXPECT_EQ(piped.exit_code, 0) << piped.err;
  EXPECT_THAT(piped.out, HasSubstr("standard input"));
  EXPECT_EQ(Run({"track", track, "--out", folder_.Path("b")}).exit_code, 0);
  EXPECT_EQ(folder_.Read("a"), folder_.Read("b"));
  EXPECT_EQ(Run({"eval", "-"}, track).exit_code, 0);
  EXPECT_EQ(Run({"mesh", "-", "--out", console_.Path("m"), "--every", "30"}, track).exit_code, 0);
  EXPECT_THAT(Run({"track", "-"}).err, HasSubstr("standard input: the file is empty"));
  EXPECT_THAT(Run({"track", "-"}, Damaged(2, "?")).err,
              HasSubstr("standard input:2: not valid JSON"));
}

// A detector at one end and a viewer at the other: each frame goes through at once.
TEST_F(Cli, TracksLineByLineThroughPipes) {
  const std::string in = console_.Path("in");
  const std::string out = console_.Path("out_pipe");
  ASSERT_EQ(mkfifo(in.c_str(), 0600), 0);
  ASSERT_EQ(mkfifo(out.c_str(), 0600), 0);
  const int keep_open = open(in.c_str(), O_RDWR | O_CLOEXEC);
  const pid_t child = Start({"track", "-", "--out", out}, in);
  std::ofstream detector(in);
  std::ifstream viewer;
  std::istringstream lines(ReadFile(ExampleTrack("synthetic_natural")));
  std::string line;
  std::getline(lines, line);
  detector << line << '\n' << std::flush;
  for (int frame = 0; frame < 3; ++frame) {
    std::getline(lines, line);
    detector << line << '\n' << std::flush;
    if (frame == 0) {
      viewer.open(out);
      std::getline(viewer, line);
      EXPECT_EQ(nlohmann::json::parse(line)["format"], "face-track-results");
    }
    ASSERT_TRUE(std::getline(viewer, line));
    EXPECT_EQ(nlohmann::json::parse(line)["frame"], frame);
  }
  detector.close();
  close(keep_open);
  const Outcome outcome = Finish(child);
  EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(outcome.out, HasSubstr("3, 0 failed"));
}

TEST_F(Cli, ResultsOnStandardOutputComeAlone) {
  const Outcome outcome = Run({"track", ExampleTrack("photo_group_3"), "--out", "/dev/stdout"});
  EXPECT_EQ(outcome.exit_code, 0);
  std::istringstream lines(outcome.out);
  std::string line;
  int count = 0;
  for (; std::getline(lines, line); ++count) EXPECT_TRUE(nlohmann::json::accept(line)) << line;
  EXPECT_EQ(count, 2);
  EXPECT_THAT(outcome.err, HasSubstr("frames "));
}

TEST_F(Cli, OtherOutputsOnStandardOutputComeAloneToo) {
  const Outcome csv = Run({"eval", ExampleTrack("synthetic_three"), "--csv", "/dev/stdout"});
  EXPECT_EQ(csv.exit_code, 0);
  EXPECT_EQ(std::count(csv.out.begin(), csv.out.end(), '\n'), 2);
  EXPECT_THAT(csv.err, HasSubstr("head frame"));
  const Outcome obj = Run({"model", "export", kModel, "--obj", "/dev/stdout"});
  EXPECT_EQ(obj.exit_code, 0);
  EXPECT_THAT(obj.out, AllOf(HasSubstr("\nf "), Not(HasSubstr("/dev/stdout"))));
  EXPECT_EQ(obj.err, "/dev/stdout\n");
}

TEST_F(Cli, RoundsFractionsAndSaysSoOnce) {
  std::string text = ReadFile(ExampleTrack("real_man_270_mirror"));
  const std::string whole = console_.Write("whole.track.jsonl", text);
  for (std::size_t at = 0; (at = text.find("\"points\":[", at)) != std::string::npos;) {
    at = text.find(',', at);
    text.insert(at, ".25");
  }
  const std::string fractions = console_.Write("fractions.track.jsonl", text);
  const Outcome exact = Run({"track", whole, "--out", folder_.Path("a")});
  const Outcome rounded = Run({"track", fractions, "--out", folder_.Path("b")});
  EXPECT_EQ(rounded.exit_code, 0);
  EXPECT_THAT(exact.err, IsEmpty());
  EXPECT_EQ(rounded.err,
            "n3ds: " + fractions + ": 31 coordinates with fractions rounded to floor(x + 0.5)\n");
  EXPECT_EQ(folder_.Read("a"), folder_.Read("b"));
  EXPECT_EQ(Run({"mesh", fractions, "--out", console_.Path("m"), "--every", "30"}).err,
            rounded.err);
}

TEST_F(Cli, RefusesToReplaceItsInput) {
  const std::string track = console_.Write("t.jsonl", ReadFile(ExampleTrack("synthetic_three")));
  const std::string before = ReadFile(track);
  std::filesystem::create_symlink(track, console_.Path("link"));
  std::filesystem::create_hard_link(track, console_.Path("hard"));
  for (const std::string& out : {track, console_.Path("link"), console_.Path("hard")}) {
    ExpectFailure({"track", track, "--out", out}, kUsage, "is also an input");
    ExpectFailure({"eval", ExampleTrack("synthetic_natural"), track, "--csv", out}, kUsage,
                  "is also an input");
  }
  EXPECT_EQ(Run({"track", "-", "--out", track}, track).exit_code, kUsage);
  const std::string model = console_.Write("m.bin", ReadFile(kModel));
  ExpectFailure({"track", track, "--model", model, "--out", model}, kUsage, "is also an input");
  std::filesystem::create_directory(console_.Path("m"));
  std::filesystem::create_symlink(track, console_.Path("m/frame_000001.obj"));
  ExpectFailure({"mesh", track, "--out", console_.Path("m")}, kUsage, "is also an input");
  EXPECT_EQ(ReadFile(track), before);
}

TEST_F(Cli, FindsTheModel) {
  const std::string track = ExampleTrack("photo_group_3");
  const std::string tool = N3DS_TOOL;
  // In the source tree it was built from.
  EXPECT_EQ(Run({"track", track}).exit_code, 0);
  // Installed: beside the program.
  std::filesystem::create_directories(console_.Path("prefix/bin"));
  std::filesystem::create_directories(console_.Path("prefix/share/norvale-3d-sticker"));
  tool_ = console_.Path("prefix/bin/n3ds");
  std::filesystem::copy_file(tool, tool_);
  console_.Write("prefix/share/norvale-3d-sticker/face_model.bin", "installed");
  ExpectFailure({"track", track}, kFailed,
                console_.Path("prefix/share/norvale-3d-sticker/face_model.bin: not a face model"));
  // In the folder that the environment names, before that.
  console_.Write("face_model.bin", "named");
  setenv("N3DS_DATA_DIR", console_.Path("").c_str(), 1);
  ExpectFailure({"track", track}, kFailed, console_.Path("face_model.bin: not a face model"));
  // By an option, before all.
  EXPECT_EQ(Run({"track", track, "--model", kModel}).exit_code, 0);
  unsetenv("N3DS_DATA_DIR");
}

TEST_F(Cli, TrackSummarisesEveryExample) {
  for (const auto& entry :
       std::filesystem::directory_iterator(N3DS_SOURCE_DIR "/examples/tracks")) {
    if (entry.path().extension() != ".jsonl") continue;
    const Outcome outcome = Run({"track", entry.path().string()});
    EXPECT_EQ(outcome.exit_code, 0) << entry.path() << outcome.err;
    EXPECT_THAT(outcome.out, AllOf(HasSubstr(" 0 failed"), HasSubstr("elapsed ms per frame"),
                                   HasSubstr("misfit of the mean")));
    EXPECT_THAT(outcome.err, IsEmpty());
  }
}

TEST_F(Cli, TrackJudgesTheMeshesOfMaskMode) {
  const Outcome outcome = Run({"track", ExampleTrack("synthetic_talk_165"), "--mode", "mask",
                               "--out", folder_.Path("r.jsonl")});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  EXPECT_THAT(outcome.out, AllOf(HasSubstr("folded meshes          0\n"),
                                 HasSubstr("misfit of the mesh     median "),
                                 HasSubstr("mouth                  opened to ")));
  const std::string results = folder_.Read("r.jsonl");
  EXPECT_THAT(results.substr(0, results.find('\n')), HasSubstr("\"mode\":\"mask\""));
  EXPECT_THAT(Run({"track", ExampleTrack("photo_group_3")}).out, Not(HasSubstr("mesh")));
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

TEST_F(Cli, ASignalRemovesTheFilesOfHalfARun) {
  const std::string track = LongTrack("photo_astronaut", 3000);
  for (const int signal : {SIGINT, SIGTERM, SIGHUP}) {
    const pid_t child = Start({"mesh", track, "--out", folder_.Path("a/meshes")});
    EXPECT_EQ(EndBySignal(child, signal, folder_.Path("a/meshes")).signal, signal);
    EXPECT_THAT(folder_.Names(), IsEmpty());
  }
  // What was there before stays.
  std::filesystem::create_directory(folder_.Path("meshes"));
  folder_.Write("meshes/frame_002999.obj", "old");
  const pid_t child = Start({"mesh", track, "--out", folder_.Path("meshes")});
  while (!std::filesystem::exists(folder_.Path("meshes/frame_000003.obj")) && !HasEnded(child)) {
    usleep(1000);
  }
  kill(child, SIGTERM);
  EXPECT_EQ(Finish(child).signal, SIGTERM);
  ASSERT_THAT(folder_.Names(), ElementsAre("meshes"));
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder_.Path("meshes")), {}), 1);
  EXPECT_EQ(folder_.Read("meshes/frame_002999.obj"), "old");
}

TEST_F(Cli, AFailedRunRemovesTheFilesItHasMade) {
  // The target of the third file cannot be replaced.
  std::filesystem::create_directories(folder_.Path("m/frame_000002.obj"));
  const Outcome outcome =
      Run({"mesh", LongTrack("photo_astronaut", 5), "--out", folder_.Path("m")});
  EXPECT_EQ(outcome.exit_code, kFailed);
  EXPECT_THAT(outcome.err, HasSubstr("frame_000002.obj: cannot be written (Is a directory)"));
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder_.Path("m")), {}), 1);
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

TEST_F(Cli, EvalExplainsItsColumnsAndShowsAllWhereAsked) {
  const std::string track = ExampleTrack("synthetic_three");
  const auto head = [](const Outcome& outcome) {
    return outcome.out.substr(0, outcome.out.find('\n'));
  };
  const Outcome main = Run({"eval", track});
  EXPECT_THAT(main.out, AllOf(HasSubstr("\nlost       no pose"), Not(HasSubstr("\nfolded "))));
  EXPECT_EQ(head(main).find("rot20"), std::string::npos);
  const Outcome mask = Run({"eval", track, "--mode", "mask"});
  EXPECT_THAT(mask.out, HasSubstr("\nfolded     faces with"));
  EXPECT_LE(head(main).size(), 100u);
  EXPECT_LE(head(mask).size(), 130u);
  for (const Outcome& outcome : {main, mask}) {
    EXPECT_THAT(head(outcome), AllOf(HasSubstr("rot40"), HasSubstr("across"), HasSubstr("lag")));
  }
  EXPECT_THAT(head(Run({"eval", track, "--wide"})), AllOf(HasSubstr("rot20"), HasSubstr("rot60")));
}

TEST_F(Cli, EvalAddsColumnsForMeshes) {
  const std::string csv = folder_.Path("scores.csv");
  const Outcome outcome = Run({"eval", ExampleTrack("synthetic_talk_165"),
                               ExampleTrack("synthetic_three"), "--mode", "mask", "--csv", csv});
  ASSERT_EQ(outcome.exit_code, 0) << outcome.err;
  std::istringstream lines(folder_.Read("scores.csv"));
  std::string line;
  int rows = 0;
  while (std::getline(lines, line)) {
    ++rows;
    EXPECT_EQ(std::count(line.begin(), line.end(), ','), 24) << line;
    if (rows == 1) {
      EXPECT_THAT(line, ::testing::EndsWith("mesh,p95,true,p95,broken,folded,mouth"));
      continue;
    }
    std::vector<std::string> cells;
    std::istringstream words(line);
    for (std::string cell; std::getline(words, cell, ',');) cells.push_back(cell);
    EXPECT_LT(std::stod(cells[18]), 4) << line;  // median, percent
    EXPECT_EQ(cells[20], "-");                   // the example tracks carry no true points
    EXPECT_EQ(cells[22], "0");
    EXPECT_EQ(cells[23], "0");
    EXPECT_GT(std::stod(cells[24]), 0.5) << line;  // the mouth opens with the landmarks'
  }
  EXPECT_EQ(rows, 4);
}

TEST_F(Cli, EvalNeedsTruth) {
  ExpectFailure({"eval", ExampleTrack("synthetic_natural"), ExampleTrack("real_expressions"),
                 "--csv", folder_.Path("scores.csv")},
                kFailed, "real_expressions.track.jsonl: the track has no truth to compare with");
}

}  // namespace
}  // namespace n3ds::tool
