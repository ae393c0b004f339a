// tessel_artgen: draws the keyboard's embedded artwork and writes it for the library.
//
//   tessel_artgen <theme file> <image folder> [contact sheet.png]
//
// Writes one raw RGBA8 file per distinct picture (top row first, no padding), the assembler
// file images.S that embeds them with .incbin, image_data.h that declares them with their exact
// sizes, and optionally a PNG contact sheet of everything for review.
//
// The look: a calm keyboard whose colours come from the theme file (themes/light.theme: white
// character keys on cool grey, grey function keys, one bank-blue accent for the done key and the
// typing cursor; themes/dark.theme: its dark counterpart). Sizes and order never depend on it. Every picture is drawn at the size
// the renderer shows it on the reference surface (1080 x 720, keys 108 x 180, surface mode 1),
// and only inside the part of the texture that the renderer samples: character key faces in
// the top-left 0.625 x 0.625 of their 128 x 256 image, the space key in the top 0.625, and so
// on. Glyph strokes are kept at 8 px or more because the library minifies with GL_NEAREST and
// no mipmaps (in surface mode 0 a 64 x 128 glyph is shown at about 32 x 65).
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "art_canvas.h"
#define TESSEL_HAVE_PNG 1  // tessel_artgen is built only where libpng is (CMakeLists.txt)
#include "../common/png_file.h"
#include "render/glyph_index.h"
#include "render/sampled_fractions.h"

using namespace artgen;
namespace render = tessel::render;

