// The three surfaces drawn by Mesa's GLES 1.1 offscreen and read back. Every keyboard state is
// compared key by key with its reviewed picture (docs/screenshots/<theme>/), so a failure names the
// key and what it should show. TESSEL_UPDATE_SCREENSHOTS=1 rewrites the pictures: review each change.
#include <gtest/gtest.h>

#include <GLES/gl.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "input/touch.h"
#include "render/glyph_index.h"
#include "render/image_table.h"
#include "render/surfaces.h"
#include "session/session.h"
#include "common/egl_pbuffer.h"
#include "common/png_file.h"

namespace tessel {
extern std::int32_t (*cursorClockMicros)();

namespace {

using host::GlesContext;

constexpr int kPopH = 180;  // pop-ups: one key row above the keyboard

// A read-back frame, top row first.
struct Shot {
  int w = 0, h = 0;
  std::vector<std::uint8_t> px;
  const std::uint8_t* at(int x, int y) const { return &px[(static_cast<std::size_t>(y) * w + x) * 4]; }
  int luma(int x, int y) const { return (at(x, y)[0] + at(x, y)[1] + at(x, y)[2]) / 3; }
  bool cursorAt(int x, int y) const { return at(x, y)[2] > at(x, y)[0] + 80; }  // blue in both themes
};

Shot grab(const GlesContext& gl) { return glFinish(), Shot{gl.width(), gl.height(), gl.readRgba()}; }

std::int64_t gNow = 0;  // the test clock, microseconds

struct Scene {
  int w = 1080, h = 720, mode = 1;
  std::uint32_t type = 0, page = 0, shift = 0;
  std::uint16_t switchMode = 0, kbdMode = 0, popMode = 1;
  bool shuffled = false;
};

class Keyboard {
 public:
  explicit Keyboard(const std::string& name, const Scene& o) : gl(o.w, o.h), w(o.w), h(o.h) {
    cursorClockMicros = [] { return static_cast<std::int32_t>(gNow % 1000000); };
    handle = createSession(name.c_str());
    s = sessionAt(handle);
    if (s == nullptr || !gl.ok()) return;
    s->kbdRandom = o.shuffled ? 1 : 0, s->maxLength = 4092, s->finishMode = 1;
    mainSurfaceCreated(*s);
    mainSurfaceChanged(*s, o.w, o.h, o.mode);
    s->currentKbdType = o.type, s->symbolPage = o.page, s->shiftOn = o.shift;
    s->switchMode = o.switchMode, s->kbdMode = o.kbdMode, s->popMode = o.popMode;
  }
  ~Keyboard() { destroySession(handle); }
  bool ready() const { return s != nullptr && gl.ok(); }
  Shot draw() { return gl.makeCurrent(), mainDrawFrame(*s), grab(gl); }
  // Holds the key whose cell (in key widths and heights) is centred at (cx, cy).
  void hold(double cx, double cy) {
    const double cols = s->currentKbdType == 0 ? 10 : 4;
    touch(*s, 0, static_cast<float>(cx * w / cols), static_cast<float>(cy * h / 4));
  }
  void setLength(int n) {
    ContentGuard guard(*s->content);
    std::fill_n(guard.text(), n, 'x'), guard.text()[n] = 0, s->content->length = static_cast<std::uint16_t>(n);
  }
  char charAt(const RelaxedField<std::uint8_t>* table, int i) const { return static_cast<char>(table[i] + s->keyMask); }
  GlesContext gl;
  int w, h, handle = -1;
  KeyboardSession* s = nullptr;
};

#define REQUIRE_GL(kb) ASSERT_TRUE((kb).ready()) << "offscreen GLES 1.1 unavailable: " << (kb).gl.error()

// The field and top pop-ups of a keyboard, each on its own context, as wide as the keyboard.
class PopUps {
 public:
  explicit PopUps(Keyboard& kb) : field(kb.w, kPopH), top(kb.w, kPopH), kb_(kb) {
    field.makeCurrent(), popSurfaceCreated(*kb.s), popSurfaceChanged(*kb.s, kb.w, kPopH);
    top.makeCurrent(), popTopSurfaceCreated(*kb.s), popTopSurfaceChanged(*kb.s, kb.w, kPopH);
  }
  Shot drawField(bool showField = true) { return field.makeCurrent(), popDrawFrame(*kb_.s, showField), grab(field); }
  Shot drawTop() { return top.makeCurrent(), popTopDrawFrame(*kb_.s), grab(top); }
  bool cursorShown(const Shot& f) const {
    for (int x = 0; x < f.w; ++x)
      if (f.cursorAt(x, kPopH / 2 + (kb_.s->currentKbdType ? 8 : 0))) return true;
    return false;
  }
  // Moves the test clock on until the cursor shows.
  Shot fieldWithCursor() {
    Shot f = drawField();
    for (int k = 0; k < 3 && !cursorShown(f); ++k) gNow += 850000, f = drawField();
    return f;
  }
  GlesContext field, top;

