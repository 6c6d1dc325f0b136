// SPDX-License-Identifier: MIT
// Processors of the tests' own: counts that a test sets, and core switches in a new directory.
#pragma once

#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "platform/cpu_system.h"

namespace n3ds::testing {

// While one lives, the engine sees `configured` processors, `online` of them online, and switches
// cores only below directory().
class FakeCpus {
 public:
  FakeCpus(long configured, long online) : saved_(cpu_system) {
    configured_ = configured;
    online_ = online;
    std::string path = (std::filesystem::temp_directory_path() / "n3ds_cpu_XXXXXX").string();
    if (mkdtemp(path.data()) == nullptr) ADD_FAILURE() << "cannot create " << path;
    directory_ = path;
    cpu_system = {Count, directory_.c_str()};
  }
  ~FakeCpus() {
    cpu_system = saved_;
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }
  FakeCpus(const FakeCpus&) = delete;
  FakeCpus& operator=(const FakeCpus&) = delete;

  void SetCounts(long configured, long online) {
    configured_ = configured;
    online_ = online;
  }
  std::filesystem::path Switch(int core) const {
    return directory_ / ("cpu" + std::to_string(core)) / "online";
  }
  void WriteSwitch(int core, const std::string& contents) const {
    std::filesystem::create_directories(Switch(core).parent_path());
    std::ofstream(Switch(core)) << contents;
  }
  std::string ReadSwitch(int core) const {
    std::ifstream file(Switch(core));
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  }

 private:
  static long Count(int name) { return name == _SC_NPROCESSORS_CONF ? configured_ : online_; }

  static inline long configured_ = 1;
  static inline long online_ = 1;
  CpuSystem saved_;
  std::filesystem::path directory_;
};

}  // namespace n3ds::testing
