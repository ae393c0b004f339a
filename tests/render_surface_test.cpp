// The three surfaces drawn by Mesa's GLES 1.1 (llvmpipe, offscreen) and read back: what a user
// would see, one check per visible behaviour. Key positions are computed here from the surface
// size (a 10 x 4 grid, the pad's four columns), and expected colours come from the embedded
// images sampled where the quad maps them, so the checks do not depend on the artwork's colours.
//
// Also writes screenshots (PNG) of every keyboard state to the build's test output folder;
// the reviewed copies live in docs/screenshots/.
#include <gtest/gtest.h>

#include <GLES/gl.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstring>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "input/touch.h"
#include "render/glyph_index.h"
#include "render/image_table.h"
#include "render/surfaces.h"
#include "render/textures.h"
#include "session/session.h"
#include "support/egl_context.h"
#include "support/openssl_oracle.h"
#include "support/png_file.h"

namespace tessel {
namespace {

using test::GlesContext;

constexpr int kW = 1080, kH = 720;          // keyboard surface
constexpr int kPopW = 1080, kPopH = 180;    // pop-ups: one key row above the keyboard
constexpr double kKw = kW / 10.0, kKh = kH / 4.0;

struct Rgba {
  int r, g, b, a;
  int luma() const { return (r + g + b) / 3; }
};

bool near(Rgba x, Rgba y, int tolerance) {
  return std::abs(x.r - y.r) <= tolerance && std::abs(x.g - y.g) <= tolerance && std::abs(x.b - y.b) <= tolerance;
}

std::string str(Rgba c) {
  return "(" + std::to_string(c.r) + "," + std::to_string(c.g) + "," + std::to_string(c.b) + "," + std::to_string(c.a) + ")";
}

// A read-back frame, top row first.
struct Shot {
  int w = 0, h = 0;
  std::vector<std::uint8_t> px;
  Rgba at(double x, double y) const {
    const int i = std::min(w - 1, std::max(0, static_cast<int>(x))), j = std::min(h - 1, std::max(0, static_cast<int>(y)));
    const std::uint8_t* p = &px[(static_cast<std::size_t>(j) * w + i) * 4];
    return {p[0], p[1], p[2], p[3]};
  }
};

Shot grab(const GlesContext& gl) {
  glFinish();
  return {gl.width(), gl.height(), gl.readRgba()};
}

// Nearest texel of an image at texture coordinates (s, t).
Rgba texel(const TextureImage& img, double s, double t) {
  const int x = std::min(img.width - 1, std::max(0, static_cast<int>(s * img.width)));
  const int y = std::min(img.height - 1, std::max(0, static_cast<int>(t * img.height)));
  const std::uint8_t* p = img.pixels + (static_cast<std::size_t>(y) * img.width + x) * 4;
  return {p[0], p[1], p[2], p[3]};
}

// The stretched 64 x 64 background at a screen point: bilinear with clamp-to-edge, as GL's
// magnifying filter reads it.
Rgba backgroundAt(double x, double y, int w, int h) {
  const double u = (x + 0.5) / w * 64 - 0.5, v = (y + 0.5) / h * 64 - 0.5;
  const int x0 = static_cast<int>(std::floor(u)), y0 = static_cast<int>(std::floor(v));
  const double fx = u - x0, fy = v - y0;
  auto at = [&](int i, int j, int c) {
    return images::kBackgroundPixels[(static_cast<std::size_t>(std::clamp(j, 0, 63)) * 64 + std::clamp(i, 0, 63)) * 4 + c];
  };
  int out[4];
  for (int c = 0; c < 4; ++c)
    out[c] = static_cast<int>(std::lround((at(x0, y0, c) * (1 - fx) + at(x0 + 1, y0, c) * fx) * (1 - fy) +
                                          (at(x0, y0 + 1, c) * (1 - fx) + at(x0 + 1, y0 + 1, c) * fx) * fy));
  return {out[0], out[1], out[2], out[3]};
}

// A quad on screen: centre and half sizes in pixels, and the part of its image it shows.
struct Quad {
  double cx, cy, hx, hy;
  double sMax = 1.0, tMax = 1.0;
  // The image texel shown at screen point (x, y).
  Rgba texelAt(const TextureImage& img, double x, double y) const {
    return texel(img, (x - (cx - hx)) / (2 * hx) * sMax, (y - (cy - hy)) / (2 * hy) * tMax);
  }
  // Whether the frame shows `img` at a point a fraction (dx, dy) of the half sizes off centre.
  ::testing::AssertionResult shows(const Shot& shot, const TextureImage& img, double dx, double dy) const {
    const double x = cx + dx * hx, y = cy + dy * hy;
    if (near(shot.at(x, y), texelAt(img, x, y), 6)) return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure() << "(" << x << ", " << y << ") shows " << str(shot.at(x, y))
                                         << ", the image " << str(texelAt(img, x, y));
  }
};

// ---- letter keyboard geometry (pixels, origin top-left)

double keyX(int i) { return i <= 9 ? (i + 0.5) * kKw : i <= 18 ? (i - 10 + 1) * kKw : (i - 19 + 2) * kKw; }
double keyY(int i) { return i <= 9 ? 0.5 * kKh : i <= 18 ? 1.5 * kKh : 2.5 * kKh; }
// Where a touch lands on key i: row 1 keys are hit-tested 0.2 key widths left of their faces.
double touchX(int i) { return i >= 10 && i <= 18 ? keyX(i) - 0.2 * kKw : keyX(i); }

// Character key face: 0.815 x 0.884 of a cell, showing the top-left 0.625 x 0.625 of its image.
// The probe point low in the face (dy 0.36 kh / 0.442 kh) is covered by no glyph.
Quad keyFace(int i) { return {keyX(i), keyY(i), 0.4075 * kKw, 0.442 * kKh, 0.625, 0.625}; }
constexpr double kFaceProbe = 0.36 / 0.442;

// A glyph quad on a key: 0.3 x 0.6 key heights in surface mode 1, key widths in mode 0.
Quad keyGlyph(int i, bool mode1) {
  const double unit = mode1 ? kKh : kKw;
  return {keyX(i), keyY(i), 0.15 * unit, 0.3 * unit};
}

// The enlarged glyph of the balloon (mode 1): one key height above the key, 0.61 x 1.21 kh.
Quad balloonGlyph(int i) {
  return {keyX(i), keyY(i) - 0.95 * kKh, 1.05 * 0.895 * 0.65 * kKh / 2, 1.054 * 0.884 * 0.65 * kKh};
}

// ---- number pad geometry

constexpr double kPadUx = 0.953125 * 2.5 * kKw / 2, kPadUy = 0.92611 * kKh / 2;
double padX(int column) { return kW / 2.0 + (2 * column - 3) * kPadUx; }
double padY(int row) { return kH / 2.0 - (3 - 2 * row) * kPadUy; }
Quad padFace(int row, int column) { return {padX(column), padY(row), 0.96065 * kPadUx, 0.93617 * kPadUy}; }
Quad padDigitGlyph(int n) { return {padX(n % 3), padY(n / 3), 2.0 / 3 * 0.44 * kPadUx, 2 * 0.44 * kPadUy}; }

// ---- glyph recognition

// Which image of `group` (all of one size) is drawn in `quad`: the one whose ink (alpha >= 128,
// nearest texel) best overlaps the dark pixels read back there (intersection over union).
int recognise(const Shot& shot, const ImageGroup& group, const Quad& quad, double* bestScore = nullptr) {
  const int x0 = std::max(0, static_cast<int>(std::ceil(quad.cx - quad.hx)));
  const int x1 = std::min(shot.w, static_cast<int>(quad.cx + quad.hx));
  const int y0 = std::max(0, static_cast<int>(std::ceil(quad.cy - quad.hy)));
  const int y1 = std::min(shot.h, static_cast<int>(quad.cy + quad.hy));
  if (x1 <= x0 || y1 <= y0) return -1;
  // Dark pixels seen, and for each of them the texel every candidate shows there.
  std::vector<bool> seen;
  std::vector<std::size_t> texelOffset;
  const TextureImage& first = group[0];
  for (int y = y0; y < y1; ++y)
    for (int x = x0; x < x1; ++x) {
      seen.push_back(shot.at(x, y).luma() < 110);
      const double s = (x + 0.5 - (quad.cx - quad.hx)) / (2 * quad.hx), t = (y + 0.5 - (quad.cy - quad.hy)) / (2 * quad.hy);
      const int tx = std::min(first.width - 1, std::max(0, static_cast<int>(s * first.width)));
      const int ty = std::min(first.height - 1, std::max(0, static_cast<int>(t * first.height)));
      texelOffset.push_back((static_cast<std::size_t>(ty) * first.width + tx) * 4 + 3);
    }
  int best = -1;
  double bestIou = -1;
  for (int g = 0; g < group.count; ++g) {
    int both = 0, either = 0;
    for (std::size_t k = 0; k < seen.size(); ++k) {
      const bool ink = group[g].pixels[texelOffset[k]] >= 128;
      both += seen[k] && ink;
      either += seen[k] || ink;
    }
    const double iou = either ? static_cast<double>(both) / either : 0;
    if (iou > bestIou) {
      bestIou = iou;
      best = g;
    }
  }
  if (bestScore) *bestScore = bestIou;
  return best;
}

// ---- sessions on offscreen surfaces

struct Options {
  int variant = 1;       // surface-changed variant: 1 = surface mode 1
  bool shuffled = false;
  std::uint32_t kbdType = 0;
  std::int16_t kbdPage = 0;
  std::uint32_t shiftOn = 0;
};

class Keyboard {
 public:
  explicit Keyboard(const std::string& name, const Options& o = {}) : gl(kW, kH) {
    handle = createSession(name.c_str());
    s = sessionAt(handle);
    if (s == nullptr || !gl.ok()) return;
    s->kbdRandom = o.shuffled ? 1 : 0;
    s->kbdPage = o.kbdPage;
    s->maxLength = 4092;
    mainSurfaceCreated(*s);
    mainSurfaceChanged(*s, kW, kH, o.variant);
    s->currentKbdType = o.kbdType;
    s->shiftOn = o.shiftOn;
  }
  ~Keyboard() { destroySession(handle); }
  bool ready() const { return s != nullptr && gl.ok(); }
  Shot draw() {
    gl.makeCurrent();
    mainDrawFrame(*s);
    return grab(gl);
  }
  // The glyph index of the character at layout position i of a table, unmasked.
  int glyphAt(const RelaxedField<std::uint8_t>* table, int i) const {
    return glyphIndexOf(static_cast<std::uint8_t>(table[i] + s->keyMask));
  }
  int down(double x, double y) { return touch(*s, 0, static_cast<float>(x), static_cast<float>(y)); }
  int up(double x, double y) { return touch(*s, 1, static_cast<float>(x), static_cast<float>(y)); }
  // A held key as a racing caller might leave it: the character highlight lit at (row, column).
  void hold(std::uint32_t row, std::uint32_t column) {
    s->anyKeyReleased = 0;
    s->keyReleased[3] = 0;
    s->touchRow = row;
    s->touchColumn = column;
  }
  void setLength(int n) {
    ContentGuard guard(*s->content);
    for (int k = 0; k < n; ++k) guard.text()[k] = 'x';
    guard.text()[n] = 0;
    s->content->length = static_cast<std::uint16_t>(n);
  }

