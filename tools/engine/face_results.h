// What the engine says about the faces of a frame. Plain data, so that everything that judges or
// draws results works without the engine.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "tracks/upright.h"

namespace n3ds::tool {

using Matrix4 = std::array<float, 16>;  // column-major

struct FaceResult {
  std::int64_t id = 0;  // the track's person
  Matrix4 projection{};
  Matrix4 view{};
  Matrix4 model{};
  std::vector<float> landmarks3d;  // x, y, z per landmark in the model frame, mm
};

struct FrameResult {
  std::int64_t number = 0;
  bool ok = false;  // the engine's call succeeded; without it there are no faces
  double milliseconds = 0;
  std::vector<FaceResult> faces;  // in the order of the track's frame
};

// Model frame to OpenGL eye space: view * model, in double.
std::array<double, 16> ModelView(const FaceResult& face);

// Every number of the matrices and landmarks is finite.
bool IsFinite(const FaceResult& face);

// The engine's matrices are made for a viewport of even size; an odd last row or column of the
// picture lies outside of it.
inline int ViewportSize(int picture_size) { return picture_size - picture_size % 2; }

// Where a renderer that uses nothing but the three matrices puts a point of the model frame, in
// pixels of the upright picture as the landmarks count them: landmark x stands for the centre of
// pixel column x, so half a pixel is taken off.
PixelPoint ProjectToPixel(const FaceResult& face, const TrackHeader& header, double x, double y,
                          double z);

}  // namespace n3ds::tool
