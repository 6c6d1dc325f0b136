// SPDX-License-Identifier: MIT
#include "render/video_writer.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>

#include "support/error.h"
#include "support/unfinished.h"

namespace n3ds::tool {

namespace {

// Starts ffmpeg with `input` as its standard input; 0 or the error's number.
int StartEncoder(const char* const* arguments, int input, pid_t& encoder) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, input, STDIN_FILENO);
  const SignalsBlocked blocked;
  posix_spawnattr_t attributes;
  posix_spawnattr_init(&attributes);
  // The child gets neither the blocked nor the ignored signals of its parent.
  sigset_t restored;
  sigemptyset(&restored);
  sigaddset(&restored, SIGPIPE);
  posix_spawnattr_setsigdefault(&attributes, &restored);
  posix_spawnattr_setsigmask(&attributes, &blocked.before());
  posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);
  const int failure = posix_spawnp(&encoder, "ffmpeg", &actions, &attributes,
                                   const_cast<char* const*>(arguments), environ);
  posix_spawnattr_destroy(&attributes);
  posix_spawn_file_actions_destroy(&actions);
  if (failure == 0) SetWritingChild(encoder);
  return failure;
}

}  // namespace

VideoWriter::VideoWriter(const std::string& path, int width, int height, double fps)
    : path_(path, ".mp4") {
  // The encoder may die while it is written to; that must become an error, not the end of n3ds.
  std::signal(SIGPIPE, SIG_IGN);
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0)
    throw Error("no pipe to ffmpeg: " + std::string(strerror(errno)));

  const std::string size = std::to_string(width) + "x" + std::to_string(height);
  const std::string rate = std::to_string(fps);
  std::array<const char*, 25> arguments = {"ffmpeg",
                                           "-y",
                                           "-loglevel",
                                           "fatal",
                                           "-f",
                                           "rawvideo",
                                           "-pix_fmt",
                                           "rgba",
                                           "-s",
                                           size.c_str(),
                                           "-r",
                                           rate.c_str(),
                                           "-i",
                                           "-",
                                           "-c:v",
                                           "libx264",
                                           "-pix_fmt",
                                           "yuv420p",
                                           "-crf",
                                           "22",
                                           "-movflags",
                                           "+faststart",
                                           path_.temporary().c_str(),
                                           nullptr};
  const int failure = StartEncoder(arguments.data(), ends[0], encoder_);
  close(ends[0]);
  if (failure != 0) {
    close(ends[1]);
    encoder_ = -1;
    throw Error(path + ": films need the program ffmpeg, which cannot be started (" +
                std::strerror(failure) + ")");
  }
  pipe_ = fdopen(ends[1], "wb");
}

VideoWriter::~VideoWriter() { Stop(); }

bool VideoWriter::Stop() {
  if (encoder_ < 0) return false;
  const bool flushed = std::fclose(pipe_) == 0;
  int status = 0;
  while (waitpid(encoder_, &status, 0) < 0 && errno == EINTR) {
  }
  SetWritingChild(0);
  encoder_ = -1;
  return flushed && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

void VideoWriter::Add(const Image& image) {
  if (std::fwrite(image.rgba.data(), 1, image.rgba.size(), pipe_) != image.rgba.size()) {
    throw Error(path_.path() + ": ffmpeg stopped taking frames");
  }
}

void VideoWriter::Finish() {
  if (!Stop()) throw Error(path_.path() + ": ffmpeg could not make the film");
  path_.Commit();
}

}  // namespace n3ds::tool
