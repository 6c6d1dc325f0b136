// SPDX-License-Identifier: MIT
#include "render/scene.h"

#include <algorithm>
#include <cmath>

#include "engine/face_model_file.h"
#include "render/obj_file.h"
#include "render/shapes.h"
#include "support/data_files.h"

namespace n3ds::tool {
namespace {

// Lit from the upper left before the head, softly from all sides; seen from both sides, because a
// hat has an inside.
const char kSolidVertex[] = R"(
layout(location = 0) in vec3 position;
layout(location = 1) in vec3 normal;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
out vec3 eye_position;
out vec3 eye_normal;
void main() {
  vec4 eye = view * model * vec4(position, 1.0);
  eye_position = eye.xyz;
  eye_normal = mat3(view) * mat3(model) * normal;
  gl_Position = projection * eye;
})";

const char kSolidFragment[] = R"(
in vec3 eye_position;
in vec3 eye_normal;
uniform vec3 colour;
uniform float opacity;
uniform float gloss;
out vec4 result;
void main() {
  vec3 n = normalize(gl_FrontFacing ? eye_normal : -eye_normal);
  vec3 to_light = normalize(vec3(-0.45, 0.75, 0.70));
  vec3 to_viewer = normalize(-eye_position);
  float sky = 0.5 + 0.5 * n.y;
  float direct = max(dot(n, to_light), 0.0);
  float highlight = pow(max(dot(n, normalize(to_light + to_viewer)), 0.0), mix(20.0, 150.0, gloss)) * gloss;
  vec3 lit = colour * (mix(0.30, 0.50, sky) + 0.60 * direct) + vec3(highlight);
  result = vec4(lit, clamp(opacity + highlight, 0.0, 1.0));
})";

const char kDotVertex[] = R"(
layout(location = 0) in vec3 position;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
uniform float size;
void main() {
  gl_Position = projection * view * model * vec4(position, 1.0);
  gl_PointSize = size;
})";

const char kDotFragment[] = R"(
uniform float size;
out vec4 result;
void main() {
  float radius = length(gl_PointCoord - 0.5) * size;
  result = vec4(0.10, 0.95, 0.55, clamp(0.5 * size - radius, 0.0, 1.0));
})";

// One triangle over the whole picture; `place` runs from (0, 0) in the upper left corner to (1, 1).
const char kGroundVertex[] = R"(
out vec2 place;
void main() {
  vec2 corner = vec2(float((gl_VertexID << 1) & 2), float(gl_VertexID & 2));
  place = vec2(corner.x, 1.0 - corner.y);
  gl_Position = vec4(corner * 2.0 - 1.0, 0.0, 1.0);
})";

const char kGroundFragment[] = R"(
in vec2 place;
uniform bool has_picture;
uniform sampler2D picture;
out vec4 result;
void main() {
  float shade = 0.62 - 0.22 * place.y - 0.10 * length(place - 0.5);
  result = has_picture ? vec4(texture(picture, place).rgb, 1.0)
                       : vec4(vec3(0.92, 0.97, 1.04) * shade, 1.0);
})";

// The mask picture on the dense mesh. Its colours are multiplied by their alpha beforehand, so that
// what hides in transparent places does not bleed over the edges.
const char kMaskVertex[] = R"(
layout(location = 0) in vec3 position;
layout(location = 1) in vec3 normal;
layout(location = 2) in vec2 texture_coordinate;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
out vec3 eye_normal;
out vec2 place;
void main() {
  eye_normal = mat3(view) * mat3(model) * normal;
  place = texture_coordinate;
  gl_Position = projection * (view * model * vec4(position, 1.0));
})";

const char kMaskFragment[] = R"(
in vec3 eye_normal;
in vec2 place;
uniform sampler2D picture;
out vec4 result;
void main() {
  vec3 n = normalize(eye_normal);
  float direct = max(dot(n, normalize(vec3(-0.45, 0.75, 0.70))), 0.0);
  vec4 colour = texture(picture, place);
  result = vec4(min(colour.rgb * (0.68 + 0.42 * direct), vec3(colour.a)), colour.a);
})";

// Every triangle's own edges, by the distance to them; an edge that two triangles share is drawn
// half by each.
const char kWireVertex[] = R"(
layout(location = 0) in vec3 position;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
out vec3 weights;
void main() {
  int corner = gl_VertexID % 3;
  weights = vec3(corner == 0, corner == 1, corner == 2);
  gl_Position = projection * (view * model * vec4(position, 1.0));
})";

const char kWireFragment[] = R"(
in vec3 weights;
uniform vec3 colour;
uniform float half_width;
out vec4 result;
void main() {
  vec3 distances = weights / fwidth(weights);
  float nearest = min(distances.x, min(distances.y, distances.z));
  float opacity = clamp(half_width + 0.5 - nearest, 0.0, 1.0);
  result = 0.85 * opacity * vec4(colour, 1.0);
})";

