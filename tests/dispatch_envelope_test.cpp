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
  Bytes request(n);
  for (std::size_t k = 0; k < n; ++k) {
    request[k] = gNext;
    gNext = static_cast<std::uint8_t>(gNext * 5 + 1);
  }
  std::copy(request.begin(), request.end(), buffer);
  gRequests.push_back(request);
  return true;
}

class KnownRandom : public ::testing::Test {
 protected:
  void SetUp() override {
    gRequests.clear();
    gNext = 0x2b;
    setRandomSourceForTesting(sequenceSource);
  }
  void TearDown() override { setRandomSourceForTesting(nullptr); }
};

// Filler as the padding routines use it: zero bytes become 0x01.
Bytes nonZero(Bytes filler) {
  for (auto& b : filler)
    if (b == 0) b = 1;
  return filler;
}

Bytes pkcs1Block(const Bytes& filler, const Bytes& message) {
  Bytes block = {0x00, 0x02};
  const Bytes f = nonZero(filler);
  block.insert(block.end(), f.begin(), f.end());
  block.push_back(0x00);
  block.insert(block.end(), message.begin(), message.end());
  return block;
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
  struct Case {
    int type;
    std::size_t drop;
    std::string content;  // what the envelope must hold
  };
  // "0123456789" rates 'W' under both the default (type 0) and the general (type 1) rating.
  const Case cases[] = {
      {0, 512, "W1700000000:0123456789"},
      {1, 625, "W1700000000:0123456789"},
      {88, 768, "0123456789"},
  };
  for (const Case& c : cases) {
    gRequests.clear();
    SecureBuffer out;
    ASSERT_EQ(encryptionDispatch(c.type, keys, &out, "0123456789", "1700000000"), 0) << c.type;
    ASSERT_EQ(gRequests.size(), 2u) << "one request for the RC4 key, one for the PKCS#1 filler";
    const Bytes& rc4Key = gRequests[0];
    ASSERT_EQ(rc4Key.size(), 16u);
    ASSERT_EQ(gRequests[1].size(), 128u - 16 - 3);
    const Bytes wrapped = opensslRawEncrypt(appKey(), pkcs1Block(gRequests[1], rc4Key));
    EXPECT_EQ(text(out), opensslEnvelope(appKey(), rc4Key, c.drop, c.content, wrapped)) << "type " << c.type;
  }
}

TEST_F(KnownRandom, TenByteEnvelopeUnderA1024BitKeyIs166Bytes) {
  const std::string modulus = appKey().modulusHex();
  SecureBuffer out;
  ASSERT_EQ(digitalEnvelope(512, modulus.c_str(), reinterpret_cast<const std::uint8_t*>("0123456789"), 10, &out), 0);
  const Bytes raw = opensslBase64Decode(text(out));
  ASSERT_EQ(raw.size(), 166u);
  EXPECT_EQ(std::string(raw.begin(), raw.begin() + 8), "00000140");
  EXPECT_EQ(toHex(Bytes(raw.begin() + 8, raw.begin() + 20)), "010200000168000000a40000");
  EXPECT_EQ(std::string(raw.begin() + 148, raw.begin() + 156), "00000010");
  const Bytes wrapped = opensslRawEncrypt(appKey(), pkcs1Block(gRequests[1], gRequests[0]));
  EXPECT_EQ(Bytes(raw.rbegin() + 18, raw.rbegin() + 146), wrapped) << "RSA value stored least significant first";
}

TEST_F(KnownRandom, LongEnvelopeHasNoLineBreaks) {
  const std::string modulus = encKey().modulusHex();
  const std::string content(3000, 'z');
  SecureBuffer out;
  ASSERT_EQ(digitalEnvelope(512, modulus.c_str(), reinterpret_cast<const std::uint8_t*>(content.data()),
                            content.size(), &out),
            0);
  EXPECT_EQ(text(out).find_first_of("\r\n"), std::string::npos);
  std::string opened, error;
  ASSERT_TRUE(server::openEnvelope(text(out), encKey(), 512, &opened, &error)) << error;
  EXPECT_EQ(opened, content);
}