namespace {

// ---- palette, from the theme file

// A theme file holds one colour per line, "name = #RRGGBB" (an optional second colour after the
// first gives a top-to-bottom ramp), '#' at the start of a line comments it out, and optionally
// "font = FILE.ttf" (a file in the font folder; "font_bold" likewise is unused and reserved).
struct Theme {
  Color panelTop, panelBottom, keyTop, keyBottom, heldTop, heldBottom, functionTop, functionBottom;
  Color accentTop, accentBottom, text, accentText, dot, cursor;
  std::string font = "DejaVuSans.ttf";
};

std::uint32_t parseHex(const std::string& word, const std::string& line) {
  if (word.size() != 7 || word[0] != '#' || word.find_first_not_of("0123456789abcdefABCDEF", 1) != std::string::npos)
    throw std::runtime_error("theme: not a #RRGGBB colour in \"" + line + "\"");
  return static_cast<std::uint32_t>(std::stoul(word.substr(1), nullptr, 16));
}

// Darkens a colour a little: the lower end of a key's ramp when the theme gives one colour.
Color lower(Color c) { return mix(c, hex(0x000000), 0.03f); }

Theme readTheme(const std::string& path) {
  std::ifstream f(path);
  if (!f) throw std::runtime_error("cannot read theme " + path);
  struct Entry {
    const char* name;
    Color *top, *bottom;
    bool seen;
  };
  Theme t;
  Entry entries[] = {{"panel", &t.panelTop, &t.panelBottom, false},    {"key", &t.keyTop, &t.keyBottom, false},
                     {"pressed", &t.heldTop, &t.heldBottom, false},   {"function", &t.functionTop, &t.functionBottom, false},
                     {"accent", &t.accentTop, &t.accentBottom, false}, {"text", &t.text, nullptr, false},
                     {"accent_text", &t.accentText, nullptr, false},   {"dot", &t.dot, nullptr, false},
                     {"cursor", &t.cursor, nullptr, false}};
  std::string line;
  while (std::getline(f, line)) {
    std::istringstream in(line);
    std::string name, eq, first, second;
    if (!(in >> name) || name[0] == '#') continue;
    if (!(in >> eq >> first) || eq != "=") throw std::runtime_error("theme: expected \"name = value\" in \"" + line + "\"");
    in >> second;
    if (name == "font") {
      t.font = first;
      continue;
    }
    Entry* e = nullptr;
    for (Entry& candidate : entries)
      if (name == candidate.name) e = &candidate;
    if (e == nullptr) throw std::runtime_error("theme: unknown colour \"" + name + "\"");
    *e->top = hex(parseHex(first, line));
    if (e->bottom) *e->bottom = second.empty() ? lower(*e->top) : hex(parseHex(second, line));
    e->seen = true;
  }
  for (const Entry& e : entries)
    if (!e.seen) throw std::runtime_error(std::string("theme: no colour for \"") + e.name + "\"");
  return t;
}

// What the pictures are drawn with: the colours, all derived from the theme once, and the font.
struct Palette {
  Color backgroundTop, backgroundBottom, keyTop, keyBottom, keyHeldTop, keyHeldBottom, functionTop, functionBottom;
  Color accentTop, accentBottom, keyShadow, ambientShadow, ink, labelInk, quietInk, onAccent, accentInk, dot, cursor;
  Color fieldBody, fieldRule;
  std::string font;
};

Palette paletteOf(const Theme& t) {
  Palette p;
  p.backgroundTop = t.panelTop, p.backgroundBottom = t.panelBottom;
  p.keyTop = t.keyTop, p.keyBottom = t.keyBottom, p.keyHeldTop = t.heldTop, p.keyHeldBottom = t.heldBottom;
  p.functionTop = t.functionTop, p.functionBottom = t.functionBottom;
  p.accentTop = t.accentTop, p.accentBottom = t.accentBottom;
  p.keyShadow = mix(t.panelBottom, hex(0x000000), 0.42f);
  p.keyShadow.a = 0.60f;
  p.ambientShadow = mix(t.panelBottom, hex(0x000000), 0.6f);
  p.ambientShadow.a = 0.14f;
  p.ink = t.text, p.labelInk = t.text, p.quietInk = mix(t.text, t.keyTop, 0.38f);
  p.onAccent = t.accentText, p.accentInk = mix(t.accentTop, t.accentBottom, 0.5f);
  p.dot = t.dot, p.cursor = t.cursor;
  p.fieldBody = t.keyTop, p.fieldRule = mix(t.keyTop, t.text, 0.25f);
  p.font = t.font;
  return p;
}

// ---- reference geometry (screen pixels): keys 108 x 180, grid unit 54 x 90
constexpr float kKw = 108.0f, kKh = 180.0f, kUx = kKw / 2, kUy = kKh / 2, kAspect = kKw / kKh;
constexpr float kPadUx = 0.953125f * 2.5f * kUx, kPadUy = 0.92611f * kUy;  // pad grid unit
constexpr float kKeyRadius = 12.0f;

struct Picture {
  std::string name;   // file stem and symbol suffix
  int width, height, count;
  std::vector<std::uint8_t> rgba;  // count images back to back
};

std::vector<Picture> gPictures;

void add(const std::string& name, const Canvas& c) {
  gPictures.push_back({name, c.width(), c.height(), 1, c.toRgba8()});
}

// ---- keys

struct KeyLook {
  Color top, bottom;
  bool shadow = true;
};

// A key body filling the design rectangle [0, w] x [0, h] less a hairline margin, with a crisp
// darker lower edge (the key's "thickness") and a faint ambient shadow.
void paintKey(const Palette& pal, Canvas& c, float w, float h, const KeyLook& look, float radius = kKeyRadius) {
  const float x0 = 2.0f, y0 = 1.0f, x1 = w - 2.0f, y1 = h - 3.5f;  // all ink stays inside w x h
  if (look.shadow) {
    c.fill(roundRect(x0, y0 + 0.5f, x1, y1 + 1.5f, radius), pal.ambientShadow, 2.0f);
    c.fill(roundRect(x0, y0 + 2.0f, x1, y1 + 2.0f, radius), pal.keyShadow);
  }
  c.fillGradient(roundRect(x0, y0, x1, y1, radius), look.top, look.bottom, y0, y1);
}

// Looks of the key faces (functions: the colours are known only once the theme is read).
KeyLook charKey(const Palette& pal) { return {pal.keyTop, pal.keyBottom}; }
KeyLook charKeyHeld(const Palette& pal) { return {pal.keyHeldTop, pal.keyHeldBottom}; }
KeyLook functionKey(const Palette& pal) { return {pal.functionTop, pal.functionBottom}; }
KeyLook functionKeyHeld(const Palette& pal) { return {pal.keyTop, pal.keyBottom}; }  // function keys light up when held
KeyLook accentKey(const Palette& pal) { return {pal.accentTop, pal.accentBottom}; }

// Character key faces: the renderer samples the top-left 80 x 160 of 128 x 256 and shows it
// at 0.815 x 0.884 of a cell (88 x 159).
Canvas charKeyFace(const Palette& pal, const KeyLook& look) {
  const float w = 0.815f * kKw, h = 0.884f * kKh;
  Canvas c(128, 256, w / (render::kSquareWidth * 128), h / (render::kSampledHeight * 256));
  paintKey(pal, c, w, h, look);
  return c;
}

// Shift/delete: 120 x 160 of 128 x 256 at 1.5 x 0.753 by 0.884 cells.
Canvas shiftDeleteFace(const Palette& pal, const KeyLook& look) {
  const float w = 2 * 1.5f * 0.753f * kUx, h = 0.884f * kKh;
  Canvas c(128, 256, w / (render::kShiftWidth * 128), h / (render::kSampledHeight * 256));
  paintKey(pal, c, w, h, look);
  return c;
}

// Switch (and done, whose held picture is this one): 0.9765 x 0.625 of the image, at about
// 4.5 x 0.9 key widths/heights.
Canvas barFace(const Palette& pal, int size, float w, float h, const KeyLook& look) {
  Canvas c(size, size, w / (render::kBarWidth * size), h / (render::kSampledHeight * size));
  paintKey(pal, c, w, h, look);
  return c;
}

// Space: 512 x 160 of 512 x 256, at 9.63 x 0.884 half-keys.
Canvas spaceFace(const Palette& pal, const KeyLook& look) {
  const float w = 2 * 5 * 0.963f * kUx, h = 0.884f * kKh;
  Canvas c(512, 256, w / 512.0f, h / (render::kSampledHeight * 256));
  paintKey(pal, c, w, h, look);
  return c;
}

// Pad keys use the whole image: 256 x 128 shown at 247 x 156.
Canvas padFace(const Palette& pal, const KeyLook& look) {
  const float w = 2 * 0.96065f * kPadUx, h = 2 * 0.93617f * kPadUy;
  Canvas c(256, 128, w / 256.0f, h / 128.0f);
  paintKey(pal, c, w, h, look, 10.0f);
  return c;
}

// The pad's done key covers two rows: 247 x 323 from a square image (pre-distorted corners).
Canvas padDoneFace(const Palette& pal, int size, const KeyLook& look) {
  const float w = 2 * 0.96065f * kPadUx, h = 2 * 2 * 0.96809f * kPadUy;
  Canvas c(size, size, w / size, h / size);
  paintKey(pal, c, w, h, look, 10.0f);
  return c;
}

// The key balloon: drawn over a held key, its head holds the enlarged glyph one key height
// higher and a short neck joins it to the key. Full image 128 x 256 shown at about
// 254 x 503 around a point 0.04 key heights above the key's top edge.
Canvas balloon(const Palette& pal) {
  const float halfW = (1 / kAspect) * 1.05f * 0.895f * 1.5f * kUx;
  const float halfH = 2 * 1.054f * 0.884f * 1.5f * kUy;
  Canvas c(128, 256, 2 * halfW / 128, 2 * halfH / 256);
  const float cx = halfW, cy = halfH;                  // balloon centre
  const float keyCy = cy + 0.08f * kUy + kUy;          // held key centre, below
  const float faceHalfW = 0.815f * kUx, faceHalfH = 0.884f * kUy;
  const float glyphCy = cy - (kUy - 0.1f * kUy - 0.08f * kUy);
  const float headHalfW = 76.0f, headTop = glyphCy - 74.0f, headBottom = glyphCy + 80.0f;
  const Sdf head = roundRect(cx - headHalfW, headTop, cx + headHalfW, headBottom, 24.0f);
  // A neck down to just inside the held key's top edge, well narrower than the key: the balloon
  // is scaled by key height, so a stem as wide as the face at the reference aspect came out
  // narrower than wider keys (tablets, landscape); the held face itself stays visible below.
  const float neckHalfW = 0.55f * faceHalfW, keyTop = keyCy - faceHalfH;
  const Sdf stem = roundRect(cx - neckHalfW, headBottom - 40.0f, cx + neckHalfW, keyTop + 14.0f, 10.0f);
  const Sdf shape = smoothUnite(head, stem, 18.0f);
  c.fill(shift(shape, 0, 1.0f), Color{pal.keyShadow.r, pal.keyShadow.g, pal.keyShadow.b, 0.22f}, 7.0f);
  c.fill(shift(shape, 0, 2.0f), pal.keyShadow);
  c.fill(outline(shape, 0.6f), Color{pal.fieldRule.r, pal.fieldRule.g, pal.fieldRule.b, 0.55f});
  c.fillGradient(shape, pal.keyTop, pal.keyBottom, headTop, keyCy + faceHalfH);
  return c;
}

// ---- glyphs: 64 x 128, the character centred on the image centre

TextStyle glyphStyle(const Palette& pal, bool lower) { return {pal.font, lower ? 73.0f : 68.0f, 2.8f}; }

// Narrows a text mask to at most maxWidth columns (area filter) and keeps its height, so a wide
// character (W, M, m, w, %, @) keeps the cap height or x-height of its group.
TextMask fitWidth(TextMask m, int maxWidth) {
  if (m.width <= maxWidth) return m;
  const float f = static_cast<float>(maxWidth) / m.width;
  std::vector<std::uint8_t> out(static_cast<std::size_t>(maxWidth) * m.height);
  for (int y = 0; y < m.height; ++y)
    for (int x = 0; x < maxWidth; ++x) {
      const float a = x / f, b = (x + 1) / f;  // source span of this column
      float sum = 0;
      for (int k = static_cast<int>(a); k < static_cast<int>(std::ceil(b)) && k < m.width; ++k)
        sum += m.coverage[static_cast<std::size_t>(y) * m.width + k] * (std::min(b, k + 1.0f) - std::max(a, static_cast<float>(k)));
      out[static_cast<std::size_t>(y) * maxWidth + x] = static_cast<std::uint8_t>(std::lround(std::min(255.0f, sum * f)));
    }
  m.coverage = std::move(out);
  m.width = maxWidth;
  return m;
}

void paintText(Canvas& c, const TextMask& m, float cx, float baseline, Color ink) {
  c.paintMask(m.coverage, m.width, m.height, static_cast<int>(std::lround(cx - m.width / 2.0f)),
              static_cast<int>(std::lround(baseline)) - m.top, ink);
}

// Glyph edges are steepened to about one texel: the top pop-up's surface keeps alpha squared
// (it blends onto transparent black), which thins soft edges, so with a soft ramp the same glyph
// looks regular there and bold in the keyboard's balloon. A steep edge looks the same in both.
void steepen(TextMask& m) {
  for (std::uint8_t& v : m.coverage) v = static_cast<std::uint8_t>(std::clamp((v - 128) * 2 + 128, 0, 255));
}

std::vector<std::uint8_t> glyphImage(const Palette& pal, char ch, bool lower) {
  Canvas c(64, 128);
  const TextStyle st = glyphStyle(pal, lower);
  const float baseline = lower ? 64.0f + xHeight(st) / 2 + 2.0f : 64.0f + capHeight(st) / 2;
  TextMask m = fitWidth(renderText(st, std::string(1, ch)), 56);
  steepen(m);
  paintText(c, m, 32.0f, baseline, pal.ink);
  return c.toRgba8();
}

void addGlyphGroup(const Palette& pal, const std::string& name, const std::vector<char>& chars, bool lower) {
  Picture p{name, 64, 128, static_cast<int>(chars.size()), {}};
  for (char ch : chars) {
    const auto img = glyphImage(pal, ch, lower);
    p.rgba.insert(p.rgba.end(), img.begin(), img.end());
  }
  gPictures.push_back(std::move(p));
}

// The punctuation of a symbol page, by glyph index 10..25: of the two characters sharing an
// index, the one in that page's character set.
std::vector<char> symbolPage(const std::string& pageSet) {
  std::vector<char> out(16, 0);
  for (char ch : pageSet) {
    const int index = tessel::glyphIndexOf(static_cast<std::uint8_t>(ch));
    if (index < 10 || index > 25 || out[index - 10] != 0) throw std::logic_error("symbol index table mismatch");
    out[index - 10] = ch;
  }
  return out;
}

// ---- labels and icons

// Labels are sized by the cap height they show on the reference surface, whatever the scale
// of their quad (screen pixels per texel, measured on the reference surface), so every function
// key's text stands at one visual size; a label too wide for its image is narrowed, not shrunk.
constexpr float kLabelCapPx = 30.0f;

Canvas label(const Palette& pal, int w, int h, float texelPx, const std::string& text, Color ink, float capPx = kLabelCapPx) {
  Canvas c(w, h);
  TextStyle st{pal.font, 40.0f, 0.0f};
  st.emPixels *= capPx / texelPx / capHeight(st);
  st.embolden = st.emPixels * 0.05f;
  const TextMask m = fitWidth(renderText(st, text), w - 8);
  paintText(c, m, w / 2.0f, h / 2.0f + capHeight(st) / 2, ink);
  return c;
}

// Space label: only the top 256 x 80 is sampled and it is magnified about 2.1 to 2.7 times
// over a quad larger than the key, so the content stays small and central.
Canvas spaceLabel(const Palette& pal) {
  Canvas c(256, 128);
  const TextStyle st{pal.font, 14.5f, 0.9f};
  const std::string text = "Secure keyboard";
  const TextMask m = renderText(st, text);
  const float lockW = 11.0f, gap = 5.0f;
  const float total = lockW + gap + m.width;
  const float x0 = 128.0f - total / 2, cy = 40.0f;
  const float cap = capHeight(st);
  // padlock: a shackle ring over a rounded body, the body's top at cap-height middle
  const float bodyTop = cy - 1.0f, bodyBottom = cy + cap / 2 + 0.5f;
  const float lx = x0 + lockW / 2;
  const Sdf shackle = subtract(outline(roundRect(lx - 3.6f, bodyTop - 8.5f, lx + 3.6f, bodyTop + 4.0f, 3.6f), 1.1f),
                               roundRect(lx - 10, bodyTop + 0.5f, lx + 10, bodyTop + 12, 0));
  c.fill(unite(shackle, roundRect(x0, bodyTop, x0 + lockW, bodyBottom, 1.8f)), pal.quietInk);
  c.paintMask(m.coverage, m.width, m.height, static_cast<int>(std::lround(x0 + lockW + gap)),
              static_cast<int>(std::lround(cy + cap / 2)) - m.top, pal.quietInk);
  return c;
}

const std::vector<float> kArrow = {32, 11, 53, 33, 41.5f, 33, 41.5f, 51, 22.5f, 51, 22.5f, 33, 11, 33};

Canvas shiftIcon(const Palette& pal, bool on) {
  Canvas c(64, 64);
  const Sdf arrow = polygon(kArrow);
  if (on) c.fill(arrow, pal.accentInk);
  c.fill(outline(arrow, 2.3f), on ? pal.accentInk : pal.labelInk);
  return c;
}

Canvas deleteIcon(const Palette& pal) {
  Canvas c(64, 64);
  const Sdf body = polygon({8, 32, 21, 17, 56, 17, 56, 47, 21, 47});
  c.fill(outline(body, 2.2f), pal.labelInk);
  c.fill(unite(capsule(30, 25, 44, 39, 2.3f), capsule(44, 25, 30, 39, 2.3f)), pal.labelInk);
  return c;
}

Canvas symbolShiftIcon(const Palette& pal) {
  return label(pal, 64, 64, 1.125f, "#+=", pal.labelInk, 26.0f);  // shown at 72 x 72 px, narrower than the rest
}

// Keyboard-hide chevron in the lower half of the pad's done key: light, with a dark rim, so it
// reads on the blue released face and on the white held face alike.
Canvas padDoneIcon(const Palette& pal) {
  Canvas c(64, 64);
  const Sdf chevron = unite(capsule(19, 26, 32, 39, 3.6f), capsule(32, 39, 45, 26, 3.6f));
  c.fill(outline(chevron, 1.3f), Color{pal.accentBottom.r * 0.5f, pal.accentBottom.g * 0.5f, pal.accentBottom.b * 0.5f, 0.55f});
  c.fill(chevron, mix(pal.onAccent, pal.accentTop, 0.12f));
  return c;
}

// ---- pop-up pictures (64 x 64, shown stretched)

Canvas background(const Palette& pal) {
  Canvas c(64, 64);
  c.fillGradient(roundRect(-10, -10, 74, 74, 0), pal.backgroundTop, pal.backgroundBottom, 0, 64);
  return c;
}

// The text field: stretched about 16 x horizontally and 2 x vertically over the pop-up, so it
// is built from rows: a hairline on top, white body, a blue underline at the bottom.
Canvas fieldFrame(const Palette& pal) {
  Canvas c(64, 64);
  c.fill(roundRect(-10, -10, 74, 74, 0), pal.fieldBody);
  c.fill(roundRect(-10, -10, 74, 1, 0), pal.fieldRule);
  c.fill(roundRect(-10, 1, 74, 2, 0), mix(pal.fieldBody, pal.fieldRule, 0.3f));
  c.fill(roundRect(-10, 60, 74, 61, 0), mix(pal.fieldBody, pal.accentInk, 0.5f));
  c.fill(roundRect(-10, 61, 74, 74, 0), pal.accentInk);
  return c;
}

Canvas maskDot(const Palette& pal) {
  Canvas c(64, 64);
  c.fill(circle(32, 32, 16.5f), pal.dot);
  return c;
}

Canvas cursor(const Palette& pal) {
  Canvas c(64, 64);
  c.fill(capsule(32, 7, 32, 57, 4.0f), pal.cursor);
  return c;
}

// ---- output

std::uint64_t fnv1a(const std::vector<std::uint8_t>& data) {
  std::uint64_t h = 1469598103934665603ull;
  for (std::uint8_t b : data) h = (h ^ b) * 1099511628211ull;
  return h;
}

void writeFile(const std::string& path, const std::string& text) {
  std::ofstream f(path, std::ios::binary);
  f << text;
  if (!f) throw std::runtime_error("cannot write " + path);
}

void writeOutputs(const std::string& dir) {
  std::ostringstream s, h;
  s << "// Generated by tools/artgen (tessel_artgen); do not edit. The keyboard artwork, embedded\n"
       "// as raw RGBA8 (width x height x 4 bytes per image, top row first, no padding). Found through\n"
       "// the assembler's include path (the folder of this file); the checksums make this file\n"
       "// change with its images so that the build re-assembles it.\n"
       "    .section .rodata.tessel_images,\"a\"\n";
  h << "// Generated by tools/artgen (tessel_artgen); do not edit. The embedded images of images.S:\n"
       "// read-only data, or in a compact artwork build the buffers that uploads inflate them into\n"
       "// (render/artwork.h).\n"
       "#pragma once\n\n#include <cstdint>\n\n#if TESSEL_COMPACT_ARTWORK\n#define TESSEL_IMAGE_CONST\n#else\n"
       "#define TESSEL_IMAGE_CONST const\n#endif\n\nextern \"C\" {\n";
  for (const Picture& p : gPictures) {
    const std::string sym = "tessel_img_" + p.name;
    const std::size_t bytes = static_cast<std::size_t>(p.width) * p.height * 4 * p.count;
    if (p.rgba.size() != bytes) throw std::logic_error("size mismatch for " + p.name);
    std::ofstream f(dir + "/" + p.name + ".rgba", std::ios::binary);
    f.write(reinterpret_cast<const char*>(p.rgba.data()), static_cast<std::streamsize>(p.rgba.size()));
    if (!f) throw std::runtime_error("cannot write " + p.name);
    char sum[32];
    std::snprintf(sum, sizeof sum, "%016llx", static_cast<unsigned long long>(fnv1a(p.rgba)));
    s << "\n    .balign 16\n    .globl " << sym << "\n    .hidden " << sym << "\n    .type " << sym
      << ", %object\n" << sym << ":\n    .incbin \"" << p.name << ".rgba\"  // " << p.count << " x " << p.width
      << " x " << p.height << ", fnv1a " << sum << "\n    .size " << sym << ", . - " << sym << "\n";
    h << "extern TESSEL_IMAGE_CONST std::uint8_t " << sym << "[" << p.count << " * " << p.width << " * " << p.height
      << " * 4];\n";
  }
  s << "\n    .section .note.GNU-stack,\"\",%progbits\n";
  h << "}\n";
  writeFile(dir + "/images.S", s.str());
  writeFile(dir + "/image_data.h", h.str());
}

void writeContactSheet(const std::string& path) {
  const int sheetW = 1400, pad = 10;
  struct Place {
    const Picture* p;
    int index, x, y;
  };
  std::vector<Place> places;
  int x = pad, y = pad, rowH = 0;
  for (const Picture& p : gPictures)
    for (int k = 0; k < p.count; ++k) {
      if (x + p.width + pad > sheetW) {
        x = pad;
        y += rowH + pad;
        rowH = 0;
      }
      places.push_back({&p, k, x, y});
      x += p.width + pad;
      rowH = std::max(rowH, p.height);
    }
  const int sheetH = y + rowH + pad;
  std::vector<std::uint8_t> sheet(static_cast<std::size_t>(sheetW) * sheetH * 4);
  for (int j = 0; j < sheetH; ++j)
    for (int i = 0; i < sheetW; ++i) {
      const std::uint8_t v = ((i / 8 + j / 8) & 1) ? 150 : 128;  // checkerboard shows alpha
      std::uint8_t* d = &sheet[(static_cast<std::size_t>(j) * sheetW + i) * 4];
      d[0] = d[1] = d[2] = v;
      d[3] = 255;
    }
  for (const Place& pl : places) {
    const Picture& p = *pl.p;
    const std::uint8_t* src = p.rgba.data() + static_cast<std::size_t>(pl.index) * p.width * p.height * 4;
    for (int j = 0; j < p.height; ++j)
      for (int i = 0; i < p.width; ++i) {
        const std::uint8_t* s = src + (static_cast<std::size_t>(j) * p.width + i) * 4;
        std::uint8_t* d = &sheet[(static_cast<std::size_t>(pl.y + j) * sheetW + pl.x + i) * 4];
        for (int c = 0; c < 3; ++c) d[c] = static_cast<std::uint8_t>((s[c] * s[3] + d[c] * (255 - s[3])) / 255);
      }
  }
  if (!tessel::host::writePng(path, sheetW, sheetH, sheet)) throw std::runtime_error("cannot write " + path);
}

void drawEverything(const Palette& pal) {
  add("background", background(pal));
  add("field_frame", fieldFrame(pal));
  add("mask_dot", maskDot(pal));
  add("cursor", cursor(pal));

  std::vector<char> lower, upper;
  for (char ch = 'a'; ch <= 'z'; ++ch) lower.push_back(ch);
  for (char ch = 'A'; ch <= 'Z'; ++ch) upper.push_back(ch);
  addGlyphGroup(pal, "glyphs_lower", lower, true);
  addGlyphGroup(pal, "glyphs_upper", upper, false);
  addGlyphGroup(pal, "glyphs_symbols1", symbolPage("`~!@#$%^&*()-_=+"), false);
  addGlyphGroup(pal, "glyphs_symbols2", symbolPage("{}[]\\|:;'\",.<>/?"), false);
  std::vector<char> keypad(10);
  for (char d = '0'; d <= '9'; ++d) keypad.at(tessel::keypadIndexOf(static_cast<std::uint8_t>(d))) = d;
  addGlyphGroup(pal, "glyphs_pad_digits", keypad, false);

  add("key_char", charKeyFace(pal, charKey(pal)));
  add("key_char_held", charKeyFace(pal, charKeyHeld(pal)));
  add("key_balloon", balloon(pal));
  add("key_space", spaceFace(pal, charKey(pal)));
  add("key_space_held", spaceFace(pal, charKeyHeld(pal)));
  add("label_space", spaceLabel(pal));
  add("key_shift_delete", shiftDeleteFace(pal, functionKey(pal)));
  add("key_shift_delete_held", shiftDeleteFace(pal, functionKeyHeld(pal)));
  add("key_switch", barFace(pal, 256, 2 * 2.25f * kUx, 0.9f * kKh, functionKey(pal)));
  add("key_switch_held", barFace(pal, 256, 2 * 2.28f * kUx, 0.892f * kKh, functionKeyHeld(pal)));
  add("key_done", barFace(pal, 128, 2 * 2.315f * kUx, 0.884f * kKh, accentKey(pal)));
  add("icon_delete", deleteIcon(pal));
  add("icon_shift_off", shiftIcon(pal, false));
  add("icon_shift_on", shiftIcon(pal, true));
  add("icon_symbol_shift", symbolShiftIcon(pal));
  add("label_to_letters", label(pal, 256, 128, 0.9f, "ABC", pal.labelInk));
  add("label_to_symbols", label(pal, 256, 128, 0.9f, "?123", pal.labelInk));
  add("label_done", label(pal, 128, 64, 1.01f, "Done", pal.onAccent));
  add("label_done_held", label(pal, 128, 64, 1.01f, "Done", pal.accentInk));
  add("label_to_pad", label(pal, 256, 128, 0.9f, "123", pal.labelInk));
  add("key_pad", padFace(pal, charKey(pal)));
  add("key_pad_alt", padFace(pal, functionKey(pal)));
  add("key_pad_done", padDoneFace(pal, 128, accentKey(pal)));
  add("key_pad_done_held", padDoneFace(pal, 256, functionKeyHeld(pal)));
  add("label_pad_clear", label(pal, 128, 64, 0.95f, "Clear", pal.labelInk));
  add("label_pad_ok", label(pal, 128, 64, 0.95f, "OK", pal.accentInk));
  add("icon_pad_done", padDoneIcon(pal));
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 3) {
    std::fprintf(stderr, "usage: %s <theme file> <image folder> [contact sheet.png]\n", argv[0]);
    return 2;
  }
  try {
    drawEverything(paletteOf(readTheme(argv[1])));
    writeOutputs(argv[2]);
    if (argc > 3) writeContactSheet(argv[3]);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "tessel_artgen: %s\n", e.what());
    return 1;
  }
  std::size_t total = 0;
  for (const Picture& p : gPictures) total += p.rgba.size();
  std::printf("tessel_artgen: %zu files, %zu bytes of pixels\n", gPictures.size(), total);
  return 0;
}
