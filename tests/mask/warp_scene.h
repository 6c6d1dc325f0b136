// SPDX-License-Identifier: MIT
// A mesh of few triangles, its texture layout and a camera, for the tests of the mask warp.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <vector>

#include "mask/test_image.h"
#include "mask/warp_reference.h"
#include "norvale_3d_sticker_core.h"

namespace n3ds::testing {

// An image point with the texture point that belongs there (v up).
struct WarpCorner {
  float x, y, u, v;
};

// Starts with 3456 triangles that have no area; Add replaces one of them. The arrays have exactly
// the promised sizes. With the default camera a mesh vertex (x, y, 1) falls on pixel (x, y).
class WarpScene {
 public:
  WarpScene()
      : vertices_(std::make_unique<float[]>(3 * N3DS_VERTEX_COUNT)),
        coordinates_(std::make_unique<float[]>(2 * N3DS_VERTEX_COUNT)),
        triangles_(std::make_unique<uint16_t[]>(3 * N3DS_TRIANGLE_COUNT)) {
    vertices_[2] = 1.0f;
  }

  // Each triangle gets three vertices of its own; returns the number of the first.
  int Add(const std::array<WarpCorner, 3>& corners) {
    const int first = next_vertex_;
    for (int c = 0; c < 3; ++c) {
      float* vertex = &vertices_[3 * next_vertex_];
      vertex[0] = corners[c].x;
      vertex[1] = corners[c].y;
      vertex[2] = 1.0f;
      coordinates_[2 * next_vertex_] = corners[c].u;
      coordinates_[2 * next_vertex_ + 1] = corners[c].v;
      triangles_[3 * next_triangle_ + c] = static_cast<uint16_t>(next_vertex_++);
    }
    ++next_triangle_;
    return first;
  }
  // Two triangles over the rectangle, with the whole texture.
  void AddRectangle(float left, float top, float right, float bottom) {
    const WarpCorner a = {left, top, 0, 1}, b = {right, top, 1, 1}, c = {right, bottom, 1, 0},
                     d = {left, bottom, 0, 0};
    Add({a, b, c});
    Add({a, c, d});
  }

  float* vertex(int i) { return &vertices_[3 * i]; }
  float* coordinate(int i) { return &coordinates_[2 * i]; }
  uint16_t* triangle(int i) { return &triangles_[3 * i]; }

  N3DS_3D_MODEL Model() {
    return {vertices_.get(), N3DS_VERTEX_COUNT, triangles_.get(), N3DS_TRIANGLE_COUNT};
  }
  N3DS_2D_TEXTURE_MASK Mask(TestImage& texture) {
    return {coordinates_.get(), N3DS_VERTEX_COUNT, triangles_.get(), N3DS_TRIANGLE_COUNT,
            texture.descriptor()};
  }
  void DrawReference(TestImage& texture, TestImage& output) {
    WarpReference(vertices_.get(), triangles_.get(), coordinates_.get(), triangles_.get(), camera,
                  texture, output);
  }

  ReferenceCamera camera = {{1, 0, 0, 0, 1, 0, 0, 0, 1}, {1, 0, 0, 0, 1, 0, 0, 0, 1}, {0, 0, 0}};

 private:
  std::unique_ptr<float[]> vertices_, coordinates_;
  std::unique_ptr<uint16_t[]> triangles_;
  int next_vertex_ = 1, next_triangle_ = 0;
};

// A texture whose bytes grow with the position: blue by column, green by row, alpha 255.
inline TestImage GradientTexture(int width, int height) {
  TestImage texture(N3DS_FORMAT_BGRA32, width, height);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      uint8_t* pixel = texture.Pixel(x, y);
      pixel[0] = static_cast<uint8_t>(2 * x);
      pixel[1] = static_cast<uint8_t>(2 * y);
      pixel[2] = 128;
      pixel[3] = 255;
    }
  }
  return texture;
}

}  // namespace n3ds::testing
