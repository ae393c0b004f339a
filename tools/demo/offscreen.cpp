// EGL surfaceless + pbuffer contexts and libpng output for the demo.
#include "offscreen.h"

#include <EGL/eglext.h>
#include <GLES/gl.h>
#include <png.h>

#include <algorithm>
#include <cstdio>

namespace demo {
namespace {

EGLDisplay sharedDisplay(std::string& error) {
  static EGLDisplay display = [] {
    auto getPlatformDisplay =
        reinterpret_cast<PFNEGLGETPLATFORMDISPLAYEXTPROC>(eglGetProcAddress("eglGetPlatformDisplayEXT"));
    if (getPlatformDisplay == nullptr) return EGL_NO_DISPLAY;
    EGLDisplay d = getPlatformDisplay(EGL_PLATFORM_SURFACELESS_MESA, EGL_DEFAULT_DISPLAY, nullptr);
    if (d == EGL_NO_DISPLAY || !eglInitialize(d, nullptr, nullptr)) return EGL_NO_DISPLAY;
    return d;
  }();
  if (display == EGL_NO_DISPLAY) error = "no EGL surfaceless display (is Mesa's libegl-mesa0 installed?)";
  return display;
}

}  // namespace

OffscreenSurface::OffscreenSurface(int width, int height) : width_(width), height_(height) {
  display_ = sharedDisplay(error_);
  if (display_ == EGL_NO_DISPLAY) return;
  const EGLint configAttributes[] = {EGL_SURFACE_TYPE, EGL_PBUFFER_BIT, EGL_RENDERABLE_TYPE, EGL_OPENGL_ES_BIT,
                                     EGL_RED_SIZE, 8, EGL_GREEN_SIZE, 8, EGL_BLUE_SIZE, 8, EGL_ALPHA_SIZE, 8,
                                     EGL_DEPTH_SIZE, 16, EGL_NONE};
  EGLConfig config = nullptr;
  EGLint count = 0;
  if (!eglChooseConfig(display_, configAttributes, &config, 1, &count) || count < 1) {
    error_ = "no RGBA8 pbuffer config for OpenGL ES 1";
    return;
  }
  const EGLint surfaceAttributes[] = {EGL_WIDTH, width, EGL_HEIGHT, height, EGL_NONE};
  surface_ = eglCreatePbufferSurface(display_, config, surfaceAttributes);
  eglBindAPI(EGL_OPENGL_ES_API);
  const EGLint contextAttributes[] = {EGL_CONTEXT_CLIENT_VERSION, 1, EGL_NONE};
  context_ = eglCreateContext(display_, config, EGL_NO_CONTEXT, contextAttributes);
  if (surface_ == EGL_NO_SURFACE || context_ == EGL_NO_CONTEXT || !makeCurrent())
    error_ = "cannot create an OpenGL ES 1.1 pbuffer context";
}

OffscreenSurface::~OffscreenSurface() {
  if (display_ == EGL_NO_DISPLAY) return;
  eglMakeCurrent(display_, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
  if (context_ != EGL_NO_CONTEXT) eglDestroyContext(display_, context_);
  if (surface_ != EGL_NO_SURFACE) eglDestroySurface(display_, surface_);
}

bool OffscreenSurface::makeCurrent() {
  return eglMakeCurrent(display_, surface_, surface_, context_) == EGL_TRUE;
}

std::vector<std::uint8_t> OffscreenSurface::read() {
  makeCurrent();
  const std::size_t row = static_cast<std::size_t>(width_) * 4;
  std::vector<std::uint8_t> bottomUp(row * height_), out(row * height_);
  glPixelStorei(GL_PACK_ALIGNMENT, 1);
  glReadPixels(0, 0, width_, height_, GL_RGBA, GL_UNSIGNED_BYTE, bottomUp.data());
  for (int y = 0; y < height_; ++y)
    std::copy_n(&bottomUp[row * (height_ - 1 - y)], row, &out[row * y]);
  return out;
}

Canvas::Canvas(int w, int h, std::uint32_t fill) : width(w), height(h), rgba(static_cast<std::size_t>(w) * h * 4) {
  for (std::size_t k = 0; k < rgba.size(); k += 4) {
    rgba[k] = static_cast<std::uint8_t>(fill >> 24);
    rgba[k + 1] = static_cast<std::uint8_t>(fill >> 16);
    rgba[k + 2] = static_cast<std::uint8_t>(fill >> 8);
    rgba[k + 3] = static_cast<std::uint8_t>(fill);
  }
}

void Canvas::paste(const std::vector<std::uint8_t>& image, int w, int h, int x0, int y0) {
  for (int y = 0; y < h && y0 + y < height; ++y) {
    for (int x = 0; x < w && x0 + x < width; ++x) {
      const std::uint8_t* s = &image[(static_cast<std::size_t>(y) * w + x) * 4];
      std::uint8_t* d = &rgba[(static_cast<std::size_t>(y0 + y) * width + (x0 + x)) * 4];
      const unsigned a = s[3];
      for (int c = 0; c < 3; ++c) d[c] = static_cast<std::uint8_t>((s[c] * a + d[c] * (255 - a)) / 255);
      d[3] = 255;
    }
  }
}

bool writePng(const std::string& path, const Canvas& canvas) {
  FILE* f = std::fopen(path.c_str(), "wb");
  if (f == nullptr) return false;
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png ? png_create_info_struct(png) : nullptr;
  if (png == nullptr || info == nullptr || setjmp(png_jmpbuf(png))) {
    png_destroy_write_struct(&png, &info);
    std::fclose(f);
    return false;
  }
  png_init_io(png, f);
  png_set_IHDR(png, info, canvas.width, canvas.height, 8, PNG_COLOR_TYPE_RGBA, PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  png_set_compression_level(png, 3);
  png_write_info(png, info);
  for (int y = 0; y < canvas.height; ++y)
    png_write_row(png, const_cast<png_bytep>(&canvas.rgba[static_cast<std::size_t>(y) * canvas.width * 4]));
  png_write_end(png, info);
  png_destroy_write_struct(&png, &info);
  return std::fclose(f) == 0;
}

}  // namespace demo
