// SPDX-License-Identifier: MIT
#include "mask/warp_face.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <utility>

#include "core/model_tables.h"
#include "platform/integer_arithmetic.h"
#include "platform/simd.h"

namespace n3ds {
namespace {

// Barycentric weights of a span's end pixels may leave 0..1 by this much; pixels further out belong
// to a neighbouring triangle.
constexpr float kLowestWeight = -0.0001f;
constexpr float kHighestWeight = 1.0001f;

struct Point {
  float x, y;
};

// A corner with the pixel it falls on.
struct Corner {
  Point at;
  int32_t ix, iy;
};

// Value of a barycentric weight as a linear function of the image point.
struct LinearMap {
  float x, y, constant;
};

int32_t RoundToPixel(float coordinate) { return TruncateToInt32(coordinate + 0.5f); }

// Keeps a coordinate in 0..last. NaN passes through and is rejected by the caller.
float ClampToImage(float value, float last) {
  if (value < 0.0f) value = 0.0f;
  if (value > last) value = last;
  return value;
}

// Position in the texture along one axis of `size` pixels. At the border it is pixel size - 3, from
// where rounding does not take it beyond the last pixel that has a neighbour to blend with.
float ClampToTexture(float value, int32_t size) {
  const int32_t limit = size - 2;
  if (value < 0.0f) value = 0.0f;
  if (value >= static_cast<float>(limit)) value = static_cast<float>(limit - 1);
  return value;
}

struct Camera {
  const float *K, *R, *t;  // 3 x 3, 3 x 3, 3
};

// A point in the camera plane has no projection; it is drawn in the corner of the image.
Point Project(const float* vertex, const Camera& camera) {
  const auto [K, R, t] = camera;
  const float x = vertex[0], y = vertex[1], z = vertex[2];
  const float zc = R[6] * x + R[7] * y + R[8] * z + t[2];
  if (zc == 0.0f) return {0.0f, 0.0f};
  const float xn = (R[0] * x + R[1] * y + R[2] * z + t[0]) / zc;
  const float yn = (R[3] * x + R[4] * y + R[5] * z + t[1]) / zc;
  return {K[0] * xn + K[1] * yn + K[2], K[3] * xn + K[4] * yn + K[5]};
}

// left * (1 - t) + right * t, each product rounded.
F32x4 Mix(F32x4 left, F32x4 right, float t) {
  return left * F32x4::Splat(1.0f - t) + right * F32x4::Splat(t);
}

// The texture's colour at a position between pixel (itx, ity) and its neighbours to the right and
// below, blended. The weights lie outside 0..1 where the position is below 0 by less than a pixel,
// since truncation then gives pixel 0; the result is clamped.
void SampleTexture(const NSVL_OFFSCREEN& texture, int32_t itx, int32_t ity, float fx, float fy,
                   uint8_t* pixel) {
  const uint8_t* upper =
      texture.plane[0] + static_cast<int64_t>(ity) * texture.pitch[0] + int64_t{4} * itx;
  F32x4 left, right;  // a pixel, its channels as lanes
  LoadBytes(upper, &left, &right);
  const F32x4 top = Mix(left, right, fx);
  LoadBytes(upper + texture.pitch[0], &left, &right);
  const F32x4 bottom = Mix(left, right, fx);
  StoreBytes(Mix(top, bottom, fy), pixel);
}

// One triangle of the output, filled from one triangle of the texture.
class TriangleFiller {
 public:
  // `area` is twice the signed area of the image triangle, not 0.
  TriangleFiller(const NSVL_OFFSCREEN& texture, const NSVL_OFFSCREEN& output, int32_t row_pixels,
                 const Point* image, const Point* texture_points, float area)
      : texture_(texture), output_(output), row_pixels_(row_pixels), corners_(texture_points) {
    const auto [x0, y0] = image[0];
    const auto [x1, y1] = image[1];
    const auto [x2, y2] = image[2];
    b1_ = {(y0 - y2) / area, (x2 - x0) / area, (y2 * x0 - y0 * x2) / area};
    b2_ = {(y1 - y0) / area, (x0 - x1) / area, (x1 * y0 - y1 * x0) / area};
  }

