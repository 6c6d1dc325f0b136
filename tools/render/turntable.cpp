// SPDX-License-Identifier: MIT
#include "render/turntable.h"

#include <array>
#include <cmath>

#include "render/egl_context.h"
#include "render/gl_program.h"
#include "render/gpu_mesh.h"
#include "render/render_target.h"
#include "render/shaders.h"
#include "render/shapes.h"

namespace n3ds::tool {
namespace {

constexpr double kProfile = 80;                        // degrees, the outermost views
constexpr float kDistance = 900;                       // mm from the camera to the head's middle
constexpr float kSpan = 250;                           // mm of the head that a view shows there
constexpr std::array<float, 3> kMiddle = {0, -8, 50};  // about which the head turns
constexpr float kDepth = 200;                          // mm, no face is deeper

using Matrix = std::array<float, 16>;  // column by column

Matrix Projection() {
  const float focus = 2 * kDistance / kSpan;
  const float near = kDistance - kDepth;
  const float far = kDistance + kDepth;
  Matrix m{};
  m[0] = focus;
  m[5] = focus;
  m[10] = (near + far) / (near - far);
  m[11] = -1;
  m[14] = 2 * near * far / (near - far);
  return m;
}

// Turned about the middle by `yaw`, positive to the image right, and set before the camera.
Matrix Turned(double yaw) {
  const auto cosine = static_cast<float>(std::cos(yaw));
  const auto sine = static_cast<float>(std::sin(yaw));
  const auto [x, y, z] = kMiddle;
  return {cosine,
          0,
          -sine,
          0,  //
          0,
          1,
          0,
          0,  //
          sine,
          0,
          cosine,
          0,  //
          -cosine * x - sine * z,
          -y,
          sine * x - cosine * z - kDistance,
          1};
}

double YawOf(int view, int views) {
  constexpr double kRadians = 0.017453292519943295;
  if (views == 1) return 0;
  return kRadians * kProfile * (2.0 * view / (views - 1) - 1);
}

}  // namespace

Image DrawTurntable(const Points& face, int views, int size) {
  const EglContext context;
  const RenderTarget target(size, size);
  const GlProgram program(kSolidVertex, kStudioFragment);
  const GpuMesh mesh(FaceMesh(face));
  Image row(views * size, size);
  target.Bind();
  glViewport(0, 0, size, size);
  glEnable(GL_DEPTH_TEST);
  program.Use();
  glUniformMatrix4fv(program.Uniform("projection"), 1, GL_FALSE, Projection().data());
  constexpr Matrix kIdentity = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1};
  glUniformMatrix4fv(program.Uniform("view"), 1, GL_FALSE, kIdentity.data());
  for (int view = 0; view < views; ++view) {
    target.Bind();
    glClearColor(0.16F, 0.17F, 0.19F, 1);
    glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
    glUniformMatrix4fv(program.Uniform("model"), 1, GL_FALSE, Turned(YawOf(view, views)).data());
    for (const MeshPart& part : mesh.parts()) {
      glUniform3fv(program.Uniform("colour"), 1, part.material.colour.data());
      mesh.DrawPart(part);
    }
    Paste(target.Read(), view * size, 0, row);
  }
  return row;
}

}  // namespace n3ds::tool
