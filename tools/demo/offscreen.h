// Offscreen surfaces for the demo: one EGL context + pbuffer per GL surface the app would own
// (keyboard, field pop-up, top pop-up), on Mesa's surfaceless platform, plus PNG output.
#pragma once

#include <EGL/egl.h>

#include <cstdint>
#include <string>
#include <vector>

namespace demo {

class OffscreenSurface {
 public:
  OffscreenSurface(int width, int height);
  ~OffscreenSurface();
  OffscreenSurface(const OffscreenSurface&) = delete;
  OffscreenSurface& operator=(const OffscreenSurface&) = delete;

  bool ok() const { return error_.empty(); }
  const std::string& error() const { return error_; }
  int width() const { return width_; }
  int height() const { return height_; }
  bool makeCurrent();
  // The colour buffer, RGBA8, top row first.
  std::vector<std::uint8_t> read();

 private:
  int width_, height_;
  EGLDisplay display_ = EGL_NO_DISPLAY;
  EGLSurface surface_ = EGL_NO_SURFACE;
  EGLContext context_ = EGL_NO_CONTEXT;
  std::string error_;
};

// An RGBA canvas that the three surfaces are pasted onto, as an app would lay them out.
struct Canvas {
  int width = 0, height = 0;
  std::vector<std::uint8_t> rgba;
  Canvas(int w, int h, std::uint32_t fill);
  // Alpha-blends an RGBA image (top row first) with its top-left corner at (x, y).
  void paste(const std::vector<std::uint8_t>& image, int w, int h, int x, int y);
};

bool writePng(const std::string& path, const Canvas& canvas);

}  // namespace demo
