// SPDX-License-Identifier: MIT
// n3ds model, and n3ds model info: what is in a face-model file, and whether it can serve.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "commands/commands.h"
#include "commands/model_commands.h"
#include "commands/options.h"
#include "model/face_model_file.h"
#include "support/error.h"

namespace n3ds::tool {
namespace {

struct Box {
  Vector3 low{std::numeric_limits<double>::max(), std::numeric_limits<double>::max(),
              std::numeric_limits<double>::max()};
  Vector3 high{std::numeric_limits<double>::lowest(), std::numeric_limits<double>::lowest(),
               std::numeric_limits<double>::lowest()};

  void Add(const Vector3& p) {
    for (std::size_t a = 0; a < 3; ++a) {
      low[a] = std::min(low[a], p[a]);
      high[a] = std::max(high[a], p[a]);
    }
  }
  double Extent(std::size_t axis) const { return high[axis] - low[axis]; }
};

// Largest distance by which each component moves a vertex at coefficient 1, mm.
std::vector<double> LargestMoves(const std::vector<std::int16_t>& basis, std::size_t components) {
  std::vector<double> largest(components, 0.0);
  for (std::size_t c = 0; c < components; ++c) {
    for (std::size_t v = 0; v < kModelVertices; ++v) {
      const std::int16_t* d = &basis[c * kModelCoordinates + 3 * v];
      largest[c] = std::max(largest[c], std::hypot(d[0], d[1], d[2]) / 256.0);
    }
  }
  return largest;
}

template <typename Integer>
void PrintRange(const char* name, const std::vector<Integer>& values) {
  const auto [low, high] = std::minmax_element(values.begin(), values.end());
  std::printf("%s%d to %d\n", name, int{*low}, int{*high});
}

void PrintMoves(const char* name, const std::vector<double>& moves) {
  const auto [low, high] = std::minmax_element(moves.begin(), moves.end());
  std::printf("%s%.2f to %.2f mm at coefficient 1\n", name, *low, *high);
}

void PrintBox(const char* name, const Box& box) {
  std::printf("%sx %.1f to %.1f, y %.1f to %.1f, z %.1f to %.1f mm\n", name, box.low[0],
              box.high[0], box.low[1], box.high[1], box.low[2], box.high[2]);
}

// What keeps a well-formed file from being a usable face; empty when nothing does.
std::vector<std::string> Complaints(const FaceModelFile& model, const Box& face,
                                    const std::vector<double>& identity,
                                    const std::vector<double>& expression) {
  // A face from ear to ear and from hairline to throat, with room for children and giants. Outside
  // of this the unit is probably not the millimetre.
  constexpr double kSmallestExtent = 60;
  constexpr double kLargestExtent = 300;
  std::vector<std::string> complaints;
  const char* const axes[] = {"width", "height", "depth"};
  for (std::size_t a = 0; a < 3; ++a) {
    if (face.Extent(a) < kSmallestExtent || face.Extent(a) > kLargestExtent) {
      char text[96];
      std::snprintf(text, sizeof text, "the mean face's %s of %.1f mm is not that of a face",
                    axes[a], face.Extent(a));
      complaints.emplace_back(text);
    }
  }
  const auto flat = [&](const char* what, const std::vector<double>& moves) {
    for (std::size_t c = 0; c < moves.size(); ++c) {
      if (moves[c] == 0) {
        complaints.push_back(std::string(what) + " component " + std::to_string(c) +
                             " is all zero");
      }
    }
  };
  flat("identity", identity);
  flat("expression", expression);
  const auto at_limit = [](std::int16_t v) {
    return v == std::numeric_limits<std::int16_t>::min() ||
           v == std::numeric_limits<std::int16_t>::max();
  };
  if (std::any_of(model.mean.begin(), model.mean.end(), at_limit)) {
    complaints.emplace_back("the mean face reaches the limit of its number format and is cut off");
  }
  return complaints;
}

void RunModelInfo(const std::string& path) {
  const FaceModelFile model = ReadFaceModelFile(path);
  Box pitched;
  for (std::size_t v = 0; v < kModelVertices; ++v) {
    const std::int16_t* p = &model.mean[3 * v];
    pitched.Add({p[0] / 256.0, p[1] / 256.0, p[2] / 256.0});
  }
  Box upright;
  for (const Vector3& p : MeanFace(model)) upright.Add(p);
  const auto identity = LargestMoves(model.identity, kModelIdentities);
  const auto expression = LargestMoves(model.expression, kModelExpressions);
  const auto zero = [](std::int8_t v) { return v == 0; };
  const auto zeros = std::count_if(model.interaction.begin(), model.interaction.end(), zero);

  std::printf("model         %s\n", path.c_str());
  std::printf("vertices      %zu\n", kModelVertices);
  std::printf("identity      %zu components\n", kModelIdentities);
  PrintRange("  numbers     ", model.identity);
  PrintMoves("  largest     ", identity);
  std::printf("expression    %zu components\n", kModelExpressions);
  PrintRange("  numbers     ", model.expression);
  PrintMoves("  largest     ", expression);
  std::printf("interaction   %zu x %zu components, %.1f %% of the numbers are zero\n",
              kModelIdentities, kModelExpressions,
              100.0 * static_cast<double>(zeros) / static_cast<double>(model.interaction.size()));
  PrintRange("  numbers     ", model.interaction);
  PrintRange("mean numbers  ", model.mean);
  PrintBox("  in the file ", pitched);
  PrintBox("  model frame ", upright);

  const auto complaints = Complaints(model, upright, identity, expression);
  std::printf("verdict       %s\n", complaints.empty() ? "usable" : "not usable");
  if (!complaints.empty()) throw Error(path + ": " + complaints.front());
}

}  // namespace

void AddModelCommand(CLI::App& app) {
  CLI::App* command =
      app.add_subcommand("model", "Looks at face-model files, checks, draws and exports them.");
  command->require_subcommand(1);
  CLI::App* info = command->add_subcommand(
      "info", "Prints counts, ranges and sizes of a face-model file and whether it is usable.");
  const auto path = std::make_shared<std::string>();
  AddFileArgument(*info, "MODEL", *path, "Face-model file");
  info->footer(
      "The box is given as stored (pitched by 20 degrees) and in the upright frame of the "
      "engine's\n"
      "model matrix. The exit code is 1 for a file that is not usable.\n"
      "Example:\n"
      "  n3ds model info data/face_model.bin");
  info->callback([path] { RunModelInfo(*path); });
  AddModelCheckCommand(*command);
  AddModelRenderCommand(*command);
  AddModelExportCommand(*command);
  command->footer(
      "Examples:\n"
      "  n3ds model info data/face_model.bin\n"
      "  n3ds model check data/face_model.bin\n"
      "  n3ds model render data/face_model.bin --out face.png\n"
      "  n3ds model export data/face_model.bin --obj face.obj");
}

}  // namespace n3ds::tool
