// SPDX-License-Identifier: MIT
// Output files, tables and results.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <limits>
#include <sstream>

#include "engine/face_model_file.h"
#include "engine/results_file.h"
#include "eval/text_table.h"
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
  AtomicFile file(folder.Path("taken"));
  file.stream() << "text";
  EXPECT_THROW(file.Commit(), Error);
}

TEST(TextTable, LinesUpNumbers) {
  TextTable table({"track", "n"});
  table.AddRow({"a", "100"});
  table.AddRow({"longer name", "5"});
  std::ostringstream out;
  table.Print(out);
  EXPECT_EQ(out.str(), "track          n\na            100\nlonger name    5\n");
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

TEST(ResultsFile, WhatIsNoNumberIsNull) {
  FrameResult frame;
  frame.faces.emplace_back();
  frame.faces[0].landmarks3d = {1, std::numeric_limits<float>::quiet_NaN(),
                                std::numeric_limits<float>::infinity()};
  std::ostringstream out;
  WriteResultsFrame(out, frame);
  EXPECT_THAT(out.str(), HasSubstr("\"landmarks3d\":[1,null,null]"));
}

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
