// SPDX-License-Identifier: MIT
// Draws what a user of stickers sees: an image or a plain ground, and on every face a hat and a
// pair of glasses, placed by nothing but the engine's three matrices, or its dense mesh, lit, as
// wireframe or under a mask image.
//
// Everything is drawn in the upright, unmirrored image.
#pragma once

#include <array>
#include <optional>
#include <string>
#include <vector>

#include "engine/face_results.h"
#include "render/egl_context.h"
#include "render/gl_program.h"
#include "render/gpu_mesh.h"
#include "render/image.h"
#include "render/mask_mesh.h"
#include "render/render_target.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

struct SceneParts {
  bool glasses = true;
  bool hat = true;
  bool axes = false;
  bool landmarks = false;
  bool head = false;  // draw the head itself instead of only letting it hide what is behind it
  bool mesh = false;  // draw the face's dense mesh alone; as all below, in mask mode only
  bool wireframe = false;
};

class Scene {
 public:
  // `background` is upright already; without one the ground is plain. `mask` is drawn on the dense
  // meshes of mask mode. Throws Error when the model or an asset cannot be read or the graphics
  // system refuses.
  Scene(const TrackHeader& header, const std::string& model_path, const SceneParts& parts,
        const std::optional<Image>& background, int width, int height,
        const std::optional<Image>& mask = std::nullopt);
  ~Scene();

  // The result stays valid on its own. Faces without a finite pose are left out. Meshes need the
  // engine's texture coordinates, u, v per corner.
  Image Draw(const FrameResult& frame, const std::vector<float>& texture_coordinates = {});

 private:
  void DrawBackground() const;
  void DrawHead(const FaceResult& face, const MaskMesh& mesh) const;
  void DrawMask(const FaceResult& face, const MaskMesh& mesh) const;
  void DrawWireframe(const FaceResult& face, const MaskMesh& mesh) const;
  void DrawStickers(const FaceResult& face, bool opaque) const;
  void DrawMesh(const GpuMesh& mesh, const FaceResult& face, bool opaque) const;
  void SetMaterial(const Material& material) const;
  void DrawLandmarks(const FaceResult& face) const;

  EglContext context_;
  TrackHeader header_;
  SceneParts parts_;
  RenderTarget target_;
  GlProgram solid_;
  GlProgram dots_;
  GlProgram ground_;
  GlProgram mask_;
  GlProgram wire_;
  GpuMesh face_;
  GpuMesh skull_;
  GpuMesh open_skull_;
  GpuMesh glasses_;
  GpuMesh hat_;
  GpuMesh tripod_;
  GLuint dot_array_ = 0;
  GLuint dot_buffer_ = 0;
  GLuint background_ = 0;  // texture, 0 without
  GLuint mask_image_ = 0;  // the same
  std::array<MaskMesh, kMaxTrackFaces> meshes_;
};

}  // namespace n3ds::tool
