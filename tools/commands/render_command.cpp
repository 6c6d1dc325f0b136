// SPDX-License-Identifier: MIT
// n3ds render: pictures and films of stickers on the tracked faces.
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
#include "engine/engine_session.h"
#include "render/contact_sheet.h"
#include "render/picture.h"
#include "render/scene.h"
#include "render/video_writer.h"
#include "render/view.h"
#include "support/progress.h"
#include "tracks/track_file.h"

namespace n3ds::tool {
namespace {

constexpr int kDefaultSide = 1280;  // largest side of a picture or film when no size is asked for
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

bool EndsWith(const std::string& text, const std::string& ending) {
  return text.size() >= ending.size() &&
         text.compare(text.size() - ending.size(), ending.size(), ending) == 0;
}

// "640x360" as a box, or nothing.
std::optional<Size> ParseSize(const std::string& text) {
  if (text.empty()) return std::nullopt;
  Size size;
  char rest = 0;
  if (std::sscanf(text.c_str(), "%dx%d%c", &size.width, &size.height, &rest) != 2 ||
      size.width < 16 || size.height < 16 || size.width > kLargestDrawnSide ||
      size.height > kLargestDrawnSide) {
    throw Error("--size " + text + ": WIDTHxHEIGHT from 16x16 to 8192x8192 is needed");
  }
  return size;
}

SceneParts DefaultParts(const RenderOptions& options) {
  SceneParts parts;
  // On a plain ground one would see hats, glasses and masks hang in the air.
  parts.head = options.image.empty();
  if (options.engine.mode() == TrackMode::kMask) {
    parts.glasses = parts.hat = parts.axes = parts.landmarks = false;
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
    throw Error("--texture and the parts mesh and wireframe need the dense mesh of --mode mask");
  }
}

std::optional<Picture> LoadBackground(const RenderOptions& options, const TrackHeader& header) {
  if (options.image.empty()) return std::nullopt;
  const Picture delivered = ReadPicture(options.image);
  // A reduced or enlarged copy of the picture serves as well, other proportions do not.
  const double stretch = static_cast<double>(delivered.width) * header.height /
                         (static_cast<double>(delivered.height) * header.width);
  if (std::abs(stretch - 1) > 0.01) {
    throw Error(options.image + ": the picture has " + std::to_string(delivered.width) + " x " +
                std::to_string(delivered.height) + " pixels, the track " +
                std::to_string(header.width) + " x " + std::to_string(header.height));
  }
  return Upright(delivered, header.degree, header.mirror == 1);
}

// Frames to draw, by their index, in ascending order.
std::vector<std::size_t> ChooseFrames(const Track& track, const RenderOptions& options) {
  if (options.contact_sheet > 0) return EvenlySpaced(track.frames.size(), options.contact_sheet);
  if (EndsWith(options.out, ".png")) return {ChosenFrame(track, options.track, options.frame)};
  std::vector<std::size_t> chosen;
  for (std::size_t f = 0; f < track.frames.size(); f += options.every) chosen.push_back(f);
  return chosen;
}

// One drawing of a track's frames.
class Drawing {
 public:
  Drawing(const Track& track, const RenderOptions& options, const SceneParts& parts)
      : track_(track), options_(options), chosen_(ChooseFrames(track, options)) {
    const std::optional<Size> box = ParseSize(options.size);
    const int side = options.contact_sheet > 0 ? kDefaultTile : kDefaultSide;
    view_ =
        options.closeup ? CloseView(track, chosen_, box, side) : WholeView(track.header, box, side);
    if (EndsWith(options.out, ".mp4")) view_.MakeEven();
    std::optional<Picture> mask;
    if (!options.texture.empty()) mask = ReadPicture(options.texture);
    scene_ = std::make_unique<Scene>(track.header, options.engine.model, parts,
                                     LoadBackground(options, track.header), view_.whole.width,
                                     view_.whole.height, mask);
  }

