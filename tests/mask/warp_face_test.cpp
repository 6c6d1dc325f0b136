// SPDX-License-Identifier: MIT
#include "mask/warp_face.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <set>
#include <utility>
#include <vector>

#include "core/model_tables.h"
#include "mask/test_image.h"
#include "mask/warp_scene.h"
#include "support/test_random.h"
namespace n3ds::testing {

namespace {

constexpr float kNan = std::numeric_limits<float>::quiet_NaN();
constexpr float kInfinity = std::numeric_limits<float>::infinity();

MRESULT Draw(WarpScene& scene, TestImage& texture, TestImage& output) {
  const N3DS_3D_MODEL model = scene.Model();
  const N3DS_2D_TEXTURE_MASK mask = scene.Mask(texture);
  return WarpFace(model, mask, scene.camera.K, scene.camera.R, scene.camera.t, output.descriptor());
}

TestImage Canvas(int width, int height, int padding = 0) {
  return TestImage(N3DS_FORMAT_BGRA32, width, height, padding);
}

using Pixels = std::set<std::pair<int, int>>;

// Pixels (x, y) that something was drawn on, by their alpha.
Pixels Covered(TestImage& output) {
  Pixels covered;
  for (int y = 0; y < output.height(); ++y) {
    for (int x = 0; x < output.width(); ++x) {
      if (output.Pixel(x, y)[3] != 0) covered.insert({x, y});
    }
  }
  return covered;
}

void ExpectLikeReference(WarpScene& scene, TestImage& texture, TestImage& output,
                         const char* what) {
  TestImage expected(output);
  scene.DrawReference(texture, expected);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  ASSERT_EQ(output.Bytes(), expected.Bytes()) << what;
}

// ---- Which pixels a triangle covers

// Row r is cut at height r + 0.5, where the long edge of this triangle stands at x = 3.5 - r: the
// last pixel of the span is the rounded 4 - r, and has its centre outside.
TEST(WarpFace, RightTriangleLeavesItsBottomRowOut) {
  WarpScene scene;
  scene.Add({{{4, 0, 0.5f, 1}, {0, 4, 0, 0.5f}, {0, 0, 0, 1}}});
  TestImage texture = GradientTexture(32, 32), output = Canvas(8, 8);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  const Pixels expected = {{0, 0}, {1, 0}, {2, 0}, {3, 0}, {0, 1},
                           {1, 1}, {2, 1}, {0, 2}, {1, 2}, {0, 3}};
  EXPECT_EQ(Covered(output), expected);
}

// The weight of corner 0 is not tested at the ends of a span, so that the edge opposite to it keeps
// the pixels which the edge only touches, as long as the other two weights allow.
TEST(WarpFace, EdgeOppositeToTheFirstCornerKeepsPixelsThatItTouches) {
  WarpScene scene;
  scene.Add({{{0, 0, 0, 1}, {4, 0, 0.5f, 1}, {0, 4, 0, 0.5f}}});
  TestImage texture = GradientTexture(32, 32), output = Canvas(8, 8);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  const Pixels expected = {{0, 0}, {1, 0}, {2, 0}, {3, 0}, {0, 1}, {1, 1}, {2, 1},
                           {3, 1}, {0, 2}, {1, 2}, {2, 2}, {0, 3}, {1, 3}};
  EXPECT_EQ(Covered(output), expected);
}

TEST(WarpFace, PointedTriangleCoversBothItsParts) {
  WarpScene scene;
  scene.Add({{{10, 5, 0.5f, 0.7f}, {5, 10, 0, 0.5f}, {5, 0, 0, 1}}});
  TestImage texture = GradientTexture(32, 32), output = Canvas(12, 12);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  Pixels expected;
  for (int y = 0; y < 10; ++y) {
    for (int x = 5; x + 0.5 <= 10 - std::abs(y + 0.5 - 5); ++x) expected.insert({x, y});
  }
  EXPECT_EQ(Covered(output), expected);
}

TEST(WarpFace, TriangleWithinOneRowIsDrawnAsSpans) {
  WarpScene scene;
  scene.Add({{{1.2f, 1.6f, 0, 1}, {7.2f, 1.6f, 0.5f, 1}, {4.0f, 2.4f, 0.2f, 0.5f}}});
  TestImage texture = GradientTexture(32, 32), output = Canvas(10, 5);
  ExpectLikeReference(scene, texture, output, "one row");
  for (const auto& [x, y] : Covered(output)) EXPECT_EQ(y, 2) << x;
  EXPECT_FALSE(Covered(output).empty());
}

TEST(WarpFace, TrianglesWithoutAreaDrawNothing) {
  TestImage texture = GradientTexture(32, 32);
  const std::array<WarpCorner, 3> flat[] = {
      {{{3, 3, 0, 0}, {3, 3, 1, 0}, {3, 3, 0, 1}}},
      {{{1, 1, 0, 0}, {3, 3, 1, 0}, {6, 6, 0, 1}}},
      {{{2, 5, 0, 0}, {7, 5, 1, 0}, {4, 5, 0, 1}}},
      {{{-5, -5, 0, 0}, {-3, -9, 1, 0}, {-8, -1, 0, 1}}},  // all clamped to the corner
  };
  for (const auto& corners : flat) {
    WarpScene scene;
    scene.Add(corners);
    TestImage output = Canvas(10, 10);
    ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
    EXPECT_TRUE(Covered(output).empty());
  }
}

TEST(WarpFace, RectangleIsCoveredWithoutGaps) {
  WarpScene scene;
  scene.AddRectangle(3, 2, 23, 17);
  TestImage texture = GradientTexture(64, 64), output = Canvas(30, 20);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  for (int y = 0; y < 20; ++y) {
    for (int x = 0; x < 30; ++x) {
      const bool inside = x >= 3 && x < 23 && y >= 2 && y < 17;
      const bool touched_edge = x == 23 && y >= 2 && y < 17;
      if (!touched_edge) {
        EXPECT_EQ(Covered(output).count({x, y}), inside ? 1u : 0u) << x << ", " << y;
      }
    }
  }
}

TEST(WarpFace, LaterTrianglesCoverEarlierOnes) {
  TestImage texture = Canvas(16, 16);
  for (int y = 0; y < 16; ++y) {
    for (int x = 0; x < 16; ++x) {
      texture.Pixel(x, y)[0] = x < 8 ? 10 : 200;
      texture.Pixel(x, y)[3] = 255;
    }
  }
  WarpScene scene;
  scene.Add({{{0, 0, 0, 1}, {12, 0, 0.2f, 1}, {0, 12, 0, 0.8f}}});
  scene.Add({{{0, 0, 0.7f, 1}, {6, 0, 0.8f, 1}, {0, 6, 0.7f, 0.8f}}});
  TestImage output = Canvas(16, 16);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  EXPECT_EQ(output.Pixel(1, 1)[0], 200);
  EXPECT_EQ(output.Pixel(4, 4)[0], 10);
}

// ---- What is sampled where

// Over an enlarged texture the output is the linear function that the texture is, within the
// truncation; found without any of the warp's own arithmetic.
TEST(WarpFace, EnlargedGradientStaysLinear) {
  WarpScene scene;
  constexpr float kLeft = 10, kTop = 5, kWidth = 300, kHeight = 240;
  scene.AddRectangle(kLeft, kTop, kLeft + kWidth, kTop + kHeight);
  for (int i = 1; i <= 6; ++i) {  // keep clear of the clamp at the texture's border
    scene.coordinate(i)[0] *= 0.9f;
    scene.coordinate(i)[1] = 0.1f + 0.9f * scene.coordinate(i)[1];
  }
  TestImage texture = GradientTexture(100, 120), output = Canvas(320, 256);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  int drawn = 0;
  for (int y = 6; y < 243; ++y) {
    for (int x = 11; x < 308; ++x) {
      const double blue = 2 * 90 * (x + 0.5 - kLeft) / kWidth;
      const double green = 2 * 108 * (y + 0.5 - kTop) / kHeight;
      ASSERT_NEAR(output.Pixel(x, y)[0], blue - 0.5, 0.51) << x << ", " << y;
      ASSERT_NEAR(output.Pixel(x, y)[1], green - 0.5, 0.51) << x << ", " << y;
      ASSERT_NEAR(output.Pixel(x, y)[2], 128, 1);
      ++drawn;
    }
  }
  EXPECT_EQ(drawn, 237 * 297);
}

TEST(WarpFace, AlphaIsSampledLikeTheColours) {
  TestImage texture = Canvas(16, 16);
  for (int y = 0; y < 16; ++y) {
    for (int x = 0; x < 16; ++x) {
      for (int c = 0; c < 4; ++c) texture.Pixel(x, y)[c] = static_cast<uint8_t>(13 * x + y + 9);
    }
  }
  WarpScene scene;
  scene.AddRectangle(1, 1, 40, 30);
  TestImage output = Canvas(48, 32);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  for (int y = 0; y < 32; ++y) {
    for (int x = 0; x < 48; ++x) {
      ASSERT_EQ(output.Pixel(x, y)[3], output.Pixel(x, y)[0]) << x << ", " << y;
    }
  }
  EXPECT_GT(output.Pixel(20, 15)[3], 0);
}

// Columns of one colour each: where all corners have the same u, the sample is that very column.
uint8_t ColumnSampledAt(float u, int width) {
  TestImage texture = Canvas(width, 8);
  for (int y = 0; y < 8; ++y) {
    for (int x = 0; x < width; ++x) texture.Pixel(x, y)[3] = static_cast<uint8_t>(x + 1);
  }
  WarpScene scene;
  scene.Add({{{0, 0, u, 0.5f}, {8, 0, u, 0.5f}, {0, 8, u, 0.5f}}});
  TestImage output = Canvas(10, 10);
  EXPECT_EQ(Draw(scene, texture, output), N3DS_OK);
  return output.Pixel(2, 2)[3];
}

TEST(WarpFace, CoordinatesAtTheBorderAreClampedThreePixelsIn) {
  EXPECT_EQ(ColumnSampledAt(1.0f, 16), 16 - 3 + 1);
  EXPECT_EQ(ColumnSampledAt(14.0f / 16, 16), 16 - 3 + 1) << "the test starts at the size less 2";
  EXPECT_EQ(ColumnSampledAt(13.75f / 16, 16), 14) << "just below it nothing is clamped";
  EXPECT_EQ(ColumnSampledAt(0.0f, 16), 1);
  EXPECT_EQ(ColumnSampledAt(7.0f, 16), 16 - 3 + 1);
  EXPECT_EQ(ColumnSampledAt(-3.0f, 16), 1);
  EXPECT_EQ(ColumnSampledAt(kInfinity, 16), 16 - 3 + 1);
  EXPECT_EQ(ColumnSampledAt(-kInfinity, 16), 1);
}

TEST(WarpFace, TextureRunsUpwards) {
  TestImage texture = Canvas(16, 16);
  for (int x = 0; x < 16; ++x) {
    for (int y = 0; y < 16; ++y) texture.Pixel(x, y)[3] = static_cast<uint8_t>(10 * y + 1);
  }
  WarpScene scene;
  scene.Add({{{0, 0, 0.2f, 1}, {8, 0, 0.4f, 1}, {0, 8, 0.2f, 1}}});
  scene.Add({{{20, 0, 0.2f, 0.25f}, {28, 0, 0.4f, 0.25f}, {20, 8, 0.2f, 0.25f}}});
  TestImage output = Canvas(30, 10);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  EXPECT_EQ(output.Pixel(2, 2)[3], 1) << "v = 1 is the first row";
  EXPECT_EQ(output.Pixel(22, 2)[3], 121) << "v = 0.25 is row 12 of 16";
}

// Of a texture two pixels wide every coordinate is clamped to -1, so nothing can be sampled.
TEST(WarpFace, TexturesTooSmallToBlendDrawNothing) {
  for (const auto& [width, height] : {std::pair(1, 1), {1, 9}, {9, 1}, {2, 9}, {9, 2}, {2, 2}}) {
    WarpScene scene;
    scene.AddRectangle(1, 1, 20, 20);
    TestImage texture = Canvas(width, height);
    texture.Fill(255);
    TestImage output = Canvas(24, 24);
    ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "small texture"));
    if (width == 1 || height == 1) {
      EXPECT_TRUE(Covered(output).empty());
    }
  }
}

