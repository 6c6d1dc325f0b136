#include "engine/face_results.h"

#include <algorithm>
#include <cmath>

namespace n3ds::tool {

std::array<double, 16> ModelView(const FaceResult& face) {
  std::array<double, 16> product{};
  for (std::size_t column = 0; column < 4; ++column) {
    for (std::size_t row = 0; row < 4; ++row) {
      for (std::size_t k = 0; k < 4; ++k) {
        product[4 * column + row] +=
            double{face.view[4 * k + row]} * double{face.model[4 * column + k]};
      }
    }
  }
  return product;
}

bool IsFinite(const FaceResult& face) {
  const auto finite = [](float v) { return std::isfinite(v); };
  return std::all_of(face.projection.begin(), face.projection.end(), finite) &&
         std::all_of(face.view.begin(), face.view.end(), finite) &&
         std::all_of(face.model.begin(), face.model.end(), finite) &&
         std::all_of(face.landmarks3d.begin(), face.landmarks3d.end(), finite);
}

PixelPoint ProjectToPixel(const FaceResult& face, const TrackHeader& header, double x, double y,
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
  return {(clip[0] / clip[3] + 1) / 2 * ViewportSize(header.upright_width()) - 0.5,
          (1 - clip[1] / clip[3]) / 2 * ViewportSize(header.upright_height()) - 0.5};
}

}  // namespace n3ds::tool