  // Fills row r from xl to xr, both included. Only the two ends are tested against the triangle's
  // edges; what lies between them is inside.
  void FillSpan(int32_t r, int32_t xl, int32_t xr) const {
    if (xl > xr || r < 0 || r >= output_.height) return;
    const int32_t first = std::max(xl, 0);
    const int32_t last = std::min(xr, row_pixels_ - 1);
    uint8_t* row = output_.plane[0] + static_cast<int64_t>(r) * output_.pitch[0];

    const float py = static_cast<float>(r) + 0.5f;
    const float b1_row = b1_.y * py;
    const float b2_row = b2_.y * py;
    const int32_t columns = texture_.width - 1;
    const int32_t rows = texture_.height - 1;
    for (int32_t x = first; x <= last; ++x) {
      const float px = static_cast<float>(x) + 0.5f;
      const float b1 = b1_.x * px + b1_row + b1_.constant;
      const float b2 = b2_.x * px + b2_row + b2_.constant;
      if ((x == xl || x == xr) && (b1 < kLowestWeight || b2 < kLowestWeight ||
                                   b1 > kHighestWeight || b2 > kHighestWeight)) {
        continue;
      }
      const float b0 = 1.0f - b1 - b2;
      const float tx = b0 * corners_[0].x + b1 * corners_[1].x + b2 * corners_[2].x;
      const float ty = b0 * corners_[0].y + b1 * corners_[1].y + b2 * corners_[2].y;
      const int32_t itx = TruncateToInt32(tx);
      const int32_t ity = TruncateToInt32(ty);
      if (itx < 0 || itx >= columns || ity < 0 || ity >= rows) continue;
      SampleTexture(texture_, itx, ity, tx - static_cast<float>(itx), ty - static_cast<float>(ity),
                    row + int64_t{4} * x);
    }
  }

 private:
  const NSVL_OFFSCREEN& texture_;
  const NSVL_OFFSCREEN& output_;
  int32_t row_pixels_;
  const Point* corners_;
  LinearMap b1_, b2_;
};

bool IsAbove(const Corner& a, const Corner& b) {
  return a.iy < b.iy || (a.iy == b.iy && a.ix < b.ix);
}

// Top, middle, bottom. Ties keep their order as far as two exchanges allow; this is no stable sort.
void SortFromTop(Corner* corners) {
  int smallest = 0;
  if (IsAbove(corners[1], corners[smallest])) smallest = 1;
  if (IsAbove(corners[2], corners[smallest])) smallest = 2;
  std::swap(corners[0], corners[smallest]);
  if (IsAbove(corners[2], corners[1])) std::swap(corners[1], corners[2]);
}

float Slope(const Point& upper, const Point& lower) {
  return (lower.x - upper.x) / (lower.y - upper.y);
}

// Rows are cut at pixel centres. The bottom row of a triangle is left to its lower neighbour; the
// row of a flat top is drawn by the top case and again by the lower part.
void ScanConvert(Corner* corners, const TriangleFiller& filler, int32_t height) {
  SortFromTop(corners);
  const Corner &top = corners[0], &middle = corners[1], &bottom = corners[2];

  if (top.iy == middle.iy) {
    filler.FillSpan(middle.iy, bottom.at.x < top.at.x ? top.ix - 1 : top.ix,
                    middle.at.x < bottom.at.x ? middle.ix + 1 : middle.ix);
    if (middle.iy == bottom.iy) {
      filler.FillSpan(middle.iy, middle.ix, bottom.ix);
      return;
    }
  } else {
    const float a = Slope(top.at, middle.at);
    const float b = Slope(top.at, bottom.at);
    const float left_step = std::min(a, b);
    const float right_step = std::max(a, b);
    const float d = static_cast<float>(top.iy) + 0.5f - top.at.y;
    float left = top.at.x + left_step * d;
    float right = top.at.x + right_step * d;
    for (int32_t r = top.iy; r < middle.iy && r < height; ++r) {
      filler.FillSpan(r, RoundToPixel(left), RoundToPixel(right));
      left += left_step;
      right += right_step;
    }
    if (middle.iy == bottom.iy) return;
  }

  // From the bottom upwards the edge of the larger slope is the left one.
  const float a = Slope(middle.at, bottom.at);
  const float b = Slope(top.at, bottom.at);
  const float left_step = std::max(a, b);
  const float right_step = std::min(a, b);
  const float d = static_cast<float>(bottom.iy - 1) + 0.5f - bottom.at.y;
  float left = bottom.at.x + left_step * d;
  float right = bottom.at.x + right_step * d;
  for (int32_t r = bottom.iy - 1; r >= middle.iy && r >= 0; --r) {
    filler.FillSpan(r, RoundToPixel(left), RoundToPixel(right));
    left -= left_step;
    right -= right_step;
  }
}

// Where the mask's texture vertices are: the caller's layout, or the engine's own, whose table has
// v pointing down.
struct TextureLayout {
  const float* coordinates;
  const uint16_t* triangles;
  bool v_down;

