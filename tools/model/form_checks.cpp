// SPDX-License-Identifier: MIT
#include <algorithm>
#include <array>
#include <cstdlib>
#include <set>
#include <string>

#include "eval/text_table.h"
#include "mesh/face_tables.h"
#include "mesh/mesh_topology.h"
#include "model/model_checks.h"

namespace n3ds::tool {
namespace {

constexpr std::size_t kCandidateCount = 534;
// A disc with three holes, the eyes and the mouth.
constexpr std::size_t kBoundaryLength = 172;
constexpr std::size_t kBoundaryLoops = 4;
// Masks are made for these rows: they pin the numbering down.
constexpr std::array<Triangle, 8> kFirstTriangles = {
    {{0, 2, 1}, {1, 3, 0}, {4, 3, 1}, {4, 1, 2}, {5, 7, 6}, {8, 6, 7}, {0, 3, 9}, {9, 3, 10}}};

std::string Join(const std::vector<std::size_t>& numbers) {
  std::string text;
  for (const std::size_t n : numbers) text += (text.empty() ? "" : " ") + std::to_string(n);
  return text;
}

std::vector<std::size_t> VerticesRound(std::size_t middle, const std::vector<Triangle>& triangles) {
  std::set<std::size_t> around;
  for (const Triangle& t : triangles) {
    if (std::find(t.begin(), t.end(), middle) != t.end()) around.insert(t.begin(), t.end());
  }
  around.erase(middle);
  return {around.begin(), around.end()};
}

}  // namespace

void CheckForm(const FaceModelFile& model, CheckReport& report) {
  report.Section("Form");
  const std::vector<Triangle>& triangles = FaceTriangles();
  report.Equal("triangles", triangles.size(), kMeshTriangles);
  std::set<std::size_t> used;
  for (const Triangle& t : triangles) used.insert(t.begin(), t.end());
  report.Equal("vertices in use", used.size(), kModelVertices);
  report.Check("first eight triangles, part of the file format", "",
               std::equal(kFirstTriangles.begin(), kFirstTriangles.end(), triangles.begin()));
  const std::vector<std::size_t> round_one = VerticesRound(1, triangles);
  report.Check("neighbours of vertex 1", Join(round_one),
               round_one == std::vector<std::size_t>({0, 2, 3, 4}), "= 0 2 3 4");
  std::size_t most = 0;
  for (const auto& [edge, owners] : EdgeOwners(triangles)) most = std::max(most, owners.size());
  report.Equal("triangles at an edge, at most", most, 2);
  const std::vector<Edge> border = BoundaryEdges(triangles);
  const std::vector<std::size_t> loops = BoundaryLoops(border);
  report.Equal("boundary edges", border.size(), kBoundaryLength);
  report.Check("their loops", Join(loops), loops.size() == kBoundaryLoops, "4 loops");
  const auto& candidates = ContourCandidates();
  report.Equal("distinct contour candidates",
               std::set<std::size_t>(candidates.begin(), candidates.end()).size(), kCandidateCount);
  int largest = 0;
  for (const std::int16_t value : model.mean) largest = std::max(largest, std::abs(int{value}));
  report.Below("largest coordinate of the mean, mm", largest / 256.0, 2, 127.99);
}

}  // namespace n3ds::tool
