// SPDX-License-Identifier: MIT
#include "mesh/mesh_shape.h"

#include <algorithm>
#include <cmath>
#include <initializer_list>
#include <limits>

#include "mesh/mesh_topology.h"
#include "support/vector3.h"

namespace n3ds::tool {
namespace {

constexpr double kDegrees = 57.29577951308232;

struct Box {
  Vector3 low{};
  Vector3 high{};
};

Box BoxOf(std::initializer_list<Vector3> points) {
  Box box{*points.begin(), *points.begin()};
  for (const Vector3& p : points) {
    for (std::size_t k = 0; k < 3; ++k) {
      box.low[k] = std::min(box.low[k], p[k]);
      box.high[k] = std::max(box.high[k], p[k]);
    }
  }
  return box;
}

bool Meet(const Box& a, const Box& b) {
  for (std::size_t k = 0; k < 3; ++k) {
    if (a.low[k] > b.high[k] || b.low[k] > a.high[k]) return false;
  }
  return true;
}

// Whether the way from p to q passes through the triangle (Moeller and Trumbore, "Fast, minimum
// storage ray/triangle intersection", 1997).
bool PassesThrough(const Vector3& p, const Vector3& q, const Vector3& a, const Vector3& b,
                   const Vector3& c) {
  const Vector3 way = q - p;
  const Vector3 ab = b - a;
  const Vector3 ac = c - a;
  const Vector3 h = Cross(way, ac);
  const double determinant = Dot(ab, h);
  if (std::abs(determinant) < 1e-9) return false;  // along the triangle: other edges tell
  const Vector3 ap = p - a;
  const double u = Dot(ap, h) / determinant;
  const Vector3 g = Cross(ap, ab);
  const double v = Dot(way, g) / determinant;
  const double s = Dot(ac, g) / determinant;
  return u >= 0 && v >= 0 && u + v <= 1 && s >= 0 && s <= 1;
}

}  // namespace

std::vector<double> SmallestAngles(const Points& points, const std::vector<Triangle>& triangles) {
  std::vector<double> smallest;
  for (const Triangle& t : triangles) {
    double least = std::numeric_limits<double>::max();
    for (std::size_t k = 0; k < 3; ++k) {
      const Vector3 a = points[t[(k + 1) % 3]] - points[t[k]];
      const Vector3 b = points[t[(k + 2) % 3]] - points[t[k]];
      least = std::min(least, kDegrees * std::atan2(Length(Cross(a, b)), Dot(a, b)));
    }
    smallest.push_back(least);
  }
  return smallest;
}

Facets MeasureFacets(const Points& points, const std::vector<Triangle>& triangles) {
  Facets facets;
  for (const Triangle& t : triangles) {
    Vector3 normal = Cross(points[t[1]] - points[t[0]], points[t[2]] - points[t[0]]);
    const double length = Length(normal);
    if (length > 0) {
      for (double& value : normal) value /= length;
    }
    facets.normals.push_back(normal);
    facets.areas.push_back(0.5 * length);
  }
  return facets;
}

FoldMeter::FoldMeter(const std::vector<Triangle>& triangles)
    : triangles_(triangles), neighbours_(Neighbours(triangles)) {}

double FoldMeter::SharpestEdge(const Points& points) const {
  const Facets facets = MeasureFacets(points, triangles_);
  double least = 1;
  for (const auto& [one, other] : neighbours_) {
    const bool empty = facets.areas[one] == 0 || facets.areas[other] == 0;
    least = std::min(least, empty ? -1 : Dot(facets.normals[one], facets.normals[other]));
  }
  return kDegrees * std::acos(std::max(least, -1.0));
}

std::size_t CountCuts(const Points& points, const std::vector<Triangle>& triangles) {
  std::vector<Box> boxes;
  boxes.reserve(triangles.size());
  for (const Triangle& t : triangles) {
    boxes.push_back(BoxOf({points[t[0]], points[t[1]], points[t[2]]}));
  }
  std::size_t cuts = 0;
  for (const auto& [edge, owners] : EdgeOwners(triangles)) {
    const auto [a, b] = edge;
    const Box box = BoxOf({points[a], points[b]});
    for (std::size_t t = 0; t < triangles.size(); ++t) {
      const Triangle& other = triangles[t];
      if (!Meet(box, boxes[t])) continue;
      if (std::find(other.begin(), other.end(), a) != other.end()) continue;
      if (std::find(other.begin(), other.end(), b) != other.end()) continue;
      if (PassesThrough(points[a], points[b], points[other[0]], points[other[1]],
                        points[other[2]])) {
        ++cuts;
      }
    }
  }
  return cuts;
}

}  // namespace n3ds::tool
