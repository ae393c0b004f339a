// An offscreen OpenGL ES 1.1 context for the tests, the benchmarks and the demo (header-only, host
// side; the library never links EGL): Mesa's surfaceless EGL platform with a pbuffer, so the
// library's GL calls run on a real driver (llvmpipe) without a window system. One EGLDisplay per
// process; each GlesContext owns its context and pbuffer, like each of the app's GL surfaces
// (texture names are per context).
#pragma once

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES/gl.h>

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

namespace tessel::host {

// The current context's colour buffer, width x height from the bottom-left corner, as RGBA8 with
// the top row first (glReadPixels delivers the bottom row first).
inline std::vector<std::uint8_t> readFramebuffer(int width, int height) {
  const std::size_t row = static_cast<std::size_t>(width) * 4;
  std::vector<std::uint8_t> bottomUp(row * height), out(row * height);
  glPixelStorei(GL_PACK_ALIGNMENT, 1);
  glReadPixels(0, 0, width, height, GL_RGBA, GL_UNSIGNED_BYTE, bottomUp.data());
  for (int y = 0; y < height; ++y) std::memcpy(&out[row * y], &bottomUp[row * (height - 1 - y)], row);
  return out;
}

class GlesContext {
 public:
  GlesContext(int width, int height) : width_(width), height_(height) {
    static const EGLDisplay shared = [] {  // one per process, kept to the end
      EGLDisplay d = eglGetPlatformDisplay(EGL_PLATFORM_SURFACELESS_MESA, EGL_DEFAULT_DISPLAY, nullptr);
      return d != EGL_NO_DISPLAY && eglInitialize(d, nullptr, nullptr) ? d : EGL_NO_DISPLAY;
    }();
    display_ = shared;
    if (display_ == EGL_NO_DISPLAY) {
      error_ = "no EGL surfaceless display (is Mesa's libegl-mesa0 installed?)";
      return;
    }
    const EGLint configAttributes[] = {EGL_SURFACE_TYPE, EGL_PBUFFER_BIT, EGL_RENDERABLE_TYPE, EGL_OPENGL_ES_BIT,
                                       EGL_RED_SIZE, 8, EGL_GREEN_SIZE, 8, EGL_BLUE_SIZE, 8, EGL_ALPHA_SIZE, 8,
                                       EGL_DEPTH_SIZE, 16, EGL_NONE};
    const EGLint surfaceAttributes[] = {EGL_WIDTH, width, EGL_HEIGHT, height, EGL_NONE};
    const EGLint contextAttributes[] = {EGL_CONTEXT_CLIENT_VERSION, 1, EGL_NONE};
    EGLConfig config = nullptr;
    EGLint count = 0;
    eglBindAPI(EGL_OPENGL_ES_API);
    if (!eglChooseConfig(display_, configAttributes, &config, 1, &count) || count < 1) {
      error_ = "no RGBA8 + depth pbuffer config for OpenGL ES 1";
    } else if ((surface_ = eglCreatePbufferSurface(display_, config, surfaceAttributes)) == EGL_NO_SURFACE) {
      error_ = "eglCreatePbufferSurface failed";
    } else if ((context_ = eglCreateContext(display_, config, EGL_NO_CONTEXT, contextAttributes)) == EGL_NO_CONTEXT) {
      error_ = "eglCreateContext (ES 1) failed";
    } else if (!makeCurrent()) {
      error_ = "eglMakeCurrent failed";
    }
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

  // The colour buffer as RGBA8, top row first.
  std::vector<std::uint8_t> readRgba() const { return readFramebuffer(width_, height_); }

 private:
  int width_, height_;
  std::string error_;
  EGLDisplay display_ = EGL_NO_DISPLAY;
  EGLSurface surface_ = EGL_NO_SURFACE;
  EGLContext context_ = EGL_NO_CONTEXT;
};

}  // namespace tessel::host
