// SPDX-License-Identifier: MIT
#include "render/gl_program.h"

#include <string>

#include "support/error.h"

namespace n3ds::tool {
namespace {

GLuint Compile(GLenum kind, const char* source) {
  const char* const sources[] = {"#version 300 es\nprecision highp float;\n", source};
  const GLuint shader = glCreateShader(kind);
  glShaderSource(shader, 2, sources, nullptr);
  glCompileShader(shader);
  GLint compiled = GL_FALSE;
  glGetShaderiv(shader, GL_COMPILE_STATUS, &compiled);
  if (compiled == GL_TRUE) return shader;
  char message[512] = "";
  glGetShaderInfoLog(shader, sizeof message, nullptr, message);
  glDeleteShader(shader);
  throw Error(std::string("the graphics system refuses a shader: ") + message);
}

}  // namespace

GlProgram::GlProgram(const char* vertex_source, const char* fragment_source)
    : program_(glCreateProgram()) {
  const GLuint vertex = Compile(GL_VERTEX_SHADER, vertex_source);
  const GLuint fragment = Compile(GL_FRAGMENT_SHADER, fragment_source);
  glAttachShader(program_, vertex);
  glAttachShader(program_, fragment);
  glLinkProgram(program_);
  glDeleteShader(vertex);
  glDeleteShader(fragment);
  GLint linked = GL_FALSE;
  glGetProgramiv(program_, GL_LINK_STATUS, &linked);
  if (linked != GL_TRUE) {
    glDeleteProgram(program_);
    throw Error("the graphics system cannot link the shaders");
  }
}

GlProgram::~GlProgram() { glDeleteProgram(program_); }

}  // namespace n3ds::tool
