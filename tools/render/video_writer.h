// SPDX-License-Identifier: MIT
// An MP4 film, encoded by ffmpeg at the other end of a pipe.
#pragma once

#include <sys/types.h>

#include <cstdio>
#include <string>

#include "render/image.h"
#include "support/atomic_file.h"

namespace n3ds::tool {

class VideoWriter {
 public:
  // Width and height must be even. Throws Error when ffmpeg cannot be started.
  VideoWriter(const std::string& path, int width, int height, double fps);
  ~VideoWriter();  // without Finish: stops the encoder and leaves nothing behind
  VideoWriter(const VideoWriter&) = delete;
  VideoWriter& operator=(const VideoWriter&) = delete;

  void Add(const Image& image);
  // Ends the film and puts it in its place. Throws Error when the encoder failed.
  void Finish();

 private:
  bool Stop();  // closes the pipe and waits; true when the encoder succeeded

  AtomicPath path_;
  std::FILE* pipe_ = nullptr;
  pid_t encoder_ = -1;
};

}  // namespace n3ds::tool
