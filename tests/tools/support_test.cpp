// SPDX-License-Identifier: MIT
// Output files, tables and results.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cmath>
#include <cstdlib>
#include <limits>
#include <sstream>

#include "core/output_matrices.h"
#include "engine/results_file.h"
#include "eval/text_table.h"
#include "model/face_model_file.h"
#include "scratch_folder.h"
#include "support/atomic_file.h"

namespace n3ds::tool {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

TEST(AtomicFile, AppearsOnCommit) {
  const ScratchFolder folder;
  AtomicFile file(folder.Path("a.txt"));
  file.stream() << "whole";
  EXPECT_EQ(folder.Read("a.txt"), "");
  file.Commit();
  EXPECT_EQ(folder.Read("a.txt"), "whole");
  EXPECT_THAT(folder.Names(), ElementsAre("a.txt"));
}

TEST(AtomicFile, WithoutCommitTheOldFileStays) {
  const ScratchFolder folder;
  folder.Write("a.txt", "old");
  {
    AtomicFile file(folder.Path("a.txt"));
    file.stream() << "half";
  }
  EXPECT_EQ(folder.Read("a.txt"), "old");
  EXPECT_THAT(folder.Names(), ElementsAre("a.txt"));
}

TEST(AtomicFile, RefusesAFolderThatIsNotThere) {
  const ScratchFolder folder;
  EXPECT_THROW(AtomicFile(folder.Path("missing/a.txt")), Error);
}

TEST(AtomicFile, RefusesToReplaceAFolder) {
  const ScratchFolder folder;
  std::filesystem::create_directory(folder.Path("taken"));
  EXPECT_THROW(AtomicFile(folder.Path("taken")), Error);
}

TEST(AtomicFile, KeepsTheModeOfAFileAndHonoursTheMaskOfANewOne) {
  const ScratchFolder folder;
  chmod(folder.Write("private.txt", "old").c_str(), 0600);
  chmod(folder.Write("open.txt", "old").c_str(), 0666);
  const mode_t before = umask(027);
  for (const char* name : {"private.txt", "open.txt", "new.txt"}) {
    AtomicFile file(folder.Path(name));
    file.stream() << "new";
    file.Commit();
  }
  umask(before);
  const auto mode = [&](const char* name) {
    struct stat status = {};
    stat(folder.Path(name).c_str(), &status);
    return status.st_mode & 0777;
  };
  EXPECT_EQ(mode("private.txt"), 0600u);
  EXPECT_EQ(mode("open.txt"), 0666u);
  EXPECT_EQ(mode("new.txt"), 0640u);
}

TEST(AtomicFile, ReplacesWhatALinkPointsTo) {
  const ScratchFolder folder;
  std::filesystem::create_directory(folder.Path("data"));
  folder.Write("data/a.txt", "old");
  std::filesystem::create_symlink("data/a.txt", folder.Path("first"));
  std::filesystem::create_symlink(folder.Path("first"), folder.Path("second"));
  AtomicFile file(folder.Path("second"));
  file.stream() << "new";
  EXPECT_EQ(folder.Read("data/a.txt"), "old");
  file.Commit();
  EXPECT_EQ(folder.Read("data/a.txt"), "new");
  EXPECT_TRUE(std::filesystem::is_symlink(folder.Path("first")));
  EXPECT_TRUE(std::filesystem::is_symlink(folder.Path("second")));
  EXPECT_FALSE(std::filesystem::is_symlink(folder.Path("data/a.txt")));
}

TEST(AtomicFile, MakesTheFileThatADanglingLinkPointsTo) {
  const ScratchFolder folder;
  std::filesystem::create_symlink("a.txt", folder.Path("link"));
  AtomicFile file(folder.Path("link"));
  file.stream() << "new";
  file.Commit();
  EXPECT_EQ(folder.Read("a.txt"), "new");
  EXPECT_TRUE(std::filesystem::is_symlink(folder.Path("link")));
}

TEST(AtomicFile, RefusesLinksThatLeadNowhere) {
  const ScratchFolder folder;
  std::filesystem::create_symlink("loop", folder.Path("loop"));
  EXPECT_THROW(AtomicFile(folder.Path("loop")), Error);
}

std::string ReadAll(int descriptor) {
  std::string text;
  char bytes[4096];
  for (ssize_t count = 0; (count = read(descriptor, bytes, sizeof bytes)) > 0;) {
    text.append(bytes, static_cast<std::size_t>(count));
  }
  return text;
}

TEST(AtomicFile, WritesIntoPipesAndLinksToThem) {
  const ScratchFolder folder;
  const std::string fifo = folder.Path("fifo");
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  std::filesystem::create_symlink("fifo", folder.Path("link"));
  for (const char* name : {"fifo", "link"}) {
    const int reader = open(fifo.c_str(), O_RDONLY | O_NONBLOCK);
    AtomicFile file(folder.Path(name));
    EXPECT_TRUE(file.is_direct());
    file.stream() << "through";
    file.Commit();
    EXPECT_EQ(ReadAll(reader), "through");
    close(reader);
  }
  EXPECT_TRUE(std::filesystem::is_fifo(fifo));
  EXPECT_THAT(folder.Names(), ElementsAre("fifo", "link"));
  EXPECT_THROW(AtomicPath{fifo}, Error);  // a writer that wants a name wants a file
}

TEST(AtomicFile, WritesIntoOpenDescriptors) {
  const ScratchFolder folder;
  int ends[2];
  ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
  const int log = open(folder.Path("log").c_str(), O_WRONLY | O_CREAT | O_APPEND, 0600);
  ASSERT_EQ(write(log, "before ", 7), 7);
  for (const int descriptor : {ends[1], log}) {
    for (const char* place : {"/dev/fd/", "/proc/self/fd/"}) {
      AtomicFile file(place + std::to_string(descriptor));
      file.stream() << "x";
      file.Commit();
    }
  }
  close(ends[1]);
  close(log);
  EXPECT_EQ(ReadAll(ends[0]), "xx");
  close(ends[0]);
  EXPECT_EQ(folder.Read("log"), "before xx");
  EXPECT_THROW(AtomicFile("/dev/fd/" + std::to_string(ends[1])), Error);  // closed by now
}

// A pipe first: where it is not left alone, a device would not be either.
TEST(AtomicFile, ReportsAFullDevice) {
  const ScratchFolder folder;
  const std::string fifo = folder.Path("fifo");
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  const int reader = open(fifo.c_str(), O_RDONLY | O_NONBLOCK);
  AtomicFile(fifo).Commit();
  close(reader);
  ASSERT_TRUE(std::filesystem::is_fifo(fifo));

  std::filesystem::create_symlink("/dev/full", folder.Path("full"));
  AtomicFile file(folder.Path("full"));
  ASSERT_TRUE(file.is_direct());
  file.stream() << "text";
  try {
    file.Commit();
    ADD_FAILURE();
  } catch (const Error& error) {
    EXPECT_THAT(error.what(), HasSubstr("full: cannot be written (No space left on device)"));
  }
  EXPECT_TRUE(std::filesystem::is_character_file("/dev/full"));
}

TEST(AtomicFile, WritesMoreThanItsBufferHolds) {
  const ScratchFolder folder;
  const std::string text(1000001, 'x');
  AtomicFile file(folder.Path("a.txt"));
  file.stream() << text << 'y';
  file.Commit();
  EXPECT_EQ(folder.Read("a.txt"), text + "y");
}

TEST(AtomicFile, RefusesAProtectedFile) {
  if (geteuid() == 0) GTEST_SKIP() << "nothing is protected from root";
  const ScratchFolder folder;
  chmod(folder.Write("a.txt", "old").c_str(), 0400);
  EXPECT_THROW(AtomicFile(folder.Path("a.txt")), Error);
  EXPECT_THAT(folder.Names(), ElementsAre("a.txt"));
}

TEST(AtomicFile, TakesTheLongestNames) {
  const ScratchFolder folder;
  const std::string name(255, 'n');
  AtomicFile file(folder.Path(name));
  file.stream() << "whole";
  file.Commit();
  EXPECT_EQ(folder.Read(name), "whole");
}

TEST(TextTable, LinesUpNumbers) {
  TextTable table({"track", "n"});
  table.AddRow({"a", "100"});
  table.AddRow({"longer name", "5"});
  std::ostringstream out;
  table.Print(out);
  EXPECT_EQ(out.str(), "track          n\na            100\nlonger name    5\n");
}

TEST(TextTable, PrintsTheColumnsAskedFor) {
  TextTable table({"track", "a", "b", "long name"});
  table.AddRow({"x", "1", "22", "3"});
  std::ostringstream out;
  table.Print(out, {0, 2});
  EXPECT_EQ(out.str(), "track   b\nx      22\n");
}

TEST(TextTable, QuotesCsvCells) {
  TextTable table({"track", "n"});
  table.AddRow({"a,\"b\"", "1"});
  std::ostringstream out;
  table.PrintCsv(out);
  EXPECT_EQ(out.str(), "track,n\n\"a,\"\"b\"\"\",1\n");
}

TEST(ResultsFile, FloatsReadBackToTheSameBits) {
  FrameResult frame;
  frame.ok = true;
  frame.faces.emplace_back();
  const std::vector<float> values = {0.1F, 1.0F / 3, -1e-30F, 16777216.0F, 3.4e38F, -0.0F, 1e-45F};
  frame.faces[0].landmarks3d = values;
  std::ostringstream out;
  WriteResultsFrame(out, frame);
  const std::string text = out.str();
  const char* at = text.c_str() + text.find("\"landmarks3d\":[") + 15;
  for (const float value : values) {
    char* end = nullptr;
    const float read = std::strtof(at, &end);
    at = end + 1;
    EXPECT_EQ(std::signbit(read), std::signbit(value));
    EXPECT_EQ(read, value);
  }
}

TEST(ResultsFile, WritesNonFiniteValuesAsNull) {
  FrameResult frame;
  frame.faces.emplace_back();
  frame.faces[0].landmarks3d = {1, std::numeric_limits<float>::quiet_NaN(),
                                std::numeric_limits<float>::infinity()};
  std::ostringstream out;
  WriteResultsFrame(out, frame);
  EXPECT_THAT(out.str(), HasSubstr("\"landmarks3d\":[1,null,null]"));
}

// The engine's own, which the public headers do not show.
static_assert(static_cast<float>(kTiltCosine) == n3ds::kTiltCosine);
static_assert(static_cast<float>(kTiltSine) == n3ds::kTiltSine);

TEST(FaceModelFile, ShipsAnUprightFaceOfHumanSize) {
  const FaceModelFile model = ReadFaceModelFile(N3DS_SOURCE_DIR "/data/face_model.bin");
  Vector3 low = {1e9, 1e9, 1e9};
  Vector3 high = {-1e9, -1e9, -1e9};
  for (const Vector3& p : MeanFace(model)) {
    for (std::size_t a = 0; a < 3; ++a) {
      low[a] = std::min(low[a], p[a]);
      high[a] = std::max(high[a], p[a]);
    }
  }
  EXPECT_NEAR(low[0] + high[0], 0, 1);  // symmetric
  EXPECT_NEAR(high[0] - low[0], 150, 15);
  EXPECT_NEAR(high[1] - low[1], 185, 30);
  EXPECT_NEAR(high[2], 120, 10);  // the nose points out of the face
}

TEST(FaceModelFile, RefusesEveryWrongSizeAndHeader) {
  const ScratchFolder folder;
  std::ostringstream whole;
  whole << std::ifstream(N3DS_SOURCE_DIR "/data/face_model.bin", std::ios::binary).rdbuf();
  const std::string bytes = whole.str();
  const auto refusal = [&](const std::string& content) -> std::string {
    try {
      ReadFaceModelFile(folder.Write("m.bin", content));
    } catch (const Error& error) {
      return error.what();
    }
    return "";
  };
  EXPECT_THAT(refusal(bytes), IsEmpty());
  EXPECT_THAT(refusal(""), HasSubstr("this file has 0"));
  EXPECT_THAT(refusal(bytes.substr(1)), HasSubstr("has 2141796 bytes, this file has 2141795"));
  EXPECT_THAT(refusal(bytes + "x"), HasSubstr("this file has more"));
  for (const auto& [at, what] :
       {std::pair{0, "vertices"}, std::pair{4, "identity"}, std::pair{8, "expression"}}) {
    std::string damaged = bytes;
    ++damaged[static_cast<std::size_t>(at)];
    EXPECT_THAT(refusal(damaged), HasSubstr(what));
  }
}

}  // namespace
}  // namespace n3ds::tool
