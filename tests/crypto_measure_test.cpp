// The measure value of a session's text: lower-case hex MD5 (RFC 1321's "abc", OpenSSL for a
// full buffer), none for an empty text or a session without a store; the text stays sealed.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "crypto/measure.h"
#include "session/session.h"
#include "support/openssl_oracle.h"

namespace tessel {
namespace {

std::string text(const SecureBuffer& v) { return v ? std::string(v.c_str()) : std::string("<none>"); }

TEST(MeasureValue, Md5HexOfTheTextOrNone) {
  const int handle = createSession("measure-value-test");
  KeyboardSession* session = sessionAt(handle);
  ASSERT_NE(session, nullptr);
  auto value = [&] { return text(computeMeasureValue(*session)); };
  auto measure = [&](const std::string& text) {
    clearContent(*session->content);
    if (!text.empty()) {
      ContentGuard guard(*session->content);
      std::memcpy(guard.text(), text.data(), text.size());
      session->content->length = static_cast<std::uint16_t>(text.size());
    }
    return value();
  };
  std::string full;
  for (std::size_t i = 0; i < kContentCapacity; ++i) full += static_cast<char>(0x21 + i % 94);
  EXPECT_EQ(measure("abc"), "900150983cd24fb0d6963f7d28e17f72");
  EXPECT_EQ(measure(""), "<none>");
  EXPECT_EQ(measure(full), test::opensslMd5Hex(full));
  EXPECT_EQ(value(), measure(full)) << "a second call sees the same text";
  // At rest the buffer holds the sealed form, not the text.
  EXPECT_NE(std::memcmp(session->content->plaintext, full.data(), 16), 0);
  {
    ContentGuard guard(*session->content);
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(guard.text()), guard.length()), full);
  }
  destroySession(handle);
}

}  // namespace
}  // namespace tessel
