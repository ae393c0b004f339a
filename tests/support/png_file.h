// PNG files for test output (screenshots of rendered surfaces), through libpng. Test-only.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tessel::test {

// Writes RGBA8 pixels (top row first) as a PNG. False when libpng is not available to the
// tests or the file cannot be written.
bool writePng(const std::string& path, int width, int height, const std::vector<std::uint8_t>& rgba);
// Reads a PNG as RGBA8, top row first. False when it cannot be read (or without libpng).
bool readPng(const std::string& path, int& width, int& height, std::vector<std::uint8_t>& rgba);

}  // namespace tessel::test
