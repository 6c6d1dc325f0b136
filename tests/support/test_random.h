// SPDX-License-Identifier: MIT
// Random input of the running test's own: the order of the tests changes nothing, and a failure can
// be replayed.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "support/random.h"

namespace n3ds::testing {

// FNV-1a of the test's full name.
inline uint64_t TestSeed() {
  const auto* info = ::testing::UnitTest::GetInstance()->current_test_info();
  uint64_t hash = 14695981039346656037u;
  for (const char c : std::string(info->test_suite_name()) + "." + info->name()) {
    hash = (hash ^ static_cast<unsigned char>(c)) * 1099511628211u;
  }
  return hash;
}

inline Random TestRandom() { return Random(TestSeed()); }

}  // namespace n3ds::testing
