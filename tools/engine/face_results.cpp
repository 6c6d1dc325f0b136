// SPDX-License-Identifier: MIT
#include "engine/face_results.h"

#include <algorithm>
#include <cmath>

#include "model/face_model_file.h"

namespace n3ds::tool {
namespace {

std::array<double, 16> Multiplied(const Matrix4& a, const Matrix4& b) {
  std::array<double, 16> product{};
  for (std::size_t column = 0; column < 4; ++column) {
    for (std::size_t row = 0; row < 4; ++row) {
      for (std::size_t k = 0; k < 4; ++k) {
        product[4 * column + row] += double{a[4 * k + row]} * double{b[4 * column + k]};
      }
    }
  }
  return product;
}

}  // namespace

Matrix4 HeadModel(const FaceResult& face) {
  if (!face.pitched) return face.model;
  constexpr auto kCosine = static_cast<float>(kTiltCosine);
  constexpr auto kSine = static_cast<float>(kTiltSine);
  // Column by column, so the rows of this text are the head's axes.
  constexpr Matrix4 kPitch = {1, 0, 0, 0, 0, kCosine, -kSine, 0, 0, kSine, kCosine, 0, 0, 0, 0, 1};
  const std::array<double, 16> product = Multiplied(face.model, kPitch);
  Matrix4 head{};
  std::transform(product.begin(), product.end(), head.begin(),
                 [](double value) { return static_cast<float>(value); });
  return head;
}

std::array<double, 16> ModelView(const FaceResult& face) {
  return Multiplied(face.view, face.model);
}

std::array<double, 16> HeadView(const FaceResult& face) {
  return Multiplied(face.view, HeadModel(face));
}

Vector3 Transformed(const std::array<double, 16>& matrix, const Vector3& p) {
  Vector3 result{};
  for (std::size_t row = 0; row < 3; ++row) {
    result[row] =
        matrix[row] * p[0] + matrix[4 + row] * p[1] + matrix[8 + row] * p[2] + matrix[12 + row];
  }
  return result;
}

bool IsFinite(const std::vector<float>& values) {
  return std::all_of(values.begin(), values.end(), [](float v) { return std::isfinite(v); });
}

bool IsFinite(const FaceResult& face) {
  const auto finite = [](float v) { return std::isfinite(v); };
  return std::all_of(face.projection.begin(), face.projection.end(), finite) &&
         std::all_of(face.view.begin(), face.view.end(), finite) &&
         std::all_of(face.model.begin(), face.model.end(), finite) && IsFinite(face.landmarks3d) &&
         IsFinite(face.corners);
}

PixelPoint ProjectToImage(const FaceResult& face, const TrackHeader& header, double x, double y,
                          double z) {
  const Vector3 eye = Transformed(ModelView(face), {x, y, z});
  std::array<double, 4> clip{};
  for (std::size_t row = 0; row < 4; ++row) {
    for (std::size_t k = 0; k < 3; ++k) clip[row] += double{face.projection[4 * k + row]} * eye[k];
    clip[row] += double{face.projection[12 + row]};
  }
  return {(clip[0] / clip[3] + 1) / 2 * ViewportSize(header.upright_width()),
          (1 - clip[1] / clip[3]) / 2 * ViewportSize(header.upright_height())};
}

PixelPoint ProjectToPixel(const FaceResult& face, const TrackHeader& header, double x, double y,
                          double z) {
  const PixelPoint place = ProjectToImage(face, header, x, y, z);
  return {place.x - 0.5, place.y - 0.5};
}

}  // namespace n3ds::tool
