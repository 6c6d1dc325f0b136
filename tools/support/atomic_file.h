// SPDX-License-Identifier: MIT
// Output that is either whole or not there: written beside its place under a temporary name and
// renamed on Commit. Without Commit, and when a signal ends the program, the temporary is removed
// and what stood there before stays.
//
// A symbolic link stays and what it points to is replaced; the mode of a file that was there is
// kept. Devices, pipes and the program's own descriptors (/dev/stdout) are written to directly.
#pragma once

#include <array>
#include <memory>
#include <optional>
#include <ostream>
#include <streambuf>
#include <string>

#include "support/unfinished.h"

namespace n3ds::tool {

// The temporary path alone, for a writer that wants a name instead of a stream (a video encoder).
class AtomicPath {
 public:
  // Makes the temporary, empty; `ending` is kept at the end of its name for writers that go by it
  // (".mp4"). Throws Error when that fails or when the place is no regular file.
  explicit AtomicPath(const std::string& path, const std::string& ending = "");

  const std::string& temporary() const { return temporary_; }
  const std::string& path() const { return path_; }
  // Throws Error when the rename fails.
  void Commit();

 private:
  std::string path_;    // as the user named it
  std::string target_;  // the file behind its links
  std::string temporary_;
  Unfinished unfinished_;
};

// Writes to a file descriptor and closes it in the end.
class DescriptorBuffer : public std::streambuf {
 public:
  explicit DescriptorBuffer(int descriptor);
  ~DescriptorBuffer() override;
  DescriptorBuffer(const DescriptorBuffer&) = delete;
  DescriptorBuffer& operator=(const DescriptorBuffer&) = delete;

  // Flushes and closes; false when not everything could be written.
  bool Close();
  int error() const { return error_; }  // errno of the first failure, 0 without one

 protected:
  int_type overflow(int_type letter) override;
  int sync() override;

 private:
  bool Flush();  // false when not everything could be written

  int descriptor_;
  int error_ = 0;
  std::array<char, 65536> bytes_;
};

class AtomicFile {
 public:
  // Throws Error when the place cannot be written to.
  explicit AtomicFile(const std::string& path);

  std::ostream& stream() { return *stream_; }
  // A device or pipe, whose reader wants to see what is there at once.
  bool is_direct() const { return !temporary_; }
  // Throws Error when not everything could be written.
  void Commit();

 private:
  std::string path_;
  std::optional<AtomicPath> temporary_;  // without one the place is written to directly
  std::unique_ptr<DescriptorBuffer> buffer_;
  std::unique_ptr<std::ostream> stream_;
};

}  // namespace n3ds::tool
