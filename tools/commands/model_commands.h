// SPDX-License-Identifier: MIT
// The commands under 'n3ds model', a file each ('info' is with 'model' itself).
#pragma once

#include <CLI/App.hpp>

namespace n3ds::tool {

void AddModelCheckCommand(CLI::App& model);
void AddModelRenderCommand(CLI::App& model);
void AddModelExportCommand(CLI::App& model);

}  // namespace n3ds::tool
