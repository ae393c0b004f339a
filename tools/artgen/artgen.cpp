// tessel_artgen: draws the keyboard's embedded artwork and writes it for the library.
//
//   tessel_artgen <image folder> [contact sheet.png]
//
// Writes one raw RGBA8 file per distinct picture (top row first, no padding), the assembler
// file images.S that embeds them with .incbin, image_data.h that declares them with their exact
// sizes, and optionally a PNG contact sheet of everything for review.
//
// The look: a light, calm keyboard (white character keys on cool grey, grey function keys, one
// bank-blue accent for the done key and the typing cursor). Every picture is drawn at the size
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
#include "render/glyph_index.h"

using namespace artgen;

namespace {

// ---- palette
const Color kBackgroundTop = hex(0xD5D9E0);
const Color kBackgroundBottom = hex(0xC9CED6);
const Color kKeyTop = hex(0xFFFFFF);
const Color kKeyBottom = hex(0xF8F9FB);
const Color kKeyHeldTop = hex(0xB4BCC8);
const Color kKeyHeldBottom = hex(0xAAB2BE);
const Color kFunctionTop = hex(0xAFB6C1);
const Color kFunctionBottom = hex(0xA7AEB9);
const Color kAccentTop = hex(0x2468DE);
const Color kAccentBottom = hex(0x1B58C6);
const Color kKeyShadow = hex(0x7C8592, 0.60f);
const Color kAmbientShadow = hex(0x5A6270, 0.14f);
const Color kInk = hex(0x171A1F);
const Color kLabelInk = hex(0x1E232A);
const Color kQuietInk = hex(0x5F6774);
const Color kWhite = hex(0xFFFFFF);
const Color kAccentInk = hex(0x1D5FD3);

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
void paintKey(Canvas& c, float w, float h, const KeyLook& look, float radius = kKeyRadius) {
  const float x0 = 2.0f, y0 = 1.0f, x1 = w - 2.0f, y1 = h - 3.5f;  // all ink stays inside w x h
  if (look.shadow) {
    c.fill(roundRect(x0, y0 + 0.5f, x1, y1 + 1.5f, radius), kAmbientShadow, 2.0f);
    c.fill(roundRect(x0, y0 + 2.0f, x1, y1 + 2.0f, radius), kKeyShadow);
  }
  c.fillGradient(roundRect(x0, y0, x1, y1, radius), look.top, look.bottom, y0, y1);
}

const KeyLook kCharKey{kKeyTop, kKeyBottom};
const KeyLook kCharKeyHeld{kKeyHeldTop, kKeyHeldBottom};
const KeyLook kFunctionKey{kFunctionTop, kFunctionBottom};
const KeyLook kFunctionKeyHeld{kKeyTop, kKeyBottom};  // function keys light up white when held
const KeyLook kAccentKey{kAccentTop, kAccentBottom};

// Character key faces: the renderer samples the top-left 80 x 160 of 128 x 256 and shows it
// at 0.815 x 0.884 of a cell (88 x 159).
Canvas charKeyFace(const KeyLook& look) {
  const float w = 0.815f * kKw, h = 0.884f * kKh;
  Canvas c(128, 256, w / 80.0f, h / 160.0f);
  paintKey(c, w, h, look);
  return c;
}

// Shift/delete: 120 x 160 of 128 x 256 at 1.5 x 0.753 by 0.884 cells.
Canvas shiftDeleteFace(const KeyLook& look) {
  const float w = 2 * 1.5f * 0.753f * kUx, h = 0.884f * kKh;
  Canvas c(128, 256, w / 120.0f, h / 160.0f);
  paintKey(c, w, h, look);
  return c;
}

// Switch (and done, whose held picture is this one): 0.9765 x 0.625 of the image, at about
// 4.5 x 0.9 key widths/heights.
Canvas barFace(int size, float w, float h, const KeyLook& look) {
  Canvas c(size, size, w / (0.9765f * size), h / (0.625f * size));
  paintKey(c, w, h, look);
  return c;
}

// Space: 512 x 160 of 512 x 256, at 9.63 x 0.884 half-keys.
Canvas spaceFace(const KeyLook& look) {
  const float w = 2 * 5 * 0.963f * kUx, h = 0.884f * kKh;
  Canvas c(512, 256, w / 512.0f, h / 160.0f);
  paintKey(c, w, h, look);
  return c;
}

// Pad keys use the whole image: 256 x 128 shown at 247 x 156.
Canvas padFace(const KeyLook& look) {
  const float w = 2 * 0.96065f * kPadUx, h = 2 * 0.93617f * kPadUy;
  Canvas c(256, 128, w / 256.0f, h / 128.0f);
  paintKey(c, w, h, look, 10.0f);
  return c;
}

// The pad's done key covers two rows: 247 x 323 from a square image (pre-distorted corners).
Canvas padDoneFace(int size, const KeyLook& look) {
  const float w = 2 * 0.96065f * kPadUx, h = 2 * 2 * 0.96809f * kPadUy;
  Canvas c(size, size, w / size, h / size);
  paintKey(c, w, h, look, 10.0f);
  return c;
}

// The key balloon: drawn over a held key, its stem is exactly that key's face and its head
// holds the enlarged glyph one key height higher. Full image 128 x 256 shown at about
// 254 x 503 around a point 0.04 key heights above the key's top edge.
Canvas balloon() {
  const float halfW = (1 / kAspect) * 1.05f * 0.895f * 1.5f * kUx;
  const float halfH = 2 * 1.054f * 0.884f * 1.5f * kUy;
  Canvas c(128, 256, 2 * halfW / 128, 2 * halfH / 256);
  const float cx = halfW, cy = halfH;                  // balloon centre
  const float keyCy = cy + 0.08f * kUy + kUy;          // held key centre, below
  const float faceHalfW = 0.815f * kUx, faceHalfH = 0.884f * kUy;
  const float glyphCy = cy - (kUy - 0.1f * kUy - 0.08f * kUy);
  const float headHalfW = 76.0f, headTop = glyphCy - 74.0f, headBottom = glyphCy + 80.0f;
  const Sdf head = roundRect(cx - headHalfW, headTop, cx + headHalfW, headBottom, 24.0f);
  const Sdf stem = roundRect(cx - faceHalfW + 1.5f, headBottom - 40.0f, cx + faceHalfW - 1.5f,
                             keyCy + faceHalfH - 3.0f, kKeyRadius);
  const Sdf shape = smoothUnite(head, stem, 18.0f);
  c.fill(shift(shape, 0, 1.0f), hex(0x4A5260, 0.22f), 7.0f);
  c.fill(shift(shape, 0, 2.0f), kKeyShadow);
  c.fill(outline(shape, 0.6f), hex(0x9098A4, 0.55f));
  c.fillGradient(shape, kKeyTop, kKeyBottom, headTop, keyCy + faceHalfH);
  return c;
}

// ---- glyphs: 64 x 128, the character centred on the image centre

const TextStyle kGlyphStyle{"DejaVuSans.ttf", 68.0f, 2.8f};
const TextStyle kLowerStyle{"DejaVuSans.ttf", 73.0f, 2.8f};

std::vector<std::uint8_t> glyphImage(char ch, bool lower) {
  Canvas c(64, 128);
  TextStyle st = lower ? kLowerStyle : kGlyphStyle;
  const float baseline = lower ? 64.0f + xHeight(st) / 2 + 2.0f : 64.0f + capHeight(st) / 2;
  const std::string s(1, ch);
  TextMask m = renderText(st, s);
  if (m.width > 56) st.emPixels *= 56.0f / m.width;  // W, M, m, w, %, @: narrow the widest
  drawTextCentered(c, st, s, 32.0f, baseline, kInk);
  return c.toRgba8();
}

void addGlyphGroup(const std::string& name, const std::vector<char>& chars, bool lower) {
  Picture p{name, 64, 128, static_cast<int>(chars.size()), {}};
  for (char ch : chars) {
    const auto img = glyphImage(ch, lower);
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

const TextStyle kSwitchLabelStyle{"DejaVuSans.ttf", 52.0f, 2.6f};
const TextStyle kDoneLabelStyle{"DejaVuSans.ttf", 36.0f, 1.8f};
const TextStyle kPadLabelStyle{"DejaVuSans.ttf", 33.0f, 1.6f};

Canvas label(int w, int h, const TextStyle& style, const std::string& text, Color ink) {
  Canvas c(w, h);
  TextStyle st = style;
  const TextMask m = renderText(st, text);
  if (m.width > w - 12) st.emPixels *= (w - 12.0f) / m.width;
  drawLabel(c, st, text, w / 2.0f, h / 2.0f, ink);
  return c;
}

// Space label: only the top 256 x 80 is sampled and it is magnified about 2.1 to 2.7 times
// over a quad larger than the key, so the content stays small and central.
Canvas spaceLabel() {
  Canvas c(256, 128);
  const TextStyle st{"DejaVuSans.ttf", 14.5f, 0.9f};
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
  c.fill(unite(shackle, roundRect(x0, bodyTop, x0 + lockW, bodyBottom, 1.8f)), kQuietInk);
  c.paintMask(m.coverage, m.width, m.height, static_cast<int>(std::lround(x0 + lockW + gap)),
              static_cast<int>(std::lround(cy + cap / 2)) - m.top, kQuietInk);
  return c;
}

const std::vector<float> kArrow = {32, 11, 53, 33, 41.5f, 33, 41.5f, 51, 22.5f, 51, 22.5f, 33, 11, 33};

Canvas shiftIcon(bool on) {
  Canvas c(64, 64);
  const Sdf arrow = polygon(kArrow);
  if (on) c.fill(arrow, kAccentInk);
  c.fill(outline(arrow, 2.3f), on ? kAccentInk : kLabelInk);
  return c;
}

Canvas deleteIcon() {
  Canvas c(64, 64);
  const Sdf body = polygon({8, 32, 21, 17, 56, 17, 56, 47, 21, 47});
  c.fill(outline(body, 2.2f), kLabelInk);
  c.fill(unite(capsule(30, 25, 44, 39, 2.3f), capsule(44, 25, 30, 39, 2.3f)), kLabelInk);
  return c;
}

Canvas symbolShiftIcon() {
  return label(64, 64, TextStyle{"DejaVuSans.ttf", 24.0f, 1.8f}, "#+=", kLabelInk);
}

// Keyboard-hide chevron in the lower half of the pad's done key: light, with a dark rim, so it
// reads on the blue released face and on the white held face alike.
Canvas padDoneIcon() {
  Canvas c(64, 64);
  const Sdf chevron = unite(capsule(19, 26, 32, 39, 3.6f), capsule(32, 39, 45, 26, 3.6f));
  c.fill(outline(chevron, 1.3f), hex(0x123E8C, 0.55f));
  c.fill(chevron, hex(0xE3ECFB));
  return c;
}

// ---- pop-up pictures (64 x 64, shown stretched)

Canvas background() {
  Canvas c(64, 64);
  c.fillGradient(roundRect(-10, -10, 74, 74, 0), kBackgroundTop, kBackgroundBottom, 0, 64);
  return c;
}

// The text field: stretched about 16 x horizontally and 2 x vertically over the pop-up, so it
// is built from rows: a hairline on top, white body, a blue underline at the bottom.
Canvas fieldFrame() {
  Canvas c(64, 64);
  c.fill(roundRect(-10, -10, 74, 74, 0), kWhite);
  c.fill(roundRect(-10, -10, 74, 1, 0), hex(0xB9C0CA));
  c.fill(roundRect(-10, 1, 74, 2, 0), hex(0xE9ECF0));
  c.fill(roundRect(-10, 60, 74, 61, 0), hex(0x8FB0EA));
  c.fill(roundRect(-10, 61, 74, 74, 0), kAccentInk);
  return c;
}

Canvas maskDot() {
  Canvas c(64, 64);
  c.fill(circle(32, 32, 16.5f), kLabelInk);
  return c;
}

Canvas cursor() {
  Canvas c(64, 64);
  c.fill(capsule(32, 7, 32, 57, 4.0f), kAccentInk);
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
  h << "// Generated by tools/artgen (tessel_artgen); do not edit. The embedded images of images.S.\n"
       "#pragma once\n\n#include <cstdint>\n\nextern \"C\" {\n";
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
    h << "extern const std::uint8_t " << sym << "[" << p.count << " * " << p.width << " * " << p.height
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
  writePng(path, sheetW, sheetH, sheet);
}

void drawEverything() {
  add("background", background());
  add("field_frame", fieldFrame());
  add("mask_dot", maskDot());
  add("cursor", cursor());

  std::vector<char> lower, upper;
  for (char ch = 'a'; ch <= 'z'; ++ch) lower.push_back(ch);
  for (char ch = 'A'; ch <= 'Z'; ++ch) upper.push_back(ch);
  addGlyphGroup("glyphs_lower", lower, true);
  addGlyphGroup("glyphs_upper", upper, false);
  addGlyphGroup("glyphs_symbols1", symbolPage("`~!@#$%^&*()-_=+"), false);
  addGlyphGroup("glyphs_symbols2", symbolPage("{}[]\\|:;'\",.<>/?"), false);
  std::vector<char> keypad(10);
  for (char d = '0'; d <= '9'; ++d) keypad.at(tessel::keypadIndexOf(static_cast<std::uint8_t>(d))) = d;
  addGlyphGroup("glyphs_pad_digits", keypad, false);

  add("key_char", charKeyFace(kCharKey));
  add("key_char_held", charKeyFace(kCharKeyHeld));
  add("key_balloon", balloon());
  add("key_space", spaceFace(kCharKey));
  add("key_space_held", spaceFace(kCharKeyHeld));
  add("label_space", spaceLabel());
  add("key_shift_delete", shiftDeleteFace(kFunctionKey));
  add("key_shift_delete_held", shiftDeleteFace(kFunctionKeyHeld));
  add("key_switch", barFace(256, 2 * 2.25f * kUx, 0.9f * kKh, kFunctionKey));
  add("key_switch_held", barFace(256, 2 * 2.28f * kUx, 0.892f * kKh, kFunctionKeyHeld));
  add("key_done", barFace(128, 2 * 2.315f * kUx, 0.884f * kKh, kAccentKey));
  add("icon_delete", deleteIcon());
  add("icon_shift_off", shiftIcon(false));
  add("icon_shift_on", shiftIcon(true));
  add("icon_symbol_shift", symbolShiftIcon());
  add("label_to_letters", label(256, 128, kSwitchLabelStyle, "ABC", kLabelInk));
  add("label_to_symbols", label(256, 128, kSwitchLabelStyle, "?123", kLabelInk));
  add("label_done", label(128, 64, kDoneLabelStyle, "Done", kWhite));
  add("label_done_held", label(128, 64, kDoneLabelStyle, "Done", kAccentInk));
  add("label_to_pad", label(256, 128, kSwitchLabelStyle, "123", kLabelInk));
  add("key_pad", padFace(kCharKey));
  add("key_pad_alt", padFace(kFunctionKey));
  add("key_pad_done", padDoneFace(128, kAccentKey));
  add("key_pad_done_held", padDoneFace(256, kFunctionKeyHeld));
  add("label_pad_clear", label(128, 64, kPadLabelStyle, "Clear", kLabelInk));
  add("label_pad_ok", label(128, 64, kPadLabelStyle, "OK", kAccentInk));
  add("icon_pad_done", padDoneIcon());
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) {
    std::fprintf(stderr, "usage: %s <image folder> [contact sheet.png]\n", argv[0]);
    return 2;
  }
  try {
    drawEverything();
    writeOutputs(argv[1]);
    if (argc > 2) writeContactSheet(argv[2]);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "tessel_artgen: %s\n", e.what());
    return 1;
  }
  std::size_t total = 0;
  for (const Picture& p : gPictures) total += p.rgba.size();
  std::printf("tessel_artgen: %zu files, %zu bytes of pixels\n", gPictures.size(), total);
  return 0;
}