TEST(WarpFace, TexturesOfThreePixelsShowTheirFirst) {
  WarpScene scene;
  scene.AddRectangle(1, 1, 20, 20);
  TestImage texture = Canvas(3, 3);
  texture.Fill(9);
  for (int c = 0; c < 4; ++c) texture.Pixel(0, 0)[c] = 200;
  TestImage output = Canvas(24, 24);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  EXPECT_EQ(output.Pixel(10, 10)[0], 200);
}

// ---- Against the reference

// Coordinates on whole, half and arbitrary positions, inside and around the image.
float RandomCoordinate(int size, Random& random) {
  const float value =
      random.Float(-0.3f * static_cast<float>(size), 1.3f * static_cast<float>(size));
  switch (random.Below(4)) {
    case 0:
      return std::floor(value);
    case 1:
      return std::floor(value) + 0.5f;
    default:
      return value;
  }
}

TEST(WarpFace, RandomTrianglesMatchTheReference) {
  Random random = TestRandom();
  const auto uv = [&random] { return random.Float(-0.2f, 1.2f); };
  for (int run = 0; run < 300; ++run) {
    const int width = 1 + random.Int(0, 39), height = 1 + random.Int(0, 29);
    TestImage texture = Canvas(1 + random.Int(0, 19), 1 + random.Int(0, 19), random.Int(0, 2));
    texture.Randomise(random);
    WarpScene scene;
    for (int i = 0; i < 12; ++i) {
      std::array<WarpCorner, 3> corners;
      for (auto& corner : corners) {
        corner = {RandomCoordinate(width, random), RandomCoordinate(height, random), uv(), uv()};
      }
      if (i % 4 == 1) corners[1].y = corners[0].y;                 // flat top or bottom
      if (i % 4 == 2) corners[2].x = corners[0].x + 0.01f * uv();  // thin
      scene.Add(corners);
    }
    TestImage output = Canvas(width, height, random.Int(0, 3));
    output.Randomise(random);
    ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "random triangles")) << run;
  }
}

