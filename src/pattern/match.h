// Whole-text matching for callers outside the pattern engine.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

// Compiles `pattern` (flags 0) and matches the whole of text[0, length). False for a null,
// empty or malformed pattern.
bool wholeMatch(const char* pattern, const std::uint8_t* text, std::size_t length);

}  // namespace tessel
