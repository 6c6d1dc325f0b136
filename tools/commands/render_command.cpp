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
#include "commands/frames.h"
#include "commands/options.h"
#include "engine/engine_session.h"
#include "render/contact_sheet.h"
#include "render/picture.h"
#include "render/scene.h"
#include "render/video_writer.h"
#include "support/progress.h"
#include "tracks/track_file.h"

namespace n3ds::tool {
namespace {

constexpr int kLargestSide = 8192;
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
};

bool EndsWith(const std::string& text, const std::string& ending) {
  return text.size() >= ending.size() &&
         text.compare(text.size() - ending.size(), ending.size(), ending) == 0;
}

struct Size {
  int width = 0;
  int height = 0;
};

// "640x360" as a box, or nothing.
std::optional<Size> ParseSize(const std::string& text) {
  if (text.empty()) return std::nullopt;
  Size size;
  char rest = 0;
  if (std::sscanf(text.c_str(), "%dx%d%c", &size.width, &size.height, &rest) != 2 ||
      size.width < 16 || size.height < 16 || size.width > kLargestSide ||
      size.height > kLargestSide) {
    throw Error("--size " + text + ": WIDTHxHEIGHT from 16x16 to 8192x8192 is needed");
  }
  return size;
}

// The largest size with the track's proportions inside the box; without a box, the picture's own
// size, reduced to `default_side`.
Size FitInto(const TrackHeader& header, const std::optional<Size>& box, int default_side) {
  const double w = header.upright_width();
  const double h = header.upright_height();
  const double scale = box ? std::min(box->width / w, box->height / h)
                           : std::min(1.0, default_side / std::max(w, h));
  return {std::max(1, static_cast<int>(std::lround(w * scale))),
          std::max(1, static_cast<int>(std::lround(h * scale)))};
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

// Runs the whole track, because tracking is a sequence in time, and draws the chosen frames
// (indices in ascending order).
void DrawFrames(const Track& track, const RenderOptions& options, Scene& scene,
                const std::vector<std::size_t>& chosen,
                const std::function<void(const FrameResult&, const Picture&)>& use) {
  EngineSession session(options.engine.model, track.header, options.engine.mode());
  Progress progress("drawing " + track.name, chosen.size());
  std::size_t next = 0;
  for (std::size_t f = 0; f < track.frames.size() && next < chosen.size(); ++f) {
    const FrameResult result = session.Process(track.frames[f]);
    if (f != chosen[next]) continue;
    CheckFrame(options.track, result);
    use(result, scene.Draw(result, session.texture_coordinates()));
    progress.Step();
    ++next;
  }
}

std::vector<std::size_t> EveryNth(const Track& track, std::size_t every) {
  std::vector<std::size_t> chosen;
  for (std::size_t f = 0; f < track.frames.size(); f += every) chosen.push_back(f);
  return chosen;
}

void RenderPicture(const Track& track, const RenderOptions& options, Scene& scene) {
  DrawFrames(track, options, scene, {ChosenFrame(track, options.track, options.frame)},
             [&](const FrameResult&, const Picture& picture) { WritePng(options.out, picture); });
}

void RenderContactSheet(const Track& track, const RenderOptions& options, Scene& scene,
                        const Size& size) {
  const auto chosen = EvenlySpaced(track.frames.size(), options.contact_sheet);
  ContactSheet sheet(chosen.size(), size.width, size.height);
  DrawFrames(track, options, scene, chosen, [&](const FrameResult& result, const Picture& picture) {
    sheet.Add(picture, result.number);
  });
  WritePng(options.out, sheet.picture());
}

void RenderFilm(const Track& track, const RenderOptions& options, Scene& scene, const Size& size) {
  VideoWriter film(options.out, size.width, size.height,
                   track.header.fps / static_cast<double>(options.every));
  DrawFrames(track, options, scene, EveryNth(track, options.every),
             [&](const FrameResult&, const Picture& picture) { film.Add(picture); });
  film.Finish();
}

void RenderFolder(const Track& track, const RenderOptions& options, Scene& scene) {
  MakeFolder(options.out);
  DrawFrames(track, options, scene, EveryNth(track, options.every),
             [&](const FrameResult& result, const Picture& picture) {
               WritePng(options.out + FrameName(result.number, ".png"), picture);
             });
}

void RunRenderCommand(const RenderOptions& options) {
  const SceneParts parts = ParseParts(options);
  CheckMode(options, parts);
  const Track track = ReadTrackFile(options.track);
  const bool png = EndsWith(options.out, ".png");
  const bool film = EndsWith(options.out, ".mp4");
  const bool sheet = options.contact_sheet > 0;
  if (!png && (sheet || options.frame)) {
    throw Error("--frame and --contact-sheet make one picture: --out must end in .png");
  }
  if (sheet && options.frame) throw Error("--frame and --contact-sheet exclude each other");

  Size size = FitInto(track.header, ParseSize(options.size), sheet ? kDefaultTile : kDefaultSide);
  if (film) {
    // The film's format halves the colour's resolution.
    size.width = std::max(2, size.width / 2 * 2);
    size.height = std::max(2, size.height / 2 * 2);
  }
  std::optional<Picture> mask;
  if (!options.texture.empty()) mask = ReadPicture(options.texture);
  Scene scene(track.header, options.engine.model, parts, LoadBackground(options, track.header),
              size.width, size.height, mask);
  if (film) {
    RenderFilm(track, options, scene, size);
  } else if (sheet) {
    RenderContactSheet(track, options, scene, size);
  } else if (png) {
    RenderPicture(track, options, scene);
  } else {
    RenderFolder(track, options, scene);
  }
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