// Triangles of about a pixel: corners share pixels and rows, and their order decides the spans.
// Twenty an image, four columns apart, because drawing goes over all 3456 triangles of the mesh.
TEST(WarpFace, TinyTrianglesMatchTheReference) {
  Random random = TestRandom();
  const auto place = [&random] { return random.Float(0.0f, 1.6f); };
  const auto uv = [&random] { return random.Float(0.0f, 1.0f); };
  TestImage texture = GradientTexture(20, 20);
  for (int run = 0; run < 100; ++run) {
    WarpScene scene;
    for (int i = 0; i < 20; ++i) {
      std::array<WarpCorner, 3> corners;
      for (auto& corner : corners) {
        corner = {place() + 4 * static_cast<float>(i), place(), uv(), uv()};
      }
      scene.Add(corners);
    }
    TestImage output = Canvas(80, 3);
    ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "tiny")) << run;
  }
}

TEST(WarpFace, SliversAcrossPixelEdgesMatchTheReference) {
  Random random = TestRandom();
  const auto place = [&random] { return random.Float(0.0f, 19.0f); };
  TestImage texture = GradientTexture(20, 20);
  for (int run = 0; run < 300; ++run) {
    WarpScene scene;
    for (int i = 0; i < 10; ++i) {
      // Two corners on neighbouring floats around the middle between two rows: the slope of their
      // edge is as steep as it can get.
      const float y = std::floor(place()) + 0.5f;
      scene.Add({{{place(), std::nextafter(y, 0.0f), 0.1f, 0.9f},
                  {place(), y, 0.8f, 0.9f},
                  {place(), place(), 0.3f, 0.2f}}});
    }
    TestImage output = Canvas(20, 20);
    ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "slivers")) << run;
  }
}

