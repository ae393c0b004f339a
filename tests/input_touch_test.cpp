// Touch dispatch at its edges: margins, dead zones, key borders, actions, modes, the length limit
// and the accepts pattern. 100 x 40 and 1000 x 400 keep every border exact in float and double.
#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "input/layout.h"
#include "input/touch.h"
#include "session/sealed_text.h"
#include "session/session.h"
#include "session/settings.h"
#include "support/keyboard_typist.h"

namespace tessel {
namespace {

using test::KeyGrid;
using test::KeyMap;
using test::ScopedKeyboard;
using test::Typist;

constexpr int kDown = 0, kUp = 1, kMove = 2;

int press(KeyboardSession& s, float x, float y) {
  touch(s, kDown, x, y);
  return touch(s, kUp, x, y);
}

struct EdgeCase {
  const char* name;
  float x, y;
  int result;            // of the up
  const char* appended;  // the content afterwards
};

// 1080 x 720: keys 108 wide and 180 high, so the side margins (a tenth of a key width, 10.8)
// and the top and bottom ones (a tenth of a key height, 18) differ.
const EdgeCase kMarginCases[] = {
    {"leftInside", 11.0f, 100.0f, 0, "q"},     {"leftOutside", 10.0f, 100.0f, -1, ""},
    {"rightInside", 1069.0f, 100.0f, 0, "p"},  {"rightOutside", 1070.0f, 100.0f, -1, ""},
    {"topInside", 50.0f, 19.0f, 0, "q"},       {"topOutside", 50.0f, 17.0f, -1, ""},
    {"bottomInside", 540.0f, 701.0f, 0, " "},  {"bottomOutside", 540.0f, 703.0f, -1, ""},
    {"nanX", std::nanf(""), 100.0f, -1, ""},   {"negative", -50.0f, -50.0f, -1, ""},
};

TEST(TouchEdges, MarginsOnANonSquareSurface) {
  for (const auto& c : kMarginCases) {
    SCOPED_TRACE(c.name);
    ScopedKeyboard kb("margins", 1080, 720);
    touch(kb.session(), kDown, 150, 100);  // light the character highlight first
    ASSERT_EQ(kb.session().keyReleased[3], 0u);
    EXPECT_EQ(touch(kb.session(), kUp, c.x, c.y), c.result);
    EXPECT_EQ(kb.text(), c.appended);
    for (std::size_t flag = 0; flag < kHighlightFlags && c.result == -1; ++flag)
      EXPECT_EQ(kb.session().keyReleased[flag], 1u) << "highlight " << flag << " kept";
  }
}

// 100 x 40: keys 10 wide. Row 1 dead zones are x <= 3 and x >= 93; row 2 has shift below 15
// and delete above 85; row 3 has switch below 25, space below 75, then done.
struct BorderCase {
  const char* name;
  float x, y;
  int result;            // of the up
  const char* appended;  // the content afterwards
  unsigned shiftOn, symbolPage;
};

const BorderCase kBorderCases[] = {
    {"row1LeftDeadZone", 3.0f, 15.0f, 0, "", 0, 0},        {"row1FirstKey", std::nextafter(3.0f, 4.0f), 15.0f, 0, "a", 0, 0},
    {"row1RightDeadZone", 93.0f, 15.0f, 0, "", 0, 0},      {"row1LastKey", std::nextafter(93.0f, 0.0f), 15.0f, 0, "l", 0, 0},
    {"row1KeyBorder", 13.0f, 15.0f, 0, "s", 0, 0},         {"row0KeyBorder", 10.0f, 5.0f, 0, "w", 0, 0},
    {"row1TopBorder", 50.0f, 10.0f, 0, "g", 0, 0},         {"shiftBelow15", std::nextafter(15.0f, 0.0f), 25.0f, 0, "", 1, 0},
    {"firstRow2KeyAt15", 15.0f, 25.0f, 0, "z", 0, 0},      {"lastRow2Key", std::nextafter(85.0f, 0.0f), 25.0f, 0, "m", 0, 0},
    {"row2At85HoldsNoKey", 85.0f, 25.0f, 0, "", 0, 0},     {"spaceAt25", 25.0f, 35.0f, 0, " ", 0, 0},
    {"switchBelow25", std::nextafter(25.0f, 0.0f), 35.0f, 0, "", 0, 1}, {"doneAt75", 75.0f, 35.0f, 1, "", 0, 0},
    {"spaceBelow75", std::nextafter(75.0f, 0.0f), 35.0f, 0, " ", 0, 0},
};

TEST(TouchEdges, KeyBorders) {
  for (const auto& c : kBorderCases) {
    SCOPED_TRACE(c.name);
    ScopedKeyboard kb("borders", 100, 40);
    setFinishMode(kb.session(), 1);
    EXPECT_EQ(press(kb.session(), c.x, c.y), c.result);
    EXPECT_EQ(kb.text(), c.appended);
    EXPECT_EQ(kb.session().shiftOn, c.shiftOn);
    EXPECT_EQ(kb.session().symbolPage, c.symbolPage);
  }
}

TEST(TouchActions, DownUpMoveAndUnknown) {
  ScopedKeyboard kb("actions", 1000, 400);
  KeyboardSession& s = kb.session();
  EXPECT_EQ(touch(s, kDown, 150, 50), -1);
  EXPECT_EQ(s.keyReleased[3], 0u);
  touch(s, kDown, 50, 250);  // shift held
  EXPECT_EQ(s.keyReleased[4], 0u);
  EXPECT_EQ(touch(s, kMove, 250, 150), -1);  // onto 'd': every highlight dropped, then 'd' lit
  EXPECT_EQ(s.keyReleased[4], 1u);
  EXPECT_EQ(s.keyReleased[3], 0u);
  for (int action : {3, -1, 255}) EXPECT_EQ(touch(s, action, 250, 150), -1);
  EXPECT_EQ(kb.length(), 0u);
  EXPECT_EQ(touch(s, kUp, 250, 150), 0);
  EXPECT_EQ(kb.text(), "d");
  EXPECT_EQ(s.anyKeyReleased, 1u);
}

TEST(TouchModes, SwitchModeOneOpensTheDigitPad) {
  ScopedKeyboard kb("switch", 1000, 400);
  KeyboardSession& s = kb.session();
  const KeyGrid grid(1000, 400);
  Typist typist(s, grid);
  ASSERT_TRUE(typist.type("ab"));
  setSwitchMode(s, 1);
  EXPECT_EQ(typist.tap(grid.switchKey()), 0);
  EXPECT_EQ(s.currentKbdType, 2u);
  EXPECT_EQ(s.symbolPage, 0u);
  EXPECT_EQ(typist.tap(grid.padCell(1, 3)), 0);  // back to the full keyboard, text kept
  EXPECT_EQ(s.currentKbdType, 0u);
  EXPECT_EQ(kb.text(), "ab");
}

TEST(TouchModes, NumberPadCells) {
  // Cell (3, 1) is the point and (3, 2) done on the pad with a point (type 1) only.
  const struct {
    std::int16_t type;
    unsigned highlightAfterDown;
    int up;
    const char* text;
    std::size_t lengthAfterDelete;
  } cases[] = {{1, 0, 1, "1.", 1}, {2, 1, 0, "1", 0}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.type);
    ScopedKeyboard kb("padcells", 1000, 400);
    KeyboardSession& s = kb.session();
    setFinishMode(s, 1);
    setKbdType(s, c.type);
    const KeyGrid grid(1000, 400);
    Typist typist(s, grid);
    EXPECT_EQ(typist.tap(grid.padCell(0, 0)), 0);
    EXPECT_EQ(typist.tap(grid.padCell(3, 1)), 0);
    touch(s, kDown, grid.padCell(3, 2).x, grid.padCell(3, 2).y);
    EXPECT_EQ(s.keyReleased[3], c.highlightAfterDown);
    EXPECT_EQ(touch(s, kUp, grid.padCell(3, 2).x, grid.padCell(3, 2).y), c.up);
    EXPECT_EQ(kb.text(), c.text);
    for (int row : {2, 3}) EXPECT_EQ(typist.tap(grid.padCell(row, 3)), 1) << "done spans rows 2 and 3";
    EXPECT_EQ(typist.tap(grid.padCell(0, 3)), 0);  // delete
    EXPECT_EQ(kb.length(), c.lengthAfterDelete);
  }
}

TEST(TouchModes, DoneClearsLayoutBuiltOnlyWithFinishMode0) {
  for (std::int16_t finish : {0, 1}) {
    ScopedKeyboard kb("done", 1000, 400, true);
    KeyboardSession& s = kb.session();
    setFinishMode(s, finish);
    const auto before = KeyMap::fromSession(s).letters;
    EXPECT_EQ(touch(s, kDown, 900, 350), -1);
    EXPECT_EQ(s.layoutBuilt, 1);
    EXPECT_EQ(touch(s, kUp, 900, 350), 1);
    EXPECT_EQ(s.layoutBuilt, finish == 0 ? 0 : 1);
    buildLayout(s);  // the next surface creation
    EXPECT_EQ(KeyMap::fromSession(s).letters == before, finish == 1);
  }
}

TEST(TouchLimits, MaxLengthStopsCharactersSpacesAndPadKeys) {
  ScopedKeyboard kb("max6", 1000, 400, false, "[[:print:]]*", 6);
  Typist typist(kb.session(), KeyGrid(1000, 400));
  ASSERT_TRUE(typist.type("abc de f "));  // a refused key's up still gives 0
  setKbdType(kb.session(), 1);
  ASSERT_TRUE(typist.typeOnPad(".1"));
  EXPECT_EQ(kb.text(), "abc de");
}

// A maxLength above the buffer is held to 4092: the buffer fills, keeps its terminator, and
// drops the next key.
TEST(TouchLimits, FillingTheWholeBuffer) {
  ScopedKeyboard kb("fill", 1000, 400, false, "[[:print:]]*", 32767);
  KeyboardSession& s = kb.session();
  for (std::size_t i = 0; i < kContentCapacity; ++i) ASSERT_EQ(press(s, 150, 50), 0);
  EXPECT_EQ(press(s, 150, 50), 0);
  EXPECT_EQ(press(s, 500, 350), 0);
  EXPECT_EQ(kb.text(), std::string(kContentCapacity, 'w'));
  EXPECT_EQ(s.content->plaintext[kContentCapacity], 0);
  // Even with the limit bypassed, the store refuses to write past its capacity.
  s.maxLength = 32767;
  EXPECT_EQ(press(s, 150, 50), 0);
  appendCharacter(*s.content, 'x', *s.acceptsEngine);
  EXPECT_EQ(kb.length(), kContentCapacity);
  EXPECT_EQ(s.content->plaintext[kContentCapacity], 0);
}

// Characters the pattern refuses, or all once it is removed, leave the sealed bytes unchanged;
// delete and clear still work without a pattern.
TEST(TouchPattern, RefusedCharactersLeaveTheSealedBytesUnchanged) {
  ScopedKeyboard kb("accepts", 1000, 400, false, "[0-9]*");
  KeyboardSession& s = kb.session();
  const KeyGrid grid(1000, 400);
  Typist typist(s, grid);
  ASSERT_TRUE(typist.type("12a# 3"));  // a letter, a symbol and space: refused
  EXPECT_EQ(kb.text(), "123");
  setAccepts(s, nullptr);  // the digit typed next is refused too: no pattern left
  const std::string sealed = kb.restingBuffer();
  ASSERT_TRUE(typist.type("d e1"));
  setKbdType(s, 1);
  EXPECT_EQ(typist.tap(grid.padCell(3, 1)), 0);
  EXPECT_EQ(kb.restingBuffer(), sealed);
  EXPECT_EQ(typist.tap(grid.padCell(0, 3)), 0);  // delete
  EXPECT_EQ(kb.text(), "12");
  EXPECT_EQ(typist.tap(grid.padCell(1, 3)), 0);  // clear, the pad staying up
  EXPECT_EQ(s.currentKbdType, 1u);
  EXPECT_EQ(kb.restingBuffer(), std::string(kContentBufferSize, '\0'));
}

// Before any layout or geometry (zeroed tables and key sizes) nothing traps or is taken as a key.
TEST(TouchBadInput, UnbuiltSession) {
  const int handle = createSession("unbuilt");
  KeyboardSession& s = *sessionAt(handle);
  setAccepts(s, "[[:print:]]*");
  setMaxLength(s, 10);
  for (float x : {0.0f, 1.0f, 50.0f}) {
    for (int action : {kDown, kUp, kMove}) EXPECT_EQ(touch(s, action, x, x), x == 0.0f && action == kUp ? 0 : -1);
  }
  applySurfaceGeometry(s, 100, 40, 0);  // columnCount still 0: key width infinite
  EXPECT_EQ(touch(s, kUp, 50, 20), -1);
  EXPECT_EQ(contentLength(s), 0);
  destroySession(handle);
}

}  // namespace
}  // namespace tessel
