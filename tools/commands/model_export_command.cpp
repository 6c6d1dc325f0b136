// SPDX-License-Identifier: MIT
// n3ds model export: a face of a model as a Wavefront OBJ file.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <cstdio>
#include <memory>
#include <string>

#include "commands/model_commands.h"
#include "commands/model_options.h"
#include "commands/options.h"
#include "commands/outputs.h"
#include "model/obj_export.h"

namespace n3ds::tool {
namespace {

struct ExportOptions {
  FaceOptions face;
  std::string obj;
};

void RunModelExport(const ExportOptions& options) {
  FormatOf("--obj", options.obj, {OutputFormat::kObj});
  CheckIsNoInput(options.obj, {options.face.model});
  WriteFaceObj(options.obj, options.face.face());
  std::fprintf(ConsoleBeside(options.obj), "%s\n", options.obj.c_str());
}

}  // namespace

void AddModelExportCommand(CLI::App& model) {
  CLI::App* command = model.add_subcommand("export", "Writes a face of the model as an OBJ file.");
  const auto options = std::make_shared<ExportOptions>();
  AddFaceOptions(*command, options->face);
  AddFileOption(*command, "--obj", options->obj, "Wavefront OBJ file to write", "FILE.obj")
      ->required();
  command->footer(
      "Millimetres in the upright frame of the engine's model matrix, with the texture\n"
      "coordinates of the masks (v upwards, as OBJ has it).\n"
      "Examples:\n"
      "  n3ds model export data/face_model.bin --obj face.obj\n"
      "  n3ds model export data/face_model.bin --obj person.obj --identity 1=2 --identity 3=-1.5\n"
      "  n3ds model export data/face_model.bin --obj shout.obj --expression jaw_open=1");
  command->callback([options] { RunModelExport(*options); });
}

}  // namespace n3ds::tool