TEST(WarpFace, PosedMeshWithAFullCameraMatchesTheReference) {
  Random random = TestRandom();
  const auto place = [&random] { return random.Float(-60.0f, 60.0f); };
  const auto uv = [&random] { return random.Float(0.0f, 1.0f); };
  TestImage texture = GradientTexture(50, 40);
  for (int run = 0; run < 40; ++run) {
    WarpScene scene;
    for (int i = 0; i < 30; ++i) {
      const float x = place(), y = place();
      const int first = scene.Add({{{x, y, uv(), uv()},
                                    {x + 0.3f * place(), y, uv(), uv()},
                                    {x, y + 0.3f * place(), uv(), uv()}}});
      for (int c = 0; c < 3; ++c) scene.vertex(first + c)[2] = place();
    }
    const float angle = place() / 40, c = std::cos(angle), s = std::sin(angle);
    // The third camera row is not read, and a skewed camera is.
    scene.camera = {{110, 7, 52, -3, 95, 41, kNan, kNan, kNan},
                    {c, 0, s, 0.1f, 1, 0, -s, 0, c},
                    {2, -3, 70 + 2 * place()}};
    TestImage output = Canvas(101, 77);
    ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "posed mesh")) << run;
  }
}

// ---- Layouts

TEST(WarpFace, RefusesALayoutOfOtherCounts) {
  WarpScene scene;
  scene.AddRectangle(1, 1, 8, 8);
  TestImage texture = GradientTexture(16, 16), output = Canvas(10, 10);
  const N3DS_3D_MODEL model = scene.Model();
  for (const auto& [coordinates, triangles] : {std::pair<int64_t, int64_t>(1811, 3456),
                                               {1813, 3456},
                                               {1812, 3455},
                                               {1812, 3457},
                                               {0, 0},
                                               {int64_t{1} << 32 | 1812, 3456}}) {
    N3DS_2D_TEXTURE_MASK mask = scene.Mask(texture);
    mask.texCoordCount = coordinates;
    mask.triangleCount = triangles;
    EXPECT_EQ(
        WarpFace(model, mask, scene.camera.K, scene.camera.R, scene.camera.t, output.descriptor()),
        N3DS_BAD_VALUE);
    EXPECT_TRUE(Covered(output).empty());
  }
}

