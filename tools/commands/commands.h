// SPDX-License-Identifier: MIT
// The tool's commands. Each adds its options to the parser and runs when it was chosen; it throws
// Error for anything the user should read in one sentence.
#pragma once

#include <CLI/App.hpp>

namespace n3ds::tool {

void AddTrackCommand(CLI::App& app);
void AddEvalCommand(CLI::App& app);
void AddRenderCommand(CLI::App& app);
void AddMaskCommand(CLI::App& app);
void AddMeshCommand(CLI::App& app);
void AddModelCommand(CLI::App& app);

}  // namespace n3ds::tool
