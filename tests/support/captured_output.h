// SPDX-License-Identifier: MIT
#pragma once

#include <gtest/gtest.h>

#include <string>

namespace n3ds::testing {

// The text a call prints to standard output.
template <typename Call>
std::string PrintedBy(Call call) {
  ::testing::internal::CaptureStdout();
  call();
  return ::testing::internal::GetCapturedStdout();
}

}  // namespace n3ds::testing