TEST(WarpFace, MissingArrayBringsTheDefaultLayoutWhateverTheCounts) {
  std::vector<float> upward;
  for (const auto& [u, v] : kTextureCoordinates) {
    upward.push_back(u);
    upward.push_back(1.0f - v);
  }
  // The mesh lies in the image as it lies in the texture, so the output is the texture's triangles.
  std::vector<float> vertices;
  for (const auto& [u, v] : kTextureCoordinates) {
    vertices.insert(vertices.end(), {80 * u, 90 * v, 1.0f});
  }
  const N3DS_3D_MODEL model = {vertices.data(), 0, &kTriangles[0][0], 0};
  WarpScene scene;
  TestImage texture = GradientTexture(64, 64);
  TestImage expected = Canvas(80, 90);
  WarpReference(vertices.data(), model.triangles, upward.data(), model.triangles, scene.camera,
                texture, expected);
  ASSERT_GT(Covered(expected).size(), 2000u);

  for (int missing = 0; missing < 3; ++missing) {
    N3DS_2D_TEXTURE_MASK mask = scene.Mask(texture);
    mask.texCoordCount = mask.triangleCount = -7;
    if (missing != 1) mask.texCoords = nullptr;
    if (missing != 0) mask.triangles = nullptr;
    TestImage output = Canvas(80, 90);
    ASSERT_EQ(
        WarpFace(model, mask, scene.camera.K, scene.camera.R, scene.camera.t, output.descriptor()),
        N3DS_OK);
    EXPECT_EQ(output.Bytes(), expected.Bytes()) << missing;
  }
}

