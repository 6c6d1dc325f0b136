// SPDX-License-Identifier: MIT
#include "support/atomic_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include "support/error.h"

namespace n3ds::tool {
namespace {

namespace fs = std::filesystem;

[[noreturn]] void Fail(const std::string& path, int error) {
  throw Error(path + ": cannot be written (" + std::strerror(error) + ")");
}

// A path with its links followed. The file need not be there.
struct Target {
  std::string path;
  std::optional<int> descriptor;  // the path is a name of this open descriptor
  struct stat status = {};
  bool exists = false;

  bool is_regular() const { return !descriptor && (!exists || S_ISREG(status.st_mode)); }
};

// The system's names for the open descriptors of a process are links that cannot be followed by
// name: they may lead to a pipe, or to a file that is being written to.
std::optional<int> OwnDescriptor(const fs::path& path) {
  const std::string name = path.filename().string();
  if (name.empty() || !std::all_of(name.begin(), name.end(),
                                   [](char letter) { return letter >= '0' && letter <= '9'; })) {
    return std::nullopt;
  }
  std::error_code error;
  const fs::path folder = fs::canonical(path.parent_path(), error);
  if (error || folder != "/proc/" + std::to_string(getpid()) + "/fd") return std::nullopt;
  return std::atoi(name.c_str());
}

Target FindTarget(const std::string& path) {
  constexpr int kMostLinks = 40;  // as the system has it
  Target target;
  fs::path place = path;
  for (int links = 0;; ++links) {
    target.descriptor = OwnDescriptor(place);
    std::error_code error;
    if (target.descriptor || !fs::is_symlink(fs::symlink_status(place, error))) break;
    if (links == kMostLinks) Fail(path, ELOOP);
    const fs::path next = fs::read_symlink(place, error);
    if (error) Fail(path, error.value());
    place = place.parent_path() / next;  // an absolute one replaces it
  }
  target.path = place.string();
  target.exists = stat(target.path.c_str(), &target.status) == 0;
  if (target.exists && S_ISDIR(target.status.st_mode)) Fail(path, EISDIR);
  // A rename would replace a protected file all the same.
  if (target.exists && access(target.path.c_str(), W_OK) != 0) Fail(path, errno);
  return target;
}

// In the folder of the file, because a rename cannot leave the file system; with a name of its own,
// because another one might be too long.
std::string TemporaryName(const std::string& target, const std::string& ending) {
  static int count = 0;
  const std::string name =
      ".n3ds_" + std::to_string(getpid()) + "_" + std::to_string(count++) + ".tmp" + ending;
  return (fs::path(target).parent_path() / name).string();
}

// A new file with the owner and mode of the one it will replace.
void MakeTemporary(const std::string& path, const std::string& temporary, const Target& target) {
  const int descriptor = open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
  if (descriptor < 0) Fail(path, errno);
  if (target.exists) {
    // Giving a file away takes rights that few have; then it becomes the caller's.
    [[maybe_unused]] const int given =
        fchown(descriptor, target.status.st_uid, target.status.st_gid);
    fchmod(descriptor, target.status.st_mode & 0777);
  }
  close(descriptor);
}

int OpenDirectly(const std::string& path, const Target& target) {
  const int descriptor = target.descriptor ? fcntl(*target.descriptor, F_DUPFD_CLOEXEC, 0)
                                           : open(target.path.c_str(), O_WRONLY | O_CLOEXEC);
  if (descriptor < 0) Fail(path, errno);
  return descriptor;
}

int OpenTemporary(const AtomicPath& file) {
  const int descriptor = open(file.temporary().c_str(), O_WRONLY | O_CLOEXEC);
  if (descriptor < 0) Fail(file.path(), errno);
  return descriptor;
}

}  // namespace

AtomicPath::AtomicPath(const std::string& path, const std::string& ending)
    : path_(path),
      target_(FindTarget(path).path),
      temporary_(TemporaryName(target_, ending)),
      unfinished_(temporary_, Unfinished::Kind::kFile) {
  const Target target = FindTarget(path);
  if (!target.is_regular()) throw Error(path + ": expected a regular file");
  MakeTemporary(path, temporary_, target);
}

void AtomicPath::Commit() {
  if (std::rename(temporary_.c_str(), target_.c_str()) != 0) Fail(path_, errno);
  unfinished_.Keep();
}

DescriptorBuffer::DescriptorBuffer(int descriptor) : descriptor_(descriptor), bytes_() {
  setp(bytes_.data(), bytes_.data() + bytes_.size());
}

DescriptorBuffer::~DescriptorBuffer() { Close(); }

DescriptorBuffer::int_type DescriptorBuffer::overflow(int_type letter) {
  if (!Flush()) return traits_type::eof();
  if (traits_type::eq_int_type(letter, traits_type::eof())) return traits_type::not_eof(letter);
  return sputc(traits_type::to_char_type(letter));
}

int DescriptorBuffer::sync() { return Flush() ? 0 : -1; }

bool DescriptorBuffer::Flush() {
  const char* next = pbase();
  while (next != pptr() && error_ == 0) {
    const ssize_t written = write(descriptor_, next, static_cast<std::size_t>(pptr() - next));
    if (written >= 0) {
      next += written;
    } else if (errno != EINTR) {
      error_ = errno;
    }
  }
  setp(bytes_.data(), bytes_.data() + bytes_.size());
  return error_ == 0;
}

bool DescriptorBuffer::Close() {
  if (descriptor_ < 0) return error_ == 0;
  Flush();
  if (close(descriptor_) != 0 && error_ == 0) error_ = errno;
  descriptor_ = -1;
  return error_ == 0;
}

AtomicFile::AtomicFile(const std::string& path) : path_(path) {
  const Target target = FindTarget(path);
  if (target.is_regular()) temporary_.emplace(path);
  buffer_ = std::make_unique<DescriptorBuffer>(temporary_ ? OpenTemporary(*temporary_)
                                                          : OpenDirectly(path, target));
  stream_ = std::make_unique<std::ostream>(buffer_.get());
}

void AtomicFile::Commit() {
  if (!buffer_->Close()) Fail(path_, buffer_->error());
  if (temporary_) temporary_->Commit();
}

}  // namespace n3ds::tool
