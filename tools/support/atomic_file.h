// SPDX-License-Identifier: MIT
// Output that is either whole or not there: written beside its place under a temporary name and
// renamed on Commit. Without Commit the temporary is removed and what stood there before stays.
#pragma once

#include <fstream>
#include <string>

namespace n3ds::tool {

// The temporary path alone, for a writer that wants a name instead of a stream (a video encoder).
class AtomicPath {
 public:
  // `ending` is kept at the end of the temporary name, for writers that go by it (".mp4").
  explicit AtomicPath(std::string path, const std::string& ending = "");
  ~AtomicPath();
  AtomicPath(const AtomicPath&) = delete;
  AtomicPath& operator=(const AtomicPath&) = delete;

  const std::string& temporary() const { return temporary_; }
  const std::string& path() const { return path_; }
  // Throws Error when the rename fails.
  void Commit();

 private:
  std::string path_;
  std::string temporary_;
  bool committed_ = false;
};

class AtomicFile {
 public:
  // Throws Error when the temporary cannot be made.
  explicit AtomicFile(const std::string& path);
  std::ostream& stream() { return stream_; }
  // Throws Error when not everything could be written.
  void Commit();

 private:
  AtomicPath path_;
  std::ofstream stream_;
};

}  // namespace n3ds::tool
