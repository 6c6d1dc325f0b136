// SPDX-License-Identifier: MIT
#include "commands/outputs.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <filesystem>

#include "support/error.h"

namespace n3ds::tool {
namespace {

namespace fs = std::filesystem;

struct Ending {
  const char* text;
  OutputFormat format;
};

constexpr Ending kEndings[] = {{".png", OutputFormat::kPng},
                               {".jpg", OutputFormat::kJpeg},
                               {".jpeg", OutputFormat::kJpeg},
                               {".mp4", OutputFormat::kFilm},
                               {".obj", OutputFormat::kObj}};

std::string LowerCase(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char letter) { return static_cast<char>(std::tolower(letter)); });
  return text;
}

}  // namespace

OutputFormat FormatOf(const std::string& option, const std::string& path,
                      const std::vector<OutputFormat>& known) {
  const auto is_known = [&](OutputFormat format) {
    return std::find(known.begin(), known.end(), format) != known.end();
  };
  const fs::path place = path;
  const std::string ending = LowerCase(place.extension().string());
  std::string list;
  for (const Ending& candidate : kEndings) {
    if (!is_known(candidate.format)) continue;
    if (ending == candidate.text) return candidate.format;
    list += (list.empty() ? "" : ", ") + std::string(candidate.text);
  }
  std::error_code error;
  const fs::file_status status = fs::status(place, error);
  const bool is_folder =
      fs::is_directory(status) || !place.has_filename() || (ending.empty() && !fs::exists(status));
  if (is_folder && is_known(OutputFormat::kFolder)) return OutputFormat::kFolder;
  const bool is_device =
      fs::exists(status) && (fs::is_other(status) || path.rfind("/dev/", 0) == 0);
  if (ending.empty() && is_device) return known.front();
  if (is_known(OutputFormat::kFolder)) list += "; a folder has none";
  throw UsageError(option + " " + path + ": " +
                   (ending.empty() ? "no ending" : "unknown ending " + ending) +
                   " (known: " + list + ")");
}

void WriteImage(const std::string& path, OutputFormat format, const Image& image) {
  if (format == OutputFormat::kJpeg) {
    WriteJpeg(path, image);
  } else {
    WritePng(path, image);
  }
}

std::FILE* ConsoleBeside(const std::string& output) {
  struct stat named = {};
  struct stat standard = {};
  // On a terminal both may appear.
  const bool is_same = stat(output.c_str(), &named) == 0 && fstat(STDOUT_FILENO, &standard) == 0 &&
                       !S_ISCHR(standard.st_mode) && named.st_dev == standard.st_dev &&
                       named.st_ino == standard.st_ino;
  return is_same ? stderr : stdout;
}

void CheckIsNoInput(const std::string& output, const std::vector<std::string>& inputs) {
  struct stat written = {};
  // Reading and writing the same terminal or pipe is no harm.
  if (stat(output.c_str(), &written) != 0 || !S_ISREG(written.st_mode)) return;
  for (const std::string& input : inputs) {
    struct stat read = {};
    const char* path = input == "-" ? "/dev/stdin" : input.c_str();
    if (stat(path, &read) == 0 && read.st_dev == written.st_dev && read.st_ino == written.st_ino) {
      std::string sentence = output;
      sentence.append(": is also an input (").append(input).append(") and would be replaced");
      throw UsageError(sentence);
    }
  }
}

}  // namespace n3ds::tool
