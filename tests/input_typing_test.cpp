// Whole passwords typed through touch coordinates only, on every page and both number pads,
// checked as text, as length, and as sealed bytes against OpenSSL's RC4 under the seal key.
#include <gtest/gtest.h>

#include <string>

#include "input/touch.h"
#include "session/session.h"
#include "session/settings.h"
#include "support/keyboard_typist.h"
#include "support/openssl_oracle.h"

namespace tessel {
namespace {

using test::KeyGrid;
using test::KeyMap;
using test::ScopedKeyboard;
using test::Typist;

// What must rest in the buffer for `text`: its RC4 encryption (keystream from the start) under
// "QN-Tesselate", then zeros.
std::string expectedResting(const std::string& text) {
  const test::Bytes sealed = test::opensslRc4(test::bytesOf("QN-Tesselate"), test::bytesOf(text));
  std::string buffer(sealed.begin(), sealed.end());
  buffer.resize(kContentBufferSize, '\0');
  return buffer;
}

void expectContent(ScopedKeyboard& kb, const std::string& text) {
  EXPECT_EQ(kb.length(), text.size());
  EXPECT_EQ(contentLength(kb.session()), static_cast<int>(text.size()));
  EXPECT_EQ(kb.restingBuffer(), expectedResting(text));
  EXPECT_EQ(kb.text(), text);
  EXPECT_EQ(kb.restingBuffer(), expectedResting(text)) << "reading the text must reseal it";
}

struct Surface {
  int width, height;
};
const Surface kSurfaces[] = {{1080, 720}, {333, 217}};

struct Password {
  const char* name;
  const char* text;
};
const Password kPasswords[] = {
    {"allLetters", "qwertyuiopasdfghjklzxcvbnm"},
    {"upperViaShift", "PassWORDxYz"},
    {"lowerSymbolPage", "1234567890`~!@#$%^&*()-_=+"},
    {"upperSymbolPage", "{}[]\\|:;'\",.<>/?"},
    {"everyPageAndSpace", "Tessel 2024! {ok} \"q\"<p>"},
};

TEST(Typing, UnshuffledLayoutOnEveryPage) {
  for (const auto& surface : kSurfaces) {
    for (const auto& pw : kPasswords) {
      SCOPED_TRACE(std::string(pw.name) + " on " + std::to_string(surface.width) + "x" + std::to_string(surface.height));
      ScopedKeyboard kb("typing", surface.width, surface.height);
      Typist typist(kb.session(), KeyGrid(surface.width, surface.height), KeyMap::standard());
      ASSERT_TRUE(typist.type(pw.text));
      expectContent(kb, pw.text);
    }
  }
}

TEST(Typing, ShuffledLayoutsTypeThroughTheirOwnTables) {
  for (int round = 0; round < 5; ++round) {
    for (const auto& pw : kPasswords) {
      SCOPED_TRACE(pw.name);
      ScopedKeyboard kb("shuffled", 1080, 720, true);
      ASSERT_NE(test::KeyMap::fromSession(kb.session()).letters, KeyMap::standard().letters);
      Typist typist(kb.session(), KeyGrid(1080, 720), KeyMap::fromSession(kb.session()));
      ASSERT_TRUE(typist.type(pw.text));
      expectContent(kb, pw.text);
    }
  }
}

// Style -1 leaves shiftOn at 0xFFFFFFFF: letters come out upper case until shift is pressed.
TEST(Typing, NegativeStyleStartsShifted) {
  ScopedKeyboard kb("style", 1000, 400);
  setKbdStyle(kb.session(), -1);
  Typist typist(kb.session(), KeyGrid(1000, 400), KeyMap::standard());
  ASSERT_TRUE(typist.type("ABCdef"));
  expectContent(kb, "ABCdef");
}

struct PadCase {
  const char* name;
  std::int16_t type;
  const char* typed;     // keys pressed
  const char* expected;  // what the content holds
};
const PadCase kPadCases[] = {
    {"decimalPad", 1, "3.14159", "3.14159"},
    {"decimalPadAllDigits", 1, "0987654321.", "0987654321."},
    {"digitsOnlyPad", 2, "0987654321", "0987654321"},
};

TEST(Typing, NumberPads) {
  for (bool shuffled : {false, true}) {
    for (const auto& c : kPadCases) {
      SCOPED_TRACE(std::string(c.name) + (shuffled ? " shuffled" : ""));
      ScopedKeyboard kb("pad", 720, 480, shuffled);
      setKbdType(kb.session(), c.type);
      const KeyMap map = shuffled ? KeyMap::fromSession(kb.session()) : KeyMap::standard();
      Typist typist(kb.session(), KeyGrid(720, 480), map);
      ASSERT_TRUE(typist.typeOnPad(c.typed));
      expectContent(kb, c.expected);
      EXPECT_EQ(typist.tap(KeyGrid(720, 480).padCell(2, 3)), 1) << "done";
    }
  }
}

}  // namespace
}  // namespace tessel
