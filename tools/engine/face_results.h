// SPDX-License-Identifier: MIT
// What the engine says about the faces of a frame. Plain data, so that everything that judges or
// draws results works without the engine.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "support/vector3.h"
#include "tracks/upright.h"

namespace n3ds::tool {

using Matrix4 = std::array<float, 16>;  // column-major

struct FaceResult {
  std::int64_t id = 0;  // the track's person
  Matrix4 projection{};
  Matrix4 view{};
  Matrix4 model{};
  bool pitched = false;            // the model frame is that of the model file, as in mask mode
  std::vector<float> landmarks3d;  // x, y, z per landmark in the model frame, mm
  std::vector<float> corners;      // mask mode: x, y, z per corner of the mesh's triangles
};

struct FrameResult {
  std::int64_t number = 0;
  bool ok = false;  // the engine's call succeeded; without it there are no faces
  double milliseconds = 0;
  std::vector<FaceResult> faces;  // in the order of the track's frame
};

// The model matrix from the upright head frame, in either mode: mask mode's own is for the frame of
// the model file, which is pitched by 20 degrees.
Matrix4 HeadModel(const FaceResult& face);

// Model frame to OpenGL eye space: view * model, in double.
std::array<double, 16> ModelView(const FaceResult& face);
// Upright head frame to OpenGL eye space.
std::array<double, 16> HeadView(const FaceResult& face);

// A point under a matrix without perspective, column-major.
Vector3 Transformed(const std::array<double, 16>& matrix, const Vector3& p);

// Every number of the matrices, landmarks and mesh is finite.
bool IsFinite(const FaceResult& face);
bool IsFinite(const std::vector<float>& values);

// The engine's matrices are made for a viewport of even size; an odd last row or column of the
// image lies outside of it.
inline int ViewportSize(int image_size) { return image_size - image_size % 2; }

// Where the matrices put a point of the model frame in the upright image, which reaches from 0 to
// its width and height. The engine's fits take the landmarks' numbers for such places.
PixelPoint ProjectToImage(const FaceResult& face, const TrackHeader& header, double x, double y,
                          double z);

// Where a renderer that uses nothing but the three matrices puts a point of the model frame, in
// pixels of the upright image as the landmarks count them: landmark x stands for the centre of
// pixel column x, so half a pixel is taken off.
PixelPoint ProjectToPixel(const FaceResult& face, const TrackHeader& header, double x, double y,
                          double z);

}  // namespace n3ds::tool
