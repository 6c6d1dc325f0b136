// SPDX-License-Identifier: MIT
#include "render/turntable.h"

#include <array>
#include <cmath>

#include "render/egl_context.h"
#include "render/gl_program.h"
#include "render/gpu_mesh.h"
#include "render/render_target.h"
#include "render/shapes.h"

namespace n3ds::tool {
namespace {

constexpr double kProfile = 80;                        // degrees, the outermost views
constexpr float kDistance = 900;                       // mm from the camera to the head's middle
constexpr float kSpan = 250;                           // mm of the head that a view shows there
constexpr std::array<float, 3> kMiddle = {0, -8, 50};  // about which the head turns
constexpr float kDepth = 200;                          // mm, no face is deeper

const char kVertexSource[] = R"(
layout(location = 0) in vec3 position;
layout(location = 1) in vec3 normal;
uniform mat4 projection;
uniform mat4 model;
out vec3 eye_position;
out vec3 eye_normal;
void main() {
  vec4 eye = model * vec4(position, 1.0);
  eye_position = eye.xyz;
  eye_normal = mat3(model) * normal;
  gl_Position = projection * eye;
})";

// As in a portrait studio: a strong light from the upper left, a weak one from the right, so that
// the form shows on both halves. The inside, seen through eyes and mouth, is dark.
const char kFragmentSource[] = R"(
in vec3 eye_position;
in vec3 eye_normal;
uniform vec3 colour;
out vec4 result;
void main() {
  vec3 n = normalize(eye_normal);
  vec3 to_viewer = normalize(-eye_position);
  vec3 to_light = normalize(vec3(-0.55, 0.60, 0.75));
  float direct = max(dot(n, to_light), 0.0);
  float fill = max(dot(n, normalize(vec3(0.80, 0.10, 0.50))), 0.0);
  float sky = 0.5 + 0.5 * n.y;
  float highlight = 0.10 * pow(max(dot(n, normalize(to_light + to_viewer)), 0.0), 22.0);
  vec3 lit = colour * (0.14 + 0.12 * sky + 0.66 * direct + 0.18 * fill) + vec3(highlight);
  result = vec4(gl_FrontFacing ? lit : 0.25 * colour, 1.0);
})";

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

Picture DrawTurntable(const Points& face, int views, int size) {
  const EglContext context;
  const RenderTarget target(size, size);
  const GlProgram program(kVertexSource, kFragmentSource);
  const GpuMesh mesh(FaceMesh(face));
  Picture row(views * size, size);
  target.Bind();
  glViewport(0, 0, size, size);
  glEnable(GL_DEPTH_TEST);
  program.Use();
  glUniformMatrix4fv(program.Uniform("projection"), 1, GL_FALSE, Projection().data());
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
