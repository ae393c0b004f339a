// libpng's simplified read and write API when the tests link libpng; a refusal otherwise.
#include "support/png_file.h"

#if defined(TESSEL_HAVE_PNG)
#include <png.h>
#endif

namespace tessel::test {

bool writePng(const std::string& path, int width, int height, const std::vector<std::uint8_t>& rgba) {
#if defined(TESSEL_HAVE_PNG)
  if (width <= 0 || height <= 0 || rgba.size() < static_cast<std::size_t>(width) * height * 4) return false;
  png_image image{};
  image.version = PNG_IMAGE_VERSION, image.format = PNG_FORMAT_RGBA;
  image.width = static_cast<png_uint_32>(width), image.height = static_cast<png_uint_32>(height);
  return png_image_write_to_file(&image, path.c_str(), 0, rgba.data(), 0, nullptr) != 0;
#else
  (void)path, (void)width, (void)height, (void)rgba;
  return false;
#endif
}

bool readPng(const std::string& path, int& width, int& height, std::vector<std::uint8_t>& rgba) {
#if defined(TESSEL_HAVE_PNG)
  png_image image{};
  image.version = PNG_IMAGE_VERSION;
  if (!png_image_begin_read_from_file(&image, path.c_str())) return false;
  image.format = PNG_FORMAT_RGBA;
  rgba.assign(PNG_IMAGE_SIZE(image), 0);
  width = static_cast<int>(image.width), height = static_cast<int>(image.height);
  return png_image_finish_read(&image, nullptr, rgba.data(), 0, nullptr) != 0;
#else
  (void)path, (void)width, (void)height, (void)rgba;
  return false;
#endif
}

}  // namespace tessel::test
