// SPDX-License-Identifier: MIT
// n3ds model check: the geometric checks of a face model as a table.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <iostream>
#include <memory>
#include <string>

#include "commands/model_commands.h"
#include "commands/model_options.h"
#include "commands/options.h"
#include "model/model_checks.h"
#include "support/error.h"

namespace n3ds::tool {
namespace {

struct CheckOptions {
  std::string model;
  double identity_unit = kIdentityUnit;
};

void RunModelCheck(const CheckOptions& options) {
  const CheckReport report = CheckModel(ReadFaceModelFile(options.model), options.identity_unit);
  report.Print(std::cout);
  std::cout.flush();
  const auto failures = report.failures();
  if (failures.empty()) return;
  throw Error(options.model + ": " + std::to_string(failures.size()) + " of " +
              std::to_string(report.checks()) + " checks failed, the first is '" +
              failures.front().name + "'");
}

}  // namespace

void AddModelCheckCommand(CLI::App& model) {
  CLI::App* command = model.add_subcommand(
      "check", "Checks the shapes of a face-model file on the engine's mesh, and prints a table.");
  const auto options = std::make_shared<CheckOptions>();
  AddFileArgument(*command, "MODEL", options->model, "Face-model file");
  AddIdentityUnit(*command, options->identity_unit);
  command->footer(
      "Triangles, texture coordinates and the names of the expressions are those the engine was\n"
      "built with. Symmetry, angles, folds (mean face, 1,000 random people, every expression,\n"
      "combinations), the interaction's products and the texture are checked. The exit code is 1\n"
      "when a check fails.\n"
      "Example:\n"
      "  n3ds model check data/face_model.bin");
  command->callback([options] { RunModelCheck(*options); });
}

}  // namespace n3ds::tool