TEST_F(KnownRandom, RsaHelpersMatchOpenSslRawRsa) {
  const std::string modulus = appKey().modulusHex();
  const Bytes message = bytesOf("hello, world");
  const auto* m = message.data();
  const std::size_t n = message.size();
  SecureBuffer hex, binary, b64, keyouHex, keyouB64;

  ASSERT_EQ(pkcs1RsaHex(modulus.c_str(), m, n, &hex), 0);
  const Bytes expected = opensslRawEncrypt(appKey(), pkcs1Block(gRequests.back(), message));
  EXPECT_EQ(text(hex), upperHex(expected));
  ASSERT_EQ(pkcs1RsaBinary(modulus.c_str(), m, n, &binary), 0);
  EXPECT_EQ(Bytes(binary.data(), binary.data() + binary.size()),
            opensslRawEncrypt(appKey(), pkcs1Block(gRequests.back(), message)));
  ASSERT_EQ(pkcs1RsaBase64(modulus.c_str(), m, n, &b64), 0);
  EXPECT_EQ(text(b64), opensslBase64(opensslRawEncrypt(appKey(), pkcs1Block(gRequests.back(), message))));

  // "Keyou": two ASCII digits of the length, the message, filler to k bytes; no leading zero.
  auto keyouBlock = [&](const Bytes& filler) {
    Bytes block = bytesOf("12");
    block.insert(block.end(), message.begin(), message.end());
    const Bytes f = nonZero(filler);
    block.insert(block.end(), f.begin(), f.end());
    return block;
  };
  ASSERT_EQ(keyouRsaHex(modulus.c_str(), m, n, &keyouHex), 0);
  ASSERT_EQ(gRequests.back().size(), 128u - 2 - n);
  EXPECT_EQ(text(keyouHex), upperHex(opensslRawEncrypt(appKey(), keyouBlock(gRequests.back()))));
  ASSERT_EQ(keyouRsaBase64(modulus.c_str(), m, n, &keyouB64), 0);
  EXPECT_EQ(text(keyouB64), opensslBase64(opensslRawEncrypt(appKey(), keyouBlock(gRequests.back()))));
}

TEST(DispatchHelpers, LengthPrefixedPairAndWrapper) {
  struct Case {
    const char *timestamp, *text;
    bool fixed;
    int code;
    const char* pair;
  };
  // 2 + 99 + 2 + 24 = 127 characters plus the terminator fill the fixed buffer.
  const std::string ts99(99, 't'), text24(24, 'p'), text25(25, 'p'), text100(100, 'x');
  const Case cases[] = {
      {"1700", "pw", true, 0, "04170002pw"},
      {"", "", true, 0, "0000"},
      {ts99.c_str(), text24.c_str(), true, 0, nullptr},
      {ts99.c_str(), text25.c_str(), true, 21, nullptr},
      {ts99.c_str(), text25.c_str(), false, 0, nullptr},
      {"1", text100.c_str(), false, 0, nullptr},
  };
  for (const Case& c : cases) {
    SecureBuffer out;
    EXPECT_EQ(lengthPrefixedPair(c.timestamp, c.text, c.fixed, &out), c.code) << c.timestamp;
    EXPECT_EQ(static_cast<bool>(out), c.code == 0);
    if (c.pair != nullptr) {
      EXPECT_EQ(text(out), c.pair);
    }
  }
  SecureBuffer pair;
  ASSERT_EQ(lengthPrefixedPair("1", text100.c_str(), false, &pair), 0);
  EXPECT_EQ(text(pair), "011100" + text100);

  SecureBuffer wrapped;
  ASSERT_EQ(payloadWrapper('M', "1700", "a:b", &wrapped), 0);
  EXPECT_EQ(text(wrapped), "M1700:a:b");
  ASSERT_EQ(payloadWrapper('E', "", "", &wrapped), 0);
  EXPECT_EQ(text(wrapped), "E:");
}

}  // namespace
}  // namespace tessel::test
