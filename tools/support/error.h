// SPDX-License-Identifier: MIT
// The tool's error: one sentence for the person at the terminal, naming the file and, where there
// is one, the line.
#pragma once

#include <stdexcept>
#include <string>

namespace n3ds::tool {

class Error : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

}  // namespace n3ds::tool
