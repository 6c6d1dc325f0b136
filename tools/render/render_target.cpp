// SPDX-License-Identifier: MIT
#include "render/render_target.h"

#include <algorithm>
#include <cstddef>
#include <string>

#include "support/error.h"

namespace n3ds::tool {

RenderTarget::RenderTarget(int width, int height) : width_(width), height_(height) {
  constexpr GLint kSamples = 4;
  GLint samples = 0;
  glGetIntegerv(GL_MAX_SAMPLES, &samples);
  samples = std::min(samples, kSamples);
  glGenFramebuffers(2, framebuffers_);
  glGenRenderbuffers(3, renderbuffers_);
  const auto storage = [&](int index, GLint count, GLenum format) {
    glBindRenderbuffer(GL_RENDERBUFFER, renderbuffers_[index]);
    glRenderbufferStorageMultisample(GL_RENDERBUFFER, count, format, width, height);
  };
  storage(0, samples, GL_RGBA8);
  storage(1, samples, GL_DEPTH_COMPONENT24);
  storage(2, 0, GL_RGBA8);
  const auto attach = [&](int framebuffer, GLenum point, int index) {
    glBindFramebuffer(GL_FRAMEBUFFER, framebuffers_[framebuffer]);
    glFramebufferRenderbuffer(GL_FRAMEBUFFER, point, GL_RENDERBUFFER, renderbuffers_[index]);
  };
  attach(1, GL_COLOR_ATTACHMENT0, 2);
  attach(0, GL_COLOR_ATTACHMENT0, 0);
  attach(0, GL_DEPTH_ATTACHMENT, 1);
  if (glCheckFramebufferStatus(GL_FRAMEBUFFER) != GL_FRAMEBUFFER_COMPLETE) {
    throw Error("an image of " + std::to_string(width) + " x " + std::to_string(height) +
                " pixels cannot be drawn here");
  }
}

RenderTarget::~RenderTarget() {
  glDeleteFramebuffers(2, framebuffers_);
  glDeleteRenderbuffers(3, renderbuffers_);
}

void RenderTarget::Bind() const { glBindFramebuffer(GL_FRAMEBUFFER, framebuffers_[0]); }

Image RenderTarget::Read() const {
  glBindFramebuffer(GL_READ_FRAMEBUFFER, framebuffers_[0]);
  glBindFramebuffer(GL_DRAW_FRAMEBUFFER, framebuffers_[1]);
  glBlitFramebuffer(0, 0, width_, height_, 0, 0, width_, height_, GL_COLOR_BUFFER_BIT, GL_NEAREST);
  glBindFramebuffer(GL_READ_FRAMEBUFFER, framebuffers_[1]);
  Image image(width_, height_);
  glReadPixels(0, 0, width_, height_, GL_RGBA, GL_UNSIGNED_BYTE, image.rgba.data());
  Bind();
  // OpenGL's first row is the lowest.
  const std::size_t row = 4 * static_cast<std::size_t>(width_);
  for (int y = 0; y < height_ / 2; ++y) {
    std::uint8_t* upper = image.Pixel(0, y);
    std::swap_ranges(upper, upper + row, image.Pixel(0, height_ - 1 - y));
  }
  return image;
}

}  // namespace n3ds::tool
