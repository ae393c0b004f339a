// The measure value of a session's text: lower-case hex MD5 (checked against OpenSSL), none
// for an empty text, and the text left sealed afterwards.
#include <gtest/gtest.h>

#include <openssl/evp.h>

#include <cstring>
#include <string>

#include "crypto/measure.h"
#include "session/session.h"
#include "support/openssl_oracle.h"

namespace tessel {
namespace {

class MeasureValue : public ::testing::Test {
 protected:
  void SetUp() override {
    handle_ = createSession("measure-value-test");
    ASSERT_GE(handle_, 0);
    session_ = sessionAt(handle_);
    ASSERT_NE(session_, nullptr);
  }
  void TearDown() override { destroySession(handle_); }

  void type(const std::string& text) {
    if (text.empty()) return clearContent(*session_->content);
    ContentGuard guard(*session_->content);
    std::memcpy(guard.text(), text.data(), text.size());
    session_->content->length = static_cast<std::uint16_t>(text.size());
  }
  std::string measure() {
    const SecureBuffer v = computeMeasureValue(*session_);
    return v ? std::string(v.c_str()) : std::string("<none>");
  }

  int handle_ = -1;
  KeyboardSession* session_ = nullptr;
};

std::string opensslMd5Hex(const std::string& s) {
  unsigned char d[EVP_MAX_MD_SIZE];
  unsigned n = 0;
  EVP_Digest(s.data(), s.size(), d, &n, EVP_md5(), nullptr);
  return test::toHex(test::Bytes(d, d + n));
}

TEST_F(MeasureValue, Abc) {
  type("abc");
  EXPECT_EQ(measure(), "900150983cd24fb0d6963f7d28e17f72");
}

TEST_F(MeasureValue, EmptyContentGivesNone) {
  EXPECT_EQ(measure(), "<none>");
  type("x");
  type("");
  EXPECT_EQ(measure(), "<none>");
}

TEST_F(MeasureValue, FullBufferMatchesOpenSslAndStaysSealed) {
  std::string text;
  for (std::size_t i = 0; i < kContentCapacity; ++i) text += static_cast<char>(0x21 + i % 94);
  type(text);
  EXPECT_EQ(measure(), opensslMd5Hex(text));
  EXPECT_EQ(measure(), opensslMd5Hex(text)) << "a second call sees the same text";
  // At rest the buffer holds the sealed form, not the text.
  EXPECT_NE(std::memcmp(session_->content->plaintext, text.data(), 16), 0);
  ContentGuard guard(*session_->content);
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(guard.text()), guard.length()), text);
}

TEST_F(MeasureValue, MissingContentStoreGivesNone) {
  KeyboardSession bare;
  EXPECT_FALSE(computeMeasureValue(bare));
}

}  // namespace
}  // namespace tessel