  // The corners of triangle k in the texture; false for vertices that do not exist.
  bool Place(int k, const NSVL_OFFSCREEN& texture, Point* corners) const {
    for (int c = 0; c < 3; ++c) {
      const uint16_t vertex = triangles[3 * k + c];
      if (vertex >= N3DS_VERTEX_COUNT) return false;
      const float u = coordinates[2 * vertex];
      const float v = v_down ? 1.0f - coordinates[2 * vertex + 1] : coordinates[2 * vertex + 1];
      corners[c] = {
          ClampToTexture(static_cast<float>(texture.width) * u, texture.width),
          ClampToTexture((1.0f - v) * static_cast<float>(texture.height), texture.height)};
    }
    return true;
  }
};

// The corners of the mesh's triangle k in an image of that size; false for NaN and for an image
// without pixels.
bool PlaceInImage(const N3DS_3D_MODEL& model, int k, const Camera& camera, float width,
                  float height, Point* corners) {
  for (int c = 0; c < 3; ++c) {
    const Point p = Project(model.vertices + 3 * model.triangles[3 * k + c], camera);
    const Point clamped = {ClampToImage(p.x, width - 1.0f), ClampToImage(p.y, height - 1.0f)};
    if (!(clamped.x >= 0.0f && clamped.x < width && clamped.y >= 0.0f && clamped.y < height)) {
      return false;
    }
    corners[c] = clamped;
  }
  return true;
}

// Twice the signed area.
float DoubleArea(const Point* corners) {
  const auto [x0, y0] = corners[0];
  const auto [x1, y1] = corners[1];
  const auto [x2, y2] = corners[2];
  return x1 * y0 - x1 * y2 + x0 * y2 - x0 * y1 + x2 * y1 - x2 * y0;
}

}  // namespace

MRESULT WarpFace(const N3DS_3D_MODEL& model, const N3DS_2D_TEXTURE_MASK& mask, const float* K,
                 const float* R, const float* t, const NSVL_OFFSCREEN& output) {
  TextureLayout layout = {&kTextureCoordinates[0][0], &kTriangles[0][0], true};
  if (mask.texCoords != nullptr && mask.triangles != nullptr) {
    if (mask.texCoordCount != N3DS_VERTEX_COUNT || mask.triangleCount != N3DS_TRIANGLE_COUNT) {
      return N3DS_BAD_VALUE;
    }
    layout = {mask.texCoords, mask.triangles, false};
  }

  // The buffer has pitch x height bytes, whatever width its descriptor claims.
  const int32_t row_pixels = std::min(output.width, output.pitch[0] / 4);
  const float width = static_cast<float>(output.width);
  const float height = static_cast<float>(output.height);
  for (int k = 0; k < N3DS_TRIANGLE_COUNT; ++k) {
    Point texture_points[3];
    Point image[3];
    if (!layout.Place(k, mask.image, texture_points)) continue;
    if (!PlaceInImage(model, k, {K, R, t}, width, height, image)) continue;
    const float area = DoubleArea(image);
    if (area == 0.0f) continue;

    Corner corners[3];
    for (int c = 0; c < 3; ++c) {
      corners[c] = {image[c], RoundToPixel(image[c].x), RoundToPixel(image[c].y)};
    }
    ScanConvert(corners, {mask.image, output, row_pixels, image, texture_points, area},
                output.height);
  }
  return N3DS_OK;
}

}  // namespace n3ds
