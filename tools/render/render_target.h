// SPDX-License-Identifier: MIT
// An image to draw into, several samples a pixel for smooth edges.
#pragma once

#include <GLES3/gl3.h>

#include "render/image.h"

namespace n3ds::tool {

class RenderTarget {
 public:
  // Throws Error when the graphics system cannot provide an image of this size.
  RenderTarget(int width, int height);
  ~RenderTarget();
  RenderTarget(const RenderTarget&) = delete;
  RenderTarget& operator=(const RenderTarget&) = delete;

  int width() const { return width_; }
  int height() const { return height_; }
  void Bind() const;
  // What has been drawn, rows from the top.
  Image Read() const;

 private:
  int width_;
  int height_;
  GLuint framebuffers_[2] = {};   // drawn into, and resolved to one sample
  GLuint renderbuffers_[3] = {};  // colour and depth of the first, colour of the second
};

}  // namespace n3ds::tool
