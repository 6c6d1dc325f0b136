// SPDX-License-Identifier: MIT
// From the delivered image's landmarks to the upright, unmirrored ones.
#include <algorithm>
#include <utility>

#include "norvale_face_shape_imp.h"
#include "platform/integer_arithmetic.h"

namespace {

// Landmarks k and sum - k change places in a mirror, for k from first to last.
struct MirrorRun {
  int first, last, sum;
};

// The other landmarks lie on the midline: 9, 78, 84, 89, 93 and 97 to 100.
// clang-format off
constexpr MirrorRun kMirrorRuns[] = {
    { 0,  8,  18},                // outline
    {19, 24,  53}, {25, 28,  63}, // brows
    {39, 45,  96}, {46, 50, 108}, // eyes
    {63, 68, 137},                // nose
    {75, 77, 156}, {82, 83, 168}, // outer lip
    {87, 88, 178}, {92, 92, 186}, // inner lip
    {95, 95, 191},                // pupils
};

// The landmarks that only the 165-point layout has.
constexpr MirrorRun kMirrorRuns165[] = {
    {101, 101, 203},                  // pupils again
    {103, 111, 223},                  // between outline points
    {121, 126, 259}, {127, 132, 271}, // between eye points
    {145, 147, 295}, {151, 153, 307}, // between outer-lip points
    {157, 158, 317}, {161, 162, 325}, // between inner-lip points
};
// clang-format on

template <size_t kCount>
void SwapPairs(const MirrorRun (&runs)[kCount], unsigned int count, int32_t* points) {
  for (const MirrorRun& run : runs) {
    for (int k = run.first; k <= run.last; ++k) {
      const int partner = run.sum - k;
      if (static_cast<unsigned int>(std::max(k, partner)) >= count) continue;
      std::swap(points[2 * k], points[2 * partner]);
      std::swap(points[2 * k + 1], points[2 * partner + 1]);
    }
  }
}

}  // namespace

int CNorvaleFaceShapeImp::TransformInputInfo(NSVL_OFFSCREEN* image, unsigned int count,
                                             __tag_point* points, N3DS_LANDMARK& out) const {
  if (points == nullptr || count == 0 || image == nullptr) return 0;
  const int32_t width = image->width;
  const int32_t height = image->height;
  const bool mirrored = mirror == 1;
  for (unsigned int i = 0; i < count; ++i) {
    // The full width and height, not one less: column 0 maps to column `width`.
    const int32_t x = mirrored ? n3ds::WrapSubtract(width, points[i].x) : points[i].x;
    const int32_t y = points[i].y;
    int32_t* to = out.points + 2 * static_cast<size_t>(i);
    switch (degree) {
      case 0:
        to[0] = x;
        to[1] = y;
        break;
      case 90:
        to[0] = n3ds::WrapSubtract(height, y);
        to[1] = x;
        break;
      case 270:
        to[0] = y;
        to[1] = n3ds::WrapSubtract(width, x);
        break;
      default:  // 180 and every other value
        to[0] = n3ds::WrapSubtract(width, x);
        to[1] = n3ds::WrapSubtract(height, y);
        break;
    }
  }
  if (mirrored) {
    SwapPairs(kMirrorRuns, count, out.points);
    if (count == N3DS_LANDMARKS_165) SwapPairs(kMirrorRuns165, count, out.points);
  }
  return 1;
}
