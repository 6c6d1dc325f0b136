// SPDX-License-Identifier: MIT
// From the delivered picture's landmarks to the upright, unmirrored ones.
#include "math/integer_arithmetic.h"
#include "norvale_face_shape_imp.h"

namespace {

struct LandmarkPair {
  uint8_t a;
  uint8_t b;
};

// Landmarks that change places in a mirror. The rest lie on the middle line: 9, 78, 84, 89, 93 and
// 97 to 100.
constexpr LandmarkPair kMirrorPairs[] = {
    // outline
    {0, 18},
    {1, 17},
    {2, 16},
    {3, 15},
    {4, 14},
    {5, 13},
    {6, 12},
    {7, 11},
    {8, 10},
    // brows
    {19, 34},
    {20, 33},
    {21, 32},
    {22, 31},
    {23, 30},
    {24, 29},  //
    {25, 38},
    {26, 37},
    {27, 36},
    {28, 35},
    // eyes
    {39, 57},
    {40, 56},
    {41, 55},
    {42, 54},
    {43, 53},
    {44, 52},  //
    {45, 51},
    {46, 62},
    {47, 61},
    {48, 60},
    {49, 59},
    {50, 58},
    // nose
    {63, 74},
    {64, 73},
    {65, 72},
    {66, 71},
    {67, 70},
    {68, 69},
    // lips
    {75, 81},
    {76, 80},
    {77, 79},
    {82, 86},
    {83, 85},  //
    {87, 91},
    {88, 90},
    {92, 94},
    // pupils
    {95, 96},
};

// The further pairs of the 165-point layout.
constexpr LandmarkPair kMirrorPairs165[] = {
    // pupils again
    {101, 102},
    // between outline points
    {103, 120},
    {104, 119},
    {105, 118},
    {106, 117},
    {107, 116},  //
    {108, 115},
    {109, 114},
    {110, 113},
    {111, 112},
    // between eye points
    {121, 138},
    {122, 137},
    {123, 136},
    {124, 135},
    {125, 134},
    {126, 133},  //
    {127, 144},
    {128, 143},
    {129, 142},
    {130, 141},
    {131, 140},
    {132, 139},
    // between lip points
    {145, 150},
    {146, 149},
    {147, 148},
    {151, 156},
    {152, 155},
    {153, 154},  //
    {157, 160},
    {158, 159},
    {161, 164},
    {162, 163},
};

template <size_t kCount>
void SwapPairs(const LandmarkPair (&pairs)[kCount], unsigned int count, int32_t* points) {
  for (const LandmarkPair& pair : pairs) {
    if (pair.a >= count || pair.b >= count) continue;
    for (int axis = 0; axis < 2; axis++) {
      const int32_t kept = points[2 * pair.a + axis];
      points[2 * pair.a + axis] = points[2 * pair.b + axis];
      points[2 * pair.b + axis] = kept;
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
  for (unsigned int i = 0; i < count; i++) {
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
      default:  // 180, and whatever else a host passes
        to[0] = n3ds::WrapSubtract(width, x);
        to[1] = n3ds::WrapSubtract(height, y);
        break;
    }
  }
  if (mirrored) {
    SwapPairs(kMirrorPairs, count, out.points);
    if (count == N3DS_LANDMARKS_165) SwapPairs(kMirrorPairs165, count, out.points);
  }
  return 1;
}