  void Run() {
    if (EndsWith(options_.out, ".mp4")) {
      VideoWriter film(options_.out, view_.shown.width, view_.shown.height,
                       track_.header.fps / static_cast<double>(options_.every));
      DrawFrames([&](const FrameResult&, const Picture& picture) { film.Add(picture); });
      film.Finish();
    } else if (options_.contact_sheet > 0) {
      ContactSheet sheet(chosen_.size(), view_.shown.width, view_.shown.height);
      DrawFrames([&](const FrameResult& result, const Picture& picture) {
        sheet.Add(picture, result.number);
      });
      WritePng(options_.out, sheet.picture());
    } else if (EndsWith(options_.out, ".png")) {
      DrawFrames(
          [&](const FrameResult&, const Picture& picture) { WritePng(options_.out, picture); });
    } else {
      FrameFolder folder(options_.out);
      DrawFrames([&](const FrameResult& result, const Picture& picture) {
        WritePng(folder.File(result.number, ".png"), picture);
      });
      folder.Commit();
    }
  }

 private:
  // Runs the whole track, because tracking is a sequence in time, and draws the chosen frames.
  void DrawFrames(const std::function<void(const FrameResult&, const Picture&)>& use) {
    EngineSession session(options_.engine.model, track_.header, options_.engine.mode());
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
  std::vector<std::size_t> chosen_;
  View view_;
  std::unique_ptr<Scene> scene_;
};

void RunRenderCommand(const RenderOptions& options) {
  const SceneParts parts = ParseParts(options);
  CheckMode(options, parts);
  const Track track = ReadTrackFile(options.track);
  const bool sheet = options.contact_sheet > 0;
  if (!EndsWith(options.out, ".png") && (sheet || options.frame)) {
    throw Error("--frame and --contact-sheet make one picture: --out must end in .png");
  }
  if (sheet && options.frame) throw Error("--frame and --contact-sheet exclude each other");
  Drawing(track, options, parts).Run();
  std::printf("%s\n", options.out.c_str());
}

}  // namespace

void AddRenderCommand(CLI::App& app) {
  CLI::App* command = app.add_subcommand(
      "render",
      "Draws a hat and glasses on the faces of a track, placed by the engine's matrices alone; in\n"
      "mask mode the face's dense mesh, plain or under a mask picture.");
  const auto options = std::make_shared<RenderOptions>();
  command->add_option("track", options->track, "Landmark track")
      ->required()
      ->type_name("FILE.track.jsonl");
  command
      ->add_option("--out", options->out,
                   "FILE.png for one picture, FILE.mp4 for a film, anything else is a folder that\n"
                   "gets a picture a frame")
      ->required()
      ->type_name("PATH");
  command
      ->add_option("--image", options->image,
                   "PNG or JPEG drawn behind, as delivered (it is turned like the landmarks)")
      ->type_name("FILE");
  command->add_option("--frame", options->frame, "Number of the frame in a picture")
      ->type_name("N");
  command
      ->add_option("--contact-sheet", options->contact_sheet,
                   "Grid of N evenly spaced frames in one picture (12)")
      ->type_name("N")
      ->expected(0, 1)
      ->default_str("12")
      ->check(CLI::Range(1, 400));
  command->add_option("--every", options->every, "Draw every Nth frame of a film or folder")
      ->type_name("N")
      ->check(CLI::Range(1, 1000000))
      ->capture_default_str();
  command->add_option("--size", options->size, "Box into which a picture, film or tile is fitted")
      ->type_name("WIDTHxHEIGHT");
  command->add_flag("--closeup", options->closeup, "Show the heads alone");
  command
      ->add_option("--draw", options->draw,
                   "What to draw: glasses, hat, axes, landmarks, head (all by default; the head\n"
                   "not on a photo); in mask mode also mesh, wireframe (by default the mesh, and\n"
                   "the head not on a photo)")
      ->delimiter(',')
      ->type_name("LIST")
      ->check(CLI::IsMember({"glasses", "hat", "axes", "landmarks", "head", "mesh", "wireframe"}));
  command
      ->add_option("--texture", options->texture,
                   "PNG or JPEG drawn on the dense mesh of mask mode, in the layout of\n"
                   "data/face_template.png")
      ->type_name("MASK.png");
  AddEngineOptions(*command, options->engine);
  command->footer(
      "The output shows the upright, unmirrored picture, whatever the orientation of the track.\n"
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
