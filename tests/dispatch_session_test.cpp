// The session's output end to end: text typed by touches, contentOutput under the built-in
// default modulus, opened with the private half of that key (crypto_rsa_test checks the pair).
// The content must rest sealed after every call. (The JVM suite covers the other outputs, the
// encrypted PIN code and lastError through the native entry points.)
#include <gtest/gtest.h>

#include <string>
#include <tuple>

#include "server/tessel_opener.h"
#include "session/output.h"
#include "session/session.h"
#include "session/settings.h"
#include "support/dispatch_oracle.h"
#include "support/keyboard_typist.h"

namespace tessel::test {
namespace {

constexpr int kWidth = 1080, kHeight = 720;

class SessionOutput : public ::testing::Test {
 protected:
  SessionOutput() : kb_("dispatch-output", kWidth, kHeight) {}
  // contentOutput, its error code, and the content still sealed afterwards.
  SecureBuffer output(int type, const char* timestamp, int expectedError = 0) {
    const std::string before = kb_.text();
    SecureBuffer out = contentOutput(kb_.session(), type, timestamp);
    EXPECT_EQ(kb_.session().content->lastError, expectedError) << "type " << type;
    EXPECT_EQ(static_cast<bool>(out), expectedError == 0);
    EXPECT_EQ(kb_.length(), before.size());
    EXPECT_TRUE(before.empty() || kb_.restingBuffer().find(before) == std::string::npos) << "content left unsealed";
    EXPECT_EQ(kb_.text(), before);
    return out;
  }
  // Opens a session output with the default key (and the encryption key for type 47).
  server::Opened open(int type, const SecureBuffer& output) {
    server::OpenKeys keys;
    keys.app = &testKey("builtin_default_key.pem");
    keys.enc = &encKey();
    server::Opened opened;
    std::string error;
    EXPECT_TRUE(output && server::openOutput(type, std::string(output.c_str(), output.size()), keys, &opened, &error))
        << error;
    return opened;
  }
  ScopedKeyboard kb_;
};

TEST_F(SessionOutput, TypedTextComesOutInTheEnvelope) {
  const server::Opened empty = open(48, output(48, "1700000003"));
  EXPECT_EQ(empty.strength, 'E');
  EXPECT_EQ(empty.payload, "");
  ASSERT_TRUE(Typist(kb_.session(), KeyGrid(kWidth, kHeight)).type("Kqhzmw7"));
  ASSERT_EQ(kb_.text(), "Kqhzmw7");
  const server::Opened opened = open(48, output(48, "1700000000"));
  EXPECT_EQ(opened.strength, 'M');  // letters and a digit, no repeats: numeric-aware rating
  EXPECT_EQ(opened.timestamp, "1700000000");
  EXPECT_EQ(opened.payload, "Kqhzmw7");
  // The hash random replaces the text by its salted MD5; the rating stays over the password.
  for (const auto& [setting, salt, mode] : {std::tuple{"1:s4lt", "s4lt", 'S'}, {"2:r4nd0m", "r4nd0m", 'F'}}) {
    setHashRandom(kb_.session(), setting);
    const server::Opened hashed = open(48, output(48, "1700000001"));
    EXPECT_EQ(hashed.payload, expectedSaltedHash("Kqhzmw7", salt, mode)) << setting;
    EXPECT_EQ(hashed.strength, 'M') << setting;
  }
  output(48, nullptr, 4);
  output(47, "1700000002", 2);  // type 47 needs the encryption key too
  const std::string enc = encKey().modulusHex();
  setEncryPlat(kb_.session(), enc.c_str(), false);
  EXPECT_EQ(open(47, output(47, "1700000002")).content, expectedSaltedHash("Kqhzmw7", "r4nd0m", 'F'));
}

}  // namespace
}  // namespace tessel::test
