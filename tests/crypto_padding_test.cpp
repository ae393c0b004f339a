// Paddings and PIN blocks, byte for byte.
//
// PKCS#1 v1.5 type 2 is a deterministic known-answer test: the RSA Laboratories vectors give
// the random seed of each example, fed through setRandomSourceForTesting, so padding plus our
// RSA must reproduce each published ciphertext exactly (300 examples, 1024 to 2048 bits).
// The other layouts are checked field by field, and through OpenSSL's private key where a
// receiver would open them.
#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cstring>
#include <string>

#include "crypto/codec.h"
#include "crypto/padding.h"
#include "crypto/random.h"
#include "crypto/rsa.h"
#include "support/rsa_oracle.h"
#include "support/vector_file.h"

namespace tessel {
namespace {

using test::Bytes;
using test::toHex;

// The scripted random source: replays `g_script` (cycled), counts calls, can fail.
Bytes g_script;
int g_calls = 0;
bool g_fail = false;

bool scriptedSource(std::uint8_t* buffer, std::size_t n) {
  ++g_calls;
  if (g_fail) return false;
  for (std::size_t i = 0; i < n; ++i) buffer[i] = g_script.empty() ? 0 : g_script[i % g_script.size()];
  return true;
}

class Padding : public ::testing::Test {
 protected:
  void SetUp() override {
    g_script = {0x5A};
    g_calls = 0;
    g_fail = false;
    setRandomSourceForTesting(scriptedSource);
  }
  void TearDown() override { setRandomSourceForTesting(nullptr); }
};

Bytes bytes(const SecureBuffer& b) { return b ? Bytes(b.data(), b.data() + b.size()) : Bytes{}; }

std::string toHexUpper(const Bytes& b) {
  std::string s = toHex(b);
  for (auto& c : s) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return s;
}

TEST_F(Padding, Pkcs1KnownAnswersFromPublishedSeeds) {
  const auto examples = test::readPkcs1Examples(test::dataPath("pkcs1v15crypt-vectors.txt"));
  ASSERT_EQ(examples.size(), 300u);
  for (const auto& e : examples) {
    const std::size_t k = rsaModulusBytes(e.modulusHex.c_str());
    ASSERT_EQ(e.seed.size(), k - e.message.size() - 3) << e.name;
    g_script = e.seed;
    const SecureBuffer block = pkcs1Type2Block(e.message.data(), e.message.size(), k);
    ASSERT_TRUE(block) << e.name;
    const SecureBuffer blockHex = hexEncode(block.data(), block.size());
    const SecureBuffer c = rsaPublicHex(e.modulusHex.c_str(), blockHex.c_str());
    ASSERT_TRUE(c) << e.name;
    EXPECT_EQ(std::string(c.c_str()), toHexUpper(e.ciphertext)) << "example " << e.name;
  }
}

TEST_F(Padding, Pkcs1Layout) {
  const Bytes m = test::bytesOf("hello");
  g_script = {0x00, 0x07, 0x00};  // zero filler bytes become 0x01, not a second draw
  const Bytes b = bytes(pkcs1Type2Block(m.data(), m.size(), 20));
  ASSERT_EQ(b.size(), 20u);
  EXPECT_EQ(toHex(b), "0002" "010701010701010701010701" "00" "68656c6c6f");
  EXPECT_EQ(g_calls, 1);
}

TEST_F(Padding, Pkcs1Bounds) {
  const Bytes m(118, 0x33);
  EXPECT_EQ(bytes(pkcs1Type2Block(m.data(), 117, 128)).size(), 128u);
  EXPECT_FALSE(pkcs1Type2Block(m.data(), 118, 128));
  EXPECT_FALSE(pkcs1Type2Block(m.data(), 0, 128));
  EXPECT_FALSE(pkcs1Type2Block(nullptr, 5, 128));
  EXPECT_FALSE(pkcs1Type2Block(m.data(), 1, 11));
  EXPECT_TRUE(pkcs1Type2Block(m.data(), 1, 12));
  EXPECT_FALSE(pkcs1Type2Block(m.data(), 1, 0));
  g_fail = true;
  EXPECT_FALSE(pkcs1Type2Block(m.data(), 5, 128)) << "random source failure";
}

TEST_F(Padding, Pkcs1OpensWithOpenSsl) {
  setRandomSourceForTesting(nullptr);  // real randomness, real receiver
  const auto key = test::RsaTestKey::generate(1024);
  const Bytes m = test::bytesOf("0123456789abcdef");
  for (int i = 0; i < 10; ++i) {
    const SecureBuffer block = pkcs1Type2Block(m.data(), m.size(), key.bytes());
    const Bytes b = bytes(block);
    EXPECT_EQ(std::count(b.begin() + 2, b.end() - static_cast<long>(m.size()) - 1, 0), 0);
    const SecureBuffer hex = hexEncode(block.data(), block.size());
    const SecureBuffer c = rsaPublicHex(key.modulusHex().c_str(), hex.c_str());
    EXPECT_EQ(key.pkcs1Decrypt(test::fromHex(c.c_str())), m);
  }
}

TEST_F(Padding, KeyouLayout) {
  const Bytes m(40, 'x');
  g_script = {0x00, 0x9C};
  const Bytes b = bytes(keyouBlock(m.data(), m.size(), 128));
  ASSERT_EQ(b.size(), 128u);
  EXPECT_EQ(b[0], '4');
  EXPECT_EQ(b[1], '0');
  EXPECT_EQ(Bytes(b.begin() + 2, b.begin() + 42), m);
  for (std::size_t i = 42; i < 128; ++i) EXPECT_EQ(b[i], (i - 42) % 2 ? 0x9C : 0x01) << i;

  const Bytes one = {0xAB};
  EXPECT_EQ(toHex(bytes(keyouBlock(one.data(), 1, 4))), "3031ab01");
}

TEST_F(Padding, KeyouLengthCharactersPast99) {
  const Bytes m(117, 'y');
  const Bytes b = bytes(keyouBlock(m.data(), m.size(), 128));
  EXPECT_EQ(b[0], '0' + 11);  // ';' : kept as it stands
  EXPECT_EQ(b[1], '7');
}

TEST_F(Padding, KeyouBounds) {
  const Bytes m(130, 'z');
  g_calls = 0;
  const Bytes full = bytes(keyouBlock(m.data(), 126, 128));
  ASSERT_EQ(full.size(), 128u) << "m = k - 2 fills the block exactly";
  EXPECT_EQ(g_calls, 0) << "no filler, no random request";
  EXPECT_FALSE(keyouBlock(m.data(), 127, 128)) << "m + 2 > k";
  EXPECT_FALSE(keyouBlock(m.data(), 0, 128));
  EXPECT_FALSE(keyouBlock(nullptr, 3, 128));
  g_fail = true;
  EXPECT_FALSE(keyouBlock(m.data(), 10, 128));
}

TEST_F(Padding, KeyouRoundTripThroughOpenSslKey) {
  const auto key = test::RsaTestKey::generate(1024);
  const Bytes m = test::bytesOf("password1");
  const SecureBuffer block = keyouBlock(m.data(), m.size(), key.bytes());
  const SecureBuffer hex = hexEncode(block.data(), block.size());
  const SecureBuffer c = rsaPublicHex(key.modulusHex().c_str(), hex.c_str());
  ASSERT_TRUE(c) << "the block starts with an ASCII digit, so it is below any full-width modulus";
  const Bytes opened = key.rawDecrypt(test::fromHex(c.c_str()));
  EXPECT_EQ(opened, bytes(block));
  EXPECT_EQ(std::string(opened.begin() + 2, opened.begin() + 2 + (opened[0] - '0') * 10 + (opened[1] - '0')),
            "password1");
}

TEST_F(Padding, KeyouBinaryAndFfFill) {
  const Bytes m = {0xDE, 0xAD};
  g_script = {0x00};
  EXPECT_EQ(toHex(bytes(keyouBinaryBlock(m.data(), 2, 6))), "0002dead0101");
  EXPECT_FALSE(keyouBinaryBlock(m.data(), 2, 3));
  const Bytes big(300, 1);
  EXPECT_FALSE(keyouBinaryBlock(big.data(), 256, 280)) << "the length must fit its byte";

  EXPECT_EQ(toHex(bytes(lengthByteFfBlock(m.data(), 2, 6))), "02deadffffff");
  EXPECT_EQ(toHex(bytes(lengthByteFfBlock(m.data(), 2, 3))), "02dead");
  EXPECT_FALSE(lengthByteFfBlock(m.data(), 2, 2));
  EXPECT_EQ(toHex(bytes(lengthByteFfBlock(m.data(), 0, 3))), "00ffff");
  EXPECT_FALSE(lengthByteFfBlock(nullptr, 2, 6));
}

TEST(PinBlock, Iso9564Format0) {
  struct Case {
    const char* pin;
    const char* pan;
    const char* block;  // lower-case hex, "" = refused
  } cases[] = {
      {"1234", nullptr, "041234ffffffffff"},
      {"12345", nullptr, "0512345fffffffff"},
      {"123456789012", nullptr, "0c123456789012ff"},
      {"1234", "4000001234567899", "041234fedcba9876"},   // account digits 000123456789
      {"1234", "12", "041234fffffffffe"},                 // one digit left of the check digit
      {"1234", "5", "041234ffffffffff"},                  // only a check digit: no account field
      {"1234", "1234567890123456789", "04124c6fedcba987"},  // account digits 789012345678
      {"123", nullptr, ""},
      {"1234567890123", nullptr, ""},
      {"12a4", nullptr, ""},
      {"", nullptr, ""},
      {"1234", "", ""},
      {"1234", "40000012345678X9", ""},
      {"1234 ", nullptr, ""},
  };
  for (const auto& c : cases) {
    const SecureBuffer b = pinBlockX98(c.pin, c.pan);
    EXPECT_EQ(b ? toHex(Bytes(b.data(), b.data() + b.size())) : std::string(), c.block)
        << c.pin << " / " << (c.pan ? c.pan : "(no PAN)");
  }
  EXPECT_FALSE(pinBlockX98(nullptr, nullptr));
}

TEST(PinBlock, FPaddedDigits) {
  struct Case {
    const char* digits;
    const char* block;
  } cases[] = {{"", "ffffffffffffffff"},
               {"1234", "1234ffffffffffff"},
               {"123", "123fffffffffffff"},
               {"123456789012", "123456789012ffff"},
               {"1234567890123", ""},
               {"12F4", ""},
               {"-1", ""}};
  for (const auto& c : cases) {
    const SecureBuffer b = fPaddedDigitBlock(c.digits);
    EXPECT_EQ(b ? toHex(Bytes(b.data(), b.data() + b.size())) : std::string(), c.block) << c.digits;
  }
  EXPECT_FALSE(fPaddedDigitBlock(nullptr));
}

}  // namespace
}  // namespace tessel
