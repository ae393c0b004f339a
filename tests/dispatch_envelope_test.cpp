// The digital envelope and the RSA helpers byte for byte: with the random source replaced by a
// known sequence, the device's output must equal the one assembled with OpenSSL alone (raw RSA
// of the expected padded block, RC4 after the type's drop, the SIMPLEBLOB layout, base64).
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "crypto/dispatcher.h"
#include "crypto/envelope.h"
#include "crypto/random.h"
#include "support/dispatch_oracle.h"

namespace tessel::test {
namespace {

// A full-period byte sequence (x -> 5x + 1 mod 256), so zero bytes do occur in the filler.
std::vector<Bytes> gRequests;
std::uint8_t gNext = 0;
bool sequenceSource(std::uint8_t* buffer, std::size_t n) {
  for (std::size_t k = 0; k < n; ++k, gNext = static_cast<std::uint8_t>(gNext * 5 + 1)) buffer[k] = gNext;
  gRequests.emplace_back(buffer, buffer + n);
  return true;
}

class KnownRandom : public ::testing::Test {
 protected:
  void SetUp() override {
    gNext = 0x2b;
    setRandomSourceForTesting(sequenceSource);
  }
  void TearDown() override { setRandomSourceForTesting(nullptr); }
};

// Filler as the padding routines use it: zero bytes become 0x01. `head` and `tail` go around it.
Bytes withFiller(Bytes head, const Bytes& filler, const Bytes& tail) {
  for (std::uint8_t b : filler) head.push_back(b ? b : 1);
  head.insert(head.end(), tail.begin(), tail.end());
  return head;
}
Bytes pkcs1Block(const Bytes& filler, const Bytes& message) {
  Bytes tail = {0x00};
  tail.insert(tail.end(), message.begin(), message.end());
  return withFiller({0x00, 0x02}, filler, tail);
}
std::string upperHex(const Bytes& b) {
  std::string s = toHex(b);
  for (char& c : s) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return s;
}
std::string text(const SecureBuffer& b) { return b ? std::string(b.c_str(), b.size()) : std::string("<absent>"); }

TEST_F(KnownRandom, EnvelopeMatchesOpenSslAssemblyForEachDrop) {
  const std::string modulus = appKey().modulusHex();
  const char* const keys[2] = {modulus.c_str(), nullptr};
  // "0123456789" rates 'W' under both the default (type 0) and the general (type 1) rating.
  const struct {
    int type;
    std::size_t drop;
    std::string content;  // what the envelope must hold
  } cases[] = {{0, 512, "W1700000000:0123456789"}, {1, 625, "W1700000000:0123456789"}, {88, 768, "0123456789"}};
  for (const auto& c : cases) {
    gRequests.clear();
    SecureBuffer out;
    ASSERT_EQ(encryptionDispatch(c.type, keys, &out, "0123456789", "1700000000"), 0) << c.type;
    ASSERT_EQ(gRequests.size(), 2u) << "one request for the RC4 key, one for the PKCS#1 filler";
    ASSERT_EQ(gRequests[0].size(), 16u);
    ASSERT_EQ(gRequests[1].size(), 128u - 16 - 3);
    const Bytes wrapped = opensslRawEncrypt(appKey(), pkcs1Block(gRequests[1], gRequests[0]));
    EXPECT_EQ(text(out), opensslEnvelope(appKey(), gRequests[0], c.drop, c.content, wrapped)) << "type " << c.type;
  }
  // A long content under the 2048-bit key: base64 without line breaks, and the server opens it.
  const std::string content(3000, 'z'), encModulus = encKey().modulusHex();
  SecureBuffer out;
  ASSERT_EQ(digitalEnvelope(512, encModulus.c_str(), bytesOf(content).data(), content.size(), &out), 0);
  EXPECT_EQ(text(out).find_first_of("\r\n"), std::string::npos);
  std::string opened, error;
  ASSERT_TRUE(server::openEnvelope(text(out), encKey(), 512, &opened, &error)) << error;
  EXPECT_EQ(opened, content);
}

TEST_F(KnownRandom, RsaHelpersMatchOpenSslRawRsa) {
  const std::string modulus = appKey().modulusHex();
  const std::string message = "hello, world";
  const Bytes m = bytesOf(message);
  SecureBuffer out;
  // PKCS#1 type 2, and "Keyou": two ASCII digits of the length, the message, filler to k bytes.
  auto pkcs1 = [&] { return opensslRawEncrypt(appKey(), pkcs1Block(gRequests.back(), m)); };
  auto keyou = [&] { return opensslRawEncrypt(appKey(), withFiller(bytesOf("12" + message), gRequests.back(), {})); };
  ASSERT_EQ(pkcs1RsaHex(modulus.c_str(), m.data(), m.size(), &out), 0);
  EXPECT_EQ(text(out), upperHex(pkcs1()));
  ASSERT_EQ(pkcs1RsaBinary(modulus.c_str(), m.data(), m.size(), &out), 0);
  EXPECT_EQ(Bytes(out.data(), out.data() + out.size()), pkcs1());
  ASSERT_EQ(pkcs1RsaBase64(modulus.c_str(), m.data(), m.size(), &out), 0);
  EXPECT_EQ(text(out), opensslBase64(pkcs1()));
  ASSERT_EQ(keyouRsaHex(modulus.c_str(), m.data(), m.size(), &out), 0);
  ASSERT_EQ(gRequests.back().size(), 128u - 2 - m.size());
  EXPECT_EQ(text(out), upperHex(keyou()));
  ASSERT_EQ(keyouRsaBase64(modulus.c_str(), m.data(), m.size(), &out), 0);
  EXPECT_EQ(text(out), opensslBase64(keyou()));
}

TEST(DispatchHelpers, LengthPrefixedPairAndWrapper) {
  // The fixed buffer's bound (127 characters) is checked through the types that use it, in
  // dispatch_types_test; here the layout, with "%02d" widening to three digits from 100 on.
  const std::string text100(100, 'x');
  SecureBuffer out;
  EXPECT_EQ(lengthPrefixedPair("1700", "pw", true, &out), 0);
  EXPECT_EQ(text(out), "04170002pw");
  EXPECT_EQ(lengthPrefixedPair("", "", true, &out), 0);
  EXPECT_EQ(text(out), "0000");
  EXPECT_EQ(lengthPrefixedPair("1", text100.c_str(), false, &out), 0);
  EXPECT_EQ(text(out), "011100" + text100);
  EXPECT_EQ(payloadWrapper('M', "1700", "a:b", &out), 0);
  EXPECT_EQ(text(out), "M1700:a:b");
  EXPECT_EQ(payloadWrapper('E', "", "", &out), 0);
  EXPECT_EQ(text(out), "E:");
}

}  // namespace
}  // namespace tessel::test
