// SPDX-License-Identifier: MIT
#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <set>
#include <string>

#include "eval/text_table.h"
#include "mesh/face_tables.h"
#include "mesh/mesh_topology.h"
#include "model/face_shapes.h"
#include "model/model_checks.h"
#include "support/statistics.h"
#include "support/vector3.h"

namespace n3ds::tool {
namespace {

constexpr double kSame = 5e-7;  // the table has six decimals
constexpr std::array<Place, 3> kFirstPlaces = {
    {{0.069524, 0.281949}, {0.081158, 0.319456}, {0.038178, 0.318155}}};
constexpr Place kLow = {0.016646, 0.002930};
constexpr Place kHigh = {0.983246, 0.997054};
constexpr double kLargestStretchRatio = 2;  // of the two directions, for 95 % of the triangles

bool Same(const Place& a, const Place& b) {
  return std::abs(a[0] - b[0]) < kSame && std::abs(a[1] - b[1]) < kSame;
}

// Twice the area that a, b and c enclose, positive when counter-clockwise with v downwards.
double TwiceArea(const Place& a, const Place& b, const Place& c) {
  return (c[0] - a[0]) * (b[1] - a[1]) - (b[0] - a[0]) * (c[1] - a[1]);
}

// Whether the ways from a to b and from c to d cross.
bool DoCross(const Place& a, const Place& b, const Place& c, const Place& d) {
  return TwiceArea(a, b, c) * TwiceArea(a, b, d) < 0 && TwiceArea(c, d, a) * TwiceArea(c, d, b) < 0;
}

std::size_t CountCrossings(const std::vector<Edge>& border) {
  const std::vector<Place>& uv = FaceTexture();
  std::size_t crossings = 0;
  for (std::size_t i = 0; i < border.size(); ++i) {
    for (std::size_t j = i + 1; j < border.size(); ++j) {
      if (DoCross(uv[border[i].first], uv[border[i].second], uv[border[j].first],
                  uv[border[j].second])) {
        ++crossings;
      }
    }
  }
  return crossings;
}

struct Stretch {
  double larger;
  double smaller;
};

// Of a triangle without area in space.
constexpr Stretch kTorn = {std::numeric_limits<double>::infinity(), 0};

// How much the layout enlarges a triangle along its two principal directions: singular values of
// the map from the triangle's own plane to the texture.
Stretch StretchOf(const Triangle& t, const Points& points) {
  const Vector3 ab = points[t[1]] - points[t[0]];
  const Vector3 ac = points[t[2]] - points[t[0]];
  const double base = Length(ab);
  if (base == 0) return kTorn;
  const double along = Dot(ab, ac) / base;
  const double height = Length(Cross(ab, ac)) / base;
  if (height == 0) return kTorn;
  const Place& origin = FaceTexture()[t[0]];
  std::array<std::array<double, 2>, 2> map{};  // column by column
  for (std::size_t k = 0; k < 2; ++k) {
    const double first = FaceTexture()[t[1]][k] - origin[k];
    const double second = FaceTexture()[t[2]][k] - origin[k];
    map[0][k] = first / base;
    map[1][k] = (second - along * map[0][k]) / height;
  }
  const double squares =
      map[0][0] * map[0][0] + map[0][1] * map[0][1] + map[1][0] * map[1][0] + map[1][1] * map[1][1];
  const double area = std::abs(map[0][0] * map[1][1] - map[0][1] * map[1][0]);
  const double sum = std::sqrt(squares + 2 * area);
  const double difference = std::sqrt(std::max(squares - 2 * area, 0.0));
  return {(sum + difference) / 2, (sum - difference) / 2};
}

void ReportStretch(const FaceModelFile& model, CheckReport& report) {
  const Points points = MeanFace(model);
  double texture_area = 0;
  double skin_area = 0;
  std::vector<double> larger;
  std::vector<double> smaller;
  std::vector<double> ratio;
  for (const Triangle& t : FaceTriangles()) {
    const Place* uv = FaceTexture().data();
    texture_area += TwiceArea(uv[t[0]], uv[t[1]], uv[t[2]]);
    skin_area += Length(Cross(points[t[1]] - points[t[0]], points[t[2]] - points[t[0]]));
    const Stretch stretch = StretchOf(t, points);
    larger.push_back(stretch.larger);
    smaller.push_back(stretch.smaller);
    ratio.push_back(stretch.larger / stretch.smaller);
  }
  const double usual = std::sqrt(texture_area / skin_area);
  for (const int percent : {5, 50, 95}) {
    const double low = Percentile(smaller, percent / 100.0) / usual;
    const double high = Percentile(larger, percent / 100.0) / usual;
    report.Figure("smaller and larger stretch, percentile " + std::to_string(percent) + " (mean 1)",
                  Decimal(low, 2) + ", " + Decimal(high, 2));
  }
  report.Figure("ratio of the two, median", Decimal(Percentile(ratio, 0.5), 2));
  report.Below("ratio of the two, 95th percentile", Percentile(ratio, 0.95), 2,
               kLargestStretchRatio);
}

}  // namespace

void CheckTexture(const FaceModelFile& model, CheckReport& report) {
  report.Section("Texture");
  const std::vector<Place>& uv = FaceTexture();
  report.Equal("distinct places", std::set<Place>(uv.begin(), uv.end()).size(), kModelVertices);
  report.Check("first three places, part of the file format", "",
               std::equal(kFirstPlaces.begin(), kFirstPlaces.end(), uv.begin(), Same));
  Place low = uv[0];
  Place high = uv[0];
  for (const Place& place : uv) {
    for (std::size_t k = 0; k < 2; ++k) {
      low[k] = std::min(low[k], place[k]);
      high[k] = std::max(high[k], place[k]);
    }
  }
  report.Check("u from 0.016646 to 0.983246, v from 0.002930 to 0.997054", "",
               Same(low, kLow) && Same(high, kHigh));
  std::size_t turned = 0;
  double covered = 0;
  for (const Triangle& t : FaceTriangles()) {
    const double area = TwiceArea(uv[t[0]], uv[t[1]], uv[t[2]]);
    covered += area;
    if (area <= 0) ++turned;
  }
  report.Equal("triangles turned over or empty", turned, 0);
  // Without overlaps the triangles add up to what their border encloses.
  const std::vector<Edge> border = BoundaryEdges(FaceTriangles());
  double enclosed = 0;
  for (const auto& [a, b] : border) enclosed += TwiceArea({0, 0}, uv[a], uv[b]);
  report.Check("area against that inside the borders", Decimal(covered / enclosed, 9),
               std::abs(covered / enclosed - 1) < 1e-9, "= 1");
  report.Equal("border edges that cross", CountCrossings(border), 0);
  ReportStretch(model, report);
}

}  // namespace n3ds::tool