TEST(WarpFace, DefaultLayoutStartsWithTheTableOfTheMesh) {
  EXPECT_FLOAT_EQ(kTextureCoordinates[0][0], 0.069524f);
  EXPECT_FLOAT_EQ(1.0f - kTextureCoordinates[0][1], 0.718051f);
  EXPECT_FLOAT_EQ(1.0f - kTextureCoordinates[1][1], 0.680544f);
  EXPECT_FLOAT_EQ(1.0f - kTextureCoordinates[2][1], 0.681845f);
}

TEST(WarpFace, TextureAndMeshMayBeCutDifferently) {
  WarpScene scene;
  scene.Add({{{0, 0, 0, 1}, {16, 0, 0.8f, 1}, {0, 16, 0, 0.2f}}});
  std::vector<uint16_t> turned(3 * N3DS_TRIANGLE_COUNT);
  turned[0] = 3;
  turned[1] = 1;
  turned[2] = 2;
  TestImage texture = GradientTexture(32, 32), output = Canvas(16, 16);
  const N3DS_3D_MODEL model = scene.Model();
  N3DS_2D_TEXTURE_MASK mask = scene.Mask(texture);
  mask.triangles = turned.data();
  ASSERT_EQ(
      WarpFace(model, mask, scene.camera.K, scene.camera.R, scene.camera.t, output.descriptor()),
      N3DS_OK);
  TestImage expected = Canvas(16, 16);
  WarpReference(model.vertices, model.triangles, mask.texCoords, turned.data(), scene.camera,
                texture, expected);
  EXPECT_EQ(output.Bytes(), expected.Bytes());
  EXPECT_GT(output.Pixel(0, 0)[1], 40) << "corner 0 shows the texture's third corner";
}

TEST(WarpFace, TextureTrianglesBeyondTheCoordinatesAreLeftOut) {
  WarpScene scene;
  scene.AddRectangle(1, 1, 8, 8);
  std::vector<uint16_t> triangles(3 * N3DS_TRIANGLE_COUNT, 1);
  triangles[0] = N3DS_VERTEX_COUNT;
  triangles[4] = UINT16_MAX;
  TestImage texture = GradientTexture(16, 16), output = Canvas(10, 10);
  const N3DS_3D_MODEL model = scene.Model();
  N3DS_2D_TEXTURE_MASK mask = scene.Mask(texture);
  mask.triangles = triangles.data();
  ASSERT_EQ(
      WarpFace(model, mask, scene.camera.K, scene.camera.R, scene.camera.t, output.descriptor()),
      N3DS_OK);
  EXPECT_TRUE(Covered(output).empty());
}

// ---- Odd poses and images

TEST(WarpFace, CornerInTheCameraPlaneIsDrawnAtTheOrigin) {
  WarpScene scene;
  const int first = scene.Add({{{9, 9, 0, 1}, {12, 0, 0.8f, 1}, {0, 12, 0, 0.2f}}});
  scene.vertex(first)[2] = 0.0f;
  TestImage texture = GradientTexture(32, 32), output = Canvas(16, 16);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);

  WarpScene same;
  same.Add({{{0, 0, 0, 1}, {12, 0, 0.8f, 1}, {0, 12, 0, 0.2f}}});
  TestImage expected = Canvas(16, 16);
  ASSERT_EQ(Draw(same, texture, expected), N3DS_OK);
  EXPECT_FALSE(Covered(expected).empty());
  EXPECT_EQ(output.Bytes(), expected.Bytes());
}

TEST(WarpFace, PosesThatAreNoNumbersDrawNothing) {
  TestImage texture = GradientTexture(32, 32);
  for (int part = 0; part < 18; ++part) {
    for (const float value : {kNan, kInfinity, -kInfinity}) {
      WarpScene scene;
      scene.AddRectangle(1, 1, 12, 12);
      float* target = part < 9    ? &scene.camera.R[part]
                      : part < 12 ? &scene.camera.t[part - 9]
                                  : &scene.camera.K[part - 12];
      *target = value;
      TestImage output = Canvas(16, 16);
      ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "pose")) << part;
      if (std::isnan(value)) {
        EXPECT_TRUE(Covered(output).empty()) << part;
      }
    }
  }
}

