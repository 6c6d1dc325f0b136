// SPDX-License-Identifier: MIT
// An OpenGL ES 3 context without a window or display, current on the thread that made it.
#pragma once

#include <EGL/egl.h>

namespace n3ds::tool {

class EglContext {
 public:
  // Throws Error when the system has no OpenGL ES 3.
  EglContext();
  ~EglContext();
  EglContext(const EglContext&) = delete;
  EglContext& operator=(const EglContext&) = delete;

 private:
  EGLDisplay display_ = EGL_NO_DISPLAY;
  EGLContext context_ = EGL_NO_CONTEXT;
};

}  // namespace n3ds::tool
