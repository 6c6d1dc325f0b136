// SPDX-License-Identifier: MIT
#include "commands/frame_folder.h"

#include <cstdio>
#include <filesystem>
#include <utility>
#include <vector>

#include "commands/outputs.h"
#include "support/error.h"

namespace n3ds::tool {

namespace fs = std::filesystem;

FrameFolder::FrameFolder(const std::string& path, std::vector<std::string> inputs)
    : path_(path), inputs_(std::move(inputs)) {
  std::vector<fs::path> missing;
  std::error_code error;
  for (fs::path folder = path; !folder.empty() && !fs::exists(folder, error);
       folder = folder.parent_path()) {
    if (folder.has_filename()) missing.push_back(folder);
  }
  for (auto folder = missing.rbegin(); folder != missing.rend(); ++folder) {
    made_.emplace_back(folder->string(), Unfinished::Kind::kFolder);
    fs::create_directory(*folder, error);
    if (error) throw Error(path + ": cannot create directory (" + error.message() + ")");
  }
  if (!fs::is_directory(path, error)) throw Error(path + ": not a directory");
}

FrameFolder::~FrameFolder() {
  // Files before the folder they are in.
  while (!made_.empty()) made_.pop_back();
}

std::string FrameFolder::File(std::int64_t number, const char* ending) {
  char name[32];
  std::snprintf(name, sizeof name, "frame_%06lld%s", static_cast<long long>(number), ending);
  std::string file = (fs::path(path_) / name).string();
  CheckIsNoInput(file, inputs_);
  std::error_code error;
  if (!fs::exists(fs::symlink_status(file, error))) {
    made_.emplace_back(file, Unfinished::Kind::kFile);
  }
  return file;
}

void FrameFolder::Commit() {
  for (Unfinished& entry : made_) entry.Keep();
}

}  // namespace n3ds::tool
