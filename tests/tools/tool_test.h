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
#include <csignal>
#include <filesystem>
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
  int exit_code = -1;  // -1: ended by a signal
  int signal = 0;
  std::string out;
  std::string err;
};

class ToolTest : public ::testing::Test {
 protected:
  // Starts n3ds with its output in files outside of the folder under test, and `input`, a file, as
  // its standard input.
  pid_t Start(std::vector<std::string> arguments, const std::string& input = "/dev/null") {
    arguments.insert(arguments.begin(), "n3ds");
    std::vector<char*> argv;
    for (std::string& argument : arguments) argv.push_back(argument.data());
    argv.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    constexpr int kFlags = O_WRONLY | O_CREAT | O_TRUNC;
    const std::string out = stdout_.empty() ? console_.Path("out") : stdout_;
    const std::string err = console_.Path("err");
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, input.c_str(), O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, out.c_str(),
                                     stdout_.empty() ? kFlags : O_WRONLY, 0600);
    posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, err.c_str(), kFlags, 0600);
    pid_t child = -1;
    // Whoever runs the tests in the background has these ignored, and the child would inherit it.
    posix_spawnattr_t attributes;
    posix_spawnattr_init(&attributes);
    sigset_t restored;
    sigemptyset(&restored);
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) sigaddset(&restored, signal);
    posix_spawnattr_setsigdefault(&attributes, &restored);
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF);
    const int failure =
        posix_spawn(&child, tool_.c_str(), &actions, &attributes, argv.data(), environ);
    posix_spawnattr_destroy(&attributes);
    posix_spawn_file_actions_destroy(&actions);
    return failure == 0 ? child : -1;
  }

  Outcome Finish(pid_t child) {
    Outcome outcome;
    int status = 0;
    if (child < 0 || waitpid(child, &status, 0) != child) return outcome;
    if (WIFEXITED(status)) outcome.exit_code = WEXITSTATUS(status);
    if (WIFSIGNALED(status)) outcome.signal = WTERMSIG(status);
    if (stdout_.empty()) outcome.out = console_.Read("out");
    outcome.err = console_.Read("err");
    return outcome;
  }

  Outcome Run(const std::vector<std::string>& arguments, const std::string& input = "/dev/null") {
    return Finish(Start(arguments, input));
  }

  // Sends a signal to a run as soon as something lies in `folder`. A child that has ended is
  // noticed, so that the test does not wait indefinitely.
  Outcome EndBySignal(pid_t child, int signal, const std::string& folder) {
    std::error_code error;
    while (std::filesystem::is_empty(folder, error) || error) {
      if (kill(child, 0) != 0 || HasEnded(child)) break;
      usleep(1000);
    }
    kill(child, signal);
    return Finish(child);
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

  // An example track's first frame, again and again.
  std::string LongTrack(const std::string& name, int frames) {
    std::istringstream in(ReadFile(ExampleTrack(name)));
    std::string header;
    std::string frame;
    std::getline(in, header);
    std::getline(in, frame);
    const std::size_t faces = frame.find(",\"faces\"");
    std::ostringstream out;
    out << header << '\n';
    for (int f = 0; f < frames; ++f) out << "{\"frame\":" << f << frame.substr(faces) << '\n';
    return console_.Write("long.track.jsonl", out.str());
  }

  static bool HasEnded(pid_t child) {
    siginfo_t info{};
    return waitid(P_PID, static_cast<id_t>(child), &info, WEXITED | WNOHANG | WNOWAIT) == 0 &&
           info.si_pid == child;
  }

  static std::string ReadFile(const std::string& path) {
    std::ostringstream content;
    content << std::ifstream(path, std::ios::binary).rdbuf();
    return content.str();
  }

  ScratchFolder folder_;
  ScratchFolder console_;
  std::string tool_ = N3DS_TOOL;
  std::string stdout_;  // where standard output goes instead of a file
};

}  // namespace n3ds::tool
