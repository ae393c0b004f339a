// Whole passwords typed through touch coordinates only, on every page and both number pads,
// standard and shuffled layouts, checked as text, as length, and as sealed bytes against
// OpenSSL's RC4 under the seal key.
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

// The buffer must hold the RC4 encryption (keystream from the start) under "QN-Tesselate", then
// zeros, before and after the text is read.
void expectContent(ScopedKeyboard& kb, const std::string& text) {
  const test::Bytes sealed = test::opensslRc4(test::bytesOf("QN-Tesselate"), test::bytesOf(text));
  std::string resting(sealed.begin(), sealed.end());
  resting.resize(kContentBufferSize, '\0');
  EXPECT_EQ(contentLength(kb.session()), static_cast<int>(text.size()));
  EXPECT_EQ(kb.restingBuffer(), resting);
  EXPECT_EQ(kb.text(), text);
  EXPECT_EQ(kb.restingBuffer(), resting) << "reading the text must reseal it";
}

TEST(Typing, EveryPageAndBothPads) {
  const struct {
    int width, height;
    std::int16_t kbdType;  // 0 full keyboard, 1 decimal pad, 2 digits-only pad
    const char* text;
  } cases[] = {
      {1080, 720, 0, "qwertyuiopasdfghjklzxcvbnm PassWORDxYz"},
      {1080, 720, 0, "1234567890`~!@#$%^&*()-_=+{}[]\\|:;'\",.<>/?"},
      {333, 217, 0, "Tessel 2024! {ok} \"q\"<p>"},
      {720, 480, 1, "3.14159"},
      {720, 480, 1, "0987654321."},
      {720, 480, 2, "0987654321"},
  };
  for (bool shuffled : {false, true}) {
    for (const auto& c : cases) {
      SCOPED_TRACE(std::string(c.text) + (shuffled ? " shuffled" : ""));
      ScopedKeyboard kb("typing", c.width, c.height, shuffled);
      setKbdType(kb.session(), c.kbdType);
      const KeyMap map = KeyMap::fromSession(kb.session());
      ASSERT_EQ(map.letters != KeyMap::standard().letters, shuffled);
      Typist typist(kb.session(), KeyGrid(c.width, c.height), map);
      ASSERT_TRUE(c.kbdType == 0 ? typist.type(c.text) : typist.typeOnPad(c.text));
      expectContent(kb, c.text);
      if (c.kbdType != 0) {
        EXPECT_EQ(typist.tap(KeyGrid(c.width, c.height).padCell(2, 3)), 1) << "done";
      }
    }
  }
}

}  // namespace
}  // namespace tessel
