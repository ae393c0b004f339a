// How much of each partly sampled image the renderer shows: the extents of the wide, square,
// shift and bar texture-coordinate sets of gl_draw.h, as fractions of the image's width (s) and
// height (t) from its top-left corner. Free of GL so that the artwork generator, which must keep
// every face inside the sampled part, and the artwork checks read the same numbers.
#pragma once

namespace tessel::render {

constexpr float kSampledHeight = 0.625f;  // t extent of every partly sampled face
constexpr float kSquareWidth = 0.625f;    // s extent of the character key faces
constexpr float kShiftWidth = 0.9375f;    // shift and delete faces
constexpr float kBarWidth = 0.9765f;      // switch and done faces

}  // namespace tessel::render
