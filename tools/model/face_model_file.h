// SPDX-License-Identifier: MIT
// The face-model file as data: what 'n3ds model info' reports on and the renderer takes its head
// from. The engine reads the file on its own.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "norvale_3d_sticker_engine.h"
#include "support/vector3.h"

namespace n3ds::tool {

constexpr std::size_t kModelVertices = N3DS_VERTEX_COUNT;
constexpr std::size_t kModelIdentities = 16;
constexpr std::size_t kModelExpressions = 20;
constexpr std::size_t kModelCoordinates = 3 * kModelVertices;

// The header's three numbers, then the arrays below.
static_assert(12 + 2 * (1 + kModelIdentities + kModelExpressions) * kModelCoordinates +
                  kModelIdentities * kModelExpressions * kModelCoordinates ==
              N3DS_FACE_MODEL_BYTES);

struct FaceModelFile {
  std::vector<std::int16_t> mean;        // x, y, z per vertex in 1/256 mm, pitched
  std::vector<std::int16_t> identity;    // component after component, as the mean
  std::vector<std::int16_t> expression;  // component after component, as the mean
  std::vector<std::int8_t> interaction;  // identity (outer) by expression, as the mean; times 40
};

// Reads a file of the format; throws Error with what is wrong with size or header.
FaceModelFile ReadFaceModelFile(const std::string& path);

// The pitch of the file's shape, 20 degrees, as the engine takes it back.
constexpr double kTiltCosine = 0.9397;
constexpr double kTiltSine = 0.342;

// A coordinate triple of the file in the frame of the engine's model matrix, mm.
Vector3 UprightPoint(const std::int16_t* stored);

// The mean face in the frame of the engine's model matrix, mm.
Points MeanFace(const FaceModelFile& model);

}  // namespace n3ds::tool
