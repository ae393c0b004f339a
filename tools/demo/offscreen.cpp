// The demo's canvas and its PNG output.
#include "offscreen.h"

#include "common/png_file.h"

namespace demo {

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
  return tessel::host::writePng(path, canvas.width, canvas.height, canvas.rgba);
}

}  // namespace demo
