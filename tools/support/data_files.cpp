// SPDX-License-Identifier: MIT
#include "support/data_files.h"

#include <cstdlib>
#include <filesystem>
#include <vector>

#include "support/error.h"

namespace n3ds::tool {
namespace {

namespace fs = std::filesystem;

std::string Find(const std::string& name, const fs::path& source) {
  std::vector<fs::path> places;
  const char* folder = std::getenv("N3DS_DATA_DIR");
  if (folder != nullptr && *folder != 0) places.push_back(fs::path(folder) / name);
  std::error_code error;
  const fs::path program = fs::read_symlink("/proc/self/exe", error);
  if (!error) {
    places.push_back(program.parent_path().parent_path() / "share" / "norvale-3d-sticker" / name);
  }
  places.push_back(source);
  std::string looked_for;
  for (const fs::path& place : places) {
    if (fs::exists(place, error)) return place.string();
    looked_for += (looked_for.empty() ? "" : ", ") + place.string();
  }
  throw Error("cannot find " + name + " (looked for " + looked_for +
              "; the environment variable N3DS_DATA_DIR can name its folder)");
}

}  // namespace

std::string DefaultModelPath() {
  return Find("face_model.bin", fs::path(N3DS_SOURCE_DIR) / "data" / "face_model.bin");
}

std::string StickerPath(const std::string& name) {
  return Find("assets/" + name, fs::path(N3DS_SOURCE_DIR) / "examples" / "assets" / name);
}

}  // namespace n3ds::tool