 private:
  Keyboard& kb_;
};

struct Region {
  std::string key, picture;
  double x0, y0, x1, y1;  // in key cells: 10 x 4 on the letter keyboard, 4 x 4 on the pad
};

struct State {
  const char* name;
  Scene setup;
  double holdX, holdY;  // centre of the held key's cell; negative: none
  const char* functionKeys;  // pictures of the function keys, in the order regionsOf names them
  int length = -1;           // >= 0: the field and top pop-ups are drawn above the keyboard
};

const State kStates[] = {
    {"letters", {}, -1, -1, "shift off|delete|?123|space|Done|no balloon"},
    {"letters_shift", {1080, 720, 1, 0, 0, 1}, -1, -1, "shift on|delete|?123|space|Done|no balloon"},
    {"symbols", {1080, 720, 1, 0, 1, 0}, -1, -1, "#+=|delete|ABC|space|Done|no balloon"},
    {"symbols_page2", {1080, 720, 1, 0, 1, 1}, -1, -1, "#+=|delete|ABC|space|Done|no balloon"},
    {"letters_switchmode1", {1080, 720, 1, 0, 0, 0, 1}, -1, -1, "shift off|delete|123|space|Done|no balloon"},
    {"symbols_switchmode1", {1080, 720, 1, 0, 1, 0, 1}, -1, -1, "#+=|delete|123|space|Done|no balloon"},
    {"held_shift", {}, 0.75, 2.5, "held shift on|delete|?123|space|Done|no balloon"},
    {"held_delete", {}, 9.25, 2.5, "shift off|held delete|?123|space|Done|no balloon"},
    {"held_switch", {}, 1.25, 3.5, "shift off|delete|held ?123|space|Done|no balloon"},
    {"held_space", {}, 5, 3.5, "shift off|delete|?123|held space|Done|no balloon"},
    {"held_done", {}, 8.75, 3.5, "shift off|delete|?123|space|held Done|no balloon"},
    {"held_key_balloon", {}, 4, 2.5, "shift off|delete|?123|space|Done|balloon with 'c'"},
    {"held_key_popmode_off", {1080, 720, 1, 0, 0, 0, 0, 0, 0}, 4, 2.5, "shift off|delete|?123|space|Done|no balloon"},
    {"held_key_kbdmode", {1080, 720, 1, 0, 0, 0, 0, 1}, 4, 2.5, "shift off|delete|?123|space|Done|no balloon"},
    {"letters_mode0_held", {1080, 720, 0}, 4, 2.5, "shift off|delete|?123|space|Done|no balloon"},
    {"letters_1440x600", {1440, 600}, 4, 2.5, "shift off|delete|?123|space|Done|balloon with 'c'"},
    {"letters_720x640_mode0", {720, 640, 0}, -1, -1, "shift off|delete|?123|space|Done|no balloon"},
    {"pad1", {1080, 720, 1, 1}, -1, -1, "delete|Clear|Done and chevron|'.'|OK"},
    {"pad2", {1080, 720, 1, 2}, -1, -1, "delete|Clear|Done|space label|space label"},
    {"pad1_switchmode1", {1080, 720, 1, 1, 0, 0, 1}, -1, -1, "delete|ABC|Done and chevron|'.'|OK"},
    {"pad2_switchmode1", {1080, 720, 1, 2, 0, 0, 1}, -1, -1, "delete|ABC|Done|space label|space label"},
    {"pad1_held_digit", {1080, 720, 1, 1}, 1.5, 1.5, "delete|Clear|Done and chevron|'.'|OK"},
    {"pad1_held_clear", {1080, 720, 1, 1}, 3.5, 1.5, "delete|held Clear|Done and chevron|'.'|OK"},
    {"pad1_held_done", {1080, 720, 1, 1}, 3.5, 2.5, "delete|Clear|held Done and chevron|'.'|OK"},
    {"pad1_held_done_kbdmode", {1080, 720, 1, 1, 0, 0, 0, 1}, 3.5, 2.5, "delete|Clear|Done and chevron|'.'|OK"},
    {"pad2_held_space", {1080, 720, 1, 2}, 1.5, 3.5, "delete|Clear|Done|held space label|held space label"},
    {"pad1_mode0", {1080, 720, 0, 1}, -1, -1, "delete|Clear|Done and chevron|'.'|OK"},
    {"pad2_1440x600", {1440, 600, 1, 2}, -1, -1, "delete|Clear|Done|space label|space label"},
    {"popups_letters", {}, 2.5, 0.5, "shift off|delete|?123|space|Done|no balloon", 7},
    {"popups_symbols_page2", {1080, 720, 1, 0, 1, 1}, 6.5, 0.5, "#+=|delete|ABC|space|Done|no balloon", 0},
    {"popups_pad", {1080, 720, 1, 1}, -1, -1, "delete|Clear|Done and chevron|'.'|OK", 5},
    {"popups_letters_25_typed", {}, -1, -1, "shift off|delete|?123|space|Done|no balloon", 25},
    {"popups_pad_25_typed", {1080, 720, 1, 2}, -1, -1, "delete|Clear|Done|space label|space label", 25},
};

// The regions of a state's keyboard, named by key and by the picture each should show.
std::vector<Region> regionsOf(const State& st, Keyboard& kb) {
  std::vector<Region> out;
  std::vector<std::string> fn;
  std::stringstream in(st.functionKeys);
  for (std::string part; std::getline(in, part, '|');) fn.push_back(part);
  const bool held = st.holdX >= 0;
  if (st.setup.type == 0) {
    const bool symbols = st.setup.page != 0;
    const auto* table = symbols ? (st.setup.shift ? kb.s->symbolsUpper : kb.s->symbolsLower) : kb.s->letters;
    for (int i = 0; i < 26; ++i) {
      const double x = i <= 9 ? i : i <= 18 ? i - 9.5 : i - 17.5, y = i <= 9 ? 0 : i <= 18 ? 1 : 2;
      const bool lit = held && st.holdX == x + 0.5 && st.holdY == y + 0.5 && !st.setup.kbdMode;
      char c = kb.charAt(table, i);
      if (!symbols && st.setup.shift) c = static_cast<char>(c - 'a' + 'A');
      out.push_back({"key " + std::to_string(i), std::string(lit ? "held face, " : "face, ") + "'" + c + "'", x, y, x + 1, y + 1});
    }
    const double boxes[][4] = {{0, 2, 1.5, 3}, {8.5, 2, 10, 3}, {0, 3, 2.5, 4}, {2.5, 3, 7.5, 4}, {7.5, 3, 10, 4}};
    const char* names[] = {"shift", "delete", "switch", "space", "done"};
    for (int k = 0; k < 5; ++k) out.push_back({names[k], fn[k], boxes[k][0], boxes[k][1], boxes[k][2], boxes[k][3]});
    if (held && st.holdY < 3) out.push_back({"above the held key", fn[5], st.holdX - 0.8, 0, st.holdX + 0.8, st.holdY - 0.5});
    return out;
  }
  // The pad's keys fill 0.95 of the width, centred: a region per column, a little inside its key.
  const auto column = [](double c) { return 2 + (c + 0.5 - 2) * 0.953; };
  for (int n = 0; n < 10; ++n) {
    const double x = column(n % 3), y = n / 3;
    const char d = kb.charAt(kb.s->padDigits, n);
    out.push_back({"pad position " + std::to_string(n), std::string("digit '") + d + "'", x - 0.45, y, x + 0.45, y + 1});
  }
  const double boxes[][3] = {{3, 0, 1}, {3, 1, 2}, {3, 2, 4}, {1, 3, 4}, {2, 3, 4}};
  const char* names[] = {"column 3, row 0", "column 3, row 1", "done", "row 3, column 1", "row 3, column 2"};
  for (int k = 0; k < 5; ++k)
    out.push_back({names[k], fn[k], column(boxes[k][0]) - 0.45, boxes[k][1], column(boxes[k][0]) + 0.45, boxes[k][2]});
  return out;
}

// Pixels inside [x0, x1) x [y0, y1) that differ clearly from the reviewed picture.
int differing(const Shot& a, const Shot& b, int x0, int y0, int x1, int y1) {
  int n = 0;
  for (int y = std::max(0, y0); y < std::min(a.h, y1); ++y)
    for (int x = std::max(0, x0); x < std::min(a.w, x1); ++x)
      n += std::max({std::abs(a.at(x, y)[0] - b.at(x, y)[0]), std::abs(a.at(x, y)[1] - b.at(x, y)[1]),
                     std::abs(a.at(x, y)[2] - b.at(x, y)[2]), std::abs(a.at(x, y)[3] - b.at(x, y)[3])}) > 40;
  return n;
}

TEST(KeyPictures, EveryStateShowsTheReviewedPictureOnEveryKey) {
  const bool update = std::getenv("TESSEL_UPDATE_SCREENSHOTS") != nullptr;
  for (const State& st : kStates) {
    SCOPED_TRACE(st.name);
    Keyboard kb(std::string("render-") + st.name, st.setup);
    REQUIRE_GL(kb);
    std::vector<Shot> shots;
    std::unique_ptr<PopUps> pops(st.length >= 0 ? new PopUps(kb) : nullptr);
    if (st.holdX >= 0) kb.hold(st.holdX, st.holdY);
    if (pops) {
      kb.setLength(st.length);
      shots = {st.length > 0 ? pops->fieldWithCursor() : pops->drawField(false), pops->drawTop()};
    }
    shots.push_back(kb.draw());
    Shot shot{kb.w, 0, {}};  // the pop-ups stacked above the keyboard, as the app lays out its views
    for (const Shot& s : shots) {
      shot.h += s.h;
      shot.px.insert(shot.px.end(), s.px.begin(), s.px.end());
    }
    const int top = shot.h - kb.h;  // the keyboard's first row in the stacked picture
    const std::string path = std::string(TESSEL_SOURCE_DIR "/docs/screenshots/") + TESSEL_TEST_THEME + "/" + st.name + ".png";
    if (update && host::writePng(path, shot.w, shot.h, shot.px)) continue;
    Shot ref;
    ASSERT_TRUE(host::readPng(path, ref.w, ref.h, ref.px)) << "no reviewed " << path;
    ASSERT_EQ(ref.w * 10000 + ref.h, shot.w * 10000 + shot.h) << "size of the reviewed picture";
    std::vector<Region> regions = regionsOf(st, kb);
    const double cols = st.setup.type == 0 ? 10 : 4, cw = kb.w / cols, ch = kb.h / 4.0;
    if (top > 0) {  // the pop-ups: the field with its dots and cursor, and the top pop-up
      const int limit = st.setup.type ? 18 : 19;
      const int dots = std::min(st.length, limit);
      regions.push_back({"field", dots > 0 ? std::to_string(dots) + " dots" : "balloon only", 0, -2 * kPopH / ch, cols, -kPopH / ch});
      if (dots > 0) {  // the cursor, one grid unit (a fortieth of the width) right of the last dot
        const double x = cols * (0.5 + (2 * dots - limit) / 40.0);
        regions.push_back({"cursor", "the cursor", x - cols / 40, -2 * kPopH / ch, x + cols / 40, -kPopH / ch});
      }
      regions.push_back({"top pop-up", st.holdX >= 0 ? "enlarged glyph" : "nothing", 0, -kPopH / ch, cols, 0});
    }
    for (const Region& r : regions) {
      const int x0 = static_cast<int>(r.x0 * cw), x1 = static_cast<int>(r.x1 * cw);
      const int y0 = top + static_cast<int>(r.y0 * ch), y1 = top + static_cast<int>(r.y1 * ch);
      const int bad = differing(shot, ref, x0, y0, x1, y1);
      EXPECT_LE(bad, 8 + (x1 - x0) * (y1 - y0) / 500)
          << r.key << " should show " << r.picture << ": " << bad << " pixels differ from the reviewed picture";
    }
  }
}

// Which image of `group` is drawn in the box (pixels): the one whose ink (alpha >= 128) best
// overlaps the dark pixels read back there (intersection over union).
int recognise(const Shot& shot, const ImageGroup& group, double cx, double cy, double hx, double hy, bool darkInk) {
  int best = -1;
  double bestIou = 0.5;
  for (int g = 0; g < group.count; ++g) {
    int both = 0, either = 0;
    for (int y = static_cast<int>(std::ceil(cy - hy)); y < static_cast<int>(cy + hy); ++y)
      for (int x = static_cast<int>(std::ceil(cx - hx)); x < static_cast<int>(cx + hx); ++x) {
        const int tx = std::clamp(static_cast<int>((x + 0.5 - (cx - hx)) / (2 * hx) * 64), 0, 63);
        const int ty = std::clamp(static_cast<int>((y + 0.5 - (cy - hy)) / (2 * hy) * 128), 0, 127);
        const bool ink = group[g].pixels[(static_cast<std::size_t>(ty) * 64 + tx) * 4 + 3] >= 128;
        const bool seen = darkInk ? shot.luma(x, y) < 110 : shot.luma(x, y) > 145;
        both += seen && ink, either += seen || ink;
      }
    const double iou = either ? static_cast<double>(both) / either : 0;
    if (iou > bestIou) bestIou = iou, best = g;
  }
  return best;
}

TEST(KeyPictures, ShuffledLayoutShowsEachCharacterOnItsKey) {
  struct Case {
    std::uint32_t page, shift, mode;
    const ImageGroup& group;
  } cases[] = {{0, 0, 1, images::kLetterGlyphs}, {0, 1, 1, images::kShiftedLetterGlyphs}, {1, 0, 1, images::kSymbolGlyphs},
               {1, 1, 1, images::kSymbolShiftGlyphs}, {0, 0, 0, images::kLetterGlyphs}, {1, 1, 0, images::kSymbolShiftGlyphs}};
  const bool darkInk = std::string(TESSEL_TEST_THEME) != "dark";
  for (const Case& c : cases) {
    SCOPED_TRACE("page " + std::to_string(c.page) + ", shift " + std::to_string(c.shift) + ", mode " + std::to_string(c.mode));
    Keyboard kb("render-shuffled", {1080, 720, static_cast<int>(c.mode), 0, c.page, c.shift, 0, 0, 1, true});
    REQUIRE_GL(kb);
    const Shot shot = kb.draw();
    const auto* table = c.page == 0 ? kb.s->letters : (c.shift ? kb.s->symbolsUpper : kb.s->symbolsLower);
    const double kw = 108, kh = 180, unit = c.mode ? kh : kw;  // a glyph is 0.3 x 0.6 units
    for (int i = 0; i < 26; ++i) {
      const double x = (i <= 9 ? i + 0.5 : i <= 18 ? i - 9 : i - 17) * kw, y = (i <= 9 ? 0.5 : i <= 18 ? 1.5 : 2.5) * kh;
      const int expected = glyphIndexOf(static_cast<std::uint8_t>(kb.charAt(table, i)));
      EXPECT_EQ(recognise(shot, c.group, x, y, 0.15 * unit, 0.3 * unit, darkInk), expected)
          << "key " << i << " should show '" << kb.charAt(table, i) << "'";
    }
  }
}

// The phase flips on the first frame more than 800 ms (within the second) after the last flip.
TEST(FieldPopUp, CursorBlinksEvery800Milliseconds) {
  Keyboard kb("render-blink", {});
  REQUIRE_GL(kb);
  PopUps pops(kb);
  std::vector<int> flips;
  const std::int64_t start = gNow;
  bool shown = pops.cursorShown(pops.drawField());
  for (int k = 1; k <= 60; ++k) {  // 3 s of 50 ms frames
    gNow += 50000;
    const bool now = pops.cursorShown(pops.drawField());
    if (now != shown) flips.push_back(k);
    shown = now;
  }
  ASSERT_GE(flips.size(), 3u);
  for (std::size_t k = 1; k < flips.size(); ++k) EXPECT_EQ(flips[k] - flips[k - 1], 17) << "frames between flips";
  // Seconds later, exactly 800 ms within the second after the last flip: no change; 1 us more: a flip.
  const std::int64_t lastFlip = start + 50000LL * flips.back();
  gNow = lastFlip + 800000 + 1000000 * ((gNow - lastFlip) / 1000000 + 2);
  EXPECT_EQ(pops.cursorShown(pops.drawField()), shown);
  gNow += 1;
  EXPECT_NE(pops.cursorShown(pops.drawField()), shown);
}

// Odd states: nothing traps, reads past an array or leaves a GL error.
TEST(OddState, UnbuiltUnsizedAndOutOfRangeStatesAreHarmless) {
  const int handle = createSession("render-unbuilt");
  KeyboardSession* s = sessionAt(handle);
  ASSERT_NE(s, nullptr);
  GlesContext pop(64, 64);
  ASSERT_TRUE(pop.ok()) << pop.error();
  popSurfaceCreated(*s), popSurfaceChanged(*s, 64, 64);
  glClearColor(1, 0, 0, 1), glClear(GL_COLOR_BUFFER_BIT);
  popDrawFrame(*s, true), popTopDrawFrame(*s);  // not built yet: nothing drawn
  EXPECT_TRUE(grab(pop).at(32, 32)[0] == 255 && grab(pop).at(32, 32)[1] == 0);
  destroySession(handle);

  Keyboard kb("render-odd", {});
  REQUIRE_GL(kb);
  PopUps pops(kb);
  for (std::uint32_t type : {0u, 1u, 2u, 9u})
    for (std::uint32_t row : {0u, 2u, 0xFFFFFFFFu})
      for (std::uint32_t column : {8u, 26u, 0xFFFFFFFFu}) {
        kb.s->currentKbdType = type;
        kb.s->anyKeyReleased = 0, kb.s->keyReleased[3] = 0, kb.s->touchRow = row, kb.s->touchColumn = column;
        kb.draw(), pops.drawField(), pops.drawTop();
      }
  kb.gl.makeCurrent();
  EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
}

}  // namespace
}  // namespace tessel
