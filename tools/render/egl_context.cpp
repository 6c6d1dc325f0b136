// SPDX-License-Identifier: MIT
#include "render/egl_context.h"

#include <EGL/eglext.h>

#include <string>

#include "support/error.h"

namespace n3ds::tool {
namespace {

[[noreturn]] void Fail(const std::string& step) {
  throw Error("drawing needs OpenGL ES 3 through EGL, which is not available (" + step + ")");
}

// The surfaceless platform needs no display server. Where it is missing, the default display may
// still serve.
EGLDisplay OpenDisplay() {
  const auto get_platform_display = reinterpret_cast<PFNEGLGETPLATFORMDISPLAYEXTPROC>(
      eglGetProcAddress("eglGetPlatformDisplayEXT"));
  if (get_platform_display != nullptr) {
    EGLDisplay display =
        get_platform_display(EGL_PLATFORM_SURFACELESS_MESA, EGL_DEFAULT_DISPLAY, nullptr);
    if (display != EGL_NO_DISPLAY && eglInitialize(display, nullptr, nullptr) == EGL_TRUE) {
      return display;
    }
  }
  EGLDisplay display = eglGetDisplay(EGL_DEFAULT_DISPLAY);
  if (display == EGL_NO_DISPLAY || eglInitialize(display, nullptr, nullptr) != EGL_TRUE) {
    Fail("no display");
  }
  return display;
}

}  // namespace

EglContext::EglContext() : display_(OpenDisplay()) {
  const EGLint config_attributes[] = {EGL_SURFACE_TYPE, EGL_PBUFFER_BIT, EGL_RENDERABLE_TYPE,
                                      EGL_OPENGL_ES3_BIT, EGL_NONE};
  EGLConfig config = nullptr;
  EGLint count = 0;
  const EGLint context_attributes[] = {EGL_CONTEXT_MAJOR_VERSION, 3, EGL_NONE};
  if (eglBindAPI(EGL_OPENGL_ES_API) == EGL_TRUE &&
      eglChooseConfig(display_, config_attributes, &config, 1, &count) == EGL_TRUE && count > 0) {
    context_ = eglCreateContext(display_, config, EGL_NO_CONTEXT, context_attributes);
  }
  if (context_ == EGL_NO_CONTEXT ||
      eglMakeCurrent(display_, EGL_NO_SURFACE, EGL_NO_SURFACE, context_) != EGL_TRUE) {
    if (context_ != EGL_NO_CONTEXT) eglDestroyContext(display_, context_);
    eglTerminate(display_);
    Fail("no context");
  }
}

EglContext::~EglContext() {
  eglMakeCurrent(display_, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
  eglDestroyContext(display_, context_);
  eglTerminate(display_);
  eglReleaseThread();
}

}  // namespace n3ds::tool
