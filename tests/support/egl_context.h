// An offscreen OpenGL ES 1.1 context for tests and benchmarks (header-only): Mesa's surfaceless
// EGL platform with a pbuffer surface, so the library's GL calls run on a real driver
// (llvmpipe) without a window system. One EGLDisplay per process; each GlesContext owns its
// context and pbuffer, like each of the app's GL surfaces (texture names are per context).
#pragma once

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES/gl.h>

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

namespace tessel::test {

class GlesContext {
 public:
  GlesContext(int width, int height) : width_(width), height_(height) {
    display_ = sharedDisplay(error_);
    if (display_ == EGL_NO_DISPLAY) return;
    const EGLint configAttributes[] = {EGL_SURFACE_TYPE, EGL_PBUFFER_BIT, EGL_RENDERABLE_TYPE, EGL_OPENGL_ES_BIT,
                                       EGL_RED_SIZE, 8, EGL_GREEN_SIZE, 8, EGL_BLUE_SIZE, 8, EGL_ALPHA_SIZE, 8,
                                       EGL_DEPTH_SIZE, 16, EGL_NONE};
    EGLConfig config = nullptr;
    EGLint count = 0;
    if (!eglChooseConfig(display_, configAttributes, &config, 1, &count) || count < 1)
      { error_ = "no RGBA8 + depth pbuffer config for OpenGL ES 1"; return; }
    const EGLint surfaceAttributes[] = {EGL_WIDTH, width, EGL_HEIGHT, height, EGL_NONE};
    surface_ = eglCreatePbufferSurface(display_, config, surfaceAttributes);
    if (surface_ == EGL_NO_SURFACE) { error_ = "eglCreatePbufferSurface failed"; return; }
    eglBindAPI(EGL_OPENGL_ES_API);
    const EGLint contextAttributes[] = {EGL_CONTEXT_CLIENT_VERSION, 1, EGL_NONE};
    context_ = eglCreateContext(display_, config, EGL_NO_CONTEXT, contextAttributes);
    if (context_ == EGL_NO_CONTEXT) { error_ = "eglCreateContext (ES 1) failed"; return; }
    if (!makeCurrent()) error_ = "eglMakeCurrent failed";
  }

  ~GlesContext() {
    if (display_ == EGL_NO_DISPLAY) return;
    eglMakeCurrent(display_, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
    if (context_ != EGL_NO_CONTEXT) eglDestroyContext(display_, context_);
    if (surface_ != EGL_NO_SURFACE) eglDestroySurface(display_, surface_);
  }

  GlesContext(const GlesContext&) = delete;
  GlesContext& operator=(const GlesContext&) = delete;

  bool ok() const { return error_.empty(); }
  const std::string& error() const { return error_; }
  int width() const { return width_; }
  int height() const { return height_; }

  bool makeCurrent() { return eglMakeCurrent(display_, surface_, surface_, context_) == EGL_TRUE; }

  // The colour buffer as RGBA8, top row first (glReadPixels delivers the bottom row first).
  std::vector<std::uint8_t> readRgba() const {
    const std::size_t row = static_cast<std::size_t>(width_) * 4;
    std::vector<std::uint8_t> bottomUp(row * height_), out(row * height_);
    glPixelStorei(GL_PACK_ALIGNMENT, 1);
    glReadPixels(0, 0, width_, height_, GL_RGBA, GL_UNSIGNED_BYTE, bottomUp.data());
    for (int y = 0; y < height_; ++y)
      std::memcpy(&out[row * y], &bottomUp[row * (height_ - 1 - y)], row);
    return out;
  }

 private:
  static EGLDisplay sharedDisplay(std::string& error) {
    static std::string failure;
    static EGLDisplay display = [] {
      auto getPlatformDisplay =
          reinterpret_cast<PFNEGLGETPLATFORMDISPLAYEXTPROC>(eglGetProcAddress("eglGetPlatformDisplayEXT"));
      if (getPlatformDisplay == nullptr) {
        failure = "eglGetPlatformDisplayEXT unavailable";
        return EGL_NO_DISPLAY;
      }
      EGLDisplay d = getPlatformDisplay(EGL_PLATFORM_SURFACELESS_MESA, EGL_DEFAULT_DISPLAY, nullptr);
      EGLint major = 0, minor = 0;
      if (d == EGL_NO_DISPLAY || !eglInitialize(d, &major, &minor)) {
        failure = "surfaceless EGL display could not be initialised";
        return EGL_NO_DISPLAY;
      }
      return d;
    }();
    error = failure;
    return display;
  }

  int width_, height_;
  std::string error_;
  EGLDisplay display_ = EGL_NO_DISPLAY;
  EGLSurface surface_ = EGL_NO_SURFACE;
  EGLContext context_ = EGL_NO_CONTEXT;
};

}  // namespace tessel::test
