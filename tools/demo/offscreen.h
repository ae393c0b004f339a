// Offscreen surfaces for the demo: one EGL context + pbuffer per GL surface the app would own
// (keyboard, field pop-up, top pop-up), on Mesa's surfaceless platform (tools/common), a canvas
// they are pasted onto, and its PNG output.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "common/egl_pbuffer.h"

namespace demo {

using OffscreenSurface = tessel::host::GlesContext;

// The surface's colour buffer, RGBA8, top row first (made current first).
inline std::vector<std::uint8_t> readSurface(OffscreenSurface& surface) {
  surface.makeCurrent();
  return surface.readRgba();
}

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
