// SPDX-License-Identifier: MIT
// Options that name a face of a model file.
#pragma once

#include <CLI/App.hpp>
#include <string>
#include <vector>

#include "model/face_shapes.h"

namespace n3ds::tool {

void AddIdentityUnit(CLI::App& command, double& unit);

struct FaceOptions {
  std::string model;
  double identity_unit = kIdentityUnit;
  std::vector<std::string> identity;    // "2=-1.5": mode and standard deviations
  std::vector<std::string> expression;  // "jaw_open=0.7": name and share of full intensity

  // Throws Error with the option that cannot be understood.
  FaceCoefficients coefficients() const;
  // Reads the model file and adds the face up. Throws Error.
  Points face() const;
};

void AddFaceOptions(CLI::App& command, FaceOptions& options);

}  // namespace n3ds::tool
