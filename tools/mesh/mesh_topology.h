// SPDX-License-Identifier: MIT
// Connectivity of a mesh.
#pragma once

#include <array>
#include <cstddef>
#include <map>
#include <utility>
#include <vector>

#include "mesh/face_tables.h"

namespace n3ds::tool {

using Edge = std::pair<std::size_t, std::size_t>;

// Triangles at each edge; the edges with the smaller vertex first.
std::map<Edge, std::vector<std::size_t>> EdgeOwners(const std::vector<Triangle>& triangles);

// Edges with one triangle, in the direction in which it runs through them.
std::vector<Edge> BoundaryEdges(const std::vector<Triangle>& triangles);

// Lengths, longest first, of the closed loops that the boundary edges make; empty when they make
// none because a vertex has two ways on.
std::vector<std::size_t> BoundaryLoops(const std::vector<Edge>& edges);

// Pairs of triangles that share an edge.
std::vector<std::array<std::size_t, 2>> Neighbours(const std::vector<Triangle>& triangles);

}  // namespace n3ds::tool
