#include "engine/face_results.h"

#include <algorithm>
#include <cmath>

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
  constexpr float kCosTilt = 0.9397F;
  constexpr float kSinTilt = 0.342F;
  // Column by column, so the rows of this text are the head's axes.
  constexpr Matrix4 kPitch = {1, 0,        0,        0, 0, kCosTilt, -kSinTilt, 0,
                              0, kSinTilt, kCosTilt, 0, 0, 0,        0,         1};
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

PixelPoint ProjectToPicture(const FaceResult& face, const TrackHeader& header, double x, double y,
                            double z) {
  const auto model_view = ModelView(face);
  std::array<double, 4> eye{};
  for (std::size_t row = 0; row < 4; ++row) {
    eye[row] = model_view[row] * x + model_view[4 + row] * y + model_view[8 + row] * z +
               model_view[12 + row];
  }
  std::array<double, 4> clip{};
  for (std::size_t row = 0; row < 4; ++row) {
    for (std::size_t k = 0; k < 4; ++k) clip[row] += double{face.projection[4 * k + row]} * eye[k];
  }
  return {(clip[0] / clip[3] + 1) / 2 * ViewportSize(header.upright_width()),
          (1 - clip[1] / clip[3]) / 2 * ViewportSize(header.upright_height())};
}

PixelPoint ProjectToPixel(const FaceResult& face, const TrackHeader& header, double x, double y,
                          double z) {
  const PixelPoint place = ProjectToPicture(face, header, x, y, z);
  return {place.x - 0.5, place.y - 0.5};
}

}  // namespace n3ds::tool
