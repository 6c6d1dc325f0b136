// SPDX-License-Identifier: MIT
// n3ds mask: a mask image on the faces of a photo, through the library's own image functions.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <cstdint>
#include <cstdio>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "commands/commands.h"
#include "commands/frames.h"
#include "commands/options.h"
#include "commands/outputs.h"
#include "engine/core_session.h"
#include "engine/engine_session.h"
#include "render/camera_image.h"
#include "render/image.h"
#include "support/data_files.h"
#include "support/error.h"
#include "tracks/track_file.h"

namespace n3ds::tool {
namespace {

using Convert = CameraImage (*)(const Image&);

const std::map<std::string, Convert>& Formats() {
  static const std::map<std::string, Convert> formats = {{"bgr24", CameraImage::Bgr24},
                                                         {"nv21", CameraImage::Nv21}};
  return formats;
}

struct MaskOptions {
  std::string model;
  std::string photo;
  std::string track;
  std::string texture;
  std::string out;
  std::string format = "bgr24";
  std::optional<std::int64_t> frame;
  std::size_t settle = 20;
};

// The photo as the landmarks see it: their pixels are those of the track's image.
Image LoadPhoto(const MaskOptions& options, const TrackHeader& header) {
  const Image photo = ReadImage(options.photo);
  if (photo.width != header.width || photo.height != header.height) {
    throw Error(options.photo + ": the image has " + std::to_string(photo.width) + " x " +
                std::to_string(photo.height) + " pixels, the track " +
                std::to_string(header.width) + " x " + std::to_string(header.height));
  }
  return Upright(photo, header.degree, header.mirror == 1);
}

void RunMaskCommand(const MaskOptions& options) {
  const OutputFormat format =
      FormatOf("--out", options.out, {OutputFormat::kPng, OutputFormat::kJpeg});
  const std::string model = options.model.empty() ? DefaultModelPath() : options.model;
  CheckIsNoInput(options.out, {options.photo, options.track, options.texture, model});
  const Track track = LoadTrack(options.track);
  const std::size_t chosen = ChosenFrame(track, options.track, options.frame);
  if (track.frames[chosen].faces.empty()) {
    throw Error(options.track + ": frame " + std::to_string(track.frames[chosen].number) +
                " has no face to put a mask on");
  }
  const Image photo = LoadPhoto(options, track.header);
  CameraImage texture = CameraImage::Bgra32(ReadImage(options.texture));

  CoreSession session(model, track.header);
  for (std::size_t f = 0; f <= chosen; ++f) session.Process(track.frames[f]);
  for (std::size_t k = 0; k < options.settle; ++k) session.Process(track.frames[chosen]);
  CameraImage image = Formats().at(options.format)(photo);
  for (const std::size_t face : session.FarToNear()) {
    CameraImage mask = CameraImage::ClearBgra32(image.width(), image.height());
    session.Warp(texture.Descriptor(), face, mask.Descriptor());
    session.Blend(mask.Descriptor(), image.Descriptor());
  }
  WriteImage(options.out, format, image.ToImage(photo.width, photo.height));
  std::fprintf(ConsoleBeside(options.out), "%s: %zu %s\n", options.out.c_str(), session.faces(),
               session.faces() == 1 ? "face" : "faces");
}

}  // namespace

void AddMaskCommand(CLI::App& app) {
  CLI::App* command = app.add_subcommand(
      "mask",
      "Puts a mask image on the faces of a photo with the library's own image functions, which\n"
      "need no graphics system.");
  const auto options = std::make_shared<MaskOptions>();
  AddFileArgument(*command, "PHOTO", options->photo,
                  "PNG or JPEG as delivered, of the track's size");
  AddTrackArgument(*command, options->track);
  AddFileOption(*command, "--texture", options->texture,
                "Mask image, PNG or JPEG, in the layout of data/face_template.png")
      ->required();
  AddFileOption(*command, "--out", options->out,
                "The upright image with the masks, FILE.png or FILE.jpg")
      ->required();
  AddChoice(*command, "--format", options->format,
            "Pixel format in which the image is blended: bgr24 (3 bytes a pixel) or nv21\n"
            "(a luma and a chroma plane)",
            Formats(), "bgr24|nv21")
      ->capture_default_str();
  AddFrameOption(*command, options->frame,
                 "Number of the photo's frame, by default the first with a face; the frames\n"
                 "before it are tracked too");
  command
      ->add_option("--settle", options->settle,
                   "For how many more frames the photo's landmarks are held before it is drawn: a\n"
                   "new face has the mean face's shape, which gradually becomes the person's")
      ->type_name("N")
      ->check(CLI::Range(0, 1000).description(""))
      ->capture_default_str();
  AddModelOption(*command, options->model);
  command->footer(
      "Examples:\n"
      "  n3ds mask group.jpg group.track.jsonl --texture examples/assets/mask_tiger.png \\\n"
      "      --out tigers.png\n"
      "  n3ds mask group.jpg group.track.jsonl --texture examples/assets/mask_gold.png \\\n"
      "      --format nv21 --out gold.png");
  command->callback([options] { RunMaskCommand(*options); });
}

}  // namespace n3ds::tool
