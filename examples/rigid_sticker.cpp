// SPDX-License-Identifier: MIT
// A sticker on one face, from landmarks to its place in the image.
//   rigid_sticker data/face_model.bin < examples/one_face.txt
#include <array>
#include <cstdio>
#include <iostream>
#include <vector>

#include "norvale_3d_sticker_engine.h"

// The pixel of a sticker's point (mm on the mean head): what OpenGL does with the three matrices.
static std::array<float, 2> ToPixel(const Norvale_3DSticker_Face_Matrix& face, int width,
                                    int height, std::array<float, 4> point) {
  for (const float* matrix : {face.modelMatrix, face.viewMatrix, face.projectionMatrix}) {
    std::array<float, 4> moved{};
    for (unsigned k = 0; k < 16; ++k) moved[k % 4] += matrix[k] * point[k / 4];
    point = moved;
  }
  return {(point[0] / point[3] + 1) / 2 * static_cast<float>(width),
          (1 - point[1] / point[3]) / 2 * static_cast<float>(height)};
}

int main(int argc, char** argv) {
  NSVL_OFFSCREEN image{};
  unsigned landmarks = 0;
  unsigned faces = 0;
  if (argc != 2 || !(std::cin >> image.width >> image.height >> landmarks)) return 2;
  std::vector<__tag_point> points(landmarks);
  std::vector<float> landmarks3d(3 * points.size());

  void* engine = Norvale_3DSticker_CreateEngine();
  MRESULT result = Norvale_3DSticker_Initialize(engine, argv[1], 0, 0);
  Norvale_3DSticker_Matrix_Array out{};
  out.faces[0].landmarks3D = landmarks3d.data();
  while (result == N3DS_OK && std::cin >> faces && faces == 1) {
    for (__tag_point& point : points) std::cin >> point.x >> point.y;
    result = Norvale_3DSticker_Process(engine, &image, 1, landmarks, points.data(), nullptr,
                                       nullptr, &out);
    const auto hat = ToPixel(out.faces[0], image.width, image.height, {0, 130, 0, 1});
    std::printf("hat at %.0f %.0f\n", static_cast<double>(hat[0]), static_cast<double>(hat[1]));
  }
  Norvale_3DSticker_DestroyEngine(engine);
  return result == N3DS_OK ? 0 : 1;
}
