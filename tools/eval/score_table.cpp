// SPDX-License-Identifier: MIT
#include "eval/score_table.h"

#include "support/statistics.h"

namespace n3ds::tool {
namespace {

constexpr double kYawLimits[] = {20, 40, 60};

std::vector<double> Across(const Score& score) {
  std::vector<double> values;
  for (const PoseError& error : score.errors) values.push_back(error.across);
  return values;
}

std::vector<double> Depth(const Score& score) {
  std::vector<double> values;
  for (const PoseError& error : score.errors) values.push_back(error.depth);
  return values;
}

// "-" where there is nothing to judge.
std::string Cell(const std::vector<double>& sample, double fraction, int decimals) {
  return sample.empty() ? "-" : Decimal(Percentile(sample, fraction), decimals);
}

std::vector<std::string> Row(const std::string& name, const Score& score) {
  std::vector<std::string> row = {name, std::to_string(score.faces), std::to_string(score.lost),
                                  std::to_string(score.swaps), std::to_string(score.jumps)};
  for (const double limit : kYawLimits) {
    const std::vector<double> errors = score.RotationErrors(limit);
    row.push_back(Cell(errors, 0.5, 2));
    row.push_back(Cell(errors, 0.95, 2));
  }
  row.push_back(Cell(Across(score), 0.5, 1));
  row.push_back(Cell(Across(score), 0.95, 1));
  row.push_back(Cell(Depth(score), 0.5, 1));
  row.push_back(Cell(Depth(score), 0.95, 1));
  const bool rested = !score.rest_rotation.empty();
  row.push_back(rested ? Decimal(RootMeanSquare(score.rest_rotation), 3) : "-");
  row.push_back(rested ? Decimal(RootMeanSquare(score.rest_across), 2) : "-");
  row.push_back(score.turning_moment > 0 ? Decimal(1000 * score.Lag(), 1) : "-");
  return row;
}

std::vector<std::string> MeshCells(const MeshScore& mesh) {
  return {Cell(mesh.distances, 0.5, 2),
          Cell(mesh.distances, 0.95, 2),
          Cell(mesh.true_distances, 0.5, 2),
          Cell(mesh.true_distances, 0.95, 2),
          std::to_string(mesh.not_finite),
          std::to_string(mesh.folded),
          mesh.mouth_seen.empty() ? "-" : Decimal(mesh.MouthGain(), 2)};
}

void Append(const std::vector<std::string>& cells, std::vector<std::string>& row) {
  row.insert(row.end(), cells.begin(), cells.end());
}

}  // namespace

const char kScoreTableLegend[] =
    "faces      face entries with truth\n"
    "lost       no pose, or one turned more than 45 degrees off\n"
    "swaps      pose lies nearer to another person's place than to its own\n"
    "jumps      error changes from one frame to the next by more than 8 degrees, 25 mm across or\n"
    "           15 % of the depth\n"
    "rotN, p95  rotation error in degrees, median and 95th percentile, of the heads turned by at\n"
    "           most N degrees, after one constant offset between the head frames\n"
    "across     offset of the head's origin parallel to the image, mm\n"
    "depth      error of the distance in percent, for the true focal length\n"
    "jit        root mean square of the error's change between frames, in degrees and mm, while\n"
    "           the head turns by less than 15 degrees and moves by less than 60 mm a second\n"
    "lag        by which the rotation trails the true one, ms\n";

const char kMeshColumnsLegend[] =
    "mesh       distance of the inner landmarks to their vertices of the dense mesh in the\n"
    "           image, percent of the interpupillary distance, median and 95th percentile\n"
    "           over the heads turned by at most 40 degrees\n"
    "true       the same from where the landmarks truly are, in the frames that tell it\n"
    "broken     faces with a mesh that is not finite\n"
    "folded     faces with a triangle turned over, by more than 150 degrees against a neighbour "
    "or\n"
    "           the mean face\n"
    "mouth      how far the mesh's mouth opens where the landmarks' opens by one\n";

std::vector<std::size_t> MainColumns(bool with_meshes) {
  // track, faces, lost, swaps, jumps; rot40, p95; medians of across and depth; jit deg, jit mm, lag
  std::vector<std::size_t> columns = {0, 1, 2, 3, 4, 7, 8, 11, 13, 15, 16, 17};
  // mesh, p95, broken, folded, mouth
  if (with_meshes) columns.insert(columns.end(), {18, 19, 22, 23, 24});
  return columns;
}

TextTable ScoreTable(const NamedScores& scores, const std::vector<MeshScore>& meshes) {
  std::vector<std::string> head = {"track", "faces", "lost", "swaps",   "jumps",  "rot20",
                                   "p95",   "rot40", "p95",  "rot60",   "p95",    "across",
                                   "p95",   "depth", "p95",  "jit deg", "jit mm", "lag"};
  if (!meshes.empty()) Append({"mesh", "p95", "true", "p95", "broken", "folded", "mouth"}, head);
  TextTable table(head);
  Score all;
  MeshScore all_meshes;
  for (std::size_t k = 0; k < scores.size(); ++k) {
    std::vector<std::string> row = Row(scores[k].first, scores[k].second);
    all.Add(scores[k].second);
    if (!meshes.empty()) {
      Append(MeshCells(meshes[k]), row);
      all_meshes.Add(meshes[k]);
    }
    table.AddRow(row);
  }
  if (scores.size() > 1) {
    std::vector<std::string> row = Row("all", all);
    if (!meshes.empty()) Append(MeshCells(all_meshes), row);
    table.AddRow(row);
  }
  return table;
}

}  // namespace n3ds::tool
