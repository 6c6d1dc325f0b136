// SPDX-License-Identifier: MIT
// Landmark sequences made from the shipped face model, for benchmarks that need plausible input and
// no files beside the model.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

std::vector<uint8_t> ReadModelFile(const std::string& path);

// 101 landmarks a face: the mean shape under a pose that sways with the frame number, at the given
// place in the picture, on whole pixels.
class SyntheticFaces {
 public:
  SyntheticFaces(const std::vector<uint8_t>& model, int32_t width, int32_t height);

  // Points of faces 0 to face_count - 1, face after face.
  void Frame(int frame, int face_count, std::vector<__tag_point>* points) const;

 private:
  std::vector<float> mean_shape_;  // mm
  float width_;
  float height_;
};

}  // namespace n3ds