const Material kPlaster = {{0.80F, 0.74F, 0.69F}, 1, 0.08F};

void SetMatrices(const GlProgram& program, const FaceResult& face, const Matrix4& model) {
  program.Use();
  glUniformMatrix4fv(program.Uniform("projection"), 1, GL_FALSE, face.projection.data());
  glUniformMatrix4fv(program.Uniform("view"), 1, GL_FALSE, face.view.data());
  glUniformMatrix4fv(program.Uniform("model"), 1, GL_FALSE, model.data());
}

GLuint UploadTexture(const Picture& picture) {
  GLuint texture = 0;
  glGenTextures(1, &texture);
  glBindTexture(GL_TEXTURE_2D, texture);
  glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA8, picture.width, picture.height, 0, GL_RGBA,
               GL_UNSIGNED_BYTE, picture.rgba.data());
  // Photos are often larger than what is drawn: without smaller copies they would flicker.
  glGenerateMipmap(GL_TEXTURE_2D);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR_MIPMAP_LINEAR);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
  return texture;
}

Picture Premultiplied(Picture picture) {
  for (std::size_t i = 0; i < picture.rgba.size(); i += 4) {
    for (std::size_t k = 0; k < 3; ++k) {
      picture.rgba[i + k] =
          static_cast<std::uint8_t>((picture.rgba[i + k] * picture.rgba[i + 3] + 127) / 255);
    }
  }
  return picture;
}

}  // namespace

Scene::Scene(const TrackHeader& header, const std::string& model_path, const SceneParts& parts,
             const std::optional<Picture>& background, int width, int height,
             const std::optional<Picture>& mask)
    : header_(header),
      parts_(parts),
      target_(width, height),
      solid_(kSolidVertex, kSolidFragment),
      dots_(kDotVertex, kDotFragment),
      ground_(kGroundVertex, kGroundFragment),
      mask_(kMaskVertex, kMaskFragment),
      wire_(kWireVertex, kWireFragment),
      face_(FaceMesh(ReadFaceModelFile(model_path))),
      skull_(SkullMesh()),
      open_skull_(OpenSkullMesh()),
      glasses_(ReadObj(StickerPath("glasses.obj"))),
      hat_(ReadObj(StickerPath("hat.obj"))),
      tripod_(TripodMesh()) {
  glGenVertexArrays(1, &dot_array_);
  glGenBuffers(1, &dot_buffer_);
  if (background) background_ = UploadTexture(*background);
  if (mask) mask_picture_ = UploadTexture(Premultiplied(*mask));
}

Scene::~Scene() {
  glDeleteTextures(1, &mask_picture_);
  glDeleteTextures(1, &background_);
  glDeleteBuffers(1, &dot_buffer_);
  glDeleteVertexArrays(1, &dot_array_);
}

Picture Scene::Draw(const FrameResult& frame, const std::vector<float>& texture_coordinates) {
  target_.Bind();
  glViewport(0, 0, target_.width(), target_.height());
  glClear(GL_DEPTH_BUFFER_BIT);
  DrawBackground();

  const auto viewport = [](int target, int upright) {
    return static_cast<GLsizei>(
        std::lround(static_cast<double>(target) * ViewportSize(upright) / upright));
  };
  const GLsizei width = viewport(target_.width(), header_.upright_width());
  const GLsizei height = viewport(target_.height(), header_.upright_height());
  glViewport(0, target_.height() - height, width, height);

  std::vector<const FaceResult*> faces;
  for (const FaceResult& face : frame.faces) {
    if (!IsFinite(face)) continue;
    if (!face.corners.empty()) meshes_[faces.size()].Update(face.corners, texture_coordinates);
    faces.push_back(&face);
  }
  glEnable(GL_DEPTH_TEST);
  glDepthFunc(GL_LEQUAL);
  for (std::size_t i = 0; i < faces.size(); ++i) DrawHead(*faces[i], meshes_[i]);
  for (const FaceResult* face : faces) DrawStickers(*face, true);
  // What lets the ground shine through comes last and hides nothing: masks, then lenses.
  glEnable(GL_BLEND);
  glBlendFuncSeparate(GL_ONE, GL_ONE_MINUS_SRC_ALPHA, GL_ZERO, GL_ONE);
  glDepthMask(GL_FALSE);
  for (std::size_t i = 0; i < faces.size(); ++i) {
    if (faces[i]->corners.empty()) continue;
    if (mask_picture_ != 0) DrawMask(*faces[i], meshes_[i]);
    if (parts_.wireframe) DrawWireframe(*faces[i], meshes_[i]);
  }
  glBlendFuncSeparate(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA, GL_ZERO, GL_ONE);
  for (const FaceResult* face : faces) DrawStickers(*face, false);
  glDisable(GL_DEPTH_TEST);
  if (parts_.landmarks) {
    for (const FaceResult* face : faces) DrawLandmarks(*face);
  }
  glDepthMask(GL_TRUE);
  glDisable(GL_BLEND);
  return target_.Read();
}

