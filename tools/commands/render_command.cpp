// SPDX-License-Identifier: MIT
// n3ds render: images and films of stickers on the tracked faces.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "commands/commands.h"
#include "commands/frame_folder.h"
#include "commands/frames.h"
#include "commands/options.h"
#include "commands/outputs.h"
#include "engine/engine_session.h"
#include "render/contact_sheet.h"
#include "render/image.h"
#include "render/scene.h"
#include "render/video_writer.h"
#include "render/view.h"
#include "support/progress.h"
#include "tracks/track_file.h"

namespace n3ds::tool {
namespace {

constexpr int kDefaultSide = 1280;  // largest side of an image or film when no size is asked for
constexpr int kDefaultTile = 320;   // of a tile on a contact sheet

struct RenderOptions {
  EngineOptions engine;
  std::string track;
  std::string out;
  std::string image;
  std::string texture;
  std::string size;
  std::vector<std::string> draw;
  std::optional<std::int64_t> frame;
  std::size_t contact_sheet = 0;
  std::size_t every = 1;
  bool closeup = false;
};

bool IsImage(OutputFormat format) {
  return format == OutputFormat::kPng || format == OutputFormat::kJpeg;
}

// "640x360" as a box, or nothing.
std::optional<Size> ParseSize(const std::string& text) {
  if (text.empty()) return std::nullopt;
  Size size;
  char rest = 0;
  if (std::sscanf(text.c_str(), "%dx%d%c", &size.width, &size.height, &rest) != 2 ||
      size.width < 16 || size.height < 16 || size.width > kLargestDrawnSide ||
      size.height > kLargestDrawnSide) {
    throw UsageError("--size " + text + ": expected WIDTHxHEIGHT from 16x16 to 8192x8192");
  }
  return size;
}

SceneParts DefaultParts(const RenderOptions& options) {
  SceneParts parts;
  // On a plain ground one would see hats, glasses and masks hang in the air.
  parts.head = options.image.empty();
  if (options.engine.mode() == TrackMode::kMask) {
    parts.glasses = parts.hat = false;
    parts.mesh = options.texture.empty();
  }
  return parts;
}

SceneParts ParseParts(const RenderOptions& options) {
  if (options.draw.empty()) return DefaultParts(options);
  const std::set<std::string> names(options.draw.begin(), options.draw.end());
  SceneParts parts;
  parts.glasses = names.count("glasses") > 0;
  parts.hat = names.count("hat") > 0;
  parts.axes = names.count("axes") > 0;
  parts.landmarks = names.count("landmarks") > 0;
  parts.head = names.count("head") > 0;
  parts.mesh = names.count("mesh") > 0;
  parts.wireframe = names.count("wireframe") > 0;
  return parts;
}

void CheckMode(const RenderOptions& options, const SceneParts& parts) {
  if (options.engine.mode() == TrackMode::kMask) return;
  if (parts.mesh || parts.wireframe || !options.texture.empty()) {
    throw UsageError(
        "--texture and the parts mesh and wireframe need the dense mesh of --mode mask");
  }
}

std::optional<Image> LoadBackground(const RenderOptions& options, const TrackHeader& header) {
  if (options.image.empty()) return std::nullopt;
  const Image delivered = ReadImage(options.image);
  // A reduced or enlarged copy of the image serves as well, other proportions do not.
  const double stretch = static_cast<double>(delivered.width) * header.height /
                         (static_cast<double>(delivered.height) * header.width);
  if (std::abs(stretch - 1) > 0.01) {
    throw Error(options.image + ": the image has " + std::to_string(delivered.width) + " x " +
                std::to_string(delivered.height) + " pixels, the track " +
                std::to_string(header.width) + " x " + std::to_string(header.height));
  }
  return Upright(delivered, header.degree, header.mirror == 1);
}

// Frames to draw, by their index, in ascending order.
std::vector<std::size_t> ChooseFrames(const Track& track, const RenderOptions& options,
                                      OutputFormat format) {
  if (options.contact_sheet > 0) return EvenlySpaced(track.frames.size(), options.contact_sheet);
  if (IsImage(format)) return {ChosenFrame(track, options.track, options.frame)};
  std::vector<std::size_t> chosen;
  for (std::size_t f = 0; f < track.frames.size(); f += options.every) chosen.push_back(f);
  return chosen;
}

std::vector<std::string> Inputs(const RenderOptions& options, const std::string& model) {
  return {options.track, model, options.image, options.texture};
}

// One drawing of a track's frames.
class Drawing {
 public:
  Drawing(const Track& track, const RenderOptions& options, const SceneParts& parts,
          OutputFormat format, const std::string& model)
      : track_(track),
        options_(options),
        format_(format),
        model_(model),
        chosen_(ChooseFrames(track, options, format)) {
    const std::optional<Size> box = ParseSize(options.size);
    const int side = options.contact_sheet > 0 ? kDefaultTile : kDefaultSide;
    view_ =
        options.closeup ? CloseView(track, chosen_, box, side) : WholeView(track.header, box, side);
    if (format == OutputFormat::kFilm) view_.MakeEven();
    std::optional<Image> mask;
    if (!options.texture.empty()) mask = ReadImage(options.texture);
    scene_ =
        std::make_unique<Scene>(track.header, model_, parts, LoadBackground(options, track.header),
                                view_.whole.width, view_.whole.height, mask);
  }

