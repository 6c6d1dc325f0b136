// SPDX-License-Identifier: MIT
#include "render/scene.h"

#include <algorithm>
#include <cmath>

#include "model/face_model_file.h"
#include "render/obj_file.h"
#include "render/shaders.h"
#include "render/shapes.h"
#include "support/data_files.h"

namespace n3ds::tool {
namespace {

const Material kPlaster = {{0.80F, 0.74F, 0.69F}, 1, 0.08F};

void SetMatrices(const GlProgram& program, const FaceResult& face, const Matrix4& model) {
  program.Use();
  glUniformMatrix4fv(program.Uniform("projection"), 1, GL_FALSE, face.projection.data());
  glUniformMatrix4fv(program.Uniform("view"), 1, GL_FALSE, face.view.data());
  glUniformMatrix4fv(program.Uniform("model"), 1, GL_FALSE, model.data());
}

GLuint UploadTexture(const Image& image) {
  GLuint texture = 0;
  glGenTextures(1, &texture);
  glBindTexture(GL_TEXTURE_2D, texture);
  glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA8, image.width, image.height, 0, GL_RGBA, GL_UNSIGNED_BYTE,
               image.rgba.data());
  // Photos are often larger than what is drawn: without smaller copies they would flicker.
  glGenerateMipmap(GL_TEXTURE_2D);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR_MIPMAP_LINEAR);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
  return texture;
}

Image Premultiplied(Image image) {
  for (std::size_t i = 0; i < image.rgba.size(); i += 4) {
    for (std::size_t k = 0; k < 3; ++k) {
      image.rgba[i + k] =
          static_cast<std::uint8_t>((image.rgba[i + k] * image.rgba[i + 3] + 127) / 255);
    }
  }
  return image;
}

}  // namespace

Scene::Scene(const TrackHeader& header, const std::string& model_path, const SceneParts& parts,
             const std::optional<Image>& background, int width, int height,
             const std::optional<Image>& mask)
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
  if (mask) mask_image_ = UploadTexture(Premultiplied(*mask));
}

Scene::~Scene() {
  glDeleteTextures(1, &mask_image_);
  glDeleteTextures(1, &background_);
  glDeleteBuffers(1, &dot_buffer_);
  glDeleteVertexArrays(1, &dot_array_);
}

Image Scene::Draw(const FrameResult& frame, const std::vector<float>& texture_coordinates) {
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
    if (mask_image_ != 0) DrawMask(*faces[i], meshes_[i]);
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
  glUniform1i(ground_.Uniform("has_image"), background_ != 0 ? 1 : 0);
  glUniform1i(ground_.Uniform("image"), 0);
  glBindVertexArray(dot_array_);
  glDrawArrays(GL_TRIANGLES, 0, 3);
}

void Scene::DrawHead(const FaceResult& face, const MaskMesh& mesh) const {
  const auto show = [](bool seen) {
    const GLboolean mask = seen ? GL_TRUE : GL_FALSE;
    glColorMask(mask, mask, mask, GL_FALSE);
  };
  // Slightly back, so that what is drawn on the very same surface lies before it.
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
  glUniform1i(mask_.Uniform("image"), 0);
  glBindTexture(GL_TEXTURE_2D, mask_image_);
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
