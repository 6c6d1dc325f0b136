// SPDX-License-Identifier: MIT
#include "mesh/mesh_topology.h"

#include <algorithm>
#include <functional>

namespace n3ds::tool {

std::map<Edge, std::vector<std::size_t>> EdgeOwners(const std::vector<Triangle>& triangles) {
  std::map<Edge, std::vector<std::size_t>> owners;
  for (std::size_t t = 0; t < triangles.size(); ++t) {
    for (std::size_t k = 0; k < 3; ++k) {
      owners[std::minmax(triangles[t][k], triangles[t][(k + 1) % 3])].push_back(t);
    }
  }
  return owners;
}

std::vector<Edge> BoundaryEdges(const std::vector<Triangle>& triangles) {
  const auto owners = EdgeOwners(triangles);
  std::vector<Edge> edges;
  for (const Triangle& t : triangles) {
    for (std::size_t k = 0; k < 3; ++k) {
      const Edge edge(t[k], t[(k + 1) % 3]);
      if (owners.at(std::minmax(edge.first, edge.second)).size() == 1) edges.push_back(edge);
    }
  }
  return edges;
}

std::vector<std::size_t> BoundaryLoops(const std::vector<Edge>& edges) {
  std::map<std::size_t, std::size_t> after(edges.begin(), edges.end());
  if (after.size() != edges.size()) return {};
  std::vector<std::size_t> loops;
  while (!after.empty()) {
    const std::size_t start = after.begin()->first;
    std::size_t length = 0;
    std::size_t v = start;
    for (auto next = after.find(v); next != after.end(); next = after.find(v)) {
      v = next->second;
      after.erase(next);
      ++length;
    }
    if (v != start) return {};
    loops.push_back(length);
  }
  std::sort(loops.begin(), loops.end(), std::greater<>());
  return loops;
}

std::vector<std::array<std::size_t, 2>> Neighbours(const std::vector<Triangle>& triangles) {
  std::vector<std::array<std::size_t, 2>> pairs;
  for (const auto& [edge, owners] : EdgeOwners(triangles)) {
    if (owners.size() == 2) pairs.push_back({owners[0], owners[1]});
  }
  return pairs;
}

}  // namespace n3ds::tool
