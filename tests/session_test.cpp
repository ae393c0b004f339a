// Session table lifecycle and the content seal, checked against an independent RC4 (OpenSSL).
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "session/session.h"
#include "support/openssl_oracle.h"

using namespace tessel;
using tessel::test::Bytes;

namespace {

class SessionTable : public ::testing::Test {
 protected:
  void SetUp() override {
    for (int h = 0; h < kSessionSlots; ++h) destroySession(h);
  }
  void TearDown() override { SetUp(); }
};

void typeInto(ContentStore& store, const std::string& text) {
  ContentGuard guard(store);
  std::memcpy(guard.text() + guard.length(), text.data(), text.size());
  store.length = static_cast<std::uint16_t>(store.length + text.size());
}

std::string unsealed(ContentStore& store) {
  ContentGuard guard(store);
  return std::string(reinterpret_cast<char*>(guard.text()), guard.length());
}

}  // namespace

TEST_F(SessionTable, CreateReuseByNameAndRefusedHandles) {
  const int h = createSession("pwd");
  ASSERT_EQ(h, 0);
  KeyboardSession* s = sessionAt(h);
  ASSERT_NE(s, nullptr);
  EXPECT_STREQ(s->sessionName, "pwd");
  EXPECT_LE(s->keyMask, 31);
  typeInto(*s->content, "abc");
  EXPECT_EQ(createSession("pwd"), h) << "same name finds the same session";
  EXPECT_EQ(unsealed(*s->content), "abc") << "reuse leaves the entered text intact";
  EXPECT_EQ(createSession("other"), 1);
  EXPECT_EQ(createSession(nullptr), -1);
  for (int bad : {-1, 2, 19, 20, 1000, -1000}) {
    EXPECT_EQ(sessionAt(bad), nullptr) << bad;
    destroySession(bad);  // must be a no-op
  }
  EXPECT_NE(sessionAt(1), nullptr);
}

TEST_F(SessionTable, FirstFreeSlotThenCircularEviction) {
  for (int k = 0; k < kSessionSlots; ++k) ASSERT_EQ(createSession(("s" + std::to_string(k)).c_str()), k);
  destroySession(7);
  EXPECT_EQ(createSession("fills-the-hole"), 7);
  // Table full: the slot after the one created last is evicted, then the one after that.
  EXPECT_EQ(createSession("evicts-8"), 8);
  EXPECT_EQ(createSession("evicts-9"), 9);
  EXPECT_EQ(createSession("s8"), 10) << "s8 was evicted, so its name is new again";
  for (int k = 11; k < kSessionSlots; ++k) createSession(("again" + std::to_string(k)).c_str());
  EXPECT_EQ(createSession("wraps"), 0) << "slot 0 follows slot 19";
  EXPECT_STREQ(sessionAt(0)->sessionName, "wraps");
}

// A pinned session outlives its slot: destroy (or eviction) frees the slot at once, and the
// session goes when the last pin is dropped (ASan reports any use after that).
TEST_F(SessionTable, PinnedSessionOutlivesItsSlot) {
  const int h = createSession("pinned");
  SessionRef pin(h, Access::kExclusive);
  ASSERT_TRUE(pin);
  typeInto(*pin->content, "kept");
  destroySession(h);
  EXPECT_EQ(sessionAt(h), nullptr);
  EXPECT_FALSE(SessionRef(h)) << "a call arriving after destroy finds nothing";
  EXPECT_EQ(createSession("successor"), h) << "the slot is free for the next create";
  EXPECT_EQ(unsealed(*pin->content), "kept");
  EXPECT_STREQ(pin->sessionName, "pinned");
  pin.reset();
  EXPECT_STREQ(SessionRef(h)->sessionName, "successor");
}

TEST_F(SessionTable, SealClearAndLength) {
  KeyboardSession* s = sessionAt(createSession("seal"));
  ASSERT_NE(s, nullptr);
  const std::string text = "Tr0ub4dor&3 correct horse";
  typeInto(*s->content, text.substr(0, 10));
  typeInto(*s->content, text.substr(10));
  ASSERT_EQ(contentLength(*s), static_cast<int>(text.size()));
  // While idle the buffer holds the keystream-from-start encryption, not the text; a guard
  // reseals on the way out.
  const Bytes expected = test::opensslRc4(Bytes(kSealKey, kSealKey + 12), test::bytesOf(text));
  EXPECT_EQ(Bytes(s->content->plaintext, s->content->plaintext + text.size()), expected);
  EXPECT_EQ(unsealed(*s->content), text);
  EXPECT_EQ(Bytes(s->content->plaintext, s->content->plaintext + text.size()), expected);

  clearContent(*s->content);
  EXPECT_EQ(contentLength(*s), 0);
  for (std::size_t k = 0; k < kContentBufferSize; ++k) {
    ASSERT_EQ(s->content->plaintext[k], 0);
    ASSERT_EQ(s->content->scratch[k], 0);
  }
  s->content->length = 0x8001;  // never produced by typing, but the read must not widen it wrongly
  EXPECT_EQ(contentLength(*s), -32767);
  s->content->length = 0;
}
