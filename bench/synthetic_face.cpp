// SPDX-License-Identifier: MIT
#include "synthetic_face.h"

#include <cmath>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include "core/face_model.h"
#include "core/model_tables.h"

namespace n3ds {

std::vector<uint8_t> ReadModelFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  std::vector<uint8_t> bytes((std::istreambuf_iterator<char>(file)),
                             std::istreambuf_iterator<char>());
  if (bytes.size() != N3DS_FACE_MODEL_BYTES) throw std::runtime_error(path + " is no face model");
  return bytes;
}

SyntheticFaces::SyntheticFaces(const std::vector<uint8_t>& model, int32_t width, int32_t height)
    : mean_shape_(kShapeSize),
      width_(static_cast<float>(width)),
      height_(static_cast<float>(height)) {
  for (size_t i = 0; i < mean_shape_.size(); i++) {
    const size_t at = FaceModelLayout::kMeanOffset + 2 * i;
    const auto value = static_cast<int16_t>(model[at] | model[at + 1] << 8);
    mean_shape_[i] = static_cast<float>(value) / 256.0f;
  }
}

void SyntheticFaces::Frame(int frame, int face_count, std::vector<__tag_point>* points) const {
  points->clear();
  const float focal = (width_ + height_) / 2.0f;
  for (int face = 0; face < face_count; face++) {
    // Head frame to camera: half a turn about x (and the model's pitch), then a swaying yaw.
    const double phase = 0.05 * frame + face;
    const double yaw = 0.3 * std::sin(phase);
    const float quat_pitch[4] = {0.1736482f, 0.9848078f, 0.0f, 0.0f};
    const float quat_yaw[4] = {static_cast<float>(std::cos(yaw / 2)), 0.0f,
                               static_cast<float>(std::sin(yaw / 2)), 0.0f};
    float pitch[9];
    float turn[9];
    QuatToRotationMatrix(quat_pitch, pitch);
    QuatToRotationMatrix(quat_yaw, turn);
    const float place_x =
        (static_cast<float>(face) - static_cast<float>(face_count - 1) / 2.0f) * 220.0f;
    const float place[3] = {place_x + static_cast<float>(4.0 * std::sin(2 * phase)), 0.0f, 900.0f};
    for (int landmark = 0; landmark < 101; landmark++) {
      int32_t vertex = 0;
      if (landmark < kOutlineLandmarkCount) {
        vertex = kDefaultContourVertexIndices[landmark];
      } else if (landmark < kFitLandmarkCount) {
        vertex = kInnerLandmarkVertexIndices[landmark - kOutlineLandmarkCount];
      } else {
        vertex = kRidgeVertexIndices[landmark < 97 ? 0 : landmark - 97];
      }
      const float* v = mean_shape_.data() + 3 * static_cast<ptrdiff_t>(vertex);
      float upright[3];
      float camera[3];
      for (int i = 0; i < 3; i++) {
        upright[i] = pitch[3 * i] * v[0] + pitch[3 * i + 1] * v[1] + pitch[3 * i + 2] * v[2];
      }
      for (int i = 0; i < 3; i++) {
        camera[i] = turn[3 * i] * upright[0] + turn[3 * i + 1] * upright[1] +
                    turn[3 * i + 2] * upright[2] + place[i];
      }
      points->push_back(
          {static_cast<int32_t>(std::lround(focal * camera[0] / camera[2] + width_ / 2.0f)),
           static_cast<int32_t>(std::lround(focal * camera[1] / camera[2] + height_ / 2.0f))});
    }
  }
}

}  // namespace n3ds
