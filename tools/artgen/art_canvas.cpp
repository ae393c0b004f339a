// Canvas, signed-distance shapes and FreeType text for the artwork generator.
#include "art_canvas.h"

#include <ft2build.h>
#include FT_FREETYPE_H
#include FT_OUTLINE_H

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <map>
#include <stdexcept>

namespace artgen {

namespace {

constexpr int kSupersample = 5;  // 5 x 5 samples per image pixel

float clamp01(float v) { return v < 0 ? 0 : (v > 1 ? 1 : v); }

float smoothstep(float e0, float e1, float x) {
  const float t = clamp01((x - e0) / (e1 - e0));
  return t * t * (3 - 2 * t);
}

}  // namespace

Color hex(std::uint32_t rgb, float alpha) {
  return {((rgb >> 16) & 255) / 255.0f, ((rgb >> 8) & 255) / 255.0f, (rgb & 255) / 255.0f, alpha};
}

Color mix(Color a, Color b, float t) {
  return {a.r + (b.r - a.r) * t, a.g + (b.g - a.g) * t, a.b + (b.b - a.b) * t, a.a + (b.a - a.a) * t};
}

// ---- shapes

Sdf roundRect(float x0, float y0, float x1, float y1, float radius) {
  const float cx = (x0 + x1) / 2, cy = (y0 + y1) / 2;
  const float hx = (x1 - x0) / 2 - radius, hy = (y1 - y0) / 2 - radius;
  return [=](float x, float y) {
    const float qx = std::fabs(x - cx) - hx, qy = std::fabs(y - cy) - hy;
    const float ox = std::max(qx, 0.0f), oy = std::max(qy, 0.0f);
    return std::sqrt(ox * ox + oy * oy) + std::min(std::max(qx, qy), 0.0f) - radius;
  };
}

Sdf circle(float cx, float cy, float radius) {
  return [=](float x, float y) { return std::hypot(x - cx, y - cy) - radius; };
}

Sdf capsule(float ax, float ay, float bx, float by, float halfWidth) {
  return [=](float x, float y) {
    const float px = x - ax, py = y - ay, dx = bx - ax, dy = by - ay;
    const float len2 = dx * dx + dy * dy;
    const float t = len2 > 0 ? clamp01((px * dx + py * dy) / len2) : 0.0f;
    return std::hypot(px - dx * t, py - dy * t) - halfWidth;
  };
}

Sdf polygon(std::vector<float> xy) {
  return [pts = std::move(xy)](float x, float y) {
    const std::size_t n = pts.size() / 2;
    float best = 1e30f;
    bool inside = false;
    for (std::size_t i = 0, j = n - 1; i < n; j = i++) {
      const float xi = pts[2 * i], yi = pts[2 * i + 1], xj = pts[2 * j], yj = pts[2 * j + 1];
      const float ex = xi - xj, ey = yi - yj, wx = x - xj, wy = y - yj;
      const float len2 = ex * ex + ey * ey;
      const float t = len2 > 0 ? clamp01((wx * ex + wy * ey) / len2) : 0.0f;
      best = std::min(best, std::hypot(wx - ex * t, wy - ey * t));
      if ((yi > y) != (yj > y) && x < (xj - xi) * (y - yi) / (yj - yi) + xi) inside = !inside;
    }
    return inside ? -best : best;
  };
}

Sdf unite(Sdf a, Sdf b) {
  return [=](float x, float y) { return std::min(a(x, y), b(x, y)); };
}

Sdf smoothUnite(Sdf a, Sdf b, float k) {
  return [=](float x, float y) {
    const float da = a(x, y), db = b(x, y);
    const float h = clamp01(0.5f + 0.5f * (db - da) / k);
    return db + (da - db) * h - k * h * (1 - h);
  };
}

Sdf subtract(Sdf a, Sdf b) {
  return [=](float x, float y) { return std::max(a(x, y), -b(x, y)); };
}

Sdf outline(Sdf a, float halfWidth) {
  return [=](float x, float y) { return std::fabs(a(x, y)) - halfWidth; };
}

Sdf shift(Sdf a, float dx, float dy) {
  return [=](float x, float y) { return a(x - dx, y - dy); };
}

// ---- canvas

Canvas::Canvas(int width, int height, float sx, float sy)
    : width_(width), height_(height), sx_(sx), sy_(sy), px_(static_cast<std::size_t>(width) * height * 4, 0.0f) {}

void Canvas::blend(int i, int j, Color c, float coverage) {
  if (coverage <= 0) return;
  float* p = &px_[(static_cast<std::size_t>(j) * width_ + i) * 4];
  const float a = c.a * coverage;
  p[0] = c.r * a + p[0] * (1 - a);
  p[1] = c.g * a + p[1] * (1 - a);
  p[2] = c.b * a + p[2] * (1 - a);
  p[3] = a + p[3] * (1 - a);
}

void Canvas::fill(const Sdf& shape, Color color, float feather) {
  if (feather <= 0) {
    fillGradient(shape, color, color, 0, 0);
    return;
  }
  for (int j = 0; j < height_; ++j)
    for (int i = 0; i < width_; ++i) {
      const float d = shape((i + 0.5f) * sx_, (j + 0.5f) * sy_);
      blend(i, j, color, 1 - smoothstep(-feather / 2, feather / 2, d));
    }
}

void Canvas::fillGradient(const Sdf& shape, Color top, Color bottom, float y0, float y1) {
  for (int j = 0; j < height_; ++j) {
    for (int i = 0; i < width_; ++i) {
      float cov = 0;
      for (int b = 0; b < kSupersample; ++b)
        for (int a = 0; a < kSupersample; ++a) {
          const float x = (i + (a + 0.5f) / kSupersample) * sx_;
          const float y = (j + (b + 0.5f) / kSupersample) * sy_;
          if (shape(x, y) < 0) cov += 1;
        }
      cov /= kSupersample * kSupersample;
      const float yc = (j + 0.5f) * sy_;
      blend(i, j, mix(top, bottom, y1 > y0 ? clamp01((yc - y0) / (y1 - y0)) : 0.0f), cov);
    }
  }
}

void Canvas::paintMask(const std::vector<std::uint8_t>& mask, int mw, int mh, int ox, int oy, Color color) {
  for (int y = 0; y < mh; ++y)
    for (int x = 0; x < mw; ++x) {
      const int i = ox + x, j = oy + y;
      if (i < 0 || j < 0 || i >= width_ || j >= height_) {
        if (mask[static_cast<std::size_t>(y) * mw + x] != 0)
          throw std::runtime_error("text runs off its image");
        continue;
      }
      blend(i, j, color, mask[static_cast<std::size_t>(y) * mw + x] / 255.0f);
    }
}

std::vector<std::uint8_t> Canvas::toRgba8() const {
  const std::size_t n = static_cast<std::size_t>(width_) * height_;
  std::vector<std::uint8_t> out(n * 4, 0);
  std::vector<int> owner(n, -1);  // painted pixel whose colour a transparent one borrows
  std::deque<std::size_t> queue;
  for (std::size_t k = 0; k < n; ++k) {
    const float a = px_[k * 4 + 3];
    const auto a8 = static_cast<std::uint8_t>(std::lround(clamp01(a) * 255));
    out[k * 4 + 3] = a8;
    if (a8 == 0) continue;
    for (int c = 0; c < 3; ++c)
      out[k * 4 + c] = static_cast<std::uint8_t>(std::lround(clamp01(px_[k * 4 + c] / a) * 255));
    owner[k] = static_cast<int>(k);
    queue.push_back(k);
  }
  while (!queue.empty()) {  // breadth-first bleed of colour into the transparent surroundings
    const std::size_t k = queue.front();
    queue.pop_front();
    const int i = static_cast<int>(k % width_), j = static_cast<int>(k / width_);
    const int di[4] = {1, -1, 0, 0}, dj[4] = {0, 0, 1, -1};
    for (int d = 0; d < 4; ++d) {
      const int ni = i + di[d], nj = j + dj[d];
      if (ni < 0 || nj < 0 || ni >= width_ || nj >= height_) continue;
      const std::size_t nk = static_cast<std::size_t>(nj) * width_ + ni;
      if (owner[nk] >= 0) continue;
      owner[nk] = owner[k];
      for (int c = 0; c < 3; ++c) out[nk * 4 + c] = out[static_cast<std::size_t>(owner[k]) * 4 + c];
      queue.push_back(nk);
    }
  }
  return out;
}

// ---- text

namespace {

FT_Library library() {
  static FT_Library lib = [] {
    FT_Library l = nullptr;
    if (FT_Init_FreeType(&l) != 0) throw std::runtime_error("FreeType init failed");
    return l;
  }();
  return lib;
}

FT_Face face(const std::string& file) {
  static std::map<std::string, FT_Face> faces;
  auto it = faces.find(file);
  if (it != faces.end()) return it->second;
  const char* dir = std::getenv("TESSEL_FONT_DIR");
  const std::string path = std::string(dir ? dir : TESSEL_ARTGEN_FONT_DIR) + "/" + file;
  FT_Face f = nullptr;
  if (FT_New_Face(library(), path.c_str(), 0, &f) != 0) throw std::runtime_error("cannot open font " + path);
  faces[file] = f;
  return f;
}

// Loads one glyph outline at the style's size, emboldened, shifted by a fractional pen offset.
FT_GlyphSlot loadOutline(const TextStyle& style, FT_UInt index, float penFraction) {
  FT_Face f = face(style.fontFile);
  FT_Set_Char_Size(f, 0, static_cast<FT_F26Dot6>(std::lround(style.emPixels * 64)), 72, 72);
  if (FT_Load_Glyph(f, index, FT_LOAD_NO_HINTING | FT_LOAD_NO_BITMAP) != 0)
    throw std::runtime_error("glyph load failed");
  FT_GlyphSlot slot = f->glyph;
  if (style.embolden > 0) FT_Outline_Embolden(&slot->outline, static_cast<FT_Pos>(std::lround(style.embolden * 64)));
  FT_Outline_Translate(&slot->outline, static_cast<FT_Pos>(std::lround(penFraction * 64)), 0);
  return slot;
}

std::vector<std::uint32_t> decodeUtf8(const std::string& s) {
  std::vector<std::uint32_t> out;
  for (std::size_t i = 0; i < s.size();) {
    const auto c = static_cast<unsigned char>(s[i]);
    int n = c < 0x80 ? 1 : (c >> 5) == 6 ? 2 : (c >> 4) == 14 ? 3 : 4;
    std::uint32_t cp = n == 1 ? c : c & (0x7F >> n);
    for (int k = 1; k < n && i + k < s.size(); ++k) cp = (cp << 6) | (static_cast<unsigned char>(s[i + k]) & 0x3F);
    out.push_back(cp);
    i += n;
  }
  return out;
}

}  // namespace

TextMask renderText(const TextStyle& style, const std::string& text) {
  struct Piece {
    std::vector<std::uint8_t> bits;
    int w, h, x, top;
  };
  std::vector<Piece> pieces;
  FT_Face f = face(style.fontFile);
  float pen = 0;
  FT_UInt previous = 0;
  for (std::uint32_t cp : decodeUtf8(text)) {
    const FT_UInt index = FT_Get_Char_Index(f, cp);
    if (index == 0) throw std::runtime_error("font lacks a character of \"" + text + "\"");
    FT_Set_Char_Size(f, 0, static_cast<FT_F26Dot6>(std::lround(style.emPixels * 64)), 72, 72);
    if (previous != 0 && FT_HAS_KERNING(f)) {
      FT_Vector k;
      FT_Get_Kerning(f, previous, index, FT_KERNING_UNFITTED, &k);
      pen += k.x / 64.0f;
    }
    const float whole = std::floor(pen);
    FT_GlyphSlot slot = loadOutline(style, index, pen - whole);
    const float advance = slot->advance.x / 64.0f + style.embolden;
    if (FT_Render_Glyph(slot, FT_RENDER_MODE_NORMAL) != 0) throw std::runtime_error("render failed");
    const FT_Bitmap& bm = slot->bitmap;
    Piece p{{}, static_cast<int>(bm.width), static_cast<int>(bm.rows), static_cast<int>(whole) + slot->bitmap_left,
            slot->bitmap_top};
    p.bits.resize(static_cast<std::size_t>(p.w) * p.h);
    for (int y = 0; y < p.h; ++y)
      for (int x = 0; x < p.w; ++x) p.bits[static_cast<std::size_t>(y) * p.w + x] = bm.buffer[y * bm.pitch + x];
    pieces.push_back(std::move(p));
    pen += advance;
    previous = index;
  }
  TextMask out;
  out.advance = pen;
  int x0 = 1 << 20, x1 = -(1 << 20), top = -(1 << 20), bottom = 1 << 20;
  for (const Piece& p : pieces) {
    if (p.w == 0 || p.h == 0) continue;
    x0 = std::min(x0, p.x);
    x1 = std::max(x1, p.x + p.w);
    top = std::max(top, p.top);
    bottom = std::min(bottom, p.top - p.h);
  }
  if (x1 <= x0) return out;
  out.width = x1 - x0;
  out.height = top - bottom;
  out.left = x0;
  out.top = top;
  out.coverage.assign(static_cast<std::size_t>(out.width) * out.height, 0);
  for (const Piece& p : pieces)
    for (int y = 0; y < p.h; ++y)
      for (int x = 0; x < p.w; ++x) {
        auto& dst = out.coverage[static_cast<std::size_t>(top - p.top + y) * out.width + (p.x - x0 + x)];
        dst = static_cast<std::uint8_t>(std::min(255, dst + p.bits[static_cast<std::size_t>(y) * p.w + x]));
      }
  return out;
}

namespace {
float heightOf(const TextStyle& style, char c) {
  FT_Face f = face(style.fontFile);
  FT_Set_Char_Size(f, 0, static_cast<FT_F26Dot6>(std::lround(style.emPixels * 64)), 72, 72);
  FT_GlyphSlot slot = loadOutline(style, FT_Get_Char_Index(f, static_cast<unsigned char>(c)), 0);
  FT_BBox box;
  FT_Outline_Get_CBox(&slot->outline, &box);
  return box.yMax / 64.0f;
}
}  // namespace

float capHeight(const TextStyle& style) { return heightOf(style, 'H'); }
float xHeight(const TextStyle& style) { return heightOf(style, 'x'); }

void drawTextCentered(Canvas& canvas, const TextStyle& style, const std::string& text, float cx, float baseline,
                      Color color) {
  const TextMask m = renderText(style, text);
  const int ox = static_cast<int>(std::lround(cx - m.width / 2.0f));
  const int oy = static_cast<int>(std::lround(baseline)) - m.top;
  canvas.paintMask(m.coverage, m.width, m.height, ox, oy, color);
}

void drawLabel(Canvas& canvas, const TextStyle& style, const std::string& text, float cx, float cy, Color color) {
  drawTextCentered(canvas, style, text, cx, cy + capHeight(style) / 2, color);
}

}  // namespace artgen
