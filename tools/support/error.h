// SPDX-License-Identifier: MIT
// The tool's errors: one sentence for the person at the terminal, naming the file and, where there
// is one, the line.
#pragma once

#include <stdexcept>
#include <string>

namespace n3ds::tool {

class Error : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// The command line asks for something that no file could make possible.
class UsageError : public Error {
 public:
  using Error::Error;
};

}  // namespace n3ds::tool
