// Drawing primitives of the artwork generator: a floating-point RGBA canvas, anti-aliased
// shapes given as signed distance functions, FreeType text, and RGBA output.
//
// Design space: every image is drawn in "screen pixels", the size at which the keyboard shows
// it on the reference surface (1080 x 720, 10 x 4 keys). A canvas maps image pixel (i, j) to
// design point (i * sx, j * sy), so an image the renderer stretches non-uniformly (the pad's
// tall done key, the field frame) is drawn pre-distorted and looks right once stretched.
// Coverage is supersampled per image pixel, so edges are anti-aliased in the image's own grid.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace artgen {

struct Color {
  float r, g, b, a;
};

// 0xRRGGBB with an alpha of 1 (or `alpha`).
Color hex(std::uint32_t rgb, float alpha = 1.0f);
Color mix(Color a, Color b, float t);

// Signed distance in design pixels: negative inside.
using Sdf = std::function<float(float x, float y)>;

Sdf roundRect(float x0, float y0, float x1, float y1, float radius);
Sdf circle(float cx, float cy, float radius);
Sdf capsule(float ax, float ay, float bx, float by, float halfWidth);
Sdf polygon(std::vector<float> xy);                 // closed, either winding
Sdf unite(Sdf a, Sdf b);
Sdf smoothUnite(Sdf a, Sdf b, float k);             // rounded fillet of width ~k
Sdf subtract(Sdf a, Sdf b);
Sdf outline(Sdf a, float halfWidth);                // a ring of the given half width
Sdf shift(Sdf a, float dx, float dy);

class Canvas {
 public:
  Canvas(int width, int height, float sx = 1.0f, float sy = 1.0f);
  int width() const { return width_; }
  int height() const { return height_; }
  float sx() const { return sx_; }
  float sy() const { return sy_; }
  float designWidth() const { return width_ * sx_; }
  float designHeight() const { return height_ * sy_; }

  // Paints `color` where the shape is, "over" what is there. feather = 0 gives a crisp,
  // supersampled edge; feather > 0 a soft edge that fades over that many design pixels.
  void fill(const Sdf& shape, Color color, float feather = 0.0f);
  // Same, with a vertical colour ramp from `top` (at design y0) to `bottom` (at design y1).
  void fillGradient(const Sdf& shape, Color top, Color bottom, float y0, float y1);
  // Composites an 8-bit coverage mask (mask pixels = image pixels) at image offset (ox, oy).
  void paintMask(const std::vector<std::uint8_t>& mask, int mw, int mh, int ox, int oy, Color color);

  // Straight-alpha RGBA8. Fully transparent pixels take the colour of the nearest painted
  // pixels, so the renderer's linear filter never pulls a dark fringe into an edge.
  std::vector<std::uint8_t> toRgba8() const;

 private:
  void blend(int i, int j, Color c, float coverage);
  int width_, height_;
  float sx_, sy_;
  std::vector<float> px_;  // premultiplied RGBA
};

// A FreeType face at a pixel size with optional synthetic emboldening (design pixels).
struct TextStyle {
  std::string fontFile;   // file name inside the font folder
  float emPixels;
  float embolden = 0.0f;  // added stroke width in pixels
};

struct TextMask {
  std::vector<std::uint8_t> coverage;
  int width = 0, height = 0;
  int left = 0;      // pen origin to the mask's left column
  int top = 0;       // baseline to the mask's top row (positive = above)
  float advance = 0; // total advance width
};

// Renders a UTF-8 string (ASCII plus a few symbols) on one baseline, with kerning.
TextMask renderText(const TextStyle& style, const std::string& text);
// Height above the baseline of capital letters and of 'x', for this style.
float capHeight(const TextStyle& style);
float xHeight(const TextStyle& style);

// Draws text with the ink box centred horizontally at cx and the baseline at `baseline`
// (image pixels).
void drawTextCentered(Canvas& canvas, const TextStyle& style, const std::string& text, float cx, float baseline,
                      Color color);
// Draws text whose cap height is centred vertically on cy.
void drawLabel(Canvas& canvas, const TextStyle& style, const std::string& text, float cx, float cy, Color color);

}  // namespace artgen
