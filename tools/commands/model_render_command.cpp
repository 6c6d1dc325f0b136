// SPDX-License-Identifier: MIT
// n3ds model render: a face of a model from several sides.
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
#include "render/turntable.h"

namespace n3ds::tool {
namespace {

struct RenderOptions {
  FaceOptions face;
  std::string out;
  int views = 5;
  int size = 480;
};

void RunModelRender(const RenderOptions& options) {
  const OutputFormat format =
      FormatOf("--out", options.out, {OutputFormat::kPng, OutputFormat::kJpeg});
  CheckIsNoInput(options.out, {options.face.model});
  const Points face = options.face.face();
  WriteImage(options.out, format, DrawTurntable(face, options.views, options.size));
  std::fprintf(ConsoleBeside(options.out), "%s\n", options.out.c_str());
}

}  // namespace

void AddModelRenderCommand(CLI::App& model) {
  CLI::App* command = model.add_subcommand(
      "render", "Draws a face of the model, lit, from several sides in one image.");
  const auto options = std::make_shared<RenderOptions>();
  AddFaceOptions(*command, options->face);
  AddFileOption(*command, "--out", options->out, "Image to write, FILE.png or FILE.jpg")
      ->required();
  command
      ->add_option("--views", options->views,
                   "Views side by side, from one profile to the other; 1 is the front alone")
      ->type_name("N")
      ->check(CLI::Range(1, 16).description(""))
      ->capture_default_str();
  command->add_option("--size", options->size, "Width and height of a view, pixels")
      ->type_name("N")
      ->check(CLI::Range(16, 2048).description(""))
      ->capture_default_str();
  command->footer(
      "Examples:\n"
      "  n3ds model render data/face_model.bin --out face.png\n"
      "  n3ds model render data/face_model.bin --out person.png --identity 1=2,3=-1.5\n"
      "  n3ds model render data/face_model.bin --out smile.png --views 1 --size 1024 \\\n"
      "    --expression mouth_smile_L=1 --expression mouth_smile_R=1");
  command->callback([options] { RunModelRender(*options); });
}

}  // namespace n3ds::tool
