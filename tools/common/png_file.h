// RGBA8 pixels (top row first) to and from PNG files through libpng's simplified API, for the
// host-side programs (the render suites' reviewed pictures, the demo's frames, the artwork's
// contact sheets; the library never links libpng). Header-only: a program that links libpng
// defines TESSEL_HAVE_PNG; without it every call refuses.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#if defined(TESSEL_HAVE_PNG)
#include <png.h>
#endif

namespace tessel::host {

#if defined(TESSEL_HAVE_PNG)
inline bool writePng(const std::string& path, int width, int height, const std::vector<std::uint8_t>& rgba) {
  png_image image{};
  image.version = PNG_IMAGE_VERSION;
  image.format = PNG_FORMAT_RGBA;
  image.width = static_cast<png_uint_32>(width);
  image.height = static_cast<png_uint_32>(height);
  return png_image_write_to_file(&image, path.c_str(), 0, rgba.data(), 0, nullptr) != 0;
}

inline bool readPng(const std::string& path, int& width, int& height, std::vector<std::uint8_t>& rgba) {
  png_image image{};
  image.version = PNG_IMAGE_VERSION;
  if (!png_image_begin_read_from_file(&image, path.c_str())) return false;
  image.format = PNG_FORMAT_RGBA;
  rgba.assign(PNG_IMAGE_SIZE(image), 0);
  width = static_cast<int>(image.width);
  height = static_cast<int>(image.height);
  return png_image_finish_read(&image, nullptr, rgba.data(), 0, nullptr) != 0;
}
#else
inline bool writePng(const std::string&, int, int, const std::vector<std::uint8_t>&) { return false; }
inline bool readPng(const std::string&, int&, int&, std::vector<std::uint8_t>&) { return false; }
#endif

}  // namespace tessel::host
