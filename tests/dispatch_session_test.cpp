// The session's output end to end: text typed by touches (or placed through a ContentGuard),
// contentOutput with types 48 and 47 under the built-in default modulus, opened with the
// private half of that key (tests/data/builtin_default_key.pem); the encrypted PIN code checked
// against OpenSSL's RC4 keyed with OpenSSL's SHA-1 of the challenge.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "crypto/error_table.h"
#include "crypto/moduli.h"
#include "server/envelope.h"
#include "session/output.h"
#include "session/session.h"
#include "session/settings.h"
#include "support/dispatch_oracle.h"
#include "support/keyboard_typist.h"

namespace tessel::test {
namespace {

const server::PrivateKey& defaultKey() { return testKey("builtin_default_key.pem"); }

constexpr int kWidth = 1080, kHeight = 720;

// Opens a session output with the default key (and the encryption key for type 47).
server::Opened openOutput(int type, const SecureBuffer& output) {
  server::OpenKeys keys;
  keys.app = &defaultKey();
  keys.enc = &encKey();
  server::Opened opened;
  std::string error;
  EXPECT_TRUE(output) << "no output";
  if (output) {
    EXPECT_TRUE(server::openOutput(type, std::string(output.c_str(), output.size()), keys, &opened, &error))
        << error;
  }
  return opened;
}

void placeText(KeyboardSession& s, const std::string& text) {
  ContentGuard guard(*s.content);
  std::memset(guard.text(), 0, kContentBufferSize);
  std::memcpy(guard.text(), text.data(), text.size());
  s.content->length = static_cast<std::uint16_t>(text.size());
}

class SessionOutput : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_EQ(std::string(builtinDefaultModulus()), defaultKey().modulusHex())
        << "tests/data/builtin_default_key.pem is not the built-in default key";
  }
  // Types `text` on a fresh keyboard and checks it landed (sealed) in the store.
  void type(ScopedKeyboard& kb, const std::string& text) {
    Typist typist(kb.session(), KeyGrid(kWidth, kHeight), KeyMap::standard());
    ASSERT_TRUE(typist.type(text));
    ASSERT_EQ(kb.text(), text);
  }
  void expectStillSealed(ScopedKeyboard& kb, const std::string& text) {
    EXPECT_EQ(kb.length(), text.size());
    EXPECT_EQ(kb.restingBuffer().find(text), std::string::npos) << "content left unsealed";
    EXPECT_EQ(kb.text(), text);
  }
};

TEST_F(SessionOutput, TypedTextComesOutInTheEnvelope) {
  ScopedKeyboard kb("dispatch-typed", kWidth, kHeight);
  type(kb, "Kqhzmw7");
  const SecureBuffer out = contentOutput(kb.session(), 48, "1700000000");
  EXPECT_EQ(kb.session().content->lastError, 0);
  const server::Opened opened = openOutput(48, out);
  EXPECT_EQ(opened.strength, 'M');  // letters and a digit, no repeats: numeric-aware rating
  EXPECT_EQ(opened.timestamp, "1700000000");
  EXPECT_EQ(opened.payload, "Kqhzmw7");
  expectStillSealed(kb, "Kqhzmw7");
}

TEST_F(SessionOutput, HashRandomReplacesTheTextBySaltedMd5) {
  ScopedKeyboard kb("dispatch-hashed", kWidth, kHeight);
  type(kb, "Kqhzmw7");
  struct Case {
    const char* setting;
    const char* salt;
    char mode;
  };
  for (const Case& c : {Case{"1:s4lt", "s4lt", 'S'}, Case{"2:r4nd0m", "r4nd0m", 'F'}}) {
    setHashRandom(kb.session(), c.setting);
    const SecureBuffer out = contentOutput(kb.session(), 48, "1700000001");
    ASSERT_EQ(kb.session().content->lastError, 0) << c.setting;
    const server::Opened opened = openOutput(48, out);
    EXPECT_EQ(opened.payload, expectedSaltedHash("Kqhzmw7", c.salt, c.mode)) << c.setting;
    EXPECT_EQ(opened.strength, 'M') << "rated over the password, not the suffix";
    expectStillSealed(kb, "Kqhzmw7");
  }
}

TEST_F(SessionOutput, PinContentNeedsTheEncryptionKey) {
  ScopedKeyboard kb("dispatch-pin", kWidth, kHeight);
  placeText(kb.session(), "739182");
  setHashRandom(kb.session(), "1:salt");
  SecureBuffer out = contentOutput(kb.session(), 47, "1700000002");
  EXPECT_FALSE(out);
  EXPECT_EQ(kb.session().content->lastError, 2);
  expectStillSealed(kb, "739182");

  out = contentOutput(kb.session(), 48, "1700000002");
  EXPECT_EQ(kb.session().content->lastError, 0) << "type 48 needs only the application key";

  const std::string enc = encKey().modulusHex();
  setEncryPlat(kb.session(), enc.c_str(), false);
  out = contentOutput(kb.session(), 47, "1700000002");
  ASSERT_EQ(kb.session().content->lastError, 0);
  const server::Opened opened = openOutput(47, out);
  EXPECT_EQ(opened.content, expectedSaltedHash("739182", "salt", 'S'));
  EXPECT_EQ(opened.strength, 'W');  // all digits: numeric-aware rating
  expectStillSealed(kb, "739182");
}

TEST_F(SessionOutput, ErrorsLandInLastError) {
  ScopedKeyboard kb("dispatch-errors", kWidth, kHeight);
  placeText(kb.session(), "pw");
  EXPECT_FALSE(contentOutput(kb.session(), 48, nullptr));
  EXPECT_EQ(kb.session().content->lastError, 4);
  EXPECT_STREQ(lastErrorText(kb.session().content->lastError), "The timestamp is missing!");
  expectStillSealed(kb, "pw");
  setHashRandom(kb.session(), "1:");  // too short: ignored, no suffix
  EXPECT_TRUE(contentOutput(kb.session(), 48, "1"));
  EXPECT_EQ(kb.session().content->lastError, 0);
}

TEST_F(SessionOutput, EmptyContentIsRatedE) {
  ScopedKeyboard kb("dispatch-empty", kWidth, kHeight);
  const server::Opened opened = openOutput(48, contentOutput(kb.session(), 48, "1700000003"));
  EXPECT_EQ(opened.strength, 'E');
  EXPECT_EQ(opened.payload, "");
  EXPECT_EQ(kb.length(), 0u);
}

TEST_F(SessionOutput, EncryptedPinCodeIsRc4UnderSha1OfTheChallenge) {
  ScopedKeyboard kb("dispatch-pincode", kWidth, kHeight);
  ContentStore& store = *kb.session().content;
  EXPECT_FALSE(encryptedPinCode(kb.session()));
  EXPECT_EQ(store.lastError, 100);

  setChallengeCode(kb.session(), "ch4llenge-0042");
  EXPECT_FALSE(encryptedPinCode(kb.session())) << "empty content";
  EXPECT_EQ(store.lastError, 101);

  for (const std::string& text : {std::string("739182"), std::string("Kqhzmw7 with space"), std::string(300, 'a')}) {
    placeText(kb.session(), text);
    const SecureBuffer code = encryptedPinCode(kb.session());
    ASSERT_TRUE(code);
    EXPECT_EQ(store.lastError, 0);
    const Bytes expected = opensslRc4(opensslSha1("ch4llenge-0042"), bytesOf(text));
    EXPECT_EQ(std::string(code.c_str(), code.size()), opensslBase64(expected));
    expectStillSealed(kb, text);
  }
}

}  // namespace
}  // namespace tessel::test
