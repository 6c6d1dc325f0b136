// SPDX-License-Identifier: MIT
#include "support/atomic_file.h"

#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <utility>

#include "support/error.h"

namespace n3ds::tool {

AtomicPath::AtomicPath(std::string path, const std::string& ending)
    : path_(std::move(path)), temporary_(path_ + ".tmp" + std::to_string(getpid()) + ending) {}

AtomicPath::~AtomicPath() {
  if (!committed_) std::remove(temporary_.c_str());
}

void AtomicPath::Commit() {
  if (std::rename(temporary_.c_str(), path_.c_str()) != 0) {
    throw Error(path_ + ": cannot be written (" + std::strerror(errno) + ")");
  }
  committed_ = true;
}

AtomicFile::AtomicFile(const std::string& path)
    : path_(path), stream_(path_.temporary(), std::ios::binary) {
  if (!stream_) throw Error(path + ": cannot be written (" + std::strerror(errno) + ")");
}

void AtomicFile::Commit() {
  stream_.close();
  if (!stream_) throw Error(path_.path() + ": not everything could be written");
  path_.Commit();
}

}  // namespace n3ds::tool