TEST(WarpFace, VerticesThatAreNoNumbersCostOnlyTheirTriangle) {
  WarpScene scene;
  const int first = scene.Add({{{0, 0, 0, 1}, {12, 0, 0.8f, 1}, {0, 12, 0, 0.2f}}});
  scene.Add({{{20, 0, 0, 1}, {30, 0, 0.8f, 1}, {20, 10, 0, 0.2f}}});
  scene.vertex(first + 1)[1] = kNan;
  TestImage texture = GradientTexture(32, 32), output = Canvas(32, 16);
  ASSERT_EQ(Draw(scene, texture, output), N3DS_OK);
  EXPECT_EQ(Covered(output).count({2, 2}), 0u);
  EXPECT_EQ(Covered(output).count({22, 2}), 1u);
}

TEST(WarpFace, TextureCoordinatesThatAreNoNumbersGiveZeroBytes) {
  WarpScene scene;
  scene.Add({{{0, 0, kNan, 1}, {12, 0, 0.8f, kNan}, {0, 12, 0, 0.2f}}});
  TestImage texture = GradientTexture(32, 32), output = Canvas(16, 16);
  output.Fill(7);
  ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "coordinates"));
  EXPECT_EQ(output.Pixel(2, 2)[0], 0);
  EXPECT_EQ(output.Pixel(14, 14)[0], 7);
}

TEST(WarpFace, FacesPartlyAndWhollyOutsideStayInsideTheBuffer) {
  Random random = TestRandom();
  TestImage texture = GradientTexture(32, 32);
  for (const auto& [x, y] : {std::pair(-30.0f, 5.0f),
                             {25.0f, 5.0f},
                             {5.0f, -30.0f},
                             {5.0f, 25.0f},
                             {-1e6f, 3.0f},
                             {3.0f, 1e9f},
                             {1e30f, -1e30f},
                             {-5.0f, -5.0f}}) {
    for (const auto& [width, height] : {std::pair(31, 27), {1, 1}, {1, 27}, {31, 1}, {2, 2}}) {
      WarpScene scene;
      scene.AddRectangle(x, y, x + 20, y + 20);
      TestImage output = Canvas(width, height);
      output.Randomise(random);
      ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "outside"))
          << x << ", " << y << " in " << width << " x " << height;
    }
  }
}

TEST(WarpFace, FaceAroundTheWholeImageFillsIt) {
  WarpScene scene;
  scene.AddRectangle(-500, -400, 700, 800);
  TestImage texture = GradientTexture(64, 64), output = Canvas(33, 21);
  ASSERT_NO_FATAL_FAILURE(ExpectLikeReference(scene, texture, output, "around"));
  // The clamp pulls the corners to the image's last row, and a bottom row is not drawn.
  EXPECT_EQ(Covered(output).size(), 33u * 20u);
}

// A triangle within the last row, where pixels beyond the row would lie beyond the buffer.
TEST(WarpFace, RowsShorterThanTheWidthAreNotOverrun) {
  WarpScene scene;
  scene.Add({{{2, 15, 0.5f, 0.5f}, {15, 15, 0.5f, 0.5f}, {8, 14.6f, 0.5f, 0.5f}}});
  TestImage texture = GradientTexture(32, 32), narrow = Canvas(9, 16);
  NSVL_OFFSCREEN output = narrow.descriptor();
  output.width = 16;
  const N3DS_3D_MODEL model = scene.Model();
  const N3DS_2D_TEXTURE_MASK mask = scene.Mask(texture);
  ASSERT_EQ(WarpFace(model, mask, scene.camera.K, scene.camera.R, scene.camera.t, output), N3DS_OK);
  EXPECT_EQ(Covered(narrow).count({8, 15}), 1u);
}

}  // namespace
}  // namespace n3ds::testing
