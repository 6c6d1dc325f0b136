// SPDX-License-Identifier: MIT
// Golden values: hashes of results that are the same bits on every machine, with every compiler and
// at every optimisation level.
#pragma once

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <ostream>
#include <stdexcept>
#include <string>
#include <vector>

namespace n3ds::testing {

// FNV-1a, 64 bits, over the bytes of words.
class Hash {
 public:
  void Add(const std::vector<uint32_t>& words) {
    for (const uint32_t word : words) {
      for (int byte = 0; byte < 4; byte++) {
        hash_ = (hash_ ^ (word >> (8 * byte) & 255)) * 1099511628211u;
      }
    }
  }
  uint64_t value() const { return hash_; }

 private:
  uint64_t hash_ = 14695981039346656037u;
};

// A row of the table: the two modes of a track, or one step of the engine on its own (`mask` is 0).
struct Golden {
  const char* name;
  uint64_t rigid;
  uint64_t mask;
};
inline bool operator==(const Golden& a, const Golden& b) {
  return a.rigid == b.rigid && a.mask == b.mask;
}
inline void PrintTo(const Golden& golden, std::ostream* out) {
  *out << "{\"" << golden.name << "\", 0x" << std::hex << golden.rigid << ", 0x" << golden.mask
       << std::dec << "},";
}

constexpr Golden kGolden[] = {
#include "engine/golden_values.inc"
};

inline const Golden& GoldenOf(const std::string& name) {
  for (const Golden& golden : kGolden) {
    if (golden.name == name) return golden;
  }
  throw std::out_of_range("no golden value of " + name);
}

// Tests call this with what they found; tests/engine/renew_golden.sh collects it.
inline void Report(const Golden& found, const std::string& frames = "") {
  const char* folder = std::getenv("N3DS_GOLDEN_FOLDER");
  if (folder == nullptr) return;
  const std::string path = std::string(folder) + "/" + found.name;
  std::ofstream row(path + ".row");
  PrintTo(found, &row);
  row << '\n';
  std::ofstream(path + ".frames") << frames;
}

}  // namespace n3ds::testing