  GlesContext gl;
  int handle = -1;
  KeyboardSession* s = nullptr;
};

#define REQUIRE_GL(kb) ASSERT_TRUE((kb).ready()) << "offscreen GLES 1.1 unavailable: " << (kb).gl.error()

// The field and top pop-ups of a keyboard, each on its own context.
class PopUps {
 public:
  explicit PopUps(Keyboard& kb) : field(kPopW, kPopH), top(kPopW, kPopH), kb_(kb) {
    field.makeCurrent();
    popSurfaceCreated(*kb.s);
    popSurfaceChanged(*kb.s, kPopW, kPopH);
    top.makeCurrent();
    popTopSurfaceCreated(*kb.s);
    popTopSurfaceChanged(*kb.s, kPopW, kPopH);
  }
  Shot drawField(bool showField = true) {
    field.makeCurrent();
    popDrawFrame(*kb_.s, showField);
    return grab(field);
  }
  Shot drawTop() {
    top.makeCurrent();
    popTopDrawFrame(*kb_.s);
    return grab(top);
  }
  // The cursor blinks every 800 ms: draws the field until it shows (at most 2 s) and returns
  // its horizontal span on the middle line ({-1, -1} if it never showed).
  std::pair<int, int> cursorSpan(Shot* frame = nullptr) {
    const auto start = std::chrono::steady_clock::now();
    while (std::chrono::steady_clock::now() - start < std::chrono::milliseconds(2000)) {
      const Shot shot = drawField();
      int minX = kPopW, maxX = -1;
      for (int x = 0; x < kPopW; ++x) {
        const Rgba c = shot.at(x, kPopH / 2.0);
        if (c.b > c.r + 80) minX = std::min(minX, x), maxX = std::max(maxX, x);
      }
      if (frame) *frame = shot;
      if (maxX >= 0) return {minX, maxX};
      std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    return {-1, -1};
  }

  GlesContext field, top;

 private:
  Keyboard& kb_;
};

// ---- letter keyboard

TEST(MainSurface, BackgroundEverywhereAndAFaceOnEveryKey) {
  for (int variant : {0, 1}) {
    SCOPED_TRACE("variant " + std::to_string(variant));
    Keyboard kb("render-faces-" + std::to_string(variant), {variant});
    REQUIRE_GL(kb);
    const Shot shot = kb.draw();
    for (int i = 0; i < 26; ++i) EXPECT_TRUE(keyFace(i).shows(shot, images::kCharKeys[0], 0, kFaceProbe)) << i;
    // Gaps between keys and the surface's corners show the background.
    const double probes[][2] = {{2, 2}, {kW - 3, 2}, {2, kH - 3}, {kW - 3, kH - 3}, {kKw, 0.5 * kKh},
                                {5 * kKw, 0.5 * kKh}, {1.5 * kKw, 1.5 * kKh}, {7.5 * kKw, 1.5 * kKh},
                                {5 * kKw, 1.0 * kKh}, {5 * kKw, 2.0 * kKh}, {0.3 * kKw, 1.5 * kKh}};
    for (const auto& p : probes)
      EXPECT_TRUE(near(shot.at(p[0], p[1]), backgroundAt(p[0], p[1], kW, kH), 4))
          << "(" << p[0] << ", " << p[1] << ") shows " << str(shot.at(p[0], p[1]));
    EXPECT_EQ(shot.at(kW / 2.0, kH / 2.0).a, 255);
  }
}

TEST(MainSurface, GlyphAtEachKeyIsTheLayoutCharacter) {
  struct Case {
    const char* name;
    std::int16_t page;
    std::uint32_t shift;
    int variant;
  } cases[] = {{"letters", 0, 0, 1}, {"shifted letters", 0, 1, 1}, {"first symbol page", 1, 0, 1},
               {"second symbol page", 1, 1, 1}, {"letters, mode 0", 0, 0, 0}, {"symbols, mode 0", 1, 1, 0}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Keyboard kb(std::string("render-glyphs-") + c.name, {c.variant, true, 0, c.page, c.shift});
    REQUIRE_GL(kb);
    const Shot shot = kb.draw();
    const ImageGroup& group = c.page == 0 ? (c.shift ? images::kShiftedLetterGlyphs : images::kLetterGlyphs)
                                          : (c.shift ? images::kSymbolShiftGlyphs : images::kSymbolGlyphs);
    const auto* table = c.page == 0 ? kb.s->letters : (c.shift ? kb.s->symbolsUpper : kb.s->symbolsLower);
    for (int i = 0; i < 26; ++i) {
      double score = 0;
      EXPECT_EQ(recognise(shot, group, keyGlyph(i, c.variant == 1), &score), kb.glyphAt(table, i)) << "position " << i;
      EXPECT_GT(score, 0.5) << "position " << i;
    }
  }
}

TEST(MainSurface, HeldKeyFaceSitsExactlyOverTheTouchedKey) {
  Keyboard kb("render-held", {0});  // mode 0: no balloon over the held face
  REQUIRE_GL(kb);
  for (int i : {0, 9, 10, 14, 18, 19, 25}) {
    SCOPED_TRACE("layout position " + std::to_string(i));
    EXPECT_EQ(kb.down(touchX(i), keyY(i)), -1);
    const Shot shot = kb.draw();
    for (int j = 0; j < 26; ++j) EXPECT_TRUE(keyFace(j).shows(shot, images::kCharKeys[j == i ? 1 : 0], 0, kFaceProbe)) << j;
    // The glyph stays readable on the held face.
    EXPECT_EQ(recognise(shot, images::kLetterGlyphs, keyGlyph(i, false)), kb.glyphAt(kb.s->letters, i));
    EXPECT_EQ(kb.up(touchX(i), keyY(i)), 0);
    EXPECT_TRUE(keyFace(i).shows(kb.draw(), images::kCharKeys[0], 0, kFaceProbe));
  }
}

// Each function key shows its held picture from the down to the up, and only then.
TEST(MainSurface, FunctionKeysChangePictureWhileHeld) {
  Keyboard kb("render-function-keys", {1});
  REQUIRE_GL(kb);
  struct Key {
    const char* name;
    double x, y;  // touch point
    Quad face;
    const ImageGroup& group;
    double probeDx, probeDy;  // probe offset from the face centre, in half sizes
  } keys[] = {
      {"shift", 0.75 * kKw, 2.5 * kKh, {(-8.709 + 10) / 20 * kW, 2.5 * kKh, 1.1295 * kKw / 2, 0.442 * kKh, 0.9375, 0.625},
       images::kShiftDeleteKeys, 0.0, 0.75},
      {"delete", 9.25 * kKw, 2.5 * kKh, {(8.709 + 10) / 20 * kW, 2.5 * kKh, 1.1295 * kKw / 2, 0.442 * kKh, 0.9375, 0.625},
       images::kShiftDeleteKeys, 0.0, 0.75},
      {"switch", 1.25 * kKw, 3.5 * kKh, {1.25 * kKw, 3.5 * kKh, 1.125 * kKw, 0.45 * kKh, 0.9765, 0.625},
       images::kSwitchKeys, 0.8, 0.0},
      {"space", 5 * kKw, 3.5 * kKh, {5 * kKw, 3.5 * kKh, 2.4075 * kKw, 0.442 * kKh, 1.0, 0.625}, images::kSpaceKeys,
       0.8, 0.0},
      {"done", 8.75 * kKw, 3.5 * kKh, {8.75 * kKw, 3.5 * kKh, 1.1575 * kKw, 0.442 * kKh, 0.9765, 0.625},
       images::kDoneKeys, 0.8, 0.0},
  };
  kb.s->finishMode = 1;
  for (const Key& k : keys) {
    SCOPED_TRACE(k.name);
    EXPECT_TRUE(k.face.shows(kb.draw(), k.group[0], k.probeDx, k.probeDy));
    kb.down(k.x, k.y);
    EXPECT_TRUE(k.face.shows(kb.draw(), k.group[1], k.probeDx, k.probeDy));
    kb.up(k.x, k.y);
    EXPECT_TRUE(k.face.shows(kb.draw(), k.group[0], k.probeDx, k.probeDy)) << "released";
  }
}

// Points above the held key's top edge that change when the balloon is drawn.
int balloonPixels(const Shot& with, const Shot& without, int i) {
  int changed = 0;
  const double top = keyY(i) - 0.5 * kKh;
  for (int y = std::max(0, static_cast<int>(top - 1.3 * kKh)); y < static_cast<int>(top) - 2; ++y)
    for (int x = static_cast<int>(keyX(i) - 0.7 * kKw); x < static_cast<int>(keyX(i) + 0.7 * kKw); ++x)
      changed += !near(with.at(x, y), without.at(x, y), 2);
  return changed;
}

// The balloon shows only in surface mode 1 with popMode on and kbdMode 0; any kbdMode other
// than 0 hides the held key altogether.
TEST(MainSurface, BalloonOnlyWhenItsConditionsHold) {
  struct Case {
    const char* name;
    int variant;
    std::uint16_t popMode, kbdMode;
    int position;
    bool expected;
  } cases[] = {
      {"mode 1, row 2", 1, 1, 0, 21, true}, {"mode 1, row 1", 1, 1, 0, 13, true}, {"mode 0", 0, 1, 0, 21, false},
      {"popMode 0", 1, 0, 0, 21, false},    {"kbdMode 1", 1, 1, 1, 21, false},    {"kbdMode 3, mode 0", 0, 1, 3, 3, false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Keyboard kb(std::string("render-balloon-") + c.name, {c.variant, true});
    REQUIRE_GL(kb);
    kb.s->popMode = c.popMode;
    kb.s->kbdMode = c.kbdMode;
    const Shot idle = kb.draw();
    kb.down(touchX(c.position), keyY(c.position));
    const Shot held = kb.draw();
    const int changed = balloonPixels(held, idle, c.position);
    if (c.kbdMode != 0) {
      EXPECT_TRUE(idle.px == held.px) << "a held key shows despite kbdMode";
    }
    if (!c.expected) {
      EXPECT_EQ(changed, 0);
    } else {
      EXPECT_GT(changed, 2000);
      if (c.position >= 19) {  // fully on screen: the enlarged glyph is the held key's
        double score = 0;
        EXPECT_EQ(recognise(held, images::kLetterGlyphs, balloonGlyph(c.position), &score),
                  kb.glyphAt(kb.s->letters, c.position));
        EXPECT_GT(score, 0.6);
      }
    }
    kb.up(touchX(c.position), keyY(c.position));
    EXPECT_EQ(balloonPixels(kb.draw(), idle, c.position), 0) << "balloon left after release";
  }
}

// ---- number pad

TEST(NumberPad, FacesHeldKeysAndTheMergedKey) {
  for (std::uint32_t type : {1u, 2u}) {
    SCOPED_TRACE("pad type " + std::to_string(type));
    Keyboard kb("render-pad-" + std::to_string(type), {1, true, type});
    REQUIRE_GL(kb);
    Shot shot = kb.draw();
    for (int row = 0; row < 4; ++row)
      for (int column = 0; column < 3; ++column)
        EXPECT_TRUE(padFace(row, column).shows(shot, images::kPadKeys[0], 0.75, 0.6)) << row << "," << column;
    EXPECT_TRUE(padFace(0, 3).shows(shot, images::kPadKeys[1], 0.75, 0.6));
    EXPECT_TRUE(padFace(1, 3).shows(shot, images::kPadKeys[1], 0.75, 0.6));
    const Quad done{padX(3), kH / 2.0 + 2 * kPadUy, 0.96065 * kPadUx, 2 * 0.96809 * kPadUy};
    EXPECT_TRUE(done.shows(shot, images::kPadDoneKeys[0], 0.75, 0.6));
    // Between columns 1 and 2 of the bottom row: a gap on type 1, the merged key on type 2.
    const double mx = kW / 2.0, my = padY(3) + 0.6 * 0.93617 * kPadUy;
    const Rgba merged = type == 1 ? backgroundAt(mx, my, kW, kH) : texel(images::kPadKeys[0], 0.5, 0.8);
    EXPECT_TRUE(near(shot.at(mx, my), merged, 6)) << str(shot.at(mx, my));
    for (int n = 0; n < 10; ++n)  // digits, by pad position
      EXPECT_EQ(recognise(shot, images::kPadDigitGlyphs, padDigitGlyph(n)),
                static_cast<int>(keypadIndexOf(static_cast<std::uint8_t>(kb.s->padDigits[n] + kb.s->keyMask))))
          << "pad position " << n;
    // Held cells: a digit key turns to face 1, the upper function keys to face 0, done to held.
    kb.down(2.5 * kKw * 1.5, 1.5 * kKh);  // row 1, column 1
    EXPECT_TRUE(padFace(1, 1).shows(kb.draw(), images::kPadKeys[1], 0.75, 0.6));
    kb.down(2.5 * kKw * 3.5, 0.5 * kKh);  // row 0, column 3
    EXPECT_TRUE(padFace(0, 3).shows(kb.draw(), images::kPadKeys[0], 0.75, 0.6));
    kb.down(2.5 * kKw * 3.5, 3.5 * kKh);  // done
    EXPECT_TRUE(done.shows(kb.draw(), images::kPadDoneKeys[1], 0.75, 0.6));
    // Row 3, column 2 is the type-1 "OK" key. On type 2 the merged key (columns 1 and 2) is
    // tested as column 1: a held column 2 lights nothing, a held column 1 the merged key.
    kb.hold(3, 2);
    shot = kb.draw();
    if (type == 1) {
      EXPECT_TRUE(padFace(3, 2).shows(shot, images::kPadKeys[1], 0.75, 0.6));
    } else {
      EXPECT_TRUE(near(shot.at(mx, my), texel(images::kPadKeys[0], 0.5, 0.8), 6));
      kb.s->touchColumn = 1;
      EXPECT_TRUE(near(kb.draw().at(mx, my), texel(images::kPadKeys[1], 0.5, 0.8), 6));
    }
    kb.up(2.5 * kKw * 1.5, 3.5 * kKh);
  }
}

// ---- pop-up surfaces

// Dark runs along the dots' centre line: the dots.
int countDots(const Shot& shot, double y) {
  int dots = 0, run = 0;
  for (int x = 0; x < shot.w; ++x) {
    const Rgba c = shot.at(x, y);
    if (c.luma() < 100 && c.b < c.r + 40) {
      ++run;
    } else {
      dots += run >= 3;
      run = 0;
    }
  }
  return dots;
}

// One dot per character up to the field's limit, and the blinking cursor one unit (half the
// dot spacing) right of the last dot.
TEST(PopUpSurface, DotsAndCursorFollowTheLength) {
  struct Case {
    std::uint32_t kbdType;
    int length, dots;
  } cases[] = {{0, 0, 0}, {0, 1, 1}, {0, 7, 7}, {0, 19, 19}, {0, 25, 19}, {1, 4, 4}, {1, 18, 18}, {1, 19, 18}, {2, 25, 18}};
  Keyboard kb("render-dots", {1});
  REQUIRE_GL(kb);
  PopUps pops(kb);
  for (const Case& c : cases) {
    SCOPED_TRACE("type " + std::to_string(c.kbdType) + ", length " + std::to_string(c.length));
    kb.s->currentKbdType = c.kbdType;
    kb.setLength(c.length);
    const Shot shot = pops.drawField();
    const double y = kPopH / 2.0 + (c.kbdType ? 0.173 * kPopH / 2 : 0);
    EXPECT_EQ(countDots(shot, y), c.dots);
    // The field frame covers the middle, the background shows at the very edge.
    EXPECT_TRUE(near(shot.at(3, 3), backgroundAt(3, 3, kPopW, kPopH), 4)) << str(shot.at(3, 3));
    EXPECT_GT(shot.at(kPopW - 18.0, y).luma(), 200);
    if (c.kbdType != 0) continue;
    const auto span = pops.cursorSpan();
    ASSERT_GE(span.second, 0) << "cursor never shown";
    EXPECT_NEAR((span.first + span.second + 1) / 2.0, kPopW / 2.0 + (2 * c.dots - 19) * (kPopW / 40.0), 2.0);
  }
}

TEST(PopUpSurface, TopRowBalloonAndEnlargedGlyph) {
  struct Case {
    const char* name;
    int variant;
    std::int16_t page;
    std::uint32_t shift;
    double touchY;
    std::uint16_t popMode;
    bool shown;
  } cases[] = {
      {"letters, top row", 1, 0, 0, 0.5 * kKh, 1, true},
      {"popMode 0 still shows", 1, 0, 1, 0.5 * kKh, 0, true},
      {"second symbol page shows the first page", 1, 1, 1, 0.5 * kKh, 1, true},
      {"row 1 shows nothing", 1, 0, 0, 1.5 * kKh, 1, false},
      {"mode 0 shows nothing", 0, 0, 0, 0.5 * kKh, 1, false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Keyboard kb(std::string("render-top-") + c.name, {c.variant, true, 0, c.page, c.shift});
    REQUIRE_GL(kb);
    kb.s->popMode = c.popMode;
    PopUps pops(kb);
    const int column = 6;
    kb.down((column + 0.5) * kKw, c.touchY);
    const Shot field = pops.drawField(false);
    Shot top = pops.drawTop();
    int opaque = 0, outside = 0;
    for (int y = 0; y < kPopH; ++y)
      for (int x = 0; x < kPopW; ++x) {
        if (field.at(x, y).a == 0) continue;
        ++opaque;
        outside += std::abs(x - (column + 0.5) * kKw) > 1.5 * kKw;
      }
    EXPECT_EQ(outside, 0);
    if (!c.shown) {
      EXPECT_EQ(opaque, 0);
      EXPECT_TRUE(std::all_of(top.px.begin(), top.px.end(), [](std::uint8_t v) { return v == 0; }));
      continue;
    }
    EXPECT_GT(opaque, 5000);
    const Quad glyph{(column + 0.5) * kKw, kPopH / 2.0 + 0.05 * kPopH, 0.1 * 0.65 / 0.6 * kPopW / 2, 0.65 * kPopH};
    const ImageGroup& group =
        c.page ? images::kSymbolGlyphs : (c.shift ? images::kShiftedLetterGlyphs : images::kLetterGlyphs);
    // The top pop-up is transparent around the glyph; put it on white to read it.
    for (std::size_t k = 0; k < top.px.size(); k += 4)
      for (int ch = 0; ch < 3; ++ch)
        top.px[k + ch] = static_cast<std::uint8_t>((top.px[k + ch] * top.px[k + 3] + 255 * (255 - top.px[k + 3])) / 255);
    double score = 0;
    EXPECT_EQ(recognise(top, group, glyph, &score), kb.glyphAt(c.page ? kb.s->symbolsLower : kb.s->letters, column));
    EXPECT_GT(score, 0.6);
  }
}

// ---- odd states: nothing traps, reads past an array or leaves a GL error

// Before the layout is built the pop-ups draw nothing; frames before the first surface change
// (zero key sizes, zero surface size) draw without fault.
TEST(OddState, UnbuiltAndUnsizedSessions) {
  const int handle = createSession("render-unbuilt");
  KeyboardSession* s = sessionAt(handle);
  ASSERT_NE(s, nullptr);
  GlesContext gl(64, 64), pop(64, 64);
  ASSERT_TRUE(gl.ok()) << gl.error();
  pop.makeCurrent();
  popSurfaceCreated(*s);
  popSurfaceChanged(*s, 64, 64);
  glClearColor(1, 0, 0, 1);
  glClear(GL_COLOR_BUFFER_BIT);
  popDrawFrame(*s, true);
  popTopDrawFrame(*s);
  EXPECT_TRUE(near(grab(pop).at(32, 32), {255, 0, 0, 255}, 0));
  gl.makeCurrent();
  mainSurfaceCreated(*s);
  for (std::uint32_t type : {0u, 1u, 2u}) {
    s->currentKbdType = type;
    s->anyKeyReleased = 0;
    s->keyReleased[3] = 0;
    s->surfaceMode = type == 0 ? 1 : 0;
    mainDrawFrame(*s);
  }
  EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
  pop.makeCurrent();
  popSurfaceCreated(*s);
  s->currentKbdType = 0;
  popDrawFrame(*s, true);
  EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
  destroySession(handle);
}

// Touch state a racing or misbehaving caller may leave behind never reads past an array.
TEST(OddState, OutOfRangeTouchStateIsHarmless) {
  Keyboard kb("render-odd", {1});
  REQUIRE_GL(kb);
  PopUps pops(kb);
  for (std::uint32_t type : {0u, 1u, 2u, 9u})
    for (std::uint32_t row : {0u, 2u, 0xFFFFFFFFu})
      for (std::uint32_t column : {8u, 26u, 0xFFFFFFFFu}) {
        kb.s->currentKbdType = type;
        kb.hold(row, column);
        kb.gl.makeCurrent();
        mainDrawFrame(*kb.s);
        if (type != 0) continue;  // the pop-ups show only held keys of the letter keyboard
        pops.field.makeCurrent();
        popDrawFrame(*kb.s, true);
        pops.top.makeCurrent();
        popTopDrawFrame(*kb.s);
      }
  kb.gl.makeCurrent();
  EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
}

// The GL state a surface sets up and leaves; every texture gets its own name, sampled nearest
// when minified and linear when magnified (glyph strokes survive 2x minification; the
// background is smooth), clamped at the edges; a new surface creation (after a lost context)
// generates new names.
TEST(GlState, SurfaceStateTexturesAndFreshNamesOnRecreation) {
  Keyboard kb("render-params", {1});
  REQUIRE_GL(kb);
  const auto allNames = [&kb] {
    const MainTextureSet& t = kb.s->mainTextures;
    std::vector<GLuint> v;
    auto add = [&](const TextureName* p, int n) {
      for (int i = 0; i < n; ++i) v.push_back(p[i].load());
    };
    add(&t.backgroundTexture, 1), add(t.charKeyTextures, 3), add(t.letterTextures, 26);
    add(t.letterShiftTextures, 26), add(t.symbolTextures, 26), add(t.symbolShiftTextures, 26);
    add(t.spaceKeyTextures, 2), add(&t.spaceLabelTexture, 1), add(t.shiftDeleteKeyTextures, 2);
    add(t.switchKeyTextures, 2), add(t.doneKeyTextures, 2), add(t.iconTextures, 4), add(t.labelTextures, 5);
    add(t.padKeyTextures, 2), add(t.padDoneKeyTextures, 2), add(t.padLabelTextures, 4);
    add(&t.padDoneIconTexture, 1), add(t.padDigitTextures, 10);
    return v;
  };
  // The surface state the draws rely on (no read-back shows a missing one in these scenes).
  GLint value = 0;
  glGetTexEnviv(GL_TEXTURE_ENV, GL_TEXTURE_ENV_MODE, &value);
  EXPECT_EQ(value, GL_REPLACE);  // as the last upload left it
  for (GLenum cap : {GL_TEXTURE_2D, GL_DEPTH_TEST, GL_VERTEX_ARRAY, GL_TEXTURE_COORD_ARRAY})
    EXPECT_TRUE(glIsEnabled(cap)) << std::hex << cap;
  for (const auto& e : {std::pair<GLenum, GLint>{GL_SHADE_MODEL, GL_SMOOTH}, {GL_PERSPECTIVE_CORRECTION_HINT, GL_NICEST}}) {
    glGetIntegerv(e.first, &value);
    EXPECT_EQ(value, e.second) << std::hex << e.first;
  }
  const std::vector<GLuint> names = allNames();
  const std::set<GLuint> first(names.begin(), names.end());
  EXPECT_EQ(first.size(), names.size()) << "one name per texture";
  for (GLuint name : names) {
    ASSERT_TRUE(glIsTexture(name)) << name;
    glBindTexture(GL_TEXTURE_2D, name);
    const std::pair<GLenum, GLint> expected[] = {{GL_TEXTURE_MIN_FILTER, GL_NEAREST},
                                                 {GL_TEXTURE_MAG_FILTER, GL_LINEAR},
                                                 {GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE},
                                                 {GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE}};
    for (const auto& e : expected) {
      glGetTexParameteriv(GL_TEXTURE_2D, e.first, &value);
      EXPECT_EQ(value, e.second) << "texture " << name << " parameter " << std::hex << e.first;
    }
  }
  kb.draw();
  glGetTexEnviv(GL_TEXTURE_ENV, GL_TEXTURE_ENV_MODE, &value);
  EXPECT_EQ(value, GL_MODULATE);
  EXPECT_FALSE(glIsEnabled(GL_BLEND));  // each step closes its blending bracket
  EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
  mainSurfaceCreated(*kb.s);
  for (GLuint name : allNames()) EXPECT_EQ(first.count(name), 0u) << name;
}

// ---- screenshots for review

void save(const Shot& shot, const std::string& name) {
  if (!test::writePng(test::outputPath(name), shot.w, shot.h, shot.px))
    std::printf("(screenshot %s not written: no libpng)\n", name.c_str());
}

TEST(Screenshots, EveryKeyboardState) {
  {
    Keyboard kb("shot-letters", {1});
    REQUIRE_GL(kb);
    save(kb.draw(), "keyboard_letters.png");
    kb.s->shiftOn = 1;
    save(kb.draw(), "keyboard_letters_shift.png");
    kb.s->shiftOn = 0;
    kb.s->symbolPage = 1;
    save(kb.draw(), "keyboard_symbols.png");
    kb.s->shiftOn = 1;
    save(kb.draw(), "keyboard_symbols_page2.png");
    kb.s->symbolPage = 0;
    kb.s->shiftOn = 0;
    kb.down(keyX(21), keyY(21));
    save(kb.draw(), "keyboard_held_balloon.png");
  }
  {
    Keyboard kb("shot-letters-mode0", {0, true});
    REQUIRE_GL(kb);
    kb.down(touchX(12), keyY(12));
    save(kb.draw(), "keyboard_letters_mode0_shuffled_held.png");
  }
  for (std::uint32_t type : {1u, 2u}) {
    Keyboard kb("shot-pad-" + std::to_string(type), {1, false, type});
    REQUIRE_GL(kb);
    save(kb.draw(), "keyboard_pad_type" + std::to_string(type) + ".png");
  }
  Keyboard kb("shot-popups", {1});
  REQUIRE_GL(kb);
  PopUps pops(kb);
  kb.setLength(6);
  kb.down(keyX(2), keyY(2));  // 'e' held in the top row
  const Shot keyboard = kb.draw();
  Shot field;
  pops.cursorSpan(&field);  // a frame with the cursor visible
  const Shot top = pops.drawTop();
  save(field, "popup_field.png");
  save(top, "popup_top.png");
  // Both pop-ups composed above the keyboard, as the app stacks its views.
  Shot all{kW, kPopH + kH, field.px};
  for (std::size_t k = 0; k < all.px.size(); k += 4)
    for (int c = 0; c < 3; ++c)
      all.px[k + c] = static_cast<std::uint8_t>((top.px[k + c] * top.px[k + 3] + all.px[k + c] * (255 - top.px[k + 3])) / 255);
  all.px.insert(all.px.end(), keyboard.px.begin(), keyboard.px.end());
  save(all, "keyboard_with_popups.png");
}

}  // namespace
}  // namespace tessel
