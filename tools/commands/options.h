// SPDX-License-Identifier: MIT
// Options that several commands share.
#pragma once

#include <CLI/App.hpp>
#include <string>

#include "engine/engine_session.h"

namespace n3ds::tool {

struct EngineOptions {
  std::string model = DefaultModelPath();
  std::string mode_name = "rigid";

  TrackMode mode() const;
};

void AddEngineOptions(CLI::App& command, EngineOptions& options);

}  // namespace n3ds::tool