void Scene::DrawBackground() const {
  ground_.Use();
  glBindTexture(GL_TEXTURE_2D, background_);
  glUniform1i(ground_.Uniform("has_picture"), background_ != 0 ? 1 : 0);
  glUniform1i(ground_.Uniform("picture"), 0);
  glBindVertexArray(dot_array_);
  glDrawArrays(GL_TRIANGLES, 0, 3);
}

void Scene::DrawHead(const FaceResult& face, const MaskMesh& mesh) const {
  const auto show = [](bool seen) {
    const GLboolean mask = seen ? GL_TRUE : GL_FALSE;
    glColorMask(mask, mask, mask, GL_FALSE);
  };
  // A hair's breadth back, so that what is drawn on the very same surface lies before it.
  glEnable(GL_POLYGON_OFFSET_FILL);
  glPolygonOffset(1, 1);
  if (face.corners.empty()) {
    show(parts_.head);
    DrawMesh(face_, face, true);
  } else {
    show(parts_.head || parts_.mesh);
    SetMatrices(solid_, face, face.model);
    SetMaterial(kPlaster);
    mesh.Draw();
  }
  show(parts_.head);
  DrawMesh(face.corners.empty() ? skull_ : open_skull_, face, true);
  glDisable(GL_POLYGON_OFFSET_FILL);
  glColorMask(GL_TRUE, GL_TRUE, GL_TRUE, GL_TRUE);
}

void Scene::DrawMask(const FaceResult& face, const MaskMesh& mesh) const {
  SetMatrices(mask_, face, face.model);
  glUniform1i(mask_.Uniform("picture"), 0);
  glBindTexture(GL_TEXTURE_2D, mask_picture_);
  // Paint on the skin has no inside.
  glEnable(GL_CULL_FACE);
  mesh.Draw();
  glDisable(GL_CULL_FACE);
}

void Scene::DrawWireframe(const FaceResult& face, const MaskMesh& mesh) const {
  const bool on_skin = parts_.head || parts_.mesh;
  SetMatrices(wire_, face, face.model);
  // Dark on the light mesh, light on everything else.
  if (on_skin) {
    glUniform3f(wire_.Uniform("colour"), 0.10F, 0.20F, 0.38F);
  } else {
    glUniform3f(wire_.Uniform("colour"), 0.75F, 0.95F, 1.0F);
  }
  glUniform1f(wire_.Uniform("half_width"), 0.3F);
  glEnable(GL_CULL_FACE);
  mesh.Draw();
  glDisable(GL_CULL_FACE);
}

void Scene::SetMaterial(const Material& material) const {
  glUniform3fv(solid_.Uniform("colour"), 1, material.colour.data());
  glUniform1f(solid_.Uniform("opacity"), material.opacity);
  glUniform1f(solid_.Uniform("gloss"), material.gloss);
}

void Scene::DrawStickers(const FaceResult& face, bool opaque) const {
  if (parts_.hat) DrawMesh(hat_, face, opaque);
  if (parts_.glasses) DrawMesh(glasses_, face, opaque);
  if (parts_.axes) DrawMesh(tripod_, face, opaque);
}

void Scene::DrawMesh(const GpuMesh& mesh, const FaceResult& face, bool opaque) const {
  SetMatrices(solid_, face, HeadModel(face));
  for (const MeshPart& part : mesh.parts()) {
    if ((part.material.opacity >= 1) != opaque) continue;
    SetMaterial(part.material);
    mesh.DrawPart(part);
  }
}

void Scene::DrawLandmarks(const FaceResult& face) const {
  SetMatrices(dots_, face, face.model);
  // In proportion to the face, so that lids and lips stay apart: 150 mm is a head's breadth.
  const double depth = -ModelView(face)[14];
  const double breadth =
      150 / depth * static_cast<double>(face.projection[0]) / 2 * target_.width();
  glUniform1f(dots_.Uniform("size"), static_cast<float>(std::clamp(0.018 * breadth, 1.5, 6.0)));
  glBindVertexArray(dot_array_);
  glBindBuffer(GL_ARRAY_BUFFER, dot_buffer_);
  glBufferData(GL_ARRAY_BUFFER, static_cast<GLsizeiptr>(face.landmarks3d.size() * sizeof(float)),
               face.landmarks3d.data(), GL_STREAM_DRAW);
  glEnableVertexAttribArray(0);
  glVertexAttribPointer(0, 3, GL_FLOAT, GL_FALSE, 0, nullptr);
  glDrawArrays(GL_POINTS, 0, static_cast<GLsizei>(face.landmarks3d.size() / 3));
  glDisableVertexAttribArray(0);
}

}  // namespace n3ds::tool
