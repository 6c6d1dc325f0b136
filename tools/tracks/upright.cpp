// SPDX-License-Identifier: MIT
#include "tracks/upright.h"

#include <cstddef>

namespace n3ds::tool {
namespace {

// Runs of the layout that mirroring reverses: every landmark from `first` to `last` changes places
// with `sum` minus itself. A run holds both sides, or the side at image left of a pair of runs.
struct MirrorRun {
  int first;
  int last;
  int sum;
};

// clang-format off
constexpr MirrorRun kMirrorRuns[] = {
    {0, 18, 18},                         // outline
    {19, 24, 53},    {25, 28, 63},       // brows: upper edge, lower edge
    {39, 45, 96},    {46, 50, 108},      // eyes: upper lid, lower lid
    {63, 74, 137},                       // nose
    {75, 81, 156},   {82, 86, 168},      // outer lip: upper edge, lower edge
    {87, 91, 178},   {92, 94, 186},      // inner lip
    {95, 96, 191},                       // pupils
    // The layout of 165 alone:
    {101, 102, 203},                     // pupils again
    {103, 120, 223},                     // between outline landmarks
    {121, 126, 259}, {127, 132, 271},    // between eye landmarks
    {145, 150, 295}, {151, 156, 307},    // between outer lip landmarks
    {157, 160, 317}, {161, 164, 325},    // between inner lip landmarks
};
// clang-format on

bool Contains(const MirrorRun& run, int landmark) {
  return landmark >= run.first && landmark <= run.last;
}

}  // namespace

PixelPoint ToUpright(const TrackHeader& header, double x, double y) {
  const double w = header.width;
  const double h = header.height;
  if (header.mirror == 1) x = w - x;
  switch (header.degree) {
    case 0:
      return {x, y};
    case 90:
      return {h - y, x};
    case 270:
      return {y, w - x};
    default:
      return {w - x, h - y};
  }
}

int MirrorLandmark(int landmark, int landmarks) {
  for (const MirrorRun& run : kMirrorRuns) {
    if (run.first >= landmarks) break;
    const int partner = run.sum - landmark;
    if (Contains(run, landmark) || Contains(run, partner)) return partner;
  }
  return landmark;
}

std::vector<PixelPoint> UprightLandmarks(const TrackHeader& header, const TrackFace& face) {
  std::vector<PixelPoint> upright(face.points.size() / 2);
  for (std::size_t k = 0; k < upright.size(); ++k) {
    const int landmark = static_cast<int>(k);
    const int place = header.mirror == 1 ? MirrorLandmark(landmark, header.landmarks) : landmark;
    upright[static_cast<std::size_t>(place)] =
        ToUpright(header, face.points[2 * k], face.points[2 * k + 1]);
  }
  return upright;
}

}  // namespace n3ds::tool