  void Run() {
    if (format_ == OutputFormat::kFilm) {
      VideoWriter film(options_.out, view_.shown.width, view_.shown.height,
                       track_.header.fps / static_cast<double>(options_.every));
      DrawFrames([&](const FrameResult&, const Image& image) { film.Add(image); });
      film.Finish();
    } else if (options_.contact_sheet > 0) {
      ContactSheet sheet(chosen_.size(), view_.shown.width, view_.shown.height);
      DrawFrames(
          [&](const FrameResult& result, const Image& image) { sheet.Add(image, result.number); });
      WriteImage(options_.out, format_, sheet.image());
    } else if (IsImage(format_)) {
      DrawFrames([&](const FrameResult&, const Image& image) {
        WriteImage(options_.out, format_, image);
      });
    } else {
      FrameFolder folder(options_.out, Inputs(options_, model_));
      DrawFrames([&](const FrameResult& result, const Image& image) {
        WritePng(folder.File(result.number, ".png"), image);
      });
      folder.Commit();
    }
  }

 private:
  // Runs the whole track, because tracking is a sequence in time, and draws the chosen frames.
  void DrawFrames(const std::function<void(const FrameResult&, const Image&)>& use) {
    EngineSession session(model_, track_.header, options_.engine.mode(), options_.engine.tracker());
    Progress progress("drawing " + track_.name, chosen_.size());
    std::size_t next = 0;
    for (std::size_t f = 0; f < track_.frames.size() && next < chosen_.size(); ++f) {
      const FrameResult result = session.Process(track_.frames[f]);
      if (f != chosen_[next]) continue;
      CheckFrame(options_.track, result);
      use(result, view_.Cut(scene_->Draw(result, session.texture_coordinates())));
      progress.Step();
      ++next;
    }
  }

  const Track& track_;
  const RenderOptions& options_;
  OutputFormat format_;
  std::string model_;
  std::vector<std::size_t> chosen_;
  View view_;
  std::unique_ptr<Scene> scene_;
};

void RunRenderCommand(const RenderOptions& options) {
  const SceneParts parts = ParseParts(options);
  CheckMode(options, parts);
  const OutputFormat format = FormatOf(
      "--out", options.out,
      {OutputFormat::kPng, OutputFormat::kJpeg, OutputFormat::kFilm, OutputFormat::kFolder});
  ParseSize(options.size);
  const bool sheet = options.contact_sheet > 0;
  if (!IsImage(format) && (sheet || options.frame)) {
    throw UsageError("--frame and --contact-sheet make one image: --out must end in .png or .jpg");
  }
  if (sheet && options.frame) throw UsageError("--frame and --contact-sheet exclude each other");
  const std::string model = options.engine.model_path();
  CheckIsNoInput(options.out, Inputs(options, model));
  const Track track = LoadTrack(options.track);
  Drawing(track, options, parts, format, model).Run();
  std::fprintf(ConsoleBeside(options.out), "%s\n", options.out.c_str());
}

}  // namespace

void AddRenderCommand(CLI::App& app) {
  CLI::App* command = app.add_subcommand(
      "render",
      "Draws a hat and glasses on the faces of a track, placed by the engine's matrices alone; in\n"
      "mask mode the face's dense mesh, plain or under a mask image.");
  const auto options = std::make_shared<RenderOptions>();
  AddTrackArgument(*command, options->track);
  AddFileOption(*command, "--out", options->out,
                "FILE.png or FILE.jpg for one image, FILE.mp4 for a film; a name without an\n"
                "ending is a folder that gets a PNG a frame",
                "PATH")
      ->required();
  AddFileOption(*command, "--image", options->image,
                "PNG or JPEG drawn behind, as delivered (it is turned like the landmarks)");
  AddFrameOption(*command, options->frame, "Number of the frame in an image");
  command
      ->add_option("--contact-sheet", options->contact_sheet,
                   "Grid of N evenly spaced frames in one image (12)")
      ->type_name("N")
      ->expected(0, 1)
      ->default_str("12")
      ->check(CLI::Range(1, 400).description(""));
  AddEveryOption(*command, options->every, "Draw every Nth frame of a film or folder");
  command->add_option("--size", options->size, "Box into which an image, film or tile is fitted")
      ->type_name("WIDTHxHEIGHT");
  command->add_flag("--closeup", options->closeup, "Show the heads alone");
  AddChoice(
      *command, "--draw", options->draw,
      "What to draw: hat, glasses, head (by default these; the head not on a photo),\n"
      "axes, landmarks; in mask mode also mesh, wireframe (by default the mesh, and\n"
      "the head not on a photo)",
      std::vector<std::string>{"glasses", "hat", "axes", "landmarks", "head", "mesh", "wireframe"},
      "LIST")
      ->delimiter(',');
  AddFileOption(*command, "--texture", options->texture,
                "PNG or JPEG drawn on the dense mesh of mask mode, in the layout of\n"
                "data/face_template.png");
  AddEngineOptions(*command, options->engine);
  command->footer(
      "The output shows the upright, unmirrored image, whatever the orientation of the track.\n"
      "The mean head of the model hides what lies behind it. Without --frame or --contact-sheet,\n"
      "FILE.png shows the first frame with a face. Films need the program ffmpeg.\n"
      "Examples:\n"
      "  n3ds render talk.track.jsonl --out talk.png --contact-sheet 12\n"
      "  n3ds render talk.track.jsonl --out talk.mp4 --size 640x640\n"
      "  n3ds render group.track.jsonl --image group.jpg --out group.png\n"
      "  n3ds render talk.track.jsonl --out frames --every 10 --draw glasses,head\n"
      "  n3ds render talk.track.jsonl --out mesh.png --mode mask --draw mesh,wireframe\n"
      "  n3ds render talk.track.jsonl --out tiger.mp4 --mode mask --texture tiger.png");
  command->callback([options] { RunRenderCommand(*options); });
}

}  // namespace n3ds::tool
