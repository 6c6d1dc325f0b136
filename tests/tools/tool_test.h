// SPDX-License-Identifier: MIT
// Fixture of tests that run the tool as a program, in an empty folder.
#pragma once

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <sstream>
#include <string>
#include <vector>

#include "scratch_folder.h"

namespace n3ds::tool {

constexpr int kFailed = 1;
constexpr int kUsage = 2;

inline std::string ExampleTrack(const std::string& name) {
  return N3DS_SOURCE_DIR "/examples/tracks/" + name + ".track.jsonl";
}

struct Outcome {
  int exit_code = -1;  // -1: killed by a signal
  std::string out;
  std::string err;
};

class ToolTest : public ::testing::Test {
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
    EXPECT_THAT(outcome.err,
                ::testing::AllOf(::testing::StartsWith("n3ds: "), ::testing::HasSubstr(text),
                                 ::testing::EndsWith("\n")));
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

}  // namespace n3ds::tool
