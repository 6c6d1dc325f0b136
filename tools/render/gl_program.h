// SPDX-License-Identifier: MIT
// A linked pair of shaders.
#pragma once

#include <GLES3/gl3.h>

namespace n3ds::tool {

class GlProgram {
 public:
  // Sources without the version line. Throws Error with the compiler's message.
  GlProgram(const char* vertex_source, const char* fragment_source);
  ~GlProgram();
  GlProgram(const GlProgram&) = delete;
  GlProgram& operator=(const GlProgram&) = delete;

  void Use() const { glUseProgram(program_); }
  GLint Uniform(const char* name) const { return glGetUniformLocation(program_, name); }

 private:
  GLuint program_;
};

}  // namespace n3ds::tool
