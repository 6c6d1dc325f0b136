// SPDX-License-Identifier: MIT
// Measures of a mesh in space: angles, folds, cuts.
#pragma once

#include <array>
#include <cstddef>
#include <vector>

#include "mesh/face_tables.h"

namespace n3ds::tool {

// The smallest angle of each triangle, degrees.
std::vector<double> SmallestAngles(const Points& points, const std::vector<Triangle>& triangles);

struct Facets {
  Points normals;             // unit length; zero for a triangle without area
  std::vector<double> areas;  // mm2
};
Facets MeasureFacets(const Points& points, const std::vector<Triangle>& triangles);

// Angle between normals, in degrees, beyond which skin is folded over. Lips that roll in come to
// 130.
constexpr double kFoldDegrees = 150;

// Looks for folds: places where neighbouring triangles' normals point nearly against each other.
class FoldMeter {
 public:
  explicit FoldMeter(const std::vector<Triangle>& triangles);
  // Largest angle between the normals of neighbours, degrees. A triangle without area counts as
  // folded over.
  double SharpestEdge(const Points& points) const;

 private:
  std::vector<Triangle> triangles_;
  std::vector<std::array<std::size_t, 2>> neighbours_;
};

// Edges that run through a triangle with which they share no vertex.
std::size_t CountCuts(const Points& points, const std::vector<Triangle>& triangles);

}  // namespace n3ds::tool
